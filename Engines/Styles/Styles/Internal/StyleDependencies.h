// Sheet-wide dependency queries, answered with a memo so that the parent
// chains the styles share are walked once. Used by the sheet.
#pragma once

#include <Styles/Style.h>

#include <vector>

namespace Styles {
namespace detail {

// Appends to `out`, in their order, the styles of `styles` for which
// HasDependency(span, false) holds, answering every shared ancestor once.
void AppendDependents(const std::vector<Style*>& styles, StyleSpan span, std::vector<Style*>& out);

} // namespace detail
} // namespace Styles
