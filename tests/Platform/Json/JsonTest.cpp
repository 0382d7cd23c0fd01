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

namespace Json {
// Failure messages show values as their compact text.
void PrintTo(const Value& value, std::ostream* out) {
  for (char16_t c : ValueToString(value, false))
    *out << (c < 0x80 ? static_cast<char>(c) : '?');
}
} // namespace Json

namespace {

using Json::Array;
using Json::Object;
using Json::Value;
using Text = ZelStringT<char16_t>;

std::string Narrow(const Text& text) {
  std::string out;
  for (char16_t c : text)
    out += c < 0x80 ? static_cast<char>(c) : '?';
  return out;
}

Value ParseOrFail(const Text& text) {
  Value value;
  Text error;
  EXPECT_TRUE(Json::Parse(text, value, error)) << Narrow(error);
  return value;
}

Object MakeObject(std::initializer_list<std::pair<const char16_t*, Value>> members) {
  Object object;
  for (const auto& member : members)
    object.AddValue(member.first, member.second);
  return object;
}

Array MakeArray(std::initializer_list<Value> values) {
  Array array;
  for (const Value& value : values)
    array.AddValue(value);
  return array;
}

TEST(JsonTest, ValuesSurviveRoundTripInBothLayouts) {
  const char16_t controls[] = {u'a', 0, u'\x01', u'\x1f', u'\x7f', u'b'};
  struct Case {
    const char* name;
    Value value;
  };
  const Case cases[] = {
      {"null", Value()},
      {"true", Value(true)},
      {"false", Value(false)},
      {"zero", Value(0)},
      {"integer", Value(-12)},
      {"fraction", Value(0.1)},
      {"huge", Value(1e300)},
      {"largest", Value(std::numeric_limits<double>::max())},
      {"smallest subnormal", Value(5e-324)},
      {"smallest normal", Value(-std::numeric_limits<double>::min())},
      {"beyond 2^53", Value(9007199254740994.0)},
      {"beyond uint64", Value(123456789012345680000.0)},
      {"beyond int64", Value(-1.8446744073709552e19)},
      {"empty string", Value(u"")},
      {"escapes", Value(u"\"quoted\" \\ / \b\f\n\r\t")},
      {"control characters", Value(Text(controls, 6))},
      {"non-BMP", Value(u"G\U0001F600\U00010000\U0010FFFF")},
      {"non-ASCII BMP", Value(u"\u00e9\u4e2d\uFFFD\uFEFF")},
      {"empty object", Value(Object())},
      {"empty array", Value(Array())},
      {"nested",
       Value(MakeObject({{u"b", MakeArray({1, u"x", Object(), Array(), Value()})},
                         {u"a", MakeObject({{u"", 2.5}, {u"\n", MakeArray({MakeArray({})})}})},
                         {u"b", false}}))},
  };
  for (const Case& c : cases) {
    for (bool format : {false, true}) {
      SCOPED_TRACE(std::string(c.name) + (format ? " indented" : " compact"));
      const Text text = Json::ValueToString(c.value, format);
      ASSERT_FALSE(text.IsEmpty());
      EXPECT_EQ(ParseOrFail(text), c.value) << Narrow(text);
    }
  }
}

TEST(JsonTest, NumbersAreShortestAndExact) {
  struct Case {
    double number;
    const char16_t* text;
  };
  for (const Case& c : {Case{12.0, u"12"}, Case{-0.0, u"-0.0"}, Case{0.1, u"0.1"},
                        Case{1e21, u"1e+21"}, Case{5e-324, u"5e-324"}, Case{-3.25, u"-3.25"}}) {
    SCOPED_TRACE(Narrow(c.text));
    EXPECT_EQ(Json::ValueToString(c.number, false), c.text);
    const Value back = ParseOrFail(c.text);
    ASSERT_TRUE(back.Is<double>());
    EXPECT_EQ(std::signbit(back.Get<double>()), std::signbit(c.number));
    EXPECT_EQ(back.Get<double>(), c.number);
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
    Value back;
    Text error;
    ASSERT_TRUE(Json::Parse(text, back, error)) << Narrow(text);
    ASSERT_TRUE(back.Is<double>());
    std::uint64_t backBits;
    std::memcpy(&backBits, &back.Get<double>(), sizeof backBits);
    ASSERT_EQ(backBits, bits) << Narrow(text);
  }

  // Text from other programs is rounded correctly; tiny magnitudes become zero.
  const std::u16string longFraction = u"0." + std::u16string(500, u'0') + u"1e501";
  struct Read {
    Text text;
    double number;
  };
  for (const Read& r : {Read{u"2e-324", 0.0}, Read{u"-1e-400", -0.0}, Read{u"3e-324", 5e-324},
                        Read{u"0.0000000001e-2147483639", 0.0}, Read{u"1e-99999999999999", 0.0},
                        Read{u"1.7976931348623158e308", std::numeric_limits<double>::max()},
                        Read{u"9007199254740993", 9007199254740992.0}, Read{longFraction, 1.0},
                        Read{u"1E2", 100.0}}) {
    SCOPED_TRACE(Narrow(r.text));
    const Value back = ParseOrFail(r.text);
    ASSERT_TRUE(back.Is<double>());
    EXPECT_EQ(back.Get<double>(), r.number);
    EXPECT_EQ(std::signbit(back.Get<double>()), std::signbit(r.number));
  }

  // Integers written by other programs become doubles.
  EXPECT_EQ(ParseOrFail(u"[-2147483649, 4294967296, 18446744073709551615, -0]"),
            Value(MakeArray({-2147483649.0, 4294967296.0, 18446744073709551615.0, 0.0})));
}

TEST(JsonTest, WriterRepairsWhatJsonCannotHold) {
  const char16_t lone[] = {u'a', 0xD800, u'b', 0xDC00, 0xDBFF};
  const char bad[] = "ok\xC3\xA9\xF0\x9F\x98\x80\xFF\xE2\x82\xC0";
  const Array array = MakeArray({std::nan(""), std::numeric_limits<double>::infinity(),
                                 Text(lone, 5), ZelStringT<char>(bad)});
  Object object;
  object.AddValue(Text(lone, 2), 1);
  for (bool format : {false, true}) {
    SCOPED_TRACE(format);
    EXPECT_EQ(ParseOrFail(Json::ValueToString(array, format)),
              Value(MakeArray({Value(), Value(), u"a\uFFFDb\uFFFD\uFFFD",
                               u"ok\u00e9\U0001F600\uFFFD\uFFFD\uFFFD"})));
    const Value back = ParseOrFail(Json::ValueToString(object, format));
    ASSERT_TRUE(back.Is<Object>());
    EXPECT_EQ(back.Get<Object>().GetValueName(0), u"a\uFFFD");
  }
}

TEST(JsonTest, LayoutOfBothFormats) {
  const Object object = MakeObject({{u"a", MakeArray({1, true, Value()})}, {u"b", u"x"}});
  EXPECT_EQ(Json::ValueToString(object, false), u"{\"a\":[1,true,null],\"b\":\"x\"}");
  EXPECT_EQ(Json::ValueToString(object, true),
            u"{\n  \"a\": [\n    1,\n    true,\n    null\n  ],\n  \"b\": \"x\"\n}");
  EXPECT_EQ(Json::ValueToString(Value(u"\x01\n"), false), u"\"\\u0001\\n\"");
}

TEST(JsonTest, MemberOrderAndRepeatedNamesAreKept) {
  const Text text = u"{\"b\":1,\"a\":2,\"b\":3}";
  const Value value = ParseOrFail(text);
  ASSERT_TRUE(value.Is<Object>());
  const Object& object = value.Get<Object>();
  ASSERT_EQ(object.GetSize(), 3u);
  EXPECT_EQ(object.GetValueName(0), u"b");
  EXPECT_EQ(object.GetValueName(1), u"a");
  EXPECT_EQ(object.GetValueName(2), u"b");
  ASSERT_NE(object.Find(u"b"), nullptr);
  EXPECT_EQ(*object.Find(u"b"), Value(1));
  EXPECT_EQ(object.Find(u"c"), nullptr);
  EXPECT_EQ(Json::ValueToString(value, false), text);
}

TEST(JsonTest, BadTextFailsAndLeavesValueAlone) {
  const char16_t loneHigh[] = {u'"', 0xD800, u'"', 0};
  const char16_t loneLow[] = {u'[', u'"', u'x', 0xDC00, u'"', u']', 0};
  const char16_t reversedPair[] = {u'"', 0xDC00, 0xD800, u'"', 0};
  const char16_t loneInName[] = {u'{', u'"', 0xDBFF, u'"', u':', u'1', u'}', 0};
  const char16_t nulInside[] = {u'[', u'1', u']', 0, u'x'};
  const std::u16string deepArrays(Json::kMaxDepth + 1, u'[');
  std::u16string deepObjects;
  for (int i = 0; i <= Json::kMaxDepth; ++i)
    deepObjects += u"{\"a\":";
  struct Case {
    const char* name;
    Text text;
  };
  const Case cases[] = {
      {"empty", u""},
      {"white space only", u" \n\t"},
      {"byte order mark only", u"\uFEFF"},
      {"truncated object", u"{\"a\":1"},
      {"truncated string", u"\"abc"},
      {"truncated literal", u"tru"},
      {"trailing value", u"{} {}"},
      {"trailing text", u"[1]x"},
      {"text after NUL", Text(nulInside, 5)},
      {"trailing comma", u"[1,]"},
      {"bad escape", u"\"\\x\""},
      {"short unicode escape", u"\"\\u12\""},
      {"single quotes", u"'a'"},
      {"raw control character", u"\"a\nb\""},
      {"unquoted name", u"{a:1}"},
      {"leading zero", u"01"},
      {"NaN", u"NaN"},
      {"number too big", u"1e400"},
      {"number rounding to infinity", u"[10e308]"},
      {"number just above the largest", u"1.7976931348623159e308"},
      {"exponent too big", u"1e99999999999999"},
      {"integer too big", Text(u"1") + Text(std::u16string(400, u'0'))},
      {"escaped lone high surrogate", u"\"\\uD800\""},
      {"escaped lone low surrogate", u"\"\\uDC00\""},
      {"escaped lone low surrogate in name", u"{\"\\uDC00\":1}"},
      {"raw lone high surrogate", loneHigh},
      {"raw lone low surrogate", loneLow},
      {"raw reversed pair", reversedPair},
      {"raw lone surrogate in name", loneInName},
      {"arrays too deep", Text(deepArrays)},
      {"objects too deep", Text(deepObjects)},
      {"far too deep", Text(std::u16string(1000000, u'['))},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Value out(u"untouched");
    Text error;
    EXPECT_FALSE(Json::Parse(c.text, out, error));
    EXPECT_EQ(out, Value(u"untouched"));
    EXPECT_NE(Narrow(error).find(" at offset "), std::string::npos) << Narrow(error);
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
}

TEST(JsonTest, ObjectAndArrayEqualityIsDeepAndOrdered) {
  const Object ab = MakeObject({{u"a", 1}, {u"b", MakeArray({true})}});
  EXPECT_EQ(ab, MakeObject({{u"a", 1}, {u"b", MakeArray({true})}}));
  EXPECT_NE(ab, MakeObject({{u"b", MakeArray({true})}, {u"a", 1}}));
  EXPECT_NE(ab, MakeObject({{u"a", 1}, {u"b", MakeArray({false})}}));
  EXPECT_NE(ab, MakeObject({{u"a", 1}}));
  EXPECT_NE(ab, MakeObject({{u"a", 1}, {u"c", MakeArray({true})}}));
  EXPECT_EQ(MakeArray({1, u"x"}), MakeArray({1.0, u"x"}));
  EXPECT_NE(MakeArray({1, u"x"}), MakeArray({u"x", 1}));
  EXPECT_NE(MakeArray({1}), MakeArray({1, 1}));
  // Equal content of different kinds is not equal.
  EXPECT_NE(Value(u"1"), Value(1));
  EXPECT_NE(Value(u"x"), Value(ZelStringT<char>("x")));
  EXPECT_NE(Value(Object()), Value(Array()));
  EXPECT_NE(Value(0), Value(false));
  EXPECT_EQ(Value(Json::NullType()), Value());
}

TEST(JsonTest, ConstructorsPickTheIntendedKind) {
  static_assert(!std::is_constructible<Value, int*>::value, "pointers must not become bools");
  static_assert(!std::is_constructible<Value, std::nullptr_t>::value, "null is NullType");
  EXPECT_TRUE(Value().IsNull());
  EXPECT_TRUE(Value(1).Is<double>());
  EXPECT_TRUE(Value(2u).Is<double>());
  EXPECT_TRUE(Value(std::int64_t{3}).Is<double>());
  EXPECT_TRUE(Value(4.5f).Is<double>());
  EXPECT_TRUE(Value(true).Is<bool>());
  EXPECT_TRUE(Value(u"x").Is<Text>());
  EXPECT_TRUE(Value("x").Is<ZelStringT<char>>());
  EXPECT_EQ(Value(Array()).Index(), 5u);

  Value number(7);
  EXPECT_EQ(number.Get<double>(), 7.0);
  EXPECT_THROW(number.Get<bool>(), std::bad_cast);
  EXPECT_THROW(number.Get<Object>(), std::bad_cast);
  EXPECT_EQ(number.GetIf<Text>(), nullptr);
  number.Get<double>() = 8;
  EXPECT_EQ(number, Value(8));
}

} // namespace
