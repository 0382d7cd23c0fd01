/// @file
/// Diagnostics of style sheet documents: every problem that a plain import
/// passes over in silence, each with a stable code and a JSON Pointer to the
/// member, checked against the categories registered with the manager; and an
/// all-or-nothing import built on the same checks.
#pragma once

#include <StylesTools/Export.h>

#include <ZelPlatform/ZelString.h>

#include <string>
#include <vector>

namespace Json {
class Document;
class Object;
} // namespace Json

namespace Styles {

class StyleSheet;

namespace Tools {

/// Whether a diagnostic is an error or a warning; see Diagnostic.
enum class Severity { Error, Warning };

/// An error means that a plain import fails or reads the document otherwise
/// than it is written; a warning, that something is skipped or adjusted.
/// Codes, stable across versions (tools match on them):
/// - errors:   invalid-json, not-an-object, style-not-object, wrong-kind,
///             bad-value, type-rejected, missing-parent, inheritance-cycle,
///             parent-category, duplicate-name, duplicate-member,
///             reserved-name, nothing-read, behaviour-failed
/// - warnings: unknown-category, unknown-property, unknown-member,
///             value-replaced, number-rounded, version-too-new,
///             property-too-new, deprecated-property, name-taken
struct STYLES_TOOLS_API Diagnostic {
  /// Error or warning.
  Severity severity = Severity::Error;
  /// One of the stable codes above.
  std::string code;
  /// RFC 6901 pointer to the member concerned; empty for the whole document.
  ZelStringT<char16_t> pointer;
  /// One sentence for people; its wording may change between versions.
  ZelStringT<char16_t> message;
  ///@{

  /// Line and column (from 1, in characters) where the text stops being JSON,
  /// or where the member the pointer names starts, when the diagnostic came
  /// from checking text; else 0.
  int line = 0;
  int column = 0;
  ///@}
};

/// Whether any of `diagnostics` is an error.
STYLES_TOOLS_API bool HasErrors(const std::vector<Diagnostic>& diagnostics);

/// Every problem of the document `text`: those of the sheet's members and
/// style names first, then those inside each style in document order, then
/// parent cycles. Names that "inherits" uses resolve among the document's own
/// styles.
STYLES_TOOLS_API std::vector<Diagnostic> ValidateDocument(const ZelStringT<char16_t>& text);
/// The same for a parsed document. With a `target`, the document is checked as
/// an import into it with `replace` would read it: "inherits" may name the
/// target's styles, parent cycles may run through them, and (without
/// `replace`) names the target holds already are reported as not imported.
STYLES_TOOLS_API std::vector<Diagnostic> ValidateDocument(const Json::Object& document,
                                                          const StyleSheet* target = nullptr,
                                                          bool replace = false);

/// Gives each of `diagnostics` that names a member of the JSON text `text` and
/// has no line yet the line and column where that member starts (ValidateDocument
/// and ImportChecked on text do this themselves). A diagnostic that reports a
/// repeated name points at the repetition.
STYLES_TOOLS_API void LocateDiagnostics(const ZelStringT<char16_t>& text,
                                        std::vector<Diagnostic>& diagnostics);

/// Imports `text` into `target` all or nothing. The document is validated
/// against the target first; then it is imported into a scratch sheet that
/// stands in for the target (empty stand-ins of the target's styles under
/// their names, with their parent links), so that "inherits", replacement and
/// cycles resolve exactly as in a plain import into the target. Only when no
/// error was found and no behaviour threw are the new styles moved into the
/// target (with AddStyle, after every target style that referred to a style
/// they replace refers to its successor), and the version and external ID
/// taken. On success the target ends as StyleSheet::ImportFromString would
/// leave it; on failure it is untouched and false is returned. `diagnostics`
/// (may be null) receives every diagnostic, warnings included.
STYLES_TOOLS_API bool ImportChecked(StyleSheet& target, const ZelStringT<char16_t>& text,
                                    bool replace, std::vector<Diagnostic>* diagnostics);
/// The same, letting go of `text` (left empty) as soon as the document has
/// been read, before the new styles move into the target. The diagnostics
/// get no positions for members: LocateDiagnostics gives them.
STYLES_TOOLS_API bool ImportChecked(StyleSheet& target, ZelStringT<char16_t>&& text, bool replace,
                                    std::vector<Diagnostic>* diagnostics);
/// The same for a parsed document, which is not changed (StyleSheet::ImportJson
/// takes it as non-const).
STYLES_TOOLS_API bool ImportChecked(StyleSheet& target, Json::Object& document, bool replace,
                                    std::vector<Diagnostic>* diagnostics);
/// The same, letting go of `document` (left empty) as soon as it has been
/// read, before the new styles move into the target: a large document and
/// its styles are then not held twice.
STYLES_TOOLS_API bool ImportChecked(StyleSheet& target, Json::Object&& document, bool replace,
                                    std::vector<Diagnostic>* diagnostics);

/// The part of `document` that the styles called `names` (letter case
/// ignored) depend on: the sheet's own members, and every style member, in
/// every registered category and in document order, whose name is one of
/// `names` or is named by an "inherits" inside such a member, again and again.
/// Reading it into an empty sheet gives those styles the same effective values
/// as reading the whole document, at the cost of their dependencies only.
STYLES_TOOLS_API Json::Object SelectStyles(const Json::Object& document,
                                           const std::vector<ZelStringT<char16_t>>& names);
/// The same, moving the part out of `document` instead of copying it; what is
/// left of `document` is unspecified, and each category's unselected members
/// are freed as the part is taken, so that a large document is never held twice.
STYLES_TOOLS_API Json::Object SelectStyles(Json::Object&& document,
                                           const std::vector<ZelStringT<char16_t>>& names);
/// The part of the compact parse `document` that the styles called `names`
/// depend on, as SelectStyles chooses it, written as compact JSON text; of
/// the sheet's own members only "version" and "id" are kept, since no other
/// bears on a style. Empty when the document is not an object.
STYLES_TOOLS_API ZelStringT<char16_t>
SelectStylesText(const Json::Document& document, const std::vector<ZelStringT<char16_t>>& names);

} // namespace Tools
} // namespace Styles
