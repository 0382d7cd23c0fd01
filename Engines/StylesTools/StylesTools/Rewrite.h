/// @file
/// Rewriting documents without losing what the library holds: a sheet or a
/// style written with its temporary values at every depth (a plain export
/// keeps them only at the top of each style), and which diagnostics tell of
/// content that reading a document and writing it again cannot keep.
#pragma once

#include <StylesTools/Diagnostics.h>
#include <StylesTools/Export.h>

namespace Json {
class Value;
} // namespace Json

namespace Styles {

class Style;
class StyleSheet;

namespace Tools {

/// Replaces `out` with the JSON document of `sheet`: what
/// StyleSheet::ExportJson writes with temporary values, and the temporary
/// values of substyles at any depth too. Nothing is owned or changed.
STYLES_TOOLS_API void ExportComplete(const StyleSheet& sheet, Json::Value& out);
/// Replaces `out` with the JSON object of `style` written the same way; names
/// of parents are looked up in `sheet`.
STYLES_TOOLS_API void SerializeComplete(const StyleSheet& sheet, const Style& style,
                                        Json::Value& out);

/// Whether `diagnostic` tells of something in a document that reading it and
/// writing it again loses or changes: an unregistered category, property or
/// member, a value newer than the document's version, a value replaced or
/// rounded, a repeated member, a name already taken.
STYLES_TOOLS_API bool LosesContent(const Diagnostic& diagnostic);

} // namespace Tools
} // namespace Styles
