// Sorting by merging ascending runs, for lists that arrive mostly in order.
// The name index uses it to put newly filed names in name order.
#pragma once

#include <algorithm>
#include <cstddef>
#include <vector>

namespace Styles {
namespace detail {

// Sorts a range whose ascending runs are already long, as the names of a
// document usually are (each category lists its styles in name order), by
// merging the runs; a range of many runs is sorted afresh.
template <class Iterator, class Less> void SortRuns(Iterator first, Iterator last, Less less) {
  constexpr std::size_t kMostRuns = 64;
  std::vector<Iterator> bounds{first};
  for (Iterator it = first; it != last && bounds.size() <= kMostRuns; ++it)
    if (it + 1 != last && less(*(it + 1), *it))
      bounds.push_back(it + 1);
  if (bounds.size() > kMostRuns) {
    std::sort(first, last, less);
    return;
  }
  bounds.push_back(last);
  while (bounds.size() > 2) {
    std::vector<Iterator> merged{first};
    for (std::size_t i = 0; i + 2 < bounds.size(); i += 2) {
      std::inplace_merge(bounds[i], bounds[i + 1], bounds[i + 2], less);
      merged.push_back(bounds[i + 2]);
    }
    if (bounds.size() % 2 == 0)
      merged.push_back(last);
    bounds.swap(merged);
  }
}

} // namespace detail
} // namespace Styles
