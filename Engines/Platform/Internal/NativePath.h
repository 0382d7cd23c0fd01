// Conversion of UTF-16 paths to the operating system's form, shared by the
// file units of the platform library. Not installed: hosts never include it.
#pragma once

#include <ZelPlatform/ZelString.h>

#include <string>

namespace ZelPlatform {
namespace detail {

// The UTF-8 form of `path` in `out`; false when the path cannot name a file
// (empty, an embedded NUL, unpaired surrogates).
bool ToNativePath(const ZelStringT<char16_t>& path, std::string& out);

} // namespace detail
} // namespace ZelPlatform
