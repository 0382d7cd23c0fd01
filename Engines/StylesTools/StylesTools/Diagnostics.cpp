#include <StylesTools/Diagnostics.h>

#include <Internal/MemberPositions.h>
#include <Internal/ParsedDocument.h>
#include <Internal/ToolsSupport.h>
#include <Internal/TreeRef.h>

#include <Styles/Internal/DocumentVersion.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/String.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <memory>
#include <optional>
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
using detail::TreeRef;
using detail::Widen;

namespace {

constexpr char16_t kVersion[] = u"version";
constexpr char16_t kExternalID[] = u"id";
constexpr char16_t kInherits[] = u"inherits";
constexpr char16_t kExternalName[] = u"original";
constexpr std::size_t kNone = ~std::size_t(0);

// The names whose unreadable values a plain import replaces instead of failing.
bool IsRepairedName(std::u16string_view name) {
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
  std::u16string_view name;
  std::size_t index = 0;
  bool isIndex = false; // an array index, not a member name

  Text Spell() const {
    std::vector<const Where*> levels;
    for (const Where* level = this; level; level = level->up)
      levels.push_back(level);
    Text pointer;
    for (auto level = levels.rbegin(); level != levels.rend(); ++level)
      pointer = (*level)->isIndex ? AppendPointer(pointer, (*level)->index)
                                  : AppendPointer(pointer, (*level)->name);
    return pointer;
  }
};

// Checks a document held as a tree (TreeRef) or a compact parse
// (Json::Document::Ref). What it keeps per style is a few words, since a
// document may hold a million styles.
template <class Ref> class Validator {
public:
  Validator(const StyleSheet* target, bool replace)
      : m_manager(GetStyleManager()), m_target(target), m_replace(replace) {}

  std::vector<Diagnostic> Run(const Ref& document) {
    for (const char16_t* name : {kVersion, kExternalID})
      if (m_manager.CategoryExists(name))
        Add(Severity::Error, "reserved-name", Text(u"/") + name,
            u"the registered category " + Quoted(name) +
                u" has the name of a document's own member; its styles cannot be written");
    CheckRepeatedNames(document, nullptr);
    IndexStyles(document);
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
      const Where category{nullptr, document.GetMemberName(style.category)};
      const Where where{&category, NameOf(m_current)};
      CheckStyle(StyleOf(m_current), m_categoryKeys[style.category], where, style.node);
    }
    FindCycles();
    return std::move(m_diagnostics);
  }

private:
  using Index = std::uint32_t;
  static constexpr Index kNoNode = ~Index(0);
  // A style member of a registered category: where it is in the document and
  // the node its name stands for (that of the first style of the name).
  struct DocumentStyle {
    Index category; // the category's member index in the document
    Index member;   // the style's member index in its category
    Index node;
  };
  // A style an "inherits" can name: node i below the number of document
  // styles is that of m_styles[i]; those above are the target's, whose
  // parent edges are resolved on demand.
  struct Node {
    PropertyKey category;
    Index parent = kNoNode;
    Index edgeStyle = kNoNode; // the document style whose "inherits" made the edge
  };
  struct TargetNode {
    const Style* style;
    bool parentKnown;
  };

  void Add(Severity severity, const char* code, const Text& pointer, const Text& message) {
    m_diagnostics.push_back(Diagnostic{severity, code, pointer, message, 0, 0});
  }
  void Add(Severity severity, const char* code, const Where& where, const Text& message) {
    Add(severity, code, where.Spell(), message);
  }

  std::u16string_view NameOf(std::size_t style) const {
    return m_root->GetMember(m_styles[style].category).GetMemberName(m_styles[style].member);
  }
  Ref StyleOf(std::size_t style) const {
    return m_root->GetMember(m_styles[style].category).GetMember(m_styles[style].member);
  }
  bool IsTargetNode(std::size_t node) const { return node >= m_styles.size(); }

  // Lists every style member of a registered category and sorts them by name
  // (letter case ignored): the first style of a name holds its node.
  void IndexStyles(const Ref& document) {
    m_root = document;
    m_categoryKeys.resize(document.GetSize());
    for (std::size_t i = 0; i < document.GetSize(); ++i) {
      const Ref category = document.GetMember(i);
      if (!category.IsObject() || !m_manager.CategoryExists(Text(document.GetMemberName(i))))
        continue;
      m_categoryKeys[i] = PropertyKey(Text(document.GetMemberName(i)));
      for (std::size_t j = 0; j < category.GetSize(); ++j)
        if (category.GetMember(j).IsObject())
          m_styles.push_back(DocumentStyle{Index(i), Index(j), kNoNode});
    }
    m_byName.resize(m_styles.size());
    for (std::size_t k = 0; k < m_byName.size(); ++k)
      m_byName[k] = Index(k);
    const ZelUtils::String::LessThanCaseInsensitive less;
    std::stable_sort(m_byName.begin(), m_byName.end(),
                     [&](Index a, Index b) { return less(NameOf(a), NameOf(b)); });
    for (std::size_t k = 0; k < m_byName.size(); ++k) {
      const bool sameName = k > 0 && !less(NameOf(m_byName[k - 1]), NameOf(m_byName[k]));
      m_styles[m_byName[k]].node = sameName ? m_styles[m_byName[k - 1]].node : m_byName[k];
    }
    m_nodes.resize(m_styles.size());
  }

  void CollectStyles(const Ref& document) {
    std::size_t style = 0; // the next of m_styles
    for (std::size_t i = 0; i < document.GetSize(); ++i) {
      const std::u16string_view name = document.GetMemberName(i);
      const Ref value = document.GetMember(i);
      const Where where{nullptr, name};
      if (!value.IsObject()) {
        CheckSheetMember(name, value, where);
        continue;
      }
      if (!m_manager.CategoryExists(Text(name))) {
        m_unknownSeen = true;
        Add(Severity::Warning, "unknown-category", where,
            u"category " + Quoted(Text(name)) + u" is not registered; its styles are skipped");
        continue;
      }
      m_understood = true;
      const PropertyKey& categoryKey = m_categoryKeys[i];
      CheckReservedProperties(categoryKey, where);
      for (std::size_t j = 0; j < value.GetSize(); ++j) {
        const std::u16string_view styleName = value.GetMemberName(j);
        const Where styleWhere{&where, styleName};
        if (!value.GetMember(j).IsObject()) {
          Add(Severity::Error, "style-not-object", styleWhere,
              u"style " + Quoted(Text(styleName)) + u" must be an object");
          continue;
        }
        AddName(style++, styleWhere, categoryKey);
      }
    }
  }

  // Reports each name that `object` holds more than once; the reading keeps
  // only one of the values. Style names of a category are checked by AddName.
  void CheckRepeatedNames(const Ref& object, const Where* where) {
    const std::size_t size = object.GetSize();
    if (size < 2)
      return;
    const auto report = [&](std::size_t i) {
      const std::u16string_view name = object.GetMemberName(i);
      Add(Severity::Error, "duplicate-member", Where{where, name},
          u"member " + Quoted(Text(name)) +
              u" appears more than once; only one of its values is read");
    };
    if (size <= 16) { // most styles: no set to build
      for (std::size_t i = 1; i < size; ++i)
        for (std::size_t j = 0; j < i; ++j)
          if (object.GetMemberName(i) == object.GetMemberName(j)) {
            report(i);
            break;
          }
      return;
    }
    std::unordered_set<std::u16string_view> seen;
    for (std::size_t i = 0; i < size; ++i)
      if (!seen.insert(object.GetMemberName(i)).second)
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

  void CheckSheetMember(std::u16string_view name, const Ref& value, const Where& where) {
    if (name == kVersion) {
      if (value.IsNumber()) {
        m_documentVersion = Styles::detail::TruncateVersion(value.GetNumber());
        m_versionSeen = true;
      } else {
        Add(Severity::Error, "wrong-kind", where, u"the version must be a number");
      }
    } else if (name == kExternalID) {
      if (!value.IsString())
        Add(Severity::Error, "wrong-kind", where, u"the sheet's id must be a string");
    } else {
      m_unknownSeen = true;
      Add(Severity::Warning, "unknown-member", where,
          u"member " + Quoted(Text(name)) + u" is neither a category, the version nor the id");
    }
  }

  // Gives the document style `style` its node's category, reporting a name
  // used twice.
  void AddName(std::size_t style, const Where& where, const PropertyKey& category) {
    const std::size_t node = m_styles[style].node;
    m_nodes[node].category = category; // the last reading wins
    if (node != style) {
      const Text first(NameOf(node)), name(NameOf(style));
      Add(Severity::Error, "duplicate-name", where,
          first == name
              ? u"style " + Quoted(name) + u" appears twice in the document"
              : u"style " + Quoted(name) + u" differs only in letter case from " + Quoted(first));
      return;
    }
    if (m_target && !m_replace && m_target->GetStyle(Text(NameOf(style))))
      Add(Severity::Warning, "name-taken", where,
          u"the sheet already has a style " + Quoted(Text(NameOf(style))) +
              u"; the document's is not imported");
  }

  // The style a parent name stands for, as the import resolves it.
  std::size_t Resolve(const Text& name) {
    const Style* targetStyle = m_target ? m_target->GetStyle(name) : nullptr;
    const ZelUtils::String::LessThanCaseInsensitive less;
    const auto documentStyle = std::lower_bound(
        m_byName.begin(), m_byName.end(), name.GetView(),
        [&](Index style, std::u16string_view key) { return less(NameOf(style), key); });
    if (documentStyle != m_byName.end() && !less(name.GetView(), NameOf(*documentStyle)) &&
        (!targetStyle || m_replace))
      return m_styles[*documentStyle].node;
    if (!targetStyle)
      return kNone;
    const auto known = m_targetNodes.find(targetStyle);
    if (known != m_targetNodes.end())
      return known->second;
    const std::size_t node = m_nodes.size();
    m_nodes.push_back(Node{targetStyle->GetCategoryName(), kNoNode, kNoNode});
    m_targets.push_back(TargetNode{targetStyle, false});
    m_targetNodes.emplace(targetStyle, node);
    return node;
  }

  std::size_t Parent(std::size_t node) {
    TargetNode& target = m_targets[node - m_styles.size()];
    if (!target.parentKnown) {
      target.parentKnown = true;
      // A target style keeps a parent of the target; one replaced by the
      // document is followed by the document's style of that name.
      const Text parentName = m_target->GetStyleName(target.style->GetParent());
      const std::size_t parentNode = parentName.IsEmpty() ? kNone : Resolve(parentName);
      m_nodes[node].parent = parentNode == kNone ? kNoNode : Index(parentNode);
    }
    return m_nodes[node].parent == kNoNode ? kNone : m_nodes[node].parent;
  }
  void CheckStyle(const Ref& object, const PropertyKey& categoryKey, const Where& where,
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
      const std::u16string_view name = object.GetMemberName(i);
      const Ref value = object.GetMember(i);
      const Where member{&where, name};
      if (name == kInherits) {
        CheckInherits(value, categoryKey, member, node);
      } else if (name == kExternalID || name == kExternalName) {
        if (!value.IsString())
          Add(Severity::Error, "wrong-kind", member, Quoted(Text(name)) + u" must be a string");
      } else {
        const std::optional<PropertyKey> key = PropertyKey::Find(name);
        const BaseStyleProperty* behaviour = key ? (*category)->GetStyleProperty(*key) : nullptr;
        if (!behaviour) {
          Add(Severity::Warning, "unknown-property", member,
              u"property " + Quoted(Text(name)) + u" is not registered in category " +
                  Quoted(categoryKey.GetString()) + u"; it is skipped");
          continue;
        }
        if (behaviour->IsDeprecated())
          Add(Severity::Warning, "deprecated-property", member,
              u"property " + Quoted(Text(name)) + u" is deprecated");
        if (behaviour->GetMinimumVersion() > m_documentVersion)
          Add(Severity::Warning, "property-too-new", member,
              u"property " + Quoted(Text(name)) + u" needs version " +
                  Widen(std::to_string(behaviour->GetMinimumVersion())) +
                  u", newer than the document's");
        CheckValue(*behaviour, name, value, member);
      }
    }
  }

  void CheckInherits(const Ref& value, const PropertyKey& categoryKey, const Where& where,
                     std::size_t node) {
    if (!value.IsString()) {
      Add(Severity::Error, "wrong-kind", where, u"\"inherits\" must be a string");
      return;
    }
    if (value.GetString().empty())
      return;
    const Text written(value.GetString());
    const Text* name = &written;
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
      m_nodes[node].parent = Index(parent);
      m_nodes[node].edgeStyle = Index(m_current);
    }
  }

  void CheckValue(const BaseStyleProperty& behaviour, std::u16string_view name, const Ref& value,
                  const Where& where) {
    if (dynamic_cast<const StyleSetProperty*>(&behaviour)) {
      if (value.IsObject())
        CheckStyle(value, behaviour.GetElementCategoryName(), where, kNone);
      else if (!value.IsNull())
        Add(Severity::Error, "wrong-kind", where,
            u"substyle " + Quoted(Text(name)) + u" must be an object or null");
      return;
    }
    if (dynamic_cast<const StyleArrayProperty*>(&behaviour)) {
      if (!value.IsArray()) {
        Add(Severity::Error, "wrong-kind", where,
            u"array " + Quoted(Text(name)) + u" must be an array of objects");
        return;
      }
      PropertyKey element = behaviour.GetElementCategoryName();
      if (element == PropertyKey::Empty)
        element = behaviour.GetCategoryKey();
      for (std::size_t i = 0; i < value.GetSize(); ++i) {
        const Where elementWhere{&where, std::u16string_view(), i, true};
        if (value.GetElement(i).IsObject())
          CheckStyle(value.GetElement(i), element, elementWhere, kNone);
        else
          Add(Severity::Error, "wrong-kind", elementWhere,
              u"an element of " + Quoted(Text(name)) + u" must be an object");
      }
      return;
    }
    const ZelPref::ConversionPolicy* policy = behaviour.GetConversionPolicy();
    if (!policy)
      return; // nothing a host's own behaviour reads can be checked here
    Text text;
    if (value.IsString()) {
      text = Text(value.GetString());
    } else if (value.IsNumber()) {
      const double number = value.GetNumber();
      // The import reads numbers as "%g" text, which keeps six digits.
      text = Text::FormatInternal("%g", number);
      const std::string ascii(text.begin(), text.end());
      if (std::strtod(ascii.c_str(), nullptr) != number)
        Add(Severity::Warning, "number-rounded", where,
            u"the number is read as " + text + u"; write it as a string to keep every digit");
    } else if (value.IsBool()) {
      text = value.GetBool() ? u"1" : u"0";
    } else {
      Add(Severity::Error, "wrong-kind", where,
          u"property " + Quoted(Text(name)) + u" must be a string, a number or true or false");
      return;
    }
    try {
      const ZelUtils::Any converted = policy->FromText(text);
      if (!behaviour.CheckType(converted))
        Add(Severity::Error, "type-rejected", where,
            Quoted(text) + u" is not an allowed value of " + Quoted(Text(name)));
    } catch (const std::exception&) {
      if (IsRepairedName(name))
        Add(Severity::Warning, "value-replaced", where,
            Quoted(text) + u" cannot be read; the import stores the neutral value instead");
      else
        Add(Severity::Error, "bad-value", where,
            Quoted(text) + u" cannot be read as a value of " + Quoted(Text(name)));
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
        node = IsTargetNode(node)                ? Parent(node)
               : m_nodes[node].parent == kNoNode ? kNone
                                                 : m_nodes[node].parent;
        if (state.size() < m_nodes.size())
          state.resize(m_nodes.size(), 0);
      }
      if (node != kNone && state[node] == 1)
        for (auto it = std::find(walk.begin(), walk.end(), node); it != walk.end(); ++it)
          if (m_nodes[*it].edgeStyle != kNoNode)
            closing.push_back(m_nodes[*it].edgeStyle);
      for (const std::size_t visited : walk)
        state[visited] = 2;
    }
    // In document order, like the other diagnostics.
    std::sort(closing.begin(), closing.end());
    for (const std::size_t edge : closing) {
      const Where category{nullptr, m_root->GetMemberName(m_styles[edge].category)};
      const Where style{&category, NameOf(edge)};
      Add(Severity::Error, "inheritance-cycle", Where{&style, kInherits},
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
  std::optional<Ref> m_root;
  std::vector<PropertyKey> m_categoryKeys; // by member index, for registered categories
  std::vector<DocumentStyle> m_styles;     // in document order
  std::vector<Index> m_byName;             // m_styles sorted by name, letter case ignored
  std::size_t m_current = kNone;           // the document style being checked
  std::vector<Node> m_nodes;
  std::vector<TargetNode> m_targets; // of the nodes after the document's
  std::unordered_map<const Style*, std::size_t> m_targetNodes;
  std::vector<Diagnostic> m_diagnostics;
};

// The "invalid-json" diagnostic of a parse that failed with `errorText`.
Diagnostic InvalidJson(const Text& text, const Text& errorText) {
  Diagnostic diagnostic{Severity::Error, "invalid-json", Text(), u"not JSON: " + errorText, 0, 0};
  std::size_t offset = 0;
  if (ParseErrorOffset(errorText, offset))
    std::tie(diagnostic.line, diagnostic.column) = detail::LinesAndColumns(text, {offset})[0];
  return diagnostic;
}

const Diagnostic kNotAnObject{
    Severity::Error, "not-an-object", Text(), u"a sheet document is a JSON object", 0, 0};

} // namespace

namespace detail {

// Parses `text` into `document`, whose strings stay in `text`; on failure
// `diagnostics` gets why and false is returned.
bool ParseDocument(const Text& text, Json::Document& document,
                   std::vector<Diagnostic>& diagnostics) {
  Text errorText;
  if (!document.ParseBorrowed(text, errorText)) {
    diagnostics.push_back(InvalidJson(text, errorText));
    return false;
  }
  if (!document.GetRoot().IsObject()) {
    diagnostics.push_back(kNotAnObject);
    return false;
  }
  return true;
}

std::vector<Diagnostic> ValidateParsed(const Json::Document& document, const StyleSheet* target,
                                       bool replace) {
  return Validator<Json::Document::Ref>(target, replace).Run(document.GetRoot());
}

} // namespace detail

bool HasErrors(const std::vector<Diagnostic>& diagnostics) {
  return std::any_of(diagnostics.begin(), diagnostics.end(),
                     [](const Diagnostic& d) { return d.severity == Severity::Error; });
}

std::vector<Diagnostic> ValidateDocument(const Text& text) {
  std::vector<Diagnostic> diagnostics;
  Json::Document document;
  if (detail::ParseDocument(text, document, diagnostics)) {
    diagnostics = detail::ValidateParsed(document, nullptr, false);
    if (!diagnostics.empty())
      detail::LocateMembers(text, diagnostics);
  }
  return diagnostics;
}

std::vector<Diagnostic> ValidateDocument(const Json::Object& document, const StyleSheet* target,
                                         bool replace) {
  return Validator<TreeRef>(target, replace).Run(TreeRef(document));
}

void LocateDiagnostics(const Text& text, std::vector<Diagnostic>& diagnostics) {
  detail::LocateMembers(text, diagnostics);
}

} // namespace Tools
} // namespace Styles
