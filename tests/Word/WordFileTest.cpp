// Word files: every file of the corpus read, counted and written back; values
// of the default template worked out by hand; hostile files from
// tests/data/word/ listed in its cases.txt.
#include <StylesWord/WordFile.h>
#include <StylesWord/WordSchema.h>

#include <StylesTools/Provenance.h>
#include <StylesTools/Schema.h>

#include <Styles/StyleSheet.h>

#include <gtest/gtest.h>

#include <fstream>
#include <sstream>
#include <string>

namespace Styles {
namespace Word {
namespace {

using Text = ZelStringT<char16_t>;

std::string U8(const Text& text) { return ZelPlatform::Utf16ToUtf8(text.GetView()); }
Text U16(const std::string& text) { return Text(ZelPlatform::Utf8ToUtf16(text)); }

std::string Slurp(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::ostringstream out;
  out << in.rdbuf();
  return out.str();
}

std::string Exported(const StyleSheet& sheet) {
  Text text;
  sheet.ExportToString(text, true);
  return U8(text);
}

std::string Describe(const ReadReport& report) {
  std::string text =
      U8(report.error.part) + ": " + U8(report.error.element) + ": " + U8(report.error.message);
  for (const Problem& warning : report.warnings)
    text += "\n  " + U8(warning.element) + ": " + U8(warning.message);
  return text;
}

class WordFileTest : public ::testing::Test {
protected:
  void SetUp() override {
    Tools::SchemaError error;
    ASSERT_TRUE(Tools::RegisterSchema(WordSchema(), m_registration, error)) << U8(error.message);
  }
  void TearDown() override { Tools::DeregisterSchema(m_registration); }

  static std::size_t WordStyles(const StyleSheet& sheet) {
    std::size_t count = 0;
    for (const Style* style : sheet.GetStyles())
      count += IsPartStyle(sheet, style) ? 0 : 1;
    return count;
  }
  // The value `styles show` prints at `path`.
  static ZelUtils::Any At(const StyleSheet& sheet, const char* style, const char* path) {
    const Style* found = sheet.GetStyle(U16(style));
    EXPECT_NE(found, nullptr) << style;
    for (const Tools::EffectiveValue& value : Tools::ListEffectiveValues(*found))
      if (U8(value.path) == path)
        return *value.resolution.value;
    return ZelUtils::Any();
  }

  Tools::SchemaRegistration m_registration;
};

TEST_F(WordFileTest, CorpusReadsCountsAndRoundTrips) {
  struct Case {
    const char* file;
    std::size_t styles;
  };
  const Case cases[] = {{"word-default-template.docx", 164},  {"par-known-styles.docx", 45},
                        {"par-known-paragraphs.docx", 41},    {"test.docx", 38},
                        {"comments-rich-para.docx", 16},      {"txt-font-props.docx", 11},
                        {"txt-font-highlight-color.docx", 4}, {"tbl-having-applied-style.docx", 7},
                        {"sty-behav-props.docx", 7}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.file);
    const std::string package = Slurp(std::string(STYLES_WORD_CORPUS) + "/" + c.file);
    ASSERT_FALSE(package.empty());
    ASSERT_TRUE(IsWordFile(package));
    StyleSheet sheet;
    ReadReport report;
    ASSERT_TRUE(ReadWord(package, sheet, report)) << Describe(report);
    EXPECT_TRUE(report.warnings.empty()) << Describe(report);
    EXPECT_EQ(WordStyles(sheet), c.styles);

    // Written back, the part is the original one as canonical XML.
    std::string original, rewritten;
    Problem problem;
    ASSERT_TRUE(ReadStylesPart(package, original, problem));
    EXPECT_TRUE(SameXml(WriteStylesPart(sheet), original));

    // Through the package: the same sheet, and no other part changed.
    ASSERT_TRUE(WriteIntoPackage(package, sheet, rewritten, problem)) << U8(problem.message);
    StyleSheet again;
    ASSERT_TRUE(ReadWord(rewritten, again, report)) << Describe(report);
    EXPECT_EQ(Exported(again), Exported(sheet));
    const std::vector<std::string> parts = ListParts(package);
    EXPECT_EQ(ListParts(rewritten), parts);
    for (const std::string& part : parts) {
      std::string before, after;
      ASSERT_TRUE(ReadPart(package, part, before, problem));
      ASSERT_TRUE(ReadPart(rewritten, part, after, problem));
      if (part != "word/styles.xml") {
        EXPECT_EQ(before, after) << part;
      }
    }

    // Through the JSON document, nothing is lost either.
    StyleSheet json;
    ASSERT_TRUE(json.ImportFromString(U16(Exported(sheet)), false));
    EXPECT_TRUE(SameXml(WriteStylesPart(json), original));
  }
}

TEST_F(WordFileTest, DefaultTemplateValuesFollowWordsRules) {
  StyleSheet sheet;
  ReadReport report;
  ASSERT_TRUE(ReadWord(Slurp(std::string(STYLES_WORD_CORPUS) + "/word-default-template.docx"),
                       sheet, report));
  using ZelUtils::Any;
  struct Case {
    const char* style;
    const char* path;
    Any expected;
  };
  const Case cases[] = {
      // sz 28 half-points; the rest from docDefaults (sz 22, after 200 twips, line 276/240).
      {"Heading 1", "character.fontSize", Any(14.0)},
      {"Heading 2", "character.fontSize", Any(13.0)},
      {"Normal", "character.fontSize", Any(11.0)},
      {"Heading 1", "spaceBefore", Any(24.0)},
      {"Heading 1", "spaceAfter", Any(0.0)},
      {"Normal", "spaceAfter", Any(10.0)},
      {"Normal", "lineSpacing", Any(1.15)},
      {"Title", "borderBottomWidth", Any(1.0)},
      {"Title", "character.characterSpacing", Any(0.25)},
      // Theme fonts resolved through the theme part, the reference kept.
      {"Heading 1", "character.fontAscii", Any(Text(u"Calibri"))},
      {"Heading 1", "character.fontAsciiTheme", Any(Text(u"majorHAnsi"))},
      {"Normal", "character.fontHighAnsi", Any(Text(u"Cambria"))},
      {"Heading 1", "character.colour", Any(Text(u"#365F91"))},
      {"Heading 1", "character.colourThemeShade", Any(Text(u"BF"))},
      {"Light Shading", "firstRow.character.bold", Any(true)},
      {"Light Shading", "tableBorderTopWidth", Any(1.0)},
      {"Light Shading", "cellMarginLeft", Any(5.4)},
      {"Heading 1 Char", "bold", Any(true)},
      // A style's own data is not taken from the style it is based on.
      {"Normal", "isDefault", Any(true)},
      {"Heading 1", "isDefault", Any(false)},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.style) + " " + c.path);
    EXPECT_TRUE(At(sheet, c.style, c.path) == c.expected);
  }

  // The toggle rule across levels: bold in both the paragraph and the
  // character style cancels out; within one chain the nearest value wins.
  const PropertyKey bold(u"bold"), italic(u"italic"), size(u"fontSize");
  const auto run = [&](const char* paragraph, const char* character, const PropertyKey& key) {
    RunStyles styles;
    styles.paragraph = paragraph ? sheet.GetStyle(U16(paragraph)) : nullptr;
    styles.character = character ? sheet.GetStyle(U16(character)) : nullptr;
    return ResolveRunProperty(sheet, styles, key);
  };
  EXPECT_FALSE(run("Heading 1", "Strong", bold).value.Get<bool>());
  EXPECT_TRUE(run("Normal", "Strong", bold).value.Get<bool>());
  EXPECT_TRUE(run("Heading 1", nullptr, bold).value.Get<bool>());
  EXPECT_TRUE(run("Heading 1", "Emphasis", italic).value.Get<bool>());
  EXPECT_FALSE(run("Normal", nullptr, bold).value.Get<bool>());
  const RunValue heading = run("Heading 1", "Emphasis", size);
  EXPECT_EQ(heading.value.Get<double>(), 14.0);
  EXPECT_EQ(heading.source,
            sheet.GetStyle(u"Heading 1")->GetSubstyle(PropertyKey(u"character"), false));

  // A table's first row sets bold over the whole table, within the table's level.
  RunStyles cell;
  cell.table = sheet.GetStyle(u"Light Shading");
  EXPECT_FALSE(ResolveRunProperty(sheet, cell, bold).value.Get<bool>());
  cell.formats = {PropertyKey(u"band1Horz"), PropertyKey(u"firstRow")};
  const RunValue firstRow = ResolveRunProperty(sheet, cell, bold);
  EXPECT_TRUE(firstRow.value.Get<bool>());
  EXPECT_EQ(firstRow.source, cell.table->GetSubstyle(PropertyKey(u"firstRow"), false)
                                 ->GetSubstyle(PropertyKey(u"character"), false));
  cell.paragraph = sheet.GetStyle(u"Heading 1");
  EXPECT_FALSE(ResolveRunProperty(sheet, cell, bold).value.Get<bool>());
}

TEST_F(WordFileTest, SheetFromJsonWritesWordsUnitsOrderAndIds) {
  // Styles made outside Word: IDs from their names, chains from the defaults
  // without w:basedOn, points back to Word's units, children in Word's order.
  const std::string folder = STYLES_WORD_DATA;
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(U16(Slurp(folder + "/from-json.json")), false));
  const std::string written = WriteStylesPart(sheet);
  EXPECT_TRUE(SameXml(written, Slurp(folder + "/from-json.xml"))) << written;
}

TEST_F(WordFileTest, HostileFilesFailOrWarnClearly) {
  // Each line of cases.txt: file, "error", "warning" or "ok", and a text the
  // problems' parts, elements and messages must hold.
  const std::string folder = STYLES_WORD_DATA;
  std::istringstream cases(Slurp(folder + "/cases.txt"));
  std::string line;
  int count = 0;
  Limits limits;
  limits.maxPartSize = 2 << 20;
  while (std::getline(cases, line)) {
    if (line.empty() || line[0] == '#')
      continue;
    std::istringstream fields(line);
    std::string file, kind, expected;
    fields >> file >> kind;
    std::getline(fields >> std::ws, expected);
    SCOPED_TRACE(line);
    ++count;
    const std::string bytes = file == "deep-chain.xml" ? [] {
      // 10,000 styles, each based on the one before.
      std::string xml = "<w:styles xmlns:w=\"w\">";
      for (int i = 0; i < 10000; ++i)
        xml += "<w:style w:styleId=\"s" + std::to_string(i) + "\"><w:name w:val=\"s" +
               std::to_string(i) + "\"/>" +
               (i ? "<w:basedOn w:val=\"s" + std::to_string(i - 1) + "\"/>" : "") +
               "<w:rPr><w:sz w:val=\"" + std::to_string(i % 50 + 10) + "\"/></w:rPr></w:style>";
      return xml + "</w:styles>";
    }() : Slurp(folder + "/" + file);
    StyleSheet sheet;
    ReadReport report;
    const bool read = ReadWord(bytes, sheet, report, limits);
    EXPECT_EQ(read, kind != "error") << Describe(report);
    const std::string problems = Describe(report);
    EXPECT_NE(problems.find(expected), std::string::npos) << problems;
    if (kind == "ok") {
      EXPECT_TRUE(report.warnings.empty()) << problems;
    }
    if (!read) {
      EXPECT_TRUE(sheet.GetStyles().empty());
      continue;
    }
    // What was read in a repaired form is written so that it reads again
    // into a sheet that writes the same part.
    const std::string written = WriteStylesPart(sheet);
    StyleSheet again;
    EXPECT_TRUE(ReadWord(written, again, report)) << Describe(report);
    EXPECT_TRUE(SameXml(WriteStylesPart(again), written));
  }
  EXPECT_GE(count, 10);
}

} // namespace
} // namespace Word
} // namespace Styles
