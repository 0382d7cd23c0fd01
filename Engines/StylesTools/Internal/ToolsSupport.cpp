#include <Internal/ToolsSupport.h>

#include <string>

namespace Styles {
namespace Tools {
namespace detail {

void AppendPointerToken(std::u16string& pointer, std::u16string_view token) {
  pointer += u'/';
  for (const char16_t c : token) {
    if (c == u'~')
      pointer += u"~0";
    else if (c == u'/')
      pointer += u"~1";
    else
      pointer += c;
  }
}

Text AppendPointer(const Text& base, std::u16string_view token) {
  std::u16string pointer = base.GetStdString();
  pointer.reserve(pointer.size() + token.size() + 1);
  AppendPointerToken(pointer, token);
  return Text(std::move(pointer));
}

Text AppendPointer(const Text& base, std::size_t index) {
  return AppendPointer(base, Widen(std::to_string(index)).GetView());
}

Text Quoted(const Text& text) { return u"\"" + text + u"\""; }

} // namespace detail
} // namespace Tools
} // namespace Styles
