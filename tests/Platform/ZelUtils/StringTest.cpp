#include <ZelUtils/String.h>

#include <gtest/gtest.h>

#include <map>
#include <set>
#include <string>
#include <vector>

namespace {

using String16 = ZelStringT<char16_t>;
using ZelUtils::String::FindUnusedName;
using ZelUtils::String::KeepCharacters;
using ZelUtils::String::LessThanCaseInsensitive;
using ZelUtils::String::RemoveCharacters;
using ZelUtils::String::Split;

std::string Narrow(std::u16string_view text) {
  std::string out;
  for (const char16_t c : text)
    out += c < 0x80 ? std::string(1, static_cast<char>(c)) : "\\u" + std::to_string(c);
  return out;
}

TEST(StringTest, Split) {
  struct Case {
    const char16_t* text;
    bool skipEmpty;
    bool trim;
    std::vector<String16> expected;
  };
  const Case cases[] = {
      {u"", false, false, {u""}},
      {u"", true, false, {}},
      {u".a;b. c", false, false, {u"", u"a", u"b", u" c"}},
      {u" a . .b ", false, true, {u"a", u"", u"b"}},
      {u" a . .b ", true, true, {u"a", u"b"}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Narrow(c.text) + (c.skipEmpty ? " skip" : "") + (c.trim ? " trim" : ""));
    EXPECT_EQ(Split(c.text, u".;", c.skipEmpty, c.trim), c.expected);
  }
}

TEST(StringTest, KeepAndRemoveCharacters) {
  struct Case {
    const char16_t* text;
    const char16_t* characters;
    const char16_t* kept;
    const char16_t* removed;
  };
  const Case cases[] = {
      {u"a\tb\"c~", u"\t\n\"~", u"\t\"~", u"abc"},
      {u"\u007F\u0080", u"\u007F", u"\u007F", u"\u0080"}, // edge of the ASCII fast path
      {u"a\u00E9b\u00E9", u"\u00E9", u"\u00E9\u00E9", u"ab"},
      {u"x\U0001F600y\U0001F601", u"\U0001F600", u"\U0001F600", u"xy\U0001F601"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Narrow(c.text) + " / " + Narrow(c.characters));
    EXPECT_EQ(KeepCharacters(c.text, c.characters), c.kept);
    EXPECT_EQ(RemoveCharacters(c.text, c.characters), c.removed);
  }
}

TEST(StringTest, FindUnusedName) {
  struct Case {
    const char16_t* candidate;
    std::set<std::u16string> used;
    const char16_t* expected;
  };
  const Case cases[] = {
      {u"Name", {u"Name", u"Name 1", u"Name 2"}, u"Name 3"},
      {u"Name 3", {u"Name 3", u"Name 4"}, u"Name 5"}, // a trailing number counts on
      {u"Name3", {u"Name3"}, u"Name3 1"},             // only after a space
      {u"", {u""}, u" 1"},
      {u"N 99999999999999999999999",
       {u"N 99999999999999999999999"},
       u"N 99999999999999999999999 1"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Narrow(c.candidate));
    const auto isUsed = [&](const String16& name) { return c.used.count(name.GetStdString()) > 0; };
    EXPECT_EQ(FindUnusedName(c.candidate, isUsed), c.expected);
  }
}

// The name index of a sheet relies on the comparator being a strict weak
// order whose equivalence is exactly CompareNoCase == 0.
TEST(StringTest, LessThanCaseInsensitiveAgreesWithCompareNoCase) {
  const std::vector<String16> sample = {
      u"Red",    u"red 1",      u"blue",        u"\u212A",
      u"k",      u"STRASSE",    u"stra\u00DFe", u"\u00C4",
      u"\u00E4", u"_x",         u"[x",          u"",
      u"\uFF21", u"\U0001F600", u"\uFFFD",      String16(std::u16string(1, char16_t(0xD800)))};
  const LessThanCaseInsensitive less;
  const auto sign = [](int value) { return (value > 0) - (value < 0); };
  std::u16string foldedA, foldedB;
  for (const String16& a : sample) {
    for (const String16& b : sample) {
      SCOPED_TRACE(Narrow(a) + " vs " + Narrow(b));
      EXPECT_EQ(less(a, b), a.CompareNoCase(b) < 0);
      // Folding once and comparing code points gives the same order.
      ZelPlatform::detail::FoldCaseUtf16(a.GetView(), foldedA);
      ZelPlatform::detail::FoldCaseUtf16(b.GetView(), foldedB);
      EXPECT_EQ(sign(ZelPlatform::detail::CompareCodePointOrder(foldedA, foldedB)),
                sign(a.CompareNoCase(b)));
    }
  }
  std::map<String16, int, LessThanCaseInsensitive> names{{u"Stra\u00DFe", 1}};
  EXPECT_FALSE(names.emplace(u"STRASSE", 2).second);
  EXPECT_NE(names.find(std::u16string_view(u"strasse")), names.end());
}

} // namespace
