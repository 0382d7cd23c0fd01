#include <Styles/StyleProperty.h>

#include <Styles/StyleManager.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

namespace Styles {
namespace {

using ZelUtils::Any;
using Text = ZelStringT<char16_t>;

bool IsNumber(const Any& value) { return value.IsTypeCompatible<double>(); }

// A plain behaviour with the base class defaults.
class PlainProperty final : public BaseStyleProperty {
public:
  explicit PlainProperty(Any defaultValue = Any(0.0))
      : BaseStyleProperty(std::move(defaultValue)) {}
  bool Serialize(const StyleSheet&, const Style*, const Any&, JsonValue&) const override {
    return false;
  }
  bool Deserialize(const StyleSheet&, Style*, const JsonValue&) const override { return false; }
  bool CheckType(const Any&) const override { return true; }
};

// Clamps numbers to at most the default; counts its destruction.
class ClampValidator final : public PropertyValidator {
public:
  explicit ClampValidator(int* destroyed) : m_destroyed(destroyed) {}
  ~ClampValidator() override { ++*m_destroyed; }
  bool Validate(Any& value, const Any& defaultValue) const override {
    if (!value.IsTypeCompatible<double>())
      return false;
    if (value.Get<double>() > defaultValue.Get<double>())
      value = defaultValue.Get<double>();
    return true;
  }

private:
  int* m_destroyed;
};

// Hands out the texts it reads as text values; "bad" is unreadable.
class RecordingPolicy final : public ZelPref::ConversionPolicy {
public:
  RecordingPolicy(std::vector<Text>* texts, int* destroyed)
      : m_texts(texts), m_destroyed(destroyed) {}
  ~RecordingPolicy() override {
    if (m_destroyed)
      ++*m_destroyed;
  }
  Text ToText(const Any& value) const override { return u"<" + value.Get<Text>() + u">"; }
  Any FromText(const Text& text) const override {
    m_texts->push_back(text);
    if (text == Text(u"bad"))
      throw ZelPref::Detail::BadConversion();
    return Any(text);
  }

private:
  std::vector<Text>* m_texts;
  int* m_destroyed;
};

TEST(StylePropertyTest, BaseDefaults) {
  PlainProperty property;
  EXPECT_EQ(property.GetCategoryKey(), PropertyKey::Empty);
  EXPECT_EQ(property.GetName(), PropertyKey::Empty);
  EXPECT_EQ(property.GetElementCategoryName(), PropertyKey::Empty);
  EXPECT_EQ(property.GetConversionPolicy(), nullptr);
  EXPECT_EQ(property.GetMinimumVersion(), 0);
  EXPECT_FALSE(property.NeedAdjustementsForStyleIO());
  EXPECT_FALSE(property.IsDeprecated());
  EXPECT_FALSE(property.IsTemporary());
  EXPECT_FALSE(property.IsSubstyle());

  Any value(Text(u"a text long enough to live on the heap"));
  EXPECT_FALSE(property.HasParentalDependency(value));
  EXPECT_TRUE(property.GetDependencies(value, StyleSpan(), false).empty());
  EXPECT_FALSE(property.ProcessStylesInProperty(value, [](Style*) { return true; }));

  const Text* held = value.GetIf<Text>();
  Any moved = property.MovePropertyData(nullptr, std::move(value));
  EXPECT_EQ(moved.GetIf<Text>(), held);

  // ProcessProperty hands its arguments to the visitor and returns its answer.
  const PropertyKey key(u"PropertyTest.key");
  Style holder;
  Style* const style = &holder;
  for (bool answer : {true, false}) {
    SCOPED_TRACE(answer);
    int calls = 0;
    PropertyVisitor visit = [&](Any& seen, Style* seenStyle, const PropertyKey& seenKey) {
      ++calls;
      EXPECT_EQ(&seen, &moved);
      EXPECT_EQ(seenStyle, style);
      EXPECT_EQ(seenKey, key);
      return answer;
    };
    EXPECT_EQ(property.ProcessProperty(moved, visit, style, key), answer);
    EXPECT_EQ(calls, 1);
  }
}

TEST(StylePropertyTest, EqualityAndOrderFollowValues) {
  PlainProperty property;
  struct Case {
    const char* label;
    Any a, b;
    bool equal;
  };
  const Case cases[] = {
      {"empty", Any(), Any(), true},
      {"same number", Any(1.0), Any(1.0), true},
      {"numbers", Any(1.0), Any(2.0), false},
      {"number and text", Any(1.0), Any(Text(u"1")), false},
      {"texts", Any(Text(u"a")), Any(Text(u"b")), false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.label);
    EXPECT_EQ(property.IsEqual(c.a, c.b), c.equal);
    EXPECT_EQ(property.IsEqual(c.b, c.a), c.equal);
    EXPECT_FALSE(property.IsLess(c.a, c.a));
    // Unequal values are ordered one way round, whatever their kinds.
    if (!c.equal) {
      EXPECT_NE(property.IsLess(c.a, c.b), property.IsLess(c.b, c.a));
    }
  }
  EXPECT_TRUE(property.IsLess(Any(1.0), Any(2.0)));
}

TEST(StylePropertyTest, ValidateWithAndWithoutValidator) {
  int destroyed = 0;
  {
    PlainProperty property(Any(10.0));
    Any value(25.0);
    EXPECT_FALSE(property.Validate(value));
    EXPECT_EQ(value.Get<double>(), 25.0);

    property.SetValidator(new ClampValidator(&destroyed));
    EXPECT_TRUE(property.Validate(value));
    EXPECT_EQ(value.Get<double>(), 10.0);
    Any text(Text(u"x"));
    EXPECT_FALSE(property.Validate(text));

    // Replacing the validator deletes the old one, once.
    property.SetValidator(new ClampValidator(&destroyed));
    EXPECT_EQ(destroyed, 1);
  }
  EXPECT_EQ(destroyed, 2);
}

TEST(StylePropertyTest, OwnsItsPolicy) {
  std::vector<Text> texts;
  int destroyed = 0;
  auto* policy = new RecordingPolicy(&texts, &destroyed);
  {
    StyleProperty property(Any(Text()), policy, IsNumber, 4);
    EXPECT_EQ(property.GetConversionPolicy(), policy);
    EXPECT_EQ(property.GetMinimumVersion(), 4);
    EXPECT_TRUE(property.CheckType(Any(1.0)));
    EXPECT_FALSE(property.CheckType(Any(Text(u"1"))));
    EXPECT_FALSE(property.CheckType(Any()));
  }
  EXPECT_EQ(destroyed, 1);
  StyleProperty unchecked(Any(0.0), nullptr, nullptr);
  EXPECT_FALSE(unchecked.CheckType(Any(0.0)));
}

TEST(StylePropertyTest, SerializeRespectsMinimumVersion) {
  std::vector<Text> texts;
  StyleProperty withPolicy(Any(Text()), new RecordingPolicy(&texts, nullptr), nullptr, 3);
  StyleProperty withoutPolicy(Any(Text()), nullptr, nullptr, 3);
  const Any value(Text(u"v"));
  struct Case {
    int version;
    const StyleProperty* property;
    bool written;
    JsonValue expected;
  };
  const JsonValue untouched(u"untouched");
  const Case cases[] = {
      {2, &withPolicy, false, untouched},        {3, &withPolicy, true, JsonValue(u"<v>")},
      {4, &withPolicy, true, JsonValue(u"<v>")}, {2, &withoutPolicy, false, untouched},
      {3, &withoutPolicy, true, JsonValue()},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << "version " << c.version << ", policy "
                                    << (c.property->GetConversionPolicy() != nullptr));
    StyleSheet sheet;
    sheet.SetVersion(c.version);
    JsonValue out = untouched;
    EXPECT_EQ(c.property->Serialize(sheet, nullptr, value, out), c.written);
    EXPECT_TRUE(out == c.expected);
  }
}

// Plain properties registered in the shared manager under keys of this suite.
class StylePropertyStyleTest : public testing::Test {
protected:
  void SetUp() override {
    StyleManager& manager = GetStyleManager();
    manager.RegisterCategory(m_category, u"PropertyTest", false, false);
    for (const char16_t* name :
         {u"width", u"xScale", u"yScale", u"angle", u"skew", u"XScale", u"Skew", u"scale"}) {
      manager.RegisterProperty(
          m_category, PropertyKey(name),
          new StyleProperty(Any(5.0), new ZelPref::NumberConversionPolicy(), IsNumber));
    }
    m_text = new StyleProperty(Any(Text()), new RecordingPolicy(&m_texts, nullptr), nullptr);
    manager.RegisterProperty(m_category, m_textKey, m_text);
    m_noPolicy = new StyleProperty(Any(Text()), nullptr, nullptr);
    manager.RegisterProperty(m_category, m_noPolicyKey, m_noPolicy);
  }
  void TearDown() override { GetStyleManager().DeregisterCategory(m_category); }

  const BaseStyleProperty* Behaviour(const char16_t* name) const {
    return GetStyleManager().GetStyleProperty(m_category, PropertyKey(name));
  }

  const PropertyKey m_category{u"PropertyTest.Para"};
  const PropertyKey m_textKey{u"PropertyTest.text"};
  const PropertyKey m_noPolicyKey{u"PropertyTest.noPolicy"};
  const PropertyKey m_width{u"width"};
  std::vector<Text> m_texts;
  StyleProperty* m_text = nullptr;
  StyleProperty* m_noPolicy = nullptr;
  StyleSheet m_sheet;
};

TEST_F(StylePropertyStyleTest, DeserializeTurnsJsonIntoText) {
  struct Case {
    const char* label;
    JsonValue in;
    const char16_t* text; // null: the JSON kind is refused
  };
  const Case cases[] = {
      {"string", JsonValue(u"as is"), u"as is"},
      {"true", JsonValue(true), u"1"},
      {"false", JsonValue(false), u"0"},
      {"half", JsonValue(0.5), u"0.5"},
      {"2.5", JsonValue(2.5), u"2.5"},
      {"whole", JsonValue(12.0), u"12"},
      {"large", JsonValue(1e21), u"1e+21"},
      {"negative", JsonValue(-0.25), u"-0.25"},
      {"null", JsonValue(), nullptr},
      {"object", JsonValue(Json::Object()), nullptr},
      {"array", JsonValue(Json::Array()), nullptr},
      {"utf8 string", JsonValue(ZelStringT<char>("text")), nullptr},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.label);
    m_texts.clear();
    Style style(nullptr, m_category);
    EXPECT_EQ(m_text->Deserialize(m_sheet, &style, c.in), c.text != nullptr);
    if (c.text) {
      EXPECT_EQ(m_texts, std::vector<Text>{Text(c.text)});
      ASSERT_TRUE(style.DoesOverrideProperty(m_textKey));
      EXPECT_EQ(style.GetProperty(m_textKey).Get<Text>(), Text(c.text));
    } else {
      EXPECT_TRUE(m_texts.empty());
      EXPECT_FALSE(style.DoesOverrideProperty(m_textKey));
    }
  }

  Style style(nullptr, m_category);
  EXPECT_FALSE(m_noPolicy->Deserialize(m_sheet, &style, JsonValue(u"x")));
  EXPECT_FALSE(style.DoesOverrideProperty(m_noPolicyKey));
}

TEST_F(StylePropertyStyleTest, UnreadableGeometryFallsBack) {
  struct Case {
    const char16_t* name;
    bool repaired;
    double value;
  };
  for (const Case& c :
       {Case{u"xScale", true, 1.0}, Case{u"yScale", true, 1.0}, Case{u"angle", true, 0.0},
        Case{u"skew", true, 0.0}, Case{u"width", false, 0.0}, Case{u"XScale", false, 0.0},
        Case{u"Skew", false, 0.0}, Case{u"scale", false, 0.0}}) {
    const PropertyKey key(c.name);
    SCOPED_TRACE(testing::Message() << std::string(key.GetView().begin(), key.GetView().end()));
    Style style(nullptr, m_category);
    const BaseStyleProperty* property = Behaviour(c.name);
    ASSERT_NE(property, nullptr);
    if (c.repaired) {
      EXPECT_TRUE(property->Deserialize(m_sheet, &style, JsonValue(u"bad")));
      ASSERT_TRUE(style.DoesOverrideProperty(key));
      EXPECT_EQ(style.GetProperty(key).Get<double>(), c.value);
    } else {
      EXPECT_THROW(property->Deserialize(m_sheet, &style, JsonValue(u"bad")),
                   ZelPref::Detail::BadConversion);
      EXPECT_FALSE(style.DoesOverrideProperty(key));
    }
    // Readable text is stored as read under every name.
    EXPECT_TRUE(property->Deserialize(m_sheet, &style, JsonValue(u"2.5")));
    EXPECT_EQ(style.GetProperty(key).Get<double>(), 2.5);
  }
}

TEST_F(StylePropertyStyleTest, MergePropertyOverwrite) {
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
  for (const Case& c : {Case{"kept", true, false, 1.0}, Case{"replaced", true, true, 7.0},
                        Case{"filled", false, false, 7.0}, Case{"filled", false, true, 7.0}}) {
    SCOPED_TRACE(c.label);
    Style target(nullptr, m_category);
    if (c.targetSets)
      target.SetProperty(m_width, Any(1.0));
    width->MergeProperty(&target, &source, m_width, c.overwrite);
    ASSERT_TRUE(target.DoesOverrideProperty(m_width));
    EXPECT_EQ(target.GetProperty(m_width).Get<double>(), c.expected);
  }

  // A source that resolves to the target's own value leaves it in place.
  Style child(&grandparent, m_category);
  width->MergeProperty(&grandparent, &child, m_width, true);
  EXPECT_EQ(grandparent.GetProperty(m_width).Get<double>(), 7.0);
}

TEST_F(StylePropertyStyleTest, MergeParentPropertyTakesOnlyFoundValues) {
  const BaseStyleProperty* width = Behaviour(u"width");
  Style parentWithValue(nullptr, m_category);
  parentWithValue.SetProperty(m_width, Any(3.0));
  Style parentWithDefault(nullptr, m_category);

  Style setsItself(nullptr, m_category);
  setsItself.SetProperty(m_width, Any(1.0));
  width->MergeParentProperty(&setsItself, &parentWithValue, m_width);
  EXPECT_EQ(setsItself.GetProperty(m_width).Get<double>(), 1.0);

  Style empty(nullptr, m_category);
  width->MergeParentProperty(&empty, &parentWithDefault, m_width);
  EXPECT_FALSE(empty.DoesOverrideProperty(m_width));
  width->MergeParentProperty(&empty, &parentWithValue, m_width);
  ASSERT_TRUE(empty.DoesOverrideProperty(m_width));
  EXPECT_EQ(empty.GetProperty(m_width).Get<double>(), 3.0);
}

TEST_F(StylePropertyStyleTest, FlattenPropertyMakesInheritedValuesOwn) {
  const BaseStyleProperty* width = Behaviour(u"width");
  Style parent(nullptr, m_category);
  parent.SetProperty(m_width, Any(4.0));
  Style child(&parent, m_category);

  EXPECT_TRUE(width->FlattenProperty(&child, m_width));
  ASSERT_TRUE(child.DoesOverrideProperty(m_width));
  parent.SetProperty(m_width, Any(8.0));
  EXPECT_EQ(child.GetProperty(m_width).Get<double>(), 4.0);

  // Only the default: nothing to flatten.
  Style alone(nullptr, m_category);
  EXPECT_FALSE(width->FlattenProperty(&alone, m_width));
  EXPECT_FALSE(alone.DoesOverrideProperty(m_width));
}

} // namespace
} // namespace Styles
