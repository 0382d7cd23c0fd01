#include <Internal/JsonText.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <utility>

namespace Json {
namespace detail {

void TextOutput::Adopt(std::u16string& storage) {
  if (m_size > 0)
    return;
  // The old text is room to write over: sizing it again would fill it first.
  m_text.swap(storage);
  storage.clear();
  m_units = m_text.data();
  m_capacity = m_text.size();
}

std::u16string TextOutput::Take() {
  m_text.resize(m_size);
  m_units = nullptr;
  m_size = m_capacity = 0;
  return std::move(m_text);
}

void TextOutput::Expect(std::size_t count) {
  m_text.reserve(m_size + count);
  m_units = m_text.data();
}

void TextOutput::Grow(std::size_t count) {
  // Sized a block past what is asked, within the capacity the string has;
  // beyond it the string grows geometrically by itself.
  constexpr std::size_t kBlock = 16384;
  const std::size_t needed = m_size + count;
  m_text.resize(std::max(needed, std::min(m_text.capacity(), m_size + count + kBlock)));
  m_units = m_text.data();
  m_capacity = m_text.size();
}

namespace {

constexpr char16_t kHexDigits[] = u"0123456789ABCDEF";

bool IsHighSurrogate(char16_t c) { return (c & 0xFC00) == 0xD800; }
bool IsLowSurrogate(char16_t c) { return (c & 0xFC00) == 0xDC00; }

} // namespace

char16_t* WriteSpecial(char16_t c, const char16_t*& next, const char16_t* end, char16_t* out) {
  if (c >= 0xD800) {
    if (IsHighSurrogate(c) && next != end && IsLowSurrogate(*next)) {
      *out++ = c;
      *out++ = *next++;
    } else {
      *out++ = u'\uFFFD';
    }
    return out;
  }
  *out++ = u'\\';
  switch (c) {
  case u'"':
  case u'\\':
    *out++ = c;
    break;
  case u'\b':
    *out++ = u'b';
    break;
  case u'\t':
    *out++ = u't';
    break;
  case u'\n':
    *out++ = u'n';
    break;
  case u'\f':
    *out++ = u'f';
    break;
  case u'\r':
    *out++ = u'r';
    break;
  default:
    *out++ = u'u';
    *out++ = u'0';
    *out++ = u'0';
    *out++ = kHexDigits[c >> 4];
    *out++ = kHexDigits[c & 0xF];
  }
  return out;
}

bool CompactWriter::String(const char16_t* text, std::size_t length) {
  if (!Prefix(true))
    return false;
  // At most six units for each unit of the text, and the quotes.
  m_out.Commit(WriteQuoted(text, length, m_out.Claim(2 + 6 * length)));
  return true;
}

bool CompactWriter::Member(const char16_t* name, std::size_t nameLength, const char16_t* text,
                           std::size_t textLength) {
  if (!AtName())
    return String(name, nameLength) && String(text, textLength);
  Level& level = m_levels.back();
  char16_t* out = m_out.Claim(6 + 6 * (nameLength + textLength));
  if (level.valueCount > 0)
    *out++ = u',';
  level.valueCount += 2;
  out = WriteQuoted(name, nameLength, out);
  *out++ = u':';
  m_out.Commit(WriteQuoted(text, textLength, out));
  return true;
}

bool CompactWriter::Root() {
  if (m_hasRoot)
    return false;
  m_hasRoot = true;
  return true;
}

bool CompactWriter::Open(bool isArray, char16_t bracket) {
  if (!Prefix(false))
    return false;
  m_levels.push_back(Level{0, isArray});
  m_out.Put(bracket);
  return true;
}

bool CompactWriter::Close(bool isArray, char16_t bracket) {
  if (m_levels.empty() || m_levels.back().inArray != isArray ||
      (!isArray && m_levels.back().valueCount % 2 != 0))
    return false;
  m_levels.pop_back();
  m_out.Put(bracket);
  return true;
}

bool CompactWriter::Raw(const char16_t* text, std::size_t length) {
  if (!Prefix(false))
    return false;
  char16_t* out = m_out.Claim(length);
  std::memcpy(out, text, length * sizeof(char16_t));
  m_out.Commit(out + length);
  return true;
}

} // namespace detail
} // namespace Json
