#include <Styles/Style.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>
#include <Styles/StyleUtilities.h>

#include <Styles/Internal/JsonAccess.h>

#include <Json/Json.h>

#include <algorithm>
#include <exception>
#include <memory>
#include <optional>
#include <typeinfo>
#include <unordered_map>

namespace Styles {

ZelUtils::StringPool& StringPool::Get() {
  static ZelUtils::StringPool pool;
  return pool;
}

// Fixed member names of a style's JSON object.
static const ZelStringT<char16_t> k_strPropertyInherits(u"inherits");
static const ZelStringT<char16_t> k_strExternalID(u"id");
static const ZelStringT<char16_t> k_strExternalName(u"original");

namespace {

// Owner keys collected on an owner-based lookup: two live inline, deeper
// nesting spills into a vector.
class OwnerKeyStack {
public:
  void Push(const PropertyKey& key) {
    if (m_size < kInline)
      m_inline[m_size] = key;
    else
      m_spill.push_back(key);
    ++m_size;
  }
  std::size_t Size() const noexcept { return m_size; }
  const PropertyKey& operator[](std::size_t i) const noexcept {
    return i < kInline ? m_inline[i] : m_spill[i - kInline];
  }

private:
  static constexpr std::size_t kInline = 2;
  PropertyKey m_inline[kInline];
  std::vector<PropertyKey> m_spill;
  std::size_t m_size = 0;
};

// The answers of HasDependency(span, false) already found during one
// sheet-wide query. While it lives, every dependency query for the same span
// on this thread, also those that behaviours make for substyles, stops at the
// first ancestor with a known answer, so each chain is walked once.
class DependencyMemo {
public:
  explicit DependencyMemo(StyleSpan span) : m_span(span), m_previous(s_active) { s_active = this; }
  ~DependencyMemo() { s_active = m_previous; }
  DependencyMemo(const DependencyMemo&) = delete;
  DependencyMemo& operator=(const DependencyMemo&) = delete;

  // The memo of the query under way for exactly this span, or null.
  static DependencyMemo* Active(StyleSpan span) {
    DependencyMemo* memo = s_active;
    return memo && memo->m_span.begin() == span.begin() && memo->m_span.end() == span.end() &&
                   memo->m_span.is_sorted() == span.is_sorted()
               ? memo
               : nullptr;
  }
  const bool* Find(const Style* style) const {
    const auto found = m_known.find(style);
    return found == m_known.end() ? nullptr : &found->second;
  }
  void Set(const Style* style, bool depends) const { m_known[style] = depends; }

private:
  static thread_local DependencyMemo* s_active;
  StyleSpan m_span;
  DependencyMemo* m_previous;
  mutable std::unordered_map<const Style*, bool> m_known;
};

thread_local DependencyMemo* DependencyMemo::s_active = nullptr;

// The keys of a style's own values, taken before a loop that may edit them.
std::vector<PropertyKey> OwnKeys(const PropertyMap& properties) {
  std::vector<PropertyKey> keys;
  keys.reserve(properties.size());
  for (const PropertyMap::Entry& entry : properties)
    keys.push_back(entry.first);
  return keys;
}

} // namespace

// ---------------------------------------------------------------------------
// PropertyMap

bool PropertyMap::Insert(const PropertyKey& key, ZelUtils::Any&& value) {
  // Documents list values in key order: appending is the usual case.
  if (m_entries.empty() || m_entries.back().first < key) {
    m_entries.emplace_back(key, std::move(value));
    return true;
  }
  const std::size_t i = LowerBound(key);
  if (i < m_entries.size() && m_entries[i].first == key)
    return false;
  m_entries.emplace(m_entries.begin() + static_cast<std::ptrdiff_t>(i), key, std::move(value));
  return true;
}

bool PropertyMap::Erase(const PropertyKey& key) {
  const std::size_t i = LowerBound(key);
  if (i == m_entries.size() || m_entries[i].first != key)
    return false;
  m_entries.erase(m_entries.begin() + static_cast<std::ptrdiff_t>(i));
  return true;
}

// ---------------------------------------------------------------------------
// Construction, copying, identity

Style::Style() = default;

Style::Style(Style* parent, const PropertyKey& categoryName) : m_parent(parent) {
  SetCategory(categoryName);
}

Style::Style(const Style& other) { *this = other; }

Style::Style(Style&& other) { *this = std::move(other); }

Style& Style::operator=(const Style& other) {
  if (&other == this)
    return *this;
  DestroyValuesAndTakeLinks(other);
  for (const PropertyMap::Entry& entry : other.m_properties) {
    BaseStyleProperty* behaviour = FindBehaviour(entry.first);
    if (!behaviour)
      continue;
    // Stored even when empty, unlike SetProperty.
    m_properties.Insert(entry.first,
                        behaviour->MovePropertyData(this, ZelUtils::Any(entry.second)));
  }
  return *this;
}

Style& Style::operator=(Style&& other) {
  if (&other == this)
    return *this;
  // Copied, not moved: the source keeps its links, category and strings.
  DestroyValuesAndTakeLinks(other);
  m_properties.Swap(other.m_properties);
  RepairSubstyleOwnerPointers();
  return *this;
}

Style::~Style() { DestroyOwnValues(); }

void Style::DestroyValuesAndTakeLinks(const Style& source) {
  DestroyOwnValues();
  m_parent = source.m_parent;
  m_category = source.m_category;
  m_externalID = source.m_externalID;
  m_externalName = source.m_externalName;
}

void Style::DestroyOwnValues() noexcept {
  for (PropertyMap::Entry& entry : m_properties) {
    BaseStyleProperty* behaviour = FindBehaviour(entry.first);
    try {
      if (behaviour)
        behaviour->DestroyPropertyData(entry.second);
    } catch (...) {
      // A plain value kept across a change of category, now under a substyle
      // behaviour, throws std::bad_cast; it owns nothing and needs no freeing.
    }
  }
  m_properties.Clear();
}

BaseStyleProperty* Style::FindBehaviour(const PropertyKey& key) const {
  return m_category ? m_category->GetStyleProperty(key) : nullptr;
}

const ZelUtils::Any& Style::DefaultValue(const PropertyKey& key) const {
  if (!m_category)
    throw std::exception();
  return m_category->GetDefaultValue(key);
}

void Style::SetCategory(const PropertyKey& name) {
  std::shared_ptr<StyleCategory> category;
  try {
    if (const std::shared_ptr<StyleCategory>* found = GetStyleManager().FindCategory(name))
      category = *found;
  } catch (...) {
    // The style keeps its previous category.
  }
  if (!category || category == m_category)
    return;
  // Existing values are kept as they are, except substyles that no behaviour of
  // the new category could destroy: the behaviour that made them frees them now.
  for (std::size_t i = 0; m_category && i < m_properties.size();) {
    PropertyMap::Entry& entry = m_properties[i];
    BaseStyleProperty* behaviour = m_category->GetStyleProperty(entry.first);
    const BaseStyleProperty* next = category->GetStyleProperty(entry.first);
    const bool holdsSubstyles = entry.second.IsTypeCompatible<Style*>() ||
                                entry.second.IsTypeCompatible<std::vector<Style*>>();
    if (behaviour && holdsSubstyles && (!next || typeid(*next) != typeid(*behaviour))) {
      behaviour->DestroyPropertyData(entry.second);
      m_properties.Erase(PropertyKey(entry.first));
    } else {
      ++i;
    }
  }
  m_category = std::move(category);
}

PropertyKey Style::GetCategoryName() const noexcept {
  return m_category ? m_category->GetKey() : PropertyKey::Empty;
}

void Style::SetExternalField(ZelStringT<char16_t> Style::*field, const ZelStringT<char16_t>& text) {
  this->*field = text;
  // Ordinary styles pass the field on to their direct single substyles only.
  if (GetCategoryName() != StyleCategoryName)
    return;
  for (const PropertyMap::Entry& entry : m_properties)
    if (Style* substyle = GetSubstyle(entry.first, false))
      substyle->*field = text;
}

void Style::SetExternalID(const ZelStringT<char16_t>& id) {
  SetExternalField(&Style::m_externalID, id);
}

void Style::SetExternalName(const ZelStringT<char16_t>& name) {
  SetExternalField(&Style::m_externalName, name);
}

void Style::RepairSubstyleOwnerPointers() {
  for (PropertyMap::Entry& entry : m_properties)
    if (BaseStyleProperty* behaviour = FindBehaviour(entry.first))
      behaviour->SetOwner(entry.second, this, entry.first);
}

void Style::SwapData(Style& other) {
  std::swap(m_category, other.m_category);
  std::swap(m_parent, other.m_parent);
  m_properties.Swap(other.m_properties);
  std::swap(m_externalID, other.m_externalID);
  std::swap(m_externalName, other.m_externalName);
  RepairSubstyleOwnerPointers();
  other.RepairSubstyleOwnerPointers();
}

bool Style::operator==(const Style& other) const {
  if (m_category != other.m_category || m_parent != other.m_parent)
    return false;
  if (m_externalID.Compare(other.m_externalID, kCompareCaseSensitive) != 0 ||
      m_externalName.Compare(other.m_externalName, kCompareCaseSensitive) != 0)
    return false;
  if (m_properties.size() != other.m_properties.size())
    return false;
  for (std::size_t i = 0; i < m_properties.size(); ++i) {
    const PropertyMap::Entry& mine = m_properties[i];
    const PropertyMap::Entry& theirs = other.m_properties[i];
    if (mine.first != theirs.first)
      return false;
    const BaseStyleProperty* behaviour = FindBehaviour(mine.first);
    if (!behaviour || !behaviour->IsEqual(mine.second, theirs.second))
      return false;
  }
  return true;
}

bool Style::operator<(const Style& other) const {
  if (m_category != other.m_category)
    return std::less<const StyleCategory*>()(m_category.get(), other.m_category.get());
  if (m_parent != other.m_parent)
    return std::less<const Style*>()(m_parent, other.m_parent);
  if (const int c = m_externalID.Compare(other.m_externalID, kCompareCaseSensitive))
    return c < 0;
  if (const int c = m_externalName.Compare(other.m_externalName, kCompareCaseSensitive))
    return c < 0;
  if (m_properties.size() != other.m_properties.size())
    return m_properties.size() < other.m_properties.size();
  for (std::size_t i = 0; i < m_properties.size(); ++i) {
    const PropertyMap::Entry& mine = m_properties[i];
    const PropertyMap::Entry& theirs = other.m_properties[i];
    if (mine.first != theirs.first)
      return mine.first < theirs.first;
    // A key without behaviour counts as equal here, unlike operator==.
    const BaseStyleProperty* behaviour = FindBehaviour(mine.first);
    if (behaviour && !behaviour->IsEqual(mine.second, theirs.second))
      return behaviour->IsLess(mine.second, theirs.second);
  }
  return false;
}

bool Style::substyle_less_including_owner_based_inheritance(const Style& other) const {
  if (!(*this == other))
    return *this < other;
  if (m_parent)
    return false;
  // Both sides resolve through this style's owner key, deliberately.
  const auto resolve = [this](const Style& style) -> const Style* {
    if (!style.m_owner)
      return nullptr;
    const ZelUtils::Any& value = style.m_owner->GetInheritedProperty(m_ownerPropertyKey);
    return value.IsTypeCompatible<Style*>() ? value.Get<Style*>() : nullptr;
  };
  return std::less<const Style*>()(resolve(*this), resolve(other));
}

// ---------------------------------------------------------------------------
// Lookup

const ZelUtils::Any& Style::GetProperty(const PropertyKey& key) const {
  if (const ZelUtils::Any* own = m_properties.Find(key))
    return *own;
  return GetInheritedProperty(key);
}

const ZelUtils::Any& Style::GetInheritedProperty(const PropertyKey& key) const {
  const Style* current = this;
  for (;;) {
    while (const Style* parent = current->m_parent) {
      if (const ZelUtils::Any* own = parent->m_properties.Find(key))
        return *own;
      current = parent;
    }
    if (!current->m_owner)
      return current->DefaultValue(key);

    // Owner-based inheritance: climb to the first owner with a parent,
    // remembering the owner keys on the way.
    OwnerKeyStack keys;
    const Style* climber = current;
    const Style* ownerWithParent = nullptr;
    while (climber->m_owner) {
      keys.Push(climber->m_ownerPropertyKey);
      climber = climber->m_owner;
      if (climber->m_parent) {
        ownerWithParent = climber;
        break;
      }
    }
    if (!ownerWithParent)
      return current->DefaultValue(key);

    // Descend from that owner's parent along the keys, nearest-to-owner first.
    const Style* counterpart = ownerWithParent->m_parent;
    for (std::size_t i = keys.Size(); i-- > 0 && counterpart;) {
      const ZelUtils::Any& value = counterpart->GetProperty(keys[i]);
      if (!value.IsTypeCompatible<Style*>())
        throw std::bad_cast();
      counterpart = value.Get<Style*>();
    }
    if (!counterpart)
      return current->DefaultValue(key);
    if (const ZelUtils::Any* own = counterpart->m_properties.Find(key))
      return *own;
    current = counterpart;
  }
}

bool Style::GetProperty(const PropertyKey& key, ZelUtils::Any& out) const {
  const BaseStyleProperty* behaviour = FindBehaviour(key);
  if (!behaviour)
    return false;
  const ZelUtils::Any& value = GetProperty(key);
  if (&value == &behaviour->GetDefaultValue())
    return false;
  out = value;
  return true;
}

bool Style::GetInheritedProperty(const PropertyKey& key, ZelUtils::Any& out) const {
  const ZelUtils::Any& value = GetInheritedProperty(key);
  const BaseStyleProperty* behaviour = FindBehaviour(key);
  if (behaviour && &value == &behaviour->GetDefaultValue())
    return false;
  out = value;
  return true;
}

bool Style::GetOverrideProperty(const PropertyKey& key, ZelUtils::Any& out) const {
  const ZelUtils::Any* own = m_properties.Find(key);
  if (!own)
    return false;
  out = *own;
  return true;
}

bool Style::DoesOverrideProperty(const PropertyKey& key) const noexcept {
  return m_properties.Contains(key);
}

Style* Style::GetSubstyle(const PropertyKey& key, bool inherited) const {
  if (inherited) {
    const ZelUtils::Any& value = GetProperty(key);
    if (!value.IsTypeCompatible<Style*>())
      throw std::bad_cast();
    return value.Get<Style*>();
  }
  const ZelUtils::Any* own = m_properties.Find(key);
  if (!own)
    return nullptr;
  Style* const* substyle = own->GetIf<Style*>();
  return substyle ? *substyle : nullptr;
}

Style* Style::GetSubstyleAndCreateIfMissing(const PropertyKey& key,
                                            const PropertyKey& categoryName) {
  if (Style* existing = GetSubstyle(key, false))
    return existing;
  const Style empty(nullptr, categoryName);
  SetProperty(key, ZelUtils::Any(static_cast<const Style*>(&empty)));
  return GetSubstyle(key, false);
}

const ZelUtils::Any& Style::GetPathProperty(const std::vector<PropertyKey>& path) const {
  if (path.empty())
    throw std::exception();
  const PropertyKey& last = path.back();
  const Style* style = this;
  for (std::size_t i = 0; i + 1 < path.size(); ++i) {
    const Style* next = style->GetSubstyle(path[i], false);
    if (!next) {
      // The path leaves the own substyles: walk the element categories from
      // this style's own category, whatever depth the walk failed at.
      const StyleCategory* category = m_category.get();
      const StyleManager& manager = GetStyleManager();
      for (std::size_t j = i; j + 1 < path.size(); ++j) {
        if (!category)
          throw std::exception();
        if (const BaseStyleProperty* behaviour = category->GetStyleProperty(path[j])) {
          const std::shared_ptr<StyleCategory>* element =
              manager.FindCategory(behaviour->GetElementCategoryName());
          category = element ? element->get() : nullptr;
        }
      }
      if (!category)
        throw std::exception();
      return category->GetDefaultValue(last);
    }
    style = next;
  }
  return style->GetProperty(last);
}

// ---------------------------------------------------------------------------
// Editing

void Style::SetProperty(const PropertyKey& key, const ZelUtils::Any& value) {
  ZelUtils::Any* old = m_properties.Find(key);
  if (old == &value)
    return; // already this style's own value
  // Copied before the old value goes, in case `value` lives inside it.
  ZelUtils::Any copy(value);
  BaseStyleProperty* behaviour = FindBehaviour(key);
  if (old) {
    if (behaviour)
      behaviour->DestroyPropertyData(*old);
    m_properties.Erase(key);
  }
  if (!behaviour)
    return;
  ZelUtils::Any result = behaviour->MovePropertyData(this, std::move(copy));
  if (!result.IsEmpty())
    m_properties.Insert(key, std::move(result));
}

void Style::SetProperty(const PropertyKey& key, ZelUtils::Any&& value) {
  BaseStyleProperty* behaviour = FindBehaviour(key);
  if (!behaviour)
    return;
  ZelUtils::Any result = behaviour->MovePropertyData(this, std::move(value));
  if (result.IsEmpty()) {
    // Deliberately without DestroyPropertyData on the old value.
    m_properties.Erase(key);
    return;
  }
  if (ZelUtils::Any* old = m_properties.Find(key)) {
    behaviour->DestroyPropertyData(*old);
    // The destroy step may have edited the values: look again.
    if ((old = m_properties.Find(key)) != nullptr) {
      *old = std::move(result);
      return;
    }
  }
  m_properties.Insert(key, std::move(result));
}

void Style::DestroyPropertyData(const PropertyKey& key, const ZelUtils::Any& value) const {
  if (const BaseStyleProperty* behaviour = FindBehaviour(key))
    behaviour->DestroyPropertyData(value);
}

bool Style::ClearProperty(const PropertyKey& key) {
  ZelUtils::Any* old = m_properties.Find(key);
  if (!old)
    return false;
  if (const BaseStyleProperty* behaviour = FindBehaviour(key))
    behaviour->DestroyPropertyData(*old);
  m_properties.Erase(key);
  return true;
}

bool Style::ClearPathProperty(const std::vector<PropertyKey>& path) {
  if (path.empty())
    return false;
  Style* style = this;
  for (std::size_t i = 0; i + 1 < path.size(); ++i)
    if (!(style = style->GetSubstyle(path[i], false)))
      return false;
  return style->ClearProperty(path.back());
}

bool Style::RevertPathProperty(const std::vector<PropertyKey>& path, bool force) {
  bool canInherit = force || m_parent || (m_owner && m_owner->m_parent);
  if (path.empty())
    return false;
  Style* style = this;
  for (std::size_t i = 0; i + 1 < path.size(); ++i) {
    if (!(style = style->GetSubstyle(path[i], false)))
      return false;
    canInherit = canInherit || style->m_parent;
  }
  return canInherit && style->ClearProperty(path.back());
}

void Style::ClearProperties(const Style* keysOf) {
  if (!keysOf)
    return;
  for (const PropertyKey& key : OwnKeys(keysOf->m_properties))
    ClearProperty(key);
}

void Style::ClearAllProperties() { DestroyOwnValues(); }

Style* Style::CopyProperties(const std::set<PropertyKey>& keys) const {
  std::unique_ptr<Style> copy(new Style(nullptr, GetCategoryName()));
  for (const PropertyKey& key : keys) {
    if (!FindBehaviour(key))
      continue; // SetProperty would drop it; its lookup could only throw
    copy->SetProperty(key, GetProperty(key));
  }
  return copy.release();
}

void Style::SetPathProperty(const std::vector<PropertyKey>& path, const ZelUtils::Any& value) {
  if (path.empty())
    return;
  Style* style = this;
  for (std::size_t i = 0; i + 1 < path.size(); ++i)
    if (!(style = GetOrCreateSubstyle(*style, path[i])))
      return;
  style->SetProperty(path.back(), value);
}

void Style::SetPathProperty(const std::vector<PropertyKey>& path, ZelUtils::Any&& value) {
  if (path.empty())
    return;
  Style* style = this;
  for (std::size_t i = 0; i + 1 < path.size(); ++i)
    if (!(style = GetOrCreateSubstyle(*style, path[i])))
      return;
  style->SetProperty(path.back(), std::move(value));
}

void Style::SetPathProperty(const std::vector<PropertyKey>& path, const Style* source) {
  if (path.empty())
    return;
  Style* destination = this;
  for (std::size_t i = 0; i + 1 < path.size(); ++i) {
    if (!(destination = GetOrCreateSubstyle(*destination, path[i])))
      return;
    if (!(source = source->GetSubstyle(path[i], false))) {
      destination->ClearProperty(path[i + 1]);
      return;
    }
  }
  if (const ZelUtils::Any* own = source->m_properties.Find(path.back()))
    destination->SetProperty(path.back(), *own);
  else
    destination->ClearProperty(path.back());
}

void Style::SetProperties(const std::vector<std::vector<PropertyKey>>& paths, const Style* source) {
  for (const std::vector<PropertyKey>& path : paths)
    SetPathProperty(path, source);
}

// ---------------------------------------------------------------------------
// Resetting and structural queries

bool Style::RevertAllProperties() {
  bool removed = false;
  for (std::size_t i = 0; i < m_properties.size();) {
    PropertyMap::Entry& entry = m_properties[i];
    if (Style* const* substyle = entry.second.GetIf<Style*>(); substyle && *substyle) {
      // Single substyles stay, emptied in turn.
      removed = (*substyle)->RevertAllProperties() || removed;
      ++i;
      continue;
    }
    const PropertyKey key = entry.first;
    if (const BaseStyleProperty* behaviour = FindBehaviour(key))
      behaviour->DestroyPropertyData(entry.second);
    m_properties.Erase(key);
    removed = true;
  }
  return removed;
}

void Style::Clear() {
  DestroyOwnValues();
  m_parent = nullptr;
}

bool Style::SubstylesHaveAnyParentalRelationships() const {
  bool found = false;
  const StyleVisitor visit = [&found](Style* substyle) {
    found = substyle && (substyle->m_parent || substyle->SubstylesHaveAnyParentalRelationships());
    return !found;
  };
  for (const PropertyMap::Entry& entry : m_properties) {
    if (const BaseStyleProperty* behaviour = FindBehaviour(entry.first))
      behaviour->ProcessStylesInProperty(entry.second, visit);
    if (found)
      return true;
  }
  return false;
}

bool Style::IsEmptyWithEmptySubstyles() const {
  // A null substyle holds nothing, so it counts as empty.
  const StyleVisitor visit = [](Style* substyle) {
    return !substyle || substyle->IsEmptyWithEmptySubstyles();
  };
  for (const PropertyMap::Entry& entry : m_properties) {
    const BaseStyleProperty* behaviour = FindBehaviour(entry.first);
    if (!behaviour || !behaviour->ProcessStylesInProperty(entry.second, visit))
      return false;
  }
  return true;
}

bool Style::DoesOverridePathProperty(const std::vector<PropertyKey>& path) const {
  if (path.empty())
    return false;
  const Style* style = this;
  for (std::size_t i = 0; i + 1 < path.size(); ++i)
    if (!(style = style->GetSubstyle(path[i], false)))
      return false;
  static const PropertyKey wildcard(u"*");
  if (path.back() == wildcard)
    return style->m_parent || !style->IsEmptyWithEmptySubstyles() ||
           style->SubstylesHaveAnyParentalRelationships();
  return style->m_properties.Contains(path.back());
}

ZelStringT<char16_t> Style::GetCategoryUIName() const {
  return m_category ? m_category->GetUIName() : ZelStringT<char16_t>();
}

unsigned Style::GetNumSubstyles() const {
  unsigned count = 0;
  for (const PropertyMap::Entry& entry : m_properties)
    if (const BaseStyleProperty* behaviour = FindBehaviour(entry.first))
      count += behaviour->IsSubstyle() ? 1 : 0;
  return count;
}

Style* Style::GetLastSubstyle() const {
  for (std::size_t i = m_properties.size(); i-- > 0;) {
    const BaseStyleProperty* behaviour = FindBehaviour(m_properties[i].first);
    // Looked up by element category name, which names single substyles.
    if (behaviour && behaviour->IsSubstyle())
      return GetSubstyle(behaviour->GetElementCategoryName(), false);
  }
  return nullptr;
}

// ---------------------------------------------------------------------------
// Merging, flattening and owner-free clones

void Style::MergeProperties(const Style* other, bool overwrite) {
  // Keys first: merging into this style may reshape `other` when it is this.
  for (const PropertyKey& key : OwnKeys(other->m_properties))
    if (const BaseStyleProperty* behaviour = other->FindBehaviour(key))
      behaviour->MergeProperty(this, other, key, overwrite);
}

void Style::MergeParentProperties(const Style* parent) {
  for (const PropertyKey& key : OwnKeys(parent->m_properties))
    if (const BaseStyleProperty* behaviour = parent->FindBehaviour(key))
      behaviour->MergeParentProperty(this, parent, key);
}

bool Style::Flatten(std::set<PropertyKey>& flattenedKeys) {
  if (m_category) {
    const std::shared_ptr<const StyleCategory> category = m_category;
    for (const PropertyKey& key : category->GetPropertyOrder()) {
      const BaseStyleProperty* behaviour = category->GetStyleProperty(key);
      if (behaviour && behaviour->FlattenProperty(this, key))
        flattenedKeys.insert(key);
    }
  }
  m_parent = nullptr;
  return !flattenedKeys.empty();
}

bool Style::Flatten() {
  std::set<PropertyKey> flattenedKeys;
  return Flatten(flattenedKeys);
}

Style* Style::CreateFlattenedStyle(std::set<PropertyKey>& flattenedKeys) const {
  std::unique_ptr<Style> copy(new Style(*this));
  // Borrow this style's place so that owner-based inheritance resolves alike.
  copy->m_owner = m_owner;
  copy->m_ownerPropertyKey = m_ownerPropertyKey;
  copy->Flatten(flattenedKeys);
  copy->m_owner = nullptr;
  return copy.release();
}

Style* Style::CreateFlattenedStyle() const {
  std::set<PropertyKey> flattenedKeys;
  return CreateFlattenedStyle(flattenedKeys);
}

bool Style::StylePropertiesHasDependencyOnOwner() const {
  if (m_parent)
    return false;
  for (const Style* owner = m_owner; owner; owner = owner->m_owner)
    if (owner->m_parent)
      return true;
  return false;
}

Style* Style::CreateStyleCloneWithNoDependencyOnOwner() const {
  if (m_parent || !StylePropertiesHasDependencyOnOwner())
    return new Style(*this);
  std::vector<PropertyKey> keys;
  std::vector<Style*> ownerParents;
  const Style* top = this;
  while (top->m_owner) {
    keys.push_back(top->m_ownerPropertyKey);
    top = top->m_owner;
    if (top->m_parent)
      ownerParents.push_back(top->m_parent);
  }
  // Bake what the topmost owner's copy inherits from those parents into it,
  // then take the substyle at this style's place.
  const std::unique_ptr<Style> root(new Style(*top));
  const bool sorted = std::is_sorted(ownerParents.begin(), ownerParents.end(), std::less<>());
  root->RemoveDependency(StyleSpan(ownerParents, sorted), true);
  const Style* reached = root.get();
  for (std::size_t i = keys.size(); i-- > 0 && reached;)
    reached = reached->GetSubstyle(keys[i], false);
  return new Style(reached ? *reached : *this);
}

Style* Style::CreateSubStyleCloneWithNoDependencyOnOwner(const PropertyKey& key) const {
  if (const Style* substyle = GetSubstyle(key, false))
    return substyle->CreateStyleCloneWithNoDependencyOnOwner();
  ZelUtils::Any found;
  if (GetProperty(key, found))
    if (Style* const* substyle = found.GetIf<Style*>(); substyle && *substyle)
      return (*substyle)->CreateStyleCloneWithNoDependencyOnOwner();
  const BaseStyleProperty* behaviour = FindBehaviour(key);
  return new Style(nullptr, behaviour ? behaviour->GetElementCategoryName() : PropertyKey::Empty);
}

void Style::CopySubstyleProperties(const Style* source, const PropertyKey& key) {
  const Style* sourceSubstyle = source->GetSubstyle(key, false);
  ZelUtils::Any scratch;
  if (!source->GetProperty(key, scratch)) {
    // The source resolves to the default: so must this style.
    ClearProperty(key);
    const ZelUtils::Any& defaultValue = DefaultValue(key);
    if (!defaultValue.IsTypeCompatible<Style*>())
      throw std::bad_cast();
    const Style* defaultSubstyle = defaultValue.Get<Style*>();
    if (GetSubstyle(key, true) != defaultSubstyle)
      SetProperty(key, ZelUtils::Any(defaultSubstyle));
    return;
  }
  if (sourceSubstyle &&
      (sourceSubstyle->m_parent || !sourceSubstyle->StylePropertiesHasDependencyOnOwner())) {
    SetProperty(key, ZelUtils::Any(sourceSubstyle));
    return;
  }
  // Does this style inherit from the same place as the source?
  bool sameInheritance = true;
  const Style* inheritedFrom = nullptr;
  const Style* counterpart = nullptr;
  if (source->m_parent) {
    inheritedFrom = source->m_parent;
    counterpart = this;
  } else {
    const Style* sourceOwner = source;
    const Style* ownOwner = this;
    do {
      sourceOwner = sourceOwner->m_owner;
      ownOwner = ownOwner ? ownOwner->m_owner : nullptr;
    } while (sourceOwner && !sourceOwner->m_parent);
    if (sourceOwner) {
      inheritedFrom = sourceOwner->m_parent;
      counterpart = ownOwner;
    }
  }
  if (inheritedFrom)
    sameInheritance = counterpart && counterpart->m_parent == inheritedFrom;
  if (!sameInheritance) {
    const std::unique_ptr<Style> clone(source->CreateSubStyleCloneWithNoDependencyOnOwner(key));
    SetProperty(key, ZelUtils::Any(static_cast<const Style*>(clone.get())));
    return;
  }
  if (sourceSubstyle)
    SetProperty(key, ZelUtils::Any(sourceSubstyle));
  else
    ClearProperty(key);
}

// ---------------------------------------------------------------------------
// Dependencies

bool Style::ValuesDepend(StyleSpan styles, bool parentOnly) const {
  for (const PropertyMap::Entry& entry : m_properties)
    if (const BaseStyleProperty* behaviour = FindBehaviour(entry.first))
      if (behaviour->HasDependency(entry.second, styles, parentOnly))
        return true;
  return false;
}

bool Style::AncestorsDepend(StyleSpan styles) const {
  DependencyMemo* memo = DependencyMemo::Active(styles);
  const Style* ancestor = m_parent;
  bool depends = false;
  for (; ancestor; ancestor = ancestor->m_parent) {
    if (memo) {
      if (const bool* known = memo->Find(ancestor)) {
        depends = *known;
        break;
      }
    }
    if (styles.contains(ancestor) || ancestor->ValuesDepend(styles, false)) {
      depends = true;
      break;
    }
  }
  // What was learnt holds for every ancestor passed on the way: each of them
  // depends exactly when the answer found above it does.
  if (memo)
    for (const Style* passed = m_parent; passed != ancestor; passed = passed->m_parent)
      memo->Set(passed, depends);
  return depends;
}

bool Style::HasDependency(StyleSpan styles, bool parentOnly) const {
  if (styles.contains(this))
    return true;
  if (m_parent) {
    if (styles.contains(m_parent))
      return true;
    if (!parentOnly && AncestorsDepend(styles))
      return true;
  }
  return ValuesDepend(styles, parentOnly);
}

void Style::AppendDependents(const std::vector<Style*>& styles, StyleSpan span,
                             std::vector<Style*>& out) {
  const DependencyMemo memo(span);
  for (Style* style : styles) {
    if (!style)
      continue;
    const bool* known = memo.Find(style);
    const bool depends = known ? *known : style->HasDependency(span, false);
    memo.Set(style, depends);
    if (depends)
      out.push_back(style);
  }
}

std::vector<Style*> Style::GetDependencies(StyleSpan styles, bool parentOnly) const {
  if (styles.is_sorted())
    return GetDependenciesImpl(styles, parentOnly);
  std::vector<Style*> sorted(styles.begin(), styles.end());
  std::sort(sorted.begin(), sorted.end(), std::less<>());
  return GetDependenciesImpl(StyleSpan(sorted, true), parentOnly);
}

void Style::AppendValueDependencies(StyleSpan styles, bool parentOnly,
                                    std::vector<Style*>& out) const {
  for (const PropertyMap::Entry& entry : m_properties) {
    if (const BaseStyleProperty* behaviour = FindBehaviour(entry.first)) {
      const std::vector<Style*> held = behaviour->GetDependencies(entry.second, styles, parentOnly);
      out.insert(out.end(), held.begin(), held.end());
    }
  }
}

std::vector<Style*> Style::GetDependenciesImpl(StyleSpan styles, bool parentOnly) const {
  std::vector<Style*> result;
  if (styles.contains(this))
    result.push_back(const_cast<Style*>(this));
  if (m_parent && styles.contains(m_parent))
    result.push_back(m_parent);
  if (!styles.empty()) {
    // With the whole chain asked for, every ancestor adds itself when it is
    // one of `styles`, and what its own values depend on.
    if (!parentOnly) {
      for (const Style* ancestor = m_parent; ancestor; ancestor = ancestor->m_parent) {
        if (ancestor->m_parent && styles.contains(ancestor->m_parent))
          result.push_back(ancestor->m_parent);
        ancestor->AppendValueDependencies(styles, false, result);
      }
    }
    AppendValueDependencies(styles, parentOnly, result);
  }
  std::sort(result.begin(), result.end(), std::less<>());
  result.erase(std::unique(result.begin(), result.end()), result.end());
  return result;
}

bool Style::HasParentalDependency(StyleSpan styles) const {
  // The parent's own answer already covers every ancestor above it.
  return m_parent && (styles.contains(m_parent) || m_parent->HasDependency(styles, false));
}

bool Style::HasParentalDependency() const {
  if (m_parent || (m_owner && m_owner->m_parent))
    return true;
  for (const PropertyMap::Entry& entry : m_properties)
    if (const BaseStyleProperty* behaviour = FindBehaviour(entry.first))
      if (behaviour->HasParentalDependency(entry.second))
        return true;
  return false;
}

void Style::MergeParent() {
  Style* parent = m_parent;
  MergeParentProperties(parent);
  m_parent = parent->m_parent;
}

void Style::RemoveDependency(StyleSpan styles, bool parentOnly) {
  if (m_parent && parentOnly) {
    // Only the run of removed styles right above this one.
    while (m_parent && styles.contains(m_parent))
      MergeParent();
  } else if (m_parent) {
    // Taking the styles of the span one by one, each found among the
    // ancestors is merged in with everything below it; together that is every
    // ancestor up to the farthest one in the span, found here in one walk.
    std::vector<Style*> storage;
    const StyleSpan searchable = ZelUtils::MakeSearchable(styles, storage);
    const Style* farthest = nullptr;
    for (const Style* ancestor = m_parent; ancestor; ancestor = ancestor->m_parent)
      if (searchable.contains(ancestor))
        farthest = ancestor;
    if (farthest) {
      const Style* stop = farthest->m_parent;
      while (m_parent && m_parent != stop)
        MergeParent();
    }
  }
  for (std::size_t i = 0; i < m_properties.size(); ++i)
    if (const BaseStyleProperty* behaviour = FindBehaviour(m_properties[i].first))
      behaviour->RemoveDependency(m_properties[i].second, styles, parentOnly);
}

void Style::RemoveAllDependencies() {
  while (m_parent)
    MergeParent();
  for (std::size_t i = 0; i < m_properties.size(); ++i)
    if (const BaseStyleProperty* behaviour = FindBehaviour(m_properties[i].first))
      behaviour->RemoveAllDependencies(m_properties[i].second);
}

void Style::RemapDependency(const std::map<Style*, Style*>& map) {
  if (m_parent) {
    const auto found = map.find(m_parent);
    if (found != map.end() && found->second)
      m_parent = found->second;
  }
  for (std::size_t i = 0; i < m_properties.size(); ++i)
    if (const BaseStyleProperty* behaviour = FindBehaviour(m_properties[i].first))
      behaviour->RemapDependency(m_properties[i].second, map);
}

void Style::RemapPointer(const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>& pairs) {
  for (std::size_t i = 0; i < m_properties.size(); ++i) {
    if (m_properties[i].second.IsEmpty())
      continue;
    if (const BaseStyleProperty* behaviour = FindBehaviour(m_properties[i].first))
      behaviour->RemapPointer(m_properties[i].second, pairs);
  }
}

bool Style::ProcessProperties(const PropertyVisitor& visit) {
  // By index: a visitor may edit this style's values.
  for (std::size_t i = 0; i < m_properties.size(); ++i) {
    const PropertyKey key = m_properties[i].first;
    if (const BaseStyleProperty* behaviour = FindBehaviour(key))
      if (!behaviour->ProcessProperty(m_properties[i].second, visit, this, key))
        return false;
  }
  return true;
}

bool Style::ProcessProperties(const std::vector<std::vector<PropertyKey>>& paths,
                              const PropertyVisitor& visit) {
  for (const std::vector<PropertyKey>& path : paths) {
    if (path.empty())
      continue;
    Style* style = this;
    for (std::size_t i = 0; i + 1 < path.size() && style; ++i)
      style = style->GetSubstyle(path[i], false);
    if (!style)
      continue;
    const BaseStyleProperty* behaviour = style->FindBehaviour(path.back());
    ZelUtils::Any* own = style->m_properties.Find(path.back());
    if (behaviour && own && !behaviour->ProcessProperty(*own, visit, style, path.back()))
      return false;
  }
  return true;
}

// ---------------------------------------------------------------------------
// JSON

namespace {

// Where Style::SerializeMembers puts the members of a style: a value tree.
class TreeSink {
public:
  explicit TreeSink(Json::Object& object) : m_object(object) {}
  void Text(const ZelStringT<char16_t>& name, std::u16string_view text) {
    m_object.AddValue(name, Json::Value(ZelStringT<char16_t>(text)));
  }
  Json::Value& Value() { return m_value = Json::Value(); }
  void Member(const ZelStringT<char16_t>& name) { m_object.AddValue(name, std::move(m_value)); }

private:
  Json::Object& m_object;
  Json::Value m_value;
};

// The same members written straight into JSON text.
class WriterSink {
public:
  WriterSink(Json::Writer& writer, Json::Value& scratch) : m_writer(writer), m_value(scratch) {}
  void Text(const ZelStringT<char16_t>& name, std::u16string_view text) {
    m_writer.Key(name.GetView());
    m_writer.String(text);
  }
  Json::Value& Value() { return m_value; }
  void Member(const ZelStringT<char16_t>& name) {
    m_writer.Key(name.GetView());
    m_writer.Write(m_value);
  }

private:
  Json::Writer& m_writer;
  Json::Value& m_value;
};

} // namespace

template <class Sink>
void Style::SerializeMembers(const StyleSheet& sheet, bool includeTemporary, Sink& sink) const {
  const std::u16string_view parentName = sheet.FindStyleName(m_parent);
  if (!parentName.empty())
    sink.Text(k_strPropertyInherits, parentName);
  if (!m_externalID.IsEmpty())
    sink.Text(k_strExternalID, m_externalID.GetView());
  if (!m_externalName.IsEmpty())
    sink.Text(k_strExternalName, m_externalName.GetView());
  for (const PropertyMap::Entry& entry : m_properties) {
    const BaseStyleProperty* behaviour = FindBehaviour(entry.first);
    if (!behaviour || (!includeTemporary && behaviour->IsTemporary()))
      continue;
    if (behaviour->Serialize(sheet, this, entry.second, sink.Value()))
      sink.Member(entry.first.GetString());
  }
}

void Style::Serialize(const StyleSheet& sheet, JsonValue& out, bool includeTemporary) const {
  Json::Object& object = out.Emplace<Json::Object>();
  object.Reserve(m_properties.size() + 3);
  TreeSink sink(object);
  SerializeMembers(sheet, includeTemporary, sink);
}

void Style::WriteJson(const StyleSheet& sheet, Json::Writer& writer, bool includeTemporary,
                      JsonValue& scratch) const {
  writer.StartObject();
  WriterSink sink(writer, scratch);
  SerializeMembers(sheet, includeTemporary, sink);
  writer.EndObject();
}

ZelStringT<char16_t> Style::Serialize(const StyleSheet& sheet, bool format,
                                      bool includeTemporary) const {
  Json::Value value;
  Serialize(sheet, value, includeTemporary);
  return Json::ValueToString(value, format);
}

bool Style::IsAncestorOrSelf(const Style* style) const noexcept {
  for (const Style* ancestor = style; ancestor; ancestor = ancestor->m_parent)
    if (ancestor == this)
      return true;
  return false;
}

void Style::DeserializeJson(const StyleSheet& sheet, const Json::Object& object) {
  JsonValue scratch;
  ReadMembers<detail::TreeAccess>(sheet, object, scratch);
}

template <class Access>
void Style::ReadMembers(const StyleSheet& sheet, const typename Access::Object& object,
                        JsonValue& scratch) {
  const std::shared_ptr<const StyleCategory> category = m_category;
  std::vector<std::pair<const BaseStyleProperty*, typename Access::Value>> deprecated;
  std::vector<const BaseStyleProperty*> needAdjustment;
  const std::size_t count = Access::Size(object);
  // Room for the members that can be properties, in one step.
  std::size_t fixedMembers = 0;
  for (std::size_t i = 0; i < count; ++i) {
    const std::u16string_view name = Access::Name(object, i);
    fixedMembers += name == k_strPropertyInherits.GetView() || name == k_strExternalID.GetView() ||
                    name == k_strExternalName.GetView();
  }
  m_properties.Reserve(m_properties.size() + count - fixedMembers);
  for (std::size_t i = 0; i < count; ++i) {
    const std::u16string_view name = Access::Name(object, i);
    const typename Access::Value value = Access::Member(object, i);
    if (name == k_strPropertyInherits.GetView()) {
      const std::optional<std::u16string_view> parentName = Access::AsString(value);
      if (!parentName || parentName->empty())
        continue;
      Style* parent = ResolveParent(sheet, *parentName);
      // Never this style itself, nor a style that already inherits from it:
      // a parent cycle would make every lookup endless.
      if (parent && sheet.AcceptParent(*this, *parent))
        m_parent = parent;
    } else if (name == k_strExternalID.GetView()) {
      const std::optional<std::u16string_view> id = Access::AsString(value);
      if (id && !id->empty())
        SetExternalID(ZelStringT<char16_t>(*id));
    } else if (name == k_strExternalName.GetView()) {
      const std::optional<std::u16string_view> externalName = Access::AsString(value);
      if (externalName && !externalName->empty())
        SetExternalName(ZelStringT<char16_t>(*externalName));
    } else {
      // Found by its text, so that names from documents are never pooled.
      const BaseStyleProperty* behaviour = category ? category->FindStyleProperty(name) : nullptr;
      if (!behaviour)
        continue;
      if (behaviour->IsDeprecated()) {
        deprecated.emplace_back(behaviour, value);
        continue;
      }
      behaviour->Deserialize(sheet, this, Access::ForBehaviour(value, scratch));
      if (behaviour->NeedAdjustementsForStyleIO())
        needAdjustment.push_back(behaviour);
    }
  }
  // Deprecated properties are read after all current ones, deliberately.
  for (const auto& [behaviour, value] : deprecated)
    behaviour->Deserialize(sheet, this, Access::ForBehaviour(value, scratch));
  for (const BaseStyleProperty* behaviour : needAdjustment)
    behaviour->AdjustAfterDeserialize(sheet, this);
}

Style* Style::ResolveParent(const StyleSheet& sheet, std::u16string_view name) {
  const WImportStyleInfo& info = GetStyleManager().GetImportStyleInfo();
  if (!info.names.empty() || !info.renames.empty()) {
    const ZelStringT<char16_t> text(name);
    if (info.names.count(text))
      return nullptr;
    const auto renamed = info.renames.find(text);
    if (renamed != info.renames.end())
      return sheet.GetStyle(renamed->second);
  }
  return sheet.FindStyle(name);
}

template void Style::ReadMembers<detail::TreeAccess>(const StyleSheet&, const Json::Object&,
                                                     JsonValue&);
template void Style::ReadMembers<detail::DocumentAccess>(const StyleSheet&,
                                                         const Json::Document::Ref&, JsonValue&);

Style* Style::Deserialize(const StyleSheet& sheet, const Json::Object& object,
                          const PropertyKey& category) {
  std::unique_ptr<Style> style(new Style(nullptr, category));
  style->DeserializeJson(sheet, object);
  return style.release();
}

} // namespace Styles

namespace ZelUtils {
template <> const PooledString<Styles::StringPool> PooledString<Styles::StringPool>::Empty(u"");
} // namespace ZelUtils
