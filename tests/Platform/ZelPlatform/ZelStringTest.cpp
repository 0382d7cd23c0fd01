#include <ZelPlatform/ZelString.h>

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <unordered_set>
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

TEST(ZelStringTest, MixedComparisonsPickExactOverloads) {
  const String16 text(u"abc");
  const String16 other(u"abd");
  const std::u16string standard(u"abc");
  EXPECT_TRUE(text == u"abc");
  EXPECT_TRUE(u"abc" == text);
  EXPECT_TRUE(text == std::u16string_view(u"abc"));
  EXPECT_TRUE(std::u16string_view(u"abc") == text);
  EXPECT_TRUE(text == standard);
  EXPECT_TRUE(standard == text);
  EXPECT_TRUE(text != other);
  EXPECT_TRUE(text < other);
  EXPECT_TRUE(text < std::u16string_view(u"abd"));
  EXPECT_FALSE(text == static_cast<const char16_t*>(nullptr));
  EXPECT_TRUE(String16() == static_cast<const char16_t*>(nullptr));

  EXPECT_EQ(u"x" + text + u'!', u"xabc!");
  EXPECT_EQ(standard + text, u"abcabc");
  EXPECT_EQ(text + std::u16string_view(u"-") + other, u"abc-abd");
}

TEST(ZelStringTest, ExactCompareIsCodeUnitOrder) {
  // U+FF21 (fullwidth A) sorts after a surrogate pair by code unit, not by code point.
  const String16 fullwidth(u"\uFF21");
  const String16 supplementary(u"\U0001F600");
  EXPECT_GT(fullwidth.Compare(supplementary, kCompareCaseSensitive), 0);
  EXPECT_EQ(String16(u"a").Compare(u"A", kCompareCaseSensitive), 1);
  EXPECT_EQ(String16(u"A").Compare(u"a", kCompareCaseInsensitive), 0);
}

TEST(ZelStringTest, CompareNoCaseFoldsFullUnicode) {
  struct Case {
    const char16_t* a;
    const char16_t* b;
    int expected;
  };
  const Case cases[] = {
      {u"Red", u"rED", 0},
      {u"\u00C4RGER", u"\u00E4rger", 0}, // ÄRGER / ärger
      {u"STRASSE", u"stra\u00DFe", 0},   // ß folds to "ss"
      {u"\u212A", u"k", 0},              // KELVIN SIGN
      {u"\u212Aelvin", u"KELVIN", 0},
      {u"\u017Fun", u"SUN", 0}, // LONG S
      {u"\u03A3\u0391", u"\u03C3\u03B1", 0},
      {u"a", u"B", -1},
      {u"B", u"a", 1},
      {u"abc", u"ABCD", -1},
      {u"", u"", 0},
      {u"", u"a", -1},
      {u"[", u"a", -1}, // '[' lies between 'Z' and 'a': folding must happen first
      {u"_", u"A", -1}, // folds to "a", so exact order ("_" > "A") must not leak in
      {u"\u212A", u"j", 1},
      {u"\u212A", u"l", -1},
      {u"straße", u"strasse1", -1},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Narrow(c.a) + " vs " + Narrow(c.b));
    EXPECT_EQ(Sign(String16(c.a).CompareNoCase(c.b)), c.expected);
    EXPECT_EQ(Sign(String16(c.b).CompareNoCase(c.a)), -c.expected);
  }
}

// Equivalence must be exactly CompareNoCase == 0 and the order transitive,
// also across the ASCII fast path and the folded path.
TEST(ZelStringTest, CompareNoCaseIsTotalPreorder) {
  const std::vector<String16> sample = {u"",
                                        u"a",
                                        u"A",
                                        u"\u212A",
                                        u"k",
                                        u"K",
                                        u"ka",
                                        u"kB",
                                        u"\u212Ab",
                                        u"ss",
                                        u"\u00DF",
                                        u"SSa",
                                        u"\u00DFb",
                                        u"s",
                                        u"\u017F",
                                        u"t",
                                        u"[",
                                        u"_",
                                        u"z",
                                        u"\u00E4",
                                        u"\u00C4",
                                        u"b",
                                        u"\uFF21",
                                        u"\U0001F600",
                                        kLoneSurrogate,
                                        u"a" + kLoneSurrogate,
                                        u"Z"};
  const std::size_t n = sample.size();
  auto cmp = [&](std::size_t i, std::size_t j) { return Sign(sample[i].CompareNoCase(sample[j])); };
  for (std::size_t i = 0; i < n; ++i) {
    EXPECT_EQ(cmp(i, i), 0);
    for (std::size_t j = 0; j < n; ++j) {
      SCOPED_TRACE(Narrow(sample[i]) + " vs " + Narrow(sample[j]));
      ASSERT_EQ(cmp(i, j), -cmp(j, i));
      for (std::size_t k = 0; k < n; ++k) {
        if (cmp(i, j) <= 0 && cmp(j, k) <= 0) {
          ASSERT_LE(cmp(i, k), 0) << "via " << Narrow(sample[j]) << " to " << Narrow(sample[k]);
        }
      }
    }
  }
}

TEST(ZelStringTest, Utf8CompareNoCaseMatchesUtf16) {
  EXPECT_EQ(ZelStringT<char>("STRASSE").CompareNoCase("stra\xC3\x9F"
                                                      "e"),
            0);
  EXPECT_EQ(ZelStringT<char>("\xE2\x84\xAA").CompareNoCase("k"), 0);
  EXPECT_LT(ZelStringT<char>("a").CompareNoCase("B"), 0);
  // Ill-formed UTF-8 compares without crashing and consistently.
  const ZelStringT<char> broken("\xC3");
  EXPECT_EQ(broken.CompareNoCase("\xC3"), 0);
  EXPECT_EQ(Sign(broken.CompareNoCase("x")), -Sign(ZelStringT<char>("x").CompareNoCase("\xC3")));
}

TEST(ZelStringTest, TrimRemovesUnicodeWhiteSpace) {
  struct Case {
    const char16_t* in;
    const char16_t* expected;
  };
  const Case cases[] = {
      {u"  a b  ", u"a b"},
      {u"\t\n\r a\t", u"a"},
      {u"\u00A0a\u00A0", u"a"},
      {u"\u3000\u2003a\u2028", u"a"},
      {u"   ", u""},
      {u"", u""},
      {u"\U0001F600 ", u"\U0001F600"},
      {u"a\u200B", u"a\u200B"}, // ZERO WIDTH SPACE is not white space
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Narrow(c.in));
    String16 text(c.in);
    EXPECT_EQ(text.Trim(), c.expected);
  }
  String16 surrogate(u" " + kLoneSurrogate + u" ");
  EXPECT_EQ(surrogate.Trim(), kLoneSurrogate);
  ZelStringT<char> utf8(" \xC2\xA0x\xE3\x80\x80\t");
  EXPECT_EQ(utf8.Trim(), "x");
  ZelStringT<char> brokenUtf8(" \xC3 ");
  EXPECT_EQ(brokenUtf8.Trim(), "\xC3");
}

TEST(ZelStringTest, FormatInternal) {
  EXPECT_EQ(String16::FormatInternal("%g", 0.5), u"0.5");
  EXPECT_EQ(String16::FormatInternal("%g", 1e21), u"1e+21");
  EXPECT_EQ(String16::FormatInternal("%g", 2.5), u"2.5");
  const std::string longText(300, 'x');
  EXPECT_EQ(ZelStringT<char>::FormatInternal("%s!", longText.c_str()), longText + "!");
}

TEST(ZelStringTest, HashFollowsExactEquality) {
  std::unordered_set<String16> set = {u"a", u"A"};
  EXPECT_EQ(set.size(), 2u);
  EXPECT_EQ(set.count(String16(u"a")), 1u);
}

} // namespace
