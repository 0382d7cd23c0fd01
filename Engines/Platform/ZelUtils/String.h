/// @file
/// ZelUtils::String: helpers over UTF-16 text used by style names and property
/// paths: splitting, filtering characters, proposing unused names and the
/// case-insensitive ordering of names.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>

#include <functional>
#include <string_view>
#include <vector>

namespace ZelUtils {
namespace String {

/// The pieces of `text` between characters that occur in `separators`, in
/// order. Pieces are trimmed of white space when `trimPieces` is set, and empty
/// pieces (after trimming) are dropped when `skipEmpty` is set. Otherwise every
/// piece is kept: "" gives one empty piece, "a..b" gives "a", "", "b".
ZEL_API std::vector<ZelStringT<char16_t>>
Split(std::u16string_view text, std::u16string_view separators, bool skipEmpty, bool trimPieces);
/// The same with a single separator character.
ZEL_API std::vector<ZelStringT<char16_t>> Split(std::u16string_view text, char16_t separator,
                                                bool skipEmpty, bool trimPieces);

/// A copy of `text` holding only the characters that occur in `characters`.
/// Characters are compared as code points; an unpaired surrogate is its own
/// character.
ZEL_API ZelStringT<char16_t> KeepCharacters(std::u16string_view text,
                                            std::u16string_view characters);
/// A copy of `text` without the characters that occur in `characters`.
ZEL_API ZelStringT<char16_t> RemoveCharacters(std::u16string_view text,
                                              std::u16string_view characters);

/// `candidate` when `isUsed` reports it unused. Otherwise, when the candidate
/// ends in a space and a decimal number N ("Name 3"), the first unused of
/// "Name 4", "Name 5", ...; else the first unused of "<candidate> 1",
/// "<candidate> 2", ... Returns the empty string only if every number up to the
/// largest 64-bit value is used.
ZEL_API ZelStringT<char16_t>
FindUnusedName(const ZelStringT<char16_t>& candidate,
               const std::function<bool(const ZelStringT<char16_t>&)>& isUsed);

/// Strict weak order of names ignoring letter case by full Unicode case
/// folding: a < b exactly when a.CompareNoCase(b) < 0. Transparent, so ordered
/// containers keyed by ZelStringT can be searched with views and literals.
struct LessThanCaseInsensitive {
  /// Marks the order as transparent for the standard containers.
  using is_transparent = void;
  /// Whether `a` comes before `b`.
  bool operator()(std::u16string_view a, std::u16string_view b) const {
    return ZelPlatform::detail::CompareNoCaseUtf16(a, b) < 0;
  }
};

} // namespace String
} // namespace ZelUtils
