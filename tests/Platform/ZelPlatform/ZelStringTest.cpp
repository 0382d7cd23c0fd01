#include <ZelPlatform/ZelString.h>

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

namespace {

using String16 = ZelStringT<char16_t>;

std::string Narrow(std::u16string_view text) {
  std::string out;
  for (const char16_t c : text)
    out += c < 0x80 ? std::string(1, static_cast<char>(c)) : "\\u" + std::to_string(c);
  return out;
}

// A lone high surrogate, which a literal cannot spell.
const std::u16string kLoneSurrogate(1, static_cast<char16_t>(0xD800));

int Sign(int value) { return value < 0 ? -1 : (value > 0 ? 1 : 0); }

TEST(ZelStringTest, ExactCompareIsCodeUnitOrder) {
  // U+FF21 (fullwidth A) sorts after a surrogate pair by code unit, not by code point.
  EXPECT_GT(String16(u"\uFF21").Compare(u"\U0001F600", kCompareCaseSensitive), 0);
  EXPECT_EQ(String16(u"a").Compare(u"A", kCompareCaseSensitive), 1);
  EXPECT_EQ(String16(u"A").Compare(u"a", kCompareCaseInsensitive), 0);
  EXPECT_FALSE(String16(u"abc") == static_cast<const char16_t*>(nullptr));
  EXPECT_TRUE(String16() == static_cast<const char16_t*>(nullptr));
}

// ß folds to "ss"; the Kelvin sign and the long s fold to k and s. '[' and '_' lie
// between 'Z' and 'a': folding must happen before comparing.
TEST(ZelStringTest, CompareNoCaseFoldsFullUnicode) {
  const std::vector<String16> ascending = {
      u"", u"[", u"_", u"A", u"abc", u"ABCD", u"j", u"\u212A", u"l", u"stra\u00DFe", u"strasse1"};
  const std::vector<std::vector<String16>> equal = {{u"STRASSE", u"stra\u00DFe"},
                                                    {u"\u212Aelvin", u"KELVIN"},
                                                    {u"\u017Fun", u"SUN"},
                                                    {u"\u00C4RGER", u"\u00E4rger"},
                                                    {u"\u03A3\u0391", u"\u03C3\u03B1"}};
  for (std::size_t i = 0; i + 1 < ascending.size(); ++i) {
    SCOPED_TRACE(Narrow(ascending[i]) + " < " + Narrow(ascending[i + 1]));
    EXPECT_LT(ascending[i].CompareNoCase(ascending[i + 1]), 0);
  }
  for (const auto& pair : equal) {
    SCOPED_TRACE(Narrow(pair[0]) + " == " + Narrow(pair[1]));
    EXPECT_EQ(pair[0].CompareNoCase(pair[1]), 0);
  }
  // An unpaired surrogate compares as the U+FFFD that documents write for it;
  // a well-formed pair stays its own character.
  const String16 replaced(u"a\uFFFD");
  const char16_t high = 0xD800, low = 0xDC00;
  for (const String16& lone : {String16(u"a") + String16(std::u16string(1, high)),
                               String16(u"A") + String16(std::u16string(1, low))}) {
    SCOPED_TRACE(Narrow(lone.GetView()));
    EXPECT_EQ(lone.CompareNoCase(replaced), 0);
    EXPECT_EQ(replaced.CompareNoCase(lone), 0);
  }
  EXPECT_LT(replaced.CompareNoCase(u"a\U00010000"), 0);
  // At every position of a text, which the search for surrogates scans in
  // steps of four.
  for (std::size_t at = 0; at < 9; ++at) {
    std::u16string withLone(9, u'x'), withReplacement(9, u'x');
    withLone[at] = at % 2 ? low : high;
    withReplacement[at] = 0xFFFD;
    EXPECT_EQ(String16(withLone).CompareNoCase(withReplacement), 0) << at;
  }
  // UTF-8 folds the same way; ill-formed bytes compare consistently.
  EXPECT_EQ(ZelStringT<char>("\xE2\x84\xAA").CompareNoCase("k"), 0);
  EXPECT_EQ(ZelStringT<char>("\xC3").CompareNoCase("\xC3"), 0);
  EXPECT_EQ(Sign(ZelStringT<char>("\xC3").CompareNoCase("x")),
            -Sign(ZelStringT<char>("x").CompareNoCase("\xC3")));
}

// Folding goes by runs: ASCII by itself, each run between ASCII units through
// the Unicode tables (on the stack up to 32 units, on the heap beyond).
TEST(ZelStringTest, FoldCaseFoldsEachRunInPlace) {
  struct Case {
    std::u16string in, expected;
  };
  const Case cases[] = {
      {u"\u00dcberschrift 12", u"\u00fcberschrift 12"},
      {u"Stra\u00dfe \u03a3\u0391\u03a3 X\U00010400", u"strasse \u03c3\u03b1\u03c3 x\U00010428"},
      {std::u16string(40, u'\u00c4') + u"B", std::u16string(40, u'\u00e4') + u"b"},
      {u"A" + kLoneSurrogate + u"\u00c4" + kLoneSurrogate, u"a\uFFFD\u00e4\uFFFD"},
  };
  std::u16string folded = u"stale";
  for (const Case& c : cases) {
    ZelPlatform::detail::FoldCaseUtf16(c.in, folded);
    EXPECT_EQ(Narrow(folded), Narrow(c.expected)) << Narrow(c.in);
  }
  // Latin, Greek, Cyrillic and Armenian units fold through a table: each
  // folding matches the unit without case and folds to itself again.
  std::u16string again;
  for (char16_t unit = 0x80; unit < 0x600; ++unit) {
    ZelPlatform::detail::FoldCaseUtf16(std::u16string(1, unit), folded);
    ZelPlatform::detail::FoldCaseUtf16(folded, again);
    ASSERT_EQ(String16(std::u16string(1, unit)).CompareNoCase(String16(folded)), 0) << unit;
    ASSERT_EQ(again, folded) << unit;
  }
}

TEST(ZelStringTest, TrimRemovesUnicodeWhiteSpace) {
  struct Case {
    std::u16string in;
    std::u16string expected;
  };
  const Case cases[] = {{u"\t\n\r a b\t", u"a b"},
                        {u"\u00A0a\u00A0", u"a"},
                        {u"\u3000\u2003a\u2028", u"a"},
                        {u"   ", u""},
                        {u"\U0001F600 ", u"\U0001F600"},
                        {u"a\u200B", u"a\u200B"}, // ZERO WIDTH SPACE is not white space
                        {u" " + kLoneSurrogate + u" ", kLoneSurrogate}};
  for (const Case& c : cases) {
    SCOPED_TRACE(Narrow(c.in));
    String16 text(c.in);
    EXPECT_EQ(text.Trim(), c.expected);
  }
  ZelStringT<char> utf8(" \xC2\xA0x\xE3\x80\x80\t");
  EXPECT_EQ(utf8.Trim(), "x");
  ZelStringT<char> brokenUtf8(" \xC3 ");
  EXPECT_EQ(brokenUtf8.Trim(), "\xC3");
}

TEST(ZelStringTest, FormatInternalGrowsPastItsBuffer) {
  EXPECT_EQ(String16::FormatInternal("%g", 1e21), u"1e+21");
  const std::string longText(300, 'x');
  EXPECT_EQ(ZelStringT<char>::FormatInternal("%s!", longText.c_str()), longText + "!");
}

} // namespace
