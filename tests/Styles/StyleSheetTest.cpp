#include <Styles/StyleSheet.h>

#include "HostBehaviours.h"

#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleUtilities.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/Stream.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <climits>
#include <functional>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <typeinfo>
#include <vector>

namespace Styles {
namespace {

using Text = ZelStringT<char16_t>;
using Names = std::vector<Text>;
using ZelUtils::Any;

const PropertyKey kParagraph(u"sheetTestParagraph");
const PropertyKey kCharacter(u"sheetTestCharacter");
const PropertyKey kSize(u"size");
const PropertyKey kFont(u"font");
const PropertyKey kTag(u"tag");
const PropertyKey kNested(u"nested");
const PropertyKey kRuns(u"runs");

// Every style made by MakeStyle carries a tag whose destruction is recorded
// here, which makes ownership visible.
Names& DestroyedTags() {
  static Names tags;
  return tags;
}

bool IsNumber(const Any& value) { return value.GetIf<double>() != nullptr; }
bool IsText(const Any& value) { return value.GetIf<Text>() != nullptr; }

class TagProperty : public StyleProperty {
public:
  TagProperty() : StyleProperty(Any(Text()), new ZelPref::TextConversionPolicy, &IsText) {}
  void DestroyPropertyData(const Any& value) const override {
    if (const Text* tag = value.GetIf<Text>())
      DestroyedTags().push_back(*tag);
  }
};

// A document `depth` objects deep: its character style "C" holds substyles
// nested in substyles down to the last level.
Text NestedSubstyles(int depth) {
  std::u16string text = uR"({"sheetTestCharacter": {"C": )";
  for (int level = 3; level < depth; ++level)
    text += uR"({"nested": )";
  text += u"{}" + std::u16string(depth - 3, u'}') + u"}}";
  return Text(text);
}

class StyleSheetTest : public ::testing::Test {
protected:
  void SetUp() override {
    StyleManager& manager = GetStyleManager();
    m_savedVersion = manager.GetCurrentVersion();
    manager.SetCurrentVersion(7);
    for (const PropertyKey& category : {kParagraph, kCharacter}) {
      manager.RegisterCategory(category, category == kParagraph ? u"Paragraph" : u"Character",
                               false, false);
      manager.RegisterProperty(
          category, kSize,
          new StyleProperty(Any(12.0), new ZelPref::NumberConversionPolicy, &IsNumber));
      manager.RegisterProperty(
          category, kFont,
          new StyleProperty(Any(Text(u"Serif")), new ZelPref::TextConversionPolicy, &IsText));
      manager.RegisterProperty(category, kTag, new TagProperty);
    }
    // Paragraphs hold a character substyle (keyed by its category) and a list
    // of them; characters nest in characters.
    RegisterSubstyleSet(kParagraph, kCharacter);
    manager.RegisterProperty(kParagraph, kRuns, new StyleArrayProperty(kCharacter));
    manager.RegisterProperty(kCharacter, kNested, new StyleSetProperty(kCharacter));
    manager.RegisterProperty(kCharacter, kRuns, new StyleArrayProperty(kCharacter));
    DestroyedTags().clear();
  }
  void TearDown() override {
    StyleManager& manager = GetStyleManager();
    manager.DeregisterCategory(kParagraph);
    manager.DeregisterCategory(kCharacter);
    manager.ClearImportStyleInfo();
    manager.SetCurrentVersion(m_savedVersion);
  }

  static Style* MakeStyle(const Text& tag, Style* parent = nullptr,
                          const PropertyKey& category = kParagraph) {
    Style* style = new Style(parent, category);
    style->SetProperty(kTag, tag);
    return style;
  }
  // A style tagged `name` and filed under it; the sheet owns it.
  static Style* Add(StyleSheet& sheet, const Text& name, Style* parent = nullptr,
                    const PropertyKey& category = kParagraph) {
    Style* style = MakeStyle(name, parent, category);
    sheet.AddStyle(name, style, false);
    return style;
  }
  static Text Export(const StyleSheet& sheet) {
    Text text;
    sheet.ExportToString(text, false);
    return text;
  }

private:
  int m_savedVersion = 0;
};

// Whatever leaves the sheet by a clash or a replacement, the styles that
// referred to it follow the name; a style the sheet holds is never destroyed
// by being offered again.
TEST_F(StyleSheetTest, AddStyleClashKeepsOrReplaces) {
  StyleSheet sheet;
  Style* old = Add(sheet, u"red");
  Style* child = Add(sheet, u"child", old);
  Style* offered = MakeStyle(u"offered");
  Style* follower = Add(sheet, u"follower", offered);
  EXPECT_EQ(sheet.AddStyle(u"Red", offered, false), nullptr);
  EXPECT_EQ(DestroyedTags(), Names{u"offered"});
  EXPECT_EQ(sheet.GetStyle(u"RED"), old);
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"child", u"follower", u"red"}));
  EXPECT_EQ(follower->GetParent(), old);

  Style* newer = MakeStyle(u"newer");
  newer->SetProperty(kSize, 30.0);
  std::unique_ptr<Style> previous(sheet.AddStyle(u"Red", newer, true));
  EXPECT_EQ(previous.get(), old);
  EXPECT_EQ(DestroyedTags(), Names{u"offered"});
  EXPECT_EQ(sheet.GetStyle(u"red"), newer);
  EXPECT_EQ(sheet.GetStyleName(old), Text());
  EXPECT_EQ(child->GetParent(), newer);
  EXPECT_EQ(follower->GetParent(), newer);

  // A replacement that inherits from the style it replaces takes over its
  // values instead of inheriting from itself.
  Style* derived = MakeStyle(u"derived", newer);
  std::unique_ptr<Style> replaced(sheet.AddStyle(u"red", derived, true));
  EXPECT_EQ(replaced.get(), newer);
  EXPECT_EQ(derived->GetParent(), nullptr);
  EXPECT_EQ(derived->GetProperty(kSize).Get<double>(), 30.0);
  EXPECT_EQ(child->GetParent(), derived);

  EXPECT_EQ(sheet.AddStyle(u"RED", derived, false), nullptr);
  EXPECT_EQ(sheet.AddStyle(u"RED", derived, true), nullptr);      // re-spelled only
  EXPECT_EQ(sheet.AddStyle(u"Crimson", derived, false), nullptr); // moves
  EXPECT_EQ(DestroyedTags(), Names{u"offered"});
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"child", u"Crimson", u"follower"}));
  EXPECT_EQ(sheet.GetStyleName(derived), Text(u"Crimson"));
}

TEST_F(StyleSheetTest, NamesIgnoreCaseBeyondAsciiAndRenameRules) {
  StyleSheet sheet;
  Style* anger = Add(sheet, u"\u00c4rger");
  Style* blue = Add(sheet, u"blue");
  EXPECT_EQ(sheet.GetStyle(u"\u00e4RgEr"), anger);
  EXPECT_EQ(sheet.GetStyle(u"Arger"), nullptr);
  EXPECT_EQ(sheet.GetStyleName(anger), Text(u"\u00c4rger"));

  sheet.RenameStyle(u"\u00e4rger", u"\u00e4RGER"); // a change of case re-spells
  sheet.RenameStyle(u"\u00c4rger", u"Blue");       // taken: nothing happens
  sheet.RenameStyle(u"Missing", u"Green");
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"blue", u"\u00e4RGER"}));
  sheet.RenameStyle(u"BLUE", u"Crimson");
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"Crimson", u"\u00e4RGER"}));
  EXPECT_EQ(sheet.GetStyle(u"crimson"), blue);
  EXPECT_EQ(sheet.GetStyleName(anger), Text(u"\u00e4RGER"));

  // Names that a document would write alike (an unpaired surrogate is written
  // as U+FFFD) are one name, so a round trip cannot merge two styles.
  const Text high = Text(u"x") + Text(std::u16string(1, char16_t(0xD800)));
  const Text low = Text(u"X") + Text(std::u16string(1, char16_t(0xDC00)));
  Style* lone = Add(sheet, high);
  EXPECT_EQ(sheet.GetStyle(u"x\uFFFD"), lone);
  EXPECT_EQ(sheet.AddStyle(low, MakeStyle(u"low"), false), nullptr);
  EXPECT_EQ(sheet.GetStyle(low), lone);
  StyleSheet copy;
  ASSERT_TRUE(copy.ImportFromString(Export(sheet), true));
  EXPECT_EQ(copy.GetStyles().size(), sheet.GetStyles().size());
  EXPECT_NE(copy.GetStyle(high), nullptr);
}

// RemoveStyle only detaches; DeleteStyles first makes every style of the sheet
// drop its references, then destroys only the sheet's own styles.
TEST_F(StyleSheetTest, RemoveDetachesAndDeleteRepairs) {
  StyleSheet sheet, other;
  Style* foreign = Add(other, u"Foreign");
  foreign->SetProperty(kFont, Text(u"Mono"));
  Style* base = Add(sheet, u"Base");
  base->SetProperty(kFont, Text(u"Sans"));
  Style* middle = Add(sheet, u"Middle", base);
  middle->SetProperty(kSize, 14.0);
  Style* leaf = Add(sheet, u"Leaf", middle);
  Style* adopted = Add(sheet, u"Adopted", foreign);
  EXPECT_FALSE(sheet.RemoveStyle(static_cast<Style*>(nullptr)));
  EXPECT_FALSE(sheet.RemoveStyle(foreign));
  EXPECT_EQ(sheet.RemoveStyle(Text(u"nothing")), nullptr);

  std::vector<Style*> doomed{nullptr, foreign, middle};
  sheet.DeleteStyles(StyleSpan(doomed, false));
  EXPECT_EQ(DestroyedTags(), Names{u"Middle"});
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"Adopted", u"Base", u"Leaf"}));
  EXPECT_EQ(other.GetStyle(u"Foreign"), foreign);
  EXPECT_EQ(leaf->GetParent(), base);
  EXPECT_EQ(leaf->GetProperty(kSize).Get<double>(), 14.0);
  EXPECT_EQ(leaf->GetProperty(kFont).Get<Text>(), Text(u"Sans"));
  EXPECT_EQ(adopted->GetParent(), nullptr);
  EXPECT_EQ(adopted->GetProperty(kFont).Get<Text>(), Text(u"Mono"));

  std::unique_ptr<Style> removed(sheet.RemoveStyle(Text(u"base")));
  EXPECT_EQ(removed.get(), base);
  EXPECT_TRUE(sheet.RemoveStyle(leaf));
  EXPECT_EQ(leaf->GetParent(), base); // not repaired
  EXPECT_EQ(sheet.GetStyleNames(), Names{u"Adopted"});
  EXPECT_EQ(DestroyedTags(), Names{u"Middle"});
  delete leaf;
}

TEST_F(StyleSheetTest, QueriesFollowNameOrderAndSkipWhatIsMissing) {
  StyleSheet sheet;
  Style* base = Add(sheet, u"base");
  Style* child = Add(sheet, u"Child", base);
  Style* grandchild = Add(sheet, u"grandchild", child);
  Style* note = Add(sheet, u"note", nullptr, kCharacter);
  note->SetExternalID(u"ID");
  note->SetExternalName(u"Name");

  EXPECT_EQ(sheet.GetStyles(), (std::vector<Style*>{base, child, grandchild, note}));
  EXPECT_EQ(sheet.GetStylesByName({u"NOTE", u"missing", u"base"}),
            (std::vector<Style*>{note, base}));
  EXPECT_EQ(sheet.GetStylesByCategory(kCharacter), std::vector<Style*>{note});
  EXPECT_EQ(sheet.GetStyleNames(kParagraph), (Names{u"base", u"Child", u"grandchild"}));
  const StyleSheet::NameIndex children = sheet.GetChildStyles(base); // direct only
  ASSERT_EQ(children.size(), 1u);
  EXPECT_EQ(children.begin()->second, child);
  EXPECT_TRUE(sheet.GetChildStyles(nullptr).empty());

  StyleSheet::CategoryStyleMap byCategory{{kTag, {}}};
  sheet.GenerateCategoryStyleMap(byCategory);
  EXPECT_EQ(byCategory.size(), 2u);
  EXPECT_EQ(byCategory[kParagraph].size(), 3u);

  const std::vector<Style*> doomed{base};
  std::vector<Style*> dependents{note};
  sheet.GetDependencies(StyleSpan(doomed, true), dependents); // appends, in name order
  EXPECT_EQ(dependents, (std::vector<Style*>{note, base, child, grandchild}));

  EXPECT_EQ(sheet.GetExternalStyleAlias(u"ID", u"Name"), note);
  EXPECT_EQ(sheet.GetExternalStyleAlias(u"ID", u"name"), nullptr);
  EXPECT_EQ(sheet.GetExternalStyleAlias(u"", u""), nullptr);
}

TEST_F(StyleSheetTest, UnusedNamesStartFromCategoryUiName) {
  StyleSheet sheet;
  Add(sheet, u"paragraph 1");
  Add(sheet, u"Note");
  EXPECT_EQ(sheet.GetUnusedStyleName(kParagraph.GetString()), Text(u"Paragraph 2"));
  EXPECT_EQ(sheet.GetUnusedStyleName(kCharacter.GetString()), Text(u"Character 1"));
  EXPECT_EQ(sheet.GetUnusedStyleName(u"Title"), Text(u"Title"));
  EXPECT_EQ(sheet.GetUnusedStyleName(u"NOTE"), Text(u"NOTE 1"));
}

TEST_F(StyleSheetTest, ClearKeepsExternalIdAndResetsVersion) {
  StyleSheet sheet;
  sheet.SetVersion(2);
  sheet.SetExternalID(u"src");
  Add(sheet, u"a");
  sheet.Clear();
  EXPECT_EQ(DestroyedTags(), Names{u"a"});
  EXPECT_TRUE(sheet.GetStyles().empty());
  EXPECT_EQ(sheet.GetVersion(), 7);
  EXPECT_EQ(sheet.GetExternalID(), Text(u"src"));
}

// MergeIn walks the target's own index and forgets the source's names; both
// halves are kept as hosts have always seen them.
TEST_F(StyleSheetTest, MergeInKeepsBothSheetsSound) {
  for (const bool replace : {false, true}) {
    SCOPED_TRACE(replace);
    {
      StyleSheet target, source;
      Style* incoming = Add(source, u"In");
      Style* own = Add(target, u"Own");
      target.MergeIn(source, replace);
      // This sheet's own styles go back where they were, nothing destroyed.
      EXPECT_TRUE(DestroyedTags().empty());
      EXPECT_EQ(target.GetStyle(u"own"), own);
      EXPECT_EQ(target.GetStyle(u"In"), nullptr);
      // The source forgets the names but still owns its styles.
      EXPECT_TRUE(source.GetStyles().empty());
      EXPECT_EQ(source.GetStyleName(incoming), Text(u"In"));
    }
    EXPECT_EQ(DestroyedTags(), (Names{u"In", u"Own"}));
    DestroyedTags().clear();
  }
}

TEST_F(StyleSheetTest, CopyContentsFromCopiesDeeplyAndTakesVersion) {
  struct Context : IStyleSheetDuplicationContext {
    bool OnStyleDuplicated(Style* style, int reserved) override {
      calls.emplace_back(style, reserved);
      return false;
    }
    std::vector<std::pair<Style*, int>> calls;
  } context;
  StyleSheet source, copy;
  source.SetVersion(3);
  Style* base = Add(source, u"Base");
  base->SetProperty(kSize, 9.0);
  Add(source, u"Body", base);
  Add(copy, u"Old");

  copy.CopyContentsFrom(source, &context);
  EXPECT_EQ(DestroyedTags(), Names{u"Old"});
  EXPECT_EQ(copy.GetVersion(), 3);
  const std::vector<Style*> styles = copy.GetStyles();
  ASSERT_EQ(styles.size(), 2u);
  EXPECT_EQ(context.calls, (std::vector<std::pair<Style*, int>>{{styles[0], 0}, {styles[1], 0}}));
  EXPECT_EQ(styles[1]->GetParent(), styles[0]);
  EXPECT_NE(styles[0], base);
  EXPECT_EQ(styles[1]->GetProperty(kSize).Get<double>(), 9.0);
  source.SetVersion(-5); // a version the document does not carry still reaches the copy
  copy.CopyContentsFrom(source, nullptr);
  EXPECT_EQ(copy.GetVersion(), -5);
}

TEST_F(StyleSheetTest, DocumentVersionRules) {
  struct Case {
    const char16_t* document;
    int version;
    const char16_t* exported;
  };
  for (const Case& c :
       {Case{uR"({"version": 3.9})", 3, uR"({"version":3})"},
        Case{uR"({"version": -2.5})", -2, u"{}"}, Case{uR"({"version": "3"})", 0, u"{}"},
        Case{uR"({"Version": 3})", 0, u"{}"}, Case{u"{}", 0, u"{}"},
        Case{uR"({"version": 1e300})", INT_MAX, uR"({"version":2147483647})"},
        Case{uR"({"version": -1e300})", INT_MIN, u"{}"}}) {
    SCOPED_TRACE(c.version);
    StyleSheet sheet;
    EXPECT_TRUE(sheet.ImportFromString(c.document, true));
    EXPECT_EQ(sheet.GetVersion(), c.version);
    EXPECT_EQ(Export(sheet), Text(c.exported));
  }
}

// The ID is applied in both passes, so a style read gets the ID in force
// where its category stands.
TEST_F(StyleSheetTest, DocumentIdIsTakenOnlyBySheetWithOne) {
  const Text document = uR"({"id": "B", "sheetTestParagraph": {"P": {"id": "own"}}, "id": "C"})";
  StyleSheet plain, linked;
  linked.SetExternalID(u"A");
  ASSERT_TRUE(plain.ImportFromString(document, true));
  ASSERT_TRUE(linked.ImportFromString(document, true));
  EXPECT_EQ(plain.GetExternalID(), Text());
  EXPECT_EQ(plain.GetStyle(u"P")->GetExternalID(), Text(u"own"));
  EXPECT_EQ(linked.GetExternalID(), Text(u"C"));
  EXPECT_EQ(linked.GetStyle(u"P")->GetExternalID(), Text(u"B"));
}

TEST_F(StyleSheetTest, ImportResolvesParentsInAnyOrderWithBookkeeping) {
  WImportStyleInfo& info = GetStyleManager().GetImportStyleInfo();
  info.names.insert(u"Skipped");
  info.renames.emplace(u"Old", u"Base");
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(uR"({
    "sheetTestCharacter": {"Strong": {"inherits": "base"}},
    "sheetTestParagraph": {"Child": {"inherits": "Base"}, "Base": {"size": "20"}, "Skipped": {},
                           "A": {"inherits": "Skipped"}, "B": {"inherits": "Old"}}})",
                                     true));
  Style* base = sheet.GetStyle(u"Base");
  ASSERT_NE(base, nullptr);
  EXPECT_EQ(sheet.GetStyle(u"Child")->GetParent(), base);
  EXPECT_EQ(sheet.GetStyle(u"Child")->GetProperty(kSize).Get<double>(), 20.0);
  EXPECT_EQ(sheet.GetStyle(u"Strong")->GetParent(), base);
  EXPECT_EQ(sheet.GetStyle(u"Strong")->GetCategoryName(), kCharacter);
  EXPECT_EQ(sheet.GetStyle(u"A")->GetParent(), nullptr);
  EXPECT_EQ(sheet.GetStyle(u"B")->GetParent(), base);
}

// A clash with a style already in the sheet is decided by replace; the same
// name in two categories makes one style that both members are read into.
TEST_F(StyleSheetTest, ImportReplaceDecidesWhoWins) {
  for (bool replace : {false, true}) {
    SCOPED_TRACE(replace);
    DestroyedTags().clear();
    StyleSheet sheet;
    Style* body = Add(sheet, u"Body");
    body->SetProperty(kSize, 10.0);
    Style* child = Add(sheet, u"Child", body);
    ASSERT_TRUE(sheet.ImportFromString(uR"({"sheetTestParagraph": {"body": {"size": "30"},
                                                                  "X": {"size": "11"}},
                                            "sheetTestCharacter": {"x": {"font": "Mono"}}})",
                                       replace));
    EXPECT_EQ(DestroyedTags(), replace ? Names{u"Body"} : Names{});
    EXPECT_EQ(sheet.GetStyleNames(),
              replace ? (Names{u"body", u"Child", u"x"}) : (Names{u"Body", u"Child", u"X"}));
    EXPECT_EQ(sheet.GetStyle(u"Body")->GetProperty(kSize).Get<double>(), replace ? 30.0 : 10.0);
    // The child of a replaced style follows its name, in memory and on disk.
    EXPECT_EQ(child->GetParent(), sheet.GetStyle(u"Body"));
    EXPECT_EQ(child->GetProperty(kSize).Get<double>(), replace ? 30.0 : 10.0);
    EXPECT_NE(Export(sheet).GetView().find(u"\"Child\":{\"inherits\""), std::u16string_view::npos);
    Style* x = sheet.GetStyle(u"X");
    EXPECT_EQ(x->GetCategoryName(), kCharacter);
    EXPECT_EQ(x->GetProperty(kSize).Get<double>(), 11.0);
    EXPECT_EQ(x->GetProperty(kFont).Get<Text>(), Text(u"Mono"));
  }
}

// Each "inherits" is refused exactly when, as the document is read, it would
// make a style its own ancestor: checked against a plain model on random
// documents that repeat names across categories and "inherits" in a style.
TEST_F(StyleSheetTest, ImportRefusesExactlyTheLinksThatCloseCycles) {
  std::mt19937 random(11);
  const auto name = [](int i) { return u"s" + std::u16string(1, static_cast<char16_t>(u'a' + i)); };
  for (int round = 0; round < 400; ++round) {
    const int count = 2 + static_cast<int>(random() % 10);
    // Style members in document order, each with the styles it names.
    std::vector<std::pair<int, std::vector<int>>> members;
    std::vector<bool> present(count, false);
    std::u16string document = u"{";
    for (const char16_t* category : {u"sheetTestParagraph", u"sheetTestCharacter"}) {
      document += std::u16string(document.size() > 1 ? u",\"" : u"\"") + category + u"\": {";
      bool first = true;
      for (int i = 0; i < count; ++i) {
        if (random() % 3 == 0)
          continue;
        present[i] = true;
        members.emplace_back(i, std::vector<int>());
        document += (first ? u"\"" : u",\"") + name(i) + u"\": {";
        first = false;
        for (int k = 0, links = static_cast<int>(random() % 3); k < links; ++k) {
          const int j = static_cast<int>(random() % count);
          members.back().second.push_back(j);
          document += (k ? u",\"inherits\": \"" : u"\"inherits\": \"") + name(j) + u"\"";
        }
        document += u"}";
      }
      document += u"}";
    }
    document += u"}";
    // The model: a link holds unless the style is the named one or one of its
    // ancestors; a name that no member lists is not in the sheet.
    std::vector<int> parents(count, -1);
    for (const auto& [i, named] : members) {
      for (const int j : named) {
        bool cycle = false;
        for (int a = j; a >= 0 && !cycle; a = parents[a])
          cycle = a == i;
        if (!cycle && present[j])
          parents[i] = j;
      }
    }
    SCOPED_TRACE(::testing::Message() << "round " << round);
    StyleSheet sheet;
    ASSERT_TRUE(sheet.ImportFromString(Text(document), true));
    for (int i = 0; i < count; ++i) {
      if (!present[i])
        continue;
      const Style* style = sheet.GetStyle(Text(name(i)));
      ASSERT_NE(style, nullptr);
      EXPECT_EQ(style->GetParent(),
                parents[i] < 0 ? nullptr : sheet.GetStyle(Text(name(parents[i]))));
    }
  }
  // A style of the sheet that followed a replaced one cannot become its
  // heir's parent.
  StyleSheet sheet;
  Add(sheet, u"Child", Add(sheet, u"Body"));
  ASSERT_TRUE(
      sheet.ImportFromString(uR"({"sheetTestParagraph": {"Body": {"inherits": "Child"}}})", true));
  EXPECT_EQ(sheet.GetStyle(u"Child")->GetParent(), sheet.GetStyle(u"Body"));
  EXPECT_EQ(sheet.GetStyle(u"Body")->GetParent(), nullptr);
}

// A chain of 200,000 styles, each inheriting from the one before, goes
// through import in either order, export, lookup, every dependency query,
// DeleteStyles and Flatten in linear time and constant stack.
TEST_F(StyleSheetTest, LongChainsStayLinearAndShallow) {
  constexpr int kLength = 200000;
  const auto name = [](int i) { return u"S" + Text::FormatInternal("%d", i).GetStdString(); };
  // Every seventh style sets the size to its number.
  const auto effectiveSize = [](int i) { return static_cast<double>(i - i % 7); };
  Text exported;
  for (const bool rootFirst : {true, false}) {
    SCOPED_TRACE(rootFirst);
    std::u16string document = u"{\"sheetTestParagraph\": {";
    for (int k = 0; k < kLength; ++k) {
      const int i = rootFirst ? k : kLength - 1 - k;
      document += (k ? u",\"" : u"\"") + name(i) + u"\": {";
      if (i)
        document += u"\"inherits\": \"" + name(i - 1) + (i % 7 ? u"\"" : u"\", ");
      if (i % 7 == 0)
        document += u"\"size\": \"" + Text::FormatInternal("%d", i).GetStdString() + u"\"";
      document += u"}";
    }
    document += u"}}";
    StyleSheet sheet;
    ASSERT_TRUE(sheet.ImportFromString(Text(document), true));
    EXPECT_EQ(sheet.GetStyle(name(kLength - 1))->GetParent(), sheet.GetStyle(name(kLength - 2)));
    EXPECT_EQ(sheet.GetStyle(name(1))->GetParent(), sheet.GetStyle(name(0)));
    if (rootFirst)
      exported = Export(sheet);
  }
  // The export lists names in name order, neither root nor child first.
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(exported, true));
  EXPECT_EQ(Export(sheet), exported);

  Style* root = sheet.GetStyle(name(0));
  Style* middle = sheet.GetStyle(name(kLength / 2));
  Style* last = sheet.GetStyle(name(kLength - 1));
  EXPECT_EQ(last->GetProperty(kSize).Get<double>(), effectiveSize(kLength - 1));
  EXPECT_EQ(last->GetProperty(kFont).Get<Text>(), Text(u"Serif")); // the category default

  Style* const rootOnly[] = {root};
  const StyleSpan rootSpan(rootOnly, rootOnly + 1, true);
  const std::vector<Style*> both{middle, root};
  EXPECT_FALSE(last->HasDependency(rootSpan, true));
  EXPECT_TRUE(last->HasDependency(rootSpan, false));
  EXPECT_TRUE(last->HasParentalDependency(rootSpan));
  std::vector<Style*> expected = both;
  std::sort(expected.begin(), expected.end(), std::less<>());
  EXPECT_EQ(last->GetDependencies(StyleSpan(both, false), false), expected);
  std::vector<Style*> dependents;
  sheet.GetDependencies(rootSpan, dependents);
  EXPECT_EQ(dependents.size(), static_cast<std::size_t>(kLength));

  std::vector<Style*> doomed;
  for (int i = 0; i < kLength; i += 10)
    doomed.push_back(sheet.GetStyle(name(i)));
  sheet.DeleteStyles(StyleSpan(doomed, false));
  ASSERT_EQ(sheet.GetStyles().size(), static_cast<std::size_t>(kLength - kLength / 10));
  for (int i = 1; i < kLength; i += 1 + (i % 10 == 9)) {
    const Style* style = sheet.GetStyle(name(i));
    ASSERT_EQ(style->GetProperty(kSize).Get<double>(), effectiveSize(i)) << i;
    ASSERT_EQ(style->GetParent(), sheet.GetStyle(name(i - 1 - ((i - 1) % 10 == 0)))) << i;
  }
  EXPECT_TRUE(last->Flatten());
  EXPECT_EQ(last->GetParent(), nullptr);
  EXPECT_EQ(last->GetProperty(kSize).Get<double>(), effectiveSize(kLength - 1));
}

// Member names no category registers are looked up without being pooled, so
// documents from outside cannot grow the process-wide pool.
TEST_F(StyleSheetTest, UnknownMemberNamesDoNotGrowThePool) {
  std::u16string document = uR"({"sheetTestParagraph": {"A": {"size": "2")";
  for (int i = 0; i < 1000; ++i)
    document += u", \"unknown " + Text::FormatInternal("%d", i).GetStdString() + u"\": \"x\"";
  document += u"}}}";
  const std::size_t size = StringPool::Get().GetSize();
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(Text(document), true));
  EXPECT_EQ(StringPool::Get().GetSize(), size);
  EXPECT_EQ(sheet.GetStyle(u"A")->GetProperty(kSize).Get<double>(), 2.0);
}

TEST_F(StyleSheetTest, DamagedDocuments) {
  struct Case {
    const char* label;
    Text document;
    bool accepted;
  };
  const Text deep = Text(u"{\"a\":") + Text(std::u16string(100000, u'[')) +
                    Text(std::u16string(100000, u']')) + u"}";
  const Text deepValue = Text(uR"({"sheetTestParagraph": {"D": {"size": )") +
                         Text(std::u16string(400, u'[')) + Text(std::u16string(400, u']')) + u"}}}";
  const Case cases[] = {
      {"substyles beyond the nesting limit", NestedSubstyles(Json::kMaxDepth + 2), false},
      {"substyles within the nesting limit", NestedSubstyles(Json::kMaxDepth - 2), true},
      {"substyle is not an object", uR"({"sheetTestParagraph": {"A": {"sheetTestCharacter": 5}}})",
       true},
      {"list members of every kind",
       uR"({"sheetTestParagraph": {"A": {"runs": [1, "x", null, {"size": "2"}, [], {}]}}})", true},
      {"list is an object", uR"({"sheetTestParagraph": {"A": {"runs": {}}}})", true},
      {"truncated style", uR"({"sheetTestParagraph": {"A": {"size": "1)", false},
      {"array", u"[]", false},
      {"deep nesting", deep, false},
      {"category is array", uR"({"sheetTestParagraph": []})", true},
      {"unknown category", uR"({"noSuchCategory": {"A": 5}})", true},
      {"id is number", uR"({"id": 5})", true},
      {"property is object", uR"({"sheetTestParagraph": {"A": {"size": {}}}})", true},
      {"inherits is number", uR"({"sheetTestParagraph": {"A": {"inherits": 5}}})", true},
      {"deep property value", deepValue, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.label);
    StyleSheet sheet;
    sheet.AddStyle(u"Keep", MakeStyle(u"keep"), false);
    const Text before = Export(sheet);
    EXPECT_EQ(sheet.ImportFromString(c.document, true), c.accepted);
    EXPECT_NE(sheet.GetStyle(u"Keep"), nullptr);
    if (!c.accepted) {
      EXPECT_EQ(Export(sheet), before);
      EXPECT_EQ(sheet.GetVersion(), 7);
    }
  }
}

// Documents built to hurt, each read into a sheet holding a style it
// replaces. Whatever the outcome, the sheet has no parent cycle, the pool has
// not grown, the export reads back to the same text, and deleting every other
// style, flattening one and destroying the sheet are sound. Sized rows also
// run at an eighth of their size: time must grow about linearly.
TEST_F(StyleSheetTest, HostileDocuments) {
  enum class Outcome { Accepted, Rejected, Throws };
  const auto num = [](int i) { return Text::FormatInternal("%d", i).GetStdString(); };
  const auto exercise = [](const Text& document) {
    StyleSheet sheet;
    sheet.AddStyle(u"Keep", MakeStyle(u"keep"), false);
    const std::size_t pooled = StringPool::Get().GetSize();
    Outcome outcome = Outcome::Throws;
    try {
      outcome = sheet.ImportFromString(document, true) ? Outcome::Accepted : Outcome::Rejected;
    } catch (const std::exception&) {
    }
    EXPECT_EQ(StringPool::Get().GetSize(), pooled);
    std::set<const Style*> acyclic; // styles whose ancestors end
    const std::size_t count = sheet.GetStyles().size();
    for (const Style* style : sheet.GetStyles()) {
      std::vector<const Style*> line;
      for (; style && !acyclic.count(style) && line.size() <= count; style = style->GetParent())
        line.push_back(style);
      EXPECT_LE(line.size(), count) << "parent cycle";
      acyclic.insert(line.begin(), line.end());
    }
    // Styles that an exception left without a category are written under ""
    // and not read back; one more round trip must then change nothing.
    Text text = Export(sheet);
    for (int round = outcome == Outcome::Throws ? 0 : 1; round < 2; ++round) {
      StyleSheet copy;
      EXPECT_TRUE(copy.ImportFromString(text, true));
      const Text before = text;
      text = Export(copy);
      EXPECT_TRUE(round == 0 || text == before);
    }
    std::vector<Style*> doomed, styles = sheet.GetStyles();
    for (std::size_t i = 0; i < styles.size(); i += 2)
      doomed.push_back(styles[i]);
    sheet.DeleteStyles(StyleSpan(doomed, false));
    try {
      if (!sheet.GetStyles().empty())
        sheet.GetStyles().back()->Flatten();
    } catch (const std::exception&) {
      // A lookup that ends in a category without the key may throw.
    }
    Export(sheet);
    return outcome;
  };
  const auto paragraphs = [](const std::u16string& members) {
    return Text(u"{\"sheetTestParagraph\": {" + members + u"}}");
  };
  struct Row {
    const char* label;
    int size; // 0 for a fixed document
    std::function<Text(int)> document;
    Outcome expected;
  };
  const Row rows[] = {
      {"substyles to the nesting limit through sets and lists", 0,
       [](int) {
         std::u16string open, close;
         for (int depth = 3, list = 0; depth + 1 + list <= Json::kMaxDepth; list = !list) {
           depth += 1 + list;
           open += list ? u"\"runs\": [{" : u"\"nested\": {";
           close = (list ? u"}]" : u"}") + close;
         }
         return Text(u"{\"sheetTestCharacter\": {\"C\": {" + open + close + u"}}}");
       },
       Outcome::Accepted},
      {"substyles inheriting along long chains", 50000,
       [&](int n) {
         std::u16string characters = u"\"C0\": {\"size\": \"5\"}", paragraphs;
         for (int i = 1; i < n; ++i)
           characters += u", \"C" + num(i) + u"\": {\"inherits\": \"C" + num(i - 1) + u"\"}";
         for (int i = 0; i < n; ++i)
           paragraphs += (i ? u", \"P" + num(i) + u"\": {\"inherits\": \"P" + num(i - 1) + u"\", "
                            : u"\"P0\": {") +
                         u"\"sheetTestCharacter\": {" +
                         (i ? u"" : u"\"inherits\": \"C" + num(n - 1) + u"\"") + u"}}";
         return Text(u"{\"sheetTestCharacter\": {" + characters + u"}, \"sheetTestParagraph\": {" +
                     paragraphs + u"}}");
       },
       Outcome::Accepted},
      {"one style with 100,000 members, most unknown", 100000,
       [&](int n) {
         std::u16string members = u"\"size\": \"0\"";
         for (int i = 1; i < n; ++i)
           members += (i % 100 ? u", \"unknown" : u", \"size") + std::u16string(u"\": \"") +
                      num(i) + u"\"";
         return paragraphs(u"\"Wide\": {" + members + u"}");
       },
       Outcome::Accepted},
      {"names of a million characters", 1000000,
       [&](int n) {
         const std::u16string a(n, u'N'), b(n, u'M');
         return paragraphs(u"\"" + a + u"\": {\"size\": \"1\"}, \"" + b + u"\": {\"inherits\": \"" +
                           a + u"\"}");
       },
       Outcome::Accepted},
      {"100,000 names differing only in letter case", 100000,
       [&](int n) {
         std::u16string members;
         for (int i = 0; i < n; ++i) {
           std::u16string name = u"abcdefghijklmnopq";
           for (int bit = 0; bit < 17; ++bit)
             if (i >> bit & 1)
               name[bit] = static_cast<char16_t>(name[bit] - u'a' + u'A');
           members += (i ? u", \"" : u"\"") + name + u"\": {\"inherits\": \"ABCDEFGHIJKLMNOPQ\"," +
                      u"\"sheetTestCharacter\": {\"inherits\": \"" + name + u"\"}}";
         }
         return paragraphs(members);
       },
       Outcome::Accepted},
      {"inherits cycles across categories and through substyles", 50000,
       [&](int n) {
         std::u16string p, c;
         for (int i = 0; i < n; ++i) {
           const std::u16string sep = i ? u", " : u"";
           p += sep + u"\"S" + num(i) + u"\": {\"inherits\": \"T" + num(i) +
                u"\", \"sheetTestCharacter\": {\"inherits\": \"S" + num((i + 1) % n) + u"\"}}";
           c += sep + u"\"T" + num(i) + u"\": {\"inherits\": \"S" + num((i + 1) % n) +
                u"\", \"nested\": {\"inherits\": \"T" + num(i) + u"\"}}";
         }
         return Text(u"{\"sheetTestParagraph\": {" + p + u"}, \"sheetTestCharacter\": {" + c +
                     u"}}");
       },
       Outcome::Accepted},
      {"substyles inheriting the styles that hold them", 0,
       [&](int) {
         return paragraphs(uR"("A": {"sheetTestCharacter": {"inherits": "B"},)"
                           uR"( "runs": [{"inherits": "A"}]}, "B": {"inherits": "A"})");
       },
       Outcome::Accepted},
      {"substyles inheriting each other's holders", 0,
       [&](int) {
         return Text(uR"({"sheetTestCharacter": {"R1": {"nested": {"inherits": "R2"}},)"
                     uR"( "R2": {"nested": {"inherits": "R1"}}}})");
       },
       Outcome::Accepted},
      {"one name under two categories, the first holding substyles", 0,
       [&](int) {
         return Text(uR"({"sheetTestParagraph": {"Q": {"sheetTestCharacter": {"nested": {}},)"
                     uR"( "runs": [{}]}}, "sheetTestCharacter": {"Q": {"size": "2"}}})");
       },
       Outcome::Accepted},
      {"numbers at the edges of double range", 0,
       [&](int) {
         return paragraphs(uR"("A": {"size": 1.7976931348623157e308, "font": -4.9e-324,)"
                           uR"( "sheetTestCharacter": {"size": -0}})");
       },
       Outcome::Accepted},
      {"a number beyond double range", 0,
       [&](int) { return paragraphs(uR"("A": {"size": 1e309})"); }, Outcome::Rejected},
      {"a refused value in a substyle", 0,
       [&](int) {
         return paragraphs(uR"("A": {"size": "2", "sheetTestCharacter": {"size": "1e309"}},)"
                           uR"( "Keep": {"inherits": "A"})");
       },
       Outcome::Throws},
      {"NaN in a list", 0,
       [&](int) { return paragraphs(uR"("A": {"runs": [{}, {"size": "NaN"}]}, "B": {})"); },
       Outcome::Throws},
      {"escaped and raw astral names are one", 0,
       [&](int) {
         return paragraphs(u"\"\\ud83d\\ude00\": {\"font\": \"\\ud83d\\ude00\"}, "
                           u"\"\U0001F600\": {\"inherits\": \"\U0001F600x\"}, \"\U0001F600x\": {}");
       },
       Outcome::Accepted},
      {"escaped lone surrogate in a name", 0, [&](int) { return paragraphs(u"\"\\ud800x\": {}"); },
       Outcome::Rejected},
      {"escaped lone surrogate in a value", 0,
       [&](int) { return paragraphs(u"\"A\": {\"font\": \"\\udc00\"}"); }, Outcome::Rejected},
      {"raw lone surrogate in a name", 0, [&](int) { return paragraphs(u"\"\xD800\": {}"); },
       Outcome::Rejected},
      {"NUL inside a name", 0,
       [&](int) { return paragraphs(uR"("a\u0000b": {"inherits": "a"}, "a": {})"); },
       Outcome::Accepted},
  };
  using Clock = std::chrono::steady_clock;
  for (const Row& row : rows) {
    SCOPED_TRACE(row.label);
    // An eighth of the size first, twice, then the full size: the bound
    // allows for caches that the larger documents outgrow, not for time
    // growing with the square of the size.
    Clock::duration least = Clock::duration::max();
    for (int run = 0; row.size && run < 2; ++run) {
      const Text eighth = row.document(row.size / 8);
      const Clock::time_point begin = Clock::now();
      exercise(eighth);
      least = std::min(least, Clock::now() - begin);
    }
    const Text document = row.document(row.size);
    const Clock::time_point start = Clock::now();
    EXPECT_EQ(exercise(document), row.expected);
    if (row.size) {
      EXPECT_LT(Clock::now() - start, 48 * least + std::chrono::seconds(1));
    }
  }
}

// Substyles name sheet styles as parents: the names are written, resolved on
// import, and the values baked in when those styles are deleted.
TEST_F(StyleSheetTest, SubstylesRoundTripAndOutliveDeletedParents) {
  StyleSheet sheet, copy;
  Style* strong = Add(sheet, u"Strong", nullptr, kCharacter);
  strong->SetProperty(kSize, 20.0);
  Style* base = Add(sheet, u"Base");
  PropertyPath path{kCharacter};
  for (int depth = 0; depth < 5; ++depth, path.push_back(kNested))
    base->SetPathProperty(MakePath(path, kFont), Text::FormatInternal("font %d", depth));
  base->GetSubstyle(kCharacter, false)->SetParent(strong);
  Style run(strong, kCharacter);
  run.SetPathProperty({kNested, kFont}, Text(u"Mono"));
  Add(sheet, u"Body", base)->SetProperty(kRuns, std::vector<Style*>{&run, &run});

  const Text text = Export(sheet);
  ASSERT_TRUE(copy.ImportFromString(text, true));
  EXPECT_EQ(Export(copy), text);
  Style* const character = copy.GetStyle(u"Base")->GetSubstyle(kCharacter, false);
  const Style* body = copy.GetStyle(u"Body");
  const std::vector<Style*> runs = body->GetProperty(kRuns).Get<std::vector<Style*>>();
  ASSERT_EQ(runs.size(), 2u);
  for (const Style* substyle : {character, runs[0], runs[1]})
    EXPECT_EQ(substyle->GetParent(), copy.GetStyle(u"Strong"));

  std::vector<Style*> doomed{copy.GetStyle(u"Strong")};
  copy.DeleteStyles(StyleSpan(doomed, true));
  for (const Style* substyle : {character, runs[0], runs[1]}) {
    EXPECT_EQ(substyle->GetParent(), nullptr);
    EXPECT_EQ(substyle->GetProperty(kSize).Get<double>(), 20.0);
  }
  EXPECT_EQ(body->GetSubstyle(kCharacter, true), character);
  EXPECT_EQ(testing::CheckOwnerLinks(*copy.GetStyle(u"Base")), 5);
  EXPECT_EQ(testing::CheckOwnerLinks(*body), 4);

  // Deep but within the nesting limit: every level is read and linked.
  StyleSheet deep;
  ASSERT_TRUE(deep.ImportFromString(NestedSubstyles(3 + 500), true));
  EXPECT_EQ(testing::CheckOwnerLinks(*deep.GetStyle(u"C")), 500);
}

TEST_F(StyleSheetTest, ImportFailuresPassThroughAfterPartialWork) {
  StyleSheet sheet;
  EXPECT_THROW(
      sheet.ImportFromString(
          uR"({"sheetTestParagraph": {"First": {"size": "3"}, "Bad": [], "Never": {}}})", true),
      std::bad_cast);
  ASSERT_NE(sheet.GetStyle(u"First"), nullptr);
  EXPECT_FALSE(sheet.GetStyle(u"First")->DoesOverrideProperty(kSize)); // added, never read
  EXPECT_EQ(sheet.GetStyle(u"Never"), nullptr);

  // A behaviour's exception passes through too.
  StyleSheet other;
  EXPECT_THROW(
      other.ImportFromString(uR"({"sheetTestParagraph": {"A": {"size": "x"}, "B": {}}})", true),
      ZelPref::Detail::BadConversion);
  EXPECT_EQ(other.GetStyleNames(), (Names{u"A", u"B"}));
}

// Ten thousand styles with inheritance within and across categories, external
// fields and non-ASCII names survive export, import and export, through a
// string and through a stream.
TEST_F(StyleSheetTest, RoundTripKeepsTextAndEffectiveValues) {
  StyleSheet original, copy, streamed;
  Style* previous = nullptr;
  for (int i = 0; i < 10000; ++i) {
    previous = MakeStyle(Text::FormatInternal("%d", i), i % 10 == 0 ? nullptr : previous,
                         i % 2 ? kCharacter : kParagraph);
    if (i % 3)
      previous->SetProperty(kSize, i * 0.5);
    if (i % 7 == 0)
      previous->SetExternalName(Text::FormatInternal("ext %d", i));
    original.AddStyle(Text(u"\u00dcberschrift ") + Text::FormatInternal("%d", i), previous, false);
  }
  const Text text = Export(original);
  JsonValue tree{Json::Object()}; // the document's tree gives the same text
  original.ExportJson(tree, false);
  EXPECT_EQ(Json::ValueToString(tree, false), text);
  ASSERT_TRUE(copy.ImportFromString(text, true));
  EXPECT_EQ(Export(copy), text);
  for (const Style* style : original.GetStyles()) {
    const Style* read = copy.GetStyle(original.GetStyleName(style));
    ASSERT_NE(read, nullptr);
    EXPECT_EQ(copy.GetStyleName(read->GetParent()), original.GetStyleName(style->GetParent()));
    EXPECT_EQ(read->GetExternalName(), style->GetExternalName());
    for (const PropertyKey& key : {kSize, kFont, kTag})
      ASSERT_TRUE(read->GetProperty(key) == style->GetProperty(key));
  }

  ZelUtils::Stream stream = ZelUtils::MemoryStream::Create();
  ASSERT_TRUE(original.Export(stream));
  ZelUtils::Stream reader =
      ZelUtils::MemoryStream::FromBytes(ZelUtils::MemoryStream::GetBytes(stream));
  ASSERT_TRUE(streamed.Import(reader, true));
  EXPECT_EQ(Export(streamed), text);
  ZelUtils::Stream garbage = ZelUtils::MemoryStream::FromBytes("\xff\xfe\x00{");
  EXPECT_FALSE(streamed.Import(garbage, true));
  ZelUtils::Stream unusable;
  EXPECT_FALSE(original.Export(unusable));
}

} // namespace
} // namespace Styles
