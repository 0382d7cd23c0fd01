// The version member of a sheet document as an int, shared by the library's
// import and the toolkit's checks so that both read it alike. Not installed.
#pragma once

#include <climits>
#include <cmath>

namespace Styles {
namespace detail {

// Truncated toward zero; values beyond the range of int are clamped so that
// no input makes the conversion undefined, and NaN reads as 0.
inline int TruncateVersion(double number) {
  if (std::isnan(number))
    return 0;
  const double truncated = std::trunc(number);
  if (truncated <= static_cast<double>(INT_MIN))
    return INT_MIN;
  if (truncated >= static_cast<double>(INT_MAX))
    return INT_MAX;
  return static_cast<int>(truncated);
}

} // namespace detail
} // namespace Styles
