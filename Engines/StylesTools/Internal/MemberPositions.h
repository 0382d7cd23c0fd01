// Where diagnostics point in a document's text: a second, light pass over JSON
// text that the parser has accepted, since parsed values keep no positions.
#pragma once

#include <StylesTools/Diagnostics.h>

#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <utility>
#include <vector>

namespace Styles {
namespace Tools {
namespace detail {

// Line and column (from 1, columns in characters) of each UTF-16 offset in
// `offsets`, which must be sorted; one sweep over the text.
std::vector<std::pair<int, int>> LinesAndColumns(const ZelStringT<char16_t>& text,
                                                 const std::vector<std::size_t>& offsets);

// Gives every diagnostic that names a member of `text` and has no position yet
// the line and column where that member's name (or array element) starts. A
// repeated name is found at each later occurrence in turn by the diagnostics
// that report the repetition, and at its first by the others.
void LocateMembers(const ZelStringT<char16_t>& text, std::vector<Diagnostic>& diagnostics);

} // namespace detail
} // namespace Tools
} // namespace Styles
