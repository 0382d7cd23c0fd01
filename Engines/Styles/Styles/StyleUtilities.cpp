#include <Styles/StyleUtilities.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>

#include <ZelUtils/String.h>

#include <memory>
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

} // namespace Styles
