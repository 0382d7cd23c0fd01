#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <random>

#include <charconv>

#include <cmath>
#include <limits>
#include <string>
#include <utility>
#include <vector>

namespace {

using String16 = ZelStringT<char16_t>;
using ZelPref::Detail::BadConversion;
using ZelUtils::Any;

std::string Narrow(std::u16string_view text) { return std::string(text.begin(), text.end()); }

TEST(ConversionPolicyTest, NumberRoundTripsShortestText) {
  const ZelPref::NumberConversionPolicy policy;
  struct Case {
    double value;
    const char16_t* text;
  };
  for (const Case& c : {Case{0.5, u"0.5"}, Case{1e21, u"1e+21"}, Case{-3.25, u"-3.25"},
                        Case{0.1, u"0.1"}, Case{1.0 / 3, u"0.3333333333333333"}}) {
    SCOPED_TRACE(c.value);
    EXPECT_EQ(policy.ToText(Any(c.value)), c.text);
    EXPECT_EQ(policy.FromText(c.text).Get<double>(), c.value);
  }
  for (const double value : {std::numeric_limits<double>::max(),
                             std::numeric_limits<double>::denorm_min(), 123456789.125}) {
    SCOPED_TRACE(value);
    EXPECT_EQ(policy.FromText(policy.ToText(Any(value))).Get<double>(), value);
  }
  EXPECT_TRUE(std::signbit(policy.FromText(policy.ToText(Any(-0.0))).Get<double>()));
  // The text is std::to_chars' own, also where a short decimal takes a fast
  // path: whole numbers and decimals of every length around it, both forms.
  std::mt19937_64 random(5);
  std::vector<double> values = {0.0,      -0.0,  1e5,   1e6,  123000,           0.001,
                                0.0001,   0.125, 100.5, 1e14, 999999999999.999, -12.75,
                                0.1 + 0.2};
  for (int i = 0; i < 20000; ++i) {
    const double whole = static_cast<double>(random() % 2000000) - 1000000;
    const double scale = std::pow(10.0, static_cast<double>(random() % 9));
    values.push_back(whole / scale);
    values.push_back(std::nextafter(whole / 1000, 1e300));
  }
  for (const double value : values) {
    char expected[64];
    const char* end = std::to_chars(expected, expected + sizeof expected, value).ptr;
    const ZelStringT<char16_t> text = policy.ToText(Any(value));
    ASSERT_EQ(std::string(text.GetView().begin(), text.GetView().end()),
              std::string(static_cast<const char*>(expected), end))
        << value;
    const double read = policy.FromText(text).Get<double>();
    ASSERT_TRUE(read == value && std::signbit(read) == std::signbit(value)) << value;
  }
}

// Each policy reads the texts on the left and refuses those on the right.
TEST(ConversionPolicyTest, ReadsAndRejects) {
  const ZelPref::NumberConversionPolicy number;
  const ZelPref::IntegerConversionPolicy integer;
  const ZelPref::BooleanConversionPolicy boolean;
  struct Case {
    const char* name;
    const ZelPref::ConversionPolicy* policy;
    std::vector<std::pair<const char16_t*, Any>> read;
    std::vector<const char16_t*> refused;
  };
  const Case cases[] = {
      {"number",
       &number,
       {{u".5", Any(0.5)},
        {u"+2", Any(2.0)},
        {u" 7 ", Any(7.0)},
        {u"1E-2", Any(0.01)},
        {u"5.", Any(5.0)}},
       {u"", u"1x", u"1 2", u"inf", u"nan", u"+-1", u"-", u".", u"1e", u"0x10", u"1e999", u"1,5",
        u"\uFF11", u"1\u00A0"}},
      {"integer",
       &integer,
       {{u" -3 ", Any(-3)},
        {u"2147483647", Any(2147483647)},
        {u"-2147483648", Any(-2147483647 - 1)},
        {u"1e+06", Any(1000000)},
        {u"2.0", Any(2)}},
       {u"1.5", u"2147483648", u"-2147483649", u"1e10", u"12abc", u"0x1F"}},
      {"boolean",
       &boolean,
       {{u"1", Any(true)}, {u"true", Any(true)}, {u"0", Any(false)}, {u" False ", Any(false)}},
       {u"", u"2", u"yes", u"01", u"truex"}},
  };
  for (const Case& c : cases) {
    for (const auto& [text, value] : c.read) {
      SCOPED_TRACE(std::string(c.name) + " reads " + Narrow(text));
      EXPECT_TRUE(c.policy->FromText(text) == value);
    }
    for (const char16_t* text : c.refused) {
      SCOPED_TRACE(std::string(c.name) + " refuses " + Narrow(text));
      EXPECT_THROW(c.policy->FromText(text), BadConversion);
    }
  }
}

TEST(ConversionPolicyTest, WritesOnlyItsOwnKind) {
  const ZelPref::TextConversionPolicy text;
  const String16 sample(u" \u00E4 \"x\" ");
  EXPECT_EQ(text.FromText(text.ToText(Any(sample))).Get<String16>(), sample);
  EXPECT_EQ(ZelPref::IntegerConversionPolicy().ToText(Any(-2147483647 - 1)), u"-2147483648");
  EXPECT_EQ(ZelPref::BooleanConversionPolicy().ToText(Any(false)), u"0");
  EXPECT_THROW(ZelPref::NumberConversionPolicy().ToText(Any(1)), BadConversion);
  EXPECT_THROW(ZelPref::NumberConversionPolicy().ToText(Any(std::nan(""))), BadConversion);
  EXPECT_THROW(ZelPref::IntegerConversionPolicy().ToText(Any(1.0)), BadConversion);
  EXPECT_THROW(ZelPref::BooleanConversionPolicy().ToText(Any(1)), BadConversion);
  EXPECT_THROW(text.ToText(Any(2.0)), BadConversion);
  // Behaviours catch it as a std::exception too.
  EXPECT_THROW(text.ToText(Any()), std::exception);
}

} // namespace
