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
  // A paragraph style under `parent` holding the given numbers.
  Style* Para(Style* parent = nullptr,
              std::initializer_list<std::pair<PropertyPath, double>> values = {}) {
    Style* style = Make(parent);
    for (const auto& [path, value] : values)
      style->SetPathProperty(path, Any(value));
    return style;
  }
  const Any& Default(const ScopedCategory& category, const PropertyKey& key) {
    return GetStyleManager().GetDefaultValue(category.Key(), key);
  }

  ScopedCategory corner, border, para;
  PropertyKey radius, width, cornerKey, size, indent, borderKey;
  const PropertyKey unregistered{u"StyleTest.unregistered"};
  std::vector<std::unique_ptr<Style>> owned;
};

TEST_F(StyleTest, LookupFallsBackThroughParentsToTheDefaultObject) {
  Style* middle = Para(Para(nullptr, {{{size}, 12.0}}), {{{size}, 14.0}});
  Style* leaf = Para(middle);
  EXPECT_EQ(&leaf->GetProperty(size), &middle->GetProperties().Find(size)[0]);
  // Nobody sets indent: the category's default object itself comes back.
  EXPECT_EQ(&leaf->GetProperty(indent), &Default(para, indent));
  Any out(u"untouched");
  EXPECT_FALSE(leaf->GetProperty(indent, out));
  EXPECT_FALSE(leaf->GetInheritedProperty(indent, out));
  EXPECT_EQ(out, Any(u"untouched"));
  // Own values are not part of the inherited lookup.
  leaf->SetProperty(size, Any(20.0));
  EXPECT_EQ(Number(leaf->GetInheritedProperty(size)), 14.0);
  EXPECT_TRUE(leaf->GetOverrideProperty(size, out));
  EXPECT_EQ(Number(out), 20.0);

  // Unregistered keys are never stored; looking one up throws.
  EXPECT_THROW(leaf->GetProperty(unregistered), std::exception);
  leaf->SetProperty(unregistered, Any(1.0));
  EXPECT_EQ(leaf->GetProperties().size(), 1u);
  Style free; // no category
  free.SetProperty(size, 3.0);
  EXPECT_TRUE(free.GetProperties().empty());
}

TEST_F(StyleTest, SettingClearingAndSelfAssignmentDestroyOldValuesOnce) {
  testing::ValueCounts counts;
  ScopedCategory counting(u"StyleTest.Counting");
  const PropertyKey count = counting.Add(u"count", new testing::CountingNumberProperty(0, &counts));
  Style style(nullptr, counting.Key());
  style.SetProperty(count, Any(1.0));
  style.SetProperty(count, Any(2.0)); // replaces: the old value is destroyed
  EXPECT_EQ(counts.destroyed, 1);
  const Any empty;
  style.SetProperty(count, empty); // copying form: destroys, then clears
  EXPECT_EQ(counts.destroyed, 2);
  EXPECT_FALSE(style.DoesOverrideProperty(count));
  style.SetProperty(count, Any(3.0));
  style.SetProperty(count, Any()); // moving form: removes without destroying
  EXPECT_EQ(counts.destroyed, 2);
  EXPECT_FALSE(style.DoesOverrideProperty(count));
  style.SetProperty(count, Any(4.0));
  EXPECT_TRUE(style.ClearProperty(count));
  EXPECT_EQ(counts.destroyed, 3);

  // Self-assignment changes and destroys nothing.
  style.SetProperty(count, Any(7.0));
  Style& alias = style;
  style = alias;
  style = std::move(alias);
  EXPECT_EQ(counts.destroyed, 3);
  EXPECT_EQ(Number(style.GetProperty(count)), 7.0);
}

// Order: fewer values first, then by value; owners are not compared, external
// strings are. Keys without behaviour have their own rule, checked below.
TEST_F(StyleTest, EqualityAndOrder) {
  Style* a = Para(nullptr, {{{size}, 1.0}});
  Style* b = Para(nullptr, {{{size}, 2.0}});
  Style* more = Para(nullptr, {{{size}, 0.0}, {{indent}, 0.0}});
  EXPECT_TRUE(*a < *b && !(*b < *a));
  EXPECT_TRUE(*b < *more && !(*more < *b));
  b->SetProperty(size, Any(1.0));
  b->SetOwner(a, size);
  EXPECT_TRUE(*a == *b);
  b->SetExternalName(u"x");
  EXPECT_TRUE(*a < *b && *a != *b);
}

// A new category keeps plain values under keys it does not register, with their
// defined behaviour, and frees only the substyles nobody could destroy later.
TEST_F(StyleTest, ChangingCategoryKeepsPlainValuesAndFreesOrphanedSubstyles) {
  // A category unknown at construction leaves none; on rebinding, the old one.
  const PropertyKey unknown(u"StyleTest.NoSuchCategory");
  EXPECT_EQ(Style(nullptr, unknown).GetCategory(), nullptr);
  ScopedCategory other(u"StyleTest.Other");
  const PropertyKey plainBorder = other.Number(u"border");
  Style& s = *Para(nullptr, {{{size}, 12.0}, {{indent}, 3.0}, {{borderKey, width}, 2.0}});
  s.SetCategory(unknown);
  EXPECT_EQ(s.GetCategoryName(), para.Key());
  s.SetCategory(other.Key());
  EXPECT_EQ(s.GetProperties().Find(borderKey), nullptr); // freed: LeakSanitizer checks
  ASSERT_NE(s.GetProperties().Find(size), nullptr);

  Style& u = *Para(nullptr, {{{size}, 13.0}, {{indent}, 3.0}});
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
  Style* p = Para(nullptr, {{{borderKey, width}, 2.0}, {{borderKey, cornerKey, radius}, 5.0}});
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

  // Without a parent anywhere above, the default.
  a->SetParent(nullptr);
  EXPECT_EQ(&aCorner->GetProperty(radius), &Default(corner, radius));

  // Deeper than the two owner keys kept without allocating.
  ScopedCategory outer(u"StyleTest.Outer");
  const PropertyKey paraKey = outer.Add(u"para", new StyleSetProperty(para.Key()));
  Style q(nullptr, outer.Key()), b(&q, outer.Key());
  q.SetPathProperty({paraKey, borderKey, cornerKey, radius}, Any(6.0));
  b.SetPathProperty({paraKey, borderKey, cornerKey, radius}, Any());
  EXPECT_EQ(Number(b.GetPathProperty({paraKey, borderKey, cornerKey, radius})), 6.0);
}

TEST_F(StyleTest, PathsThroughSubstyles) {
  Style* style = Para(nullptr, {{{size}, 1.0}});
  EXPECT_EQ(style->GetSubstyle(borderKey, true), nullptr); // the null default
  EXPECT_THROW(style->GetSubstyle(size, true), std::bad_cast);
  // Leaving the substyles, a path ends at the element categories' defaults.
  EXPECT_EQ(&style->GetPathProperty({borderKey, cornerKey, radius}), &Default(corner, radius));
  // Failing one level down still walks from the root's category, which does
  // not know "corner" and so never reaches the corner category.
  style->SetPathProperty({borderKey, width}, Any(2.0));
  EXPECT_THROW(style->GetPathProperty({borderKey, cornerKey, radius}), std::exception);
  EXPECT_FALSE(style->ClearPathProperty({cornerKey, radius}));

  // With nothing to inherit from, only a forced revert clears; the parent of
  // a substyle's owner gives something to inherit.
  Style* substyle = style->GetSubstyle(borderKey, false);
  EXPECT_FALSE(style->RevertPathProperty({borderKey, width}, false));
  EXPECT_TRUE(style->RevertPathProperty({borderKey, width}, true));
  substyle->SetProperty(width, Any(2.0));
  style->SetParent(Para());
  EXPECT_TRUE(substyle->RevertPathProperty({width}, false));
  EXPECT_FALSE(substyle->DoesOverrideProperty(width));
}

// A copy of selected keys carries inherited values as its own; a path copied
// from a source that lacks a substyle on the way clears the destination's key.
TEST_F(StyleTest, CopyingSelectedProperties) {
  Style* style = Para(Para(nullptr, {{{size}, 12.0}}), {{{indent}, 1.0}});
  std::unique_ptr<Style> copy(style->CopyProperties({size, indent, unregistered}));
  EXPECT_EQ(copy->GetParent(), nullptr);
  EXPECT_EQ(copy->GetProperties().size(), 2u);
  EXPECT_EQ(Number(copy->GetProperty(size)), 12.0);
  style->ClearProperties(copy.get());
  EXPECT_TRUE(style->GetProperties().empty());

  Style* source = Para(style, {{{borderKey, width}, 4.0}});
  style = Para(nullptr, {{{borderKey, cornerKey, radius}, 2.0}, {{size}, 5.0}});
  style->SetProperties({{borderKey, width}, {size}}, source);
  EXPECT_EQ(Number(style->GetPathProperty({borderKey, width})), 4.0);
  EXPECT_FALSE(style->DoesOverrideProperty(size)); // the source only inherits it
  style->SetPathProperty({borderKey, cornerKey, radius}, source);
  EXPECT_FALSE(
      style->GetPathProperty({borderKey, cornerKey}).Get<Style*>()->DoesOverrideProperty(radius));
}

TEST_F(StyleTest, ExternalIdReachesDirectSubstylesOfOrdinaryStylesOnly) {
  ScopedCategory ordinary(u"style");
  const PropertyKey paraKey = ordinary.Add(u"StyleTest.para", new StyleSetProperty(para.Key()));
  Style style(nullptr, StyleCategoryName);
  style.SetPathProperty({paraKey, borderKey, width}, Any(1.0));
  style.SetExternalID(u"E1");
  Style* paraSub = style.GetSubstyle(paraKey, false);
  EXPECT_EQ(paraSub->GetExternalID(), ZelStringT<char16_t>(u"E1"));
  paraSub->SetExternalID(u"E2"); // not an ordinary style: its border stays without
  EXPECT_TRUE(paraSub->GetSubstyle(borderKey, false)->GetExternalID().IsEmpty());
}

// A <- B <- C, each setting its own size; A also sets indent.
class StyleChainTest : public StyleTest {
protected:
  StyleChainTest()
      : a(Para(nullptr, {{{size}, 1.0}, {{indent}, 7.0}})), b(Para(a, {{{size}, 2.0}})),
        c(Para(b)) {}
  static StyleSpan Span(const std::vector<Style*>& styles, bool sorted = false) {
    return StyleSpan(styles, sorted);
  }
  Style *a, *b, *c;
};

TEST_F(StyleChainTest, DependencyQueriesAndRemoval) {
  const std::vector<Style*> onlyA{a};
  EXPECT_FALSE(c->HasDependency(Span(onlyA), true));
  EXPECT_TRUE(c->HasDependency(Span(onlyA), false));
  std::vector<Style*> sorted{a, b};
  std::sort(sorted.begin(), sorted.end(), std::less<>());
  const std::vector<Style*> reversed(sorted.rbegin(), sorted.rend());
  EXPECT_EQ(c->GetDependencies(Span(reversed), false), sorted);
  EXPECT_EQ(c->GetDependencies(Span(reversed), true), std::vector<Style*>{b});
  EXPECT_TRUE(c->HasParentalDependency(Span(onlyA)));
  // A substyle depends on its owner's parent.
  c->SetPathProperty({borderKey, width}, Any(1.0));
  EXPECT_TRUE(c->GetSubstyle(borderKey, false)->HasParentalDependency());
  EXPECT_FALSE(a->HasParentalDependency());

  // Whatever goes, C keeps its effective values: the parent link skips the
  // removed styles and what they gave becomes C's own.
  std::vector<Style*> manyWithB(20, Para()); // long, unsorted, foreign to the chain
  manyWithB[7] = b;
  const std::vector<Style*> onlyB{b}, both{a, b};
  struct Case {
    const char* label;
    std::function<void()> remove;
    Style* parent;
    std::size_t own;
  };
  for (const Case& row : {
           Case{"A is not C's parent", [&] { c->RemoveDependency(Span(onlyA), true); }, b, 0},
           Case{"the parent", [&] { c->RemoveDependency(Span(onlyB), true); }, a, 1},
           Case{"parent and grandparent", [&] { c->RemoveDependency(Span(both), true); }, nullptr,
                2},
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
}

TEST_F(StyleChainTest, MergeAndFlatten) {
  Style* target = Para(nullptr, {{{size}, 50.0}});
  target->MergeProperties(b, false);
  EXPECT_EQ(Number(target->GetProperty(size)), 50.0);
  target->MergeProperties(b, true);
  EXPECT_EQ(Number(target->GetProperty(size)), 2.0);
  // From a parent: only its own values, without linking to it.
  Style* fresh = Para();
  fresh->MergeParentProperties(b);
  EXPECT_FALSE(fresh->DoesOverrideProperty(indent));
  EXPECT_EQ(fresh->GetParent(), nullptr);

  std::set<PropertyKey> flattened{radius}; // accumulates: not cleared
  EXPECT_TRUE(c->Flatten(flattened));
  EXPECT_EQ(c->GetParent(), nullptr);
  EXPECT_EQ(Number(c->GetProperty(size)), 2.0);
  EXPECT_EQ(flattened, (std::set<PropertyKey>{size, indent, radius}));
}

TEST_F(StyleChainTest, OwnerFreeCopiesOfSubstyles) {
  a->SetPathProperty({borderKey, width}, Any(4.0));
  Style* holder = Para(a, {{{borderKey, cornerKey, radius}, 2.0}});
  std::unique_ptr<Style> clone(holder->CreateSubStyleCloneWithNoDependencyOnOwner(borderKey));
  EXPECT_EQ(Number(clone->GetProperty(width)), 4.0);
  EXPECT_EQ(Number(clone->GetPathProperty({cornerKey, radius})), 2.0);

  // Copied to a style of the same parent, the substyle keeps inheriting from
  // A; to a stranger, it must carry A's values itself.
  Style* sibling = Para(a);
  sibling->CopySubstyleProperties(holder, borderKey);
  EXPECT_FALSE(sibling->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));
  Style* stranger = Para();
  stranger->CopySubstyleProperties(holder, borderKey);
  EXPECT_TRUE(stranger->GetSubstyle(borderKey, false)->DoesOverrideProperty(width));
}

// Nodes carry a counted mark, a child node and a list of item nodes.
class StyleTreeTest : public ::testing::Test {
protected:
  using List = std::vector<Style*>;

  StyleTreeTest() : node(u"StyleTest.Node") {
    mark = node.Add(u"mark", new testing::CountingNumberProperty(0, &counts));
    child = node.Add(u"child", new StyleSetProperty(node.Key()));
    items = node.Add(u"items", new StyleArrayProperty(PropertyKey::Empty));
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
  std::unique_ptr<Style> Own(Style* style) { return std::unique_ptr<Style>(style); }

  testing::ValueCounts counts;
  ScopedCategory node;
  PropertyKey mark, child, items;
};

TEST_F(StyleTreeTest, OwnerLinksSurviveEveryOperationThatMovesSubstyles) {
  const std::unique_ptr<Style> base = Tree();
  const std::unique_ptr<Style> tree = Tree(base.get());
  StyleSheet sheet;
  sheet.SetVersion(1);
  JsonValue json;
  tree->Serialize(sheet, json, false);
  const auto copy = [&] { return std::make_unique<Style>(*tree); };
  const auto read = [&] { return Style::Deserialize(sheet, json.Get<Json::Object>(), node.Key()); };
  // Each row edits a copy of the tree or an empty style.
  struct Case {
    const char* label;
    bool fromCopy;
    std::function<void(Style&)> edit;
  };
  for (const Case& c : {
           Case{"copy", true, [](Style&) {}},
           Case{"move", true, [](Style& s) { s = Style(std::move(s)); }},
           Case{"swap", false, [&](Style& s) { s.SwapData(*copy()); }},
           Case{"merge into nothing", false,
                [&](Style& s) { s.MergeProperties(tree.get(), false); }},
           Case{"merge parent", false, [&](Style& s) { s.MergeParentProperties(tree.get()); }},
           Case{"flatten", true, [](Style& s) { s.Flatten(); }},
           Case{"flattened clone", false,
                [&](Style& s) { s = std::move(*Own(tree->CreateFlattenedStyle())); }},
           Case{"remove all dependencies", true, [](Style& s) { s.RemoveAllDependencies(); }},
           Case{"JSON round trip", false, [&](Style& s) { s = std::move(*Own(read())); }},
       }) {
    SCOPED_TRACE(c.label);
    const int live = counts.Live();
    auto result = c.fromCopy ? copy() : std::make_unique<Style>(nullptr, node.Key());
    c.edit(*result);
    EXPECT_EQ(CheckOwnerLinks(*result), 9);
    EXPECT_EQ(Number(Deep(*result, 5)->GetProperty(mark)), 5.0);
    EXPECT_EQ(counts.Live(), live + 10);
    result.reset();
    EXPECT_EQ(counts.Live(), live);
  }
  EXPECT_EQ(CheckOwnerLinks(*tree), 9);

  // A copy keeps the parent but is nobody's substyle; swapping data leaves
  // each style under its own owner.
  EXPECT_EQ(Style(*tree).GetParent(), base.get());
  EXPECT_EQ(Style(*Deep(*tree, 1)).GetOwner(), nullptr);
  Style other(nullptr, node.Key());
  other.SetPathProperty({child, mark}, Any(1.0));
  Style* otherChild = Deep(other, 1);
  Style* first = Deep(*tree, 1);
  first->SwapData(other);
  EXPECT_EQ(first->GetOwner(), tree.get());
  EXPECT_EQ(other.GetOwner(), nullptr);
  EXPECT_EQ(otherChild->GetOwner(), first);
}

TEST_F(StyleTreeTest, OverriddenPathsRevertAndClear) {
  const PropertyKey any(u"*");
  const std::unique_ptr<Style> base = Tree();
  const std::unique_ptr<Style> style = Tree(base.get());
  Style empty(nullptr, node.Key()), onlyParent(&empty, node.Key());
  Style emptyChildWithParent(nullptr, node.Key()); // holds an empty child that has a parent
  GetOrCreateSubstyle(emptyChildWithParent, child)->SetParent(&empty);
  struct Case {
    const char* label;
    const Style* style;
    PropertyPath path;
    bool overrides;
  };
  for (const Case& c : {
           Case{"five deep", style.get(), {child, child, child, child, child, mark}, true},
           Case{"inherited does not count", &onlyParent, {mark}, false},
           Case{"wildcard on values", style.get(), {child, any}, true},
           Case{"wildcard on a missing substyle", &empty, {child, any}, false},
           Case{"wildcard with only a parent", &onlyParent, {any}, true},
           Case{"wildcard on a substyle's parent", &emptyChildWithParent, {any}, true},
       }) {
    SCOPED_TRACE(c.label);
    EXPECT_EQ(c.style->DoesOverridePathProperty(c.path), c.overrides);
  }
  EXPECT_TRUE(emptyChildWithParent.SubstylesHaveAnyParentalRelationships());
  EXPECT_FALSE(style->SubstylesHaveAnyParentalRelationships());

  // Reverting keeps the chain of single substyles, emptied; the list and
  // every mark are gone, and the substyles inherit through their owners again.
  style->SetExternalID(u"E");
  Style* deepest = Deep(*style, 5);
  EXPECT_TRUE(style->RevertAllProperties());
  EXPECT_EQ(CheckOwnerLinks(*style), 5);
  EXPECT_EQ(Deep(*style, 5), deepest);
  EXPECT_TRUE(style->IsEmptyWithEmptySubstyles());
  EXPECT_EQ(counts.Live(), 10);
  EXPECT_FALSE(style->RevertAllProperties());
  EXPECT_EQ(Number(deepest->GetProperty(mark)), 5.0);
  // Clearing keeps the identity but not the parent.
  style->SetProperty(mark, Any(1.0));
  style->Clear();
  EXPECT_TRUE(style->GetProperties().empty());
  EXPECT_EQ(style->GetParent(), nullptr);
  EXPECT_EQ(style->GetExternalID(), ZelStringT<char16_t>(u"E"));
  EXPECT_EQ(counts.Live(), 10);
}

// A number property that is temporary ('t'), deprecated ('d') or needs
// adjusting after reads ('a'); it logs reads and adjustments.
struct FlaggedNumberProperty : StyleProperty {
  FlaggedNumberProperty(char flag, testing::Log* log)
      : StyleProperty(Any(0.0), new ZelPref::NumberConversionPolicy(), &testing::IsNumber),
        flag(flag), log(log) {}
  bool IsTemporary() const override { return flag == 't'; }
  bool IsDeprecated() const override { return flag == 'd'; }
  bool NeedAdjustementsForStyleIO() const override { return flag == 'a'; }
  void AdjustAfterDeserialize(const StyleSheet&, Style* style) const override {
    log->push_back("adjust " + std::to_string(Number(style->GetProperty(GetName()))));
  }
  bool Deserialize(const StyleSheet& sheet, Style* style, const JsonValue& in) const override {
    log->push_back("read " + std::string(GetName().GetView().begin(), GetName().GetView().end()));
    return StyleProperty::Deserialize(sheet, style, in);
  }
  char flag;
  testing::Log* log;
};

Json::Object Parse(const char16_t* text) {
  Json::Value document;
  ZelStringT<char16_t> error;
  EXPECT_TRUE(Json::Parse(text, document, error));
  return document.Get<Json::Object>();
}

TEST_F(StyleTest, JsonWritesFixedMembersFirstAndReadsDeprecatedLast) {
  testing::Log log;
  const PropertyKey scratch = para.Add(u"scratch", new FlaggedNumberProperty('t', &log));
  const PropertyKey oldSize = para.Add(u"oldSize", new FlaggedNumberProperty('d', &log));
  para.Add(u"adjusted", new FlaggedNumberProperty('a', &log));
  StyleSheet sheet;
  sheet.SetVersion(1); // the manager's initial version -1 is older than any property
  Style* x = new Style(nullptr, para.Key());
  sheet.AddStyle(u"x", x, false);
  Style* style = Para(x, {{{size}, 12.0}, {{scratch}, 1.0}});
  style->SetExternalID(u"E");
  style->SetExternalName(u"Orig");
  EXPECT_EQ(style->Serialize(sheet, false, false),
            ZelStringT<char16_t>(
                u"{\"inherits\":\"x\",\"id\":\"E\",\"original\":\"Orig\",\"size\":\"12\"}"));
  EXPECT_NE(style->Serialize(sheet, false, true).GetView().find(u"\"scratch\":\"1\""),
            std::u16string_view::npos);
  // A parent the sheet does not hold is not written.
  EXPECT_EQ(style->Serialize(StyleSheet(), false, false).GetView().find(u"inherits"),
            std::u16string_view::npos);

  // Reading skips what it cannot use; names of parents ignore case.
  const auto read = [&](const char16_t* text) {
    owned.emplace_back(Style::Deserialize(sheet, Parse(text), para.Key()));
    return owned.back().get();
  };
  style = read(u"{\"inherits\":\"X\",\"id\":\"\",\"original\":7,\"nonsense\":\"1\","
               u"\"oldSize\":\"1\",\"adjusted\":\"5\",\"size\":\"2\"}");
  EXPECT_EQ(style->GetParent(), x);
  EXPECT_TRUE(style->GetExternalID().IsEmpty() && style->GetExternalName().IsEmpty());
  EXPECT_EQ(style->GetProperties().size(), 3u);
  EXPECT_EQ(Number(style->GetProperty(oldSize)), 1.0);
  EXPECT_EQ(log, (std::vector<std::string>{"read adjusted", "read oldSize", "adjust 5.000000"}));
  EXPECT_THROW(read(u"{\"size\":\"big\"}"), ZelPref::Detail::BadConversion);

  // Reading into a style of the sheet: never its own parent, never a cycle.
  Style* y = new Style(x, para.Key());
  sheet.AddStyle(u"Y", y, false);
  x->DeserializeJson(sheet, Parse(u"{\"inherits\":\"Y\"}"));
  EXPECT_EQ(x->GetParent(), nullptr);
  y->DeserializeJson(sheet, Parse(u"{\"inherits\":\"y\"}"));
  EXPECT_EQ(y->GetParent(), x);

  // A document holds temporary values only when asked; substyles never do.
  const PropertyKey scratchWidth =
      border.Add(u"scratchWidth", new FlaggedNumberProperty('t', &log));
  Style* z = new Style(nullptr, para.Key());
  z->SetProperty(scratch, Any(1.0));
  z->SetPathProperty({borderKey, scratchWidth}, Any(2.0));
  sheet.AddStyle(u"z", z, false);
  for (const bool includeTemporary : {false, true}) {
    ZelStringT<char16_t> text;
    sheet.ExportToString(text, includeTemporary);
    EXPECT_EQ(text.GetView().find(u"\"scratch\":\"1\"") != std::u16string_view::npos,
              includeTemporary);
    EXPECT_EQ(text.GetView().find(u"scratchWidth"), std::u16string_view::npos);
  }
}

} // namespace
} // namespace Styles
