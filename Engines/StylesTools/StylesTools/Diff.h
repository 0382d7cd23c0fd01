/// @file
/// Differences between two style sheets, matched by style name ignoring letter
/// case within each category: styles added and removed, parents changed, own
/// values changed and, on request, effective values changed, each with the
/// property path it concerns.
#pragma once

#include <StylesTools/Export.h>

#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>

#include <vector>

namespace Styles {

class StyleSheet;

namespace Tools {

/// One difference between two sheets.
struct STYLES_TOOLS_API Difference {
  /// What changed.
  enum class Kind {
    Added,           ///< the style is only in the new sheet
    Removed,         ///< the style is only in the old sheet
    ParentChanged,   ///< "inherits" differs (path empty, or a substyle's path)
    ValueChanged,    ///< an own value was set, cleared or changed
    EffectiveChanged ///< what the style resolves to changed, its own value not
  };
  /// What changed.
  Kind kind = Kind::ValueChanged;
  /// The category of the style.
  PropertyKey category;
  /// The style's name, as the new sheet spells it when it has the style.
  ZelStringT<char16_t> style;
  /// "character.fontSize", "cells[0].padding"; empty for the style itself.
  ZelStringT<char16_t> path;
  ///@{

  /// Text of the old and new value (a parent's name for ParentChanged); empty
  /// with `hasOld`/`hasNew` false where there is none.
  ZelStringT<char16_t> oldValue;
  ZelStringT<char16_t> newValue;
  bool hasOld = false;
  bool hasNew = false;
  ///@}
};

/// The differences from `oldSheet` to `newSheet`, both read with the same
/// registered categories. Ordered by category key text, then by style name
/// ignoring case, then as the properties are registered. With `effective`,
/// every effective value (see ListEffectiveValues) that differs, where the own
/// value does not, is listed too. Throws what lookups throw.
STYLES_TOOLS_API std::vector<Difference> DiffSheets(const StyleSheet& oldSheet,
                                                    const StyleSheet& newSheet, bool effective);

} // namespace Tools
} // namespace Styles
