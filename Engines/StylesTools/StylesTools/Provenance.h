/// @file
/// Provenance of effective values: where a style's value of a property comes
/// from (the style itself, an ancestor, the substyle of an owner's parent, or
/// the category default), resolved exactly as Style::GetProperty resolves it,
/// and the list of a style's effective values, substyles included as paths.
#pragma once

#include <StylesTools/Export.h>

#include <Styles/Style.h>
#include <Styles/StyleUtilities.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>

#include <cstddef>
#include <unordered_map>
#include <utility>
#include <vector>

namespace Styles {

class BaseStyleProperty;
class StyleCategory;
class StyleSheet;

namespace Tools {

/// Where an effective value comes from.
enum class ValueSource {
  Own,      ///< the style sets the value itself
  Ancestor, ///< an ancestor along the style's parent chain sets it
  Owner,    ///< found through owner-based inheritance: the counterpart of a
            ///< substyle under an owner's parent, or one of its ancestors
  Default   ///< the category default
};

/// An effective value and where it comes from. Pointers are not owned and stay
/// valid as long as the styles and categories involved.
struct STYLES_TOOLS_API Resolution {
  /// The very object Style::GetProperty returns.
  const ZelUtils::Any* value = nullptr;
  /// Where the value comes from.
  ValueSource source = ValueSource::Default;
  /// The style whose own value it is; null for a default.
  const Style* holder = nullptr;
  /// For a default, the category that supplies it.
  const StyleCategory* category = nullptr;
  /// For owner-based inheritance, the first owner whose parent was followed.
  const Style* owner = nullptr;
};

/// Resolves `key` on `style` step by step as Style::GetProperty does, with the
/// same result object and the same exceptions (std::bad_cast when an owner's
/// parent holds no substyle where one must be, std::exception for a key that
/// nobody holds and the category does not register). A property marked
/// perStyle (PropertySchema) without an own value resolves to the default,
/// as the style's flattened copy holds it.
STYLES_TOOLS_API Resolution ResolveProperty(const Style& style, const PropertyKey& key);
/// Resolves the end of `path` as Style::GetPathProperty does: through own
/// substyles, and where the path leaves them, the default of the category
/// reached through element categories. Throws what GetPathProperty throws.
/// Unlike GetSubstyleProperty and ListEffectiveValues, it does not take a
/// substyle the style inherits, so the two can answer differently.
STYLES_TOOLS_API Resolution ResolvePathProperty(const Style& style, const PropertyPath& path);

/// One effective value of a style, at a path such as "character.fontSize" or
/// "cells[1].padding" (list elements are numbered from 0).
struct STYLES_TOOLS_API EffectiveValue {
  /// The path as text, as in the examples above.
  ZelStringT<char16_t> path;
  /// The path's last key.
  PropertyKey key;
  /// The behaviour of `key` in the category of the style the path reaches.
  const BaseStyleProperty* behaviour = nullptr;
  /// The value and where it comes from.
  Resolution resolution;
  /// The value is a list of substyles; its elements follow as entries of
  /// their own.
  bool isList = false;
};

/// Remembers resolutions so that resolving the same keys on many styles of
/// one sheet costs each style once, not once per descendant: listing the
/// effective values of every style of a chain is then linear in its length.
/// Results equal ResolveProperty's. The styles must not change, nor be
/// destroyed, while the cache is in use.
class STYLES_TOOLS_API ResolutionCache {
public:
  ResolutionCache();
  ~ResolutionCache();
  ResolutionCache(const ResolutionCache&) = delete;
  ResolutionCache& operator=(const ResolutionCache&) = delete;

  /// ResolveProperty(style, key), remembered for `style` and the ancestors
  /// it climbs through. Throws what ResolveProperty throws.
  Resolution Resolve(const Style& style, const PropertyKey& key);

private:
  using Entry = std::pair<const Style*, PropertyKey>;
  struct EntryHash {
    std::size_t operator()(const Entry& entry) const noexcept;
  };
  std::unordered_map<Entry, Resolution, EntryHash> m_resolutions;
};

/// Every effective value of `style`, in the registration order of each
/// category: what the style's flattened copy (Style::CreateFlattenedStyle)
/// holds. A substyle the style inherits but does not own is resolved as the
/// empty own substyle that flattening would give it, through the owners; a
/// substyle property with no effective substyle lists nothing. Throws what
/// lookups throw.
STYLES_TOOLS_API std::vector<EffectiveValue> ListEffectiveValues(const Style& style);
/// ListEffectiveValues(style), resolving through `cache` (see ResolutionCache):
/// the way to list the values of many styles of one sheet.
STYLES_TOOLS_API std::vector<EffectiveValue> ListEffectiveValues(const Style& style,
                                                                 ResolutionCache& cache);

/// The text of a value: a plain value through the behaviour's conversion
/// policy, a list of substyles as its length; empty when there is no text form.
STYLES_TOOLS_API ZelStringT<char16_t> FormatValue(const BaseStyleProperty& behaviour,
                                                  const ZelUtils::Any& value);
/// Where `style` lives in `sheet`: its name, or for a substyle the name of its
/// outermost owner followed by the keys down to it ("Heading › character");
/// empty when the style is null or belongs to no style of the sheet.
STYLES_TOOLS_API ZelStringT<char16_t> DescribeStyle(const StyleSheet& sheet, const Style* style);

} // namespace Tools
} // namespace Styles
