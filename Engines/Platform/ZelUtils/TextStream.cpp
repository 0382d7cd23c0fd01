#include <ZelUtils/TextStream.h>

#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>

namespace ZelUtils {

namespace {

constexpr char32_t kReplacement = 0xFFFD;

bool IsKnown(TextStream::Encoding encoding) {
  return encoding == TextStream::SystemDefault || encoding == TextStream::UTF8 ||
         encoding == TextStream::UTF16LE || encoding == TextStream::UTF16BE;
}

bool IsHighSurrogate(char16_t unit) { return unit >= 0xD800 && unit <= 0xDBFF; }
bool IsLowSurrogate(char16_t unit) { return unit >= 0xDC00 && unit <= 0xDFFF; }

// Calls `emit` with each code point of `text`; unpaired surrogates give U+FFFD.
template <class Emit> void ForEachCodePoint(std::u16string_view text, Emit emit) {
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char16_t unit = text[i];
    if (IsHighSurrogate(unit) && i + 1 < text.size() && IsLowSurrogate(text[i + 1])) {
      emit(0x10000 + ((char32_t(unit) - 0xD800) << 10) + (char32_t(text[i + 1]) - 0xDC00));
      ++i;
    } else if (IsHighSurrogate(unit) || IsLowSurrogate(unit)) {
      emit(kReplacement);
    } else {
      emit(char32_t(unit));
    }
  }
}

void AppendUtf16(std::u16string& out, char32_t codePoint) {
  if (codePoint < 0x10000) {
    out.push_back(static_cast<char16_t>(codePoint));
  } else {
    codePoint -= 0x10000;
    out.push_back(static_cast<char16_t>(0xD800 + (codePoint >> 10)));
    out.push_back(static_cast<char16_t>(0xDC00 + (codePoint & 0x3FF)));
  }
}

std::string EncodeUtf16(std::u16string_view text, bool bigEndian) {
  std::string out;
  out.reserve(text.size() * 2);
  const auto appendUnit = [&out, bigEndian](char32_t unit) {
    const char high = static_cast<char>(unit >> 8);
    const char low = static_cast<char>(unit & 0xFF);
    out.push_back(bigEndian ? high : low);
    out.push_back(bigEndian ? low : high);
  };
  ForEachCodePoint(text, [&appendUnit](char32_t c) {
    if (c < 0x10000) {
      appendUnit(c);
    } else {
      appendUnit(0xD800 + ((c - 0x10000) >> 10));
      appendUnit(0xDC00 + ((c - 0x10000) & 0x3FF));
    }
  });
  return out;
}

// Decodes UTF-16 bytes; an odd last byte and unpaired surrogates give U+FFFD.
std::u16string DecodeUtf16(std::string_view bytes, bool bigEndian) {
  std::u16string units;
  units.reserve(bytes.size() / 2 + 1);
  for (std::size_t i = 0; i + 1 < bytes.size(); i += 2) {
    const auto first = static_cast<unsigned char>(bytes[i]);
    const auto second = static_cast<unsigned char>(bytes[i + 1]);
    units.push_back(bigEndian ? char16_t(first << 8 | second) : char16_t(second << 8 | first));
  }
  std::u16string out;
  out.reserve(units.size() + 1);
  ForEachCodePoint(units, [&out](char32_t c) { AppendUtf16(out, c); });
  if (bytes.size() % 2 != 0)
    out.push_back(char16_t(kReplacement));
  return out;
}

bool StartsWith(std::string_view bytes, std::string_view prefix) {
  return bytes.substr(0, prefix.size()) == prefix;
}

constexpr std::string_view kUtf8Mark = "\xEF\xBB\xBF";
constexpr std::string_view kUtf16LEMark = "\xFF\xFE";
constexpr std::string_view kUtf16BEMark = "\xFE\xFF";

} // namespace

TextStreamWriter::TextStreamWriter(Stream stream, TextStream::Encoding encoding,
                                   bool writeByteOrderMark)
    : m_stream(std::move(stream)), m_encoding(encoding),
      m_byteOrderMarkPending(writeByteOrderMark) {}

bool TextStreamWriter::Write(const ZelStringT<char16_t>& text) {
  if (!m_stream.IsWritable() || !IsKnown(m_encoding))
    return false;
  std::string bytes;
  if (m_byteOrderMarkPending) {
    bytes = m_encoding == TextStream::UTF16LE   ? kUtf16LEMark
            : m_encoding == TextStream::UTF16BE ? kUtf16BEMark
                                                : kUtf8Mark;
    m_byteOrderMarkPending = false;
  }
  if (m_encoding == TextStream::UTF16LE || m_encoding == TextStream::UTF16BE)
    bytes += EncodeUtf16(text.GetView(), m_encoding == TextStream::UTF16BE);
  else
    bytes += ZelPlatform::Utf16ToUtf8(text.GetView());
  return m_stream.Write(bytes.data(), bytes.size()) && m_stream.Flush();
}

TextStreamReader::TextStreamReader(Stream stream, TextStream::Encoding encoding)
    : m_stream(std::move(stream)), m_encoding(encoding) {}

ZelStringT<char16_t> TextStreamReader::ReadToEnd() {
  if (!m_stream.IsReadable() || !IsKnown(m_encoding))
    return ZelStringT<char16_t>();
  std::string bytes;
  std::string buffer(64 * 1024, '\0');
  while (const std::size_t count = m_stream.Read(buffer.data(), buffer.size()))
    bytes.append(buffer, 0, count);

  std::string_view view(bytes);
  if (StartsWith(view, kUtf8Mark))
    return ZelPlatform::Utf8ToUtf16(view.substr(kUtf8Mark.size()));
  if (StartsWith(view, kUtf16LEMark))
    return DecodeUtf16(view.substr(kUtf16LEMark.size()), false);
  if (StartsWith(view, kUtf16BEMark))
    return DecodeUtf16(view.substr(kUtf16BEMark.size()), true);
  if (m_encoding == TextStream::UTF16LE || m_encoding == TextStream::UTF16BE)
    return DecodeUtf16(view, m_encoding == TextStream::UTF16BE);
  return ZelPlatform::Utf8ToUtf16(view);
}

} // namespace ZelUtils
