#include <StylesTools/Diagnostics.h>

#include <Internal/MemberPositions.h>
#include <Internal/ToolsSupport.h>

#include <Styles/Internal/DocumentVersion.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/String.h>

#include <algorithm>
#include <cstdlib>
#include <exception>
#include <map>
#include <memory>
#include <string>
#include <tuple>
#include <unordered_map>
#include <unordered_set>
#include <utility>

namespace Styles {
namespace Tools {

using detail::AppendPointer;
using detail::Quoted;
using detail::Text;
using detail::Widen;

namespace {

constexpr char16_t kVersion[] = u"version";
constexpr char16_t kExternalID[] = u"id";
constexpr char16_t kInherits[] = u"inherits";
constexpr char16_t kExternalName[] = u"original";
constexpr std::size_t kNone = ~std::size_t(0);

// The names whose unreadable values a plain import replaces instead of failing.
bool IsRepairedName(const Text& name) {
  return name == u"xScale" || name == u"yScale" || name == u"angle" || name == u"skew";
}

// The offset the parser's message ends with ("... at offset N"), if any.
bool ParseErrorOffset(const Text& message, std::size_t& offset) {
  static constexpr std::u16string_view kMarker = u" at offset ";
  const std::size_t at = message.GetView().rfind(kMarker);
  if (at == std::u16string_view::npos)
    return false;
  std::size_t value = 0;
  std::size_t i = at + kMarker.size();
  if (i == message.GetLength())
    return false;
  for (; i < message.GetLength(); ++i) {
    const char16_t c = message[i];
    if (c < u'0' || c > u'9' || value > (kNone - 9) / 10)
      return false;
    value = value * 10 + static_cast<std::size_t>(c - u'0');
  }
  offset = value;
  return true;
}

// A JSON Pointer that is spelt out only when a diagnostic needs it: each
// level holds its token and the level above, on the stack of the walk.
struct Where {
  const Where* up;
  const Text* name; // the member's name, or null for an array index
  std::size_t index = 0;

  Text Spell() const {
    std::vector<const Where*> levels;
    for (const Where* level = this; level; level = level->up)
      levels.push_back(level);
    Text pointer;
    for (auto level = levels.rbegin(); level != levels.rend(); ++level)
      pointer = (*level)->name ? AppendPointer(pointer, (*level)->name->GetView())
                               : AppendPointer(pointer, (*level)->index);
    return pointer;
  }
};

const Text kInheritsName(kInherits);

class Validator {
public:
  Validator(const StyleSheet* target, bool replace)
      : m_manager(GetStyleManager()), m_target(target), m_replace(replace) {}

  std::vector<Diagnostic> Run(const Json::Object& document) {
    for (const char16_t* name : {kVersion, kExternalID})
      if (m_manager.CategoryExists(name))
        Add(Severity::Error, "reserved-name", Text(u"/") + name,
            u"the registered category " + Quoted(name) +
                u" has the name of a document's own member; its styles cannot be written");
    CheckRepeatedNames(document, nullptr);
    CollectStyles(document);
    if (!m_understood && m_unknownSeen)
      Add(Severity::Error, "nothing-read", Text(),
          u"no member of the document is a registered category; no style would be read");
    const int current = m_manager.GetCurrentVersion();
    if (m_versionSeen && current >= 0 && m_documentVersion > current)
      Add(Severity::Warning, "version-too-new", u"/version",
          u"the document's version " + Widen(std::to_string(m_documentVersion)) +
              u" is newer than the current version " + Widen(std::to_string(current)));
    for (m_current = 0; m_current < m_styles.size(); ++m_current) {
      const DocumentStyle& style = m_styles[m_current];
      const Where category{nullptr, style.categoryName};
      const Where where{&category, style.name};
      CheckStyle(*style.object, style.category, where, style.node);
    }
    FindCycles();
    return std::move(m_diagnostics);
  }

private:
  struct DocumentStyle {
    const Text* categoryName;
    const Text* name;
    PropertyKey category;
    const Json::Object* object;
    std::size_t node;
  };
  // A style an "inherits" can name: one of the document (first member of
  // that name) or of the target. A target style's parent edge is resolved on
  // demand.
  struct Node {
    PropertyKey category;
    const Style* targetStyle = nullptr;
    std::size_t parent = kNone;
    bool parentKnown = false;
    std::size_t edgeStyle = kNone; // the document style whose "inherits" made the edge
  };
  // Case-insensitive names of the document, viewing the parsed text.
  using NameMap =
      std::map<std::u16string_view, std::size_t, ZelUtils::String::LessThanCaseInsensitive>;

  void Add(Severity severity, const char* code, const Text& pointer, const Text& message) {
    m_diagnostics.push_back(Diagnostic{severity, code, pointer, message, 0, 0});
  }
  void Add(Severity severity, const char* code, const Where& where, const Text& message) {
    Add(severity, code, where.Spell(), message);
  }

  void CollectStyles(const Json::Object& document) {
    for (std::size_t i = 0; i < document.GetSize(); ++i) {
      const Text& name = document.GetValueName(i);
      const Json::Value& value = document.GetValue(i);
      const Where where{nullptr, &name};
      const Json::Object* category = value.GetIf<Json::Object>();
      if (!category) {
        CheckSheetMember(name, value, where);
        continue;
      }
      if (!m_manager.CategoryExists(name)) {
        m_unknownSeen = true;
        Add(Severity::Warning, "unknown-category", where,
            u"category " + Quoted(name) + u" is not registered; its styles are skipped");
        continue;
      }
      m_understood = true;
      const PropertyKey categoryKey(name);
      CheckReservedProperties(categoryKey, where);
      m_styles.reserve(m_styles.size() + category->GetSize());
      m_nodes.reserve(m_nodes.size() + category->GetSize());
      for (std::size_t j = 0; j < category->GetSize(); ++j) {
        const Text& styleName = category->GetValueName(j);
        const Where styleWhere{&where, &styleName};
        const Json::Object* object = category->GetValue(j).GetIf<Json::Object>();
        if (!object) {
          Add(Severity::Error, "style-not-object", styleWhere,
              u"style " + Quoted(styleName) + u" must be an object");
          continue;
        }
        m_styles.push_back(DocumentStyle{&name, &styleName, categoryKey, object,
                                         AddName(styleName, styleWhere, categoryKey)});
      }
    }
  }

  // Reports each name that `object` holds more than once; the reading keeps
  // only one of the values. Style names of a category are checked by AddName.
  void CheckRepeatedNames(const Json::Object& object, const Where* where) {
    const std::size_t size = object.GetSize();
    if (size < 2)
      return;
    const auto report = [&](std::size_t i) {
      const Text& name = object.GetValueName(i);
      Add(Severity::Error, "duplicate-member", Where{where, &name},
          u"member " + Quoted(name) + u" appears more than once; only one of its values is read");
    };
    if (size <= 16) { // most styles: no set to build
      for (std::size_t i = 1; i < size; ++i)
        for (std::size_t j = 0; j < i; ++j)
          if (object.GetValueName(i) == object.GetValueName(j)) {
            report(i);
            break;
          }
      return;
    }
    std::unordered_set<std::u16string_view> seen;
    for (std::size_t i = 0; i < size; ++i)
      if (!seen.insert(object.GetValueName(i).GetView()).second)
        report(i);
  }

  // A property whose key is a style's own member can be neither read nor
  // written apart from that member; reported once per category.
  void CheckReservedProperties(const PropertyKey& categoryKey, const Where& where) {
    const std::shared_ptr<StyleCategory>* category = m_manager.FindCategory(categoryKey);
    if (!category || !m_reservedChecked.insert(categoryKey.GetString().GetView()).second)
      return;
    for (const char16_t* name : {kInherits, kExternalID, kExternalName}) {
      const std::optional<PropertyKey> key = PropertyKey::Find(name);
      if (key && (*category)->GetStyleProperty(*key))
        Add(Severity::Error, "reserved-name", where,
            u"category " + Quoted(categoryKey.GetString()) + u" registers a property " +
                Quoted(name) + u", the name of a style's own member");
    }
  }

  void CheckSheetMember(const Text& name, const Json::Value& value, const Where& where) {
    if (name == kVersion) {
      if (const double* number = value.GetIf<double>()) {
        m_documentVersion = Styles::detail::TruncateVersion(*number);
        m_versionSeen = true;
      } else {
        Add(Severity::Error, "wrong-kind", where, u"the version must be a number");
      }
    } else if (name == kExternalID) {
      if (!value.Is<Text>())
        Add(Severity::Error, "wrong-kind", where, u"the sheet's id must be a string");
    } else {
      m_unknownSeen = true;
      Add(Severity::Warning, "unknown-member", where,
          u"member " + Quoted(name) + u" is neither a category, the version nor the id");
    }
  }

  // The node of a document style name, reporting a name used twice.
  std::size_t AddName(const Text& name, const Where& where, const PropertyKey& category) {
    const auto [found, added] = m_documentNames.emplace(name.GetView(), m_nodes.size());
    if (!added) {
      const Text first(found->first);
      Add(Severity::Error, "duplicate-name", where,
          first == name
              ? u"style " + Quoted(name) + u" appears twice in the document"
              : u"style " + Quoted(name) + u" differs only in letter case from " + Quoted(first));
      m_nodes[found->second].category = category; // the last reading wins
      return found->second;
    }
    m_nodes.push_back(Node{category, nullptr, kNone, true, kNone});
    if (m_target && !m_replace && m_target->GetStyle(name))
      Add(Severity::Warning, "name-taken", where,
          u"the sheet already has a style " + Quoted(name) + u"; the document's is not imported");
    return found->second;
  }

  // The style a parent name stands for, as the import resolves it.
  std::size_t Resolve(const Text& name) {
    const Style* targetStyle = m_target ? m_target->GetStyle(name) : nullptr;
    const auto documentNode = m_documentNames.find(name.GetView());
    if (documentNode != m_documentNames.end() && (!targetStyle || m_replace))
      return documentNode->second;
    if (!targetStyle)
      return kNone;
    const auto known = m_targetNodes.find(targetStyle);
    if (known != m_targetNodes.end())
      return known->second;
    const std::size_t node = m_nodes.size();
    m_nodes.push_back(Node{targetStyle->GetCategoryName(), targetStyle, kNone, false, kNone});
    m_targetNodes.emplace(targetStyle, node);
    return node;
  }

  std::size_t Parent(std::size_t node) {
    if (!m_nodes[node].parentKnown) {
      m_nodes[node].parentKnown = true;
      // A target style keeps a parent of the target; one replaced by the
      // document is followed by the document's style of that name.
      const Style* parent = m_nodes[node].targetStyle->GetParent();
      const Text parentName = m_target->GetStyleName(parent);
      const std::size_t parentNode = parentName.IsEmpty() ? kNone : Resolve(parentName);
      m_nodes[node].parent = parentNode;
    }
    return m_nodes[node].parent;
  }

  void CheckStyle(const Json::Object& object, const PropertyKey& categoryKey, const Where& where,
                  std::size_t node) {
    const std::shared_ptr<StyleCategory>* category = m_manager.FindCategory(categoryKey);
    if (!category) {
      Add(Severity::Warning, "unknown-category", where,
          u"category " + Quoted(categoryKey.GetString()) +
              u" is not registered; the substyle is read empty");
      return;
    }
    CheckRepeatedNames(object, &where);
    for (std::size_t i = 0; i < object.GetSize(); ++i) {
      const Text& name = object.GetValueName(i);
      const Json::Value& value = object.GetValue(i);
      const Where member{&where, &name};
      if (name == kInherits) {
        CheckInherits(value, categoryKey, member, node);
      } else if (name == kExternalID || name == kExternalName) {
        if (!value.Is<Text>())
          Add(Severity::Error, "wrong-kind", member, Quoted(name) + u" must be a string");
      } else {
        const std::optional<PropertyKey> key = PropertyKey::Find(name.GetView());
        const BaseStyleProperty* behaviour = key ? (*category)->GetStyleProperty(*key) : nullptr;
        if (!behaviour) {
          Add(Severity::Warning, "unknown-property", member,
              u"property " + Quoted(name) + u" is not registered in category " +
                  Quoted(categoryKey.GetString()) + u"; it is skipped");
          continue;
        }
        if (behaviour->IsDeprecated())
          Add(Severity::Warning, "deprecated-property", member,
              u"property " + Quoted(name) + u" is deprecated");
        if (behaviour->GetMinimumVersion() > m_documentVersion)
          Add(Severity::Warning, "property-too-new", member,
              u"property " + Quoted(name) + u" needs version " +
                  Widen(std::to_string(behaviour->GetMinimumVersion())) +
                  u", newer than the document's");
        CheckValue(*behaviour, name, value, member);
      }
    }
  }

  void CheckInherits(const Json::Value& value, const PropertyKey& categoryKey, const Where& where,
                     std::size_t node) {
    const Text* name = value.GetIf<Text>();
    if (!name) {
      Add(Severity::Error, "wrong-kind", where, u"\"inherits\" must be a string");
      return;
    }
    if (name->IsEmpty())
      return;
    const WImportStyleInfo& info = m_manager.GetImportStyleInfo();
    if (!info.names.empty() && info.names.count(*name))
      return; // the host asked for this name to be left alone
    const auto renamed = info.renames.empty() ? info.renames.end() : info.renames.find(*name);
    const Text& parentName = renamed != info.renames.end() ? renamed->second : *name;
    const std::size_t parent = Resolve(parentName);
    if (parent == kNone) {
      Add(Severity::Error, "missing-parent", where,
          u"no style " + Quoted(parentName) + u" to inherit from");
      return;
    }
    if (m_nodes[parent].category != categoryKey)
      Add(Severity::Error, "parent-category", where,
          u"parent " + Quoted(parentName) + u" is of category " +
              Quoted(m_nodes[parent].category.GetString()) + u", not " +
              Quoted(categoryKey.GetString()));
    if (node != kNone) {
      m_nodes[node].parent = parent;
      m_nodes[node].edgeStyle = m_current;
    }
  }

  void CheckValue(const BaseStyleProperty& behaviour, const Text& name, const Json::Value& value,
                  const Where& where) {
    if (dynamic_cast<const StyleSetProperty*>(&behaviour)) {
      if (const Json::Object* object = value.GetIf<Json::Object>())
        CheckStyle(*object, behaviour.GetElementCategoryName(), where, kNone);
      else if (!value.IsNull())
        Add(Severity::Error, "wrong-kind", where,
            u"substyle " + Quoted(name) + u" must be an object or null");
      return;
    }
    if (dynamic_cast<const StyleArrayProperty*>(&behaviour)) {
      const Json::Array* array = value.GetIf<Json::Array>();
      if (!array) {
        Add(Severity::Error, "wrong-kind", where,
            u"array " + Quoted(name) + u" must be an array of objects");
        return;
      }
      PropertyKey element = behaviour.GetElementCategoryName();
      if (element == PropertyKey::Empty)
        element = behaviour.GetCategoryKey();
      for (std::size_t i = 0; i < array->GetSize(); ++i) {
        const Where elementWhere{&where, nullptr, i};
        if (const Json::Object* object = array->GetValue(i).GetIf<Json::Object>())
          CheckStyle(*object, element, elementWhere, kNone);
        else
          Add(Severity::Error, "wrong-kind", elementWhere,
              u"an element of " + Quoted(name) + u" must be an object");
      }
      return;
    }
    const ZelPref::ConversionPolicy* policy = behaviour.GetConversionPolicy();
    if (!policy)
      return; // nothing a host's own behaviour reads can be checked here
    Text text;
    if (const Text* string = value.GetIf<Text>()) {
      text = *string;
    } else if (const double* number = value.GetIf<double>()) {
      // The import reads numbers as "%g" text, which keeps six digits.
      text = Text::FormatInternal("%g", *number);
      const std::string ascii(text.begin(), text.end());
      if (std::strtod(ascii.c_str(), nullptr) != *number)
        Add(Severity::Warning, "number-rounded", where,
            u"the number is read as " + text + u"; write it as a string to keep every digit");
    } else if (const bool* flag = value.GetIf<bool>()) {
      text = *flag ? u"1" : u"0";
    } else {
      Add(Severity::Error, "wrong-kind", where,
          u"property " + Quoted(name) + u" must be a string, a number or true or false");
      return;
    }
    try {
      const ZelUtils::Any converted = policy->FromText(text);
      if (!behaviour.CheckType(converted))
        Add(Severity::Error, "type-rejected", where,
            Quoted(text) + u" is not an allowed value of " + Quoted(name));
    } catch (const std::exception&) {
      if (IsRepairedName(name))
        Add(Severity::Warning, "value-replaced", where,
            Quoted(text) + u" cannot be read; the import stores the neutral value instead");
      else
        Add(Severity::Error, "bad-value", where,
            Quoted(text) + u" cannot be read as a value of " + Quoted(name));
    }
  }

  // Reports every "inherits" that closes a parent cycle. Each style has one
  // parent, so one walk per style that stops at styles already seen finds
  // every cycle in linear time.
  void FindCycles() {
    std::vector<unsigned char> state(m_nodes.size(), 0); // 0 new, 1 on the walk, 2 done
    std::vector<std::size_t> walk, closing;
    for (std::size_t start = 0; start < m_nodes.size(); ++start) {
      walk.clear();
      std::size_t node = start;
      while (node != kNone && state[node] == 0) {
        state[node] = 1;
        walk.push_back(node);
        node = m_nodes[node].targetStyle ? Parent(node) : m_nodes[node].parent;
        if (state.size() < m_nodes.size())
          state.resize(m_nodes.size(), 0);
      }
      if (node != kNone && state[node] == 1)
        for (auto it = std::find(walk.begin(), walk.end(), node); it != walk.end(); ++it)
          if (m_nodes[*it].edgeStyle != kNone)
            closing.push_back(m_nodes[*it].edgeStyle);
      for (const std::size_t visited : walk)
        state[visited] = 2;
    }
    // In document order, like the other diagnostics.
    std::sort(closing.begin(), closing.end());
    for (const std::size_t edge : closing) {
      const Where category{nullptr, m_styles[edge].categoryName};
      const Where style{&category, m_styles[edge].name};
      Add(Severity::Error, "inheritance-cycle", Where{&style, &kInheritsName},
          u"this parent would make the style inherit from itself; the import ignores it");
    }
  }

  StyleManager& m_manager;
  const StyleSheet* m_target;
  bool m_replace;
  int m_documentVersion = 0;
  bool m_versionSeen = false;
  bool m_understood = false;  // some member is a registered category
  bool m_unknownSeen = false; // some member is an unknown category or member
  std::unordered_set<std::u16string_view> m_reservedChecked;
  std::vector<DocumentStyle> m_styles;
  std::size_t m_current = kNone; // the document style being checked
  std::vector<Node> m_nodes;
  NameMap m_documentNames;
  std::unordered_map<const Style*, std::size_t> m_targetNodes;
  std::vector<Diagnostic> m_diagnostics;
};

// Parses `text`; on failure `diagnostics` gets why and null is returned.
Json::Object* ParseDocument(const Text& text, Json::Value& value,
                            std::vector<Diagnostic>& diagnostics) {
  Text errorText;
  if (!Json::Parse(text, value, errorText)) {
    Diagnostic diagnostic{Severity::Error, "invalid-json", Text(), u"not JSON: " + errorText, 0, 0};
    std::size_t offset = 0;
    if (ParseErrorOffset(errorText, offset))
      std::tie(diagnostic.line, diagnostic.column) = detail::LinesAndColumns(text, {offset})[0];
    diagnostics.push_back(std::move(diagnostic));
    return nullptr;
  }
  Json::Object* document = value.GetIf<Json::Object>();
  if (!document)
    diagnostics.push_back(Diagnostic{Severity::Error, "not-an-object", Text(),
                                     u"a sheet document is a JSON object", 0, 0});
  return document;
}

// Marks the stand-ins of target styles in the scratch sheet. No document can
// give a style this external name: JSON text cannot hold an unpaired surrogate.
const Text& StandInMark() {
  static const Text mark(std::u16string(1, char16_t(0xD800)) + u"stand-in");
  return mark;
}

// ImportChecked on a parsed document; with `release`, the document is let go
// as soon as the scratch sheet has read it, so that its tree is not held
// beside both sheets while the new styles move into the target.
bool ImportParsed(StyleSheet& target, Json::Object& document, bool replace,
                  std::vector<Diagnostic>* diagnostics, bool release) {
  std::vector<Diagnostic> found;
  const auto finish = [&](bool imported) {
    if (diagnostics)
      *diagnostics = std::move(found);
    return imported;
  };
  found = ValidateDocument(document, &target, replace);
  if (HasErrors(found))
    return finish(false);

  // The scratch sheet starts as an image of the target: one empty stand-in
  // per target style, under its name and category, linked as the originals.
  StyleSheet scratch;
  scratch.SetVersion(target.GetVersion());
  scratch.SetExternalID(target.GetExternalID());
  std::unordered_map<const Style*, Style*> standIns;
  std::unordered_set<const Style*> standInSet;
  for (const Text& name : target.GetStyleNames()) {
    const Style* original = target.GetStyle(name);
    Style* standIn =
        new Style(nullptr, original ? original->GetCategoryName() : PropertyKey::Empty);
    standIn->SetExternalName(StandInMark());
    standIns.emplace(original, standIn);
    standInSet.insert(standIn);
    scratch.AddStyle(name, standIn, false);
  }
  for (const auto& [original, standIn] : standIns)
    if (original && original->GetParent()) {
      const auto parent = standIns.find(original->GetParent());
      if (parent != standIns.end())
        standIn->SetParent(parent->second);
    }

  try {
    scratch.ImportJson(&document, replace);
  } catch (const std::exception& error) {
    found.push_back(Diagnostic{
        Severity::Error, "behaviour-failed", Text(),
        u"reading the document failed (" + Widen(error.what()) + u"); nothing was imported", 0, 0});
    return finish(false);
  } catch (...) {
    found.push_back(Diagnostic{Severity::Error, "behaviour-failed", Text(),
                               u"reading the document failed; nothing was imported", 0, 0});
    return finish(false);
  }
  if (release)
    document = Json::Object();

  // Stand-ins still in the scratch sheet map back to their originals; the
  // other styles are the import's. A replaced stand-in was destroyed, and its
  // address may have been reused by a new style, hence the mark.
  std::map<Style*, Style*> toOriginals;
  std::vector<std::pair<Text, Style*>> created;
  {
    std::vector<Text> names = scratch.GetStyleNames();
    const std::vector<Style*> styles = scratch.GetStyles(); // the same order
    for (std::size_t i = 0; i < names.size(); ++i) {
      Style* style = styles[i];
      if (style && standInSet.count(style) && style->GetExternalName() == StandInMark())
        toOriginals.emplace(style, target.GetStyle(names[i]));
      else
        created.emplace_back(std::move(names[i]), style);
    }
  }
  for (auto& [name, style] : created) {
    scratch.RemoveStyle(style);
    if (style && !toOriginals.empty())
      style->RemapDependency(toOriginals);
  }

  // Into the target, as the import's first pass would file them: a replaced
  // style leaves, and every target style that referred to it refers to its
  // successor.
  std::map<Style*, Style*> successors;
  for (auto& [name, style] : created) {
    if (replace)
      if (Style* previous = target.RemoveStyle(name))
        successors.emplace(previous, style);
    target.AddStyle(name, style, false);
  }
  if (!successors.empty()) {
    std::unordered_set<const Style*> createdSet;
    for (const auto& entry : created)
      createdSet.insert(entry.second);
    for (Style* style : target.GetStyles())
      if (style && !createdSet.count(style))
        style->RemapDependency(successors);
    for (const auto& entry : successors)
      delete entry.first;
  }
  target.SetVersion(scratch.GetVersion());
  target.SetExternalID(scratch.GetExternalID());
  return finish(true);
}

} // namespace

bool HasErrors(const std::vector<Diagnostic>& diagnostics) {
  return std::any_of(diagnostics.begin(), diagnostics.end(),
                     [](const Diagnostic& d) { return d.severity == Severity::Error; });
}

std::vector<Diagnostic> ValidateDocument(const Text& text) {
  std::vector<Diagnostic> diagnostics;
  Json::Value value;
  if (const Json::Object* document = ParseDocument(text, value, diagnostics)) {
    diagnostics = ValidateDocument(*document);
    detail::LocateMembers(text, diagnostics);
  }
  return diagnostics;
}

std::vector<Diagnostic> ValidateDocument(const Json::Object& document, const StyleSheet* target,
                                         bool replace) {
  return Validator(target, replace).Run(document);
}

void LocateDiagnostics(const Text& text, std::vector<Diagnostic>& diagnostics) {
  detail::LocateMembers(text, diagnostics);
}

bool ImportChecked(StyleSheet& target, const Text& text, bool replace,
                   std::vector<Diagnostic>* diagnostics) {
  std::vector<Diagnostic> found;
  Json::Value value;
  if (Json::Object* document = ParseDocument(text, value, found)) {
    const bool imported = ImportChecked(target, std::move(*document), replace, diagnostics);
    if (diagnostics)
      detail::LocateMembers(text, *diagnostics);
    return imported;
  }
  if (diagnostics)
    *diagnostics = std::move(found);
  return false;
}

bool ImportChecked(StyleSheet& target, Json::Object& document, bool replace,
                   std::vector<Diagnostic>* diagnostics) {
  return ImportParsed(target, document, replace, diagnostics, false);
}

bool ImportChecked(StyleSheet& target, Json::Object&& document, bool replace,
                   std::vector<Diagnostic>* diagnostics) {
  return ImportParsed(target, document, replace, diagnostics, true);
}

} // namespace Tools
} // namespace Styles
