#include <StylesTools/Diagnostics.h>

#include "ToolsFixture.h"

#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <gtest/gtest.h>

#include <map>
#include <random>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace Styles {
namespace Tools {
namespace {

using testing::Exported;
using testing::Text;
using testing::U16;
using testing::U8;

// A text property that fails while it is read when the text is "boom", as a
// host behaviour might: validation cannot see it coming.
class FragileProperty : public StyleProperty {
public:
  FragileProperty()
      : StyleProperty(ZelUtils::Any(Text()), new ZelPref::TextConversionPolicy, &IsText) {}
  bool Deserialize(const StyleSheet& sheet, Style* style, const JsonValue& in) const override {
    const Text* text = in.GetIf<Text>();
    if (text && *text == u"boom")
      throw std::runtime_error("fragile");
    return StyleProperty::Deserialize(sheet, style, in);
  }

private:
  static bool IsText(const ZelUtils::Any& value) { return value.GetIf<Text>() != nullptr; }
};

// The built-in schema, a "shape" category that raises the warnings only some
// properties can, and a "fragile" category.
class DiagnosticsTest : public testing::DefaultSchemaTest {
protected:
  void SetUp() override {
    testing::DefaultSchemaTest::SetUp();
    Schema shapes;
    SchemaError error;
    ASSERT_TRUE(ParseSchema(U16(R"({"version": 1, "categories": [{"key": "shape", "properties": [
        {"key": "angle", "type": "number"},
        {"key": "outline", "type": "number", "minimumVersion": 2},
        {"key": "legacyWidth", "type": "number", "deprecated": true}]}]})"),
                            shapes, error));
    ASSERT_TRUE(RegisterSchema(shapes, m_shapes, error));
    GetStyleManager().RegisterCategory(kFragile, u"Fragile", false, false);
    GetStyleManager().RegisterProperty(kFragile, PropertyKey(u"text"), new FragileProperty);
  }
  void TearDown() override {
    GetStyleManager().DeregisterCategory(kFragile);
    DeregisterSchema(m_shapes);
    testing::DefaultSchemaTest::TearDown();
  }

  const PropertyKey kFragile{u"fragile"};
  SchemaRegistration m_shapes;
};

TEST_F(DiagnosticsTest, EachCodeFromTheSmallestDocumentThatRaisesIt) {
  struct Case {
    const char* code;
    const char* document;
    const char* pointer;
    Severity severity;
  };
  const Case cases[] = {
      {"invalid-json", R"({"paragraph": })", "", Severity::Error},
      {"not-an-object", "[]", "", Severity::Error},
      {"style-not-object", R"({"paragraph": {"A": 1}})", "/paragraph/A", Severity::Error},
      {"wrong-kind", R"({"paragraph": {"A": {"inherits": 5}}})", "/paragraph/A/inherits",
       Severity::Error},
      {"wrong-kind", R"({"table": {"T": {"cells": [{}, null]}}})", "/table/T/cells/1",
       Severity::Error},
      {"bad-value", R"({"paragraph": {"A": {"spaceAfter": "wide"}}})", "/paragraph/A/spaceAfter",
       Severity::Error},
      {"type-rejected", R"({"paragraph": {"A": {"character": {"fontSize": "0"}}}})",
       "/paragraph/A/character/fontSize", Severity::Error},
      {"missing-parent", R"({"paragraph": {"A": {"inherits": "B"}}})", "/paragraph/A/inherits",
       Severity::Error},
      {"inheritance-cycle", R"({"paragraph": {"A/1": {"inherits": "a/1"}}})",
       "/paragraph/A~11/inherits", Severity::Error},
      {"parent-category", R"({"character": {"C": {}}, "paragraph": {"A": {"inherits": "C"}}})",
       "/paragraph/A/inherits", Severity::Error},
      {"duplicate-name", R"({"paragraph": {"Ä": {}}, "character": {"ä": {}}})", "/character/ä",
       Severity::Error},
      {"duplicate-member", R"({"paragraph": {"A": {"spaceAfter": "1", "spaceAfter": "2"}}})",
       "/paragraph/A/spaceAfter", Severity::Error},
      {"duplicate-member", R"({"version": 1, "version": 1})", "/version", Severity::Error},
      {"reserved-name", R"({"clash": {"C": {}}})", "/clash", Severity::Error},
      {"unknown-category", R"({"paragraph": {}, "heading": {}})", "/heading", Severity::Warning},
      {"unknown-property", R"({"paragraph": {"A": {"zoom": "2"}}})", "/paragraph/A/zoom",
       Severity::Warning},
      {"unknown-member", R"({"paragraph": {}, "author": "me"})", "/author", Severity::Warning},
      {"value-replaced", R"({"shape": {"S": {"angle": "steep"}}})", "/shape/S/angle",
       Severity::Warning},
      {"number-rounded", R"({"paragraph": {"A": {"spaceAfter": 1.23456789}}})",
       "/paragraph/A/spaceAfter", Severity::Warning},
      {"version-too-new", R"({"version": 2})", "/version", Severity::Warning},
      {"property-too-new", R"({"version": 1, "shape": {"S": {"outline": "1"}}})",
       "/shape/S/outline", Severity::Warning},
      {"deprecated-property", R"({"shape": {"S": {"legacyWidth": "1"}}})", "/shape/S/legacyWidth",
       Severity::Warning},
  };
  // A host's category with a property named like a style's own member.
  const PropertyKey clash(u"clash");
  GetStyleManager().RegisterCategory(clash, u"Clash", false, false);
  GetStyleManager().RegisterProperty(clash, PropertyKey(u"original"), new FragileProperty);
  for (const Case& c : cases) {
    SCOPED_TRACE(c.document);
    const std::vector<Diagnostic> diagnostics = ValidateDocument(U16(c.document));
    ASSERT_FALSE(diagnostics.empty());
    for (const Diagnostic& d : diagnostics) {
      EXPECT_EQ(d.code, c.code) << U8(d.message);
      EXPECT_EQ(U8(d.pointer), c.pointer);
      EXPECT_EQ(d.severity, c.severity);
    }
  }
  GetStyleManager().DeregisterCategory(clash);
  // Beside its warnings, a document of unknown members only reads as nothing.
  const std::vector<Diagnostic> unread = ValidateDocument(U16(R"({"heading": {"H": {}}})"));
  ASSERT_EQ(unread.size(), 2u);
  EXPECT_EQ(unread[1].code, "nothing-read");
  // The sample document is clean.
  ZelUtils::Stream file = ZelUtils::FileStream::Open(U16(STYLES_SAMPLE_SHEET));
  const Text sample = ZelUtils::TextStreamReader(file, ZelUtils::TextStream::UTF8).ReadToEnd();
  EXPECT_TRUE(ValidateDocument(sample).empty());
}

TEST_F(DiagnosticsTest, TextThatIsNotJsonGivesLineAndColumnInCharacters) {
  // The astral character before the fault is one character, two code units.
  const std::vector<Diagnostic> diagnostics =
      ValidateDocument(U16("{\"paragraph\": {\n  \"\xF0\x9F\x8E\xA8\": {\"a\" 1}}}"));
  ASSERT_EQ(diagnostics.size(), 1u);
  EXPECT_EQ(diagnostics[0].code, "invalid-json");
  EXPECT_EQ(diagnostics[0].line, 2);
  EXPECT_EQ(diagnostics[0].column, 13);
}

TEST_F(DiagnosticsTest, ATargetSheetDecidesWhatNamesStandFor) {
  StyleSheet target;
  ASSERT_TRUE(target.ImportFromString(
      u"{\"paragraph\": {\"Base\": {}, \"Child\": {\"inherits\": \"Base\"}}}", true));
  Json::Value value;
  Text error;
  const auto codes = [&](const char* document, bool replace) {
    EXPECT_TRUE(Json::Parse(U16(document), value, error));
    std::vector<std::string> found;
    for (const Diagnostic& d : ValidateDocument(value.Get<Json::Object>(), &target, replace))
      found.push_back(d.code + " " + U8(d.pointer));
    return found;
  };
  using Codes = std::vector<std::string>;
  EXPECT_EQ(codes(R"({"paragraph": {"A": {"inherits": "base"}}})", false), Codes{});
  EXPECT_EQ(codes(R"({"paragraph": {"BASE": {"spaceAfter": "1"}}})", false),
            Codes{"name-taken /paragraph/BASE"});
  // Replacing Base makes Child follow the new Base, which cannot inherit from it.
  EXPECT_EQ(codes(R"({"paragraph": {"Base": {"inherits": "Child"}}})", true),
            Codes{"inheritance-cycle /paragraph/Base/inherits"});
  // Without replace the document's Base is not read at all.
  EXPECT_EQ(codes(R"({"paragraph": {"Base": {"inherits": "Child"}}})", false),
            Codes{"name-taken /paragraph/Base"});
}

TEST_F(DiagnosticsTest, AFailedImportLeavesTheTargetExactlyAsItWas) {
  StyleSheet target;
  target.SetExternalID(u"sheet");
  ASSERT_TRUE(
      target.ImportFromString(u"{\"version\": 1, \"paragraph\": {\"Base\": {\"spaceAfter\": "
                              u"\"1\"}, \"Child\": {\"inherits\": \"Base\"}}}",
                              true));
  const std::string before = Exported(target);
  Style* base = target.GetStyle(u"Base");
  Style* child = target.GetStyle(u"Child");

  // Base is replaced and a new style read before the fragile one throws.
  const Text document = u"{\"version\": 1, \"id\": \"other\", \"paragraph\": {\"Base\": "
                        u"{\"spaceAfter\": \"9\"}, \"New\": {\"inherits\": \"Child\"}}, "
                        u"\"fragile\": {\"F\": {\"text\": \"boom\"}}}";
  for (const bool replace : {true, false}) {
    std::vector<Diagnostic> diagnostics;
    EXPECT_FALSE(ImportChecked(target, document, replace, &diagnostics));
    ASSERT_FALSE(diagnostics.empty());
    EXPECT_EQ(diagnostics.back().code, "behaviour-failed");
    EXPECT_EQ(Exported(target), before);
    EXPECT_EQ(target.GetStyle(u"Base"), base);
    EXPECT_EQ(child->GetParent(), base);
    EXPECT_EQ(target.GetStyles().size(), 2u);
    EXPECT_EQ(target.GetExternalID(), Text(u"sheet"));
  }
  // Errors found by validation stop the import before anything is read.
  EXPECT_FALSE(
      ImportChecked(target, u"{\"paragraph\": {\"X\": {\"inherits\": \"Y\"}}}", true, nullptr));
  EXPECT_EQ(Exported(target), before);
}

// Every parent, of a style or of a substyle, is a style of `sheet`, and every
// single substyle names its holder as owner: nothing points into the scratch
// sheet that the checked import used.
void ExpectSoundLinks(const StyleSheet& sheet, const Style& style) {
  if (style.GetParent()) {
    EXPECT_FALSE(sheet.GetStyleName(style.GetParent()).IsEmpty());
  }
  for (const auto& entry : style.GetProperties()) {
    if (Style* const* substyle = entry.second.GetIf<Style*>(); substyle && *substyle) {
      EXPECT_EQ((*substyle)->GetOwner(), &style);
      ExpectSoundLinks(sheet, **substyle);
    }
  }
}

// A random document over a few names in varying letter case, so that
// replacements, clashes, parents in the target and cycles all occur.
std::string RandomDocument(std::mt19937& random) {
  static const char* const kNames[] = {"Alpha", "beta", "Gamma", "delta", "Eps"};
  const auto pick = [&](int n) { return static_cast<int>(random() % static_cast<unsigned>(n)); };
  const auto spell = [&](int i) {
    std::string name = kNames[i];
    if (pick(3) == 0)
      name[0] = static_cast<char>(name[0] ^ 0x20); // the other letter case
    return name;
  };
  std::string paragraphs, characters;
  std::vector<bool> used(5, false);
  for (int n = pick(5) + 1; n-- > 0;) {
    const int i = pick(5);
    if (used[i])
      continue;
    used[i] = true;
    const bool character = i >= 3;
    std::string style = "\"" + spell(i) + "\": {";
    if (pick(3) != 0)
      style += "\"inherits\": \"" + spell(character ? 3 + pick(2) : pick(3)) + "\", ";
    style += character ? "\"fontSize\": \"" + std::to_string(8 + pick(9)) + "\""
                       : "\"spaceAfter\": \"" + std::to_string(pick(9)) + "\"";
    if (!character && pick(2) == 0)
      style += ", \"character\": {\"inherits\": \"" + spell(3 + pick(2)) + "\", \"bold\": \"1\"}";
    style += "}";
    std::string& list = character ? characters : paragraphs;
    list += (list.empty() ? "" : ", ") + style;
  }
  return "{\"version\": " + std::to_string(pick(2)) + ", \"paragraph\": {" + paragraphs +
         "}, \"character\": {" + characters + "}}";
}

TEST_F(DiagnosticsTest, ACheckedImportGivesWhatThePlainImportGives) {
  std::mt19937 random(20260401);
  int imported = 0, refused = 0;
  for (int round = 0; round < 300; ++round) {
    const std::string targetDocument = RandomDocument(random);
    const std::string document = RandomDocument(random);
    const bool replace = round % 2 == 0;
    SCOPED_TRACE(targetDocument + " <- " + document + (replace ? " replacing" : ""));
    StyleSheet checked, plain;
    for (StyleSheet* sheet : {&checked, &plain}) {
      sheet->SetExternalID(round % 3 == 0 ? u"ext" : u"");
      ASSERT_TRUE(sheet->ImportFromString(U16(targetDocument), true));
    }
    const std::string before = Exported(checked);
    std::map<std::string, const Style*> kept;
    for (const Text& name : checked.GetStyleNames())
      kept[U8(name)] = checked.GetStyle(name);

    Json::Value tree;
    Text error;
    if (Json::Parse(U16(document), tree, error) && tree.Is<Json::Object>()) {
      std::vector<Diagnostic> fromText = ValidateDocument(U16(document));
      for (Diagnostic& d : fromText)
        d.line = d.column = 0;
      const std::vector<Diagnostic> fromTree = ValidateDocument(tree.Get<Json::Object>());
      ASSERT_EQ(fromText.size(), fromTree.size());
      for (std::size_t i = 0; i < fromText.size(); ++i)
        EXPECT_EQ(U8(fromText[i].pointer) + fromText[i].code + U8(fromText[i].message),
                  U8(fromTree[i].pointer) + fromTree[i].code + U8(fromTree[i].message));
    }
    if (!ImportChecked(checked, U16(document), replace, nullptr)) {
      ++refused;
      EXPECT_EQ(Exported(checked), before);
      continue;
    }
    ++imported;
    ASSERT_TRUE(plain.ImportFromString(U16(document), replace));
    EXPECT_EQ(Exported(checked), Exported(plain));
    for (const Style* style : checked.GetStyles())
      ExpectSoundLinks(checked, *style);
    EXPECT_EQ(checked.GetVersion(), plain.GetVersion());
    EXPECT_EQ(checked.GetExternalID(), plain.GetExternalID());
    // Target styles that were not replaced are the same objects as before.
    if (!replace) {
      for (const auto& [name, style] : kept) {
        EXPECT_EQ(checked.GetStyle(U16(name)), style) << name;
      }
    }
  }
  EXPECT_GT(imported, 60);
  EXPECT_GT(refused, 20);
}

TEST_F(DiagnosticsTest, SelectingAStyleKeepsWhatItDependsOn) {
  const Text text = U16(R"({"version": 1, "note": 2, "paragraph": {
      "A": {"inherits": "b", "n": -1.5e-7, "f": [true, null, {"q": "\u00e9\""}]},
      "B": {"character": {"inherits": "Em"}}, "Unrelated": {}},
      "character": {"Em": {"inherits": "Base"}, "base": {}, "Other": {}},
      "unknown": {"A": {}}, "id": "x"})");
  Json::Value value;
  Text error;
  ASSERT_TRUE(Json::Parse(text, value, error));
  const std::string styles =
      R"("paragraph":{"A":{"inherits":"b","n":-1.5e-07,"f":[true,null,{"q":"é\""}]},)"
      R"("B":{"character":{"inherits":"Em"}}},"character":{"Em":{"inherits":"Base"},"base":{}})";
  const Json::Object part = SelectStyles(value.Get<Json::Object>(), {u"a"});
  EXPECT_EQ(U8(Json::ValueToString(Json::Value(part), false)),
            R"({"version":1,"note":2,)" + styles + R"(,"id":"x"})");
  // Moving the part out of the document gives the same part.
  EXPECT_EQ(SelectStyles(std::move(value.Get<Json::Object>()), {u"a"}), part);
  // From a compact parse, as text, keeping of the sheet's members the
  // version and the id only.
  Json::Document document;
  ASSERT_TRUE(document.ParseBorrowed(text, error));
  EXPECT_EQ(U8(SelectStylesText(document, {u"a"})), R"({"version":1,)" + styles + R"(,"id":"x"})");
}

} // namespace
} // namespace Tools
} // namespace Styles
