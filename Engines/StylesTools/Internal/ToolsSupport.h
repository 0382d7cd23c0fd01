// Helpers shared by the toolkit's units and never installed: text in UTF-8
// and UTF-16, JSON Pointers and the text form of property values.
#pragma once

#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <string>
#include <string_view>

namespace Styles {
class BaseStyleProperty;

namespace Tools {
namespace detail {

using Text = ZelStringT<char16_t>;

// ASCII or UTF-8 text as UTF-16.
inline Text Widen(const std::string& text) { return Text(ZelPlatform::Utf8ToUtf16(text)); }

// `base` followed by one JSON Pointer token ("~" as "~0", "/" as "~1").
// Appends "/" and `token`, escaped as a JSON Pointer token ("~0", "~1").
void AppendPointerToken(std::u16string& pointer, std::u16string_view token);
Text AppendPointer(const Text& base, std::u16string_view token);
Text AppendPointer(const Text& base, std::size_t index);

// A text in double quotes for messages.
Text Quoted(const Text& text);

} // namespace detail
} // namespace Tools
} // namespace Styles
