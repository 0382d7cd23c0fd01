// The style object: construction and copying, its category, lookups through
// parents and owners, editing and resetting its values. Dependencies live in
// StyleDependencies.cpp and its JSON form in StyleJson.cpp.
#include <Styles/Style.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleUtilities.h>

#include <Styles/Internal/OwnerKeyStack.h>

#include <algorithm>
#include <exception>
#include <memory>
#include <typeinfo>

namespace Styles {

ZelUtils::StringPool& StringPool::Get() {
  static ZelUtils::StringPool pool;
  return pool;
}

namespace {

// The keys of a style's own values, taken before a loop that may edit them.
std::vector<PropertyKey> OwnKeys(const PropertyMap& properties) {
  std::vector<PropertyKey> keys;
  keys.reserve(properties.size());
  for (const PropertyMap::ConstEntry& entry : properties)
    keys.push_back(entry.first);
  return keys;
}

} // namespace

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
  for (const PropertyMap::ConstEntry& entry : other.m_properties) {
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
  m_external.reset(source.m_external ? new ExternalNames(*source.m_external) : nullptr);
}

void Style::DestroyOwnValues() noexcept {
  for (const PropertyMap::Entry& entry : m_properties) {
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
    const PropertyMap::Entry& entry = m_properties[i];
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

void Style::SetExternalField(ZelStringT<char16_t> ExternalNames::*field,
                             const ZelStringT<char16_t>& text) {
  const auto set = [&](Style& style) {
    if (!style.m_external && !text.IsEmpty())
      style.m_external.reset(new ExternalNames);
    if (style.m_external)
      style.m_external.get()->*field = text;
  };
  set(*this);
  // Ordinary styles pass the field on to their direct single substyles only.
  if (GetCategoryName() != StyleCategoryName)
    return;
  for (const PropertyMap::ConstEntry& entry : m_properties)
    if (Style* substyle = GetSubstyle(entry.first, false))
      set(*substyle);
}

void Style::SetExternalID(const ZelStringT<char16_t>& id) {
  SetExternalField(&ExternalNames::id, id);
}

void Style::SetExternalName(const ZelStringT<char16_t>& name) {
  SetExternalField(&ExternalNames::name, name);
}

namespace {
const ZelStringT<char16_t>& EmptyText() noexcept {
  static const ZelStringT<char16_t> empty;
  return empty;
}
} // namespace

const ZelStringT<char16_t>& Style::GetExternalID() const noexcept {
  return m_external ? m_external->id : EmptyText();
}

const ZelStringT<char16_t>& Style::GetExternalName() const noexcept {
  return m_external ? m_external->name : EmptyText();
}

void Style::RepairSubstyleOwnerPointers() {
  for (const PropertyMap::Entry& entry : m_properties)
    if (BaseStyleProperty* behaviour = FindBehaviour(entry.first))
      behaviour->SetOwner(entry.second, this, entry.first);
}

void Style::SwapData(Style& other) {
  std::swap(m_category, other.m_category);
  std::swap(m_parent, other.m_parent);
  m_properties.Swap(other.m_properties);
  std::swap(m_external, other.m_external);
  RepairSubstyleOwnerPointers();
  other.RepairSubstyleOwnerPointers();
}

bool Style::operator==(const Style& other) const {
  if (m_category != other.m_category || m_parent != other.m_parent)
    return false;
  if (GetExternalID() != other.GetExternalID() || GetExternalName() != other.GetExternalName())
    return false;
  if (m_properties.size() != other.m_properties.size())
    return false;
  for (std::size_t i = 0; i < m_properties.size(); ++i) {
    const PropertyMap::ConstEntry& mine = m_properties[i];
    const PropertyMap::ConstEntry& theirs = other.m_properties[i];
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
  if (const int c = GetExternalID().Compare(other.GetExternalID(), kCompareCaseSensitive))
    return c < 0;
  if (const int c = GetExternalName().Compare(other.GetExternalName(), kCompareCaseSensitive))
    return c < 0;
  if (m_properties.size() != other.m_properties.size())
    return m_properties.size() < other.m_properties.size();
  for (std::size_t i = 0; i < m_properties.size(); ++i) {
    const PropertyMap::ConstEntry& mine = m_properties[i];
    const PropertyMap::ConstEntry& theirs = other.m_properties[i];
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
  __builtin_prefetch(m_parent); // overlaps the parent's load with the own search
  if (const ZelUtils::Any* own = m_properties.Find(key))
    return *own;
  return GetInheritedProperty(key);
}

const ZelUtils::Any& Style::GetInheritedProperty(const PropertyKey& key) const {
  const Style* current = this;
  for (;;) {
    while (const Style* parent = current->m_parent) {
      // Fetch the next parent while this one's values arrive: the two loads
      // then overlap instead of waiting for each other.
      __builtin_prefetch(parent->m_parent);
      if (const ZelUtils::Any* own = parent->m_properties.Find(key))
        return *own;
      current = parent;
    }
    if (!current->m_owner)
      return current->DefaultValue(key);

    // Owner-based inheritance: climb to the first owner with a parent,
    // remembering the owner keys on the way.
    detail::OwnerKeyStack keys;
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
    const PropertyMap::Entry& entry = m_properties[i];
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
  for (const PropertyMap::ConstEntry& entry : m_properties) {
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
  for (const PropertyMap::ConstEntry& entry : m_properties) {
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
  for (const PropertyMap::ConstEntry& entry : m_properties)
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

} // namespace Styles

namespace ZelUtils {
template <> const PooledString<Styles::StringPool> PooledString<Styles::StringPool>::Empty(u"");
} // namespace ZelUtils
