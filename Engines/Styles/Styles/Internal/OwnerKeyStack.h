// The owner-key stack: the property keys that lead from a style up through
// its owners, collected by an owner-based lookup of a value. Used by Style's
// lookups only.
#pragma once

#include <Styles/Style.h>

#include <cstddef>
#include <vector>

namespace Styles {
namespace detail {

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

} // namespace detail
} // namespace Styles
