#include <Styles/StyleSheet.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>

#include <Json/Json.h>
#include <ZelUtils/TextStream.h>

#include <algorithm>
#include <cassert>
#include <climits>
#include <cmath>
#include <cstdint>
#include <iterator>
#include <memory>
#include <unordered_map>
#include <utility>

namespace Styles {

namespace {

// Member names of the document object.
constexpr char16_t k_strVersion[] = u"version";
constexpr char16_t k_strExternalID[] = u"id";

// The byte encoding of documents in streams, the same both ways.
constexpr ZelUtils::TextStream::Encoding kDocumentEncoding = ZelUtils::TextStream::UTF8;

bool NameEquals(const ZelStringT<char16_t>& name, const char16_t* fixed) {
  return name.Compare(fixed, 0) == 0;
}

// A document number truncated toward zero into an int; values beyond the
// range of int are clamped so that no input makes the conversion undefined.
int TruncateVersion(double number) {
  if (std::isnan(number))
    return 0;
  const double truncated = std::trunc(number);
  if (truncated <= static_cast<double>(INT_MIN))
    return INT_MIN;
  if (truncated >= static_cast<double>(INT_MAX))
    return INT_MAX;
  return static_cast<int>(truncated);
}

} // namespace

namespace detail {

// The parent links of the styles an import touches, as a forest whose paths
// are kept in splay trees (a link-cut forest), so that whether a new link
// would close a cycle takes amortised logarithmic time, and constant time for
// the shapes real documents have, however long their chains. A style enters
// the forest, with its whole chain, the first time it is to be a parent; a
// child that is not in it cannot be an ancestor of anything and is linked at
// once. The forest stays exact as long as parent links change only through
// it while the import runs.
class ParentForest {
public:
  // Whether `child` may inherit from `parent` (false when `child` is `parent`
  // or one of its ancestors); when it may, the new link is recorded.
  bool Link(const Style* child, const Style* parent) {
    if (child == parent)
      return false;
    const std::uint32_t above = Load(parent);
    const std::uint32_t node = Find(child);
    if (node == kNone)
      return true;
    Cut(node);
    if (FindRoot(above) == node) {
      if (const Style* current = child->GetParent())
        Attach(node, Find(current));
      return false;
    }
    Attach(node, above);
    return true;
  }

private:
  static constexpr std::uint32_t kNone = ~std::uint32_t(0);
  struct Node {
    std::uint32_t child[2] = {kNone, kNone};
    std::uint32_t up = kNone; // parent in the splay tree, else the path's parent
  };

  std::uint32_t Find(const Style* style) const {
    const auto found = m_index.find(style);
    return found == m_index.end() ? kNone : found->second;
  }
  // The node of `style`, made with those of its ancestors when missing.
  std::uint32_t Load(const Style* style) {
    std::uint32_t above = Find(style);
    if (above != kNone)
      return above;
    m_chain.clear();
    for (const Style* ancestor = style; ancestor; ancestor = ancestor->GetParent()) {
      if ((above = Find(ancestor)) != kNone)
        break;
      m_chain.push_back(ancestor);
    }
    for (auto it = m_chain.rbegin(); it != m_chain.rend(); ++it) {
      const auto node = static_cast<std::uint32_t>(m_nodes.size());
      m_nodes.emplace_back();
      m_index.emplace(*it, node);
      if (above != kNone)
        Attach(node, above);
      above = node;
    }
    return above;
  }
  bool IsSplayRoot(std::uint32_t x) const {
    const std::uint32_t up = m_nodes[x].up;
    return up == kNone || (m_nodes[up].child[0] != x && m_nodes[up].child[1] != x);
  }
  void Rotate(std::uint32_t x) {
    const std::uint32_t y = m_nodes[x].up;
    const std::uint32_t z = m_nodes[y].up;
    const int side = m_nodes[y].child[1] == x ? 1 : 0;
    if (!IsSplayRoot(y))
      m_nodes[z].child[m_nodes[z].child[1] == y ? 1 : 0] = x;
    m_nodes[x].up = z;
    const std::uint32_t moved = m_nodes[x].child[1 - side];
    m_nodes[y].child[side] = moved;
    if (moved != kNone)
      m_nodes[moved].up = y;
    m_nodes[x].child[1 - side] = y;
    m_nodes[y].up = x;
  }
  void Splay(std::uint32_t x) {
    while (!IsSplayRoot(x)) {
      const std::uint32_t y = m_nodes[x].up;
      if (!IsSplayRoot(y)) {
        const std::uint32_t z = m_nodes[y].up;
        const bool sameSide = (m_nodes[z].child[0] == y) == (m_nodes[y].child[0] == x);
        Rotate(sameSide ? y : x);
      }
      Rotate(x);
    }
  }
  // Makes the path from x's root down to x one splay tree, rooted at x.
  void Access(std::uint32_t x) {
    std::uint32_t below = kNone;
    for (std::uint32_t y = x; y != kNone; y = m_nodes[y].up) {
      Splay(y);
      m_nodes[y].child[1] = below;
      below = y;
    }
    Splay(x);
  }
  std::uint32_t FindRoot(std::uint32_t x) {
    Access(x);
    while (m_nodes[x].child[0] != kNone)
      x = m_nodes[x].child[0];
    Splay(x);
    return x;
  }
  // Links the root x below `parent`.
  void Attach(std::uint32_t x, std::uint32_t parent) {
    Access(x);
    m_nodes[x].up = parent;
  }
  // Cuts x from its parent, if it has one.
  void Cut(std::uint32_t x) {
    Access(x);
    const std::uint32_t above = m_nodes[x].child[0];
    if (above != kNone) {
      m_nodes[above].up = kNone;
      m_nodes[x].child[0] = kNone;
    }
  }

  std::vector<Node> m_nodes;
  std::unordered_map<const Style*, std::uint32_t> m_index;
  std::vector<const Style*> m_chain; // scratch of Load
};

} // namespace detail

IStyleSheetDuplicationContext::~IStyleSheetDuplicationContext() = default;

StyleSheet::StyleSheet()
    : m_styles(new NameIndex), m_names(new PointerIndex),
      m_version(GetStyleManager().GetCurrentVersion()) {}

StyleSheet::~StyleSheet() { Clear(); }

ZelStringT<char16_t> StyleSheet::GetExternalID() const { return m_externalID; }

void StyleSheet::SetExternalID(const ZelStringT<char16_t>& id) { m_externalID = id; }

void StyleSheet::Clear() {
  m_version = GetStyleManager().GetCurrentVersion();
  NameIndex styles;
  styles.swap(*m_styles);
  PointerIndex names;
  names.swap(*m_names);
  for (auto& entry : styles) {
    names.erase(entry.second);
    delete entry.second;
  }
  // Styles known only by pointer (MergeIn dropped their names) are the
  // sheet's too.
  for (auto& entry : names)
    delete entry.first;
}

Style* StyleSheet::AddStyle(const ZelStringT<char16_t>& name, Style* style, bool replace) {
  if (style) {
    const auto filedAs = m_names->find(style);
    if (filedAs != m_names->end()) {
      const auto found = m_styles->find(name);
      if (found != m_styles->end() && found->second == style) {
        // Already filed under this name: destroying or handing it back would
        // leave the sheet listing a style it no longer has.
        if (replace) {
          const ZelStringT<char16_t> current = found->first;
          RenameStyle(current, name);
        }
        return nullptr;
      }
      // Filed under another name: it leaves that one, so that the sheet never
      // lists one style twice.
      DetachByPointerEntry(filedAs);
    }
  }
  Style* previous = nullptr;
  const auto [entry, filed] = FileStyle(name, style, replace, previous);
  if (!filed) {
    // The style already in the sheet wins; whatever referred to the offered
    // one follows the name.
    if (style) {
      Redirect({{style, entry->second}});
      delete style;
    }
    return nullptr;
  }
  if (previous)
    Redirect({{previous, style}});
  return previous;
}

std::pair<StyleSheet::NameIndex::iterator, bool>
StyleSheet::FileStyle(const ZelStringT<char16_t>& name, Style* style, bool replace,
                      Style*& previous) {
  previous = nullptr;
  const auto found = m_styles->lower_bound(name);
  const bool present = found != m_styles->end() && !m_styles->key_comp()(name, found->first);
  if (present && !replace)
    return {found, false};
  Style* const removed = present ? found->second : nullptr;
  NameIndex::iterator filed;
  try {
    // Everything that allocates comes before the first change, so that a
    // failure leaves both indexes as they were.
    ZelStringT<char16_t> key = name;
    ZelStringT<char16_t> spelling = name;
    const auto [pointerEntry, newPointerEntry] = m_names->try_emplace(style);
    if (present) {
      // Replacing: the entry is taken out and put back under the caller's
      // spelling, which is what removing and adding again amounts to.
      const auto next = std::next(found);
      auto node = m_styles->extract(found);
      node.key() = std::move(key);
      node.mapped() = style;
      filed = m_styles->insert(next, std::move(node));
      if (removed != style)
        m_names->erase(removed);
    } else {
      try {
        filed = m_styles->emplace_hint(found, std::move(key), style);
      } catch (...) {
        if (newPointerEntry)
          m_names->erase(pointerEntry);
        throw;
      }
    }
    pointerEntry->second = std::move(spelling);
  } catch (...) {
    // The sheet owns the offered style even when it could not be filed.
    if (style != removed)
      delete style;
    throw;
  }
  previous = removed;
  return {filed, true};
}

void StyleSheet::Redirect(const std::map<Style*, Style*>& heirs) {
  if (heirs.empty())
    return;
  // Styles that an heir is or inherits from cannot take it as parent without
  // a cycle, and nothing can take a null heir: those take over the old
  // style's values instead, as DeleteStyles would do.
  std::vector<Style*> olds, heirLines;
  for (const auto& [old, heir] : heirs) {
    olds.push_back(old);
    for (Style* style = heir; style; style = style->GetParent())
      heirLines.push_back(style);
  }
  std::sort(heirLines.begin(), heirLines.end());
  const StyleSpan doomed(olds, true);
  const bool anyNull = std::any_of(heirs.begin(), heirs.end(),
                                   [](const auto& pair) { return pair.second == nullptr; });
  for (auto& entry : *m_styles) {
    Style* style = entry.second;
    if (!style)
      continue;
    if (anyNull || std::binary_search(heirLines.begin(), heirLines.end(), style))
      style->RemoveDependency(doomed, true);
    else
      style->RemapDependency(heirs);
  }
}

bool StyleSheet::AcceptParent(Style& child, Style& parent) const {
  if (m_import)
    return m_import->Link(&child, &parent);
  return !child.IsAncestorOrSelf(&parent);
}

Style* StyleSheet::RemoveStyle(const ZelStringT<char16_t>& name) {
  const auto found = m_styles->find(name);
  if (found == m_styles->end())
    return nullptr;
  Style* style = found->second;
  m_names->erase(style);
  m_styles->erase(found);
  return style;
}

Style* StyleSheet::DetachByPointerEntry(PointerIndex::iterator entry) {
  Style* style = const_cast<Style*>(entry->first);
  const auto found = m_styles->find(entry->second);
  if (found != m_styles->end() && found->second == style)
    m_styles->erase(found);
  m_names->erase(entry);
  return style;
}

bool StyleSheet::RemoveStyle(Style* style) {
  if (!style)
    return false;
  const auto found = m_names->find(style);
  if (found == m_names->end())
    return false;
  DetachByPointerEntry(found);
  return true;
}

void StyleSheet::DeleteStyles(StyleSpan styles) {
  // Every style drops its references first, the doomed ones included, so
  // that no surviving style is left pointing at a destroyed one.
  std::vector<Style*> storage;
  const StyleSpan doomed = ZelUtils::MakeSearchable(styles, storage);
  for (auto& entry : *m_styles)
    if (entry.second)
      entry.second->RemoveDependency(doomed, true);
  for (Style* style : styles) {
    if (!style)
      continue;
    const auto found = m_names->find(style);
    if (found == m_names->end())
      continue; // foreign styles are left to their owner
    delete DetachByPointerEntry(found);
  }
}

void StyleSheet::RenameStyle(const ZelStringT<char16_t>& oldName,
                             const ZelStringT<char16_t>& newName) {
  if (oldName.CompareNoCase(newName) != 0 && m_styles->count(newName) != 0)
    return;
  const auto found = m_styles->find(oldName);
  if (found == m_styles->end())
    return;
  // Allocations first, so that a failure leaves both indexes as they were.
  ZelStringT<char16_t> nameKey = newName;
  ZelStringT<char16_t> nameValue = newName;
  const auto pointerEntry = m_names->try_emplace(found->second).first;
  auto node = m_styles->extract(found);
  node.key() = std::move(nameKey);
  m_styles->insert(std::move(node));
  pointerEntry->second = std::move(nameValue);
}

void StyleSheet::MergeIn(StyleSheet& other, bool replace) {
  // Walks this sheet's own index, not `other`'s: a long-standing behaviour
  // hosts rely on, kept as it is. Each style goes back into this sheet and
  // whatever AddStyle hands back is destroyed. A snapshot keeps the walk
  // valid while AddStyle changes the index.
  const std::vector<std::pair<ZelStringT<char16_t>, Style*>> own(m_styles->begin(),
                                                                 m_styles->end());
  for (const auto& entry : own)
    delete AddStyle(entry.first, entry.second, replace);
  other.m_styles->clear();
}

Style* StyleSheet::GetStyle(const ZelStringT<char16_t>& name) const {
  const auto found = m_styles->find(name);
  return found == m_styles->end() ? nullptr : found->second;
}

std::vector<Style*> StyleSheet::GetStyles() const {
  std::vector<Style*> styles;
  styles.reserve(m_styles->size());
  for (const auto& entry : *m_styles)
    styles.push_back(entry.second);
  return styles;
}

std::vector<Style*>
StyleSheet::GetStylesByName(const std::vector<ZelStringT<char16_t>>& names) const {
  std::vector<Style*> styles;
  styles.reserve(names.size());
  for (const ZelStringT<char16_t>& name : names)
    if (Style* style = GetStyle(name))
      styles.push_back(style);
  return styles;
}

std::vector<Style*> StyleSheet::GetStylesByCategory(const PropertyKey& category) const {
  std::vector<Style*> styles;
  for (const auto& entry : *m_styles)
    if (entry.second && entry.second->GetCategoryName() == category)
      styles.push_back(entry.second);
  return styles;
}

ZelStringT<char16_t> StyleSheet::GetStyleName(const Style* style) const {
  if (!style)
    return ZelStringT<char16_t>();
  const auto found = m_names->find(style);
  return found == m_names->end() ? ZelStringT<char16_t>() : found->second;
}

std::vector<ZelStringT<char16_t>> StyleSheet::GetStyleNames() const {
  std::vector<ZelStringT<char16_t>> names;
  names.reserve(m_styles->size());
  for (const auto& entry : *m_styles)
    names.push_back(entry.first);
  return names;
}

std::vector<ZelStringT<char16_t>> StyleSheet::GetStyleNames(const PropertyKey& category) const {
  std::vector<ZelStringT<char16_t>> names;
  for (const auto& entry : *m_styles)
    if (entry.second && entry.second->GetCategoryName() == category)
      names.push_back(entry.first);
  return names;
}

StyleSheet::NameIndex StyleSheet::GetChildStyles(const Style* parent) const {
  NameIndex children;
  if (!parent)
    return children;
  for (const auto& entry : *m_styles)
    if (entry.second && entry.second->GetParent() == parent)
      children.emplace_hint(children.end(), entry.first, entry.second);
  return children;
}

void StyleSheet::GenerateCategoryStyleMap(CategoryStyleMap& out) const {
  out.clear();
  for (const auto& entry : *m_styles) {
    if (!entry.second)
      continue;
    NameIndex& styles = out[entry.second->GetCategoryName()];
    styles.emplace_hint(styles.end(), entry.first, entry.second);
  }
}

void StyleSheet::GetDependencies(StyleSpan styles, std::vector<Style*>& out) const {
  Style::AppendDependents(GetStyles(), styles, out);
}

Style* StyleSheet::GetExternalStyleAlias(const ZelStringT<char16_t>& externalID,
                                         const ZelStringT<char16_t>& externalName) const {
  if (externalID.IsEmpty() || externalName.IsEmpty())
    return nullptr;
  for (const auto& entry : *m_styles) {
    const Style* style = entry.second;
    if (style && style->GetExternalID().Compare(externalID, 0) == 0 &&
        style->GetExternalName().Compare(externalName, 0) == 0)
      return entry.second;
  }
  return nullptr;
}

ZelStringT<char16_t> StyleSheet::GetUnusedStyleName(const ZelStringT<char16_t>& proposed) const {
  ZelStringT<char16_t> candidate = proposed;
  StyleManager& manager = GetStyleManager();
  if (manager.CategoryExists(proposed)) {
    // A category's key is not a good style name; start from its UI name.
    const PropertyKey key(proposed);
    candidate = manager.GetCategory(key)->GetUIName() + u" 1";
  }
  return ZelUtils::String::FindUnusedName(candidate, [this](const ZelStringT<char16_t>& name) {
    return m_styles->find(name) != m_styles->end();
  });
}

void StyleSheet::CopyContentsFrom(const StyleSheet& source,
                                  IStyleSheetDuplicationContext* context) {
  Clear();
  ZelStringT<char16_t> text;
  source.ExportToString(text, true);
  ImportFromString(text, true);
  if (context)
    for (const auto& entry : *m_styles)
      context->OnStyleDuplicated(entry.second, 0);
  m_version = source.m_version;
}

void StyleSheet::ExportJson(JsonValue& out, bool includeTemporary) const {
  Json::Object& document = out.Get<Json::Object>();
  CategoryStyleMap categories;
  GenerateCategoryStyleMap(categories);
  if (m_version > 0)
    document.AddValue(k_strVersion, Json::Value(m_version));
  if (!m_externalID.IsEmpty())
    document.AddValue(k_strExternalID, Json::Value(m_externalID));
  for (const auto& category : categories) {
    Json::Object styles;
    styles.Reserve(category.second.size());
    for (const auto& [name, style] : category.second) {
      Json::Value json;
      style->Serialize(*this, json, includeTemporary);
      styles.AddValue(name, std::move(json));
    }
    document.AddValue(category.first.GetString(), Json::Value(std::move(styles)));
  }
}

namespace {

// Points the sheet's import bookkeeping at a forest for as long as it lives.
class ImportScope {
public:
  explicit ImportScope(detail::ParentForest*& slot) : m_slot(slot), m_previous(slot) {
    slot = &m_forest;
  }
  ~ImportScope() { m_slot = m_previous; }
  ImportScope(const ImportScope&) = delete;
  ImportScope& operator=(const ImportScope&) = delete;

private:
  detail::ParentForest m_forest;
  detail::ParentForest*& m_slot;
  detail::ParentForest* m_previous;
};

} // namespace

bool StyleSheet::ImportJson(Json::Object* document, bool replace) {
  assert(document && "ImportJson needs a document");
  if (!document)
    return false;
  StyleManager& manager = GetStyleManager();
  // Styles made by this import, sorted after the first pass; only they are
  // read, so styles that were in the sheet before are never read into.
  std::vector<const Style*> created;
  // The name-index entry filed under each style member's name, in document
  // order. Import never erases an entry (a replacement re-files it), so the
  // second pass reads each entry instead of searching for the name again.
  std::vector<const NameIndex::value_type*> filed;
  // Styles that replacements took out of the sheet, with the entry of the
  // name each held. They are destroyed after the first pass, once every style
  // that referred to one refers to the style holding its name at that time.
  std::vector<std::pair<Style*, const NameIndex::value_type*>> replaced;
  const auto repairReplaced = [this, &replaced] {
    std::map<Style*, Style*> heirs;
    for (const auto& [old, entry] : replaced)
      heirs[old] = entry->second;
    Redirect(heirs);
    for (const auto& old : replaced)
      delete old.first;
    replaced.clear();
  };
  bool versionSeen = false;

  // The members are gone through twice. The first pass makes an empty style
  // for every name, so that every reference resolves when the second pass
  // reads the styles; the version and the ID are applied in both.
  const std::size_t memberCount = document->GetSize();
  const auto applySheetMember = [&](const ZelStringT<char16_t>& name, const Json::Value& value) {
    if (const double* number = value.GetIf<double>()) {
      if (NameEquals(name, k_strVersion)) {
        m_version = TruncateVersion(*number);
        versionSeen = true;
      }
    } else if (const ZelStringT<char16_t>* text = value.GetIf<ZelStringT<char16_t>>()) {
      // The document's ID is taken only by a sheet that already has one.
      if (NameEquals(name, k_strExternalID) && !m_externalID.IsEmpty())
        m_externalID = *text;
    }
  };

  try {
    for (std::size_t i = 0; i < memberCount; ++i) {
      const ZelStringT<char16_t>& name = document->GetValueName(i);
      const Json::Value& value = document->GetValue(i);
      const Json::Object* category = value.GetIf<Json::Object>();
      if (!category) {
        applySheetMember(name, value);
        continue;
      }
      if (!manager.CategoryExists(name))
        continue;
      for (std::size_t j = 0; j < category->GetSize(); ++j) {
        category->GetValue(j).Get<Json::Object>(); // std::bad_cast for a non-object
        std::unique_ptr<Style> style(new Style);
        created.push_back(style.get());
        Style* previous = nullptr;
        const auto [entry, isFiled] =
            FileStyle(category->GetValueName(j), style.get(), replace, previous);
        if (isFiled)
          style.release();
        if (previous)
          replaced.emplace_back(previous, &*entry);
        filed.push_back(&*entry);
      }
    }
  } catch (...) {
    repairReplaced();
    throw;
  }
  repairReplaced();
  // An address freed in the first pass can only have been reused by a style
  // made later in it, so membership in `created` stays exact.
  std::sort(created.begin(), created.end());

  const ImportScope scope(m_import);
  std::size_t next = 0;
  for (std::size_t i = 0; i < memberCount; ++i) {
    const ZelStringT<char16_t>& name = document->GetValueName(i);
    const Json::Value& value = document->GetValue(i);
    const Json::Object* category = value.GetIf<Json::Object>();
    if (!category) {
      applySheetMember(name, value);
      continue;
    }
    if (!manager.CategoryExists(name))
      continue;
    const PropertyKey categoryKey(name);
    for (std::size_t j = 0; j < category->GetSize(); ++j) {
      Style* style = filed[next++]->second;
      if (!std::binary_search(created.begin(), created.end(), style))
        continue;
      style->SetCategory(categoryKey);
      style->DeserializeJson(*this, category->GetValue(j).Get<Json::Object>());
      if (!m_externalID.IsEmpty())
        style->SetExternalID(m_externalID);
    }
  }

  if (!versionSeen)
    m_version = 0;
  return true;
}

bool StyleSheet::ImportFromString(const ZelStringT<char16_t>& text, bool replace) {
  Json::Value value;
  ZelStringT<char16_t> errorText;
  try {
    if (!Json::Parse(text, value, errorText))
      return false;
  } catch (...) {
    return false;
  }
  Json::Object* document = value.GetIf<Json::Object>();
  if (!document)
    return false;
  return ImportJson(document, replace);
}

void StyleSheet::ExportToString(ZelStringT<char16_t>& text, bool includeTemporary) const {
  JsonValue value{Json::Object()};
  ExportJson(value, includeTemporary);
  text = Json::ValueToString(value, false);
}

bool StyleSheet::Export(ZelUtils::Stream& stream) const {
  ZelStringT<char16_t> text;
  ExportToString(text, false);
  ZelUtils::TextStreamWriter writer(stream, kDocumentEncoding, false);
  return writer.Write(text);
}

bool StyleSheet::Import(ZelUtils::Stream& stream, bool replace) {
  ZelUtils::TextStreamReader reader(stream, kDocumentEncoding);
  const ZelStringT<char16_t> text = reader.ReadToEnd();
  return ImportFromString(text, replace);
}

} // namespace Styles
