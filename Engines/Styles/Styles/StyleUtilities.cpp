#include <Styles/StyleUtilities.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>

#include <ZelUtils/String.h>

#include <algorithm>
#include <cassert>
#include <cstring>
#include <memory>
#include <typeinfo>
#include <utility>

namespace Styles {

const PropertyKey StyleCategoryName(u"style");

namespace {

PropertyPath Concatenate(const PropertyKey* first, std::size_t firstCount,
                         const PropertyKey* second, std::size_t secondCount) {
  PropertyPath path;
  path.reserve(firstCount + secondCount);
  path.insert(path.end(), first, first + firstCount);
  path.insert(path.end(), second, second + secondCount);
  return path;
}

template <class Keys> std::vector<PropertyPath> OneKeyPaths(const Keys& keys) {
  std::vector<PropertyPath> paths;
  paths.reserve(keys.size());
  for (const PropertyKey& key : keys)
    paths.push_back(PropertyPath{key});
  return paths;
}

// Space, digits, ASCII letters and the punctuation that is safe in names.
constexpr char16_t kAllowedNameCharacters[] =
    u" 0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ()[]{}'|!@#$%^&*-_.,?/+=:;`";
constexpr char16_t kRemovedNameCharacters[] = u"\t\n\"~";

} // namespace

void RegisterSubstyleSet(const PropertyKey& categoryKey, const PropertyKey& propertyKey) {
  StyleManager& manager = GetStyleManager();
  std::unique_ptr<StyleSetProperty> property(new StyleSetProperty(propertyKey));
  manager.RegisterProperty(categoryKey, propertyKey, property.get());
  // A behaviour the category did not take (unknown category, key taken) is
  // owned by nobody else, so it is freed here.
  if (manager.GetStyleProperty(categoryKey, propertyKey) == property.get())
    property.release();
}

void RegisterStyleCategory(const ZelStringT<char16_t>& uiName) {
  StyleManager& manager = GetStyleManager();
  const std::vector<PropertyKey> substyleSets = manager.GetSubstyleSetCategories();
  manager.RegisterCategory(StyleCategoryName, uiName, false, true);
  for (const PropertyKey& key : substyleSets)
    RegisterSubstyleSet(StyleCategoryName, key);
}

PropertyPath MakePath(const PropertyKey& a) { return PropertyPath{a}; }

PropertyPath MakePath(const PropertyKey& a, const PropertyKey& b) { return PropertyPath{a, b}; }

PropertyPath MakePath(const PropertyKey& a, const PropertyKey& b, const PropertyKey& c) {
  return PropertyPath{a, b, c};
}

PropertyPath MakePath(const PropertyPath& path, const PropertyKey& key) {
  return Concatenate(path.data(), path.size(), &key, 1);
}

PropertyPath MakePath(const PropertyKey& key, const PropertyPath& path) {
  return Concatenate(&key, 1, path.data(), path.size());
}

PropertyPath MakePath(const PropertyPath& first, const PropertyPath& second) {
  return Concatenate(first.data(), first.size(), second.data(), second.size());
}

std::vector<PropertyPath> MakePaths(const std::set<PropertyKey>& keys) { return OneKeyPaths(keys); }

std::vector<PropertyPath> MakePaths(const std::vector<PropertyKey>& keys) {
  return OneKeyPaths(keys);
}

PropertyPath SplitPath(const ZelStringT<char16_t>& text) {
  const std::vector<ZelStringT<char16_t>> pieces =
      ZelUtils::String::Split(text, u".", false, false);
  PropertyPath path;
  path.reserve(pieces.size());
  for (const ZelStringT<char16_t>& piece : pieces)
    path.push_back(PropertyKey(piece));
  return path;
}

Style* GetOrCreateSubstyle(Style& style, const PropertyKey& setKey) {
  const std::shared_ptr<const StyleCategory>& category = style.GetCategory();
  const BaseStyleProperty* behaviour = category ? category->GetStyleProperty(setKey) : nullptr;
  if (!behaviour)
    return nullptr;
  if (Style* existing = style.GetSubstyle(setKey, false))
    return existing;
  const Style empty(nullptr, behaviour->GetElementCategoryName());
  style.SetProperty(setKey, ZelUtils::Any(&empty));
  return style.GetSubstyle(setKey, false);
}

ZelStringT<char16_t> ConvertToValidStyleName(const ZelStringT<char16_t>& name,
                                             bool restrictToAllowedCharacters) {
  ZelStringT<char16_t> result =
      restrictToAllowedCharacters
          ? ZelUtils::String::KeepCharacters(name, kAllowedNameCharacters)
          : ZelUtils::String::RemoveCharacters(name, kRemovedNameCharacters);
  result.Trim();
  return result;
}

// ---------------------------------------------------------------------------
// Lasting handles of substyles

SubStyle::SubStyle(Style* style) : m_root(style) {
  if (!style)
    return;
  for (const Style* current = style; current->GetOwner(); current = current->GetOwner()) {
    m_path.push_back(current->GetOwnerPropertyKey());
    m_root = current->GetOwner();
  }
  std::reverse(m_path.begin(), m_path.end());
}

SubStyle::SubStyle(const SubStyle& other) : m_root(other.m_root), m_path(other.m_path) {}

SubStyle::SubStyle(SubStyle&& other) noexcept
    : m_root(std::exchange(other.m_root, nullptr)), m_path(std::move(other.m_path)) {
  other.m_path.clear();
}

SubStyle& SubStyle::operator=(const SubStyle& other) {
  m_root = other.m_root;
  if (this != &other)
    m_path = other.m_path;
  return *this;
}

SubStyle::operator Style*() const {
  Style* style = m_root;
  for (auto key = m_path.begin(); style && key != m_path.end(); ++key)
    style = style->GetSubstyle(*key, false);
  return style;
}

std::vector<SubStyle> StylesToSubStyles(const std::vector<Style*>& styles) {
  std::vector<SubStyle> subStyles;
  for (Style* style : styles)
    subStyles.push_back(SubStyle(style));
  return subStyles;
}

std::vector<Style*> SubStylesToStyles(const std::vector<SubStyle>& subStyles) {
  std::vector<Style*> styles;
  styles.reserve(subStyles.size());
  for (const SubStyle& subStyle : subStyles)
    styles.push_back(subStyle);
  return styles;
}

// ---------------------------------------------------------------------------
// Overridden properties

namespace {

// Whether `value` holds exactly the kind Style*: the type names are compared
// by address first, then by text, so a kind made in a host library counts.
bool HoldsSubstyleKind(const ZelUtils::Any& value) {
  const std::type_info& held = value.Type();
  const std::type_info& wanted = typeid(Style*);
  return held.name() == wanted.name() || std::strcmp(held.name(), wanted.name()) == 0;
}

// The substyle held by a value of the substyle kind; std::bad_cast when the
// value cannot be read as one.
Style* HeldSubstyle(const ZelUtils::Any& value) {
  if (!value.IsTypeCompatible<Style*>())
    throw std::bad_cast();
  return value.Get<Style*>();
}

} // namespace

std::set<PropertyKey> GetStyleCategoryProperties(const Style& style) {
  const std::shared_ptr<const StyleCategory> category = style.GetCategory();
  assert(category && "a style without category has no properties to list");
  std::set<PropertyKey> keys;
  for (const auto& entry : category->GetProperties())
    keys.insert(keys.end(), entry.first);
  return keys;
}

std::set<PropertyKey> GetOverriddenProperties(const Style& style) {
  std::set<PropertyKey> keys;
  for (const PropertyMap::ConstEntry& entry : style.GetProperties())
    keys.insert(keys.end(), entry.first);
  return keys;
}

std::vector<PropertyPath> GetOverriddenPropertyPaths(const Style& style) {
  std::vector<PropertyPath> paths;
  GetOverriddenPropertyPaths(style, PropertyPath(), paths);
  return paths;
}

void GetOverriddenPropertyPaths(const Style& style, const PropertyPath& prefix,
                                std::vector<PropertyPath>& paths) {
  for (const PropertyMap::ConstEntry& entry : style.GetProperties()) {
    if (!HoldsSubstyleKind(entry.second)) {
      paths.push_back(MakePath(prefix, entry.first));
      continue;
    }
    if (const Style* substyle = HeldSubstyle(entry.second))
      GetOverriddenPropertyPaths(*substyle, MakePath(prefix, entry.first), paths);
  }
}

std::vector<PropertyPath>
GetOverriddenSubstyleProperties(const Style& style, const PropertyKey& setKey, bool includeSetKey) {
  std::vector<PropertyPath> paths;
  const Style* substyle = style.GetSubstyle(setKey, false);
  if (!substyle)
    return paths;
  for (const PropertyMap::ConstEntry& entry : substyle->GetProperties())
    paths.push_back(includeSetKey ? MakePath(setKey, entry.first) : MakePath(entry.first));
  return paths;
}

// ---------------------------------------------------------------------------
// Substyle helpers

const ZelUtils::Any& GetSubstyleProperty(const Style& style, const PropertyKey& setKey,
                                         const PropertyKey& key) {
  const Style* substyle = HeldSubstyle(style.GetProperty(setKey));
  assert(substyle && "no substyle to read from");
  return substyle->GetProperty(key);
}

bool GetSubstyleProperty(const Style& style, const PropertyKey& setKey, const PropertyKey& key,
                         ZelUtils::Any& out) {
  ZelUtils::Any value;
  if (!style.GetProperty(setKey, value))
    return false;
  const Style* substyle = HeldSubstyle(value);
  assert(substyle && "no substyle to read from");
  return substyle->GetProperty(key, out);
}

void SetSubstyleProperty(Style& style, const PropertyKey& category, const PropertyKey& setKey,
                         const PropertyKey& key, const ZelUtils::Any& value) {
  ZelUtils::Any own;
  Style* target = nullptr;
  if (style.GetOverrideProperty(setKey, own)) {
    target = HeldSubstyle(own);
  } else {
    // Handed over as const Style*: the behaviour stores a copy, and a value
    // that is no substyle can never be read back as this temporary.
    const Style empty(nullptr, category);
    style.SetProperty(setKey, ZelUtils::Any(&empty));
    target = HeldSubstyle(style.GetProperty(setKey));
  }
  assert(target && "an own substyle value must not be null");
  target->SetProperty(key, value);
}

void ClearSubstyleProperty(Style& style, const PropertyKey& setKey, const PropertyKey& key) {
  ZelUtils::Any own;
  if (!style.GetOverrideProperty(setKey, own))
    return;
  if (Style* substyle = HeldSubstyle(own))
    substyle->ClearProperty(key);
}

const Style* GetStyleOrSubstyle(const Style* style, const PropertyKey& key, bool inherited) {
  if (!style)
    return nullptr;
  if (style->GetCategoryName() == key)
    return style;
  return style->GetSubstyle(key, inherited);
}

Style* GetStyleOrSubstyle(Style* style, const PropertyKey& key, bool inherited) {
  return const_cast<Style*>(GetStyleOrSubstyle(static_cast<const Style*>(style), key, inherited));
}

Style* GetSubstyleParent(const Style& style) {
  if (Style* parent = style.GetParent())
    return parent;
  const PropertyKey& ownerKey = style.GetOwnerPropertyKey();
  for (const Style* owner = style.GetOwner(); owner; owner = owner->GetParent()) {
    const Style* counterpart = owner->GetSubstyle(ownerKey, false);
    if (counterpart && counterpart->GetParent())
      return counterpart->GetParent();
  }
  return nullptr;
}

Style* CreateStyleFromSubstyleWithoutOwnerDependencies(const Style* style,
                                                       const PropertyKey& setKey,
                                                       std::set<PropertyKey>& categoryKeys) {
  const Style* substyle = style->GetSubstyle(setKey, true);
  if (!substyle)
    return nullptr;
  Style* parent = GetSubstyleParent(*substyle);
  const std::shared_ptr<const StyleCategory>& category = substyle->GetCategory();
  if (!category)
    return nullptr;
  std::unique_ptr<Style> clone(new Style(*substyle));
  clone->SetParent(parent);
  categoryKeys = GetStyleCategoryProperties(*substyle);
  for (const PropertyKey& key : categoryKeys) {
    const ZelUtils::Any& value = substyle->GetProperty(key);
    const ZelUtils::Any& reference =
        parent ? parent->GetProperty(key) : category->GetDefaultValue(key);
    // Identity, not equality: a value found where the parent finds it is
    // left to inheritance, an equal value found elsewhere is still copied.
    if (&value != &reference)
      clone->SetProperty(key, value);
  }
  return clone.release();
}

void ClearMatchingInheritedProperties(Style& style) {
  const Style* withParent = &style;
  while (withParent && !withParent->GetParent())
    withParent = withParent->GetOwner();
  if (!withParent)
    return;
  Style original(std::move(style));
  style.ClearAllProperties();
  const StyleCategory* category = style.GetCategory().get();
  for (const PropertyMap::ConstEntry& entry : original.GetProperties()) {
    const BaseStyleProperty* behaviour =
        category ? category->GetStyleProperty(entry.first) : nullptr;
    if (behaviour && !behaviour->IsEqual(entry.second, style.GetProperty(entry.first)))
      style.SetProperty(entry.first, entry.second);
  }
}

bool ForEachSubStyle(Style* style, const std::function<bool(Style*)>& fn, bool includeSelf,
                     std::vector<PropertyKey> keys) {
  if (!style)
    return true;
  if (includeSelf && !fn(style))
    return false;
  if (keys.empty()) {
    assert(style->GetCategory() && "a style without category has no keys to walk");
    keys = style->GetCategory()->GetPropertyOrder();
  }
  for (const PropertyKey& key : keys) {
    Style* substyle = style->GetSubstyle(key, false);
    if (substyle && !fn(substyle))
      return false;
  }
  return true;
}

void ClearEmptySubstyles(Style& style) {
  std::vector<PropertyKey> emptied;
  for (const PropertyMap::ConstEntry& entry : style.GetProperties()) {
    if (!HoldsSubstyleKind(entry.second))
      continue;
    Style* substyle = HeldSubstyle(entry.second);
    assert(substyle && "an own substyle value must not be null");
    ClearEmptySubstyles(*substyle);
    if (substyle->GetProperties().empty())
      emptied.push_back(entry.first);
  }
  for (const PropertyKey& key : emptied)
    style.ClearProperty(key);
}

void CopySourceSubstylesThatExistsInDestinationStyle(Style* destination, const Style* source,
                                                     bool mergeProperties) {
  // Taken first: the destination changes during the walk.
  const std::set<PropertyKey> keys = GetOverriddenProperties(*destination);
  for (const PropertyKey& key : keys) {
    const Style* sourceSubstyle = source->GetSubstyle(key, false);
    if (!sourceSubstyle)
      continue;
    if (!mergeProperties) {
      destination->SetProperty(key, ZelUtils::Any(sourceSubstyle));
      continue;
    }
    Style* destinationSubstyle = destination->GetSubstyle(key, false);
    assert(destinationSubstyle && "merging needs a substyle in the destination");
    for (const PropertyMap::ConstEntry& entry : sourceSubstyle->GetProperties())
      destinationSubstyle->SetProperty(entry.first, entry.second);
  }
}

} // namespace Styles
