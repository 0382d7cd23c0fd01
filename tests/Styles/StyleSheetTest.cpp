#include <Styles/StyleSheet.h>

#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/Stream.h>

#include <gtest/gtest.h>

#include <climits>
#include <string>
#include <typeinfo>
#include <vector>

namespace Styles {
namespace {

using Text = ZelStringT<char16_t>;
using ZelUtils::Any;

const PropertyKey kParagraph(u"sheetTestParagraph");
const PropertyKey kCharacter(u"sheetTestCharacter");
const PropertyKey kSize(u"size");
const PropertyKey kFont(u"font");
const PropertyKey kTag(u"tag");

std::string Narrow(const Text& text) {
  std::string out;
  for (char16_t c : text)
    out += c < 0x80 ? static_cast<char>(c) : '?';
  return out;
}

// Tags of destroyed styles: every style made by MakeStyle carries a tag whose
// destruction is recorded, which makes ownership visible.
std::vector<Text>& DestroyedTags() {
  static std::vector<Text> tags;
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
  static Text Export(const StyleSheet& sheet) {
    Text text;
    sheet.ExportToString(text, false);
    return text;
  }
  static bool WasDestroyed(const Text& tag) {
    for (const Text& destroyed : DestroyedTags())
      if (destroyed == tag)
        return true;
    return false;
  }

private:
  int m_savedVersion = 0;
};

TEST_F(StyleSheetTest, AddStyleClashKeepsOrReplaces) {
  StyleSheet sheet;
  Style* old = MakeStyle(u"old");
  EXPECT_EQ(sheet.AddStyle(u"red", old, false), nullptr);

  EXPECT_EQ(sheet.AddStyle(u"Red", MakeStyle(u"kept-out"), false), nullptr);
  EXPECT_TRUE(WasDestroyed(u"kept-out"));
  EXPECT_EQ(sheet.GetStyle(u"RED"), old);
  EXPECT_EQ(sheet.GetStyleNames(), std::vector<Text>{u"red"});

  Style* newer = MakeStyle(u"newer");
  Style* previous = sheet.AddStyle(u"Red", newer, true);
  EXPECT_EQ(previous, old);
  EXPECT_FALSE(WasDestroyed(u"old"));
  EXPECT_EQ(sheet.GetStyle(u"red"), newer);
  EXPECT_EQ(sheet.GetStyleNames(), std::vector<Text>{u"Red"});
  EXPECT_EQ(sheet.GetStyleName(old), Text());
  delete previous;
}

TEST_F(StyleSheetTest, NamesCompareIgnoringCaseBeyondAscii) {
  StyleSheet sheet;
  Style* anger = MakeStyle(u"anger");
  sheet.AddStyle(u"\u00c4rger", anger, false);
  Style* sigma = MakeStyle(u"sigma");
  sheet.AddStyle(u"\u03a3\u039f\u03a6\u0399\u0391", sigma, false); // ΣΟΦΙΑ
  for (const char16_t* lookup : {u"\u00e4rger", u"\u00c4RGER", u"\u00e4RgEr"}) {
    SCOPED_TRACE(Narrow(lookup));
    EXPECT_EQ(sheet.GetStyle(lookup), anger);
  }
  EXPECT_EQ(sheet.GetStyle(u"\u03c3\u03bf\u03c6\u03b9\u03b1"), sigma);
  EXPECT_EQ(sheet.GetStyle(u"Arger"), nullptr);
  EXPECT_EQ(sheet.GetStyleName(anger), Text(u"\u00c4rger"));

  sheet.RenameStyle(u"\u00e4rger", u"\u00e4RGER");
  EXPECT_EQ(sheet.GetStyleName(anger), Text(u"\u00e4RGER"));
  EXPECT_EQ(sheet.GetStyles().size(), 2u);
}

TEST_F(StyleSheetTest, RenameRules) {
  StyleSheet sheet;
  Style* red = MakeStyle(u"red");
  Style* blue = MakeStyle(u"blue");
  sheet.AddStyle(u"Red", red, false);
  sheet.AddStyle(u"blue", blue, false);

  sheet.RenameStyle(u"Red", u"Blue"); // taken: nothing happens
  EXPECT_EQ(sheet.GetStyleName(red), Text(u"Red"));
  EXPECT_EQ(sheet.GetStyle(u"blue"), blue);
  sheet.RenameStyle(u"Missing", u"Green");
  EXPECT_EQ(sheet.GetStyle(u"Green"), nullptr);

  sheet.RenameStyle(u"red", u"Crimson");
  EXPECT_EQ(sheet.GetStyle(u"crimson"), red);
  EXPECT_EQ(sheet.GetStyle(u"Red"), nullptr);
  EXPECT_EQ(sheet.GetStyleName(red), Text(u"Crimson"));
  EXPECT_EQ(sheet.GetStyleNames(), (std::vector<Text>{u"blue", u"Crimson"}));
}

TEST_F(StyleSheetTest, RemoveStyleDetachesWithoutRepair) {
  StyleSheet sheet, other;
  Style* base = MakeStyle(u"base");
  Style* child = MakeStyle(u"child", base);
  Style* foreign = MakeStyle(u"foreign");
  sheet.AddStyle(u"Base", base, false);
  sheet.AddStyle(u"Child", child, false);
  other.AddStyle(u"Foreign", foreign, false);

  EXPECT_FALSE(sheet.RemoveStyle(static_cast<Style*>(nullptr)));
  EXPECT_FALSE(sheet.RemoveStyle(foreign));
  EXPECT_EQ(sheet.RemoveStyle(Text(u"nothing")), nullptr);
  EXPECT_EQ(sheet.GetStyleName(nullptr), Text());

  EXPECT_TRUE(sheet.RemoveStyle(base));
  EXPECT_EQ(sheet.GetStyle(u"base"), nullptr);
  EXPECT_EQ(child->GetParent(), base);
  EXPECT_TRUE(DestroyedTags().empty());
  delete base;
}

TEST_F(StyleSheetTest, DeleteStylesRepairsAndSkipsNullAndForeign) {
  StyleSheet sheet, other;
  Style* foreign = MakeStyle(u"foreign");
  foreign->SetProperty(kFont, Text(u"Mono"));
  other.AddStyle(u"Foreign", foreign, false);

  Style* base = MakeStyle(u"base");
  base->SetProperty(kFont, Text(u"Sans"));
  Style* middle = MakeStyle(u"middle", base);
  middle->SetProperty(kSize, 14.0);
  Style* leaf = MakeStyle(u"leaf", middle);
  Style* adopted = MakeStyle(u"adopted", foreign);
  for (auto [name, style] : {std::pair<const char16_t*, Style*>{u"Base", base},
                             {u"Middle", middle},
                             {u"Leaf", leaf},
                             {u"Adopted", adopted}})
    sheet.AddStyle(name, style, false);

  std::vector<Style*> doomed{nullptr, foreign, middle};
  sheet.DeleteStyles(StyleSpan(doomed, false));

  EXPECT_EQ(DestroyedTags(), std::vector<Text>{u"middle"});
  EXPECT_EQ(sheet.GetStyleNames(), (std::vector<Text>{u"Adopted", u"Base", u"Leaf"}));
  EXPECT_EQ(other.GetStyle(u"Foreign"), foreign);
  // The leaf skips the deleted style but keeps what it inherited from it.
  EXPECT_EQ(leaf->GetParent(), base);
  EXPECT_EQ(leaf->GetProperty(kSize).Get<double>(), 14.0);
  EXPECT_EQ(leaf->GetProperty(kFont).Get<Text>(), Text(u"Sans"));
  // A style of the sheet drops its link to a foreign style of the span too.
  EXPECT_EQ(adopted->GetParent(), nullptr);
  EXPECT_EQ(adopted->GetProperty(kFont).Get<Text>(), Text(u"Mono"));
}

TEST_F(StyleSheetTest, Queries) {
  StyleSheet sheet;
  Style* base = MakeStyle(u"base");
  Style* body = MakeStyle(u"body", base);
  Style* quote = MakeStyle(u"quote", body);
  Style* emphasis = MakeStyle(u"emphasis", nullptr, kCharacter);
  emphasis->SetExternalID(u"ext");
  emphasis->SetExternalName(u"Em");
  sheet.AddStyle(u"base", base, false);
  sheet.AddStyle(u"Body", body, false);
  sheet.AddStyle(u"quote", quote, false);
  sheet.AddStyle(u"Emphasis", emphasis, false);

  EXPECT_EQ(sheet.GetStylesByName({u"QUOTE", u"none", u"base"}),
            (std::vector<Style*>{quote, base}));
  EXPECT_EQ(sheet.GetStylesByCategory(kParagraph), (std::vector<Style*>{base, body, quote}));
  EXPECT_EQ(sheet.GetStyleNames(kCharacter), std::vector<Text>{u"Emphasis"});

  const StyleSheet::NameIndex children = sheet.GetChildStyles(base);
  ASSERT_EQ(children.size(), 1u);
  EXPECT_EQ(children.begin()->second, body);
  EXPECT_TRUE(sheet.GetChildStyles(nullptr).empty());

  StyleSheet::CategoryStyleMap map{{PropertyKey(u"stale"), {}}};
  sheet.GenerateCategoryStyleMap(map);
  ASSERT_EQ(map.size(), 2u);
  EXPECT_EQ(map[kParagraph].size(), 3u);
  EXPECT_EQ(map[kCharacter].begin()->second, emphasis);

  std::vector<Style*> asked{base};
  std::vector<Style*> dependents{emphasis};
  sheet.GetDependencies(StyleSpan(asked, true), dependents);
  EXPECT_EQ(dependents, (std::vector<Style*>{emphasis, base, body, quote}));

  EXPECT_EQ(sheet.GetExternalStyleAlias(u"ext", u"Em"), emphasis);
  EXPECT_EQ(sheet.GetExternalStyleAlias(u"ext", u"em"), nullptr);
  EXPECT_EQ(sheet.GetExternalStyleAlias(u"", u""), nullptr);
  EXPECT_EQ(sheet.GetExternalStyleAlias(u"ext", u""), nullptr);
}

TEST_F(StyleSheetTest, UnusedNamesStartFromCategoryUiName) {
  StyleSheet sheet;
  sheet.AddStyle(u"paragraph 1", MakeStyle(u"p1"), false);
  sheet.AddStyle(u"Note", MakeStyle(u"note"), false);
  EXPECT_EQ(sheet.GetUnusedStyleName(kParagraph.GetString()), Text(u"Paragraph 2"));
  EXPECT_EQ(sheet.GetUnusedStyleName(kCharacter.GetString()), Text(u"Character 1"));
  EXPECT_EQ(sheet.GetUnusedStyleName(u"Title"), Text(u"Title"));
  EXPECT_EQ(sheet.GetUnusedStyleName(u"NOTE"), Text(u"NOTE 1"));
}

TEST_F(StyleSheetTest, ClearKeepsExternalIdAndResetsVersion) {
  StyleSheet sheet;
  EXPECT_EQ(sheet.GetVersion(), 7);
  sheet.SetVersion(2);
  sheet.SetExternalID(u"src");
  sheet.AddStyle(u"a", MakeStyle(u"a"), false);
  sheet.Clear();
  EXPECT_EQ(DestroyedTags(), std::vector<Text>{u"a"});
  EXPECT_TRUE(sheet.GetStyles().empty());
  EXPECT_EQ(sheet.GetVersion(), 7);
  EXPECT_EQ(sheet.GetExternalID(), Text(u"src"));
}

// MergeIn walks the target's own index and forgets the source's names; both
// halves are kept as hosts have always seen them.
TEST_F(StyleSheetTest, MergeInKeepsItsHistoricBehaviour) {
  StyleSheet target, source;
  Style* incoming = MakeStyle(u"incoming");
  source.AddStyle(u"In", incoming, false);
  target.AddStyle(u"Own", MakeStyle(u"own"), false);

  target.MergeIn(source, false);
  EXPECT_EQ(DestroyedTags(), std::vector<Text>{u"own"});
  EXPECT_EQ(target.GetStyleNames(), std::vector<Text>{u"Own"}); // still listed, destroyed
  EXPECT_TRUE(source.GetStyles().empty());
  EXPECT_EQ(source.GetStyleName(incoming), Text(u"In")); // pointer index untouched
  EXPECT_EQ(target.GetStyle(u"In"), nullptr);

  target.RemoveStyle(Text(u"Own")); // detach the destroyed style before the sheet goes
  delete incoming;
}

class CountingContext : public IStyleSheetDuplicationContext {
public:
  bool OnStyleDuplicated(Style* style, int reserved) override {
    seen.push_back(style);
    reservedValues.push_back(reserved);
    return false;
  }
  std::vector<Style*> seen;
  std::vector<int> reservedValues;
};

TEST_F(StyleSheetTest, CopyContentsFromCopiesDeeplyAndTakesVersion) {
  StyleSheet source;
  source.SetVersion(3);
  Style* base = MakeStyle(u"base");
  base->SetProperty(kSize, 9.0);
  source.AddStyle(u"Base", base, false);
  source.AddStyle(u"Body", MakeStyle(u"body", base), false);

  StyleSheet copy;
  copy.AddStyle(u"Old", MakeStyle(u"old"), false);
  CountingContext context;
  copy.CopyContentsFrom(source, &context);

  EXPECT_TRUE(WasDestroyed(u"old"));
  EXPECT_EQ(copy.GetVersion(), 3);
  EXPECT_EQ(copy.GetStyleNames(), (std::vector<Text>{u"Base", u"Body"}));
  EXPECT_EQ(context.seen, copy.GetStyles());
  EXPECT_EQ(context.reservedValues, (std::vector<int>{0, 0}));
  Style* copiedBody = copy.GetStyle(u"Body");
  ASSERT_NE(copiedBody, nullptr);
  EXPECT_NE(copiedBody->GetParent(), base);
  EXPECT_EQ(copiedBody->GetParent(), copy.GetStyle(u"Base"));
  EXPECT_EQ(copiedBody->GetProperty(kSize).Get<double>(), 9.0);

  // A version the document does not carry still reaches the copy.
  source.SetVersion(-5);
  copy.CopyContentsFrom(source, nullptr);
  EXPECT_EQ(copy.GetVersion(), -5);
  EXPECT_EQ(copy.GetStyles().size(), 2u);
}

TEST_F(StyleSheetTest, DocumentVersionRules) {
  struct Case {
    const char16_t* document;
    int expected;
  };
  for (const Case& c :
       {Case{uR"({"version": 3.9})", 3}, Case{uR"({"version": -2.5})", -2},
        Case{uR"({"version": "3"})", 0}, Case{uR"({"Version": 3})", 0}, Case{u"{}", 0},
        Case{uR"({"version": 1e300})", INT_MAX}, Case{uR"({"version": -1e300})", INT_MIN}}) {
    SCOPED_TRACE(Narrow(c.document));
    StyleSheet sheet;
    EXPECT_TRUE(sheet.ImportFromString(c.document, true));
    EXPECT_EQ(sheet.GetVersion(), c.expected);
  }

  StyleSheet sheet;
  sheet.SetVersion(0);
  EXPECT_EQ(Export(sheet), Text(u"{}"));
  sheet.SetVersion(4);
  EXPECT_EQ(Export(sheet), Text(uR"({"version":4})"));
}

// The document's ID is applied in both passes, so a style read gets the ID in
// force where its category stands.
TEST_F(StyleSheetTest, DocumentIdIsTakenOnlyBySheetWithOne) {
  const Text document = uR"({"id": "B", "sheetTestParagraph": {"P": {"id": "own"}}, "id": "C"})";
  StyleSheet plain;
  ASSERT_TRUE(plain.ImportFromString(document, true));
  EXPECT_EQ(plain.GetExternalID(), Text());
  EXPECT_EQ(plain.GetStyle(u"P")->GetExternalID(), Text(u"own"));

  StyleSheet linked;
  linked.SetExternalID(u"A");
  ASSERT_TRUE(linked.ImportFromString(document, true));
  EXPECT_EQ(linked.GetExternalID(), Text(u"C"));
  EXPECT_EQ(linked.GetStyle(u"P")->GetExternalID(), Text(u"B"));
}

TEST_F(StyleSheetTest, ImportResolvesParentsInAnyOrder) {
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(uR"({
    "sheetTestCharacter": {"Strong": {"inherits": "base"}},
    "sheetTestParagraph": {"Child": {"inherits": "Base"}, "Base": {"size": "20"}}})",
                                     true));
  Style* base = sheet.GetStyle(u"Base");
  ASSERT_NE(base, nullptr);
  EXPECT_EQ(sheet.GetStyle(u"Child")->GetParent(), base);
  EXPECT_EQ(sheet.GetStyle(u"Strong")->GetParent(), base);
  EXPECT_EQ(sheet.GetStyle(u"Child")->GetProperty(kSize).Get<double>(), 20.0);
  EXPECT_EQ(sheet.GetStyle(u"Strong")->GetCategoryName(), kCharacter);
}

TEST_F(StyleSheetTest, ImportBookkeepingSkipsAndRenamesParents) {
  WImportStyleInfo& info = GetStyleManager().GetImportStyleInfo();
  info.names.insert(u"Skipped");
  info.renames.emplace(u"Old", u"Base");
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(uR"({"sheetTestParagraph": {
    "Base": {}, "Skipped": {}, "A": {"inherits": "Skipped"}, "B": {"inherits": "Old"}}})",
                                     true));
  EXPECT_EQ(sheet.GetStyle(u"A")->GetParent(), nullptr);
  EXPECT_EQ(sheet.GetStyle(u"B")->GetParent(), sheet.GetStyle(u"Base"));
}

TEST_F(StyleSheetTest, ImportReplaceDecidesWhoWins) {
  const Text document = uR"({"sheetTestParagraph": {"body": {"size": "30"}, "New": {}}})";
  StyleSheet keep;
  Style* existing = MakeStyle(u"existing");
  existing->SetProperty(kSize, 10.0);
  keep.AddStyle(u"Body", existing, false);
  ASSERT_TRUE(keep.ImportFromString(document, false));
  EXPECT_EQ(keep.GetStyle(u"body"), existing);
  EXPECT_EQ(existing->GetProperty(kSize).Get<double>(), 10.0);
  EXPECT_EQ(keep.GetStyleName(existing), Text(u"Body"));
  EXPECT_NE(keep.GetStyle(u"New"), nullptr);

  StyleSheet replace;
  replace.AddStyle(u"Body", MakeStyle(u"existing"), false);
  ASSERT_TRUE(replace.ImportFromString(document, true));
  EXPECT_TRUE(WasDestroyed(u"existing"));
  EXPECT_EQ(replace.GetStyle(u"Body")->GetProperty(kSize).Get<double>(), 30.0);
  EXPECT_EQ(replace.GetStyleNames(), (std::vector<Text>{u"body", u"New"}));
}

TEST_F(StyleSheetTest, SameNameInTwoCategoriesMakesOneStyle) {
  for (bool replace : {false, true}) {
    SCOPED_TRACE(replace);
    StyleSheet sheet;
    ASSERT_TRUE(sheet.ImportFromString(uR"({"sheetTestParagraph": {"X": {"size": "11"}},
                                            "sheetTestCharacter": {"x": {"font": "Mono"}}})",
                                       replace));
    // Without replace the first spelling stays; with it the second takes over.
    EXPECT_EQ(sheet.GetStyleNames(), std::vector<Text>{replace ? u"x" : u"X"});
    Style* style = sheet.GetStyle(u"X");
    EXPECT_EQ(style->GetCategoryName(), kCharacter);
    EXPECT_EQ(style->GetProperty(kSize).Get<double>(), 11.0);
    EXPECT_EQ(style->GetProperty(kFont).Get<Text>(), Text(u"Mono"));
  }
}

TEST_F(StyleSheetTest, DamagedDocuments) {
  enum Outcome { kRejected, kAccepted, kThrows };
  struct Case {
    const char* label;
    Text document;
    Outcome outcome;
  };
  const Text deep = Text(u"{\"a\":") + Text(std::u16string(100000, u'[')) +
                    Text(std::u16string(100000, u']')) + u"}";
  const Text deepValue = Text(uR"({"sheetTestParagraph": {"D": {"size": )") +
                         Text(std::u16string(400, u'[')) + Text(std::u16string(400, u']')) + u"}}}";
  const Case cases[] = {
      {"empty", u"", kRejected},
      {"open brace", u"{", kRejected},
      {"truncated style", uR"({"sheetTestParagraph": {"A": {"size": "1)", kRejected},
      {"array", u"[]", kRejected},
      {"number", u"42", kRejected},
      {"deep nesting", deep, kRejected},
      {"number out of range", uR"({"version": 1e400})", kRejected},
      {"byte order mark", u"\ufeff{}", kAccepted},
      {"category is array", uR"({"sheetTestParagraph": []})", kAccepted},
      {"category is string", uR"({"sheetTestParagraph": "A"})", kAccepted},
      {"unknown category", uR"({"noSuchCategory": {"A": 5}})", kAccepted},
      {"id is number", uR"({"id": 5})", kAccepted},
      {"property is object", uR"({"sheetTestParagraph": {"A": {"size": {}}}})", kAccepted},
      {"inherits is number", uR"({"sheetTestParagraph": {"A": {"inherits": 5}}})", kAccepted},
      {"deep property value", deepValue, kAccepted},
      {"non-ASCII names", u"{\"sheetTestParagraph\": {\"\u00dcberschrift \u2713 \U0001F600\": {}}}",
       kAccepted},
      {"NUL in a name", uR"({"sheetTestParagraph": {"a\u0000b": {}}})", kAccepted},
      {"style is number", uR"({"sheetTestParagraph": {"A": 5}})", kThrows},
      {"unreadable number", uR"({"sheetTestParagraph": {"A": {"size": "big"}}})", kThrows},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.label);
    StyleSheet sheet;
    sheet.AddStyle(u"Keep", MakeStyle(u"keep"), false);
    const Text before = Export(sheet);
    switch (c.outcome) {
    case kRejected:
      EXPECT_FALSE(sheet.ImportFromString(c.document, true));
      EXPECT_EQ(Export(sheet), before);
      EXPECT_EQ(sheet.GetVersion(), 7);
      break;
    case kAccepted:
      EXPECT_TRUE(sheet.ImportFromString(c.document, true));
      EXPECT_NE(sheet.GetStyle(u"Keep"), nullptr);
      break;
    case kThrows:
      EXPECT_ANY_THROW(sheet.ImportFromString(c.document, true));
      break;
    }
  }
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

  StyleSheet other;
  EXPECT_THROW(
      other.ImportFromString(uR"({"sheetTestParagraph": {"A": {"size": "x"}, "B": {}}})", true),
      ZelPref::Detail::BadConversion);
  EXPECT_EQ(other.GetStyleNames(), (std::vector<Text>{u"A", u"B"}));
}

// A sheet with inheritance across categories, external fields and non-ASCII
// names; the document text must survive export, import and export.
void FillSample(StyleSheet& sheet) {
  Style* normal = new Style(nullptr, kParagraph);
  normal->SetProperty(kFont, Text(u"Garamond"));
  normal->SetProperty(kSize, 11.5);
  Style* heading = new Style(normal, kParagraph);
  heading->SetProperty(kSize, 18.0);
  Style* heading2 = new Style(heading, kParagraph);
  heading2->SetExternalID(u"word");
  heading2->SetExternalName(u"Heading 2");
  Style* strong = new Style(nullptr, kCharacter);
  strong->SetProperty(kFont, Text(u"Garamond Bold"));
  sheet.AddStyle(u"Normal", normal, false);
  sheet.AddStyle(u"\u00dcberschrift", heading, false);
  sheet.AddStyle(u"heading 2", heading2, false);
  sheet.AddStyle(u"Strong", strong, false);
}

TEST_F(StyleSheetTest, RoundTripKeepsTextAndEffectiveValues) {
  StyleSheet original;
  FillSample(original);
  const Text text = Export(original);

  StyleSheet copy;
  ASSERT_TRUE(copy.ImportFromString(text, true));
  EXPECT_EQ(Export(copy), text);
  EXPECT_EQ(copy.GetStyleNames(), original.GetStyleNames());
  for (Style* style : original.GetStyles()) {
    const Text name = original.GetStyleName(style);
    SCOPED_TRACE(Narrow(name));
    const Style* read = copy.GetStyle(name);
    ASSERT_NE(read, nullptr);
    EXPECT_EQ(read->GetCategoryName(), style->GetCategoryName());
    EXPECT_EQ(copy.GetStyleName(read->GetParent()), original.GetStyleName(style->GetParent()));
    EXPECT_EQ(read->GetExternalID(), style->GetExternalID());
    EXPECT_EQ(read->GetExternalName(), style->GetExternalName());
    for (const PropertyKey& key : {kSize, kFont})
      EXPECT_TRUE(read->GetProperty(key) == style->GetProperty(key));
  }

  // The stream layer gives the same sheet back.
  ZelUtils::Stream stream = ZelUtils::MemoryStream::Create();
  ASSERT_TRUE(original.Export(stream));
  StyleSheet streamed;
  ZelUtils::Stream reader =
      ZelUtils::MemoryStream::FromBytes(ZelUtils::MemoryStream::GetBytes(stream));
  ASSERT_TRUE(streamed.Import(reader, true));
  EXPECT_EQ(Export(streamed), text);

  ZelUtils::Stream garbage = ZelUtils::MemoryStream::FromBytes("\xff\xfe\x00{");
  EXPECT_FALSE(streamed.Import(garbage, true));
  ZelUtils::Stream unusable;
  EXPECT_FALSE(original.Export(unusable));
}

TEST_F(StyleSheetTest, TenThousandStylesRoundTrip) {
  constexpr int kCount = 10000;
  StyleSheet sheet;
  Style* previous = nullptr;
  for (int i = 0; i < kCount; ++i) {
    Style* style = new Style(i % 10 == 0 ? nullptr : previous, i % 2 ? kCharacter : kParagraph);
    style->SetProperty(kSize, static_cast<double>(i));
    sheet.AddStyle(Text::FormatInternal("Style %d", i), style, false);
    previous = style;
  }
  const Text text = Export(sheet);
  StyleSheet copy;
  ASSERT_TRUE(copy.ImportFromString(text, true));
  ASSERT_EQ(copy.GetStyles().size(), static_cast<std::size_t>(kCount));
  for (int i : {0, 1, 4999, 9999}) {
    const Style* style = copy.GetStyle(Text::FormatInternal("style %d", i));
    ASSERT_NE(style, nullptr);
    EXPECT_EQ(style->GetProperty(kSize).Get<double>(), static_cast<double>(i));
  }
  EXPECT_EQ(copy.GetStyle(u"Style 11")->GetParent(), copy.GetStyle(u"Style 10"));
  EXPECT_EQ(Export(copy), text);
}

} // namespace
} // namespace Styles
