#include <Styles/StyleSheet.h>

#include "HostBehaviours.h"

#include <Styles/StyleUtilities.h>

#include <Json/Json.h>
#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <set>

namespace Styles {
namespace {

using Text = ZelStringT<char16_t>;
using Names = std::vector<Text>;
using ZelUtils::Any;

const PropertyKey kParagraph(u"p"), kCharacter(u"c");
const PropertyKey kSize(u"size"), kFont(u"font"), kTag(u"tag"), kRuns(u"runs");

// Every style made by MakeStyle carries a tag whose destruction is recorded
// here, which makes ownership visible.
Names& DestroyedTags() {
  static Names tags;
  return tags;
}

bool IsText(const Any& value) { return value.GetIf<Text>() != nullptr; }

class TagProperty : public StyleProperty {
public:
  TagProperty() : StyleProperty(Any(Text()), new ZelPref::TextConversionPolicy, &IsText) {}
  void DestroyPropertyData(const Any& value) const override {
    if (const Text* tag = value.GetIf<Text>())
      DestroyedTags().push_back(*tag);
  }
};

// Expands every "$<count>[member$]" of `text` into `count / divisor` copies
// of member, in which $i, $p and $n stand for the copy's number, the one
// before and the one after (wrapping), and $c for 17 letters whose case
// spells the number in binary. Other text is kept as it is.
Text Expand(std::u16string_view text, int divisor = 1) {
  std::u16string out;
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t open = text.find_first_not_of(u"0123456789", at + 1);
    if (text[at] != u'$' || open == at + 1 || open == text.npos || text[open] != u'[') {
      out += text[at++];
      continue;
    }
    const int count = std::stoi(std::string(text.begin() + at + 1, text.begin() + open)) / divisor;
    const std::size_t close = text.find(u"$]", open);
    const std::u16string_view member = text.substr(open + 1, close - open - 1);
    for (int i = 0; i < count; ++i) {
      for (std::size_t k = 0; k < member.size(); ++k) {
        const char16_t token = member[k] == u'$' ? member[++k] : 0;
        if (!token)
          out += member[k];
        else if (token == u'c')
          for (int bit = 0; bit < 17; ++bit)
            out += static_cast<char16_t>((i >> bit & 1 ? u'A' : u'a') + bit);
        else
          out += Text::FormatInternal("%d", token == u'n' ? (i + 1) % count : i - (token == u'p'))
                     .GetStdString();
      }
    }
    at = close + 2;
  }
  return Text(out);
}

class StyleSheetTest : public ::testing::Test {
protected:
  // Paragraphs hold a character substyle (keyed by its category) and a list
  // of them; characters nest in characters.
  StyleSheetTest() {
    GetStyleManager().SetCurrentVersion(7);
    for (testing::ScopedCategory* category : {&m_paragraph, &m_character}) {
      category->Number(u"size", 12.0);
      category->Add(u"font", new StyleProperty(Any(Text(u"Serif")),
                                               new ZelPref::TextConversionPolicy, &IsText));
      category->Add(u"tag", new TagProperty);
    }
    RegisterSubstyleSet(kParagraph, kCharacter);
    m_paragraph.Add(u"runs", new StyleArrayProperty(kCharacter));
    m_character.Add(u"nested", new StyleSetProperty(kCharacter));
    m_character.Add(u"runs", new StyleArrayProperty(kCharacter));
    // Old documents hold unreadable geometry; only these exact names fall back.
    for (const char16_t* name : {u"xScale", u"angle", u"XScale"})
      m_paragraph.Number(name, 5.0);
    m_paragraph.Add(u"noPolicy", new StyleProperty(Any(Text()), nullptr, nullptr));
    DestroyedTags().clear();
  }
  ~StyleSheetTest() override {
    GetStyleManager().ClearImportStyleInfo();
    GetStyleManager().SetCurrentVersion(m_savedVersion);
  }

  // A style tagged `tag`; the caller owns it.
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
  // The folder of the documents these tests read, and the text of one.
  static std::filesystem::path Data() {
    return std::filesystem::path(__FILE__).parent_path().parent_path() / "data" / "sheet";
  }
  static Text Read(const std::filesystem::path& path) {
    return ZelUtils::TextStreamReader(ZelUtils::FileStream::Open(path.u16string()),
                                      ZelUtils::TextStream::UTF8)
        .ReadToEnd();
  }

private:
  int m_savedVersion = GetStyleManager().GetCurrentVersion();
  testing::ScopedCategory m_paragraph{u"p", u"Paragraph"};
  testing::ScopedCategory m_character{u"c", u"Character"};
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
  EXPECT_EQ(follower->GetParent(), old);

  Style* newer = MakeStyle(u"newer");
  newer->SetProperty(kSize, 30.0);
  std::unique_ptr<Style> previous(sheet.AddStyle(u"Red", newer, true));
  EXPECT_EQ(previous.get(), old);
  EXPECT_EQ(sheet.GetStyle(u"red"), newer);
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
}

TEST_F(StyleSheetTest, NamesIgnoreCaseBeyondAsciiAndRenameRules) {
  StyleSheet sheet;
  Style* anger = Add(sheet, u"\u00c4rger");
  Style* blue = Add(sheet, u"blue");
  EXPECT_EQ(sheet.GetStyle(u"\u00e4RgEr"), anger);
  EXPECT_EQ(sheet.GetStyle(u"Arger"), nullptr);

  sheet.RenameStyle(u"\u00e4rger", u"\u00e4RGER"); // a change of case re-spells
  sheet.RenameStyle(u"\u00c4rger", u"Blue");       // taken: nothing happens
  sheet.RenameStyle(u"Missing", u"Green");
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"blue", u"\u00e4RGER"}));
  sheet.RenameStyle(u"BLUE", u"Crimson");
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"Crimson", u"\u00e4RGER"}));
  EXPECT_EQ(sheet.GetStyle(u"crimson"), blue);

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
  EXPECT_FALSE(sheet.RemoveStyle(foreign));

  std::vector<Style*> doomed{nullptr, foreign, middle};
  sheet.DeleteStyles(StyleSpan(doomed, false));
  EXPECT_EQ(DestroyedTags(), Names{u"Middle"});
  EXPECT_EQ(sheet.GetStyleNames(), (Names{u"Adopted", u"Base", u"Leaf"}));
  EXPECT_EQ(leaf->GetParent(), base);
  EXPECT_EQ(leaf->GetProperty(kSize).Get<double>(), 14.0);
  EXPECT_EQ(leaf->GetProperty(kFont).Get<Text>(), Text(u"Sans"));
  EXPECT_EQ(adopted->GetParent(), nullptr);
  EXPECT_EQ(adopted->GetProperty(kFont).Get<Text>(), Text(u"Mono"));

  std::unique_ptr<Style> removed(sheet.RemoveStyle(Text(u"base")));
  EXPECT_EQ(removed.get(), base);
  EXPECT_TRUE(sheet.RemoveStyle(leaf));
  EXPECT_EQ(leaf->GetParent(), base); // not repaired
  delete leaf;
}

TEST_F(StyleSheetTest, QueriesFollowNameOrderAndClearKeepsExternalId) {
  StyleSheet sheet;
  Style* base = Add(sheet, u"base");
  Style* child = Add(sheet, u"Child", base);
  Style* grandchild = Add(sheet, u"grandchild", child);
  Style* note = Add(sheet, u"note", nullptr, kCharacter);
  note->SetExternalID(u"ID");
  note->SetExternalName(u"Name");
  EXPECT_EQ(sheet.GetStylesByName({u"NOTE", u"missing", u"base"}),
            (std::vector<Style*>{note, base}));
  const std::vector<Style*> doomed{base};
  std::vector<Style*> dependents{note};
  sheet.GetDependencies(StyleSpan(doomed, true), dependents); // appends, in name order
  EXPECT_EQ(dependents, (std::vector<Style*>{note, base, child, grandchild}));
  EXPECT_EQ(sheet.GetExternalStyleAlias(u"ID", u"Name"), note);

  sheet.SetVersion(2);
  sheet.SetExternalID(u"src");
  sheet.Clear();
  EXPECT_EQ(DestroyedTags().size(), 4u);
  EXPECT_EQ(sheet.GetVersion(), 7);
  EXPECT_EQ(sheet.GetExternalID(), Text(u"src"));

  // Unused names start from the category's name for people, then count on.
  Add(sheet, u"paragraph 1");
  EXPECT_EQ(sheet.GetUnusedStyleName(kParagraph.GetString()), Text(u"Paragraph 2"));
}

// MergeIn walks the target's own index and forgets the source's names; both
// halves are kept as hosts have always seen them.
TEST_F(StyleSheetTest, MergeInKeepsBothSheetsSound) {
  {
    StyleSheet target, source;
    Style* incoming = Add(source, u"In");
    Style* own = Add(target, u"Own");
    target.MergeIn(source, true);
    EXPECT_TRUE(DestroyedTags().empty());
    EXPECT_EQ(target.GetStyles(), std::vector<Style*>{own});
    EXPECT_TRUE(source.GetStyles().empty()); // names forgotten, styles still owned
    EXPECT_EQ(source.GetStyleName(incoming), Text(u"In"));
  }
  EXPECT_EQ(DestroyedTags(), (Names{u"In", u"Own"}));
}

TEST_F(StyleSheetTest, CopyContentsFromCopiesDeeplyAndTakesVersion) {
  StyleSheet source, copy;
  source.SetVersion(3);
  Style* base = Add(source, u"Base");
  base->SetProperty(kSize, 9.0);
  Add(source, u"Body", base);
  Add(copy, u"Old");
  copy.CopyContentsFrom(source, nullptr);
  EXPECT_EQ(DestroyedTags(), Names{u"Old"});
  EXPECT_EQ(copy.GetVersion(), 3);
  const std::vector<Style*> styles = copy.GetStyles();
  ASSERT_EQ(styles.size(), 2u);
  EXPECT_EQ(styles[1]->GetParent(), styles[0]);
  EXPECT_NE(styles[0], base);
  EXPECT_EQ(styles[1]->GetProperty(kSize).Get<double>(), 9.0);
  source.SetVersion(-5); // a version no document carries still reaches the copy
  copy.CopyContentsFrom(source, nullptr);
  EXPECT_EQ(copy.GetVersion(), -5);
}

TEST_F(StyleSheetTest, DocumentIdIsTakenOnlyBySheetWithOne) {
  // Only a sheet with an ID takes the document's; it is applied in both
  // passes, so a style read gets the ID in force where its category stands.
  const Text document = uR"({"id": "B", "p": {"P": {"id": "own"}}, "id": "C"})";
  StyleSheet plain, linked;
  linked.SetExternalID(u"A");
  ASSERT_TRUE(plain.ImportFromString(document, true));
  ASSERT_TRUE(linked.ImportFromString(document, true));
  EXPECT_EQ(plain.GetExternalID(), Text());
  EXPECT_EQ(plain.GetStyle(u"P")->GetExternalID(), Text(u"own"));
  EXPECT_EQ(linked.GetExternalID(), Text(u"C"));
  EXPECT_EQ(linked.GetStyle(u"P")->GetExternalID(), Text(u"B"));
}

// A clash with a style already in the sheet is decided by replace; the same
// name in two categories makes one style that both members are read into.
TEST_F(StyleSheetTest, ImportReplaceDecidesWhoWins) {
  for (bool replace : {false, true}) {
    SCOPED_TRACE(replace);
    DestroyedTags().clear();
    StyleSheet sheet;
    Add(sheet, u"Body")->SetProperty(kSize, 10.0);
    Style* child = Add(sheet, u"Child", sheet.GetStyle(u"Body"));
    ASSERT_TRUE(sheet.ImportFromString(uR"({"p": {"body": {"size": "30"},
                                                                  "X": {"size": "11"}},
                                            "c": {"x": {"font": "Mono"}}})",
                                       replace));
    EXPECT_EQ(DestroyedTags(), replace ? Names{u"Body"} : Names{});
    EXPECT_EQ(sheet.GetStyleNames(),
              replace ? (Names{u"body", u"Child", u"x"}) : (Names{u"Body", u"Child", u"X"}));
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

// Documents built to hurt, read from tests/data/sheet/<expected outcome>/
// into a sheet holding a style they may replace and one that follows it.
// Whatever the outcome, the pool has not grown, owner links hold, no style is
// its own ancestor, the export reads back to the same text, and deleting
// every other style and flattening one keep the values of the styles that
// stay; a refused document leaves the sheet as it was. Large documents are
// written compactly (see Expand) and also run at an eighth of their size:
// time must grow about linearly.
TEST_F(StyleSheetTest, HostileDocuments) {
  enum class Outcome { Accepted, Rejected, Throws };
  const auto exercise = [](const Text& document, Text& imported) {
    StyleSheet sheet;
    Add(sheet, u"Follower", Add(sheet, u"Keep"));
    const Text before = Export(sheet);
    const std::size_t pooled = StringPool::Get().GetSize();
    Outcome outcome = Outcome::Throws;
    try {
      outcome = sheet.ImportFromString(document, true) ? Outcome::Accepted : Outcome::Rejected;
    } catch (const std::exception&) {
    }
    EXPECT_EQ(StringPool::Get().GetSize(), pooled);
    imported = Export(sheet);
    JsonValue tree{Json::Object()}; // the document's tree gives the same text
    sheet.ExportJson(tree, false);
    EXPECT_EQ(Json::ValueToString(tree, false), imported);
    EXPECT_TRUE(outcome != Outcome::Rejected || (imported == before && sheet.GetVersion() == 7));
    std::set<const Style*> acyclic; // styles whose ancestors end
    const std::vector<Style*> styles = sheet.GetStyles();
    for (const Style* style : styles) {
      testing::CheckOwnerLinks(*style);
      std::vector<const Style*> line;
      for (; style && !acyclic.count(style) && line.size() <= styles.size();
           style = style->GetParent())
        line.push_back(style);
      if (line.size() > styles.size()) {
        ADD_FAILURE() << "parent cycle";
        return outcome; // the lookups below would never end
      }
      acyclic.insert(line.begin(), line.end());
    }
    // Styles that an exception left without a category are written under ""
    // and not read back; one more round trip must then change nothing.
    Text text = imported;
    for (int round = outcome == Outcome::Throws ? 0 : 1; round < 2; ++round) {
      StyleSheet copy;
      EXPECT_TRUE(copy.ImportFromString(text, true));
      EXPECT_TRUE(round == 0 || Export(copy) == text);
      text = Export(copy);
    }
    // Every other style goes; up to 32 of the others are watched. A style the
    // sheet lists as dependent, and only such a style, sees the dependency itself.
    std::vector<Style*> doomed, watched, dependents;
    for (std::size_t i = 0; i < styles.size(); ++i)
      (i % 2 ? watched : doomed).push_back(styles[i]);
    for (std::size_t i = 0, step = watched.size() / 32 + 1; i < watched.size(); i += step)
      watched[i / step] = watched[i];
    watched.resize(std::min<std::size_t>(watched.size(), 32));
    std::sort(doomed.begin(), doomed.end(), std::less<>());
    sheet.GetDependencies(StyleSpan(doomed, true), dependents);
    for (const Style* style : watched) {
      EXPECT_EQ(style->HasDependency(StyleSpan(doomed, true), false),
                std::count(dependents.begin(), dependents.end(), style) == 1);
    }
    const auto values = [&] {
      std::vector<Any> out;
      for (const Style* style : watched) {
        for (const PropertyKey& key : {kSize, kFont}) {
          try {
            out.push_back(style->GetProperty(key));
          } catch (const std::exception&) {
            out.emplace_back(); // a category without the key
          }
        }
      }
      return out;
    };
    const std::vector<Any> kept = values();
    // An exception may leave styles without a category, whose values are lost.
    sheet.DeleteStyles(StyleSpan(doomed, true));
    EXPECT_TRUE(outcome == Outcome::Throws || values() == kept);
    try {
      if (!watched.empty()) {
        watched.back()->Flatten();
        EXPECT_EQ(watched.back()->GetParent(), nullptr);
        EXPECT_TRUE(outcome == Outcome::Throws || values() == kept);
      }
    } catch (const std::exception&) {
      // A lookup that ends in a category without the key may throw.
    }
    Export(sheet);
    return outcome;
  };

  // Where a document has a sibling ".expected" file, that is the sheet's
  // export right after the import, the host skipping "Skipped" and renaming
  // "Old" to "Base".
  WImportStyleInfo& info = GetStyleManager().GetImportStyleInfo();
  info.names.insert(u"Skipped");
  info.renames.emplace(u"Old", u"Base");
  using Clock = std::chrono::steady_clock;
  int documents = 0, expectations = 0;
  Text imported;
  for (const auto& [folder, expected] :
       {std::pair{"accepted", Outcome::Accepted}, std::pair{"rejected", Outcome::Rejected},
        std::pair{"throws", Outcome::Throws}}) {
    for (const auto& entry : std::filesystem::directory_iterator(Data() / folder)) {
      if (entry.path().extension() != ".json")
        continue;
      SCOPED_TRACE(entry.path().string());
      ++documents;
      const Text text = Read(entry.path());
      // An eighth of the size first, twice, then the full size: the bound
      // allows for caches that the larger documents outgrow, not for time
      // growing with the square of the size.
      const bool sized = text.GetView().find(u'$') != std::u16string_view::npos;
      Clock::duration least = Clock::duration::max();
      for (int run = 0; sized && run < 2; ++run) {
        const Clock::time_point begin = Clock::now();
        exercise(Expand(text.GetView(), 8), imported);
        least = std::min(least, Clock::now() - begin);
      }
      const Clock::time_point start = Clock::now();
      EXPECT_EQ(exercise(Expand(text.GetView()), imported), expected);
      if (sized) {
        EXPECT_LT(Clock::now() - start, 48 * least + std::chrono::seconds(1));
      }
      if (std::filesystem::exists(
              std::filesystem::path(entry.path()).replace_extension(".expected"))) {
        ++expectations;
        EXPECT_EQ(imported,
                  Read(std::filesystem::path(entry.path()).replace_extension(".expected")).Trim());
      }
    }
  }
  EXPECT_GE(documents, 51);
  EXPECT_GE(expectations, 16);
  // UTF-8 cannot carry a lone surrogate.
  EXPECT_EQ(exercise(u"{\"p\": {\"\xD800\": {}}}", imported), Outcome::Rejected);
}

// Substyles name sheet styles as parents: the names are resolved on import
// (the document's .expected file pins what is written back), and the values
// baked in when those styles are deleted.
TEST_F(StyleSheetTest, SubstylesOutliveDeletedParents) {
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(
      Read(Data() / "accepted" / "substyles-naming-sheet-styles.json"), true));
  Style* const character = sheet.GetStyle(u"Base")->GetSubstyle(kCharacter, false);
  const Style* body = sheet.GetStyle(u"\u00fcberschrift");
  const std::vector<Style*> runs = body->GetProperty(kRuns).Get<std::vector<Style*>>();
  ASSERT_EQ(runs.size(), 2u);
  for (const Style* substyle : {character, runs[0], runs[1]})
    EXPECT_EQ(substyle->GetParent(), sheet.GetStyle(u"Strong"));
  std::vector<Style*> doomed{sheet.GetStyle(u"Strong")};
  sheet.DeleteStyles(StyleSpan(doomed, true));
  for (const Style* substyle : {character, runs[0], runs[1]}) {
    EXPECT_EQ(substyle->GetParent(), nullptr);
    EXPECT_EQ(substyle->GetProperty(kSize).Get<double>(), 20.0);
  }
  EXPECT_EQ(body->GetSubstyle(kCharacter, true), character);
  EXPECT_EQ(testing::CheckOwnerLinks(*sheet.GetStyle(u"Base")), 5);
  EXPECT_EQ(testing::CheckOwnerLinks(*body), 4);
}

} // namespace
} // namespace Styles
