/// @file
/// The Word schema: the categories and properties that the styles of Word
/// files are read into (paragraph, character, table, numbering and the styles
/// part's own settings), the names of the styles that stand for the document
/// defaults, and the effective run values that follow Word's toggle rule.
#pragma once

#include <StylesWord/Export.h>

#include <StylesTools/Schema.h>

#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>

#include <vector>

namespace Styles {

class StyleSheet;

namespace Word {

/// The Word schema. Lengths are held in points (converted exactly from
/// twentieths, halves and eighths of a point), line spacing under the "auto"
/// rule in lines, colours as "#RRGGBB" or "auto"; Word's own text is kept
/// where no number fits. docs/word.md lists every property with its unit.
STYLES_WORD_API Tools::Schema WordSchema();

/// The name of the style that holds the document defaults for styles of
/// `category` ("paragraph", "character", "table", "numbering"): every chain of
/// that category starts from it. Empty for other categories.
STYLES_WORD_API ZelStringT<char16_t> DefaultsStyleName(const PropertyKey& category);
/// The name of the style of category "document" that keeps the styles part's
/// own data: latent styles, the root element's attributes, theme fonts and the
/// order of the styles.
STYLES_WORD_API const char16_t* PartStyleName();
/// Whether `style`, or the outermost style that owns it, is one of the
/// defaults styles or the part style of `sheet`.
STYLES_WORD_API bool IsPartStyle(const StyleSheet& sheet, const Style* style);

/// Whether `key` is a toggle property of runs (bold, italic, caps, ...).
STYLES_WORD_API bool IsToggleProperty(const PropertyKey& key);

/// The styles that format a run, each null when not applied: a table style,
/// a paragraph style and a character style of one sheet.
struct STYLES_WORD_API RunStyles {
  /// A style of category "table"; its "character" substyle is the table's level.
  const Style* table = nullptr;
  /// The conditional formats of `table` that apply to the run's cell, such as
  /// "firstRow" or "band1Horz", in the order Word layers them (wholeTable,
  /// banded columns, banded rows, first and last column, first and last row,
  /// corner cells): what each one's "character" substyle sets replaces the
  /// table's value, within the table's level.
  std::vector<PropertyKey> formats;
  /// A style of category "paragraph"; its "character" substyle is its level.
  const Style* paragraph = nullptr;
  /// A style of category "character".
  const Style* character = nullptr;
};

/// A run property's effective value and the style whose own value decided it.
struct STYLES_WORD_API RunValue {
  /// The value; empty when neither a style nor the defaults set it.
  ZelUtils::Any value;
  /// The style (or substyle) that holds the deciding value; null for the
  /// category default. Not owned.
  const Style* source = nullptr;
};

/// The effective value of the character property `key` for a run formatted by
/// `styles` of `sheet`. Within one level (table, paragraph, character) the
/// nearest style along the parent chain that sets the key wins, as for any
/// property, and the table's conditional formats override the whole table. Across levels a plain property takes the last level's value; a
/// toggle property starts from the document defaults and is flipped by every
/// level whose value is true. Throws what Style::GetProperty throws.
STYLES_WORD_API RunValue ResolveRunProperty(const StyleSheet& sheet, const RunStyles& styles,
                                            const PropertyKey& key);

} // namespace Word
} // namespace Styles
