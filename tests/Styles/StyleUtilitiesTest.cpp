#include <Styles/StyleUtilities.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>

#include "HostBehaviours.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <memory>
#include <string>

namespace Styles {
namespace {

std::string Narrow(std::u16string_view text) { return std::string(text.begin(), text.end()); }

TEST(StyleUtilitiesTest, MakePathsKeepArgumentAndContainerOrder) {
  const PropertyKey a(u"a"), b(u"b"), c(u"c");
  EXPECT_EQ(MakePath(c, a, a), PropertyPath({c, a, a}));
  EXPECT_EQ(MakePath(c, PropertyPath{a, b}), PropertyPath({c, a, b}));
  const PropertyPath joined = MakePath(PropertyPath{b}, PropertyPath{a, c});
  EXPECT_EQ(joined, PropertyPath({b, a, c}));
  EXPECT_EQ(joined.capacity(), 3u);
  EXPECT_EQ(MakePaths(std::vector<PropertyKey>{b, a, b}),
            (std::vector<PropertyPath>{{b}, {a}, {b}}));
  // A set iterates in identity order, whatever the texts are.
  const std::set<PropertyKey> keys{b, a};
  EXPECT_EQ(MakePaths(keys), (std::vector<PropertyPath>{{*keys.begin()}, {*keys.rbegin()}}));
}

TEST(StyleUtilitiesTest, SplitPathInternsEveryPiece) {
  struct Case {
    const char16_t* text;
    std::vector<const char16_t*> keys;
  };
  for (const Case& c : {Case{u"font", {u"font"}}, Case{u"border.left", {u"border", u"left"}},
                        Case{u"a.b.c", {u"a", u"b", u"c"}}, Case{u"a..b", {u"a", u"", u"b"}},
                        Case{u".a", {u"", u"a"}}, Case{u"", {u""}}}) {
    SCOPED_TRACE(Narrow(c.text));
    const PropertyPath path = SplitPath(c.text);
    ASSERT_EQ(path.size(), c.keys.size());
    for (std::size_t i = 0; i < path.size(); ++i)
      EXPECT_EQ(path[i], PropertyKey(c.keys[i]));
  }
  EXPECT_EQ(SplitPath(u"x.").back(), PropertyKey::Empty);
}

// The refused behaviours of the repeated and the misdirected registrations
// must be freed: LeakSanitizer checks that.
TEST(StyleUtilitiesTest, SubstyleSetsAndTheCategoryOfOrdinaryStyles) {
  StyleManager& manager = GetStyleManager();
  const PropertyKey marked(u"UtilitiesTest.Marked"), plain(u"UtilitiesTest.Plain"),
      later(u"UtilitiesTest.Later");
  manager.RegisterCategory(marked, u"Marked", true, false);
  manager.RegisterCategory(plain, u"Plain", false, false);
  RegisterStyleCategory(u"Style");
  manager.RegisterCategory(later, u"Later", true, false);
  RegisterStyleCategory(u"Again");

  EXPECT_EQ(manager.TranslateCategory(StyleCategoryName), ZelStringT<char16_t>(u"Style"));
  EXPECT_TRUE(manager.GetCategory(StyleCategoryName)->GetFlag());
  const BaseStyleProperty* set = manager.GetStyleProperty(StyleCategoryName, marked);
  EXPECT_TRUE(set->IsSubstyle());
  EXPECT_EQ(set->GetElementCategoryName(), marked);
  EXPECT_EQ(manager.GetStyleProperty(StyleCategoryName, plain), nullptr);
  // Marked after the first call, so only the second one added it.
  EXPECT_NE(manager.GetStyleProperty(StyleCategoryName, later), nullptr);

  RegisterSubstyleSet(plain, marked);
  const BaseStyleProperty* first = manager.GetStyleProperty(plain, marked);
  RegisterSubstyleSet(plain, marked);
  RegisterSubstyleSet(PropertyKey(u"UtilitiesTest.Unknown"), marked);
  EXPECT_EQ(manager.GetStyleProperty(plain, marked), first);

  DeregisterStyleCategory();
  for (const PropertyKey& key : {marked, plain, later})
    manager.DeregisterCategory(key);
}

TEST(StyleUtilitiesTest, ConvertToValidStyleNameFiltersThenTrims) {
  struct Case {
    const char16_t* in;
    bool strict;
    const char16_t* expected;
  };
  for (const Case& c : {
           Case{u"Caf\u00e9 Title", true, u"Caf Title"},
           Case{u"Caf\u00e9 Title", false, u"Caf\u00e9 Title"},
           Case{u"a\tb\"c\nd~e", false, u"abcde"},
           Case{u"back\\slash <x>", false, u"back\\slash <x>"},
           Case{u"line\rfeed", false, u"line\rfeed"},
           Case{u"\"  inner  space \"", true, u"inner  space"}, // filtered, then trimmed
           Case{u"~ edge ~", false, u"edge"},
           Case{u"\u00e9 x \u00e9", true, u"x"},
           Case{u" \t \u00a0 ", true, u""},
           Case{u"\u3000Heading\u3000", false, u"Heading"},
       }) {
    SCOPED_TRACE(Narrow(c.in) + (c.strict ? " strict" : " lenient"));
    EXPECT_EQ(ConvertToValidStyleName(c.in, c.strict), ZelStringT<char16_t>(c.expected));
  }
  // Strict mode keeps exactly this set of ASCII.
  const std::u16string allowed =
      u" 0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ()[]{}'|!@#$%^&*-_.,?/+=:;`";
  std::u16string everyAscii;
  for (char16_t c = 1; c < 0x80; ++c)
    everyAscii.push_back(c);
  // Wrapped in letters so that trimming does not hide a kept space.
  const ZelStringT<char16_t> kept = ConvertToValidStyleName(u"x" + everyAscii + u"x", true);
  std::u16string expected = u"x";
  for (char16_t c : everyAscii)
    if (allowed.find(c) != std::u16string::npos)
      expected.push_back(c);
  expected.push_back(u'x');
  EXPECT_EQ(kept, ZelStringT<char16_t>(expected));
}

using testing::CheckOwnerLinks;
using testing::Number;
using ZelUtils::Any;

// Nodes hold a counted mark, a size, two single substyles of their own kind
// (child, side) and a list of them (items). Every counted value a test makes
// must be freed exactly once.
class StyleUtilitiesSubstyleTest : public ::testing::Test {
protected:
  StyleUtilitiesSubstyleTest() : node(u"UtilitiesTest.Node") {
    mark = node.Add(u"mark", new testing::CountingNumberProperty(0.0, &counts));
    size = node.Number(u"size", 10.0);
    child = node.Add(u"child", new StyleSetProperty(node.Key()));
    side = node.Add(u"side", new StyleSetProperty(node.Key()));
    items = node.Add(u"items", new StyleArrayProperty(PropertyKey::Empty));
  }
  ~StyleUtilitiesSubstyleTest() override { EXPECT_EQ(counts.Live(), 0); }

  Style Node(Style* parent = nullptr) const { return Style(parent, node.Key()); }
  // Depth first in key order is the lexicographic order of the paths.
  static std::vector<PropertyPath> Sorted(std::vector<PropertyPath> paths) {
    std::sort(paths.begin(), paths.end());
    return paths;
  }

  testing::ValueCounts counts;
  testing::ScopedCategory node;
  PropertyKey mark, size, child, side, items;
};

TEST_F(StyleUtilitiesSubstyleTest, SubStyleHandlesOutliveReplacedSubstyles) {
  Style root = Node();
  root.SetPathProperty({child, child, side, mark}, Any(1.0));
  Style* deep = root.GetSubstyle(child, false)->GetSubstyle(child, false)->GetSubstyle(side, false);
  const SubStyle handle(deep);
  EXPECT_EQ(handle.GetRoot(), &root);
  EXPECT_EQ(handle.GetPath(), PropertyPath({child, child, side}));
  EXPECT_EQ(SubStylesToStyles({handle, &root, nullptr}),
            (std::vector<Style*>{deep, &root, nullptr}));

  // Replacing an intermediate substyle frees `deep`; the handle finds the copy.
  Style replacement = Node();
  replacement.SetPathProperty({child, side, mark}, Any(2.0));
  root.SetProperty(child, Any(static_cast<const Style*>(&replacement)));
  ASSERT_NE(static_cast<Style*>(handle), nullptr);
  EXPECT_EQ(Number(static_cast<Style*>(handle)->GetProperty(mark)), 2.0);
  root.GetSubstyle(child, false)->GetSubstyle(child, false)->ClearProperty(side);
  EXPECT_EQ(static_cast<Style*>(handle), nullptr);

  SubStyle copy = nullptr;
  copy = handle;
  const SubStyle moved(std::move(copy));
  EXPECT_EQ(moved.GetPath(), handle.GetPath());
  EXPECT_EQ(copy.GetRoot(), nullptr);
  EXPECT_TRUE(copy.GetPath().empty());

  // A list element linked to its owner (as a host's behaviour may do) gets a
  // path without index, which resolves to nothing.
  root.SetProperty(items, std::vector<Style*>{&replacement});
  Style* element = root.GetProperty(items).Get<std::vector<Style*>>()[0];
  element->SetOwner(&root, items);
  const std::vector<SubStyle> handles = StylesToSubStyles({element});
  EXPECT_EQ(handles[0].GetPath(), PropertyPath{items});
  EXPECT_EQ(SubStylesToStyles(handles), std::vector<Style*>{nullptr});
}

TEST_F(StyleUtilitiesSubstyleTest, OverriddenPathsListOwnLeavesDepthFirst) {
  Style list = Node();
  Style style = Node();
  style.SetProperty(size, Any(1.0));
  style.SetPathProperty({child, mark}, Any(2.0));
  style.SetPathProperty({child, side, size}, Any(3.0));
  GetOrCreateSubstyle(style, side); // empty: no path, not even [side]
  style.SetProperty(items, std::vector<Style*>{&list});
  EXPECT_EQ(GetOverriddenPropertyPaths(style),
            Sorted({{size}, {items}, {child, mark}, {child, side, size}}));
  EXPECT_EQ(GetOverriddenProperties(style), (std::set<PropertyKey>{size, child, side, items}));
  EXPECT_TRUE(GetOverriddenPropertyPaths(list).empty());
  EXPECT_EQ(GetStyleCategoryProperties(list).size(), 5u);

  // One level only: the inner substyle gives its key.
  EXPECT_EQ(GetOverriddenSubstyleProperties(style, child, true),
            Sorted({{child, mark}, {child, side}}));
  EXPECT_EQ(GetOverriddenSubstyleProperties(style, child, false), Sorted({{mark}, {side}}));
  EXPECT_TRUE(GetOverriddenSubstyleProperties(style, side, true).empty());
  EXPECT_TRUE(GetOverriddenSubstyleProperties(style, items, true).empty());
}

TEST_F(StyleUtilitiesSubstyleTest, SubstyleValuesReadInheritedAndWriteOwnSubstyles) {
  Style base = Node();
  base.SetPathProperty({child, size}, Any(4.0));
  Style derived = Node(&base);
  EXPECT_EQ(Number(GetSubstyleProperty(derived, child, size)), 4.0);
  Any out(7.0);
  EXPECT_FALSE(GetSubstyleProperty(derived, child, mark, out)); // only the default
  EXPECT_FALSE(GetSubstyleProperty(derived, items, size, out)); // the default list
  EXPECT_EQ(Number(out), 7.0);
  EXPECT_TRUE(GetSubstyleProperty(derived, child, size, out));
  EXPECT_EQ(Number(out), 4.0);

  // The write creates an own substyle with the one value; base's stays as it is.
  SetSubstyleProperty(derived, node.Key(), child, mark, Any(1.0));
  Style* own = derived.GetSubstyle(child, false);
  ASSERT_NE(own, nullptr);
  EXPECT_EQ(GetOverriddenProperties(*own), std::set<PropertyKey>{mark});
  EXPECT_EQ(Number(own->GetProperty(size)), 4.0);
  EXPECT_FALSE(base.GetSubstyle(child, false)->DoesOverrideProperty(mark));
  SetSubstyleProperty(derived, node.Key(), child, size, Any(5.0));
  ClearSubstyleProperty(derived, child, mark);
  ClearSubstyleProperty(derived, child, size);
  ClearSubstyleProperty(derived, side, size); // no own substyle: nothing
  EXPECT_EQ(derived.GetSubstyle(child, false), own);
  EXPECT_TRUE(own->GetProperties().empty());

  // A plain value or a list where a substyle must be.
  derived.SetProperty(size, Any(1.0));
  const std::function<void()> misuses[] = {
      [&] { GetSubstyleProperty(derived, items, mark); },
      [&] { GetSubstyleProperty(derived, size, mark, out); },
      [&] { SetSubstyleProperty(derived, node.Key(), size, mark, Any(1.0)); },
      [&] { SetSubstyleProperty(derived, node.Key(), items, mark, Any(1.0)); },
      // The plain behaviour stores the pointer, but it never reads as a substyle.
      [&] { SetSubstyleProperty(derived, node.Key(), mark, size, Any(1.0)); },
      [&] { ClearSubstyleProperty(derived, size, mark); },
  };
  for (const std::function<void()>& misuse : misuses)
    EXPECT_THROW(misuse(), std::bad_cast);
  EXPECT_FALSE(derived.DoesOverrideProperty(items));
  EXPECT_EQ(derived.GetSubstyle(mark, false), nullptr);
}

TEST_F(StyleUtilitiesSubstyleTest, StyleOrSubstyleAndOwnerBasedParents) {
  Style base = Node();
  Style* baseChild = GetOrCreateSubstyle(base, child);
  Style derived = Node(&base);
  EXPECT_EQ(GetStyleOrSubstyle(&derived, node.Key(), false), &derived);
  EXPECT_EQ(GetStyleOrSubstyle(&derived, child, false), nullptr);
  EXPECT_EQ(GetStyleOrSubstyle(static_cast<const Style*>(&derived), child, true), baseChild);

  // A parentless substyle takes the parent of the substyle under its key in
  // the nearest of its owner and the owner's ancestors that has one.
  Style target = Node();
  baseChild->SetParent(&target);
  Style middle = Node(&base);
  GetOrCreateSubstyle(middle, child); // parentless: passed over
  Style owner = Node(&middle);
  Style* substyle = GetOrCreateSubstyle(owner, child);
  EXPECT_EQ(GetSubstyleParent(*substyle), &target);
  EXPECT_EQ(GetSubstyleParent(*GetOrCreateSubstyle(owner, side)), nullptr);
  substyle->SetParent(&middle);
  EXPECT_EQ(GetSubstyleParent(*substyle), &middle);
}

TEST_F(StyleUtilitiesSubstyleTest, OwnerFreeStyleFromSubstyle) {
  // shared <- base.child; derived.child inherits through its owner's parent.
  Style shared = Node();
  shared.SetProperty(mark, Any(3.0));
  shared.SetPathProperty({side, mark}, Any(9.0));
  Style base = Node();
  base.SetPathProperty({child, mark}, Any(3.0)); // equal to shared's, found elsewhere
  base.GetSubstyle(child, false)->SetParent(&shared);
  Style derived = Node(&base);
  derived.SetPathProperty({child, size}, Any(5.0));

  std::set<PropertyKey> keys{size};
  const std::unique_ptr<Style> clone(
      CreateStyleFromSubstyleWithoutOwnerDependencies(&derived, child, keys));
  ASSERT_NE(clone, nullptr);
  EXPECT_EQ(keys, GetStyleCategoryProperties(derived));
  EXPECT_EQ(clone->GetParent(), &shared);
  EXPECT_EQ(clone->GetOwner(), nullptr);
  // Side comes from where the parent finds it and is left to inheritance.
  EXPECT_EQ(GetOverriddenProperties(*clone), (std::set<PropertyKey>{mark, size}));
  EXPECT_EQ(Number(clone->GetProperty(mark)), 3.0);

  keys = {size};
  EXPECT_EQ(CreateStyleFromSubstyleWithoutOwnerDependencies(&derived, side, keys), nullptr);
  EXPECT_EQ(keys, std::set<PropertyKey>{size});
}

// Lookups that throw midway must still free the clone and the values moved
// aside: the counted marks show any that leak.
TEST_F(StyleUtilitiesSubstyleTest, ThrowingLookupsFreeTheirTemporaries) {
  Style uncategorised; // a lookup ending here has no default to give
  Style owner = Node();
  owner.SetPathProperty({child, mark}, Any(1.0));
  owner.GetSubstyle(child, false)->SetParent(&uncategorised);
  std::set<PropertyKey> keys;
  EXPECT_THROW(CreateStyleFromSubstyleWithoutOwnerDependencies(&owner, child, keys),
               std::exception);

  Style style = Node(&uncategorised);
  style.SetProperty(mark, Any(2.0));
  style.SetPathProperty({child, mark}, Any(3.0));
  EXPECT_THROW(ClearMatchingInheritedProperties(style), std::exception);
  EXPECT_EQ(counts.Live(), 1); // owner's mark
}

TEST_F(StyleUtilitiesSubstyleTest, ClearMatchingInheritedPropertiesKeepsOnlyDifferences) {
  Style lone = Node();
  lone.SetProperty(size, Any(10.0));
  ClearMatchingInheritedProperties(lone);
  EXPECT_TRUE(lone.DoesOverrideProperty(size)); // nothing to inherit from

  Style base = Node();
  base.SetProperty(size, Any(1.0));
  base.SetPathProperty({child, mark}, Any(4.0));
  Style derived = Node(&base);
  derived.SetProperty(size, Any(1.0));
  derived.SetProperty(mark, Any(2.0));
  derived.SetPathProperty({child, mark}, Any(4.0)); // a substyle equal to base's
  derived.SetPathProperty({side, size}, Any(10.0));
  derived.SetPathProperty({side, mark}, Any(6.0));
  // Through its owner's parent the side substyle inherits the default size.
  ClearMatchingInheritedProperties(*derived.GetSubstyle(side, false));
  ClearMatchingInheritedProperties(derived);
  EXPECT_EQ(GetOverriddenPropertyPaths(derived), Sorted({{mark}, {side, mark}}));
  CheckOwnerLinks(derived);
}

TEST_F(StyleUtilitiesSubstyleTest, ForEachSubStyleWalksOneLevel) {
  Style style = Node();
  style.SetPathProperty({child, child, mark}, Any(2.0));
  style.SetPathProperty({side, mark}, Any(3.0));
  Style* first = style.GetSubstyle(child, false);
  Style* second = style.GetSubstyle(side, false);
  struct Case {
    bool includeSelf;
    std::vector<PropertyKey> keys;
    std::size_t stopAt;
    std::vector<Style*> visited;
  };
  for (const Case& c :
       {Case{false, {}, 9, {first, second}}, Case{false, {side, mark, child}, 9, {second, first}},
        Case{true, {}, 1, {&style}}, Case{false, {}, 1, {first}}}) {
    std::vector<Style*> visited;
    const auto visit = [&](Style* s) {
      visited.push_back(s);
      return visited.size() < c.stopAt;
    };
    EXPECT_EQ(ForEachSubStyle(&style, visit, c.includeSelf, c.keys), c.stopAt > 2);
    EXPECT_EQ(visited, c.visited);
  }
  EXPECT_TRUE(ForEachSubStyle(nullptr, {}, true, {}));
  EXPECT_THROW(ForEachSubStyle(&style, {}, false, {}), std::bad_function_call);
}

TEST_F(StyleUtilitiesSubstyleTest, ClearEmptySubstylesPrunesDepthFirst) {
  Style list = Node();
  Style style = Node();
  style.SetPathProperty({child, child, side, mark}, Any(1.0));
  style.SetPathProperty({side, mark}, Any(2.0));
  style.SetProperty(items, std::vector<Style*>{&list});
  ClearSubstyleProperty(*style.GetSubstyle(child, false)->GetSubstyle(child, false), side, mark);
  ClearEmptySubstyles(style);
  // child held only substyles that became empty; the list's empty element stays.
  EXPECT_EQ(GetOverriddenPropertyPaths(style), Sorted({{side, mark}, {items}}));
  EXPECT_EQ(style.GetProperty(items).Get<std::vector<Style*>>().size(), 1u);
}

TEST_F(StyleUtilitiesSubstyleTest, CopySourceSubstylesOnlyWhereTheDestinationHasOne) {
  Style source = Node();
  source.SetPathProperty({child, mark}, Any(2.0));
  source.SetPathProperty({side, mark}, Any(7.0)); // the destination has no side
  for (const bool merge : {false, true}) {
    SCOPED_TRACE(merge ? "merge" : "replace");
    Style destination = Node();
    destination.SetProperty(size, Any(1.0));
    destination.SetPathProperty({child, mark}, Any(1.0));
    destination.SetPathProperty({child, size}, Any(1.0));
    CopySourceSubstylesThatExistsInDestinationStyle(&destination, &source, merge);
    const Style* copied = destination.GetSubstyle(child, false);
    EXPECT_EQ(Number(copied->GetProperty(mark)), 2.0);
    EXPECT_EQ(copied->DoesOverrideProperty(size), merge);
    EXPECT_FALSE(destination.DoesOverrideProperty(side));
    EXPECT_EQ(CheckOwnerLinks(destination), 1);
  }
}

} // namespace
} // namespace Styles
