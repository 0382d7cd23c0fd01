// Substyle-cycle dropping: after an import, the parents of substyles that
// inherit their way back to the style holding them are cut. Used by the
// document reader.
#pragma once

#include <vector>

namespace Styles {

class Style;

namespace detail {

// Drops the parent of every substyle, in the trees of `roots` and of the
// styles they lead to, whose parent leads back (through parents and other
// substyles' parents) to the style holding it: it would take values from a
// style holding it, which flattening or repairing copies without end.
void DropSubstyleCycles(const std::vector<Style*>& roots);

} // namespace detail
} // namespace Styles
