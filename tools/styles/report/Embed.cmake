# Writes a C++ source that returns the bytes of INPUT as ReportTemplate().
# Run at build time; the page itself is edited as an ordinary HTML file.
file(READ "${INPUT}" bytes HEX)
string(LENGTH "${bytes}" length)
math(EXPR size "${length} / 2")
string(REGEX REPLACE "([0-9a-f][0-9a-f])" "0x\\1," bytes "${bytes}")
string(REGEX REPLACE "((0x..,){24})" "\\1\n  " bytes "${bytes}")
file(WRITE "${OUTPUT}" "// Generated from report.html at build time; edit that file instead.
#include \"Report.h\"

namespace StylesCommand {

namespace {
const unsigned char kReportTemplate[] = {
  ${bytes}
};
} // namespace

std::string_view ReportTemplate() { return std::string_view(reinterpret_cast<const char*>(kReportTemplate), ${size}); }

} // namespace StylesCommand
")
