/// @file
/// The platform string: ZelStringT<CharT> wraps a standard string and adds the
/// operations the style library needs (exact and case-insensitive comparison,
/// trimming of Unicode white space, printf-style number formatting).
/// ZelStringT<char16_t> holds UTF-16; ZelStringT<char> holds UTF-8.
#pragma once

#include <ZelPlatform/Export.h>

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <utility>

/// A read-only view of the text of a ZelStringT of the same character type.
template <class CharT> using ZelStringViewT = std::basic_string_view<CharT>;

namespace ZelPlatform {
/// UTF-8 to UTF-16; each ill-formed sequence becomes one U+FFFD.
ZEL_API std::u16string Utf8ToUtf16(std::string_view text);
/// UTF-16 to UTF-8; unpaired surrogates become U+FFFD.
ZEL_API std::string Utf16ToUtf8(std::u16string_view text);
/// The offset of the first byte of `text` that does not start a well-formed
/// UTF-8 character (overlong forms, surrogates and values above U+10FFFF are
/// ill-formed), or npos when the whole text is UTF-8.
ZEL_API std::size_t FindInvalidUtf8(std::string_view text);

namespace detail {
// Full Unicode case-folded comparison (ASCII fast path); <0, 0 or >0. An
// unpaired surrogate compares as U+FFFD, the character that JSON text and
// UTF-8 write in its place, so texts equal here stay equal once written.
ZEL_API int CompareNoCaseUtf16(std::u16string_view a, std::u16string_view b);
ZEL_API int CompareNoCaseUtf8(std::string_view a, std::string_view b);
// Bounds [first, last) of the text without leading and trailing white space.
ZEL_API std::pair<std::size_t, std::size_t> TrimBoundsUtf16(std::u16string_view text);
ZEL_API std::pair<std::size_t, std::size_t> TrimBoundsUtf8(std::string_view text);
// snprintf into an ASCII buffer; the result is widened by the caller. No
// printf format attribute: FormatInternal always forwards a non-literal format,
// which would trip -Wformat-security in hosts for calls without arguments.
ZEL_API std::string FormatAscii(const char* format, ...);
// `out` becomes the full case folding of `text`, with every unpaired
// surrogate taken as U+FFFD: two texts compare equal by CompareNoCase exactly
// when their foldings are equal, and CompareNoCase orders them as
// CompareCodePointOrder orders their foldings.
ZEL_API void FoldCaseUtf16(std::u16string_view text, std::u16string& out);
// Code point order of two UTF-16 texts (which differs from code unit order
// where surrogates meet units above them); <0, 0 or >0.
ZEL_API int CompareCodePointOrder(std::u16string_view a, std::u16string_view b) noexcept;
// Whether `text` holds a high surrogate not followed by a low one, or a low
// surrogate not preceded by a high one.
bool HasUnpairedSurrogate(std::u16string_view text) noexcept;
// `out` becomes `text` with every unpaired surrogate replaced by U+FFFD.
void ReplaceUnpairedSurrogates(std::u16string_view text, std::u16string& out);
} // namespace detail
} // namespace ZelPlatform

/// Case mode for ZelStringT::Compare: 0 compares exactly, code unit by code unit.
enum CompareCase : int { kCompareCaseSensitive = 0, kCompareCaseInsensitive = 1 };

/// A text of `CharT` code units that owns a standard string; see the file overview.
template <class CharT> class ZelStringT {
public:
  /// The standard string that holds the text.
  using StdString = std::basic_string<CharT>;
  /// A read-only view of the text.
  using View = std::basic_string_view<CharT>;

  ZelStringT() = default;
  ///@{

  /// Copies the text; implicit on purpose, so that texts, views and standard
  /// strings convert. A null pointer gives the empty string.
  ZelStringT(const CharT* text) : m_text(text ? text : StdString()) {}
  ZelStringT(const CharT* text, std::size_t length) : m_text(text, length) {}
  ZelStringT(View text) : m_text(text) {}
  ZelStringT(const StdString& text) : m_text(text) {}
  ZelStringT(StdString&& text) noexcept : m_text(std::move(text)) {}
  ///@}

  /// `count` copies of `c`.
  ZelStringT(std::size_t count, CharT c) : m_text(count, c) {}

  ///@{

  /// The text itself, not a copy; valid until the string changes or goes.
  operator View() const noexcept { return m_text; }
  View GetView() const noexcept { return m_text; }
  const StdString& GetStdString() const noexcept { return m_text; }
  StdString& GetStdString() noexcept { return m_text; }
  const CharT* c_str() const noexcept { return m_text.c_str(); }
  const CharT* data() const noexcept { return m_text.data(); }
  ///@}

  ///@{

  /// Size and code units, counted in code units, not characters.
  bool IsEmpty() const noexcept { return m_text.empty(); }
  std::size_t GetLength() const noexcept { return m_text.size(); }
  CharT operator[](std::size_t i) const { return m_text[i]; }
  auto begin() const noexcept { return m_text.begin(); }
  auto end() const noexcept { return m_text.end(); }
  ///@}

  /// Case mode 0 compares exactly (code unit order); any other mode ignores
  /// letter case like CompareNoCase. Returns <0, 0 or >0.
  int Compare(View other, int caseMode) const {
    if (caseMode != kCompareCaseSensitive)
      return CompareNoCase(other);
    const int c = View(m_text).compare(other);
    return c < 0 ? -1 : (c > 0 ? 1 : 0);
  }

  /// Case-insensitive comparison by full Unicode case folding.
  int CompareNoCase(View other) const {
    if constexpr (sizeof(CharT) == 2)
      return ZelPlatform::detail::CompareNoCaseUtf16(
          std::u16string_view(reinterpret_cast<const char16_t*>(m_text.data()), m_text.size()),
          std::u16string_view(reinterpret_cast<const char16_t*>(other.data()), other.size()));
    else
      return ZelPlatform::detail::CompareNoCaseUtf8(
          std::string_view(reinterpret_cast<const char*>(m_text.data()), m_text.size()),
          std::string_view(reinterpret_cast<const char*>(other.data()), other.size()));
  }

  /// Removes Unicode white space at both ends, in place.
  ZelStringT& Trim() {
    std::pair<std::size_t, std::size_t> bounds;
    if constexpr (sizeof(CharT) == 2)
      bounds = ZelPlatform::detail::TrimBoundsUtf16(
          std::u16string_view(reinterpret_cast<const char16_t*>(m_text.data()), m_text.size()));
    else
      bounds = ZelPlatform::detail::TrimBoundsUtf8(
          std::string_view(reinterpret_cast<const char*>(m_text.data()), m_text.size()));
    m_text.erase(bounds.second);
    m_text.erase(0, bounds.first);
    return *this;
  }

  /// printf-style formatting of numbers and ASCII text (`"%g"`, `"%d"`, ...).
  template <class... Args> static ZelStringT FormatInternal(const char* format, Args... args) {
    const std::string ascii = ZelPlatform::detail::FormatAscii(format, args...);
    return ZelStringT(StdString(ascii.begin(), ascii.end()));
  }

  ///@{

  /// Appends in place.
  ZelStringT& operator+=(View other) {
    m_text.append(other);
    return *this;
  }
  ZelStringT& operator+=(CharT c) {
    m_text.push_back(c);
    return *this;
  }
  ///@}

  ///@{

  /// A new string of both texts; a null text counts as empty.
  friend ZelStringT operator+(const ZelStringT& a, View b) {
    StdString text;
    text.reserve(a.GetLength() + b.size());
    text.append(a.m_text).append(b);
    return ZelStringT(std::move(text));
  }
  friend ZelStringT operator+(View a, const ZelStringT& b) {
    StdString text;
    text.reserve(a.size() + b.GetLength());
    text.append(a).append(b.m_text);
    return ZelStringT(std::move(text));
  }
  friend ZelStringT operator+(const ZelStringT& a, const ZelStringT& b) { return a + b.GetView(); }
  friend ZelStringT operator+(const ZelStringT& a, const CharT* b) { return a + NullSafeView(b); }
  friend ZelStringT operator+(const CharT* a, const ZelStringT& b) { return NullSafeView(a) + b; }
  friend ZelStringT operator+(const ZelStringT& a, const StdString& b) { return a + View(b); }
  friend ZelStringT operator+(const StdString& a, const ZelStringT& b) { return View(a) + b; }
  friend ZelStringT operator+(const ZelStringT& a, CharT b) {
    ZelStringT text(a);
    text += b;
    return text;
  }
  ///@}

  ///@{

  /// Exact comparisons in code unit order. Every mix of ZelStringT with a view,
  /// a standard string or a null-terminated text has its own overload, so that
  /// no call has to choose between two user-defined conversions.
  friend bool operator==(const ZelStringT& a, const ZelStringT& b) noexcept {
    return a.m_text == b.m_text;
  }
  friend bool operator!=(const ZelStringT& a, const ZelStringT& b) noexcept {
    return a.m_text != b.m_text;
  }
  friend bool operator<(const ZelStringT& a, const ZelStringT& b) noexcept {
    return a.m_text < b.m_text;
  }
  friend bool operator>(const ZelStringT& a, const ZelStringT& b) noexcept {
    return b.m_text < a.m_text;
  }
  friend bool operator<=(const ZelStringT& a, const ZelStringT& b) noexcept {
    return !(b.m_text < a.m_text);
  }
  friend bool operator>=(const ZelStringT& a, const ZelStringT& b) noexcept {
    return !(a.m_text < b.m_text);
  }

  friend bool operator==(const ZelStringT& a, View b) noexcept { return a.GetView() == b; }
  friend bool operator==(View a, const ZelStringT& b) noexcept { return a == b.GetView(); }
  friend bool operator!=(const ZelStringT& a, View b) noexcept { return a.GetView() != b; }
  friend bool operator!=(View a, const ZelStringT& b) noexcept { return a != b.GetView(); }
  friend bool operator<(const ZelStringT& a, View b) noexcept { return a.GetView() < b; }
  friend bool operator<(View a, const ZelStringT& b) noexcept { return a < b.GetView(); }
  friend bool operator==(const ZelStringT& a, const StdString& b) noexcept {
    return a.GetView() == View(b);
  }
  friend bool operator==(const StdString& a, const ZelStringT& b) noexcept {
    return View(a) == b.GetView();
  }
  friend bool operator!=(const ZelStringT& a, const StdString& b) noexcept {
    return a.GetView() != View(b);
  }
  friend bool operator!=(const StdString& a, const ZelStringT& b) noexcept {
    return View(a) != b.GetView();
  }
  friend bool operator<(const ZelStringT& a, const StdString& b) noexcept {
    return a.GetView() < View(b);
  }
  friend bool operator<(const StdString& a, const ZelStringT& b) noexcept {
    return View(a) < b.GetView();
  }
  friend bool operator==(const ZelStringT& a, const CharT* b) noexcept {
    return a.GetView() == NullSafeView(b);
  }
  friend bool operator==(const CharT* a, const ZelStringT& b) noexcept {
    return NullSafeView(a) == b.GetView();
  }
  friend bool operator!=(const ZelStringT& a, const CharT* b) noexcept {
    return a.GetView() != NullSafeView(b);
  }
  friend bool operator!=(const CharT* a, const ZelStringT& b) noexcept {
    return NullSafeView(a) != b.GetView();
  }
  friend bool operator<(const ZelStringT& a, const CharT* b) noexcept {
    return a.GetView() < NullSafeView(b);
  }
  friend bool operator<(const CharT* a, const ZelStringT& b) noexcept {
    return NullSafeView(a) < b.GetView();
  }
  ///@}

private:
  static View NullSafeView(const CharT* text) noexcept { return text ? View(text) : View(); }

  StdString m_text;
};

/// Hashes the text, so that strings can key unordered containers.
template <class CharT> struct std::hash<ZelStringT<CharT>> {
  /// The standard hash of the text's view.
  std::size_t operator()(const ZelStringT<CharT>& text) const noexcept {
    return std::hash<std::basic_string_view<CharT>>()(text.GetView());
  }
};
