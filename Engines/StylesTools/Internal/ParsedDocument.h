// Validation of a compact parse, shared by the diagnostics and the checked
// import, which live in separate units.
#pragma once

#include <StylesTools/Diagnostics.h>

#include <ZelPlatform/ZelString.h>

#include <vector>

namespace Json {
class Document;
} // namespace Json

namespace Styles {
class StyleSheet;

namespace Tools {
namespace detail {

// Parses `text` into `document`, whose strings stay in `text`; on failure
// `diagnostics` gets why ("invalid-json" or "not-an-object") and false is
// returned.
bool ParseDocument(const ZelStringT<char16_t>& text, Json::Document& document,
                   std::vector<Diagnostic>& diagnostics);

// ValidateDocument on a document that ParseDocument accepted.
std::vector<Diagnostic> ValidateParsed(const Json::Document& document, const StyleSheet* target,
                                       bool replace);

} // namespace detail
} // namespace Tools
} // namespace Styles
