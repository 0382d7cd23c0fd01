#include <Styles/StyleManager.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleUtilities.h>

#include <ZelUtils/Singleton.h>

#include <algorithm>
#include <cassert>
#include <exception>

namespace Styles {

WImportStyleInfo::WImportStyleInfo() {
  names.max_load_factor(1.0f);
  renames.max_load_factor(1.0f);
}

StyleManager::StyleManager() = default;

StyleManager::~StyleManager() { PreDestroyAllInReverseOrder(); }

void StyleManager::PreDestroyAllInReverseOrder() {
  for (auto key = m_categoryOrder.rbegin(); key != m_categoryOrder.rend(); ++key) {
    const auto it = m_categories.find(*key);
    if (it != m_categories.end())
      it->second->PreDestroyProperties();
  }
}

std::shared_ptr<StyleCategory> StyleManager::RegisterCategory(const PropertyKey& key,
                                                              const ZelStringT<char16_t>& uiName,
                                                              bool addToStyleCategory, bool flag) {
  // A second registration returns the first category unchanged.
  if (const std::shared_ptr<StyleCategory>* existing = FindCategory(key))
    return *existing;
  m_categoryOrder.push_back(key);
  auto category = std::make_shared<StyleCategory>(key, uiName, flag);
  m_categories.emplace(key, category);
  if (addToStyleCategory)
    m_substyleSetCategories.push_back(key);
  return category;
}

void StyleManager::DeregisterCategory(const PropertyKey& key) {
  const auto it = m_categories.find(key);
  if (it == m_categories.end())
    return;
  it->second->PreDestroyProperties();
  m_categories.erase(it);
  // The substyle-set list keeps the key: the category of ordinary styles may
  // still hold a substyle-set behaviour for it.
  const auto order = std::find(m_categoryOrder.begin(), m_categoryOrder.end(), key);
  if (order != m_categoryOrder.end())
    m_categoryOrder.erase(order);
}

void StyleManager::RegisterProperty(const PropertyKey& categoryKey, const PropertyKey& propertyKey,
                                    BaseStyleProperty* property) {
  assert(property);
  const std::shared_ptr<StyleCategory>* category = FindCategory(categoryKey);
  if (!category)
    return;
  property->SetName(categoryKey, propertyKey);
  (*category)->RegisterProperty(propertyKey, property);
}

std::shared_ptr<StyleCategory> StyleManager::GetCategory(const PropertyKey& key) const {
  if (const std::shared_ptr<StyleCategory>* category = FindCategory(key))
    return *category;
  throw std::exception();
}

const std::shared_ptr<StyleCategory>* StyleManager::FindCategory(const PropertyKey& key) const {
  const auto it = m_categories.find(key);
  return it != m_categories.end() ? &it->second : nullptr;
}

bool StyleManager::CategoryExists(const ZelStringT<char16_t>& name) const {
  for (const auto& entry : m_categories) {
    if (entry.first.GetString().Compare(name, kCompareCaseSensitive) == 0)
      return true;
  }
  return false;
}

BaseStyleProperty* StyleManager::GetStyleProperty(const PropertyKey& categoryKey,
                                                  const PropertyKey& propertyKey) const {
  const std::shared_ptr<StyleCategory>* category = FindCategory(categoryKey);
  return category ? (*category)->GetStyleProperty(propertyKey) : nullptr;
}

const ZelUtils::Any& StyleManager::GetDefaultValue(const PropertyKey& categoryKey,
                                                   const PropertyKey& propertyKey) const {
  // The copy keeps the category alive for the duration of the call.
  const std::shared_ptr<StyleCategory> category = GetCategory(categoryKey);
  return category->GetDefaultValue(propertyKey);
}

ZelPref::ConversionPolicy* StyleManager::GetConversionPolicy(const PropertyKey& categoryKey,
                                                             const PropertyKey& propertyKey) const {
  const std::shared_ptr<StyleCategory>* category = FindCategory(categoryKey);
  return category ? (*category)->GetConversionPolicy(propertyKey) : nullptr;
}

std::vector<PropertyKey> StyleManager::GetCategoryNames() const {
  std::vector<PropertyKey> names;
  names.reserve(m_categories.size());
  for (const auto& entry : m_categories)
    names.push_back(entry.first);
  return names;
}

std::vector<PropertyKey> StyleManager::GetStylePropertyNames(const PropertyKey& categoryKey) const {
  const std::shared_ptr<StyleCategory>* category = FindCategory(categoryKey);
  return category ? (*category)->GetPropertyOrder() : std::vector<PropertyKey>();
}

ZelStringT<char16_t> StyleManager::TranslateCategory(const PropertyKey& key) const {
  if (const std::shared_ptr<StyleCategory>* category = FindCategory(key))
    return (*category)->GetUIName();
  throw std::exception();
}

PropertyKey StyleManager::UntranslateCategory(const ZelStringT<char16_t>& uiName) const {
  for (const auto& entry : m_categories) {
    if (entry.second->GetUIName().Compare(uiName, kCompareCaseSensitive) == 0)
      return entry.first;
  }
  return PropertyKey::Empty;
}

void StyleManager::ClearImportStyleInfo() {
  // Clearing an empty hashed container still walks its buckets.
  if (!m_importStyleInfo.names.empty())
    m_importStyleInfo.names.clear();
  if (!m_importStyleInfo.renames.empty())
    m_importStyleInfo.renames.clear();
}

void StyleManager::Reset() {
  PreDestroyAllInReverseOrder();
  m_categoryOrder.clear();
  m_categories.clear();
  m_substyleSetCategories.clear();
}

StyleManager& GetStyleManager() { return ZelUtils::Singleton<StyleManager>::Get(); }

void DeregisterStyleCategory() { GetStyleManager().DeregisterCategory(StyleCategoryName); }

void ResetStyleManager() { GetStyleManager().Reset(); }

} // namespace Styles
