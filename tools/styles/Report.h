// `styles report`: one self-contained HTML page that draws a sheet's
// inheritance graphs and shows each style's effective values with their
// sources, and with an older sheet, what changed. The page's markup, style
// and script live in report/report.html; the sheet's data goes into it as JSON.
#pragma once

#include "Output.h"

#include <string>
#include <string_view>

namespace StylesCommand {

// The page for `sheet`, read from the document `title`. With `oldSheet` (not
// owned; may be null), read from `oldTitle`, the styles added, removed and
// changed are marked. Throws what lookups throw.
std::string BuildReport(const Styles::StyleSheet& sheet, const std::string& title,
                        const Styles::StyleSheet* oldSheet, const std::string& oldTitle);

// Writes `text` to the file `path`, or to standard output when `path` is
// empty; the exit status, with the reason on standard error when it fails.
int WriteOutput(const std::string& text, const std::string& path);

// report/report.html as it was when the program was built.
std::string_view ReportTemplate();

} // namespace StylesCommand
