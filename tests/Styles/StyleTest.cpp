#include <Styles/Style.h>

#include "HostBehaviours.h"

#include <Styles/StyleUtilities.h>

#include <Json/Json.h>

#include <gtest/gtest.h>

#include <exception>
#include <functional>
#include <memory>
#include <typeinfo>
#include <vector>

namespace Styles {
namespace {

using testing::CheckOwnerLinks;
using testing::Number;
using testing::ScopedCategory;
using ZelUtils::Any;

// A paragraph category with plain numbers and a substyle "border" of a
// border category that itself holds a substyle "corner".
class StyleTest : public ::testing::Test {
protected:
  StyleTest() : corner(u"StyleTest.Corner"), border(u"StyleTest.Border"), para(u"StyleTest.Para") {
    radius = corner.Number(u"radius", 1.0);
    width = border.Number(u"width", 0.5);
    cornerKey = border.Add(u"corner", new StyleSetProperty(corner.Key()));
    size = para.Number(u"size", 10.0);
    indent = para.Number(u"indent", 0.0);
    borderKey = para.Add(u"border", new StyleSetProperty(border.Key()));
  }

  Style* Make(Style* parent = nullptr, const PropertyKey& category = PropertyKey::Empty) {
    owned.emplace_back(new Style(parent, category == PropertyKey::Empty ? para.Key() : category));
    return owned.back().get();
  }
  Style* Para(Style* parent = nullptr) { return Make(parent); }

  ScopedCategory corner, border, para;
  PropertyKey radius, width, cornerKey, size, indent, borderKey;
  const PropertyKey unregistered{u"StyleTest.unregistered"};
  std::vector<std::unique_ptr<Style>> owned;
};

TEST_F(StyleTest, LookupFallsBackThroughParentsToTheDefaultObject) {
  // A category unknown at construction leaves none; on rebinding, the old one.
  const PropertyKey unknown(u"StyleTest.NoSuchCategory");
  EXPECT_EQ(Style(nullptr, unknown).GetCategory(), nullptr);
  Style* base = Para();
  base->SetCategory(unknown);
  EXPECT_EQ(base->GetCategoryName(), para.Key());

  Style* middle = Para(base);
  Style* leaf = Para(middle);
  base->SetProperty(size, Any(12.0));
  middle->SetProperty(size, Any(14.0));
  EXPECT_EQ(&leaf->GetProperty(size), &middle->GetProperties().Find(size)[0]);
  // Nobody sets indent: the category's default object itself comes back.
  EXPECT_EQ(&leaf->GetProperty(indent), &GetStyleManager().GetDefaultValue(para.Key(), indent));
  Any out(u"untouched");
  EXPECT_FALSE(leaf->GetProperty(indent, out));
  EXPECT_FALSE(leaf->GetInheritedProperty(indent, out));
  EXPECT_EQ(out, Any(u"untouched"));

  // Own values are not part of the inherited lookup.
  leaf->SetProperty(size, Any(20.0));
  EXPECT_EQ(Number(leaf->GetInheritedProperty(size)), 14.0);
  EXPECT_FALSE(leaf->GetOverrideProperty(indent, out));
  EXPECT_TRUE(leaf->GetOverrideProperty(size, out));
  EXPECT_EQ(Number(out), 20.0);
}

TEST_F(StyleTest, UnregisteredKeysAreNeverStoredAndThrowFromOneLookup) {
  Style* style = Para();
  EXPECT_THROW(style->GetProperty(unregistered), std::exception);
  Any out;
  EXPECT_FALSE(style->GetProperty(unregistered, out));
  EXPECT_THROW(style->GetInheritedProperty(unregistered, out), std::exception);
  style->SetProperty(unregistered, Any(1.0));
  style->SetProperty(unregistered, 2.0);
  EXPECT_TRUE(style->GetProperties().empty());
  Style free; // no category
  free.SetProperty(size, 3.0);
  EXPECT_TRUE(free.GetProperties().empty());
}

TEST_F(StyleTest, SettingClearingAndSelfAssignmentDestroyOldValuesOnce) {
  testing::ValueCounts counts;
  int& destroyed = counts.destroyed;
  ScopedCategory counting(u"StyleTest.Counting");
  const PropertyKey count = counting.Add(u"count", new testing::CountingNumberProperty(0, &counts));
  Style style(nullptr, counting.Key());

  style.SetProperty(count, Any(1.0));
  style.SetProperty(count, Any(2.0)); // replaces: the old value is destroyed
  EXPECT_EQ(destroyed, 1);
  const Any empty;
  style.SetProperty(count, empty); // copying form: destroys, then clears
  EXPECT_EQ(destroyed, 2);
  EXPECT_FALSE(style.DoesOverrideProperty(count));

  style.SetProperty(count, Any(3.0));
  style.SetProperty(count, Any()); // moving form: removes without destroying
  EXPECT_EQ(destroyed, 2);
  EXPECT_FALSE(style.DoesOverrideProperty(count));

  style.SetProperty(count, Any(4.0));
  EXPECT_TRUE(style.ClearProperty(count));
  EXPECT_FALSE(style.ClearProperty(count));
  EXPECT_EQ(destroyed, 3);

  // Self-assignment changes and destroys nothing.
  style.SetProperty(count, Any(7.0));
  Style& alias = style;
  style = alias;
  style = std::move(alias);
  EXPECT_EQ(destroyed, 3);
  EXPECT_EQ(Number(style.GetProperty(count)), 7.0);
}

// A copy keeps the parent but is nobody's substyle; a moved-from style keeps
// its links; swapping data leaves each style under its own owner.
TEST_F(StyleTest, CopyMoveAndSwapKeepOwnersWhereTheyBelong) {
  Style* base = Para();
  Style* style = Para(base);
  style->SetExternalID(u"ext");
  style->SetPathProperty({borderKey, width}, Any(2.0));
  Style* substyle = style->GetSubstyle(borderKey, false);

  const Style copy(*style);
  EXPECT_EQ(copy.GetParent(), base);
  EXPECT_EQ(copy, *style);
  EXPECT_EQ(Style(*substyle).GetOwner(), nullptr);

  Style moved(std::move(*style));
  EXPECT_TRUE(style->GetProperties().empty());
  EXPECT_EQ(style->GetParent(), base);
  EXPECT_EQ(style->GetCategoryName(), para.Key());
  EXPECT_EQ(style->GetExternalID(), ZelStringT<char16_t>(u"ext"));
  EXPECT_EQ(moved.GetSubstyle(borderKey, false), substyle);

  Style other(nullptr, border.Key());
  other.SetPathProperty({cornerKey, radius}, Any(4.0));
  Style* otherCorner = other.GetSubstyle(cornerKey, false);
  substyle->SwapData(other);
  EXPECT_EQ(substyle->GetOwner(), &moved);
  EXPECT_EQ(other.GetOwner(), nullptr);
  EXPECT_EQ(otherCorner->GetOwner(), substyle);
  EXPECT_EQ(Number(other.GetProperty(width)), 2.0);
}

TEST_F(StyleTest, EqualityAndOrderOnKeysWithoutBehaviour) {
  ScopedCategory* temporary = new ScopedCategory(u"StyleTest.Temporary");
  const PropertyKey value = temporary->Number(u"value");
  Style a(nullptr, temporary->Key());
  Style b(nullptr, temporary->Key());
  a.SetProperty(value, Any(1.0));
  b.SetProperty(value, Any(2.0));
  EXPECT_TRUE(a < b);
  EXPECT_FALSE(b < a);
  b.SetProperty(value, Any(1.0));

  // Owners are not compared; external strings are.
  b.SetOwner(&a, value);
  EXPECT_TRUE(a == b);
  b.SetExternalName(u"x");
  EXPECT_TRUE(a < b);
  b.SetExternalName(u"");

  // Deregistering deletes the behaviours while the styles still hold values:
  // unequal, yet neither is less.
  delete temporary;
  EXPECT_TRUE(a != b);
  EXPECT_FALSE(a < b);
  EXPECT_FALSE(b < a);
}

// A new category keeps plain values under keys it does not register, with their
// defined behaviour, and frees only the substyles nobody could destroy later.
TEST_F(StyleTest, ChangingCategoryKeepsPlainValuesAndFreesOrphanedSubstyles) {
  ScopedCategory other(u"StyleTest.Other");
  const PropertyKey plainBorder = other.Number(u"border");
  Style s(nullptr, para.Key());
  s.SetProperty(size, Any(12.0));
  s.SetProperty(indent, Any(3.0));
  s.SetPathProperty({borderKey, width}, Any(2.0));
  s.SetCategory(other.Key());
  EXPECT_EQ(s.GetProperties().Find(borderKey), nullptr); // freed: LeakSanitizer checks
  ASSERT_NE(s.GetProperties().Find(size), nullptr);

  Style u(nullptr, para.Key());
  u.SetProperty(size, Any(13.0));
  u.SetProperty(indent, Any(3.0));
  u.SetCategory(other.Key());
  EXPECT_TRUE(s != u);
  EXPECT_FALSE(s < u || u < s);
  EXPECT_FALSE(s.IsEmptyWithEmptySubstyles());
  s.SetProperty(size, Any(1.0)); // moving: no behaviour, the value stays
  EXPECT_EQ(Number(s.GetProperties().Find(size)[0]), 12.0);
  const Any one(1.0);
  s.SetProperty(indent, one); // copying: the value goes
  EXPECT_EQ(s.GetProperties().Find(indent), nullptr);
  EXPECT_TRUE(s.RevertAllProperties());
  EXPECT_TRUE(s.IsEmptyWithEmptySubstyles());

  // A plain value now under a substyle behaviour stays and is destroyed quietly.
  Style t(nullptr, other.Key());
  t.SetProperty(plainBorder, Any(4.0));
  t.SetCategory(para.Key());
  EXPECT_EQ(Number(t.GetProperties().Find(plainBorder)[0]), 4.0);
}

// P holds border{width=2, corner{radius=5}}; A inherits from P and holds its
// own border and corner, neither setting anything.
TEST_F(StyleTest, OwnerBasedInheritance) {
  Style* p = Para();
  p->SetPathProperty({borderKey, width}, Any(2.0));
  p->SetPathProperty({borderKey, cornerKey, radius}, Any(5.0));
  Style* a = Para(p);
  a->SetPathProperty({borderKey, cornerKey, radius}, Any()); // creates both substyles
  Style* aBorder = a->GetSubstyle(borderKey, false);
  Style* aCorner = aBorder->GetSubstyle(cornerKey, false);
  EXPECT_EQ(Number(aBorder->GetProperty(width)), 2.0);
  EXPECT_EQ(Number(aCorner->GetProperty(radius)), 5.0);

  // Then from that substyle's own parents.
  Style* cornerBase = Make(nullptr, corner.Key());
  cornerBase->SetProperty(radius, Any(9.0));
  Style* pCorner = p->GetSubstyle(borderKey, false)->GetSubstyle(cornerKey, false);
  pCorner->ClearProperty(radius);
  pCorner->SetParent(cornerBase);
  EXPECT_EQ(Number(aCorner->GetProperty(radius)), 9.0);

  // A plain value where the owner's parent should hold a substyle.
  aBorder->SetOwner(a, size); // pretend the border hangs under "size"
  p->SetProperty(size, Any(3.0));
  EXPECT_THROW(aCorner->GetProperty(radius), std::bad_cast);
  aBorder->SetOwner(a, borderKey);

  // Without a parent anywhere above, the default.
  a->SetParent(nullptr);
  EXPECT_EQ(&aCorner->GetProperty(radius),
            &GetStyleManager().GetDefaultValue(corner.Key(), radius));

  // Deeper than the two owner keys kept without allocating.
  ScopedCategory outer(u"StyleTest.Outer");
  const PropertyKey paraKey = outer.Add(u"para", new StyleSetProperty(para.Key()));
  Style q(nullptr, outer.Key());
  q.SetPathProperty({paraKey, borderKey, cornerKey, radius}, Any(6.0));
  Style b(&q, outer.Key());
  b.SetPathProperty({paraKey, borderKey, cornerKey, radius}, Any());
  EXPECT_EQ(Number(b.GetPathProperty({paraKey, borderKey, cornerKey, radius})), 6.0);
}

TEST_F(StyleTest, SubstyleAccessorsAndPathLookups) {
  Style* style = Para();
  EXPECT_EQ(style->GetSubstyle(borderKey, true), nullptr); // the null default
  style->SetProperty(size, Any(1.0));
  EXPECT_EQ(style->GetSubstyle(size, false), nullptr);
  EXPECT_THROW(style->GetSubstyle(size, true), std::bad_cast);
  Style* created = style->GetSubstyleAndCreateIfMissing(borderKey, border.Key());
  EXPECT_EQ(created->GetCategoryName(), border.Key());
  EXPECT_EQ(GetOrCreateSubstyle(*style, borderKey), created);
  EXPECT_EQ(GetOrCreateSubstyle(*style, unregistered), nullptr);
  style->ClearProperty(borderKey);

  // Leaving the substyles, a path ends at the element categories' defaults.
  EXPECT_THROW(style->GetPathProperty({}), std::exception);
  EXPECT_EQ(&style->GetPathProperty({borderKey, cornerKey, radius}),
            &GetStyleManager().GetDefaultValue(corner.Key(), radius));
  // Failing one level down still walks from the root's category, which does
  // not know "corner" and so never reaches the corner category.
  style->SetPathProperty({borderKey, width}, Any(1.0));
  EXPECT_THROW(style->GetPathProperty({borderKey, cornerKey, radius}), std::exception);
  EXPECT_THROW(style->GetPathProperty({borderKey, unregistered}), std::exception);
}

TEST_F(StyleTest, ClearAndRevertAlongPaths) {
  Style* style = Para();
  style->SetPathProperty({borderKey, width}, Any(2.0));
  EXPECT_FALSE(style->ClearPathProperty({}));
  EXPECT_FALSE(style->ClearPathProperty({cornerKey, radius}));

  // A top-level style without parent has nothing to inherit: only forced.
  EXPECT_FALSE(style->RevertPathProperty({borderKey, width}, false));
  EXPECT_TRUE(style->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));
  EXPECT_TRUE(style->RevertPathProperty({borderKey, width}, true));
  EXPECT_FALSE(style->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));

  // A substyle with a parent along the path makes reverting useful.
  style->SetPathProperty({borderKey, width}, Any(2.0));
  style->GetSubstyle(borderKey, false)->SetParent(Make(nullptr, border.Key()));
  EXPECT_TRUE(style->RevertPathProperty({borderKey, width}, false));
  Style* child = Para(style);
  child->SetProperty(size, Any(3.0));
  EXPECT_TRUE(child->RevertPathProperty({size}, false));
}

TEST_F(StyleTest, ClearPropertiesAndCopyProperties) {
  Style* base = Para();
  base->SetProperty(size, Any(12.0));
  Style* style = Para(base);
  Style* keys = Para();
  keys->SetProperty(indent, Any(99.0));
  for (const Style* keysOf : {static_cast<const Style*>(keys), static_cast<const Style*>(style)}) {
    style->SetProperty(indent, Any(1.0));
    style->ClearProperties(keysOf);
    EXPECT_TRUE(style->GetProperties().empty());
  }

  std::unique_ptr<Style> copy(style->CopyProperties({size, indent, unregistered}));
  EXPECT_EQ(copy->GetParent(), nullptr);
  ASSERT_EQ(copy->GetProperties().size(), 2u);
  EXPECT_EQ(Number(copy->GetProperty(size)), 12.0); // inherited, now own
  EXPECT_NE(&copy->GetProperty(indent), &GetStyleManager().GetDefaultValue(para.Key(), indent));
}

TEST_F(StyleTest, SetPathPropertyFromSourceCopiesOnlyOwnValues) {
  Style* source = Para();
  source->SetPathProperty({borderKey, width}, Any(4.0));
  Style* destination = Para();
  destination->SetPathProperty({borderKey, cornerKey, radius}, Any(2.0));
  destination->SetProperty(size, Any(5.0));

  destination->SetProperties({{borderKey, width}, {size}}, source);
  EXPECT_EQ(Number(destination->GetPathProperty({borderKey, width})), 4.0);
  EXPECT_FALSE(destination->DoesOverrideProperty(size)); // the source only inherits it

  // The source lacks the corner substyle: the key after it is cleared in the
  // destination's corner.
  destination->SetPathProperty({borderKey, cornerKey, radius}, source);
  EXPECT_FALSE(destination->GetSubstyle(borderKey, false)
                   ->GetSubstyle(cornerKey, false)
                   ->DoesOverrideProperty(radius));
}

TEST_F(StyleTest, ExternalIdReachesDirectSubstylesOfOrdinaryStylesOnly) {
  ScopedCategory ordinary(u"style");
  const PropertyKey paraKey = ordinary.Add(u"StyleTest.para", new StyleSetProperty(para.Key()));
  Style style(nullptr, StyleCategoryName);
  style.SetPathProperty({paraKey, borderKey, width}, Any(1.0));
  style.SetExternalID(u"E1");
  style.SetExternalName(u"N1");
  Style* paraSub = style.GetSubstyle(paraKey, false);
  EXPECT_EQ(paraSub->GetExternalID(), ZelStringT<char16_t>(u"E1"));
  EXPECT_EQ(paraSub->GetExternalName(), ZelStringT<char16_t>(u"N1"));
  EXPECT_TRUE(paraSub->GetSubstyle(borderKey, false)->GetExternalID().IsEmpty());

  Style* other = Para();
  other->SetPathProperty({borderKey, width}, Any(1.0));
  other->SetExternalID(u"E2");
  EXPECT_TRUE(other->GetSubstyle(borderKey, false)->GetExternalID().IsEmpty());
}

// A <- B <- C, each setting its own size; A also sets indent.
class StyleChainTest : public StyleTest {
protected:
  StyleChainTest() : a(Para()), b(Para(a)), c(Para(b)) {
    a->SetProperty(size, Any(1.0));
    a->SetProperty(indent, Any(7.0));
    b->SetProperty(size, Any(2.0));
  }
  static StyleSpan Span(const std::vector<Style*>& styles, bool sorted = false) {
    return StyleSpan(styles, sorted);
  }
  Style *a, *b, *c;
};

TEST_F(StyleChainTest, DependencyQueries) {
  const std::vector<Style*> onlyA{a}, onlyC{c}, none;
  EXPECT_FALSE(c->HasDependency(Span(onlyA), true));
  EXPECT_TRUE(c->HasDependency(Span(onlyA), false));
  EXPECT_TRUE(c->HasDependency(Span(onlyC), true)); // itself
  EXPECT_TRUE(c->GetDependencies(Span(none), false).empty());

  std::vector<Style*> sorted{a, b};
  std::sort(sorted.begin(), sorted.end(), std::less<>());
  const std::vector<Style*> reversed(sorted.rbegin(), sorted.rend());
  EXPECT_EQ(c->GetDependencies(Span(reversed), false), sorted);
  EXPECT_EQ(c->GetDependencies(Span(sorted, true), false), sorted);
  EXPECT_EQ(c->GetDependencies(Span(reversed), true), std::vector<Style*>{b});

  EXPECT_TRUE(c->HasParentalDependency(Span(onlyA)));
  EXPECT_FALSE(c->HasParentalDependency(Span(onlyC)));
  EXPECT_TRUE(c->HasParentalDependency());
  EXPECT_FALSE(a->HasParentalDependency());
}

// Whatever goes, C keeps its effective values: the parent link skips the
// removed styles and what they gave becomes C's own.
TEST_F(StyleChainTest, RemovingDependenciesKeepsEffectiveValues) {
  std::vector<Style*> manyWithB(20, Para()); // long, unsorted, foreign to the chain
  manyWithB[7] = b;
  const std::vector<Style*> onlyA{a}, onlyB{b};
  struct Case {
    const char* label;
    std::function<void()> remove;
    Style* parent;
    std::size_t own;
  };
  for (const Case& row : {
           Case{"A is not C's parent", [&] { c->RemoveDependency(Span(onlyA), true); }, b, 0},
           Case{"the parent", [&] { c->RemoveDependency(Span(onlyB), true); }, a, 1},
           Case{"among many", [&] { c->RemoveDependency(Span(manyWithB), false); }, a, 1},
           Case{"an ancestor folds the chain", [&] { c->RemoveDependency(Span(onlyA), false); },
                nullptr, 2},
           Case{"all", [&] { c->RemoveAllDependencies(); }, nullptr, 2},
       }) {
    SCOPED_TRACE(row.label);
    c->SetParent(b);
    c->ClearAllProperties();
    row.remove();
    EXPECT_EQ(c->GetParent(), row.parent);
    EXPECT_EQ(c->GetProperties().size(), row.own);
    EXPECT_EQ(Number(c->GetProperty(size)), 2.0); // the nearest value wins
    EXPECT_EQ(Number(c->GetProperty(indent)), 7.0);
  }

  // A mapping to null is ignored.
  c->SetParent(b);
  c->RemapDependency({{b, nullptr}});
  EXPECT_EQ(c->GetParent(), b);
  c->RemapDependency({{b, a}, {a, nullptr}});
  EXPECT_EQ(c->GetParent(), a);
}

TEST_F(StyleChainTest, ProcessPropertiesStopsAtFalse) {
  int calls = 0;
  EXPECT_FALSE(a->ProcessProperties([&](Any&, Style*, const PropertyKey&) { return ++calls > 5; }));
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(a->ProcessProperties([&](Any& value, Style* holder, const PropertyKey&) {
    EXPECT_EQ(holder, a);
    value = Any(Number(value) * 10);
    return true;
  }));
  EXPECT_EQ(Number(a->GetProperty(size)), 10.0);

  // Along paths, only those that reach own values.
  a->SetPathProperty({borderKey, width}, Any(3.0));
  calls = 0;
  EXPECT_TRUE(a->ProcessProperties({{}, {borderKey, width}, {cornerKey, radius}, {indent}},
                                   [&](Any&, Style*, const PropertyKey&) { return ++calls > 0; }));
  EXPECT_EQ(calls, 2);
}

TEST_F(StyleChainTest, MergeRespectsOverwrite) {
  Style* target = Para();
  target->SetProperty(size, Any(50.0));
  target->MergeProperties(b, false);
  EXPECT_EQ(Number(target->GetProperty(size)), 50.0);
  target->MergeProperties(b, true);
  EXPECT_EQ(Number(target->GetProperty(size)), 2.0);
  // From a parent: only its own values, without linking to it.
  Style* fresh = Para();
  fresh->MergeParentProperties(b);
  EXPECT_EQ(Number(fresh->GetProperty(size)), 2.0);
  EXPECT_FALSE(fresh->DoesOverrideProperty(indent));
  EXPECT_EQ(fresh->GetParent(), nullptr);
}

TEST_F(StyleChainTest, FlattenBakesInheritedValuesAndCutsTheParent) {
  std::set<PropertyKey> flattened{radius}; // accumulates: not cleared
  EXPECT_TRUE(c->Flatten(flattened));
  EXPECT_EQ(c->GetParent(), nullptr);
  EXPECT_EQ(Number(c->GetProperty(size)), 2.0);
  EXPECT_TRUE(c->DoesOverrideProperty(indent));
  EXPECT_EQ(flattened, (std::set<PropertyKey>{size, indent, radius}));

  ScopedCategory bare(u"StyleTest.Bare");
  Style parent(nullptr, bare.Key());
  Style child(&parent, bare.Key());
  EXPECT_FALSE(child.Flatten());
  EXPECT_EQ(child.GetParent(), nullptr);
}

TEST_F(StyleChainTest, OwnerFreeCopiesOfSubstyles) {
  a->SetPathProperty({borderKey, width}, Any(4.0));
  Style* holder = Para(a);
  holder->SetPathProperty({borderKey, cornerKey, radius}, Any(2.0));
  const Style* substyle = holder->GetSubstyle(borderKey, false);
  EXPECT_TRUE(substyle->StylePropertiesHasDependencyOnOwner());
  EXPECT_FALSE(a->GetSubstyle(borderKey, false)->StylePropertiesHasDependencyOnOwner());

  std::unique_ptr<Style> flat(substyle->CreateFlattenedStyle());
  EXPECT_EQ(flat->GetOwner(), nullptr);
  EXPECT_EQ(Number(flat->GetProperty(width)), 4.0);
  std::unique_ptr<Style> clone(holder->CreateSubStyleCloneWithNoDependencyOnOwner(borderKey));
  EXPECT_EQ(Number(clone->GetProperty(width)), 4.0);
  EXPECT_EQ(Number(clone->GetPathProperty({cornerKey, radius})), 2.0);
  // Nothing under the key anywhere: an empty style of the element category.
  std::unique_ptr<Style> empty(Para()->CreateSubStyleCloneWithNoDependencyOnOwner(borderKey));
  EXPECT_TRUE(empty->GetProperties().empty());
  EXPECT_EQ(empty->GetCategoryName(), border.Key());

  // Copied to a style of the same parent, the substyle keeps inheriting from
  // A; to a stranger, it must carry A's values itself.
  Style* sibling = Para(a);
  sibling->CopySubstyleProperties(holder, borderKey);
  EXPECT_FALSE(sibling->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));
  Style* stranger = Para();
  stranger->CopySubstyleProperties(holder, borderKey);
  const Style* carried = stranger->GetSubstyle(borderKey, false);
  EXPECT_TRUE(carried->DoesOverrideProperty(width));
  EXPECT_EQ(Number(carried->GetProperty(width)), 4.0);
  // A source resolving to the null default clears the key.
  stranger->CopySubstyleProperties(Para(), borderKey);
  EXPECT_EQ(stranger->GetSubstyle(borderKey, false), nullptr);
}

// Nodes carry a counted mark, a child node, a list of item nodes and a
// substyle keyed by their own category's name, as RegisterSubstyleSet makes.
class StyleTreeTest : public ::testing::Test {
protected:
  using List = std::vector<Style*>;

  StyleTreeTest() : node(u"StyleTest.Node", u"Node") {
    mark = node.Add(u"mark", new testing::CountingNumberProperty(0, &counts));
    child = node.Add(u"child", new StyleSetProperty(node.Key()));
    items = node.Add(u"items", new StyleArrayProperty(PropertyKey::Empty));
    RegisterSubstyleSet(node.Key(), node.Key());
  }
  ~StyleTreeTest() override { EXPECT_EQ(counts.Live(), 0); }

  // Ten marked nodes: the root, a chain of children five deep under it, and
  // two items that own a child each.
  std::unique_ptr<Style> Tree(Style* parent = nullptr) {
    auto root = std::make_unique<Style>(parent, node.Key());
    PropertyPath path;
    for (int depth = 0; depth <= 5; ++depth, path.push_back(child))
      root->SetPathProperty(MakePath(path, mark), Any(double(depth)));
    Style item(nullptr, node.Key());
    item.SetPathProperty({child, mark}, Any(9.0));
    item.SetProperty(mark, Any(8.0));
    root->SetProperty(items, List{&item, &item});
    return root;
  }
  Style* Deep(const Style& root, int depth) const {
    const Style* style = &root;
    while (style && depth-- > 0)
      style = style->GetSubstyle(child, false);
    return const_cast<Style*>(style);
  }
  testing::ValueCounts counts;
  ScopedCategory node;
  PropertyKey mark, child, items;
};

TEST_F(StyleTreeTest, OwnerLinksSurviveEveryOperationThatMovesSubstyles) {
  const std::unique_ptr<Style> base = Tree();
  const std::unique_ptr<Style> tree = Tree(base.get());
  StyleSheet sheet;
  sheet.SetVersion(1);
  struct Case {
    const char* label;
    std::function<std::unique_ptr<Style>()> make;
  };
  const Case cases[] = {
      {"copy", [&] { return std::make_unique<Style>(*tree); }},
      {"move",
       [&] {
         Style scratch(*tree);
         return std::make_unique<Style>(std::move(scratch));
       }},
      {"swap",
       [&] {
         Style scratch(*tree);
         auto style = std::make_unique<Style>();
         style->SwapData(scratch);
         return style;
       }},
      {"merge into nothing",
       [&] {
         auto style = std::make_unique<Style>(nullptr, node.Key());
         style->MergeProperties(tree.get(), false);
         return style;
       }},
      {"merge into own substyles",
       [&] {
         std::unique_ptr<Style> style = Tree();
         style->MergeProperties(tree.get(), true);
         return style;
       }},
      {"merge parent",
       [&] {
         auto style = std::make_unique<Style>(tree.get(), node.Key());
         style->MergeParentProperties(tree.get());
         return style;
       }},
      {"flatten",
       [&] {
         auto style = std::make_unique<Style>(*tree);
         style->Flatten();
         return style;
       }},
      {"flattened clone", [&] { return std::unique_ptr<Style>(tree->CreateFlattenedStyle()); }},
      {"remove all dependencies",
       [&] {
         auto style = std::make_unique<Style>(*tree);
         style->RemoveAllDependencies();
         return style;
       }},
      {"JSON round trip",
       [&] {
         JsonValue json;
         tree->Serialize(sheet, json, false);
         return std::unique_ptr<Style>(
             Style::Deserialize(sheet, json.Get<Json::Object>(), node.Key()));
       }},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.label);
    const int live = counts.Live();
    std::unique_ptr<Style> result = c.make();
    EXPECT_EQ(CheckOwnerLinks(*result), 9);
    EXPECT_EQ(Number(Deep(*result, 5)->GetProperty(mark)), 5.0);
    EXPECT_EQ(counts.Live(), live + 10);
    result.reset();
    EXPECT_EQ(counts.Live(), live);
  }
  EXPECT_EQ(CheckOwnerLinks(*tree), 9);
}

TEST_F(StyleTreeTest, RevertKeepsSingleSubstylesAndClearKeepsIdentity) {
  const std::unique_ptr<Style> base = Tree();
  const std::unique_ptr<Style> style = Tree(base.get());
  style->SetExternalID(u"E");
  Style* deepest = Deep(*style, 5);
  EXPECT_TRUE(style->RevertAllProperties());
  // The chain stays, emptied; the list and every mark are gone.
  EXPECT_EQ(CheckOwnerLinks(*style), 5);
  EXPECT_EQ(Deep(*style, 5), deepest);
  EXPECT_TRUE(style->IsEmptyWithEmptySubstyles());
  EXPECT_EQ(counts.Live(), 10);
  EXPECT_FALSE(style->RevertAllProperties());
  // Reverted substyles inherit again through their owners' parents.
  EXPECT_EQ(Number(deepest->GetProperty(mark)), 5.0);

  style->SetProperty(mark, Any(1.0));
  style->Clear();
  EXPECT_TRUE(style->GetProperties().empty());
  EXPECT_EQ(style->GetParent(), nullptr);
  EXPECT_EQ(style->GetCategoryName(), node.Key());
  EXPECT_EQ(style->GetExternalID(), ZelStringT<char16_t>(u"E"));
  EXPECT_EQ(counts.Live(), 10);
}

TEST_F(StyleTreeTest, OverriddenPathsAndTheWildcard) {
  const PropertyKey any(u"*");
  const std::unique_ptr<Style> tree = Tree();
  const std::unique_ptr<Style> empty = std::make_unique<Style>(nullptr, node.Key());
  const Style onlyParent(empty.get(), node.Key());
  Style emptyChildWithParent(nullptr, node.Key()); // holds an empty child that has a parent
  GetOrCreateSubstyle(emptyChildWithParent, child)->SetParent(empty.get());
  Style emptyItem(nullptr, node.Key());
  Style emptyItems(nullptr, node.Key());
  emptyItems.SetProperty(items, List{&emptyItem});
  struct Case {
    const char* label;
    const Style* style;
    PropertyPath path;
    bool overrides;
  };
  for (const Case& c : {
           Case{"empty path", tree.get(), {}, false},
           Case{"own list", tree.get(), {items}, true},
           Case{"five deep", tree.get(), {child, child, child, child, child, mark}, true},
           Case{"missing substyle",
                tree.get(),
                {child, child, child, child, child, child, mark},
                false},
           Case{"a list is no substyle", tree.get(), {items, mark}, false},
           Case{"inherited does not count", &onlyParent, {mark}, false},
           Case{"wildcard on values", tree.get(), {child, any}, true},
           Case{"wildcard on nothing", empty.get(), {any}, false},
           Case{"wildcard on a missing substyle", empty.get(), {child, any}, false},
           Case{"wildcard with only a parent", &onlyParent, {any}, true},
           Case{"wildcard on a substyle's parent", &emptyChildWithParent, {any}, true},
           Case{"wildcard on empty items", &emptyItems, {any}, false},
       }) {
    SCOPED_TRACE(c.label);
    EXPECT_EQ(c.style->DoesOverridePathProperty(c.path), c.overrides);
  }
  EXPECT_TRUE(emptyChildWithParent.IsEmptyWithEmptySubstyles());
  EXPECT_TRUE(emptyChildWithParent.SubstylesHaveAnyParentalRelationships());
  EXPECT_FALSE(tree->SubstylesHaveAnyParentalRelationships());
  emptyItem.SetParent(empty.get()); // the stored copy keeps no parent
  EXPECT_FALSE(emptyItems.SubstylesHaveAnyParentalRelationships());
  emptyItems.SetProperty(items, List{&emptyItem});
  EXPECT_TRUE(emptyItems.SubstylesHaveAnyParentalRelationships());
}

TEST_F(StyleTreeTest, SubstyleCountsAndNames) {
  std::unique_ptr<Style> style = Tree();
  EXPECT_EQ(style->GetNumSubstyles(), 1u); // the list does not count
  // Looked up under the element category's name, deliberately: a substyle
  // keyed otherwise is not found.
  EXPECT_EQ(style->GetLastSubstyle(), nullptr);
  Style* named = GetOrCreateSubstyle(*style, node.Key());
  EXPECT_EQ(style->GetNumSubstyles(), 2u);
  EXPECT_EQ(style->GetLastSubstyle(), named);
  EXPECT_EQ(style->GetCategoryUIName(), ZelStringT<char16_t>(u"Node"));
}

// Number properties with the flags a host may switch on; reads and
// adjustments are logged.
class FlaggedNumberProperty : public StyleProperty {
public:
  enum Flag { kTemporary, kDeprecated, kAdjusting };
  FlaggedNumberProperty(Flag flag, std::vector<std::string>* log)
      : StyleProperty(Any(0.0), new ZelPref::NumberConversionPolicy(), &testing::IsNumber),
        m_flag(flag), m_log(log) {}
  bool IsTemporary() const override { return m_flag == kTemporary; }
  bool IsDeprecated() const override { return m_flag == kDeprecated; }
  bool NeedAdjustementsForStyleIO() const override { return m_flag == kAdjusting; }
  void AdjustAfterDeserialize(const StyleSheet&, Style* style) const override {
    m_log->push_back("adjust " + std::to_string(Number(style->GetProperty(GetName()))));
  }
  bool Deserialize(const StyleSheet& sheet, Style* style, const JsonValue& in) const override {
    m_log->push_back("read " + std::string(GetName().GetView().begin(), GetName().GetView().end()));
    return StyleProperty::Deserialize(sheet, style, in);
  }

private:
  Flag m_flag;
  std::vector<std::string>* m_log;
};

class StyleJsonTest : public StyleTest {
protected:
  StyleJsonTest() {
    scratch =
        para.Add(u"scratch", new FlaggedNumberProperty(FlaggedNumberProperty::kTemporary, &log));
    oldSize =
        para.Add(u"oldSize", new FlaggedNumberProperty(FlaggedNumberProperty::kDeprecated, &log));
    para.Add(u"adjusted", new FlaggedNumberProperty(FlaggedNumberProperty::kAdjusting, &log));
  }
  static Json::Value Parse(const char16_t* text) {
    Json::Value document;
    ZelStringT<char16_t> error;
    EXPECT_TRUE(Json::Parse(text, document, error));
    return document;
  }
  Style* Read(const char16_t* text) {
    Style* style = Style::Deserialize(sheet, Parse(text).Get<Json::Object>(), para.Key());
    owned.emplace_back(style);
    return style;
  }

  std::vector<std::string> log;
  PropertyKey scratch, oldSize;
  StyleSheet sheet;
};

TEST_F(StyleJsonTest, SerializeWritesFixedMembersThenOwnValues) {
  // A sheet of the manager's initial version -1 is older than any property.
  sheet.SetVersion(1);
  Style* base = new Style(nullptr, para.Key());
  sheet.AddStyle(u"Base", base, false);
  Style* style = Para(base);
  style->SetExternalID(u"E");
  style->SetExternalName(u"Orig");
  style->SetProperty(size, Any(12.0));
  style->SetProperty(scratch, Any(1.0));
  EXPECT_EQ(style->Serialize(sheet, false, false),
            ZelStringT<char16_t>(
                u"{\"inherits\":\"Base\",\"id\":\"E\",\"original\":\"Orig\",\"size\":\"12\"}"));
  EXPECT_NE(style->Serialize(sheet, false, true).GetView().find(u"\"scratch\":\"1\""),
            std::u16string_view::npos);
  // A parent the sheet does not hold is not written.
  EXPECT_EQ(style->Serialize(StyleSheet(), false, false).GetView().find(u"inherits"),
            std::u16string_view::npos);
}

TEST_F(StyleJsonTest, InheritsResolvesInTheSheetWithoutCycles) {
  Style* x = new Style(nullptr, para.Key());
  Style* y = new Style(nullptr, para.Key());
  sheet.AddStyle(u"x", x, false);
  sheet.AddStyle(u"Y", y, false);
  EXPECT_EQ(Read(u"{\"inherits\":\"X\"}")->GetParent(), x);
  EXPECT_EQ(Read(u"{\"inherits\":5}")->GetParent(), nullptr);
  EXPECT_EQ(Read(u"{\"inherits\":\"missing\"}")->GetParent(), nullptr);

  // Reading into a style of the sheet: never its own parent, never a cycle.
  y->SetParent(x);
  x->DeserializeJson(sheet, Parse(u"{\"inherits\":\"Y\"}").Get<Json::Object>());
  EXPECT_EQ(x->GetParent(), nullptr);
  y->DeserializeJson(sheet, Parse(u"{\"inherits\":\"y\"}").Get<Json::Object>());
  EXPECT_EQ(y->GetParent(), x);
}

TEST_F(StyleJsonTest, DeserializeSkipsWhatItCannotUseAndReadsDeprecatedLast) {
  Style* style = Read(u"{\"id\":\"\",\"original\":7,\"nonsense\":\"1\",\"oldSize\":\"1\","
                      u"\"adjusted\":\"5\",\"size\":\"2\"}");
  EXPECT_TRUE(style->GetExternalID().IsEmpty());
  EXPECT_TRUE(style->GetExternalName().IsEmpty());
  EXPECT_EQ(style->GetProperties().size(), 3u);
  EXPECT_EQ(Number(style->GetProperty(oldSize)), 1.0);
  EXPECT_EQ(log, (std::vector<std::string>{"read adjusted", "read oldSize", "adjust 5.000000"}));
  EXPECT_THROW(Read(u"{\"size\":\"big\"}"), ZelPref::Detail::BadConversion);
}

} // namespace
} // namespace Styles
