// A quick single pass that builds Json::Document's arrays from text that is
// plainly well-formed. It declines whatever it is not sure of (an error, an
// escaped surrogate, a number near a double's limits) so that the general
// reader, with its exact messages, takes over. Not installed.
#pragma once

#include <Json/Json.h>

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace Json {
namespace detail {

// Fills the arrays as the general reader's builder would for `source`, which
// is NUL-terminated and has no byte order mark. False when the scan declines;
// the arrays are then in no particular state.
bool ScanDocument(std::u16string_view source, std::u16string& copies, std::vector<double>& numbers,
                  std::vector<DocumentNode>& nodes, std::vector<std::uint8_t>& kinds);

// Converts the text of a JSON number, correctly rounded. Returns false when
// its magnitude is too big for a double; one too small becomes a signed zero.
bool ReadNumber(const char16_t* text, std::size_t length, double& number);

} // namespace detail
} // namespace Json
