/// @file
/// Reading and writing the styles of Word files: a package (.docx, .dotx,
/// .docm, .dotm), whose styles part is found through the package
/// relationships, or a bare styles part. The sheet must be read and written
/// while the Word schema (WordSchema.h) is registered with the manager.
#pragma once

#include <StylesWord/Export.h>

#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace Styles {

class StyleSheet;

namespace Word {

/// What is wrong with a file, naming the part and the element at fault.
struct STYLES_WORD_API Problem {
  /// The part in the package ("word/styles.xml"); empty for the package itself.
  ZelStringT<char16_t> part;
  /// The element at fault ("w:style \"Heading1\""); empty for the whole part.
  ZelStringT<char16_t> element;
  /// What is wrong, in one sentence.
  ZelStringT<char16_t> message;
};

/// The problems of a read: an error that stopped it, and warnings about what
/// was read in a repaired form.
struct STYLES_WORD_API ReadReport {
  /// Set when the read failed.
  Problem error;
  /// Styles based on themselves or on missing styles, duplicate IDs, values
  /// not of their unit's form (kept as raw XML), ...
  std::vector<Problem> warnings;
};

/// Bounds that keep hostile files from taking unbounded memory or time.
struct STYLES_WORD_API Limits {
  /// The most bytes a part may have once uncompressed; larger parts are not
  /// read (a ZIP bomb stops here, whatever sizes the archive claims).
  std::size_t maxPartSize = 64u << 20;
  /// The most entries a package may have.
  std::size_t maxEntries = 10000;
};

/// Whether `bytes` look like a Word file: a ZIP archive that holds package
/// relationships, or XML whose root element is w:styles.
STYLES_WORD_API bool IsWordFile(std::string_view bytes);

/// Replaces the contents of `sheet` with the styles of a package or a bare
/// styles part in `bytes`. False, with report.error telling why, when the file
/// cannot be read: the sheet is then empty. Warnings do not fail the read.
STYLES_WORD_API bool ReadWord(std::string_view bytes, StyleSheet& sheet, ReadReport& report,
                              const Limits& limits = Limits());

/// The styles part that holds the styles of `sheet`, as XML text. Styles of
/// other categories than the Word schema's are left out.
STYLES_WORD_API std::string WriteStylesPart(const StyleSheet& sheet);

/// A copy of the package `package` in which only the styles part is replaced
/// by that of `sheet`; every other part keeps its bytes. False, with `error`
/// telling why, when `package` is not a package with a styles part.
STYLES_WORD_API bool WriteIntoPackage(std::string_view package, const StyleSheet& sheet,
                                      std::string& out, Problem& error,
                                      const Limits& limits = Limits());

/// The text of the styles part of the package `package`, found through its
/// relationships. False, with `error` set, when there is none or it cannot be
/// read.
STYLES_WORD_API bool ReadStylesPart(std::string_view package, std::string& xml, Problem& error,
                                    const Limits& limits = Limits());
/// The names of the parts of the package `package`, in archive order; empty
/// when it is not a readable archive.
STYLES_WORD_API std::vector<std::string> ListParts(std::string_view package);
/// The bytes of the part `name` of `package`. False, with `error` set, when it
/// is missing, damaged or beyond the limits.
STYLES_WORD_API bool ReadPart(std::string_view package, const std::string& name, std::string& bytes,
                              Problem& error, const Limits& limits = Limits());

/// Whether two XML texts are equal after canonicalisation: declarations,
/// white space between elements and the order of attributes do not count.
/// False when either is not well-formed XML.
STYLES_WORD_API bool SameXml(std::string_view a, std::string_view b);

} // namespace Word
} // namespace Styles
