#include <Styles/Style.h>

#include "HostBehaviours.h"

#include <Styles/StyleUtilities.h>

#include <Json/Json.h>

#include <gtest/gtest.h>

#include <exception>
#include <memory>
#include <typeinfo>

#include <algorithm>
#include <functional>
#include <unordered_set>
#include <vector>

namespace Styles {
namespace {

TEST(PropertyKeyTest, InterningIsExactAndByIdentity) {
  const PropertyKey a(u"fontSize");
  const PropertyKey b(ZelStringT<char16_t>(u"font") + u"Size");
  EXPECT_EQ(a, b);
  EXPECT_EQ(&a.GetString(), &b.GetString());
  EXPECT_EQ(std::hash<PropertyKey>()(a), std::hash<PropertyKey>()(b));
  EXPECT_EQ(a.ToString(), ZelStringT<char16_t>(u"fontSize"));
  EXPECT_NE(PropertyKey(u"Bold"), PropertyKey(u"bold"));
  EXPECT_NE(PropertyKey(u"\u00c9"), PropertyKey(u"\u00e9"));
  EXPECT_EQ(PropertyKey(u""), PropertyKey::Empty);
  EXPECT_EQ(PropertyKey(), PropertyKey::Empty);
  EXPECT_EQ(std::unordered_set<PropertyKey>({a, b, PropertyKey(u"x")}).size(), 2u);
}

TEST(PropertyKeyTest, OrderIsEntryIdentityNotText) {
  std::vector<PropertyKey> keys;
  for (const char16_t* text : {u"zeta", u"alpha", u"mid", u"Beta", u"omega", u"a"})
    keys.emplace_back(text);
  std::sort(keys.begin(), keys.end());
  for (std::size_t i = 1; i < keys.size(); ++i)
    EXPECT_TRUE(std::less<const void*>()(&keys[i - 1].GetString(), &keys[i].GetString()));
  EXPECT_FALSE(keys[0] < keys[0]);
}

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

  Style* Para(Style* parent = nullptr) {
    owned.emplace_back(new Style(parent, para.Key()));
    return owned.back().get();
  }

  ScopedCategory corner, border, para;
  PropertyKey radius, width, cornerKey, size, indent, borderKey;
  const PropertyKey unregistered{u"StyleTest.unregistered"};
  std::vector<std::unique_ptr<Style>> owned;
};

TEST_F(StyleTest, ConstructionBindsCategoryOrNone) {
  const Style style(nullptr, para.Key());
  EXPECT_EQ(style.GetCategoryName(), para.Key());
  const Style unknown(nullptr, PropertyKey(u"StyleTest.NoSuchCategory"));
  EXPECT_EQ(unknown.GetCategory(), nullptr);
  EXPECT_EQ(unknown.GetCategoryName(), PropertyKey::Empty);
  Style rebound(nullptr, para.Key());
  rebound.SetCategory(PropertyKey(u"StyleTest.NoSuchCategory"));
  EXPECT_EQ(rebound.GetCategoryName(), para.Key());
}

TEST_F(StyleTest, LookupFallsBackThroughParentsToTheDefaultObject) {
  Style* base = Para();
  Style* middle = Para(base);
  Style* leaf = Para(middle);
  base->SetProperty(size, Any(12.0));
  EXPECT_EQ(Number(leaf->GetProperty(size)), 12.0);
  middle->SetProperty(size, Any(14.0));
  EXPECT_EQ(Number(leaf->GetProperty(size)), 14.0);
  EXPECT_EQ(&leaf->GetProperty(size), &middle->GetProperties().Find(size)[0]);

  // Nobody sets indent: the category's default object itself comes back.
  const Any& fallback = leaf->GetProperty(indent);
  EXPECT_EQ(&fallback, &GetStyleManager().GetDefaultValue(para.Key(), indent));
  Any out(u"untouched");
  EXPECT_FALSE(leaf->GetProperty(indent, out));
  EXPECT_FALSE(leaf->GetInheritedProperty(indent, out));
  EXPECT_EQ(out, Any(u"untouched"));
  EXPECT_TRUE(leaf->GetProperty(size, out));
  EXPECT_EQ(Number(out), 14.0);

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

TEST_F(StyleTest, CopyKeepsParentButNotOwner) {
  Style* base = Para();
  Style* style = Para(base);
  style->SetProperty(size, Any(11.0));
  style->SetPathProperty({borderKey, width}, Any(2.0));
  Style* substyle = style->GetSubstyle(borderKey, false);
  ASSERT_NE(substyle, nullptr);
  EXPECT_EQ(substyle->GetOwner(), style);
  EXPECT_EQ(substyle->GetOwnerPropertyKey(), borderKey);

  const Style copy(*style);
  EXPECT_EQ(copy.GetParent(), base);
  EXPECT_EQ(copy, *style);
  Style* copiedSubstyle = copy.GetSubstyle(borderKey, false);
  ASSERT_NE(copiedSubstyle, nullptr);
  EXPECT_NE(copiedSubstyle, substyle);
  EXPECT_EQ(copiedSubstyle->GetOwner(), &copy);

  const Style substyleCopy(*substyle);
  EXPECT_EQ(substyleCopy.GetOwner(), nullptr);
  EXPECT_EQ(substyleCopy.GetOwnerPropertyKey(), PropertyKey::Empty);
}

TEST_F(StyleTest, MoveLeavesSourceLinksAndRepairsOwners) {
  Style* base = Para();
  Style source(base, para.Key());
  source.SetExternalID(u"ext");
  source.SetPathProperty({borderKey, width}, Any(3.0));
  Style* substyle = source.GetSubstyle(borderKey, false);

  Style destination(std::move(source));
  EXPECT_TRUE(source.GetProperties().empty());
  EXPECT_EQ(source.GetParent(), base);
  EXPECT_EQ(source.GetCategoryName(), para.Key());
  EXPECT_EQ(source.GetExternalID(), ZelStringT<char16_t>(u"ext"));
  EXPECT_EQ(destination.GetSubstyle(borderKey, false), substyle);
  EXPECT_EQ(substyle->GetOwner(), &destination);
}

TEST_F(StyleTest, SwapDataKeepsEachOwnerInPlace) {
  Style* holder = Para();
  holder->SetPathProperty({borderKey, width}, Any(1.0));
  Style* inner = holder->GetSubstyle(borderKey, false);
  Style other(nullptr, border.Key());
  other.SetPathProperty({cornerKey, radius}, Any(4.0));
  Style* otherCorner = other.GetSubstyle(cornerKey, false);

  inner->SwapData(other);
  EXPECT_EQ(inner->GetOwner(), holder);
  EXPECT_EQ(other.GetOwner(), nullptr);
  EXPECT_EQ(inner->GetSubstyle(cornerKey, false), otherCorner);
  EXPECT_EQ(otherCorner->GetOwner(), inner);
  EXPECT_EQ(Number(other.GetProperty(width)), 1.0);
}

TEST_F(StyleTest, EqualityAndOrderOnKeysWithoutBehaviour) {
  ScopedCategory* temporary = new ScopedCategory(u"StyleTest.Temporary");
  const PropertyKey value = temporary->Number(u"value");
  Style a(nullptr, temporary->Key());
  Style b(nullptr, temporary->Key());
  a.SetProperty(value, Any(1.0));
  b.SetProperty(value, Any(1.0));
  EXPECT_TRUE(a == b);
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

  // Deregistering deletes the behaviours while the styles still hold values.
  delete temporary;
  EXPECT_FALSE(a == b);
  EXPECT_TRUE(a != b);
  EXPECT_FALSE(a < b);
  EXPECT_FALSE(b < a);
}

TEST_F(StyleTest, OwnerBasedInheritanceOneAndTwoLevelsDeep) {
  // Parent P holds border{width=2, corner{radius=5}}; A inherits from P and
  // holds its own border with an own corner, neither setting anything.
  Style* p = Para();
  p->SetPathProperty({borderKey, width}, Any(2.0));
  p->SetPathProperty({borderKey, cornerKey, radius}, Any(5.0));
  Style* a = Para(p);
  a->SetPathProperty({borderKey, cornerKey, radius}, Any()); // creates both substyles
  Style* aBorder = a->GetSubstyle(borderKey, false);
  ASSERT_NE(aBorder, nullptr);
  Style* aCorner = aBorder->GetSubstyle(cornerKey, false);
  ASSERT_NE(aCorner, nullptr);

  EXPECT_EQ(Number(aBorder->GetProperty(width)), 2.0);
  EXPECT_EQ(Number(aCorner->GetProperty(radius)), 5.0);
  EXPECT_EQ(Number(a->GetPathProperty({borderKey, cornerKey, radius})), 5.0);

  // Then from that substyle's own parents.
  Style* cornerBase = new Style(nullptr, corner.Key());
  owned.emplace_back(cornerBase);
  cornerBase->SetProperty(radius, Any(9.0));
  p->GetSubstyle(borderKey, false)->GetSubstyle(cornerKey, false)->ClearProperty(radius);
  p->GetSubstyle(borderKey, false)->GetSubstyle(cornerKey, false)->SetParent(cornerBase);
  EXPECT_EQ(Number(aCorner->GetProperty(radius)), 9.0);

  // Without a parent anywhere above, the default.
  a->SetParent(nullptr);
  EXPECT_EQ(&aCorner->GetProperty(radius),
            &GetStyleManager().GetDefaultValue(corner.Key(), radius));
}

TEST_F(StyleTest, OwnerBasedInheritanceThreeLevelsDeep) {
  // A category whose substyle holds a paragraph, so the chain can go deeper
  // than the two keys kept without allocating.
  ScopedCategory outer(u"StyleTest.Outer");
  const PropertyKey paraKey = outer.Add(u"para", new StyleSetProperty(para.Key()));
  Style p(nullptr, outer.Key());
  p.SetPathProperty({paraKey, borderKey, cornerKey, radius}, Any(6.0));
  Style a(&p, outer.Key());
  a.SetPathProperty({paraKey, borderKey, cornerKey, radius}, Any());
  const Style* deep =
      a.GetSubstyle(paraKey, false)->GetSubstyle(borderKey, false)->GetSubstyle(cornerKey, false);
  EXPECT_EQ(Number(deep->GetProperty(radius)), 6.0);
}

TEST_F(StyleTest, OwnerBasedInheritanceRejectsNonSubstyles) {
  Style* p = Para();
  Style* a = Para(p);
  a->SetPathProperty({borderKey, width}, Any(1.0));
  Style* aBorder = a->GetSubstyle(borderKey, false);
  // P's border is the null default: nothing to inherit from.
  EXPECT_EQ(&aBorder->GetProperty(cornerKey),
            &GetStyleManager().GetDefaultValue(border.Key(), cornerKey));
  // A corner lookup under P's plain value under the same key cannot descend.
  Style* q = Para();
  Style* b = Para(q);
  b->SetPathProperty({borderKey, width}, Any(1.0));
  q->SetPathProperty({borderKey, width}, Any(1.0));
  Style* bBorder = b->GetSubstyle(borderKey, false);
  bBorder->SetOwner(b, size); // pretend the border hangs under "size"
  q->SetProperty(size, Any(3.0));
  EXPECT_THROW(bBorder->GetProperty(radius), std::bad_cast);
  bBorder->SetOwner(b, borderKey);
}

TEST_F(StyleTest, SubstyleAccessors) {
  Style* style = Para();
  EXPECT_EQ(style->GetSubstyle(borderKey, false), nullptr);
  EXPECT_EQ(style->GetSubstyle(borderKey, true), nullptr); // the null default
  style->SetProperty(size, Any(1.0));
  EXPECT_EQ(style->GetSubstyle(size, false), nullptr);
  EXPECT_THROW(style->GetSubstyle(size, true), std::bad_cast);

  Style* created = style->GetSubstyleAndCreateIfMissing(borderKey, border.Key());
  ASSERT_NE(created, nullptr);
  EXPECT_EQ(created->GetCategoryName(), border.Key());
  EXPECT_EQ(style->GetSubstyleAndCreateIfMissing(borderKey, border.Key()), created);
  EXPECT_EQ(GetOrCreateSubstyle(*style, borderKey), created);
  EXPECT_EQ(GetOrCreateSubstyle(*style, unregistered), nullptr);
  EXPECT_EQ(style->GetSubstyleAndCreateIfMissing(unregistered, border.Key()), nullptr);
}

TEST_F(StyleTest, PathLookupLeavingSubstylesUsesElementCategoryDefaults) {
  Style* style = Para();
  EXPECT_THROW(style->GetPathProperty({}), std::exception);
  EXPECT_EQ(&style->GetPathProperty({borderKey, cornerKey, radius}),
            &GetStyleManager().GetDefaultValue(corner.Key(), radius));
  EXPECT_EQ(&style->GetPathProperty({size}), &style->GetProperty(size));
  EXPECT_EQ(&style->GetPathProperty({borderKey, width}),
            &GetStyleManager().GetDefaultValue(border.Key(), width));
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

  // A top-level style without parent has nothing to inherit.
  EXPECT_FALSE(style->RevertPathProperty({borderKey, width}, false));
  EXPECT_TRUE(style->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));
  EXPECT_TRUE(style->RevertPathProperty({borderKey, width}, true));
  EXPECT_FALSE(style->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));

  // A substyle with a parent along the path makes reverting useful.
  style->SetPathProperty({borderKey, width}, Any(2.0));
  Style* borderBase = new Style(nullptr, border.Key());
  owned.emplace_back(borderBase);
  style->GetSubstyle(borderKey, false)->SetParent(borderBase);
  EXPECT_TRUE(style->RevertPathProperty({borderKey, width}, false));

  Style* child = Para(style);
  child->SetProperty(size, Any(3.0));
  EXPECT_TRUE(child->RevertPathProperty({size}, false));
  EXPECT_TRUE(child->ClearPathProperty({borderKey, width}) == false);
}

TEST_F(StyleTest, ClearPropertiesAndCopyProperties) {
  Style* base = Para();
  base->SetProperty(size, Any(12.0));
  Style* style = Para(base);
  style->SetProperty(indent, Any(1.0));
  Style* keys = Para();
  keys->SetProperty(indent, Any(99.0));
  style->ClearProperties(nullptr);
  style->ClearProperties(keys);
  EXPECT_FALSE(style->DoesOverrideProperty(indent));
  style->SetProperty(indent, Any(1.0));
  style->ClearProperties(style);
  EXPECT_TRUE(style->GetProperties().empty());

  std::unique_ptr<Style> copy(style->CopyProperties({size, indent, unregistered}));
  EXPECT_EQ(copy->GetParent(), nullptr);
  EXPECT_EQ(copy->GetCategoryName(), para.Key());
  ASSERT_EQ(copy->GetProperties().size(), 2u);
  EXPECT_EQ(Number(copy->GetProperty(size)), 12.0); // inherited, now own
  EXPECT_TRUE(copy->DoesOverrideProperty(indent));  // the default, stored explicitly
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
  const Style* destinationCorner =
      destination->GetSubstyle(borderKey, false)->GetSubstyle(cornerKey, false);
  ASSERT_NE(destinationCorner, nullptr);
  EXPECT_FALSE(destinationCorner->DoesOverrideProperty(radius));

  Style* empty = Para();
  Style* fresh = Para();
  fresh->SetPathProperty({borderKey, width}, empty);
  ASSERT_NE(fresh->GetSubstyle(borderKey, false), nullptr); // created on the way
  EXPECT_FALSE(fresh->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));
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
  EXPECT_FALSE(c->HasDependency(Span(none), false));
  EXPECT_TRUE(c->GetDependencies(Span(none), false).empty());

  std::vector<Style*> sorted{a, b};
  std::sort(sorted.begin(), sorted.end(), std::less<>());
  const std::vector<Style*> reversed(sorted.rbegin(), sorted.rend());
  EXPECT_EQ(c->GetDependencies(Span(reversed), false), sorted);
  EXPECT_EQ(c->GetDependencies(Span(sorted, true), false), sorted);
  EXPECT_EQ(c->GetDependencies(Span(reversed), true), std::vector<Style*>{b});
  EXPECT_EQ(c->GetDependencies(Span(onlyC), false), onlyC);

  EXPECT_TRUE(c->HasParentalDependency(Span(onlyA)));
  EXPECT_FALSE(c->HasParentalDependency(Span(onlyC)));
  EXPECT_FALSE(a->HasParentalDependency(Span(onlyA)));
  EXPECT_TRUE(c->HasParentalDependency());
  EXPECT_FALSE(a->HasParentalDependency());
}

TEST_F(StyleChainTest, RemoveDependencyKeepsEffectiveValues) {
  const std::vector<Style*> onlyA{a}, onlyB{b};
  c->RemoveDependency(Span(onlyA), true); // A is not C's parent: nothing
  EXPECT_EQ(c->GetParent(), b);
  EXPECT_TRUE(c->GetProperties().empty());

  c->RemoveDependency(Span(onlyB), true);
  EXPECT_EQ(c->GetParent(), a);
  EXPECT_EQ(Number(c->GetProperty(size)), 2.0);
  EXPECT_FALSE(c->DoesOverrideProperty(indent)); // still inherited from A
}

TEST_F(StyleChainTest, RemoveDependencyOnAnAncestorFoldsTheChain) {
  // Folding stops above the farthest ancestor in the span, also in a long
  // unsorted span of styles foreign to the chain.
  std::vector<Style*> withB(20, Para());
  withB[7] = b;
  c->RemoveDependency(Span(withB), false);
  EXPECT_EQ(c->GetParent(), a);
  EXPECT_EQ(Number(c->GetProperty(size)), 2.0);
  c->SetParent(b);
  c->ClearAllProperties();

  const std::vector<Style*> onlyA{a};
  c->RemoveDependency(Span(onlyA), false);
  EXPECT_EQ(c->GetParent(), nullptr);
  EXPECT_EQ(Number(c->GetProperty(size)), 2.0); // the nearest value wins
  EXPECT_EQ(Number(c->GetProperty(indent)), 7.0);
}

TEST_F(StyleChainTest, RemoveAllDependenciesAndRemap) {
  Style* other = Para();
  c->RemapDependency({{b, nullptr}});
  EXPECT_EQ(c->GetParent(), b);
  c->RemapDependency({{b, other}, {a, nullptr}});
  EXPECT_EQ(c->GetParent(), other);
  c->SetParent(b);

  c->RemoveAllDependencies();
  EXPECT_EQ(c->GetParent(), nullptr);
  EXPECT_EQ(Number(c->GetProperty(size)), 2.0);
  EXPECT_EQ(Number(c->GetProperty(indent)), 7.0);
}

TEST_F(StyleChainTest, ProcessPropertiesStopsAtFalse) {
  int calls = 0;
  EXPECT_FALSE(a->ProcessProperties([&](Any&, Style*, const PropertyKey&) { return ++calls > 5; }));
  EXPECT_EQ(calls, 1);
  std::vector<PropertyKey> seen;
  EXPECT_TRUE(a->ProcessProperties([&](Any& value, Style* holder, const PropertyKey& key) {
    EXPECT_EQ(holder, a);
    value = Any(Number(value) * 10);
    seen.push_back(key);
    return true;
  }));
  EXPECT_EQ(seen.size(), 2u);
  EXPECT_EQ(Number(a->GetProperty(size)), 10.0);

  a->SetPathProperty({borderKey, width}, Any(3.0));
  calls = 0;
  EXPECT_TRUE(a->ProcessProperties({{}, {borderKey, width}, {cornerKey, radius}, {indent}},
                                   [&](Any&, Style*, const PropertyKey&) { return ++calls > 0; }));
  EXPECT_EQ(calls, 2);
  EXPECT_TRUE(
      c->ProcessProperties({{size}}, [](Any&, Style*, const PropertyKey&) { return false; }));
}

TEST_F(StyleChainTest, MergeRespectsOverwrite) {
  Style* target = Para();
  target->SetProperty(size, Any(50.0));
  target->MergeProperties(c, false); // C sets nothing itself
  EXPECT_TRUE(target->GetProperties().size() == 1);
  target->MergeProperties(b, false);
  EXPECT_EQ(Number(target->GetProperty(size)), 50.0);
  target->MergeProperties(b, true);
  EXPECT_EQ(Number(target->GetProperty(size)), 2.0);

  Style* fresh = Para();
  fresh->MergeParentProperties(a);
  EXPECT_EQ(Number(fresh->GetProperty(indent)), 7.0);
  EXPECT_EQ(fresh->GetParent(), nullptr);
}

TEST_F(StyleChainTest, FlattenBakesInheritedValuesAndCutsTheParent) {
  std::set<PropertyKey> flattened{radius}; // accumulates: not cleared
  EXPECT_TRUE(c->Flatten(flattened));
  EXPECT_EQ(c->GetParent(), nullptr);
  EXPECT_EQ(Number(c->GetProperty(size)), 2.0);
  EXPECT_TRUE(c->DoesOverrideProperty(indent));
  EXPECT_EQ(flattened.count(size) + flattened.count(indent) + flattened.count(radius), 3u);

  ScopedCategory bare(u"StyleTest.Bare");
  Style parent(nullptr, bare.Key());
  Style child(&parent, bare.Key());
  EXPECT_FALSE(child.Flatten());
  EXPECT_EQ(child.GetParent(), nullptr);
}

TEST_F(StyleChainTest, FlattenedSubstyleCarriesOwnerInheritance) {
  a->SetPathProperty({borderKey, width}, Any(4.0));
  Style* holder = Para(a);
  holder->SetPathProperty({borderKey, cornerKey, radius}, Any(2.0));
  const Style* substyle = holder->GetSubstyle(borderKey, false);
  EXPECT_TRUE(substyle->StylePropertiesHasDependencyOnOwner());
  EXPECT_FALSE(a->GetSubstyle(borderKey, false)->StylePropertiesHasDependencyOnOwner());

  std::unique_ptr<Style> flat(substyle->CreateFlattenedStyle());
  EXPECT_EQ(flat->GetOwner(), nullptr);
  EXPECT_EQ(flat->GetParent(), nullptr);
  EXPECT_EQ(Number(flat->GetProperty(width)), 4.0);

  std::unique_ptr<Style> clone(holder->CreateSubStyleCloneWithNoDependencyOnOwner(borderKey));
  EXPECT_EQ(clone->GetOwner(), nullptr);
  EXPECT_EQ(Number(clone->GetProperty(width)), 4.0);
  EXPECT_EQ(Number(clone->GetPathProperty({cornerKey, radius})), 2.0);

  // Nothing under the key anywhere: an empty style of the element category.
  std::unique_ptr<Style> empty(Para()->CreateSubStyleCloneWithNoDependencyOnOwner(borderKey));
  EXPECT_TRUE(empty->GetProperties().empty());
  EXPECT_EQ(empty->GetCategoryName(), border.Key());
}

TEST_F(StyleChainTest, CopySubstylePropertiesDependsOnSharedInheritance) {
  a->SetPathProperty({borderKey, width}, Any(4.0));
  Style* source = Para(a);
  source->SetPathProperty({borderKey, cornerKey, radius}, Any(3.0));

  // Same parent as the source: a plain copy keeps inheriting from A.
  Style* sibling = Para(a);
  sibling->CopySubstyleProperties(source, borderKey);
  const Style* copied = sibling->GetSubstyle(borderKey, false);
  ASSERT_NE(copied, nullptr);
  EXPECT_FALSE(copied->DoesOverrideProperty(width));
  EXPECT_EQ(Number(copied->GetProperty(width)), 4.0);

  // Another parent: the copy must carry A's values itself.
  Style* stranger = Para();
  stranger->CopySubstyleProperties(source, borderKey);
  const Style* clone = stranger->GetSubstyle(borderKey, false);
  ASSERT_NE(clone, nullptr);
  EXPECT_TRUE(clone->DoesOverrideProperty(width));
  EXPECT_EQ(Number(clone->GetProperty(width)), 4.0);

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
  EXPECT_EQ(style->GetParent(), base.get());
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
           Case{"own value", tree.get(), {mark}, true},
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
  EXPECT_TRUE(Style().GetCategoryUIName().IsEmpty());
}

// Number properties with the flags a host may switch on.
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
    adjusted =
        para.Add(u"adjusted", new FlaggedNumberProperty(FlaggedNumberProperty::kAdjusting, &log));
  }
  Style* Read(const char16_t* text) {
    Json::Value document;
    ZelStringT<char16_t> error;
    EXPECT_TRUE(Json::Parse(text, document, error));
    Style* style = Style::Deserialize(sheet, document.Get<Json::Object>(), para.Key());
    owned.emplace_back(style);
    return style;
  }

  std::vector<std::string> log;
  PropertyKey scratch, oldSize, adjusted;
  StyleSheet sheet;
};

TEST_F(StyleJsonTest, SerializeWritesFixedMembersThenOwnValues) {
  Style* empty = Para();
  EXPECT_EQ(empty->Serialize(sheet, false, false), ZelStringT<char16_t>(u"{}"));

  // A sheet of the manager's initial version -1 is older than any property.
  sheet.SetVersion(1);
  Style* base = Para();
  sheet.AddStyle(u"Base", base, false);
  owned.back().release(); // the sheet owns it now
  Style* style = Para(base);
  style->SetExternalID(u"E");
  style->SetExternalName(u"Orig");
  style->SetProperty(size, Any(12.0));
  style->SetProperty(scratch, Any(1.0));
  EXPECT_EQ(style->Serialize(sheet, false, false),
            ZelStringT<char16_t>(
                u"{\"inherits\":\"Base\",\"id\":\"E\",\"original\":\"Orig\",\"size\":\"12\"}"));
  const ZelStringT<char16_t> withTemporary = style->Serialize(sheet, false, true);
  EXPECT_NE(withTemporary.GetView().find(u"\"scratch\":\"1\""), std::u16string_view::npos);

  // A parent the sheet does not hold is not written.
  StyleSheet other;
  EXPECT_EQ(style->Serialize(other, false, false).GetView().find(u"inherits"),
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
  x->DeserializeJson(sheet, Json::Object());
  Json::Value document;
  ZelStringT<char16_t> error;
  ASSERT_TRUE(Json::Parse(u"{\"inherits\":\"Y\"}", document, error));
  x->DeserializeJson(sheet, document.Get<Json::Object>());
  EXPECT_EQ(x->GetParent(), nullptr);
  ASSERT_TRUE(Json::Parse(u"{\"inherits\":\"y\"}", document, error));
  y->DeserializeJson(sheet, document.Get<Json::Object>());
  EXPECT_EQ(y->GetParent(), x);
}

TEST_F(StyleJsonTest, DeserializeSkipsWhatItCannotUse) {
  Style* style = Read(u"{\"id\":\"\",\"original\":7,\"nonsense\":\"1\",\"size\":\"3\"}");
  EXPECT_TRUE(style->GetExternalID().IsEmpty());
  EXPECT_TRUE(style->GetExternalName().IsEmpty());
  ASSERT_EQ(style->GetProperties().size(), 1u);
  EXPECT_EQ(Number(style->GetProperty(size)), 3.0);
  EXPECT_THROW(Read(u"{\"size\":\"big\"}"), ZelPref::Detail::BadConversion);
}

TEST_F(StyleJsonTest, DeprecatedReadLastAndAdjustmentsAfterAll) {
  Style* style = Read(u"{\"oldSize\":\"1\",\"adjusted\":\"5\",\"size\":\"2\"}");
  EXPECT_EQ(log, (std::vector<std::string>{"read adjusted", "read oldSize", "adjust 5.000000"}));
  EXPECT_EQ(Number(style->GetProperty(oldSize)), 1.0);
  EXPECT_EQ(Number(style->GetProperty(size)), 2.0);
}

} // namespace
} // namespace Styles
