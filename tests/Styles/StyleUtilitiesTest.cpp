#include <Styles/StyleUtilities.h>

#include "HostBehaviours.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>

namespace Styles {
namespace {

using testing::CheckOwnerLinks;
using testing::Number;
using ZelUtils::Any;

TEST(StyleUtilitiesTest, PathsKeepOrderAndSplitKeepsEmptyPieces) {
  const PropertyKey a(u"a"), b(u"b"), c(u"c"), none = PropertyKey::Empty;
  EXPECT_EQ(MakePath(PropertyPath{b}, PropertyPath{a, c}), PropertyPath({b, a, c}));
  EXPECT_EQ(MakePaths(std::vector<PropertyKey>{b, a, b}),
            (std::vector<PropertyPath>{{b}, {a}, {b}}));
  EXPECT_EQ(SplitPath(u"a.b.c"), PropertyPath({a, b, c}));
  EXPECT_EQ(SplitPath(u".a..b."), PropertyPath({none, a, none, b, none}));
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
  EXPECT_EQ(manager.GetStyleProperty(StyleCategoryName, marked)->GetElementCategoryName(), marked);
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

// Strict mode keeps exactly the ASCII below; lenient mode drops only tab, line
// feed, double quote and tilde. Both trim afterwards.
TEST(StyleUtilitiesTest, ConvertToValidStyleNameFiltersThenTrims) {
  const std::u16string strict =
      u" 0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ()[]{}'|!@#$%^&*-_.,?/+=:;`";
  std::u16string everyAscii = u"x", keptStrict = u"x", keptLenient = u"x";
  for (char16_t c = 1; c < 0x80; ++c) {
    everyAscii.push_back(c);
    if (strict.find(c) != std::u16string::npos)
      keptStrict.push_back(c);
    if (std::u16string_view(u"\t\n\"~").find(c) == std::u16string_view::npos)
      keptLenient.push_back(c);
  }
  // Letters around keep a space at either end from being trimmed.
  EXPECT_EQ(ConvertToValidStyleName(everyAscii + u"x", true),
            ZelStringT<char16_t>(keptStrict + u"x"));
  EXPECT_EQ(ConvertToValidStyleName(everyAscii + u"x", false),
            ZelStringT<char16_t>(keptLenient + u"x"));
  EXPECT_EQ(ConvertToValidStyleName(u"\"  in  \u00e9 \u3000", true), ZelStringT<char16_t>(u"in"));
  EXPECT_EQ(ConvertToValidStyleName(u"~\u3000Caf\u00e9 \t", false),
            ZelStringT<char16_t>(u"Caf\u00e9"));
}

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

  // A node under `parent` holding the given numbers.
  Style Node(Style* parent = nullptr,
             std::initializer_list<std::pair<PropertyPath, double>> values = {}) const {
    Style style(parent, node.Key());
    for (const auto& [path, value] : values)
      style.SetPathProperty(path, Any(value));
    return style;
  }
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
  Style root = Node(nullptr, {{{child, child, side, mark}, 1.0}});
  Style* deep = root.GetSubstyle(child, false)->GetSubstyle(child, false)->GetSubstyle(side, false);
  const SubStyle handle(deep);
  EXPECT_EQ(handle.GetPath(), PropertyPath({child, child, side}));
  EXPECT_EQ(SubStylesToStyles({handle, &root, nullptr}),
            (std::vector<Style*>{deep, &root, nullptr}));

  // Replacing an intermediate substyle frees `deep`; the handle finds the copy.
  Style replacement = Node(nullptr, {{{child, side, mark}, 2.0}});
  root.SetProperty(child, Any(static_cast<const Style*>(&replacement)));
  ASSERT_NE(static_cast<Style*>(handle), nullptr);
  EXPECT_EQ(Number(static_cast<Style*>(handle)->GetProperty(mark)), 2.0);
  root.GetSubstyle(child, false)->GetSubstyle(child, false)->ClearProperty(side);
  EXPECT_EQ(static_cast<Style*>(handle), nullptr);
}

// Paths of own leaves; pruning empty substyles removes what became empty.
TEST_F(StyleUtilitiesSubstyleTest, OverriddenPathsAndPruning) {
  Style list = Node(), style = Node(nullptr, {{{size}, 1.0}, {{child, mark}, 2.0}});
  style.SetPathProperty({child, side, size}, Any(3.0));
  style.SetPathProperty({side, child, child, mark}, Any(4.0));
  style.SetProperty(items, std::vector<Style*>{&list});
  EXPECT_EQ(
      GetOverriddenPropertyPaths(style),
      Sorted({{size}, {items}, {child, mark}, {child, side, size}, {side, child, child, mark}}));
  // One level only: the inner substyle gives its key.
  EXPECT_EQ(GetOverriddenSubstyleProperties(style, child, true),
            Sorted({{child, mark}, {child, side}}));
  EXPECT_EQ(GetOverriddenSubstyleProperties(style, child, false), Sorted({{mark}, {side}}));

  // Empty substyles give no path. Side holds only substyles that became empty:
  // pruning removes it too, but keeps the list's empty element.
  ClearSubstyleProperty(*style.GetSubstyle(side, false)->GetSubstyle(child, false), child, mark);
  EXPECT_EQ(GetOverriddenPropertyPaths(style),
            Sorted({{size}, {items}, {child, mark}, {child, side, size}}));
  ClearEmptySubstyles(style);
  EXPECT_FALSE(style.DoesOverrideProperty(side));
  EXPECT_TRUE(style.GetSubstyle(child, false)->DoesOverrideProperty(side));
  EXPECT_EQ(style.GetProperty(items).Get<std::vector<Style*>>().size(), 1u);
}

TEST_F(StyleUtilitiesSubstyleTest, SubstyleValuesReadInheritedAndWriteOwnSubstyles) {
  Style base = Node(nullptr, {{{child, size}, 4.0}}), derived = Node(&base);
  Any out(7.0);
  EXPECT_FALSE(GetSubstyleProperty(derived, child, mark, out)); // only the default
  EXPECT_EQ(Number(out), 7.0);
  EXPECT_TRUE(GetSubstyleProperty(derived, child, size, out));
  EXPECT_EQ(Number(out), 4.0);

  // The write creates an own substyle with the one value; base's stays as it is.
  SetSubstyleProperty(derived, node.Key(), child, mark, Any(1.0));
  Style* own = GetStyleOrSubstyle(&derived, child, false);
  ASSERT_NE(own, nullptr);
  EXPECT_EQ(GetOverriddenProperties(*own), std::set<PropertyKey>{mark});
  EXPECT_EQ(Number(own->GetProperty(size)), 4.0);
  EXPECT_FALSE(base.GetSubstyle(child, false)->DoesOverrideProperty(mark));
  ClearSubstyleProperty(derived, child, mark);
  ClearSubstyleProperty(derived, side, size); // no own substyle: nothing
  EXPECT_EQ(derived.GetSubstyle(child, false), own);
  EXPECT_TRUE(own->GetProperties().empty());

  // A plain value where a substyle must be; the plain behaviour stores the
  // substyle under "mark", but it never reads as one.
  derived.SetProperty(size, Any(1.0));
  EXPECT_THROW(SetSubstyleProperty(derived, node.Key(), mark, size, Any(1.0)), std::bad_cast);
  EXPECT_THROW(ClearSubstyleProperty(derived, size, mark), std::bad_cast);
}

// shared <- base.child; derived.child inherits through its owner's parent,
// passing over middle's parentless child.
TEST_F(StyleUtilitiesSubstyleTest, OwnerBasedParentsAndOwnerFreeCopies) {
  Style uncategorised; // a lookup ending here has no default to give
  // base.child's mark equals shared's but is found elsewhere.
  Style shared = Node(nullptr, {{{mark}, 3.0}, {{side, mark}, 9.0}}),
        base = Node(nullptr, {{{child, mark}, 3.0}}), middle = Node(&base),
        derived = Node(&middle, {{{child, size}, 5.0}});
  base.GetSubstyle(child, false)->SetParent(&shared);
  GetOrCreateSubstyle(middle, child);
  Style* substyle = derived.GetSubstyle(child, false);
  EXPECT_EQ(GetSubstyleParent(*substyle), &shared);

  std::set<PropertyKey> keys{size};
  std::unique_ptr<Style> clone(
      CreateStyleFromSubstyleWithoutOwnerDependencies(&derived, child, keys));
  ASSERT_NE(clone, nullptr);
  EXPECT_EQ(keys, GetStyleCategoryProperties(derived));
  EXPECT_EQ(clone->GetParent(), &shared);
  // Side comes from where the parent finds it and is left to inheritance.
  EXPECT_EQ(GetOverriddenProperties(*clone), (std::set<PropertyKey>{mark, size}));
  EXPECT_EQ(Number(clone->GetProperty(mark)), 3.0);
  EXPECT_EQ(CreateStyleFromSubstyleWithoutOwnerDependencies(&derived, side, keys), nullptr);

  // A lookup that throws midway still frees the clone: the marks show a leak.
  base.GetSubstyle(child, false)->SetParent(&uncategorised);
  EXPECT_THROW(CreateStyleFromSubstyleWithoutOwnerDependencies(&base, child, keys), std::exception);
}

TEST_F(StyleUtilitiesSubstyleTest, ClearMatchingInheritedPropertiesKeepsOnlyDifferences) {
  Style uncategorised, lone = Node(nullptr, {{{size}, 10.0}});
  ClearMatchingInheritedProperties(lone);
  EXPECT_TRUE(lone.DoesOverrideProperty(size)); // nothing to inherit from

  // Size and the child substyle equal base's.
  Style base = Node(nullptr, {{{size}, 1.0}, {{child, mark}, 4.0}});
  Style derived = Node(&base, {{{size}, 1.0}, {{mark}, 2.0}, {{child, mark}, 4.0}});
  derived.SetPathProperty({side, size}, Any(10.0));
  derived.SetPathProperty({side, mark}, Any(6.0));
  // Through its owner's parent the side substyle inherits the default size.
  ClearMatchingInheritedProperties(*derived.GetSubstyle(side, false));
  ClearMatchingInheritedProperties(derived);
  EXPECT_EQ(GetOverriddenPropertyPaths(derived), Sorted({{mark}, {side, mark}}));
  CheckOwnerLinks(derived);
  // Values moved aside before a lookup throws are freed, not leaked.
  derived.SetParent(&uncategorised);
  EXPECT_THROW(ClearMatchingInheritedProperties(derived), std::exception);
}

TEST_F(StyleUtilitiesSubstyleTest, ForEachSubStyleWalksOneLevelUntilFalse) {
  Style style = Node(nullptr, {{{child, child, mark}, 2.0}, {{side, mark}, 3.0}});
  Style *first = style.GetSubstyle(child, false), *second = style.GetSubstyle(side, false);
  std::vector<Style*> seen;
  const auto visit = [&](Style* s) { return seen.push_back(s), s != &style; };
  EXPECT_TRUE(ForEachSubStyle(&style, visit, false, {}));
  EXPECT_TRUE(ForEachSubStyle(&style, visit, false, {side, mark, child}));
  EXPECT_FALSE(ForEachSubStyle(&style, visit, true, {}));
  EXPECT_EQ(seen, (std::vector<Style*>{first, second, second, first, &style}));
  EXPECT_TRUE(ForEachSubStyle(nullptr, {}, true, {}));
}

TEST_F(StyleUtilitiesSubstyleTest, CopySourceSubstylesOnlyWhereTheDestinationHasOne) {
  // The destination has no side.
  Style source = Node(nullptr, {{{child, mark}, 2.0}, {{side, mark}, 7.0}});
  for (const bool merge : {false, true}) {
    SCOPED_TRACE(merge ? "merge" : "replace");
    Style destination = Node(nullptr, {{{child, mark}, 1.0}, {{child, size}, 1.0}});
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
