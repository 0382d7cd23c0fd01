/// @file
/// Free functions of the style library: registration of substyle properties
/// and of the category of ordinary styles, property paths (sequences of keys
/// that lead through substyles to a property), the category key of ordinary
/// styles, the cleaning of user-typed style names, and the substyle helpers:
/// lasting handles, overridden-property queries and substyle edits.
#pragma once

#include <Styles/Export.h>
#include <Styles/Style.h>

#include <functional>
#include <set>
#include <vector>

namespace Styles {

/// The key of the category of ordinary (top-level) styles, "style".
STYLES_API extern const PropertyKey StyleCategoryName;

/// Registers under `propertyKey` of category `categoryKey` a new substyle
/// property (StyleSetProperty) whose element category is `propertyKey`, owned
/// by the category. Nothing is registered, and nothing kept, when the
/// category is unknown or already has the key.
STYLES_API void RegisterSubstyleSet(const PropertyKey& categoryKey, const PropertyKey& propertyKey);
/// Registers the category of ordinary styles (StyleCategoryName) with
/// `uiName`, giving it one substyle property per category registered before
/// with addToStyleCategory, keyed by that category's key. Meant to run once,
/// after those categories; a later call adds only the keys still missing.
STYLES_API void RegisterStyleCategory(const ZelStringT<char16_t>& uiName);

/// A path of keys from the outermost style to a property; every key but the
/// last names a substyle-holding property.
using PropertyPath = std::vector<PropertyKey>;

///@{

/// Path builders; each result is allocated once at its final length.
STYLES_API PropertyPath MakePath(const PropertyKey& a);
STYLES_API PropertyPath MakePath(const PropertyKey& a, const PropertyKey& b);
STYLES_API PropertyPath MakePath(const PropertyKey& a, const PropertyKey& b, const PropertyKey& c);
STYLES_API PropertyPath MakePath(const PropertyPath& path, const PropertyKey& key);
STYLES_API PropertyPath MakePath(const PropertyKey& key, const PropertyPath& path);
STYLES_API PropertyPath MakePath(const PropertyPath& first, const PropertyPath& second);
///@}

/// One one-key path per key, in the set's (identity) order.
STYLES_API std::vector<PropertyPath> MakePaths(const std::set<PropertyKey>& keys);
/// One one-key path per key, in the vector's order, repeats kept.
STYLES_API std::vector<PropertyPath> MakePaths(const std::vector<PropertyKey>& keys);

/// The path whose keys are the pieces of `text` between "." characters. Every
/// piece is interned as it is; empty pieces become the empty key.
STYLES_API PropertyPath SplitPath(const ZelStringT<char16_t>& text);

/// The own single substyle of `style` under `setKey`, created empty from the
/// behaviour's element category when missing; null, with nothing changed,
/// when the key has no behaviour. Owned by `style`.
STYLES_API Style* GetOrCreateSubstyle(Style& style, const PropertyKey& setKey);

/// A copy of `name` fit to be a style or preset name. Strict mode keeps only
/// printable ASCII letters, digits, space and safe punctuation; lenient mode
/// removes tab, line feed, double quote and tilde. Both trim white space at
/// the ends afterwards; the result may be empty.
STYLES_API ZelStringT<char16_t> ConvertToValidStyleName(const ZelStringT<char16_t>& name,
                                                        bool restrictToAllowedCharacters);

// ---------------------------------------------------------------------------
// Lasting handles of substyles

/// A handle of a substyle that survives edits of its owners: the outermost
/// owner (the root) and the owner keys from it down to the substyle. It owns
/// only its path; the root must outlive every resolution.
class STYLES_API SubStyle {
public:
  /// The handle of `style` (implicit on purpose, so lists convert); a null
  /// style gives an empty handle, a top-level style an empty path.
  SubStyle(Style* style);
  /// A handle of the same root and path.
  SubStyle(const SubStyle& other);
  /// Leaves `other` empty: null root, empty path.
  SubStyle(SubStyle&& other) noexcept;
  /// Takes `other`'s root and path.
  SubStyle& operator=(const SubStyle& other);

  /// The substyle now found from the root along the path through own single
  /// substyles, or null; never creates or changes a style. A handle of an
  /// element of a substyle list resolves to null: the path holds no index.
  operator Style*() const;

  /// The outermost owner, or the style itself when it has no owner; null for
  /// an empty handle. Not owned.
  Style* GetRoot() const noexcept { return m_root; }
  /// The owner keys, outermost first.
  const PropertyPath& GetPath() const noexcept { return m_path; }

private:
  Style* m_root;
  PropertyPath m_path;
};

/// One handle per style, in order; null styles give empty handles.
STYLES_API std::vector<SubStyle> StylesToSubStyles(const std::vector<Style*>& styles);
/// One resolved pointer per handle, in order; null entries are kept.
STYLES_API std::vector<Style*> SubStylesToStyles(const std::vector<SubStyle>& subStyles);

// ---------------------------------------------------------------------------
// Overridden properties

/// Every key registered in the style's category, which must exist.
STYLES_API std::set<PropertyKey> GetStyleCategoryProperties(const Style& style);
/// The keys the style sets itself, whatever their values.
STYLES_API std::set<PropertyKey> GetOverriddenProperties(const Style& style);
/// The paths of the leaf values the style sets itself, depth first in key
/// order: an own single substyle stands for the paths of its own values (none
/// when it is empty); a substyle list is a leaf. Throws std::bad_cast only
/// for a value of the substyle kind that cannot be read as one.
STYLES_API std::vector<PropertyPath> GetOverriddenPropertyPaths(const Style& style);
/// Appends the same paths, each after `prefix`; on an exception the paths
/// appended so far stay.
STYLES_API void GetOverriddenPropertyPaths(const Style& style, const PropertyPath& prefix,
                                           std::vector<PropertyPath>& paths);
/// One path per value set by the own single substyle under `setKey`, one
/// level deep: [setKey, key] with `includeSetKey`, else [key]. Empty when
/// there is no own single substyle.
STYLES_API std::vector<PropertyPath>
GetOverriddenSubstyleProperties(const Style& style, const PropertyKey& setKey, bool includeSetKey);

// ---------------------------------------------------------------------------
// Substyle helpers

/// The effective value of `key` in the effective substyle under `setKey`,
/// which must not be null. Throws std::bad_cast when that value is not a
/// substyle.
STYLES_API const ZelUtils::Any& GetSubstyleProperty(const Style& style, const PropertyKey& setKey,
                                                    const PropertyKey& key);
/// Copies the same value into `out`; false, `out` untouched, when `setKey` or
/// `key` resolves only to a default or is unregistered. Throws std::bad_cast
/// like the form above.
STYLES_API bool GetSubstyleProperty(const Style& style, const PropertyKey& setKey,
                                    const PropertyKey& key, ZelUtils::Any& out);
/// Sets `key` in the style's own substyle under `setKey`. Without one, an own
/// substyle of `category` is created first, holding only this value: an
/// inherited substyle is never written through. Throws std::bad_cast when the
/// own value under `setKey` is not a substyle (a value created for it stays).
STYLES_API void SetSubstyleProperty(Style& style, const PropertyKey& category,
                                    const PropertyKey& setKey, const PropertyKey& key,
                                    const ZelUtils::Any& value);
/// Clears `key` in the style's own substyle under `setKey`, if any; the
/// substyle stays even when it becomes empty (see ClearEmptySubstyles).
/// Throws std::bad_cast when the own value is not a substyle.
STYLES_API void ClearSubstyleProperty(Style& style, const PropertyKey& setKey,
                                      const PropertyKey& key);
///@{

/// The style itself when its category is named `key`, else its substyle
/// under `key` (Style::GetSubstyle with `inherited`); null for a null style.
STYLES_API const Style* GetStyleOrSubstyle(const Style* style, const PropertyKey& key,
                                           bool inherited);
STYLES_API Style* GetStyleOrSubstyle(Style* style, const PropertyKey& key, bool inherited);
///@}

/// The style's parent; for a parentless substyle, the parent of the substyle
/// under the same key in the nearest of its owner and the owner's ancestors
/// that has one; else null. Not owned.
STYLES_API Style* GetSubstyleParent(const Style& style);
/// A new free style that resolves as the effective substyle of `style` under
/// `setKey` does, without owners: it gets the substyle's (owner-inherited)
/// parent and, as own values, every effective value not found where that
/// parent finds it. `categoryKeys` becomes the keys of the substyle's
/// category. Null, `categoryKeys` untouched, without a substyle; null also
/// for a substyle without category. The caller owns the result.
STYLES_API Style*
CreateStyleFromSubstyleWithoutOwnerDependencies(const Style* style, const PropertyKey& setKey,
                                                std::set<PropertyKey>& categoryKeys);
/// Removes the own values equal to what the style would inherit without them,
/// and those without behaviour. Nothing changes when neither the style nor
/// any of its owners has a parent. On an exception the values not yet put
/// back are lost.
STYLES_API void ClearMatchingInheritedProperties(Style& style);
/// Calls `fn` on the style (with `includeSelf`), then on its own single
/// substyles under `keys` in that order, or under every key of its category
/// in registration order when `keys` is empty. One level deep only; false as
/// soon as `fn` returns false; true for a null style.
STYLES_API bool ForEachSubStyle(Style* style, const std::function<bool(Style*)>& fn,
                                bool includeSelf, std::vector<PropertyKey> keys);
/// Removes, depth first, every own single substyle that holds no own values,
/// also one that becomes empty because its substyles were removed. Substyle
/// lists are left alone.
STYLES_API void ClearEmptySubstyles(Style& style);
/// For every key that `destination` sets itself and under which `source` has
/// an own single substyle: with `mergeProperties`, the source substyle's own
/// values are set on the destination's substyle (which must be one); without,
/// the destination's value is replaced by a copy of the source substyle.
STYLES_API void CopySourceSubstylesThatExistsInDestinationStyle(Style* destination,
                                                                const Style* source,
                                                                bool mergeProperties);

} // namespace Styles
