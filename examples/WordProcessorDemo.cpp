// A word-processor host in miniature: it registers character, paragraph,
// cell and table styles (every paragraph and cell owns a character substyle
// for its text, a table an ordered list of cell substyles), builds a style
// sheet with a few levels of inheritance, edits a property along a path,
// deletes a style in the middle of a chain, writes the sheet to a JSON file,
// reads the file into a new sheet and prints what every style resolves to.
// Last it saves two styles as presets in a folder, reads them back through a
// new preset manager and applies one to a new style.
//
// Usage: WordProcessorDemo [file.json]   (by default the file, and always the
// presets, go to a new folder under the temp folder, named in the output)
#include <Styles/FolderPresetManager.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>
#include <Styles/StyleUtilities.h>

#include <ZelPlatform/ZelString.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/Stream.h>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <string>
#include <vector>

namespace {

using Styles::PropertyKey;
using Styles::Style;
using Styles::StyleSheet;
using Text = ZelStringT<char16_t>;
using ZelUtils::Any;

const PropertyKey kParagraph(u"paragraph");
const PropertyKey kCharacter(u"character");
const PropertyKey kCell(u"cell");
const PropertyKey kTable(u"table");

const PropertyKey kFontName(u"fontName");
const PropertyKey kFontSize(u"fontSize");
const PropertyKey kColour(u"colour");
const PropertyKey kBold(u"bold");
const PropertyKey kItalic(u"italic");
const PropertyKey kTracking(u"tracking");
const PropertyKey kSpaceBefore(u"spaceBefore");
const PropertyKey kSpaceAfter(u"spaceAfter");
const PropertyKey kLineSpacing(u"lineSpacing");
const PropertyKey kAlignment(u"alignment");
const PropertyKey kKeepWithNext(u"keepWithNext");
const PropertyKey kBackground(u"background");
const PropertyKey kPadding(u"padding");
const PropertyKey kBorderWidth(u"borderWidth");
const PropertyKey kCells(u"cells");

bool IsNumber(const Any& value) { return value.GetIf<double>() != nullptr; }
bool IsInteger(const Any& value) { return value.GetIf<int>() != nullptr; }
bool IsFlag(const Any& value) { return value.GetIf<bool>() != nullptr; }
bool IsText(const Any& value) { return value.GetIf<Text>() != nullptr; }

// Console and file-system text is UTF-8.
std::string ToUtf8(const Text& text) { return ZelPlatform::Utf16ToUtf8(text); }
Text FromUtf8(const std::string& bytes) { return ZelPlatform::Utf8ToUtf16(bytes); }

// The behaviours own their policies; the manager owns the behaviours.
void AddNumber(const PropertyKey& category, const PropertyKey& key, double initial) {
  Styles::GetStyleManager().RegisterProperty(
      category, key,
      new Styles::StyleProperty(Any(initial), new ZelPref::NumberConversionPolicy, &IsNumber));
}
void AddInteger(const PropertyKey& category, const PropertyKey& key, int initial) {
  Styles::GetStyleManager().RegisterProperty(
      category, key,
      new Styles::StyleProperty(Any(initial), new ZelPref::IntegerConversionPolicy, &IsInteger));
}
void AddFlag(const PropertyKey& category, const PropertyKey& key, bool initial) {
  Styles::GetStyleManager().RegisterProperty(
      category, key,
      new Styles::StyleProperty(Any(initial), new ZelPref::BooleanConversionPolicy, &IsFlag));
}
void AddText(const PropertyKey& category, const PropertyKey& key, const char16_t* initial) {
  Styles::GetStyleManager().RegisterProperty(
      category, key,
      new Styles::StyleProperty(Any(Text(initial)), new ZelPref::TextConversionPolicy, &IsText));
}

void RegisterCategories() {
  Styles::StyleManager& manager = Styles::GetStyleManager();
  manager.SetCurrentVersion(1);

  // Run formatting, used on its own and as the text of paragraphs and cells.
  manager.RegisterCategory(kCharacter, u"Character", false, false);
  AddText(kCharacter, kFontName, u"Times New Roman");
  AddNumber(kCharacter, kFontSize, 12.0);
  AddText(kCharacter, kColour, u"#000000");
  AddFlag(kCharacter, kBold, false);
  AddFlag(kCharacter, kItalic, false);
  AddInteger(kCharacter, kTracking, 0);

  manager.RegisterCategory(kParagraph, u"Paragraph", false, false);
  AddNumber(kParagraph, kSpaceBefore, 0.0);
  AddNumber(kParagraph, kSpaceAfter, 0.0);
  AddNumber(kParagraph, kLineSpacing, 1.0);
  AddText(kParagraph, kAlignment, u"left");
  AddFlag(kParagraph, kKeepWithNext, false);
  // The property "character" holds one character substyle.
  Styles::RegisterSubstyleSet(kParagraph, kCharacter);

  manager.RegisterCategory(kCell, u"Cell", false, false);
  AddText(kCell, kBackground, u"none");
  AddNumber(kCell, kPadding, 2.0);
  Styles::RegisterSubstyleSet(kCell, kCharacter);

  manager.RegisterCategory(kTable, u"Table", false, false);
  AddNumber(kTable, kBorderWidth, 1.0);
  manager.RegisterProperty(kTable, kCells, new Styles::StyleArrayProperty(kCell));
}

// A new style owned by the caller until it is added to a sheet.
Style* NewStyle(const PropertyKey& category, Style* parent) { return new Style(parent, category); }

// Sets `value` at the end of a dotted path, creating substyles on the way.
void SetPath(Style* style, const char16_t* path, Any value) {
  style->SetPathProperty(Styles::SplitPath(path), std::move(value));
}

void BuildSheet(StyleSheet& sheet) {
  // Character styles: Strong <- Strong Emphasis, and Emphasis on its own.
  Style* emphasis = NewStyle(kCharacter, nullptr);
  emphasis->SetProperty(kItalic, true);
  sheet.AddStyle(u"Emphasis", emphasis, false);

  Style* strong = NewStyle(kCharacter, nullptr);
  strong->SetProperty(kBold, true);
  strong->SetProperty(kColour, Text(u"#8B0000"));
  strong->SetProperty(kTracking, 10);
  sheet.AddStyle(u"Strong", strong, false);

  Style* strongEmphasis = NewStyle(kCharacter, strong);
  strongEmphasis->SetProperty(kItalic, true);
  sheet.AddStyle(u"Strong Emphasis", strongEmphasis, false);

  // Paragraphs: Normal <- Heading <- Heading 1 <- Chapter Title, and
  // Normal <- Body Text. Their fonts live in their character substyles.
  Style* normal = NewStyle(kParagraph, nullptr);
  SetPath(normal, u"character.fontName", Text(u"Georgia"));
  SetPath(normal, u"character.fontSize", 11.0);
  normal->SetProperty(kSpaceAfter, 6.0);
  sheet.AddStyle(u"Normal", normal, false);

  Style* body = NewStyle(kParagraph, normal);
  body->SetProperty(kAlignment, Text(u"justify"));
  body->SetProperty(kLineSpacing, 1.15);
  sheet.AddStyle(u"Body Text", body, false);

  Style* heading = NewStyle(kParagraph, normal);
  SetPath(heading, u"character.fontName", Text(u"Avenir Next"));
  SetPath(heading, u"character.colour", Text(u"#1F3A5C"));
  heading->SetProperty(kSpaceBefore, 12.0);
  heading->SetProperty(kKeepWithNext, true);
  sheet.AddStyle(u"Heading", heading, false);

  Style* heading1 = NewStyle(kParagraph, heading);
  SetPath(heading1, u"character.fontSize", 20.0);
  sheet.AddStyle(u"Heading 1", heading1, false);

  Style* chapter = NewStyle(kParagraph, heading1);
  chapter->SetProperty(kAlignment, Text(u"center"));
  chapter->SetProperty(kSpaceBefore, 36.0);
  sheet.AddStyle(u"Chapter Title", chapter, false);

  // A table whose cells are a header, a body cell and a total; the header's
  // and the total's text are based on the character style Strong.
  Style header(nullptr, kCell);
  header.SetProperty(kBackground, Text(u"#1F3A5C"));
  SetPath(&header, u"character.colour", Text(u"#FFFFFF"));
  header.GetSubstyle(kCharacter, false)->SetParent(strong);
  Style cell(nullptr, kCell);
  cell.SetProperty(kPadding, 4.0);
  Style total(nullptr, kCell);
  Styles::GetOrCreateSubstyle(total, kCharacter)->SetParent(strong);
  Style* priceList = NewStyle(kTable, nullptr);
  priceList->SetProperty(kBorderWidth, 0.5);
  // The table stores copies; the three cells here go out of scope.
  priceList->SetProperty(kCells, std::vector<Style*>{&header, &cell, &total});
  sheet.AddStyle(u"Price List", priceList, false);
}

constexpr int kNameWidth = 20;

const char* Origin(const Style& style, const PropertyKey& key) {
  Any inherited;
  return style.DoesOverrideProperty(key)              ? "own"
         : style.GetInheritedProperty(key, inherited) ? "inherited"
                                                      : "default";
}

// One line per property, `indent` spaces in: the effective value and where it
// comes from. Own substyles and lists of them are printed below their key.
void PrintValues(const StyleSheet& sheet, const Style& style, int indent) {
  Styles::StyleManager& manager = Styles::GetStyleManager();
  const PropertyKey category = style.GetCategoryName();
  for (const PropertyKey& key : manager.GetStylePropertyNames(category)) {
    const std::string name = ToUtf8(key.GetString());
    const int width = kNameWidth - indent;
    if (manager.GetStyleProperty(category, key)->IsSubstyle()) {
      if (const Style* own = style.GetSubstyle(key, false)) {
        std::printf("%*s%s\n", indent, "", name.c_str());
        PrintValues(sheet, *own, indent + 2);
      } else if (const Style* inherited = style.GetSubstyle(key, true)) {
        std::printf("%*s%-*s from %s\n", indent, "", width, name.c_str(),
                    ToUtf8(sheet.GetStyleName(inherited->GetOwner())).c_str());
      }
      continue;
    }
    const Any& value = style.GetProperty(key);
    if (const auto* list = value.GetIf<std::vector<Style*>>()) {
      std::printf("%*s%-*s %-16zu %s\n", indent, "", width, name.c_str(), list->size(),
                  Origin(style, key));
      for (std::size_t i = 0; i < list->size(); ++i) {
        std::printf("%*s#%zu\n", indent + 2, "", i + 1);
        PrintValues(sheet, *(*list)[i], indent + 4);
      }
      continue;
    }
    const ZelPref::ConversionPolicy* policy = manager.GetConversionPolicy(category, key);
    std::printf("%*s%-*s %-16s %s\n", indent, "", width, name.c_str(),
                ToUtf8(policy->ToText(value)).c_str(), Origin(style, key));
  }
}

void PrintStyle(const StyleSheet& sheet, const Style& style) {
  std::printf("%s (%s)", ToUtf8(sheet.GetStyleName(&style)).c_str(),
              ToUtf8(style.GetCategoryUIName()).c_str());
  if (const Style* parent = style.GetParent())
    std::printf(", based on %s", ToUtf8(sheet.GetStyleName(parent)).c_str());
  std::printf("\n");
  PrintValues(sheet, style, 2);
}

// What a substyle resolves to, and where it comes from.
void PrintPathValue(const Style& style, const char16_t* path) {
  const Styles::PropertyPath keys = Styles::SplitPath(path);
  const Style* substyle = style.GetSubstyle(keys[0], false);
  const ZelPref::ConversionPolicy* policy =
      Styles::GetStyleManager().GetConversionPolicy(kCharacter, keys[1]);
  std::printf("  %s = %s (%s)\n", ToUtf8(path).c_str(),
              ToUtf8(policy->ToText(style.GetPathProperty(keys))).c_str(),
              substyle ? Origin(*substyle, keys[1]) : "no substyle");
}

// `path` as dotted text, as SplitPath reads it.
std::string JoinPath(const Styles::PropertyPath& path) {
  std::string text;
  for (const PropertyKey& key : path)
    text += (text.empty() ? "" : ".") + ToUtf8(key.GetString());
  return text;
}

// Saves Heading 1 and Strong Emphasis of `sheet` as presets of a set in
// `folder`, reads the set back through a new manager and gives a new style
// the values of one preset.
int RunPresets(const StyleSheet& sheet, const std::filesystem::path& folder) {
  const Text setName(u"Word Processor");
  std::filesystem::create_directories(folder);
  {
    Styles::FolderPresetManager presets(FromUtf8(folder.string()));
    const std::filesystem::path file = folder / ToUtf8(presets.GetFileName(setName));
    if (!presets.CreatePresetSet(setName)) {
      std::fprintf(stderr, "Cannot create a preset set in %s\n", folder.string().c_str());
      return 1;
    }
    // Each preset is a copy folded with its parents; the sheet is not changed.
    for (const char16_t* name : {u"Heading 1", u"Strong Emphasis"})
      presets.AddPreset(setName, name, sheet.GetStyle(name), false);
    std::printf("\nSaved 2 presets to %s\n", file.string().c_str());
  }

  Styles::FolderPresetManager presets(FromUtf8(folder.string()));
  std::printf("Read back by a new manager:");
  for (const Text& name : presets.GetPresetNames(setName))
    std::printf(" \"%s\"", ToUtf8(name).c_str());
  std::printf("\n");
  const Style* preset = presets.GetPreset(setName, u"Heading 1");
  if (!preset) {
    std::fprintf(stderr, "Cannot read the preset set back\n");
    return 1;
  }

  // A new style takes the preset's values; the paths of what it now sets
  // itself lead into its own character substyle.
  Style title(nullptr, kParagraph);
  title.MergeProperties(preset, true);
  std::printf("A new paragraph style merged with the preset \"Heading 1\" sets:\n");
  Styles::StyleManager& manager = Styles::GetStyleManager();
  for (const Styles::PropertyPath& path : Styles::GetOverriddenPropertyPaths(title)) {
    const Style* holder = &title;
    for (std::size_t i = 0; i + 1 < path.size(); ++i)
      holder = holder->GetSubstyle(path[i], false);
    const ZelPref::ConversionPolicy* policy =
        manager.GetConversionPolicy(holder->GetCategoryName(), path.back());
    std::printf("  %s = %s\n", JoinPath(path).c_str(),
                ToUtf8(policy->ToText(title.GetPathProperty(path))).c_str());
  }
  return 0;
}

int Run(const Text& path, const std::filesystem::path& folder) {
  {
    StyleSheet sheet;
    BuildSheet(sheet);
    std::printf("Built %zu styles.\n", sheet.GetStyles().size());

    // Heading 1's character substyle has no parent of its own: what it does
    // not set comes from the character substyle of its owner's parent.
    Style* heading1 = sheet.GetStyle(u"Heading 1");
    std::printf("Heading 1's character substyle has no parent; it inherits through its owner's:\n");
    PrintPathValue(*heading1, u"character.fontSize");
    PrintPathValue(*heading1, u"character.fontName");

    // Body Text has no character substyle; setting a value along the path
    // creates one, which inherits the rest through Normal.
    Style* body = sheet.GetStyle(u"Body Text");
    SetPath(body, u"character.fontName", Text(u"Source Serif"));
    std::printf("Body Text after SetPathProperty(\"character.fontName\"):\n");
    PrintPathValue(*body, u"character.fontName");
    PrintPathValue(*body, u"character.fontSize");

    // Heading sits between Normal and Heading 1: Heading 1 takes over its
    // values, its character substyle those of Heading's, and is then based
    // on Normal.
    std::vector<Style*> doomed{sheet.GetStyle(u"Heading")};
    sheet.DeleteStyles(Styles::StyleSpan(doomed, true));
    std::printf("Deleted \"Heading\"; %zu styles left. Heading 1 now holds:\n",
                sheet.GetStyles().size());
    PrintPathValue(*heading1, u"character.fontName");

    ZelUtils::Stream file = ZelUtils::FileStream::Create(path);
    if (!sheet.Export(file)) {
      std::fprintf(stderr, "Cannot write %s\n", ToUtf8(path).c_str());
      return 1;
    }
    std::printf("Wrote %s\n\n", ToUtf8(path).c_str());
  }

  StyleSheet loaded;
  ZelUtils::Stream file = ZelUtils::FileStream::Open(path);
  if (!loaded.Import(file, true)) {
    std::fprintf(stderr, "Cannot read %s\n", ToUtf8(path).c_str());
    return 1;
  }
  std::printf("Read %zu styles back (document version %d):\n\n", loaded.GetStyles().size(),
              loaded.GetVersion());
  for (const PropertyKey& category : {kParagraph, kCharacter, kTable})
    for (const Style* style : loaded.GetStylesByCategory(category))
      PrintStyle(loaded, *style);
  return RunPresets(loaded, folder / "presets");
}

} // namespace

int main(int argc, char** argv) {
  // A fresh folder of its own, so that no run meets another's files.
  std::string folderName =
      (std::filesystem::temp_directory_path() / "WordProcessorDemo-XXXXXX").string();
  if (!mkdtemp(folderName.data())) {
    std::fprintf(stderr, "Cannot create a folder under %s\n",
                 std::filesystem::temp_directory_path().string().c_str());
    return 1;
  }
  const std::filesystem::path folder(folderName);
  const Text path = FromUtf8(argc > 1 ? argv[1] : (folder / "WordProcessorDemo.json").string());
  RegisterCategories();
  int result = 1;
  try {
    result = Run(path, folder);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "Failed: %s\n", error.what());
  }
  // Styles are gone by now; the behaviours can go too.
  for (const PropertyKey& category : {kTable, kCell, kParagraph, kCharacter})
    Styles::GetStyleManager().DeregisterCategory(category);
  return result;
}
