#include <Styles/StyleCategory.h>

#include <Styles/StyleProperty.h>

#include <exception>

namespace Styles {

StyleCategory::StyleCategory(const PropertyKey& key, const ZelStringT<char16_t>& uiName, bool flag)
    : m_key(key), m_uiName(uiName), m_flag(flag) {}

StyleCategory::~StyleCategory() = default;

void StyleCategory::RegisterProperty(const PropertyKey& key, BaseStyleProperty* property) {
  // The first registration wins; the caller keeps an object that was refused.
  if (m_properties.find(key) != m_properties.end())
    return;
  m_propertyOrder.push_back(key);
  m_properties.emplace(key, property);
}

BaseStyleProperty* StyleCategory::GetStyleProperty(const PropertyKey& key) const {
  const auto it = m_properties.find(key);
  return it != m_properties.end() ? it->second : nullptr;
}

const ZelUtils::Any& StyleCategory::GetDefaultValue(const PropertyKey& key) const {
  const BaseStyleProperty* property = GetStyleProperty(key);
  if (!property)
    throw std::exception();
  return property->GetDefaultValue();
}

ZelPref::ConversionPolicy* StyleCategory::GetConversionPolicy(const PropertyKey& key) const {
  const BaseStyleProperty* property = GetStyleProperty(key);
  return property ? property->GetConversionPolicy() : nullptr;
}

void StyleCategory::PreDestroyProperties() {
  for (auto& entry : m_properties) {
    delete entry.second;
    entry.second = nullptr;
  }
  m_properties.clear();
}

} // namespace Styles
