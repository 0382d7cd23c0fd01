#include <Json/Json.h>

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <ostream>
#include <random>
#include <string>
#include <typeinfo>
#include <vector>

namespace {
using Text = ZelStringT<char16_t>;
std::string Show(const Text& text) {
  return ::testing::PrintToString(std::u16string(text.GetView()));
}
} // namespace

namespace Json {
// Failure messages show values as their compact text.
void PrintTo(const Value& value, std::ostream* out) { *out << Show(ValueToString(value, false)); }
} // namespace Json

namespace {

using Json::Array;
using Json::Object;
using Json::Value;

// Parses `text` both into a Value and into a Document, which must agree.
Value ParseOrFail(const Text& text) {
  Value value;
  Text error;
  EXPECT_TRUE(Json::Parse(text, value, error)) << Show(error) << " in " << Show(text);
  Json::Document document;
  EXPECT_TRUE(document.Parse(text, error)) << Show(error) << " in " << Show(text);
  EXPECT_EQ(document.GetRoot().ToValue(), value);
  return value;
}

TEST(JsonTest, ValuesSurviveRoundTripInBothLayouts) {
  const char16_t controls[] = {u'a', 0, u'\x01', u'\x1f', u'\x7f', u'b'};
  const double kMax = std::numeric_limits<double>::max();
  const Value cases[] = {
      Value(),
      Value(u"top-level string"),
      Array({Value(), true, false, 0, -0.0, -12, 0.1, 1e300, kMax, 5e-324, -2.2250738585072014e-308,
             9007199254740994.0, 123456789012345680000.0, -1.8446744073709552e19}),
      Array({u"", u"\"quoted\" \\ / \b\f\n\r\t", Text(controls, 6), u"G\U0001F600\U0010FFFF",
             u"\u00e9\u4e2d\uFFFD\uFEFF"}),
      Object(),
      Array(),
      Object({{u"b", Array({1, u"x", Object(), Array(), Value()})},
              {u"a", Object({{u"", 2.5}, {u"\n", Array({Value(Array())})}})},
              {u"b", false}}),
  };
  for (const Value& value : cases) {
    for (bool format : {false, true}) {
      const Text text = Json::ValueToString(value, format);
      SCOPED_TRACE(Show(text));
      ASSERT_FALSE(text.IsEmpty());
      EXPECT_EQ(ParseOrFail(text), value);
      EXPECT_EQ(Json::ValueToString(ParseOrFail(text), format), text);
    }
  }
}

TEST(JsonTest, NumbersAreShortestAndExact) {
  // Read back exactly, sign of zero included; the first rows are also what the
  // writer makes, the others text from other programs: correctly rounded, tiny
  // magnitudes become zero of their sign, integers become doubles.
  const std::u16string longFraction = u"0." + std::u16string(500, u'0') + u"1e501";
  struct Case {
    Text text;
    double number;
    bool written;
  };
  for (const Case& c :
       {Case{u"12", 12.0, true}, Case{u"-0.0", -0.0, true}, Case{u"0.1", 0.1, true},
        Case{u"1e+21", 1e21, true}, Case{u"5e-324", 5e-324, true}, Case{u"-3.25", -3.25, true},
        Case{u"2e-324", 0.0, false}, Case{u"-1e-400", -0.0, false}, Case{u"3e-324", 5e-324, false},
        Case{u"1e-99999999999999", 0.0, false}, Case{u"0.0000000001e-2147483639", 0.0, false},
        Case{u"9007199254740993", 9007199254740992.0, false},
        Case{u"1.7976931348623158e308", std::numeric_limits<double>::max(), false},
        Case{longFraction, 1.0, false}, Case{u"1E2", 100.0, false},
        Case{u"18446744073709551615", 18446744073709551615.0, false}}) {
    SCOPED_TRACE(Show(c.text));
    const Value back = ParseOrFail(c.text);
    EXPECT_EQ(back, Value(c.number));
    EXPECT_EQ(std::signbit(back.Get<double>()), std::signbit(c.number));
    if (c.written) {
      EXPECT_EQ(Json::ValueToString(c.number, false), c.text);
    }
  }

  // Any finite double comes back bit for bit.
  std::mt19937_64 random(20240611);
  for (int i = 0; i < 20000; ++i) {
    double number;
    const std::uint64_t bits = random();
    std::memcpy(&number, &bits, sizeof number);
    if (!std::isfinite(number))
      continue;
    const Text text = Json::ValueToString(number, false);
    std::uint64_t backBits;
    std::memcpy(&backBits, &ParseOrFail(text).Get<double>(), sizeof backBits);
    ASSERT_EQ(backBits, bits) << Show(text);
  }
}

TEST(JsonTest, WriterRepairsWhatJsonCannotHold) {
  const char16_t lone[] = {u'a', 0xD800, u'b', 0xDC00, 0xDBFF};
  const char bad[] = "ok\xC3\xA9\xF0\x9F\x98\x80\xFF\xE2\x82\xC0";
  const Array array({std::nan(""), std::numeric_limits<double>::infinity(), Text(lone, 5),
                     ZelStringT<char>(bad)});
  const Object object({{Text(lone, 2), 1}});
  for (bool format : {false, true}) {
    SCOPED_TRACE(format);
    EXPECT_EQ(ParseOrFail(Json::ValueToString(array, format)),
              Value(Array({Value(), Value(), u"a\uFFFDb\uFFFD\uFFFD",
                           u"ok\u00e9\U0001F600\uFFFD\uFFFD\uFFFD"})));
    EXPECT_EQ(ParseOrFail(Json::ValueToString(object, format)), Value(Object({{u"a\uFFFD", 1}})));
  }
}

// Compact strings unit for unit: every escape, repaired surrogates, and each
// unit that needs care at every place of a run the writer copies in words.
TEST(JsonTest, CompactStringsAreEscapedExactly) {
  const char16_t mixed[] = {u'"',  u'\\', u'/',  0x7F,   0,      0x1F,   u'\b',  u'\t',
                            u'\n', u'\f', u'\r', 0xD83D, 0xDE00, 0xDC00, 0xD800, u'x'};
  EXPECT_EQ(Json::ValueToString(Text(mixed, 16), false),
            u"\"\\\"\\\\/\x7f\\u0000\\u001F\\b\\t\\n\\f\\r\U0001F600\uFFFD\uFFFDx\"");
  struct Case {
    std::u16string unit, written;
  };
  for (const Case& c :
       {Case{u"\"", u"\\\""}, Case{u"\\", u"\\\\"}, Case{u"\x1b", u"\\u001B"},
        Case{std::u16string(1, 0xDBFF), u"\uFFFD"}, Case{u"\U0001F600", u"\U0001F600"}}) {
    for (std::size_t at = 0; at < 8; ++at) {
      const std::u16string before(at, u'a');
      SCOPED_TRACE(Show(c.unit) + " at " + std::to_string(at));
      EXPECT_EQ(Json::ValueToString(Text(before + c.unit + u"bcdefgh"), false),
                u"\"" + before + c.written + u"bcdefgh\"");
    }
  }
}

// Pieces out of place lose the whole text, as an unfinished one does. Steps:
// { } [ ] open and close, k a name, s a string, m both, M two such members
// (one with its name quoted already), n a number. Each writer writes over a
// longer text it is handed.
TEST(JsonTest, WriterRefusesPiecesOutOfPlace) {
  struct Case {
    const char* steps;
    const char16_t* text;
  };
  for (const Case& c :
       {Case{"{kn}", u"{\"k\":1}"}, Case{"[sn[]{}]", u"[\"s\",1,[],{}]"},
        Case{"{k{}k[]}", u"{\"k\":{},\"k\":[]}"}, Case{"{mkn}", u"{\"k\":\"s\",\"k\":1}"},
        Case{"[m]", u"[\"k\",\"s\"]"}, Case{"{kmn}", u"{\"k\":\"k\",\"s\":1}"}, Case{"{n}", u""},
        Case{"{k}", u""}, Case{"{k[}", u""}, Case{"[}", u""}, Case{"{]", u""}, Case{"ss", u""},
        Case{"[", u""}, Case{"}", u""}, Case{"", u""}, Case{"{M}", u"{\"k\":\"s\",\"q\\\"uoted\":\"t\"}"},
        Case{"[M]", u"[\"k\",\"s\",\"q\\\"uoted\",\"t\"]"}, Case{"{kM}", u""}}) {
    SCOPED_TRACE(c.steps);
    const Text quoted = Json::Writer::Quote(u"q\"uoted");
    const Json::Writer::StringMember members[] = {{u"k", u"s"}, {u"q\"uoted", u"t", quoted}};
    Text storage(u"a longer text that the writer writes over");
    Json::Writer writer(false);
    writer.ReuseStorage(storage);
    for (const char* step = c.steps; *step; ++step) {
      switch (*step) {
      case '{':
        writer.StartObject();
        break;
      case '}':
        writer.EndObject();
        break;
      case '[':
        writer.StartArray();
        break;
      case ']':
        writer.EndArray();
        break;
      case 'k':
        writer.Key(u"k");
        break;
      case 's':
        writer.String(u"s");
        break;
      case 'm':
        writer.Member(u"k", u"s");
        break;
      case 'M':
        writer.Members(members, 2);
        break;
      default:
        writer.Write(Value(1));
      }
    }
    EXPECT_EQ(writer.TakeText(), Text(c.text));
  }
}

TEST(JsonTest, LayoutKeepsMemberOrderAndRepeatedNames) {
  const Text compact = u"{\"b\":[1,true,null],\"a\":\"\\u0001\\n\",\"b\":3}";
  const Value value = ParseOrFail(compact);
  EXPECT_EQ(Json::ValueToString(value, false), compact);
  EXPECT_EQ(Json::ValueToString(value, true),
            u"{\n  \"b\": [\n    1,\n    true,\n    null\n  ],\n  \"a\": \"\\u0001\\n\",\n"
            u"  \"b\": 3\n}");
  ASSERT_NE(value.Get<Object>().Find(u"b"), nullptr);
  EXPECT_EQ(*value.Get<Object>().Find(u"b"), Value(Array({1, true, Value()}))); // the first
  EXPECT_EQ(value.Get<Object>().Find(u"c"), nullptr);
}

TEST(JsonTest, BadTextFailsAndLeavesValueAlone) {
  const char16_t loneHigh[] = {u'"', 0xD800, u'"', 0};
  const char16_t loneLow[] = {u'[', u'"', u'x', 0xDC00, u'"', u']', 0};
  const char16_t reversedPair[] = {u'"', 0xDC00, 0xD800, u'"', 0};
  const char16_t loneInName[] = {u'{', u'"', 0xDBFF, u'"', u':', u'1', u'}', 0};
  const char16_t nulInside[] = {u'[', u'1', u']', 0, u'x'};
  const char16_t controlInside[] = {u'[', u'"', 0x1F, u'"', u']', 0};
  std::u16string deepObjects;
  for (int i = 0; i <= Json::kMaxDepth; ++i)
    deepObjects += u"{\"a\":";
  struct Case {
    const char* fault;
    std::vector<Text> texts;
  };
  const Case cases[] = {
      {"no value", {u"", u" \n\t", u"\uFEFF"}},
      {"truncated", {u"{\"a\":1", u"\"abc", u"tru"}},
      {"trailing text", {u"{} {}", u"[1]x", Text(nulInside, 5)}},
      {"syntax", {u"[1,]", u"'a'", u"{a:1}", u"01", u"NaN", u"\"a\nb\""}},
      // What follows a number is not part of it, even when it looks like more number.
      {"after a number", {u"[01e999]", u"[1-9e999]", u"[2.5.1e999]", u"[-0.0e+1e999]"}},
      {"invalid escape", {u"\"\\x\"", u"\"\\u12\""}},
      {"number too big",
       {u"1e400", u"[10e308]", u"1.7976931348623159e308", u"1e99999999999999",
        Text(u"1") + Text(400, u'0')}},
      {"escaped lone surrogate", {u"\"\\uD800\"", u"\"\\uDC00\"", u"{\"\\uDC00\":1}"}},
      {"raw lone surrogate", {loneHigh, loneLow, reversedPair, loneInName}},
      {"too deep", {Text(Json::kMaxDepth + 1, u'['), Text(deepObjects), Text(1000000, u'[')}},
      {"inside a container",
       {u"[0e400]", u"{\"a\":-0E+309}", u"[1}", u"{\"a\":1]", controlInside, u"[tru]", u"{\"a\" 1}",
        u"[\"\\a\"]", u"[1,]", u"{\"a\":1,}", u"[-]", u"[1.]", u"[1e+]"}},
  };
  for (const Case& c : cases) {
    for (const Text& text : c.texts) {
      SCOPED_TRACE(c.fault + (" " + Show(text.GetView().substr(0, 40))));
      Value out(u"untouched");
      Text error;
      EXPECT_FALSE(Json::Parse(text, out, error));
      EXPECT_EQ(out, Value(u"untouched"));
      EXPECT_NE(Show(error).find(" at offset "), std::string::npos) << Show(error);
      Json::Document document;
      Text documentError;
      EXPECT_FALSE(document.Parse(text, documentError));
      EXPECT_EQ(documentError, error);
      EXPECT_TRUE(document.GetRoot().IsNull());
    }
  }
}

TEST(JsonTest, AcceptsLimitsOfGoodText) {
  std::u16string deep(Json::kMaxDepth, u'[');
  deep += std::u16string(Json::kMaxDepth, u']');
  Value value = ParseOrFail(deep);
  EXPECT_TRUE(value.Is<Array>());
  EXPECT_EQ(ParseOrFail(Json::ValueToString(value, true)), value);

  Text error = u"stale";
  EXPECT_TRUE(Json::Parse(u"\uFEFF \"\\ud83d\\ude00\\u0000\" ", value, error));
  EXPECT_EQ(value, Value(Text(u"\U0001F600\0", 3)));
  EXPECT_TRUE(error.IsEmpty());
  // A document with an escaped pair is read by the general reader, escapes
  // and numbers beside it too.
  EXPECT_EQ(ParseOrFail(u"[\"\\ud83d\\ude00\", \"a\\nb\", 0.5]"),
            Value(Array({u"\U0001F600", u"a\nb", 0.5})));
}

TEST(JsonTest, EqualityIsDeepAndOrderedAcrossKinds) {
  const Object ab({{u"a", 1}, {u"b", Array({true})}});
  EXPECT_EQ(ab, Object({{u"a", 1.0}, {u"b", Array({true})}}));
  for (const Object& other :
       {Object({{u"b", Array({true})}, {u"a", 1}}), Object({{u"a", 1}, {u"b", Array({false})}}),
        Object({{u"a", 1}}), Object({{u"a", 1}, {u"c", Array({true})}})})
    EXPECT_NE(ab, other) << ::testing::PrintToString(Value(other));
  EXPECT_NE(Array({1, u"x"}), Array({u"x", 1}));
  EXPECT_NE(Array({1}), Array({1, 1}));
  // Equal content of different kinds is not equal.
  EXPECT_NE(Value(u"1"), Value(1));
  EXPECT_NE(Value(u"x"), Value(ZelStringT<char>("x")));
  EXPECT_NE(Value(Object()), Value(Array()));
  EXPECT_NE(Value(0), Value(false));
  EXPECT_EQ(Value(Json::NullType()), Value());
}

} // namespace
