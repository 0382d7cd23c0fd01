#include <ZelUtils/TextStream.h>

#include <gtest/gtest.h>

#include <string>

namespace {

using ZelUtils::MemoryStream;
using ZelUtils::Stream;
using ZelUtils::TextStreamReader;
using ZelUtils::TextStreamWriter;
namespace TextStream = ZelUtils::TextStream;
using Text = ZelStringT<char16_t>;

// Writes `text` twice: the byte order mark must still come once, at the start.
std::string EncodeTwice(const Text& text, TextStream::Encoding encoding, bool byteOrderMark) {
  Stream stream = MemoryStream::Create();
  TextStreamWriter writer(stream, encoding, byteOrderMark);
  EXPECT_TRUE(writer.Write(text));
  EXPECT_TRUE(writer.Write(text));
  return MemoryStream::GetBytes(stream);
}

Text Decode(const std::string& bytes, TextStream::Encoding encoding) {
  return TextStreamReader(MemoryStream::FromBytes(bytes), encoding).ReadToEnd();
}

TEST(TextStreamTest, WritesTheChosenEncoding) {
  struct Case {
    const char* name;
    Text text;
    TextStream::Encoding encoding;
    bool byteOrderMark;
    std::string bytes;
  };
  const Case cases[] = {
      {"UTF-8", u"\u00e9\U0001F600", TextStream::UTF8, false,
       "\xC3\xA9\xF0\x9F\x98\x80\xC3\xA9\xF0\x9F\x98\x80"},
      {"UTF-8 with mark", u"a", TextStream::UTF8, true,
       "\xEF\xBB\xBF"
       "aa"},
      {"UTF-16LE with mark", u"\U0001F600", TextStream::UTF16LE, true,
       std::string("\xFF\xFE\x3D\xD8\x00\xDE\x3D\xD8\x00\xDE", 10)},
      {"UTF-16BE", u"a", TextStream::UTF16BE, false, std::string("\0a\0a", 4)},
      {"unpaired surrogates", u"\xDC00x\xD800y", TextStream::UTF8, false,
       "\xEF\xBF\xBDx\xEF\xBF\xBDy\xEF\xBF\xBDx\xEF\xBF\xBDy"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(EncodeTwice(c.text, c.encoding, c.byteOrderMark), c.bytes);
  }
}

TEST(TextStreamTest, ReadsMarksAndReplacesMalformedBytes) {
  struct Case {
    const char* name;
    std::string bytes;
    TextStream::Encoding encoding;
    std::u16string expected;
  };
  const Case cases[] = {
      {"UTF-16LE mark", std::string("\xFF\xFEo\0k\0", 6), TextStream::UTF8, u"ok"},
      {"UTF-16BE mark", std::string("\xFE\xFF\0o\0k", 6), TextStream::UTF8, u"ok"},
      {"mark beats the stated encoding", "\xEF\xBB\xBFok", TextStream::UTF16BE, u"ok"},
      {"stray byte", "a\xFF", TextStream::UTF8, u"a\uFFFD"},
      {"truncated before ASCII", "\xE2\x82z", TextStream::UTF8, u"\uFFFDz"},
      {"encoded surrogate", "\xED\xA0\x80", TextStream::UTF8, u"\uFFFD\uFFFD\uFFFD"},
      {"beyond U+10FFFF", "\xF4\x90\x80\x80", TextStream::UTF8, u"\uFFFD\uFFFD\uFFFD\uFFFD"},
      {"odd UTF-16 byte", std::string("o\0k", 3), TextStream::UTF16LE, u"o\uFFFD"},
      {"unpaired surrogate in UTF-16", std::string("\xD8\0\0a", 4), TextStream::UTF16BE,
       u"\uFFFDa"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(Decode(c.bytes, c.encoding).GetStdString(), c.expected);
  }
}

TEST(TextStreamTest, RoundTripsEveryEncoding) {
  std::u16string raw = u"{\"name\": \"Caf\u00e9 \U0001F600 \u4E2D\"}\n";
  raw += u'\0'; // a NUL is text like any other
  const Text text(raw);
  for (const auto encoding :
       {TextStream::SystemDefault, TextStream::UTF16LE, TextStream::UTF16BE, TextStream::UTF8}) {
    for (const bool byteOrderMark : {false, true}) {
      SCOPED_TRACE(std::to_string(encoding) + (byteOrderMark ? " with mark" : ""));
      EXPECT_TRUE(Decode(EncodeTwice(text, encoding, byteOrderMark), encoding) == text + text);
    }
  }
}

TEST(TextStreamTest, UnusableStreamsAndEncodings) {
  EXPECT_FALSE(TextStreamWriter(Stream(), TextStream::UTF8, false).Write(u"x"));
  EXPECT_TRUE(TextStreamReader(Stream(), TextStream::UTF8).ReadToEnd().IsEmpty());
  const auto unknown = static_cast<TextStream::Encoding>(9);
  Stream stream = MemoryStream::FromBytes("kept");
  EXPECT_FALSE(TextStreamWriter(stream, unknown, true).Write(u"x"));
  EXPECT_TRUE(TextStreamReader(stream, unknown).ReadToEnd().IsEmpty());
  EXPECT_TRUE(TextStreamReader(stream, TextStream::UTF8).ReadToEnd() == u"kept");
}

} // namespace
