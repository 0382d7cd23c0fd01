#include <Internal/NativePath.h>

#include <unicode/ustring.h>

#include <cstdint>

namespace ZelPlatform {
namespace detail {

bool ToNativePath(const ZelStringT<char16_t>& path, std::string& out) {
  if (path.IsEmpty() || path.GetLength() > INT32_MAX / 3 ||
      path.GetView().find(u'\0') != std::u16string_view::npos)
    return false;
  // Every UTF-16 unit becomes at most three UTF-8 bytes.
  out.assign(path.GetLength() * 3, '\0');
  int32_t length = 0;
  UErrorCode error = U_ZERO_ERROR;
  u_strToUTF8(out.data(), static_cast<int32_t>(out.size()), &length,
              reinterpret_cast<const UChar*>(path.data()), static_cast<int32_t>(path.GetLength()),
              &error);
  if (U_FAILURE(error))
    return false;
  out.resize(static_cast<std::size_t>(length));
  return true;
}

} // namespace detail
} // namespace ZelPlatform
