#include <ZelUtils/String.h>

#include <algorithm>
#include <cstdint>
#include <limits>
#include <string>

namespace ZelUtils {
namespace String {
namespace {

// Membership test for a set of characters: a bitmap when the set is all
// ASCII, else a sorted list of code points.
class CharacterSet {
public:
  explicit CharacterSet(std::u16string_view characters) {
    for (const char16_t c : characters) {
      if (c >= 0x80) {
        m_asciiOnly = false;
        break;
      }
      m_ascii[c >> 6] |= std::uint64_t{1} << (c & 63);
    }
    if (!m_asciiOnly) {
      for (std::size_t i = 0; i < characters.size();)
        m_codePoints.push_back(NextCodePoint(characters, i));
      std::sort(m_codePoints.begin(), m_codePoints.end());
    }
  }

  bool IsAsciiOnly() const noexcept { return m_asciiOnly; }
  bool ContainsAscii(char16_t c) const noexcept {
    return c < 0x80 && (m_ascii[c >> 6] >> (c & 63) & 1) != 0;
  }
  bool Contains(char32_t c) const {
    return std::binary_search(m_codePoints.begin(), m_codePoints.end(), c);
  }

  // The code point starting at `i`, advancing `i` past it.
  static char32_t NextCodePoint(std::u16string_view text, std::size_t& i) {
    const char16_t lead = text[i++];
    if (lead >= 0xD800 && lead <= 0xDBFF && i < text.size()) {
      const char16_t trail = text[i];
      if (trail >= 0xDC00 && trail <= 0xDFFF) {
        ++i;
        return 0x10000 + ((char32_t(lead) - 0xD800) << 10) + (char32_t(trail) - 0xDC00);
      }
    }
    return lead;
  }

private:
  std::uint64_t m_ascii[2] = {0, 0};
  bool m_asciiOnly = true;
  std::vector<char32_t> m_codePoints;
};

// Characters of `text` whose membership in `characters` equals `keep`.
ZelStringT<char16_t> Filter(std::u16string_view text, std::u16string_view characters, bool keep) {
  const CharacterSet set(characters);
  std::u16string result;
  result.reserve(text.size());
  if (set.IsAsciiOnly()) {
    for (const char16_t c : text)
      if (set.ContainsAscii(c) == keep)
        result.push_back(c);
  } else {
    for (std::size_t i = 0; i < text.size();) {
      const std::size_t start = i;
      const char32_t c = CharacterSet::NextCodePoint(text, i);
      if (set.Contains(c) == keep)
        result.append(text.substr(start, i - start));
    }
  }
  return ZelStringT<char16_t>(std::move(result));
}

ZelStringT<char16_t> Numbered(std::u16string_view stem, std::uint64_t number) {
  std::u16string text;
  const std::string digits = std::to_string(number);
  text.reserve(stem.size() + 1 + digits.size());
  text.append(stem);
  text.push_back(u' ');
  text.append(digits.begin(), digits.end());
  return ZelStringT<char16_t>(std::move(text));
}

} // namespace

std::vector<ZelStringT<char16_t>> Split(std::u16string_view text, std::u16string_view separators,
                                        bool skipEmpty, bool trimPieces) {
  std::vector<ZelStringT<char16_t>> pieces;
  std::size_t start = 0;
  while (true) {
    const std::size_t end = text.find_first_of(separators, start);
    ZelStringT<char16_t> piece(text.substr(
        start, end == std::u16string_view::npos ? std::u16string_view::npos : end - start));
    if (trimPieces)
      piece.Trim();
    if (!skipEmpty || !piece.IsEmpty())
      pieces.push_back(std::move(piece));
    if (end == std::u16string_view::npos)
      break;
    start = end + 1;
  }
  return pieces;
}

std::vector<ZelStringT<char16_t>> Split(std::u16string_view text, char16_t separator,
                                        bool skipEmpty, bool trimPieces) {
  return Split(text, std::u16string_view(&separator, 1), skipEmpty, trimPieces);
}

ZelStringT<char16_t> KeepCharacters(std::u16string_view text, std::u16string_view characters) {
  return Filter(text, characters, true);
}

ZelStringT<char16_t> RemoveCharacters(std::u16string_view text, std::u16string_view characters) {
  return Filter(text, characters, false);
}

ZelStringT<char16_t>
FindUnusedName(const ZelStringT<char16_t>& candidate,
               const std::function<bool(const ZelStringT<char16_t>&)>& isUsed) {
  if (!isUsed(candidate))
    return candidate;

  const std::u16string_view text = candidate;
  std::u16string_view stem = text;
  std::uint64_t number = 0;

  // A trailing " N" continues its numbering; digit runs too long to count in
  // 64 bits are treated as part of the name.
  std::size_t digitsStart = text.size();
  while (digitsStart > 0 && text[digitsStart - 1] >= u'0' && text[digitsStart - 1] <= u'9')
    --digitsStart;
  const std::size_t digitCount = text.size() - digitsStart;
  constexpr std::size_t kMaxDigits = 18; // below 10^18, far from overflow
  if (digitCount > 0 && digitCount <= kMaxDigits && digitsStart >= 2 &&
      text[digitsStart - 1] == u' ') {
    for (std::size_t i = digitsStart; i < text.size(); ++i)
      number = number * 10 + static_cast<std::uint64_t>(text[i] - u'0');
    stem = text.substr(0, digitsStart - 1);
  }

  while (number < std::numeric_limits<std::uint64_t>::max()) {
    ++number;
    ZelStringT<char16_t> name = Numbered(stem, number);
    if (!isUsed(name))
      return name;
  }
  return ZelStringT<char16_t>();
}

} // namespace String
} // namespace ZelUtils
