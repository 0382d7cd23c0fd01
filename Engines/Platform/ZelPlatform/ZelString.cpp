#include <ZelPlatform/ZelString.h>

#include <unicode/uchar.h>
#include <unicode/ustring.h>
#include <unicode/utf16.h>
#include <unicode/utf8.h>

#include <algorithm>
#include <cassert>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <type_traits>
#include <vector>

namespace ZelPlatform {
namespace detail {
namespace {

constexpr char32_t kReplacementCharacter = 0xFFFD;

inline bool IsAscii(char32_t c) noexcept { return c < 0x80; }

inline char32_t FoldAscii(char32_t c) noexcept {
  return (c >= 'A' && c <= 'Z') ? c + ('a' - 'A') : c;
}

inline int Sign(int value) noexcept { return value < 0 ? -1 : (value > 0 ? 1 : 0); }

inline bool IsHighSurrogate(char16_t c) noexcept { return c >= 0xD800 && c <= 0xDBFF; }
inline bool IsLowSurrogate(char16_t c) noexcept { return c >= 0xDC00 && c <= 0xDFFF; }

// Full case-folded comparison of two UTF-16 texts in code point order.
int FoldedCompare(std::u16string_view a, std::u16string_view b) {
  // ICU compares an unpaired surrogate as its own code point; it must compare
  // as the U+FFFD it is written as.
  std::u16string repairedA, repairedB;
  if (HasUnpairedSurrogate(a)) {
    ReplaceUnpairedSurrogates(a, repairedA);
    a = repairedA;
  }
  if (HasUnpairedSurrogate(b)) {
    ReplaceUnpairedSurrogates(b, repairedB);
    b = repairedB;
  }
  // ICU takes 32-bit lengths; texts beyond 2 GiB code units are not supported.
  assert(a.size() <= static_cast<std::size_t>(std::numeric_limits<int32_t>::max()));
  assert(b.size() <= static_cast<std::size_t>(std::numeric_limits<int32_t>::max()));
  UErrorCode status = U_ZERO_ERROR;
  const int result = u_strCaseCompare(a.data(), static_cast<int32_t>(a.size()), b.data(),
                                      static_cast<int32_t>(b.size()),
                                      U_FOLD_CASE_DEFAULT | U_COMPARE_CODE_POINT_ORDER, &status);
  if (U_FAILURE(status)) {
    // Only an argument error can get here; fall back to exact code unit order.
    const int exact = a.compare(b);
    return Sign(exact);
  }
  return Sign(result);
}

// Decides on the ASCII prefix of two texts, folding A-Z; at the first
// non-ASCII unit on either side, `rest` compares the remaining suffixes. A
// non-ASCII unit may fold to ASCII (U+212A KELVIN SIGN to "k"), so the ASCII
// path never decides against one.
template <class View, class Rest> int CompareFoldingAsciiPrefix(View a, View b, Rest rest) {
  using Unit = std::make_unsigned_t<typename View::value_type>;
  const std::size_t common = a.size() < b.size() ? a.size() : b.size();
  for (std::size_t i = 0; i < common; ++i) {
    const char32_t ca = static_cast<Unit>(a[i]);
    const char32_t cb = static_cast<Unit>(b[i]);
    if (!IsAscii(ca) || !IsAscii(cb))
      return rest(a.substr(i), b.substr(i));
    const char32_t fa = FoldAscii(ca);
    const char32_t fb = FoldAscii(cb);
    if (fa != fb)
      return fa < fb ? -1 : 1;
  }
  if (a.size() == b.size())
    return 0;
  // No character folds to nothing, so the longer text is greater.
  return a.size() < b.size() ? -1 : 1;
}

} // namespace

bool HasUnpairedSurrogate(std::u16string_view text) noexcept {
  // Most text has no surrogate at all: look four units at a time for one. A
  // unit is a surrogate when its top five bits are 11011, which leaves its
  // lane of `x` zero; the second line finds a zero lane without a branch each.
  const char16_t* units = text.data();
  std::size_t i = 0;
  bool anySurrogate = false;
  for (; i + 4 <= text.size() && !anySurrogate; i += 4) {
    std::uint64_t word;
    std::memcpy(&word, units + i, sizeof word);
    const std::uint64_t x = (word & 0xF800F800F800F800ull) ^ 0xD800D800D800D800ull;
    anySurrogate = ((x - 0x0001000100010001ull) & ~x & 0x8000800080008000ull) != 0;
  }
  for (; i < text.size() && !anySurrogate; ++i)
    anySurrogate = (units[i] & 0xF800) == 0xD800;
  if (!anySurrogate)
    return false;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char16_t c = text[i];
    if ((c & 0xF800) != 0xD800)
      continue;
    if (!IsHighSurrogate(c) || i + 1 == text.size() || !IsLowSurrogate(text[i + 1]))
      return true;
    ++i;
  }
  return false;
}

void ReplaceUnpairedSurrogates(std::u16string_view text, std::u16string& out) {
  out.assign(text.begin(), text.end());
  for (std::size_t i = 0; i < out.size(); ++i) {
    if ((out[i] & 0xF800) != 0xD800)
      continue;
    if (IsHighSurrogate(out[i]) && i + 1 < out.size() && IsLowSurrogate(out[i + 1]))
      ++i;
    else
      out[i] = static_cast<char16_t>(kReplacementCharacter);
  }
}

namespace {

// Writes the full folding of `run`, a text without ASCII units, into `out`
// from `at`, growing `out` so that `rest` more units still fit after it;
// returns the folding's length.
std::size_t FoldRun(std::u16string_view run, std::u16string& out, std::size_t at,
                    std::size_t rest) {
  std::u16string repaired;
  if (HasUnpairedSurrogate(run)) {
    ReplaceUnpairedSurrogates(run, repaired);
    run = repaired;
  }
  assert(run.size() <= static_cast<std::size_t>(std::numeric_limits<int32_t>::max() / 3));
  // Full folding grows a text by at most three times; short runs fold on the stack.
  char16_t fixed[96];
  std::u16string grown;
  char16_t* folded = fixed;
  if (run.size() * 3 > sizeof fixed / sizeof fixed[0]) {
    grown.resize(run.size() * 3);
    folded = grown.data();
  }
  UErrorCode status = U_ZERO_ERROR;
  int32_t length = u_strFoldCase(folded, static_cast<int32_t>(run.size() * 3), run.data(),
                                 static_cast<int32_t>(run.size()), U_FOLD_CASE_DEFAULT, &status);
  if (U_FAILURE(status)) { // cannot happen with a large enough buffer
    folded = const_cast<char16_t*>(run.data());
    length = static_cast<int32_t>(run.size());
  }
  const auto count = static_cast<std::size_t>(length);
  if (at + count + rest > out.size())
    out.resize(at + count + rest);
  std::copy(folded, folded + count, out.begin() + static_cast<std::ptrdiff_t>(at));
  return count;
}

// Units from U+0080 up to here (Latin, Greek, Cyrillic, Armenian) fold
// through a table.
constexpr char16_t kFoldTableEnd = 0x0600;

// Marks a unit that folds to more than one unit (U+00DF folds to "ss"); no
// unit of the table folds to this noncharacter.
constexpr char16_t kNotSingle = 0xFFFF;

// The full folding of each unit from U+0080 below kFoldTableEnd, taken from
// ICU once; kNotSingle for those that ICU keeps folding.
const char16_t* SingleUnitFoldings() {
  static const std::vector<char16_t> table = [] {
    std::vector<char16_t> units(kFoldTableEnd - 0x80, kNotSingle);
    for (char16_t c = 0x80; c < kFoldTableEnd; ++c) {
      char16_t folded[4];
      UErrorCode status = U_ZERO_ERROR;
      const int32_t length = u_strFoldCase(folded, 4, &c, 1, U_FOLD_CASE_DEFAULT, &status);
      if (U_SUCCESS(status) && length == 1)
        units[c - 0x80] = folded[0];
    }
    return units;
  }();
  return table.data();
}

} // namespace

void FoldCaseUtf16(std::u16string_view text, std::u16string& out) {
  out.resize(text.size());
  const char16_t* const table = SingleUnitFoldings();
  // ASCII and the table's units fold here, one for one; neither is a surrogate.
  const auto folding = [table](char16_t c) -> char16_t {
    if (c < 0x80)
      return static_cast<char16_t>(FoldAscii(c));
    return c < kFoldTableEnd ? table[c - 0x80] : kNotSingle;
  };
  std::size_t length = 0;
  std::size_t i = 0;
  while (i < text.size()) {
    for (char16_t folded; i < text.size() && (folded = folding(text[i])) != kNotSingle; ++i)
      out[length++] = folded;
    // Full folding maps each code point on its own, so the runs between
    // units folded here fold apart, and those units never split a pair.
    const std::size_t start = i;
    while (i < text.size() && folding(text[i]) == kNotSingle)
      ++i;
    if (i > start)
      length += FoldRun(text.substr(start, i - start), out, length, text.size() - i);
  }
  out.resize(length);
}

int CompareCodePointOrder(std::u16string_view a, std::u16string_view b) noexcept {
  const std::size_t common = a.size() < b.size() ? a.size() : b.size();
  for (std::size_t i = 0; i < common; ++i) {
    char16_t x = a[i], y = b[i];
    if (x == y)
      continue;
    // Units from U+D800 up: surrogates (code points above U+FFFF) must sort
    // after U+E000..U+FFFF, so those are moved below them.
    if (x >= 0xD800 && y >= 0xD800) {
      x = static_cast<char16_t>(x >= 0xE000 ? x - 0x800 : x + 0x2000);
      y = static_cast<char16_t>(y >= 0xE000 ? y - 0x800 : y + 0x2000);
    }
    return x < y ? -1 : 1;
  }
  return a.size() == b.size() ? 0 : (a.size() < b.size() ? -1 : 1);
}

int CompareNoCaseUtf16(std::u16string_view a, std::u16string_view b) {
  return CompareFoldingAsciiPrefix(a, b, FoldedCompare);
}

int CompareNoCaseUtf8(std::string_view a, std::string_view b) {
  return CompareFoldingAsciiPrefix(a, b, [](std::string_view x, std::string_view y) {
    return FoldedCompare(Utf8ToUtf16(x), Utf8ToUtf16(y));
  });
}

std::pair<std::size_t, std::size_t> TrimBoundsUtf16(std::u16string_view text) {
  const char16_t* units = text.data();
  const auto length = static_cast<int64_t>(text.size());
  int64_t first = 0;
  while (first < length) {
    int64_t next = first;
    UChar32 c;
    U16_NEXT(units, next, length, c);
    if (!u_isUWhiteSpace(c))
      break;
    first = next;
  }
  int64_t last = length;
  while (last > first) {
    int64_t previous = last;
    UChar32 c;
    U16_PREV(units, first, previous, c);
    if (!u_isUWhiteSpace(c))
      break;
    last = previous;
  }
  return {static_cast<std::size_t>(first), static_cast<std::size_t>(last)};
}

std::pair<std::size_t, std::size_t> TrimBoundsUtf8(std::string_view text) {
  const auto* bytes = reinterpret_cast<const uint8_t*>(text.data());
  const auto length = static_cast<int64_t>(text.size());
  int64_t first = 0;
  while (first < length) {
    int64_t next = first;
    UChar32 c;
    U8_NEXT(bytes, next, length, c);
    if (c < 0 || !u_isUWhiteSpace(c))
      break;
    first = next;
  }
  int64_t last = length;
  while (last > first) {
    // Step back over at most three continuation bytes, then decode forward:
    // the character counts only if it ends exactly at `last`.
    int64_t previous = last - 1;
    while (previous > first && last - previous < 4 && U8_IS_TRAIL(bytes[previous]))
      --previous;
    int64_t next = previous;
    UChar32 c;
    U8_NEXT(bytes, next, length, c);
    if (next != last || c < 0 || !u_isUWhiteSpace(c))
      break;
    last = previous;
  }
  return {static_cast<std::size_t>(first), static_cast<std::size_t>(last)};
}

std::string FormatAscii(const char* format, ...) {
  char buffer[128];
  va_list arguments;
  va_start(arguments, format);
  va_list copy;
  va_copy(copy, arguments);
  const int needed = std::vsnprintf(buffer, sizeof buffer, format, arguments);
  va_end(arguments);
  std::string result;
  if (needed < 0) {
    va_end(copy);
    return result;
  }
  if (static_cast<std::size_t>(needed) < sizeof buffer) {
    result.assign(buffer, static_cast<std::size_t>(needed));
  } else {
    result.resize(static_cast<std::size_t>(needed));
    std::vsnprintf(result.data(), result.size() + 1, format, copy);
  }
  va_end(copy);
  return result;
}

} // namespace detail

std::size_t FindInvalidUtf8(std::string_view text) {
  const auto* bytes = reinterpret_cast<const uint8_t*>(text.data());
  const auto length = static_cast<int64_t>(text.size());
  for (int64_t i = 0; i < length;) {
    const int64_t start = i;
    UChar32 c;
    U8_NEXT(bytes, i, length, c);
    if (c < 0)
      return static_cast<std::size_t>(start);
  }
  return std::string_view::npos;
}

std::u16string Utf8ToUtf16(std::string_view text) {
  std::u16string result;
  result.reserve(text.size());
  const auto* bytes = reinterpret_cast<const uint8_t*>(text.data());
  const auto length = static_cast<int64_t>(text.size());
  int64_t i = 0;
  while (i < length) {
    UChar32 c;
    U8_NEXT(bytes, i, length, c); // skips a maximal ill-formed subpart at once
    if (c < 0)
      c = 0xFFFD;
    if (U_IS_BMP(c)) {
      result.push_back(static_cast<char16_t>(c));
    } else {
      result.push_back(U16_LEAD(c));
      result.push_back(U16_TRAIL(c));
    }
  }
  return result;
}

std::string Utf16ToUtf8(std::u16string_view text) {
  std::string result;
  result.reserve(text.size() + text.size() / 2);
  const char16_t* units = text.data();
  const auto length = static_cast<int64_t>(text.size());
  int64_t i = 0;
  while (i < length) {
    UChar32 c;
    U16_NEXT(units, i, length, c);
    if (U_IS_SURROGATE(c))
      c = 0xFFFD;
    uint8_t buffer[U8_MAX_LENGTH];
    int32_t size = 0;
    U8_APPEND_UNSAFE(buffer, size, c);
    result.append(reinterpret_cast<const char*>(buffer), static_cast<std::size_t>(size));
  }
  return result;
}

} // namespace ZelPlatform
