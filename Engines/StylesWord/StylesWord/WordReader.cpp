// Reading the styles part of a Word file into a sheet (declared in WordFile.h).
#include <StylesWord/WordFile.h>

#include <Internal/Package.h>
#include <Internal/WordMap.h>
#include <StylesWord/WordSchema.h>

#include <Styles/StyleManager.h>
#include <Styles/StyleSheet.h>

#include <algorithm>
#include <cctype>
#include <cstring>
#include <functional>
#include <map>
#include <memory>

namespace Styles {
namespace Word {

using detail::Container;
using detail::Narrow;
using detail::Text;
using detail::Widen;
using ZelUtils::Any;

namespace {

const char* const kCategories[] = {"paragraph", "character", "table", "numbering"};

Problem MakeProblem(const std::string& part, const std::string& element,
                    const std::string& message) {
  return Problem{Widen(part), Widen(element), Widen(message)};
}

// Parses XML text, refusing any DOCTYPE: no DTD or entity is ever processed.
bool ParseXml(std::string_view text, pugi::xml_document& document, std::string& message) {
  // Text without a UTF-16 or UTF-32 byte order mark must be UTF-8: names that
  // differ only in broken bytes would otherwise become one name when written.
  const bool wide = text.substr(0, 2) == "\xFF\xFE" || text.substr(0, 2) == "\xFE\xFF" ||
                    text.substr(0, 4) == std::string_view("\0\0\xFE\xFF", 4);
  if (const std::size_t bad = wide ? std::string_view::npos : ZelPlatform::FindInvalidUtf8(text);
      bad != std::string_view::npos) {
    message = "is not well-formed XML (a byte that is not UTF-8 at byte " + std::to_string(bad) +
              ")";
    return false;
  }
  const pugi::xml_parse_result result =
      document.load_buffer(text.data(), text.size(), pugi::parse_default | pugi::parse_doctype);
  if (!result) {
    message = std::string("is not well-formed XML (") + result.description() + " at byte " +
              std::to_string(result.offset) + ")";
    return false;
  }
  for (pugi::xml_node node = document.first_child(); node; node = node.next_sibling())
    if (node.type() == pugi::node_doctype) {
      message = "has a DOCTYPE; document type declarations and entities are refused";
      return false;
    }
  // The parser lets an attribute repeat; well-formed XML does not.
  struct RepeatFinder : pugi::xml_tree_walker {
    std::string repeated;
    bool for_each(pugi::xml_node& node) override {
      std::vector<std::string_view> names;
      for (const pugi::xml_attribute attribute : node.attributes())
        names.emplace_back(attribute.name());
      std::sort(names.begin(), names.end());
      const auto twice = std::adjacent_find(names.begin(), names.end());
      if (twice == names.end())
        return true;
      repeated = std::string(node.name()) + " repeats the attribute " + std::string(*twice);
      return false;
    }
  } finder;
  document.traverse(finder);
  if (!finder.repeated.empty()) {
    message = "is not well-formed XML (" + finder.repeated + ")";
    return false;
  }
  return true;
}

// Theme fonts by the references that styles use.
detail::ThemeFonts ReadTheme(const pugi::xml_document& theme) {
  detail::ThemeFonts fonts;
  const pugi::xml_node scheme =
      theme.child("a:theme").child("a:themeElements").child("a:fontScheme");
  for (const char* kind : {"major", "minor"}) {
    const pugi::xml_node font = scheme.child((std::string("a:") + kind + "Font").c_str());
    const std::string latin = font.child("a:latin").attribute("typeface").value();
    fonts[std::string(kind) + "Ascii"] = latin;
    fonts[std::string(kind) + "HAnsi"] = latin;
    fonts[std::string(kind) + "EastAsia"] = font.child("a:ea").attribute("typeface").value();
    fonts[std::string(kind) + "Bidi"] = font.child("a:cs").attribute("typeface").value();
  }
  return fonts;
}

class PartReader {
public:
  PartReader(StyleSheet& sheet, ReadReport& report, std::string part, detail::ThemeFonts theme)
      : m_sheet(sheet), m_report(report), m_part(std::move(part)), m_theme(std::move(theme)) {}

  bool Read(std::string_view text);

private:
  struct Entry {
    pugi::xml_node node;
    Style* style;
    std::string id;
  };
  // Consumes the structural children of an element; true when it took one.
  using Structural = std::function<bool(const pugi::xml_node&)>;

  void Warn(const std::string& element, const std::string& message) {
    if (!m_quiet)
      m_report.warnings.push_back(MakeProblem(m_part, element, message));
  }
  static PropertyKey Key(const char* key) {
    // The keys of substyles and categories come up for every style.
    static const PropertyKey paragraph(u"paragraph"), character(u"character");
    if (std::strcmp(key, "paragraph") == 0)
      return paragraph;
    if (std::strcmp(key, "character") == 0)
      return character;
    return PropertyKey(Widen(key));
  }
  void AppendRaw(Style& style, Container container, const std::string& xml) {
    const PropertyKey& key = detail::RawPropertyKey(container);
    const Any* raw = style.GetProperties().Find(key);
    const Text* text = raw ? raw->GetIf<Text>() : nullptr;
    style.SetProperty(key, Any((text ? *text : Text()) + Widen(xml)));
  }

  void ReadChildren(Container container, const pugi::xml_node& element, Style& style,
                    const Structural& structural = nullptr);
  void ReadStyle(const Entry& entry);
  void ReadTableFormat(const pugi::xml_node& node, Style& table);
  void ReadDefaults(const pugi::xml_node& node);
  void LinkParents(std::vector<Entry>& entries);
  Style* AddStyle(const Text& name, const PropertyKey& category, const Text& externalName);

  StyleSheet& m_sheet;
  ReadReport& m_report;
  std::string m_part;
  detail::ThemeFonts m_theme;
  Style* m_partStyle = nullptr;
  std::map<std::string, Style*> m_roots;
  std::map<std::u16string, int> m_nextNumber;
  bool m_quiet = false;
  std::string m_context; // the style being read, for warnings
  pugi::xml_document m_scratch; // holds elements built to compare, one at a time
};

Style* PartReader::AddStyle(const Text& name, const PropertyKey& category,
                            const Text& externalName) {
  Style* style = new Style(nullptr, category);
  Text filed = name;
  if (m_sheet.GetStyle(name)) {
    // Numbered on from the last number given to this name, so that many
    // styles of one name take linear time.
    int& next = m_nextNumber[std::u16string(name.GetView())];
    do
      filed = name + u" " + Widen(std::to_string(++next));
    while (m_sheet.GetStyle(filed));
    style->SetExternalName(externalName);
  }
  m_sheet.AddStyle(filed, style, false);
  return style;
}

void PartReader::ReadChildren(Container container, const pugi::xml_node& element, Style& style,
                              const Structural& structural) {
  std::string raw;
  for (const pugi::xml_node child : element.children()) {
    if (child.type() != pugi::node_element || (structural && structural(child)))
      continue;
    const detail::Group* group = detail::FindGroup(container, child.name());
    if (!group) {
      detail::AppendNodeText(child, raw);
      continue;
    }
    detail::Values values;
    std::string problem;
    if (!detail::ReadGroup(*group, child, m_theme, values, problem)) {
      Warn(m_context + child.name(), problem + "; the element is kept as written, unread");
      raw += detail::NodeText(child);
      continue;
    }
    for (auto& [key, value] : values)
      style.SetProperty(key, std::move(value));
    // What the writer would make of the values must be the element itself;
    // where it is not (other spellings, extra attributes), the element is kept.
    pugi::xml_node written = m_scratch.append_child("written");
    detail::WriteGroup(*group, style, m_theme, written);
    if (!detail::SameNode(written.first_child(), child))
      detail::AppendNodeText(child, raw);
    m_scratch.remove_child(written);
  }
  AppendRaw(style, container, raw);
}

void PartReader::ReadTableFormat(const pugi::xml_node& node, Style& table) {
  const std::string type = node.attribute("w:type").value();
  // Only known names become keys: a file cannot grow the process's key pool.
  const bool known = detail::IsConditionalFormat(type);
  const PropertyKey key = known ? PropertyKey(Widen(type)) : PropertyKey();
  if (!known || table.GetSubstyle(key, false)) {
    Warn("w:tblStylePr \"" + type + "\"",
         known ? "repeats a conditional format; kept as it is written"
               : "is not a known conditional format; kept as it is written");
    AppendRaw(table, Container::Style, detail::NodeText(node));
    return;
  }
  Style* format = table.GetSubstyleAndCreateIfMissing(key, table.GetCategoryName());
  ReadChildren(Container::Style, node, *format, [&](const pugi::xml_node& child) {
    const std::string_view name = child.name();
    if (name == "w:pPr")
      ReadChildren(Container::Paragraph, child,
                   *format->GetSubstyleAndCreateIfMissing(Key("paragraph"), Key("paragraph")));
    else if (name == "w:rPr")
      ReadChildren(Container::Run, child,
                   *format->GetSubstyleAndCreateIfMissing(Key("character"), Key("character")));
    else if (name == "w:tblPr")
      ReadChildren(Container::Table, child, *format);
    else if (name == "w:trPr")
      ReadChildren(Container::Row, child, *format);
    else if (name == "w:tcPr")
      ReadChildren(Container::Cell, child, *format);
    else
      return false;
    return true;
  });
}

void PartReader::ReadStyle(const Entry& entry) {
  Style& style = *entry.style;
  m_context = "w:style \"" + entry.id + "\" ";
  const std::string category = Narrow(style.GetCategoryName().GetString());
  const detail::Group* attributes = detail::FindGroup(Container::Style, "");
  detail::Values values;
  std::string problem;
  if (detail::ReadGroup(*attributes, entry.node, m_theme, values, problem))
    for (auto& [key, value] : values)
      style.SetProperty(key, std::move(value));
  else
    Warn("w:style \"" + entry.id + "\"", problem);

  ReadChildren(Container::Style, entry.node, style, [&](const pugi::xml_node& child) {
    const std::string_view name = child.name();
    if (name == "w:name" || name == "w:basedOn")
      return true;
    if (name == "w:pPr" && category != "character") {
      Style& target = category == "table"
                          ? *style.GetSubstyleAndCreateIfMissing(Key("paragraph"), Key("paragraph"))
                          : style;
      ReadChildren(Container::Paragraph, child, target);
    } else if (name == "w:rPr" && category != "numbering") {
      Style& target =
          category == "character"
              ? style
              : *style.GetSubstyleAndCreateIfMissing(Key("character"), Key("character"));
      ReadChildren(Container::Run, child, target);
    } else if (category == "table" && name == "w:tblPr") {
      ReadChildren(Container::Table, child, style);
    } else if (category == "table" && name == "w:trPr") {
      ReadChildren(Container::Row, child, style);
    } else if (category == "table" && name == "w:tcPr") {
      ReadChildren(Container::Cell, child, style);
    } else if (category == "table" && name == "w:tblStylePr") {
      ReadTableFormat(child, style);
    } else {
      return false;
    }
    return true;
  });
}

void PartReader::ReadDefaults(const pugi::xml_node& node) {
  std::string raw;
  for (const pugi::xml_node child : node.children()) {
    const std::string_view name = child.name();
    const bool run = name == "w:rPrDefault";
    const pugi::xml_node properties = child.child(run ? "w:rPr" : "w:pPr");
    // Kept whole unless it is exactly one property element.
    if ((!run && name != "w:pPrDefault") || !properties || properties != child.last_child()) {
      raw += detail::NodeText(child);
      continue;
    }
    // Every root of a chain holds the defaults its category uses; warnings once.
    for (const char* category : kCategories) {
      Style* root = m_roots[category];
      if (run && std::strcmp(category, "numbering") == 0)
        continue;
      if (run && std::strcmp(category, "character") != 0)
        root = root->GetSubstyleAndCreateIfMissing(Key("character"), Key("character"));
      else if (!run && std::strcmp(category, "table") == 0)
        root = root->GetSubstyleAndCreateIfMissing(Key("paragraph"), Key("paragraph"));
      else if (!run && std::strcmp(category, "character") == 0)
        continue;
      ReadChildren(run ? Container::Run : Container::Paragraph, properties, *root);
      m_quiet = true;
    }
    m_quiet = false;
  }
  m_partStyle->SetProperty(Key("defaultsXml"), Any(Widen(raw)));
}

void PartReader::LinkParents(std::vector<Entry>& entries) {
  std::map<std::string, std::size_t> byId;
  for (std::size_t i = 0; i < entries.size(); ++i)
    if (!entries[i].id.empty() && !byId.emplace(entries[i].id, i).second)
      Warn("w:style \"" + entries[i].id + "\"",
           "repeats a style ID; references to it reach the first style of that ID");

  constexpr std::size_t kRoot = static_cast<std::size_t>(-1);
  std::vector<std::size_t> parents(entries.size(), kRoot);
  for (std::size_t i = 0; i < entries.size(); ++i) {
    const pugi::xml_node basedOn = entries[i].node.child("w:basedOn");
    if (!basedOn)
      continue;
    const std::string target = basedOn.attribute("w:val").value();
    const auto found = byId.find(target);
    std::string problem;
    if (found == byId.end())
      problem = "is based on \"" + target + "\", which is not a style of the part";
    else if (found->second == i)
      problem = "is based on itself";
    else if (entries[found->second].style->GetCategoryName() != entries[i].style->GetCategoryName())
      problem = "is based on \"" + target + "\", a style of another type";
    if (problem.empty()) {
      parents[i] = found->second;
      continue;
    }
    Warn("w:style \"" + entries[i].id + "\"", problem + "; it starts from the defaults");
    AppendRaw(*entries[i].style, Container::Style, detail::NodeText(basedOn));
  }

  // Cuts the link that would close a cycle, walking each chain once.
  enum : char { kNew, kOnPath, kDone };
  std::vector<char> state(entries.size(), kNew);
  for (std::size_t start = 0; start < entries.size(); ++start) {
    std::size_t i = start;
    std::vector<std::size_t> path;
    while (i != kRoot && state[i] == kNew) {
      state[i] = kOnPath;
      path.push_back(i);
      if (parents[i] != kRoot && state[parents[i]] == kOnPath) {
        Warn("w:style \"" + entries[i].id + "\"",
             "closes a cycle of w:basedOn; it starts from the defaults");
        AppendRaw(*entries[i].style, Container::Style,
                  detail::NodeText(entries[i].node.child("w:basedOn")));
        parents[i] = kRoot;
      }
      i = parents[i];
    }
    for (std::size_t visited : path)
      state[visited] = kDone;
  }
  for (std::size_t i = 0; i < entries.size(); ++i) {
    Style* style = entries[i].style;
    style->SetParent(parents[i] == kRoot ? m_roots[Narrow(style->GetCategoryName().GetString())]
                                         : entries[parents[i]].style);
  }
}

bool PartReader::Read(std::string_view text) {
  pugi::xml_document document;
  std::string message;
  if (!ParseXml(text, document, message)) {
    m_report.error = MakeProblem(m_part, "", message);
    return false;
  }
  const pugi::xml_node root = document.document_element();
  if (std::strcmp(root.name(), "w:styles") != 0) {
    m_report.error = MakeProblem(m_part, root.name(), "is not w:styles, the root of a styles part");
    return false;
  }

  m_partStyle = AddStyle(PartStyleName(), Key("document"), Text());
  pugi::xml_document shell;
  shell.append_copy(root).remove_children();
  m_partStyle->SetProperty(Key("rootElement"), Any(Widen(detail::NodeText(shell.first_child()))));
  for (const auto& [reference, font] : m_theme) {
    static const std::map<std::string, const char*> kKeys = {
        {"majorHAnsi", "themeMajorLatin"},       {"majorEastAsia", "themeMajorEastAsia"},
        {"majorBidi", "themeMajorComplex"},      {"minorHAnsi", "themeMinorLatin"},
        {"minorEastAsia", "themeMinorEastAsia"}, {"minorBidi", "themeMinorComplex"}};
    const auto key = kKeys.find(reference);
    if (key != kKeys.end())
      m_partStyle->SetProperty(Key(key->second), Any(Widen(font)));
  }
  for (const char* category : kCategories) {
    const PropertyKey key = Key(category);
    m_roots[category] = AddStyle(DefaultsStyleName(key), key, Text());
  }

  std::vector<Entry> entries;
  std::string extra, order;
  for (const pugi::xml_node child : root.children()) {
    const std::string_view name = child.name();
    if (name == "w:docDefaults") {
      ReadDefaults(child);
    } else if (name == "w:latentStyles") {
      m_partStyle->SetProperty(Key("latentStyles"), Any(Widen(detail::NodeText(child))));
    } else if (name == "w:style") {
      std::string type = child.attribute("w:type").value();
      if (type.empty())
        type = "paragraph";
      std::string id = child.attribute("w:styleId").value();
      const std::string name = child.child("w:name").attribute("w:val").value();
      if (id.empty()) {
        // References need an ID: the name's letters and digits, as Word makes them.
        for (const char c : name.empty() ? std::string("Style") : name)
          if (std::isalnum(static_cast<unsigned char>(c)))
            id += c;
        id += std::to_string(entries.size());
        Warn("w:style \"" + name + "\"", "has no w:styleId; it is given \"" + id + "\"");
      }
      if (!m_roots.count(type)) {
        Warn("w:style \"" + id + "\"",
             "has the unknown type \"" + type + "\"; kept as it is written");
        extra += detail::NodeText(child);
        continue;
      }
      const Text display = Widen(name.empty() ? (id.empty() ? "Style" : id) : name);
      Style* style = AddStyle(display, Key(type.c_str()), display);
      style->SetExternalID(Widen(id));
      entries.push_back(Entry{child, style, id});
      order += (order.empty() ? "" : " ") + id;
    } else if (child.type() == pugi::node_element) {
      extra += detail::NodeText(child);
    }
  }
  m_partStyle->SetProperty(Key("extraXml"), Any(Widen(extra)));
  m_partStyle->SetProperty(Key("styleOrder"), Any(Widen(order)));
  for (const Entry& entry : entries)
    ReadStyle(entry);
  m_context.clear();
  LinkParents(entries);
  return true;
}

bool WordSchemaRegistered() {
  StyleManager& manager = GetStyleManager();
  for (const char16_t* key : {u"paragraph", u"character", u"table", u"numbering", u"document"})
    if (!manager.FindCategory(PropertyKey(key)))
      return false;
  // The Word schema's paragraphs, not another schema's of the same name.
  return manager.GetStyleProperty(PropertyKey(u"paragraph"), PropertyKey(u"styleXml")) != nullptr;
}

bool ReadPackage(std::string_view bytes, StyleSheet& sheet, ReadReport& report,
                 const Limits& limits) {
  detail::Package package;
  detail::PackageParts parts;
  if (!package.Open(bytes, limits, report.error) || !FindParts(package, parts, report.error))
    return false;
  if (parts.styles.empty()) {
    report.error =
        MakeProblem("", "", "the package has no styles part: its main document names none");
    return false;
  }
  detail::ThemeFonts theme;
  if (!parts.theme.empty()) {
    std::string text, message;
    Problem problem;
    pugi::xml_document document;
    if (!package.Read(parts.theme, text, problem))
      report.warnings.push_back(problem);
    else if (!ParseXml(text, document, message))
      report.warnings.push_back(
          MakeProblem(parts.theme, "", message + "; theme fonts stay unresolved"));
    else
      theme = ReadTheme(document);
  }
  std::string text;
  if (!package.Read(parts.styles, text, report.error))
    return false;
  return PartReader(sheet, report, package.EntryName(parts.styles), std::move(theme)).Read(text);
}

} // namespace

bool IsWordFile(std::string_view bytes) {
  if (bytes.substr(0, 4) == std::string_view("PK\x03\x04", 4)) {
    detail::Package package;
    Problem ignored;
    return package.Open(bytes, Limits(), ignored) && package.Has("_rels/.rels");
  }
  // A bare styles part: its root element, without parsing the whole text.
  const std::size_t root = bytes.find("<w:styles");
  return root != std::string_view::npos &&
         bytes.substr(0, root).find("<w:") == std::string_view::npos &&
         bytes.substr(0, root).find('{') == std::string_view::npos;
}

bool ReadWord(std::string_view bytes, StyleSheet& sheet, ReadReport& report, const Limits& limits) {
  report = ReadReport();
  sheet.Clear();
  if (!WordSchemaRegistered()) {
    report.error = MakeProblem("", "", "the Word schema is not registered with the style manager");
    return false;
  }
  if (bytes.size() > limits.maxPartSize && bytes.substr(0, 2) != "PK") {
    report.error = MakeProblem("", "", "the styles part is larger than the limit");
    return false;
  }
  const bool read =
      bytes.substr(0, 2) == "PK"
          ? ReadPackage(bytes, sheet, report, limits)
          : PartReader(sheet, report, std::string(), detail::ThemeFonts()).Read(bytes);
  if (!read)
    sheet.Clear();
  return read;
}

bool ReadStylesPart(std::string_view package, std::string& xml, Problem& error,
                    const Limits& limits) {
  detail::Package opened;
  detail::PackageParts parts;
  if (!opened.Open(package, limits, error) || !FindParts(opened, parts, error))
    return false;
  if (parts.styles.empty()) {
    error = MakeProblem("", "", "the package has no styles part: its main document names none");
    return false;
  }
  return opened.Read(parts.styles, xml, error);
}

std::vector<std::string> ListParts(std::string_view package) {
  detail::Package opened;
  Problem ignored;
  return opened.Open(package, Limits(), ignored) ? opened.Names() : std::vector<std::string>();
}

bool ReadPart(std::string_view package, const std::string& name, std::string& bytes, Problem& error,
              const Limits& limits) {
  detail::Package opened;
  return opened.Open(package, limits, error) && opened.Read(name, bytes, error);
}

bool SameXml(std::string_view a, std::string_view b) {
  pugi::xml_document first, second;
  std::string message;
  return ParseXml(a, first, message) && ParseXml(b, second, message) &&
         detail::SameNode(first.document_element(), second.document_element());
}

} // namespace Word
} // namespace Styles
