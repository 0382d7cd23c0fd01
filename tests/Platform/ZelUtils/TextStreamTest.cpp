#include <ZelUtils/TextStream.h>

#include <gtest/gtest.h>

#include <cstdio>
#include <string>

#include <unistd.h>

namespace {

using ZelUtils::MemoryStream;
using ZelUtils::Stream;
using ZelUtils::TextStreamReader;
using ZelUtils::TextStreamWriter;
namespace TextStream = ZelUtils::TextStream;
using Text = ZelStringT<char16_t>;

std::string Hex(const std::string& bytes) {
  std::string out;
  char digits[4];
  for (const unsigned char byte : bytes) {
    std::snprintf(digits, sizeof digits, "%02X ", byte);
    out += digits;
  }
  return out;
}

std::string Encode(const Text& text, TextStream::Encoding encoding, bool byteOrderMark) {
  Stream stream = MemoryStream::Create();
  TextStreamWriter writer(stream, encoding, byteOrderMark);
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
      {"UTF-8", u"a\u00e9\u20ac\U0001F600", TextStream::UTF8, false,
       "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80"},
      {"UTF-8 with mark", u"a", TextStream::UTF8, true,
       "\xEF\xBB\xBF"
       "a"},
      {"system default is UTF-8", u"\u00e9", TextStream::SystemDefault, false, "\xC3\xA9"},
      {"UTF-16LE with mark", u"a\U0001F600", TextStream::UTF16LE, true,
       std::string("\xFF\xFE"
                   "a\0\x3D\xD8\x00\xDE",
                   8)},
      {"UTF-16BE", u"a", TextStream::UTF16BE, false, std::string("\0a", 2)},
      {"unpaired surrogates", u"\xDC00x\xD800", TextStream::UTF8, false,
       "\xEF\xBF\xBDx\xEF\xBF\xBD"},
      {"unpaired surrogate in UTF-16", Text(std::u16string(u"\xD800", 1)), TextStream::UTF16BE,
       false, "\xFF\xFD"},
      {"empty text", Text(), TextStream::UTF8, false, ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(Hex(Encode(c.text, c.encoding, c.byteOrderMark)), Hex(c.bytes));
  }
}

TEST(TextStreamTest, ByteOrderMarkComesOnceAtTheStart) {
  Stream stream = MemoryStream::Create();
  TextStreamWriter writer(stream, TextStream::UTF8, true);
  EXPECT_TRUE(writer.Write(u"a"));
  EXPECT_TRUE(writer.Write(u"b"));
  EXPECT_EQ(MemoryStream::GetBytes(stream), "\xEF\xBB\xBF"
                                            "ab");
  EXPECT_TRUE(TextStreamReader(stream, TextStream::UTF8).ReadToEnd() == u"ab");
}

TEST(TextStreamTest, ReadsMarksAndReplacesMalformedBytes) {
  struct Case {
    const char* name;
    std::string bytes;
    TextStream::Encoding encoding;
    std::u16string expected;
  };
  const Case cases[] = {
      {"UTF-8 mark dropped", "\xEF\xBB\xBFok", TextStream::UTF8, u"ok"},
      {"UTF-16LE mark", std::string("\xFF\xFEo\0k\0", 6), TextStream::UTF8, u"ok"},
      {"UTF-16BE mark", std::string("\xFE\xFF\0o\0k", 6), TextStream::UTF8, u"ok"},
      {"mark beats the stated encoding", "\xEF\xBB\xBFok", TextStream::UTF16BE, u"ok"},
      {"UTF-16LE without mark", std::string("o\0k\0", 4), TextStream::UTF16LE, u"ok"},
      {"non-BMP", "\xF0\x9F\x98\x80", TextStream::UTF8, u"\U0001F600"},
      {"stray byte",
       "a\xFF"
       "b",
       TextStream::UTF8, u"a\uFFFDb"},
      {"lone trail byte", "\x80", TextStream::UTF8, u"\uFFFD"},
      {"overlong NUL", "\xC0\x80", TextStream::UTF8, u"\uFFFD\uFFFD"},
      {"overlong three bytes", "\xE0\x80\xAF", TextStream::UTF8, u"\uFFFD\uFFFD\uFFFD"},
      {"truncated at the end", "a\xE2\x82", TextStream::UTF8, u"a\uFFFD"},
      {"truncated before ASCII", "\xE2\x82z", TextStream::UTF8, u"\uFFFDz"},
      {"encoded surrogate", "\xED\xA0\x80", TextStream::UTF8, u"\uFFFD\uFFFD\uFFFD"},
      {"beyond U+10FFFF", "\xF4\x90\x80\x80", TextStream::UTF8, u"\uFFFD\uFFFD\uFFFD\uFFFD"},
      {"highest code point", "\xF4\x8F\xBF\xBF", TextStream::UTF8, u"\U0010FFFF"},
      {"odd UTF-16 byte", std::string("o\0k", 3), TextStream::UTF16LE, u"o\uFFFD"},
      {"unpaired surrogate in UTF-16", std::string("\xD8\0\0a", 4), TextStream::UTF16BE,
       u"\uFFFDa"},
      {"empty", "", TextStream::UTF8, u""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(Decode(c.bytes, c.encoding).GetStdString(), c.expected);
  }
}

TEST(TextStreamTest, RoundTripsEveryEncoding) {
  std::u16string raw = u"{\"name\": \"Caf\u00e9 \U0001F600 \u4E2D\"}\n";
  raw += u'\0'; // a NUL is text like any other
  raw += u"end";
  const Text text(raw);
  for (const auto encoding :
       {TextStream::SystemDefault, TextStream::UTF16LE, TextStream::UTF16BE, TextStream::UTF8}) {
    for (const bool byteOrderMark : {false, true}) {
      SCOPED_TRACE(std::to_string(encoding) + (byteOrderMark ? " with mark" : ""));
      EXPECT_TRUE(Decode(Encode(text, encoding, byteOrderMark), encoding) == text);
    }
  }
}

TEST(TextStreamTest, RoundTripsThroughAFile) {
  const std::string path =
      ::testing::TempDir() + "TextStreamTest-" + std::to_string(::getpid()) + ".json";
  const Text widePath(std::u16string(path.begin(), path.end()));
  const Text text(u"{\"a\": \"\u00e9\U0001F600\"}");
  EXPECT_TRUE(TextStreamWriter(ZelUtils::FileStream::Create(widePath), TextStream::UTF8, false)
                  .Write(text));
  EXPECT_TRUE(
      TextStreamReader(ZelUtils::FileStream::Open(widePath), TextStream::UTF8).ReadToEnd() == text);
  std::remove(path.c_str());
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
