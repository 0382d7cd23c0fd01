#include <Styles/StyleCategory.h>

#include <Styles/StyleProperty.h>

#include <algorithm>
#include <exception>

namespace Styles {

StyleCategory::StyleCategory(const PropertyKey& key, const ZelStringT<char16_t>& uiName, bool flag)
    : m_key(key), m_uiName(uiName), m_flag(flag) {}

StyleCategory::~StyleCategory() = default;

void StyleCategory::RegisterProperty(const PropertyKey& key, BaseStyleProperty* property) {
  // The first registration wins; the caller keeps an object that was refused.
  if (m_properties.find(key) != m_properties.end())
    return;
  // Everything that allocates comes first, so that a failure changes nothing.
  m_propertyOrder.reserve(m_propertyOrder.size() + 1);
  m_byKey.reserve(m_byKey.size() + 1);
  const auto entry = m_properties.emplace(key, property).first;
  try {
    m_byName.emplace(key.GetView(), property);
  } catch (...) {
    m_properties.erase(entry);
    throw;
  }
  m_propertyOrder.push_back(key);
  const auto at = std::lower_bound(m_byKey.begin(), m_byKey.end(), key,
                                   [](const auto& item, PropertyKey k) { return item.first < k; });
  m_byKey.emplace(at, key, property);
}

BaseStyleProperty* StyleCategory::GetStyleProperty(const PropertyKey& key) const {
  // A flat array keyed by identity: scanned while short, halved when long.
  constexpr std::size_t kScanLimit = 16;
  if (m_byKey.size() <= kScanLimit) {
    for (const auto& entry : m_byKey)
      if (entry.first == key)
        return entry.second;
    return nullptr;
  }
  const auto at =
      std::lower_bound(m_byKey.begin(), m_byKey.end(), key,
                       [](const auto& entry, PropertyKey k) { return entry.first < k; });
  return at != m_byKey.end() && at->first == key ? at->second : nullptr;
}

BaseStyleProperty* StyleCategory::FindStyleProperty(std::u16string_view name) const {
  const auto found = m_byName.find(name);
  return found != m_byName.end() ? found->second : nullptr;
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
  m_byKey.clear();
  m_byName.clear();
}

} // namespace Styles
