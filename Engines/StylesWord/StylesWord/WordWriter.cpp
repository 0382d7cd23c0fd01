// Writing a sheet as a styles part, alone or into a package (declared in
// WordFile.h).
#include <StylesWord/WordFile.h>

#include <Internal/Package.h>
#include <Internal/WordMap.h>
#include <StylesWord/WordSchema.h>

#include <Styles/StyleSheet.h>

#include <algorithm>
#include <cctype>
#include <climits>
#include <cstring>
#include <map>
#include <set>
#include <sstream>

namespace Styles {
namespace Word {

using detail::Container;
using detail::Narrow;
using detail::Text;
using detail::Widen;
using ZelUtils::Any;

namespace {

const char kDefaultRoot[] =
    "<w:styles xmlns:r=\"http://schemas.openxmlformats.org/officeDocument/2006/relationships\" "
    "xmlns:w=\"http://schemas.openxmlformats.org/wordprocessingml/2006/main\"/>";

PropertyKey Key(const char* key) { return PropertyKey(Widen(key)); }

std::string OwnText(const Style& style, const char* key) {
  const Any* value = style.GetProperties().Find(Key(key));
  const Text* text = value ? value->GetIf<Text>() : nullptr;
  return text ? Narrow(*text) : std::string();
}

const Style* OwnSubstyle(const Style& style, const char* key) {
  const Any* value = style.GetProperties().Find(Key(key));
  Style* const* held = value ? value->GetIf<Style*>() : nullptr;
  return held ? *held : nullptr;
}

// One child of an element being written: its rank in the container's order
// and where it was found, so that equal ranks keep their order.
struct Item {
  int rank;
  std::size_t sequence;
  pugi::xml_node node;
};

class PartWriter {
public:
  explicit PartWriter(const StyleSheet& sheet) : m_sheet(sheet) {}
  std::string Write();

private:
  void ReadTheme(const Style& part);
  // Items for the own values of `style` in `container`: its raw children
  // (those of mapped elements only while they still say what the values say)
  // and elements built from the values not covered by a raw one.
  void CollectItems(Container container, const Style& style, std::vector<Item>& items);
  // The container element `name` under `parent`, when the style has one.
  void WriteContainer(Container container, const Style* style, const char* name,
                      std::vector<Item>& items, Container outer);
  void WriteStyle(const Style& style, pugi::xml_node parent);
  void WriteFormat(const Style& format, const char* type, std::vector<Item>& items);
  void AppendSorted(std::vector<Item>& items, pugi::xml_node parent);
  void AppendRaw(const std::string& xml, pugi::xml_node parent);
  std::string IdOf(const Style* style) const;
  void AssignIds(const std::vector<const Style*>& styles);

  const StyleSheet& m_sheet;
  detail::ThemeFonts m_theme;
  pugi::xml_document m_scratch;
  std::map<const Style*, std::string> m_ids;
};

void PartWriter::ReadTheme(const Style& part) {
  const std::pair<const char*, const char*> kKeys[] = {
      {"themeMajorLatin", "majorAscii"},       {"themeMajorLatin", "majorHAnsi"},
      {"themeMajorEastAsia", "majorEastAsia"}, {"themeMajorComplex", "majorBidi"},
      {"themeMinorLatin", "minorAscii"},       {"themeMinorLatin", "minorHAnsi"},
      {"themeMinorEastAsia", "minorEastAsia"}, {"themeMinorComplex", "minorBidi"}};
  for (const auto& [key, reference] : kKeys)
    m_theme[reference] = OwnText(part, key);
}

void PartWriter::AppendRaw(const std::string& xml, pugi::xml_node parent) {
  if (xml.empty())
    return;
  // Raw text that no longer parses is left out rather than written broken.
  pugi::xml_document fragment;
  if (!fragment.load_buffer(xml.data(), xml.size(), pugi::parse_default | pugi::parse_fragment))
    return;
  for (const pugi::xml_node child : fragment.children())
    parent.append_copy(child);
}

void PartWriter::CollectItems(Container container, const Style& style, std::vector<Item>& items) {
  pugi::xml_node holder = m_scratch.append_child("holder");
  const Any* raw = style.GetProperties().Find(detail::RawPropertyKey(container));
  const Text* rawText = raw ? raw->GetIf<Text>() : nullptr;
  if (rawText && !rawText->IsEmpty())
    AppendRaw(Narrow(*rawText), holder);
  std::set<const detail::Group*> covered;
  for (const pugi::xml_node child : holder.children()) {
    // Elements the order does not know (extensions) go last, as Word puts them.
    const int known = detail::ChildRank(container, child.name());
    const int rank = known >= 0 ? known : INT_MAX;
    const detail::Group* group = detail::FindGroup(container, child.name());
    if (group) {
      detail::Values values;
      std::string problem;
      const bool read = detail::ReadGroup(*group, child, m_theme, values, problem);
      if (!detail::SameOwnValues(*group, style, read ? values : detail::Values()))
        continue; // the values changed: the element is built from them instead
      covered.insert(group);
    }
    items.push_back(Item{rank, items.size(), child});
  }
  for (const detail::Group& group : detail::Groups()) {
    if (group.container != container || group.element.empty() || covered.count(&group))
      continue;
    const pugi::xml_node last = holder.last_child();
    detail::WriteGroup(group, style, m_theme, holder);
    if (holder.last_child() != last)
      items.push_back(
          Item{detail::ChildRank(container, group.element), items.size(), holder.last_child()});
  }
}

void PartWriter::AppendSorted(std::vector<Item>& items, pugi::xml_node parent) {
  std::stable_sort(items.begin(), items.end(), [](const Item& a, const Item& b) {
    return a.rank != b.rank ? a.rank < b.rank : a.sequence < b.sequence;
  });
  for (const Item& item : items)
    parent.append_copy(item.node);
}

void PartWriter::WriteContainer(Container container, const Style* style, const char* name,
                                std::vector<Item>& items, Container outer) {
  if (!style)
    return;
  std::vector<Item> children;
  CollectItems(container, *style, children);
  if (children.empty() && !style->GetProperties().Find(detail::RawPropertyKey(container)))
    return;
  pugi::xml_node element = m_scratch.append_child(name);
  AppendSorted(children, element);
  items.push_back(Item{detail::ChildRank(outer, name), items.size(), element});
}

void PartWriter::WriteFormat(const Style& format, const char* type, std::vector<Item>& items) {
  std::vector<Item> children;
  CollectItems(Container::Style, format, children);
  WriteContainer(Container::Paragraph, OwnSubstyle(format, "paragraph"), "w:pPr", children,
                 Container::Style);
  WriteContainer(Container::Run, OwnSubstyle(format, "character"), "w:rPr", children,
                 Container::Style);
  WriteContainer(Container::Table, &format, "w:tblPr", children, Container::Style);
  WriteContainer(Container::Row, &format, "w:trPr", children, Container::Style);
  WriteContainer(Container::Cell, &format, "w:tcPr", children, Container::Style);
  pugi::xml_node element = m_scratch.append_child("w:tblStylePr");
  element.append_attribute("w:type").set_value(type);
  AppendSorted(children, element);
  items.push_back(Item{detail::ChildRank(Container::Style, "w:tblStylePr"), items.size(), element});
}

std::string PartWriter::IdOf(const Style* style) const {
  const auto id = m_ids.find(style);
  return id == m_ids.end() ? std::string() : id->second;
}

void PartWriter::AssignIds(const std::vector<const Style*>& styles) {
  std::set<std::string> used;
  for (const Style* style : styles)
    if (style->IsExternal())
      used.insert(m_ids[style] = Narrow(style->GetExternalID()));
  for (const Style* style : styles) {
    if (style->IsExternal())
      continue;
    // Word's IDs are the name's letters and digits.
    std::string base;
    for (const char c : Narrow(m_sheet.GetStyleName(style)))
      if (std::isalnum(static_cast<unsigned char>(c)))
        base += c;
    if (base.empty())
      base = "Style";
    std::string id = base;
    for (int n = 1; used.count(id); ++n)
      id = base + std::to_string(n);
    used.insert(m_ids[style] = id);
  }
}

void PartWriter::WriteStyle(const Style& style, pugi::xml_node parent) {
  const std::string category = Narrow(style.GetCategoryName().GetString());
  pugi::xml_node element = parent.append_child("w:style");
  element.append_attribute("w:type").set_value(category.c_str());
  pugi::xml_node flags = m_scratch.append_child("flags");
  detail::WriteGroup(*detail::FindGroup(Container::Style, ""), style, m_theme, flags);
  for (const pugi::xml_attribute attribute : flags.first_child().attributes())
    element.append_attribute(attribute.name()).set_value(attribute.value());
  if (const std::string id = IdOf(&style); !id.empty())
    element.append_attribute("w:styleId").set_value(id.c_str());

  std::vector<Item> items;
  pugi::xml_node name = m_scratch.append_child("w:name");
  const Text external = style.GetExternalName();
  name.append_attribute("w:val").set_value(
      Narrow(external.IsEmpty() ? m_sheet.GetStyleName(&style) : external).c_str());
  items.push_back(Item{detail::ChildRank(Container::Style, "w:name"), 0, name});
  if (const Style* base = style.GetParent(); base && !IsPartStyle(m_sheet, base)) {
    pugi::xml_node basedOn = m_scratch.append_child("w:basedOn");
    basedOn.append_attribute("w:val").set_value(IdOf(base).c_str());
    items.push_back(Item{detail::ChildRank(Container::Style, "w:basedOn"), 1, basedOn});
  }
  CollectItems(Container::Style, style, items);
  if (category == "paragraph" || category == "numbering")
    WriteContainer(Container::Paragraph, &style, "w:pPr", items, Container::Style);
  if (category == "table")
    WriteContainer(Container::Paragraph, OwnSubstyle(style, "paragraph"), "w:pPr", items,
                   Container::Style);
  if (category == "character")
    WriteContainer(Container::Run, &style, "w:rPr", items, Container::Style);
  else if (category != "numbering")
    WriteContainer(Container::Run, OwnSubstyle(style, "character"), "w:rPr", items,
                   Container::Style);
  if (category == "table") {
    WriteContainer(Container::Table, &style, "w:tblPr", items, Container::Style);
    WriteContainer(Container::Row, &style, "w:trPr", items, Container::Style);
    WriteContainer(Container::Cell, &style, "w:tcPr", items, Container::Style);
    for (const char* const* type = detail::ConditionalFormats(); *type; ++type)
      if (const Style* format = OwnSubstyle(style, *type))
        WriteFormat(*format, *type, items);
  }
  AppendSorted(items, element);
}

std::string PartWriter::Write() {
  const Style* part = m_sheet.GetStyle(PartStyleName());
  if (part)
    ReadTheme(*part);
  pugi::xml_document document;
  const std::string rootText = part ? OwnText(*part, "rootElement") : std::string();
  pugi::xml_document shell;
  if (rootText.empty() || !shell.load_buffer(rootText.data(), rootText.size()) ||
      std::strcmp(shell.document_element().name(), "w:styles") != 0)
    shell.load_string(kDefaultRoot);
  pugi::xml_node root = document.append_copy(shell.document_element());

  // The defaults come from the paragraph chains' root, else the characters'.
  const Style* paragraphs = m_sheet.GetStyle(DefaultsStyleName(Key("paragraph")));
  const Style* characters = m_sheet.GetStyle(DefaultsStyleName(Key("character")));
  const Style* runDefaults = paragraphs ? OwnSubstyle(*paragraphs, "character") : characters;
  std::vector<Item> run, paragraph;
  WriteContainer(Container::Run, runDefaults, "w:rPr", run, Container::Run);
  WriteContainer(Container::Paragraph, paragraphs, "w:pPr", paragraph, Container::Paragraph);
  const std::string defaultsXml = part ? OwnText(*part, "defaultsXml") : std::string();
  if (!run.empty() || !paragraph.empty() || !defaultsXml.empty()) {
    pugi::xml_node holder = m_scratch.append_child("defaults");
    if (!run.empty())
      holder.append_child("w:rPrDefault").append_copy(run.front().node);
    if (!paragraph.empty())
      holder.append_child("w:pPrDefault").append_copy(paragraph.front().node);
    AppendRaw(defaultsXml, holder);
    std::vector<Item> items;
    for (const pugi::xml_node child : holder.children()) {
      const std::string_view name = child.name();
      items.push_back(Item{name == "w:rPrDefault"   ? 0
                           : name == "w:pPrDefault" ? 1
                                                    : 2,
                           items.size(), child});
    }
    AppendSorted(items, root.append_child("w:docDefaults"));
  }
  if (part)
    AppendRaw(OwnText(*part, "latentStyles"), root);

  // Styles in the order they were read, then the others by name.
  std::vector<const Style*> styles;
  for (const Style* style : m_sheet.GetStyles()) {
    if (!IsPartStyle(m_sheet, style) && !DefaultsStyleName(style->GetCategoryName()).IsEmpty())
      styles.push_back(style);
  }
  AssignIds(styles);
  std::map<std::string, std::vector<std::size_t>> positions;
  std::istringstream order(part ? OwnText(*part, "styleOrder") : std::string());
  std::size_t position = 0;
  for (std::string id; order >> id; ++position)
    positions[id].push_back(position);
  std::vector<std::pair<std::size_t, const Style*>> ranked;
  for (const Style* style : styles) {
    std::vector<std::size_t>& slots = positions[Narrow(style->GetExternalID())];
    std::size_t slot = static_cast<std::size_t>(-1);
    if (style->IsExternal() && !slots.empty()) {
      slot = slots.front();
      slots.erase(slots.begin());
    }
    ranked.emplace_back(slot, style);
  }
  std::stable_sort(ranked.begin(), ranked.end(),
                   [](const auto& a, const auto& b) { return a.first < b.first; });
  for (const auto& [slot, style] : ranked)
    WriteStyle(*style, root);
  if (part)
    AppendRaw(OwnText(*part, "extraXml"), root);

  std::ostringstream out;
  out << "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\r\n";
  document.save(out, "", pugi::format_raw | pugi::format_no_declaration);
  return out.str();
}

} // namespace

std::string WriteStylesPart(const StyleSheet& sheet) { return PartWriter(sheet).Write(); }

bool WriteIntoPackage(std::string_view package, const StyleSheet& sheet, std::string& out,
                      Problem& error, const Limits& limits) {
  detail::Package opened;
  detail::PackageParts parts;
  if (!opened.Open(package, limits, error) || !FindParts(opened, parts, error))
    return false;
  if (parts.styles.empty() || !opened.Has(parts.styles)) {
    error = Problem{Text(), Text(), u"the package has no styles part to replace"};
    return false;
  }
  return detail::ReplacePart(package, opened.EntryName(parts.styles), WriteStylesPart(sheet), out,
                             error);
}

} // namespace Word
} // namespace Styles
