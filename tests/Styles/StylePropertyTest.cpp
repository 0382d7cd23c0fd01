#include <Styles/StyleProperty.h>

#include <Styles/StyleManager.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <string>

namespace Styles {
namespace {

using ZelUtils::Any;
using Text = ZelStringT<char16_t>;

bool IsNumber(const Any& value) { return value.IsTypeCompatible<double>(); }

// Clamps numbers to at most the default; counts its destruction.
struct ClampValidator final : PropertyValidator {
  explicit ClampValidator(int* destroyed) : destroyed(destroyed) {}
  ~ClampValidator() override { ++*destroyed; }
  bool Validate(Any& value, const Any& defaultValue) const override {
    if (!value.IsTypeCompatible<double>())
      return false;
    value = std::min(value.Get<double>(), defaultValue.Get<double>());
    return true;
  }
  int* destroyed;
};

TEST(StylePropertyTest, ValidateAndOwnership) {
  int destroyed = 0;
  {
    StyleProperty property(Any(10.0), new ZelPref::NumberConversionPolicy(), IsNumber);
    Any value(25.0);
    EXPECT_FALSE(property.Validate(value)); // no validator: refused, untouched
    EXPECT_EQ(value.Get<double>(), 25.0);
    property.SetValidator(new ClampValidator(&destroyed));
    EXPECT_TRUE(property.Validate(value));
    EXPECT_EQ(value.Get<double>(), 10.0);
    property.SetValidator(new ClampValidator(&destroyed)); // deletes the old one
    EXPECT_EQ(destroyed, 1);
  }
  EXPECT_EQ(destroyed, 2); // the policy is checked by LeakSanitizer
  // Without a type check nothing is accepted.
  EXPECT_FALSE(StyleProperty(Any(0.0), nullptr, nullptr).CheckType(Any(0.0)));
}

TEST(StylePropertyTest, SerializeRespectsMinimumVersion) {
  const StyleProperty withPolicy(Any(Text()), new ZelPref::TextConversionPolicy(), nullptr, 3);
  const StyleProperty withoutPolicy(Any(Text()), nullptr, nullptr, 3);
  const JsonValue untouched(u"untouched");
  struct Case {
    int version;
    const StyleProperty* property;
    bool written;
    JsonValue expected;
  };
  for (const Case& c :
       {Case{2, &withPolicy, false, untouched}, Case{3, &withPolicy, true, JsonValue(u"v")},
        Case{4, &withPolicy, true, JsonValue(u"v")}, Case{2, &withoutPolicy, false, untouched},
        Case{3, &withoutPolicy, true, JsonValue()}}) {
    SCOPED_TRACE(testing::Message()
                 << "version " << c.version << ", policy " << (c.property == &withPolicy));
    StyleSheet sheet;
    sheet.SetVersion(c.version);
    JsonValue out = untouched;
    EXPECT_EQ(c.property->Serialize(sheet, nullptr, Any(Text(u"v")), out), c.written);
    EXPECT_TRUE(out == c.expected);
  }
}

// Behaviours registered in the shared manager under keys of this suite.
class StylePropertyStyleTest : public testing::Test {
protected:
  void SetUp() override {
    GetStyleManager().RegisterCategory(m_category, u"PropertyTest", false, false);
    for (const char16_t* name :
         {u"width", u"xScale", u"yScale", u"angle", u"skew", u"XScale", u"Skew"})
      Register(name, new StyleProperty(Any(5.0), new ZelPref::NumberConversionPolicy(), IsNumber));
    Register(u"PropertyTest.text",
             new StyleProperty(Any(Text()), new ZelPref::TextConversionPolicy(), nullptr));
    Register(u"PropertyTest.noPolicy", new StyleProperty(Any(Text()), nullptr, nullptr));
  }
  void TearDown() override { GetStyleManager().DeregisterCategory(m_category); }
  void Register(const char16_t* name, BaseStyleProperty* property) {
    GetStyleManager().RegisterProperty(m_category, PropertyKey(name), property);
  }
  const BaseStyleProperty* Behaviour(const char16_t* name) const {
    return GetStyleManager().GetStyleProperty(m_category, PropertyKey(name));
  }

  const PropertyKey m_category{u"PropertyTest.Para"};
  const PropertyKey m_width{u"width"};
  StyleSheet m_sheet;
};

TEST_F(StylePropertyStyleTest, DeserializeReadsTextNumbersAndBools) {
  const PropertyKey key(u"PropertyTest.text");
  struct Case {
    const char* label;
    JsonValue in;
    const char16_t* text; // null: the JSON kind is refused
  };
  for (const Case& c :
       {Case{"string", JsonValue(u" as is"), u" as is"}, Case{"true", JsonValue(true), u"1"},
        Case{"false", JsonValue(false), u"0"}, Case{"2.5", JsonValue(2.5), u"2.5"},
        Case{"12", JsonValue(12.0), u"12"}, Case{"1e21", JsonValue(1e21), u"1e+21"},
        Case{"null", JsonValue(), nullptr}, Case{"object", JsonValue(Json::Object()), nullptr},
        Case{"array", JsonValue(Json::Array()), nullptr}}) {
    SCOPED_TRACE(c.label);
    Style style(nullptr, m_category);
    EXPECT_EQ(Behaviour(u"PropertyTest.text")->Deserialize(m_sheet, &style, c.in),
              c.text != nullptr);
    ASSERT_EQ(style.DoesOverrideProperty(key), c.text != nullptr);
    if (c.text) {
      EXPECT_EQ(style.GetProperty(key).Get<Text>(), Text(c.text));
    }
  }
  Style style(nullptr, m_category);
  EXPECT_FALSE(Behaviour(u"PropertyTest.noPolicy")->Deserialize(m_sheet, &style, JsonValue(u"x")));
  EXPECT_FALSE(style.DoesOverrideProperty(PropertyKey(u"PropertyTest.noPolicy")));
}

// Old documents hold unreadable geometry; only these exact names fall back.
TEST_F(StylePropertyStyleTest, UnreadableGeometryFallsBack) {
  struct Case {
    const char16_t* name;
    bool repaired;
    double value;
  };
  for (const Case& c : {Case{u"xScale", true, 1}, Case{u"yScale", true, 1}, Case{u"angle", true, 0},
                        Case{u"skew", true, 0}, Case{u"width", false, 0}, Case{u"XScale", false, 0},
                        Case{u"Skew", false, 0}}) {
    const PropertyKey key(c.name);
    SCOPED_TRACE(std::string(key.GetView().begin(), key.GetView().end()));
    const BaseStyleProperty* property = Behaviour(c.name);
    Style style(nullptr, m_category);
    if (c.repaired) {
      EXPECT_TRUE(property->Deserialize(m_sheet, &style, JsonValue(u"bad")));
      EXPECT_EQ(style.GetProperty(key).Get<double>(), c.value);
    } else {
      EXPECT_THROW(property->Deserialize(m_sheet, &style, JsonValue(u"bad")),
                   ZelPref::Detail::BadConversion);
      EXPECT_FALSE(style.DoesOverrideProperty(key));
    }
    EXPECT_TRUE(property->Deserialize(m_sheet, &style, JsonValue(u"2.5"))); // readable: as read
    EXPECT_EQ(style.GetProperty(key).Get<double>(), 2.5);
  }
}

TEST_F(StylePropertyStyleTest, MergeProperty) {
  const BaseStyleProperty* width = Behaviour(u"width");
  Style grandparent(nullptr, m_category);
  grandparent.SetProperty(m_width, Any(7.0));
  Style source(&grandparent, m_category); // only inherits 7
  struct Case {
    const char* label;
    bool targetSets;
    bool overwrite;
    double expected;
  };
  for (const Case& c :
       {Case{"kept", true, false, 1.0}, Case{"replaced", true, true, 7.0},
        Case{"filled", false, false, 7.0}, Case{"filled, overwrite", false, true, 7.0}}) {
    SCOPED_TRACE(c.label);
    Style target(nullptr, m_category);
    if (c.targetSets)
      target.SetProperty(m_width, Any(1.0));
    width->MergeProperty(&target, &source, m_width, c.overwrite);
    ASSERT_TRUE(target.DoesOverrideProperty(m_width));
    EXPECT_EQ(target.GetProperty(m_width).Get<double>(), c.expected);
  }

  // From a parent only a value found there is taken, never the default.
  Style withDefault(nullptr, m_category);
  Style target(nullptr, m_category);
  width->MergeParentProperty(&target, &withDefault, m_width);
  EXPECT_FALSE(target.DoesOverrideProperty(m_width));
  width->MergeParentProperty(&target, &grandparent, m_width);
  EXPECT_EQ(target.GetProperty(m_width).Get<double>(), 7.0);

  // A source that resolves to the target's own value leaves it in place.
  Style child(&grandparent, m_category);
  width->MergeProperty(&grandparent, &child, m_width, true);
  EXPECT_EQ(grandparent.GetProperty(m_width).Get<double>(), 7.0);
}

TEST_F(StylePropertyStyleTest, FlattenPropertyMakesInheritedValuesOwn) {
  const BaseStyleProperty* width = Behaviour(u"width");
  Style parent(nullptr, m_category);
  parent.SetProperty(m_width, Any(4.0));
  Style child(&parent, m_category);
  EXPECT_TRUE(width->FlattenProperty(&child, m_width));
  parent.SetProperty(m_width, Any(8.0));
  EXPECT_EQ(child.GetProperty(m_width).Get<double>(), 4.0);

  Style alone(nullptr, m_category); // only the default: nothing to flatten
  EXPECT_FALSE(width->FlattenProperty(&alone, m_width));
  EXPECT_FALSE(alone.DoesOverrideProperty(m_width));
}

} // namespace
} // namespace Styles
