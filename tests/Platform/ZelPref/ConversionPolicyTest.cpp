#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <memory>
#include <string>

namespace {

using String16 = ZelStringT<char16_t>;
using ZelPref::Detail::BadConversion;
using ZelUtils::Any;

std::string Narrow(std::u16string_view text) {
  std::string out;
  for (const char16_t c : text)
    out += c < 0x80 ? std::string(1, static_cast<char>(c)) : "\\u" + std::to_string(c);
  return out;
}

TEST(ConversionPolicyTest, NumberWritesShortestRoundTripText) {
  const ZelPref::NumberConversionPolicy policy;
  struct Case {
    double value;
    const char16_t* text;
  };
  for (const Case& c :
       {Case{0.5, u"0.5"}, Case{1e21, u"1e+21"}, Case{12, u"12"}, Case{-3.25, u"-3.25"},
        Case{0.1, u"0.1"}, Case{1.0 / 3, u"0.3333333333333333"}}) {
    SCOPED_TRACE(c.value);
    EXPECT_EQ(policy.ToText(Any(c.value)), c.text);
    EXPECT_EQ(policy.FromText(c.text).Get<double>(), c.value);
  }
  for (const double value : {std::numeric_limits<double>::max(),
                             std::numeric_limits<double>::denorm_min(), -0.0, 123456789.125}) {
    SCOPED_TRACE(value);
    EXPECT_EQ(policy.FromText(policy.ToText(Any(value))).Get<double>(), value);
  }
}

TEST(ConversionPolicyTest, NumberReadsAndRejects) {
  const ZelPref::NumberConversionPolicy policy;
  struct Case {
    const char16_t* text;
    double value;
  };
  for (const Case& c : {Case{u"12", 12}, Case{u"-3.5", -3.5}, Case{u".5", 0.5}, Case{u"1e3", 1000},
                        Case{u"+2", 2}, Case{u" 7 ", 7}, Case{u"1E-2", 0.01}, Case{u"5.", 5}}) {
    SCOPED_TRACE(Narrow(c.text));
    EXPECT_EQ(policy.FromText(c.text).Get<double>(), c.value);
  }
  for (const char16_t* text :
       {u"", u"  ", u"1x", u"x1", u"1 2", u"inf", u"-inf", u"nan", u"infinity", u"+-1", u"--1",
        u"-", u".", u"1e", u"0x10", u"1e999", u"1,5", u"\uFF11", u"1\u00A0"}) {
    SCOPED_TRACE(Narrow(text));
    EXPECT_THROW(policy.FromText(text), BadConversion);
  }
  EXPECT_THROW(policy.ToText(Any(1)), BadConversion);
  EXPECT_THROW(policy.ToText(Any()), BadConversion);
  EXPECT_THROW(policy.ToText(Any(std::nan(""))), BadConversion);
}

TEST(ConversionPolicyTest, Integer) {
  const ZelPref::IntegerConversionPolicy policy;
  EXPECT_EQ(policy.ToText(Any(-42)), u"-42");
  EXPECT_EQ(policy.ToText(Any(std::numeric_limits<int>::min())), u"-2147483648");
  struct Case {
    const char16_t* text;
    int value;
  };
  for (const Case& c :
       {Case{u"12", 12}, Case{u"+7", 7}, Case{u" -3 ", -3}, Case{u"2147483647", 2147483647},
        Case{u"-2147483648", -2147483647 - 1}, Case{u"1e+06", 1000000}, Case{u"2.0", 2}}) {
    SCOPED_TRACE(Narrow(c.text));
    EXPECT_EQ(policy.FromText(c.text).Get<int>(), c.value);
  }
  for (const char16_t* text :
       {u"", u"1.5", u"2147483648", u"-2147483649", u"1e10", u"12abc", u"+-3", u"nan", u"0x1F"}) {
    SCOPED_TRACE(Narrow(text));
    EXPECT_THROW(policy.FromText(text), BadConversion);
  }
  EXPECT_THROW(policy.ToText(Any(1.0)), BadConversion);
}

TEST(ConversionPolicyTest, BooleanAndText) {
  const ZelPref::BooleanConversionPolicy flags;
  EXPECT_EQ(flags.ToText(Any(true)), u"1");
  EXPECT_EQ(flags.ToText(Any(false)), u"0");
  EXPECT_TRUE(flags.FromText(u"1").Get<bool>());
  EXPECT_TRUE(flags.FromText(u"true").Get<bool>());
  EXPECT_FALSE(flags.FromText(u"0").Get<bool>());
  EXPECT_FALSE(flags.FromText(u" False ").Get<bool>());
  for (const char16_t* text : {u"", u"2", u"yes", u"01", u"truex"}) {
    SCOPED_TRACE(Narrow(text));
    EXPECT_THROW(flags.FromText(text), BadConversion);
  }
  EXPECT_THROW(flags.ToText(Any(1)), BadConversion);

  const ZelPref::TextConversionPolicy text;
  const String16 sample(u" \u00E4 \"x\" ");
  EXPECT_EQ(text.FromText(text.ToText(Any(sample))).Get<String16>(), sample);
  EXPECT_THROW(text.ToText(Any(2.0)), BadConversion);
}

// Behaviours hold policies through the base and catch BadConversion by type,
// also when the policy was made in another library.
TEST(ConversionPolicyTest, PolymorphicUseAndCatchableAsStdException) {
  std::unique_ptr<const ZelPref::ConversionPolicy> policy =
      std::make_unique<ZelPref::NumberConversionPolicy>();
  try {
    policy->FromText(u"bad");
    FAIL() << "no exception";
  } catch (const std::exception& error) {
    EXPECT_NE(dynamic_cast<const BadConversion*>(&error), nullptr);
    EXPECT_NE(std::string(error.what()), "");
  }
}

} // namespace
