#include <Styles/StyleProperty.h>

#include "HostBehaviours.h"

#include <Styles/StyleManager.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

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

// Behaviours registered in the shared manager under keys of this suite.
class StylePropertyStyleTest : public ::testing::Test {
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

// Nodes carry a counted mark and hold a child node (one substyle) and a list
// of item nodes (an array of the holder's own category).
class SubstylePropertyTest : public ::testing::Test {
protected:
  using List = std::vector<Style*>;

  SubstylePropertyTest() : node(u"PropertyTest.Node") {
    sheet.SetVersion(1);
    mark = node.Add(u"mark", new testing::CountingNumberProperty(0, &counts));
    child = node.Add(u"child", new StyleSetProperty(node.Key()));
    items = node.Add(u"items", new StyleArrayProperty(PropertyKey::Empty));
  }
  ~SubstylePropertyTest() override { EXPECT_EQ(counts.Live(), 0); }

  // A free node marked `value`; the caller owns it.
  std::unique_ptr<Style> Node(double value, Style* parent = nullptr) {
    auto style = std::make_unique<Style>(parent, node.Key());
    style->SetProperty(mark, Any(value));
    return style;
  }
  const BaseStyleProperty& Behaviour(const PropertyKey& key) const {
    return *GetStyleManager().GetStyleProperty(node.Key(), key);
  }
  double Mark(const Style* style) const { return style->GetProperty(mark).Get<double>(); }
  static JsonValue Parse(const char16_t* text) {
    JsonValue value;
    Text error;
    EXPECT_TRUE(Json::Parse(text, value, error));
    return value;
  }
  const List& Items(const Style& style) const { return style.GetProperty(items).Get<List>(); }

  testing::ValueCounts counts;
  testing::ScopedCategory node;
  PropertyKey mark, child, items;
  StyleSheet sheet;
};

TEST_F(SubstylePropertyTest, ComparesSubstylesByContentAndListsByLengthFirst) {
  const std::unique_ptr<Style> one = Node(1), alsoOne = Node(1), two = Node(2);
  Style* const a = one.get();
  Style* const b = alsoOne.get();
  Style* const c = two.get();
  Style* const none = nullptr;
  struct Case {
    const char* label;
    List x, y;
    bool equal, less;
  };
  // Single substyles go through one-element rows; nulls order first.
  for (const Case& row :
       {Case{"null, null", {none}, {none}, true, false},
        Case{"null, style", {none}, {a}, false, true},
        Case{"style, null", {a}, {none}, false, false},
        Case{"equal content", {a}, {b}, true, false}, Case{"1 before 2", {a}, {c}, false, true},
        Case{"2 after 1", {c}, {a}, false, false}}) {
    SCOPED_TRACE(row.label);
    const BaseStyleProperty& set = Behaviour(child);
    EXPECT_EQ(set.IsEqual(Any(row.x[0]), Any(row.y[0])), row.equal);
    EXPECT_EQ(set.IsLess(Any(row.x[0]), Any(row.y[0])), row.less);
    const BaseStyleProperty& array = Behaviour(items);
    EXPECT_EQ(array.IsEqual(Any(row.x), Any(row.y)), row.equal);
    EXPECT_EQ(array.IsLess(Any(row.x), Any(row.y)), row.less);
  }
  for (const Case& row : {Case{"empty lists", {}, {}, true, false},
                          Case{"shorter first, whatever it holds", {c}, {a, a}, false, true},
                          Case{"longer after", {a, a}, {c}, false, false},
                          Case{"nulls in place", {a, none}, {b, none}, true, false}}) {
    SCOPED_TRACE(row.label);
    EXPECT_EQ(Behaviour(items).IsEqual(Any(row.x), Any(row.y)), row.equal);
    EXPECT_EQ(Behaviour(items).IsLess(Any(row.x), Any(row.y)), row.less);
  }
  EXPECT_THROW(Behaviour(child).IsEqual(Any(1.0), Any(1.0)), std::bad_cast);
  EXPECT_THROW(Behaviour(items).IsLess(Any(a), Any(a)), std::bad_cast);
}

TEST_F(SubstylePropertyTest, StoresCopiesOwnedByTheHolder) {
  const std::unique_ptr<Style> source = Node(1);
  source->SetPathProperty({child, mark}, Any(2.0));
  const std::unique_ptr<Style> holder = Node(0);
  holder->SetProperty(child, Any(static_cast<const Style*>(source.get())));
  holder->SetProperty(items, List{source.get(), nullptr, source.get()});
  EXPECT_EQ(counts.Live(), 2 + 1 + 2 + 2 * 2); // source, holder, copied child, two copied items

  EXPECT_NE(holder->GetSubstyle(child, false), source.get());
  EXPECT_EQ(source->GetOwner(), nullptr);
  const List& list = Items(*holder);
  ASSERT_EQ(list.size(), 3u);
  EXPECT_EQ(list[1], nullptr);
  EXPECT_NE(list[0], list[2]);
  EXPECT_EQ(testing::CheckOwnerLinks(*holder), 6); // array elements get no owner link

  // Null elements are passed to style visitors but skipped by value visitors.
  int styles = 0, values = 0;
  EXPECT_TRUE(Behaviour(items).ProcessStylesInProperty(holder->GetProperty(items),
                                                       [&](Style*) { return ++styles > 0; }));
  EXPECT_EQ(styles, 3);
  Any value = holder->GetProperty(items);
  EXPECT_TRUE(Behaviour(items).ProcessProperty(
      value, [&](Any&, Style*, const PropertyKey&) { return ++values > 0; }, holder.get(), items));
  EXPECT_EQ(values, 2 * 2);
  Style* seen = source.get();
  EXPECT_FALSE(Behaviour(child).ProcessStylesInProperty(Any(static_cast<Style*>(nullptr)),
                                                        [&](Style* s) { return (seen = s); }));
  EXPECT_EQ(seen, nullptr);
}

TEST_F(SubstylePropertyTest, JsonFormsAndDamagedInput) {
  const std::unique_ptr<Style> holder = Node(0);
  JsonValue out(u"untouched");
  EXPECT_TRUE(
      Behaviour(child).Serialize(sheet, holder.get(), Any(static_cast<Style*>(nullptr)), out));
  EXPECT_TRUE(out.IsNull());
  const std::unique_ptr<Style> element = Node(4);
  EXPECT_TRUE(
      Behaviour(items).Serialize(sheet, holder.get(), Any(List{nullptr, element.get()}), out));
  EXPECT_EQ(Json::ValueToString(out, false), Text(u"[{\"mark\":\"4\"}]"));

  // A substyle member must be an object; a repeated one keeps the first.
  for (const char16_t* text : {u"null", u"3", u"[{}]", u"\"x\""})
    EXPECT_FALSE(Behaviour(child).Deserialize(sheet, holder.get(), Parse(text)));
  EXPECT_FALSE(holder->DoesOverrideProperty(child));
  EXPECT_TRUE(Behaviour(child).Deserialize(sheet, holder.get(), Parse(u"{\"mark\":\"5\"}")));
  EXPECT_TRUE(Behaviour(child).Deserialize(sheet, holder.get(), Parse(u"{\"mark\":\"6\"}")));
  const Style* read = holder->GetSubstyle(child, false);
  EXPECT_EQ(Mark(read), 5.0);
  EXPECT_EQ(read->GetOwner(), holder.get());
  EXPECT_EQ(counts.Live(), 3);

  // Array members other than objects are dropped; the read substyles are
  // stored as copies and freed.
  EXPECT_FALSE(Behaviour(items).Deserialize(sheet, holder.get(), Parse(u"{}")));
  EXPECT_TRUE(Behaviour(items).Deserialize(
      sheet, holder.get(), Parse(u"[1, \"x\", null, {\"mark\":\"7\"}, [], {}, true]")));
  const List& list = Items(*holder);
  ASSERT_EQ(list.size(), 2u);
  EXPECT_EQ(Mark(list[0]), 7.0);
  EXPECT_EQ(list[1]->GetCategoryName(), node.Key());
  EXPECT_EQ(counts.Live(), 4);
  EXPECT_TRUE(Behaviour(items).Deserialize(sheet, holder.get(), Parse(u"[]")));
  EXPECT_TRUE(Items(*holder).empty());
}

TEST_F(SubstylePropertyTest, DependenciesOfSubstylesAndOfListsDiffer) {
  const std::unique_ptr<Style> p1 = Node(1), p2 = Node(2);
  const std::unique_ptr<Style> holder = Node(0);
  holder->SetProperty(child, Any(static_cast<const Style*>(Node(3, p1.get()).get())));
  holder->SetProperty(items, List{nullptr, Node(4, p2.get()).get()});
  Style* sub = holder->GetSubstyle(child, false);
  Style* element = Items(*holder)[1];
  const Any& set = holder->GetProperty(child);
  const Any& array = holder->GetProperty(items);
  const List onlyP1{p1.get()}, onlyP2{p2.get()}, onlySub{sub}, onlyElement{element};

  // parentOnly: the single substyle reports its parent, the list its
  // substyles themselves, while the list's HasDependency asks about parents.
  EXPECT_EQ(Behaviour(child).GetDependencies(set, StyleSpan(onlyP1, true), true), onlyP1);
  EXPECT_TRUE(Behaviour(child).HasDependency(set, StyleSpan(onlyP1, true), true));
  EXPECT_TRUE(Behaviour(child).GetDependencies(set, StyleSpan(onlySub, true), true).empty());
  EXPECT_TRUE(Behaviour(items).GetDependencies(array, StyleSpan(onlyP2, false), true).empty());
  EXPECT_TRUE(Behaviour(items).HasDependency(array, StyleSpan(onlyP2, false), true));
  EXPECT_EQ(Behaviour(items).GetDependencies(array, StyleSpan(onlyElement, false), true),
            onlyElement);
  EXPECT_FALSE(Behaviour(items).HasDependency(array, StyleSpan(onlyElement, false), true));
  // Without parentOnly both look through the substyles.
  EXPECT_EQ(Behaviour(items).GetDependencies(array, StyleSpan(onlyP2, false), false), onlyP2);
  EXPECT_TRUE(Behaviour(child).HasDependency(set, StyleSpan(onlySub, false), false));
  EXPECT_TRUE(Behaviour(items).HasParentalDependency(array));

  // Deleting P2 bakes its values into the element that inherited them.
  p2->SetProperty(child, Any(static_cast<const Style*>(Node(9).get())));
  holder->RemoveDependency(StyleSpan(onlyP2, false), true);
  EXPECT_EQ(element->GetParent(), nullptr);
  EXPECT_EQ(Mark(element->GetSubstyle(child, false)), 9.0);
  EXPECT_EQ(element->GetSubstyle(child, false)->GetOwner(), element);
}

TEST_F(SubstylePropertyTest, MergeNeverReplacesAnOwnSubstyle) {
  const std::unique_ptr<Style> source = Node(0);
  source->SetPathProperty({child, mark}, Any(2.0));
  const std::unique_ptr<Style> target = Node(0);
  target->SetPathProperty({child, mark}, Any(1.0));
  Style* own = target->GetSubstyle(child, false);

  Behaviour(child).MergeProperty(target.get(), source.get(), child, false);
  EXPECT_EQ(Mark(own), 1.0);
  Behaviour(child).MergeProperty(target.get(), source.get(), child, true);
  EXPECT_EQ(target->GetSubstyle(child, false), own);
  EXPECT_EQ(Mark(own), 2.0);

  const std::unique_ptr<Style> empty = Node(0);
  Behaviour(child).MergeProperty(empty.get(), source.get(), child, false);
  EXPECT_EQ(empty->GetSubstyle(child, false)->GetOwner(), empty.get());

  // From a parent: a parentless own substyle takes over the parent's
  // substyle and that substyle's parent.
  const std::unique_ptr<Style> base = Node(5);
  source->GetSubstyle(child, false)->SetParent(base.get());
  target->GetSubstyle(child, false)->ClearProperty(mark);
  Behaviour(child).MergeParentProperty(target.get(), source.get(), child);
  EXPECT_EQ(own->GetParent(), base.get());
  EXPECT_EQ(Mark(own), 2.0);
}

TEST_F(SubstylePropertyTest, FlattenGivesOwnSubstylesCarryingInheritedValues) {
  const std::unique_ptr<Style> base = Node(8);
  const std::unique_ptr<Style> parent = Node(0);
  parent->SetPathProperty({child, mark}, Any(7.0));
  Style element(base.get(), node.Key()); // inherits its mark
  parent->SetProperty(items, List{&element});
  const std::unique_ptr<Style> holder = Node(0, parent.get());

  EXPECT_TRUE(Behaviour(child).FlattenProperty(holder.get(), child));
  const Style* sub = holder->GetSubstyle(child, false);
  EXPECT_TRUE(sub->DoesOverrideProperty(mark));
  EXPECT_EQ(Mark(sub), 7.0);
  EXPECT_EQ(sub->GetOwner(), holder.get());
  EXPECT_TRUE(Behaviour(items).FlattenProperty(holder.get(), items));
  const Style* flat = Items(*holder)[0];
  EXPECT_EQ(flat->GetParent(), nullptr);
  EXPECT_EQ(Mark(flat), 8.0);

  // Nothing to inherit: nothing stored.
  const std::unique_ptr<Style> alone = Node(0);
  EXPECT_FALSE(Behaviour(child).FlattenProperty(alone.get(), child));
  EXPECT_FALSE(Behaviour(items).FlattenProperty(alone.get(), items));
}

} // namespace
} // namespace Styles
