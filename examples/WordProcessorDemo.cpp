// A word-processor host in miniature: it registers paragraph and character
// styles, builds a style sheet with a few levels of inheritance, deletes a
// style in the middle of a chain, writes the sheet to a JSON file, reads the
// file into a new sheet and prints what every style resolves to.
//
// Usage: WordProcessorDemo [file.json]   (default: a file in the temp folder)
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <ZelPlatform/ZelString.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/Stream.h>

#include <cstdio>
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

  manager.RegisterCategory(kParagraph, u"Paragraph", false, false);
  AddText(kParagraph, kFontName, u"Times New Roman");
  AddNumber(kParagraph, kFontSize, 12.0);
  AddText(kParagraph, kColour, u"#000000");
  AddNumber(kParagraph, kSpaceBefore, 0.0);
  AddNumber(kParagraph, kSpaceAfter, 0.0);
  AddNumber(kParagraph, kLineSpacing, 1.0);
  AddText(kParagraph, kAlignment, u"left");
  AddFlag(kParagraph, kKeepWithNext, false);

  manager.RegisterCategory(kCharacter, u"Character", false, false);
  AddText(kCharacter, kFontName, u"Times New Roman");
  AddNumber(kCharacter, kFontSize, 12.0);
  AddText(kCharacter, kColour, u"#000000");
  AddFlag(kCharacter, kBold, false);
  AddFlag(kCharacter, kItalic, false);
  AddInteger(kCharacter, kTracking, 0);
}

// A new style owned by the caller until it is added to a sheet.
Style* NewStyle(const PropertyKey& category, Style* parent) { return new Style(parent, category); }

void BuildSheet(StyleSheet& sheet) {
  // Normal <- Heading <- Heading 1 <- Chapter Title, and Normal <- Body Text.
  Style* normal = NewStyle(kParagraph, nullptr);
  normal->SetProperty(kFontName, Text(u"Georgia"));
  normal->SetProperty(kFontSize, 11.0);
  normal->SetProperty(kSpaceAfter, 6.0);
  sheet.AddStyle(u"Normal", normal, false);

  Style* body = NewStyle(kParagraph, normal);
  body->SetProperty(kAlignment, Text(u"justify"));
  body->SetProperty(kLineSpacing, 1.15);
  sheet.AddStyle(u"Body Text", body, false);

  Style* heading = NewStyle(kParagraph, normal);
  heading->SetProperty(kFontName, Text(u"Avenir Next"));
  heading->SetProperty(kColour, Text(u"#1F3A5C"));
  heading->SetProperty(kSpaceBefore, 12.0);
  heading->SetProperty(kKeepWithNext, true);
  sheet.AddStyle(u"Heading", heading, false);

  Style* heading1 = NewStyle(kParagraph, heading);
  heading1->SetProperty(kFontSize, 20.0);
  sheet.AddStyle(u"Heading 1", heading1, false);

  Style* chapter = NewStyle(kParagraph, heading1);
  chapter->SetProperty(kAlignment, Text(u"center"));
  chapter->SetProperty(kSpaceBefore, 36.0);
  sheet.AddStyle(u"Chapter Title", chapter, false);

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
}

// One line per property: the effective value and where it comes from.
void PrintStyle(const StyleSheet& sheet, const Style& style) {
  Styles::StyleManager& manager = Styles::GetStyleManager();
  const PropertyKey category = style.GetCategoryName();
  std::printf("%s (%s)", ToUtf8(sheet.GetStyleName(&style)).c_str(),
              ToUtf8(manager.TranslateCategory(category)).c_str());
  if (const Style* parent = style.GetParent())
    std::printf(", based on %s", ToUtf8(sheet.GetStyleName(parent)).c_str());
  std::printf("\n");
  for (const PropertyKey& key : manager.GetStylePropertyNames(category)) {
    const ZelPref::ConversionPolicy* policy = manager.GetConversionPolicy(category, key);
    Any inherited;
    const char* origin = style.DoesOverrideProperty(key)              ? "own"
                         : style.GetInheritedProperty(key, inherited) ? "inherited"
                                                                      : "default";
    std::printf("  %-13s %-16s %s\n", ToUtf8(key.GetString()).c_str(),
                ToUtf8(policy->ToText(style.GetProperty(key))).c_str(), origin);
  }
}

int Run(const Text& path) {
  {
    StyleSheet sheet;
    BuildSheet(sheet);
    std::printf("Built %zu styles.\n", sheet.GetStyles().size());

    // Heading sits between Normal and Heading 1: Heading 1 takes over its
    // values and is then based on Normal.
    std::vector<Style*> doomed{sheet.GetStyle(u"Heading")};
    sheet.DeleteStyles(Styles::StyleSpan(doomed, true));
    std::printf("Deleted \"Heading\"; %zu styles left.\n", sheet.GetStyles().size());

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
  for (const PropertyKey& category : {kParagraph, kCharacter})
    for (const Style* style : loaded.GetStylesByCategory(category))
      PrintStyle(loaded, *style);
  return 0;
}

} // namespace

int main(int argc, char** argv) {
  Text path;
  if (argc > 1) {
    path = FromUtf8(argv[1]);
  } else {
    const std::filesystem::path file =
        std::filesystem::temp_directory_path() / "WordProcessorDemo.json";
    path = FromUtf8(file.string());
  }
  RegisterCategories();
  int result = 1;
  try {
    result = Run(path);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "Failed: %s\n", error.what());
  }
  // Styles are gone by now; the behaviours can go too.
  Styles::GetStyleManager().DeregisterCategory(kParagraph);
  Styles::GetStyleManager().DeregisterCategory(kCharacter);
  return result;
}
