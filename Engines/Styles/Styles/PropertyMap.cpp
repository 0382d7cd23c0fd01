// The property map's edits; the map itself, with its lookups, is declared in
// Style.h because every style holds one.
#include <Styles/Style.h>

#include <cstddef>
#include <utility>

namespace Styles {

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

} // namespace Styles
