// What a style depends on and how it lets go of it: dependency queries with
// their per-query memo, remapping and removing dependencies, flattening and
// owner-free clones. Declared in Style.h; the sheet uses AppendDependents.
#include <Styles/Internal/StyleDependencies.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleUtilities.h>

#include <algorithm>
#include <memory>
#include <typeinfo>
#include <unordered_map>

namespace Styles {

namespace {

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

} // namespace

namespace detail {

void AppendDependents(const std::vector<Style*>& styles, StyleSpan span, std::vector<Style*>& out) {
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

} // namespace detail

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
  for (const PropertyMap::ConstEntry& entry : m_properties)
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

std::vector<Style*> Style::GetDependencies(StyleSpan styles, bool parentOnly) const {
  if (styles.is_sorted())
    return GetDependenciesImpl(styles, parentOnly);
  std::vector<Style*> sorted(styles.begin(), styles.end());
  std::sort(sorted.begin(), sorted.end(), std::less<>());
  return GetDependenciesImpl(StyleSpan(sorted, true), parentOnly);
}

void Style::AppendValueDependencies(StyleSpan styles, bool parentOnly,
                                    std::vector<Style*>& out) const {
  for (const PropertyMap::ConstEntry& entry : m_properties) {
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
  for (const PropertyMap::ConstEntry& entry : m_properties)
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

} // namespace Styles
