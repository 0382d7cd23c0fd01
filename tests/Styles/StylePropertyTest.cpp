#include <Styles/StyleProperty.h>

#include "HostBehaviours.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace Styles {
namespace {

using ZelUtils::Any;
using Text = ZelStringT<char16_t>;
using List = std::vector<Style*>;

// Clamps numbers to at most the default; counts its destruction.
struct ClampValidator final : PropertyValidator {
  explicit ClampValidator(int* destroyed) : destroyed(destroyed) {}
  ~ClampValidator() override { ++*destroyed; }
  bool Validate(Any& value, const Any& defaultValue) const override {
    value = std::min(value.Get<double>(), defaultValue.Get<double>());
    return true;
  }
  int* destroyed;
};

TEST(StylePropertyTest, ValidateAndOwnership) {
  int destroyed = 0;
  {
    StyleProperty property(Any(10.0), new ZelPref::NumberConversionPolicy(), testing::IsNumber);
    Any value(25.0);
    EXPECT_FALSE(property.Validate(value)); // no validator: refused
    property.SetValidator(new ClampValidator(&destroyed));
    EXPECT_TRUE(property.Validate(value));
    EXPECT_EQ(value.Get<double>(), 10.0);
    property.SetValidator(new ClampValidator(&destroyed)); // deletes the old one
    EXPECT_EQ(destroyed, 1);
  }
  EXPECT_EQ(destroyed, 2); // the policy is checked by LeakSanitizer
  EXPECT_FALSE(StyleProperty(Any(0.0), nullptr, nullptr).CheckType(Any(0.0)));
}

// Nodes carry a counted mark and hold a child node (one substyle) and a list
// of item nodes (an array of the holder's own category), beside a plain width.
class StylePropertyStyleTest : public ::testing::Test {
protected:
  StylePropertyStyleTest() {
    sheet.SetVersion(1);
    mark = node.Add(u"mark", new testing::CountingNumberProperty(0, &counts));
    child = node.Add(u"child", new StyleSetProperty(node.Key()));
    items = node.Add(u"items", new StyleArrayProperty(PropertyKey::Empty));
    node.Number(u"width", 5.0);
  }
  ~StylePropertyStyleTest() override { EXPECT_EQ(counts.Live(), 0); }

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
  const List& Items(const Style& style) const { return style.GetProperty(items).Get<List>(); }
  static JsonValue Parse(const char16_t* text) {
    JsonValue value;
    Text error;
    EXPECT_TRUE(Json::Parse(text, value, error));
    return value;
  }

  testing::ValueCounts counts;
  testing::ScopedCategory node{u"PropertyTest.Node"};
  PropertyKey mark, child, items;
  StyleSheet sheet;
};

// Merging takes the source's value wherever it comes from, and from a parent
// only a value found there; a source that resolves to the target's own value
// leaves it in place.
TEST_F(StylePropertyStyleTest, MergeProperty) {
  const PropertyKey width(u"width");
  Style grandparent(nullptr, node.Key()), source(&grandparent, node.Key());
  grandparent.SetProperty(width, Any(7.0));
  for (const bool overwrite : {false, true}) {
    Style target(nullptr, node.Key()), kept(nullptr, node.Key());
    kept.SetProperty(width, Any(1.0));
    Behaviour(width).MergeProperty(&target, &source, width, overwrite);
    Behaviour(width).MergeProperty(&kept, &source, width, overwrite);
    EXPECT_EQ(testing::Number(target.GetProperty(width)), 7.0);
    EXPECT_EQ(testing::Number(kept.GetProperty(width)), overwrite ? 7.0 : 1.0);
  }
  Style target(nullptr, node.Key()), withDefault(nullptr, node.Key());
  Behaviour(width).MergeParentProperty(&target, &withDefault, width);
  EXPECT_FALSE(target.DoesOverrideProperty(width));
  Behaviour(width).MergeParentProperty(&target, &grandparent, width);
  EXPECT_EQ(testing::Number(target.GetProperty(width)), 7.0);
  Behaviour(width).MergeProperty(&grandparent, &source, width, true);
  EXPECT_EQ(testing::Number(grandparent.GetProperty(width)), 7.0);
}

// Single substyles and lists compare by content; lists by length first; nulls
// order first.
TEST_F(StylePropertyStyleTest, ComparesSubstylesByContentAndListsByLengthFirst) {
  const std::unique_ptr<Style> one = Node(1), alsoOne = Node(1), two = Node(2);
  Style *const a = one.get(), *const b = alsoOne.get(), *const c = two.get(), *const none = nullptr;
  struct Case {
    List x, y;
    bool equal, less;
  };
  int row = 0;
  for (const Case& test :
       {Case{{none}, {none}, true, false}, Case{{none}, {a}, false, true},
        Case{{a}, {none}, false, false}, Case{{a}, {b}, true, false}, Case{{a}, {c}, false, true},
        Case{{c}, {a}, false, false}, Case{{}, {}, true, false}, Case{{c}, {a, a}, false, true},
        Case{{a, a}, {c}, false, false}, Case{{a, none}, {b, none}, true, false}}) {
    SCOPED_TRACE(row++);
    EXPECT_EQ(Behaviour(items).IsEqual(Any(test.x), Any(test.y)), test.equal);
    EXPECT_EQ(Behaviour(items).IsLess(Any(test.x), Any(test.y)), test.less);
    if (test.x.size() == 1 && test.y.size() == 1) {
      EXPECT_EQ(Behaviour(child).IsEqual(Any(test.x[0]), Any(test.y[0])), test.equal);
      EXPECT_EQ(Behaviour(child).IsLess(Any(test.x[0]), Any(test.y[0])), test.less);
    }
  }
  EXPECT_THROW(Behaviour(child).IsEqual(Any(1.0), Any(1.0)), std::bad_cast); // not a substyle
}

// Stored substyles are copies owned by the holder; single ones name it as
// owner, list elements do not.
TEST_F(StylePropertyStyleTest, StoresCopiesOwnedByTheHolder) {
  const std::unique_ptr<Style> source = Node(1), holder = Node(0);
  source->SetPathProperty({child, mark}, Any(2.0));
  holder->SetProperty(child, Any(static_cast<const Style*>(source.get())));
  holder->SetProperty(items, List{source.get(), nullptr, source.get()});
  EXPECT_EQ(counts.Live(), 2 + 1 + 2 + 2 * 2); // source, holder, copied child, two copied items
  const List& list = Items(*holder);
  ASSERT_EQ(list.size(), 3u);
  EXPECT_EQ(list[1], nullptr);
  EXPECT_EQ(testing::CheckOwnerLinks(*holder), 6);

  // Null elements are passed to style visitors but skipped by value visitors.
  int styles = 0, values = 0;
  EXPECT_TRUE(Behaviour(items).ProcessStylesInProperty(holder->GetProperty(items),
                                                       [&](Style*) { return ++styles > 0; }));
  EXPECT_EQ(styles, 3);
  Any value = holder->GetProperty(items);
  EXPECT_TRUE(Behaviour(items).ProcessProperty(
      value, [&](Any&, Style*, const PropertyKey&) { return ++values > 0; }, holder.get(), items));
  EXPECT_EQ(values, 2 * 2);
}

TEST_F(StylePropertyStyleTest, SubstyleJsonFormsAndDamagedInput) {
  const std::unique_ptr<Style> holder = Node(0), element = Node(4);
  JsonValue out(u"untouched");
  EXPECT_TRUE(
      Behaviour(child).Serialize(sheet, holder.get(), Any(static_cast<Style*>(nullptr)), out));
  EXPECT_TRUE(out.IsNull());
  EXPECT_TRUE(
      Behaviour(items).Serialize(sheet, holder.get(), Any(List{nullptr, element.get()}), out));
  EXPECT_EQ(Json::ValueToString(out, false), Text(u"[{\"mark\":\"4\"}]"));

  // A substyle member must be an object; a repeated one keeps the first.
  for (const char16_t* text : {u"null", u"3", u"[{}]", u"{}"})
    EXPECT_EQ(Behaviour(child).Deserialize(sheet, holder.get(), Parse(text)), text[0] == u'{');
  EXPECT_TRUE(Behaviour(child).Deserialize(sheet, holder.get(), Parse(u"{\"mark\":\"6\"}")));
  EXPECT_FALSE(holder->GetSubstyle(child, false)->DoesOverrideProperty(mark));
  EXPECT_EQ(holder->GetSubstyle(child, false)->GetOwner(), holder.get());

  // Array members other than objects are dropped; the read substyles are
  // stored as copies and freed.
  EXPECT_FALSE(Behaviour(items).Deserialize(sheet, holder.get(), Parse(u"{}")));
  EXPECT_TRUE(Behaviour(items).Deserialize(
      sheet, holder.get(), Parse(u"[1, \"x\", null, {\"mark\":\"7\"}, [], {}, true]")));
  ASSERT_EQ(Items(*holder).size(), 2u);
  EXPECT_EQ(Mark(Items(*holder)[0]), 7.0);
  EXPECT_EQ(Items(*holder)[1]->GetCategoryName(), node.Key());
  // Reading again frees the old list.
  EXPECT_TRUE(Behaviour(items).Deserialize(sheet, holder.get(), Parse(u"[]")));
  EXPECT_TRUE(Items(*holder).empty());
}

// With parentOnly the single substyle reports its parent and the list its
// substyles themselves, while the list's HasDependency asks about parents.
// Deleting a parent bakes its values into the element that inherited them.
TEST_F(StylePropertyStyleTest, DependenciesOfSubstylesAndOfListsDiffer) {
  const std::unique_ptr<Style> p1 = Node(1), p2 = Node(2), holder = Node(0);
  holder->SetProperty(child, Any(static_cast<const Style*>(Node(3, p1.get()).get())));
  holder->SetProperty(items, List{nullptr, Node(4, p2.get()).get()});
  Style* sub = holder->GetSubstyle(child, false);
  Style* element = Items(*holder)[1];
  const Any &set = holder->GetProperty(child), &array = holder->GetProperty(items);
  const List onlyP1{p1.get()}, onlyP2{p2.get()}, onlySub{sub}, onlyElement{element};
  EXPECT_EQ(Behaviour(child).GetDependencies(set, StyleSpan(onlyP1, true), true), onlyP1);
  EXPECT_TRUE(Behaviour(child).GetDependencies(set, StyleSpan(onlySub, true), true).empty());
  EXPECT_TRUE(Behaviour(items).GetDependencies(array, StyleSpan(onlyP2, false), true).empty());
  EXPECT_TRUE(Behaviour(items).HasDependency(array, StyleSpan(onlyP2, false), true));
  EXPECT_EQ(Behaviour(items).GetDependencies(array, StyleSpan(onlyElement, false), true),
            onlyElement);
  EXPECT_FALSE(Behaviour(items).HasDependency(array, StyleSpan(onlyElement, false), true));
  EXPECT_EQ(Behaviour(items).GetDependencies(array, StyleSpan(onlyP2, false), false), onlyP2);

  p2->SetProperty(child, Any(static_cast<const Style*>(Node(9).get())));
  holder->RemoveDependency(StyleSpan(onlyP2, false), true);
  EXPECT_EQ(element->GetParent(), nullptr);
  EXPECT_EQ(Mark(element->GetSubstyle(child, false)), 9.0);
  EXPECT_EQ(element->GetSubstyle(child, false)->GetOwner(), element);
}

// Merging never replaces an own substyle but merges into it; from a parent,
// a parentless own substyle takes over the parent's substyle's parent.
// Flattening gives own substyles carrying the inherited values.
TEST_F(StylePropertyStyleTest, MergeAndFlattenKeepOwnSubstyles) {
  const std::unique_ptr<Style> source = Node(0), target = Node(0), base = Node(5);
  source->SetPathProperty({child, mark}, Any(2.0));
  target->SetPathProperty({child, mark}, Any(1.0));
  Style* own = target->GetSubstyle(child, false);
  Behaviour(child).MergeProperty(target.get(), source.get(), child, false);
  EXPECT_EQ(Mark(own), 1.0);
  Behaviour(child).MergeProperty(target.get(), source.get(), child, true);
  EXPECT_EQ(target->GetSubstyle(child, false), own);
  EXPECT_EQ(Mark(own), 2.0);
  source->GetSubstyle(child, false)->SetParent(base.get());
  own->ClearProperty(mark);
  Behaviour(child).MergeParentProperty(target.get(), source.get(), child);
  EXPECT_EQ(own->GetParent(), base.get());
  EXPECT_EQ(Mark(own), 2.0);

  Style element(base.get(), node.Key()); // inherits its mark
  source->SetProperty(items, List{&element});
  const std::unique_ptr<Style> holder = Node(0, source.get());
  EXPECT_TRUE(Behaviour(child).FlattenProperty(holder.get(), child));
  EXPECT_TRUE(holder->GetSubstyle(child, false)->DoesOverrideProperty(mark));
  EXPECT_EQ(Mark(holder->GetSubstyle(child, false)), 2.0);
  EXPECT_EQ(holder->GetSubstyle(child, false)->GetOwner(), holder.get());
  EXPECT_TRUE(Behaviour(items).FlattenProperty(holder.get(), items));
  EXPECT_EQ(Items(*holder)[0]->GetParent(), nullptr);
  EXPECT_EQ(Mark(Items(*holder)[0]), 5.0);
  EXPECT_FALSE(Behaviour(child).FlattenProperty(base.get(), child)); // nothing to inherit
}

} // namespace
} // namespace Styles
