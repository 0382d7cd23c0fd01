#include <Styles/StyleCategory.h>

#include <Styles/StyleProperty.h>

#include <algorithm>
#include <cstring>
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
  const std::size_t count = m_properties.size() + 1;
  std::vector<std::pair<PropertyKey, BaseStyleProperty*>> byKey;
  if (count * 2 > m_byKey.size()) {
    byKey.resize(std::max<std::size_t>(16, m_byKey.size() * 2));
    for (const auto& [known, behaviour] : m_byKey)
      if (behaviour)
        PlaceByKey(byKey, known, behaviour);
  }
  std::vector<std::pair<std::u16string_view, BaseStyleProperty*>> byName;
  if (count * 2 > m_byName.size()) {
    byName.resize(std::max<std::size_t>(8, m_byName.size() * 2));
    for (const auto& [name, behaviour] : m_byName)
      if (behaviour)
        PlaceByName(byName, name, behaviour);
  }
  m_properties.emplace(key, property);
  // Nothing below throws.
  if (!byName.empty())
    m_byName.swap(byName);
  if (!byKey.empty())
    m_byKey.swap(byKey);
  PlaceByName(m_byName, key.GetView(), property);
  // A null behaviour is found as no behaviour, so it needs no slot.
  if (property)
    PlaceByKey(m_byKey, key, property);
  m_propertyOrder.push_back(key);
}

namespace {

// The first slot to try for `key` in a by-key table of `size` slots (a power
// of two): keys are identities, whose low bits are alike, so mix them.
std::size_t FirstSlot(const PropertyKey& key, std::size_t size) {
  return static_cast<std::size_t>((key.getHash() * 0x9E3779B97F4A7C15ull) >> 32) & (size - 1);
}

} // namespace

void StyleCategory::PlaceByKey(std::vector<std::pair<PropertyKey, BaseStyleProperty*>>& table,
                               const PropertyKey& key, BaseStyleProperty* property) {
  std::size_t slot = FirstSlot(key, table.size());
  while (table[slot].second)
    slot = (slot + 1) & (table.size() - 1);
  table[slot] = {key, property};
}

BaseStyleProperty* StyleCategory::GetStyleProperty(const PropertyKey& key) const {
  // An open-addressing table by key identity, half full at most.
  if (m_byKey.empty())
    return nullptr;
  for (std::size_t slot = FirstSlot(key, m_byKey.size());;
       slot = (slot + 1) & (m_byKey.size() - 1)) {
    const auto& entry = m_byKey[slot];
    if (!entry.second || entry.first == key)
      return entry.second;
  }
}

namespace {

// A cheap hash of a property name: its length and three of its characters.
std::size_t HashName(std::u16string_view name) {
  std::size_t hash = name.size();
  if (!name.empty())
    hash = ((hash * 31 + name.front()) * 31 + name[name.size() / 2]) * 31 + name.back();
  return hash;
}

} // namespace

void StyleCategory::PlaceByName(
    std::vector<std::pair<std::u16string_view, BaseStyleProperty*>>& table,
    std::u16string_view name, BaseStyleProperty* property) {
  const std::size_t mask = table.size() - 1;
  std::size_t i = HashName(name) & mask;
  while (table[i].second)
    i = (i + 1) & mask;
  table[i] = {name, property};
}

BaseStyleProperty* StyleCategory::FindStyleProperty(std::u16string_view name) const {
  if (m_byName.empty())
    return nullptr;
  const std::size_t mask = m_byName.size() - 1;
  for (std::size_t i = HashName(name) & mask; m_byName[i].second; i = (i + 1) & mask) {
    const std::u16string_view candidate = m_byName[i].first;
    if (candidate.size() == name.size() &&
        std::memcmp(candidate.data(), name.data(), name.size() * sizeof(char16_t)) == 0)
      return m_byName[i].second;
  }
  return nullptr;
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
