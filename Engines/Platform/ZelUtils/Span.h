/// @file
/// ZelUtils::maybe_sorted_span: a read-only view of a range that knows whether
/// it is sorted, so that membership tests can be binary searches.
#pragma once

#include <algorithm>
#include <cstddef>
#include <functional>
#include <type_traits>
#include <vector>

namespace ZelUtils {

/// A view of elements of type `T` that it does not own, with a flag that says
/// whether they are sorted under `Less`.
template <class T, class Less = std::less<void>> class maybe_sorted_span {
public:
  /// The element type without const.
  using value_type = std::remove_const_t<T>;
  /// Pointer into the viewed elements.
  using iterator = T*;

  maybe_sorted_span() noexcept = default;
  /// [first, last) must stay alive while the span is used; `sorted` says it is
  /// in ascending order under Less.
  maybe_sorted_span(T* first, T* last, bool sorted) noexcept
      : m_first(first), m_last(last), m_sorted(sorted) {}
  ///@{

  /// Views the elements of `values`, which must outlive the span. A span of
  /// const elements also views a const vector.
  template <class Allocator>
  maybe_sorted_span(std::vector<value_type, Allocator>& values, bool sorted) noexcept
      : m_first(values.data()), m_last(values.data() + values.size()), m_sorted(sorted) {}
  template <class Allocator, class U = T, class = std::enable_if_t<std::is_const<U>::value>>
  maybe_sorted_span(const std::vector<value_type, Allocator>& values, bool sorted) noexcept
      : m_first(values.data()), m_last(values.data() + values.size()), m_sorted(sorted) {}
  ///@}

  ///@{

  /// The viewed elements, not owned by the span.
  T* begin() const noexcept { return m_first; }
  T* end() const noexcept { return m_last; }
  T* data() const noexcept { return m_first; }
  std::size_t size() const noexcept { return static_cast<std::size_t>(m_last - m_first); }
  bool empty() const noexcept { return m_first == m_last; }
  ///@}

  /// Whether the creator declared the elements sorted; never checked.
  bool is_sorted() const noexcept { return m_sorted; }
  /// Element `i`, which must be below size().
  T& operator[](std::size_t i) const noexcept { return m_first[i]; }

  /// Binary search when sorted, linear scan otherwise.
  template <class U> bool contains(const U& value) const {
    Less less;
    if (m_sorted) {
      T* found = std::lower_bound(m_first, m_last, value, less);
      return found != m_last && !less(value, *found);
    }
    return std::find_if(m_first, m_last, [&](const value_type& element) {
             return !less(element, value) && !less(value, element);
           }) != m_last;
  }

private:
  T* m_first = nullptr;
  T* m_last = nullptr;
  bool m_sorted = false;
};

/// `span` when its membership tests are cheap (it is sorted, or short enough
/// to scan); otherwise a sorted copy of it, kept in `storage`, so that many
/// tests against a long unsorted span cost a logarithm each.
template <class T, class Less>
maybe_sorted_span<T, Less> MakeSearchable(maybe_sorted_span<T, Less> span,
                                          std::vector<std::remove_const_t<T>>& storage) {
  constexpr std::size_t kLinearLimit = 16;
  if (span.is_sorted() || span.size() <= kLinearLimit)
    return span;
  storage.assign(span.begin(), span.end());
  std::sort(storage.begin(), storage.end(), Less());
  return maybe_sorted_span<T, Less>(storage, true);
}

} // namespace ZelUtils
