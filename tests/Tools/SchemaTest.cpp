#include <StylesTools/Schema.h>
#include <StylesTools/Provenance.h>

#include "ToolsFixture.h"

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>
#include <Styles/StyleUtilities.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace Styles {
namespace Tools {
namespace {

using testing::Exported;
using testing::Text;
using testing::U16;
using testing::U8;

TEST(SchemaTest, MalformedSchemasNameTheMemberAndRegisterNothing) {
  struct Case {
    const char* schema;
    const char* pointer;
  };
  const std::string property = R"({"categories": [{"key": "a", "properties": [)";
  const Case cases[] = {
      {"[]", ""},
      {"{\"categories\": [", ""},
      {"{}", ""},
      {R"({"categories": {}})", "/categories"},
      {R"({"categories": [{"name": "A"}]})", "/categories/0"},
      {R"({"categories": [{"key": "a.b"}]})", "/categories/0/key"},
      {R"({"categories": [{"key": "style"}]})", "/categories/0/key"},
      {R"({"categories": [{"key": "a"}, {"key": "id"}]})", "/categories/1/key"},
      {R"({"categories": [{"key": "a"}, {"key": "a"}]})", "/categories/1/key"},
      {R"({"categories": [{"key": "a", "a/b~": 1}]})", "/categories/0/a~1b~0"},
      {R"({"version": -1, "categories": []})", "/version"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "float"}]}]})",
       "/categories/0/properties/0/type"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "inherits", "type": "text"}]}]})",
       "/categories/0/properties/0/key"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "text", "defualt": ""}]}]})",
       "/categories/0/properties/0/defualt"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "text", "minimum": 1}]}]})",
       "/categories/0/properties/0/minimum"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "number", "minimum": 2, "default": 1}]}]})",
       "/categories/0/properties/0/default"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "integer", "default": 1.5}]}]})",
       "/categories/0/properties/0/default"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "enum"}]}]})",
       "/categories/0/properties/0"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "enum", "values": ["l", "l"]}]}]})",
       "/categories/0/properties/0/values/1"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "colour", "default": "red"}]}]})",
       "/categories/0/properties/0/default"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "substyle", "category": "b"}]}]})",
       "/categories/0/properties/0/category"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "array", "category": "a", "default": []}]}]})",
       "/categories/0/properties/0/default"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "substyle", "category": "a", "perStyle": true}]}]})",
       "/categories/0/properties/0/perStyle"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "bool", "minimumVersion": 1.5}]}]})",
       "/categories/0/properties/0/minimumVersion"},
      {R"({"categories": [{"key": "a", "properties": [{"key": "x", "type": "bool"}, {"key": "x", "type": "text"}]}]})",
       "/categories/0/properties/1/key"},
  };
  const std::vector<PropertyKey> before = GetStyleManager().GetCategoryNames();
  for (const Case& c : cases) {
    SCOPED_TRACE(c.schema);
    Schema schema;
    SchemaError error;
    EXPECT_FALSE(ParseSchema(U16(c.schema), schema, error));
    EXPECT_EQ(U8(error.pointer), c.pointer) << U8(error.message);
    EXPECT_FALSE(error.message.IsEmpty());
  }
  EXPECT_EQ(GetStyleManager().GetCategoryNames(), before);
}

TEST(SchemaTest, ASchemaNamingARegisteredCategoryIsRefusedWhole) {
  StyleManager& manager = GetStyleManager();
  const int version = manager.GetCurrentVersion();
  SchemaRegistration first;
  SchemaError error;
  ASSERT_TRUE(RegisterSchema(DefaultSchema(), first, error));
  EXPECT_EQ(manager.GetCurrentVersion(), 1);
  const BaseStyleProperty* fontSize =
      manager.GetStyleProperty(PropertyKey(u"character"), PropertyKey(u"fontSize"));

  // "fresh" comes first and is new, yet nothing of this schema may stay.
  Schema second;
  ASSERT_TRUE(
      ParseSchema(U16(R"({"version": 5, "categories": [{"key": "fresh"}, {"key": "character"}]})"),
                  second, error));
  SchemaRegistration refused;
  EXPECT_FALSE(RegisterSchema(second, refused, error));
  EXPECT_EQ(U8(error.pointer), "/categories/1/key");
  EXPECT_FALSE(refused.active);
  EXPECT_FALSE(manager.CategoryExists(u"fresh"));
  EXPECT_EQ(manager.GetStyleProperty(PropertyKey(u"character"), PropertyKey(u"fontSize")),
            fontSize);
  EXPECT_EQ(manager.GetCurrentVersion(), 1);
  DeregisterSchema(refused); // inactive: nothing happens

  DeregisterSchema(first);
  for (const char16_t* key : {u"character", u"paragraph", u"cell", u"table"})
    EXPECT_FALSE(manager.CategoryExists(key));
  EXPECT_EQ(manager.GetCurrentVersion(), version);
  // Registered again after deregistration, the schema works as before.
  ASSERT_TRUE(RegisterSchema(DefaultSchema(), first, error));
  DeregisterSchema(first);
}

using StockBehaviourTest = testing::DefaultSchemaTest;

TEST_F(StockBehaviourTest, PoliciesReadTextAndTypeChecksGuardBounds) {
  struct Case {
    const char16_t* category;
    const char16_t* property;
    const char16_t* text;
    bool readable;
    bool accepted;
  };
  const Case cases[] = {
      {u"character", u"fontSize", u"12.5", true, true},
      {u"character", u"fontSize", u"0", true, false}, // below the minimum of 1
      {u"character", u"fontSize", u"big", false, false},
      {u"character", u"tracking", u"-1000", true, true},
      {u"character", u"tracking", u"2000", true, false},
      {u"character", u"tracking", u"1000", true, true}, // the maximum itself
      {u"character", u"tracking", u"1.5", false, false},
      {u"character", u"bold", u"true", true, true},
      {u"character", u"bold", u"yes", false, false},
      {u"character", u"colour", u"#1f3a5c", true, true},
      {u"character", u"colour", u"#12345", false, false},
      {u"paragraph", u"alignment", u"center", true, true},
      {u"paragraph", u"alignment", u"Center", false, false},
      {u"character", u"fontName", u"", true, true},
  };
  const StyleManager& manager = GetStyleManager();
  for (const Case& c : cases) {
    SCOPED_TRACE(U8(Text(c.property) + u" " + c.text));
    const BaseStyleProperty* behaviour =
        manager.GetStyleProperty(PropertyKey(c.category), PropertyKey(c.property));
    ASSERT_NE(behaviour, nullptr);
    EXPECT_TRUE(behaviour->CheckType(behaviour->GetDefaultValue()));
    try {
      const ZelUtils::Any value = behaviour->GetConversionPolicy()->FromText(c.text);
      EXPECT_TRUE(c.readable);
      EXPECT_EQ(behaviour->CheckType(value), c.accepted);
    } catch (const ZelPref::Detail::BadConversion&) {
      EXPECT_FALSE(c.readable);
    }
  }
  // Numbers that no document could hold are refused, bounds or not.
  const BaseStyleProperty* spaceAfter =
      manager.GetStyleProperty(PropertyKey(u"paragraph"), PropertyKey(u"spaceAfter"));
  for (const double number : {std::numeric_limits<double>::infinity(), std::nan("")})
    EXPECT_FALSE(spaceAfter->CheckType(ZelUtils::Any(number)));
  // Colours are kept in upper case, so that equal colours compare equal.
  StyleSheet sheet;
  ASSERT_TRUE(sheet.ImportFromString(u"{\"character\": {\"C\": {\"colour\": \"#aabbcc\"}}}", true));
  EXPECT_EQ(Exported(sheet), R"({"character":{"C":{"colour":"#AABBCC"}}})");
}

TEST(SchemaTest, FlagsAndVersionsShapeWhatIsWritten) {
  Schema schema;
  SchemaError error;
  ASSERT_TRUE(ParseSchema(U16(R"({
    "version": 3,
    "styleCategoryName": "Ordinary",
    "categories": [
      {"key": "note", "styleSubstyle": true, "properties": [
        {"key": "text", "type": "text"},
        {"key": "scratch", "type": "text", "temporary": true},
        {"key": "old", "type": "text", "deprecated": true},
        {"key": "recent", "type": "integer", "minimumVersion": 3},
        {"key": "inner", "type": "substyle", "category": "note", "minimumVersion": 3},
        {"key": "mark", "type": "text", "default": "-", "perStyle": true}
      ]}
    ]})"),
                          schema, error))
      << U8(error.pointer) << U8(error.message);
  SchemaRegistration registration;
  ASSERT_TRUE(RegisterSchema(schema, registration, error)) << U8(error.message);
  {
    StyleManager& manager = GetStyleManager();
    const BaseStyleProperty* noteSet =
        manager.GetStyleProperty(StyleCategoryName, PropertyKey(u"note"));
    ASSERT_NE(noteSet, nullptr);
    EXPECT_TRUE(noteSet->IsSubstyle());
    EXPECT_EQ(manager.TranslateCategory(StyleCategoryName), Text(u"Ordinary"));
    EXPECT_TRUE(
        manager.GetStyleProperty(PropertyKey(u"note"), PropertyKey(u"old"))->IsDeprecated());

    StyleSheet sheet;
    ASSERT_TRUE(sheet.ImportFromString(
        u"{\"version\": 3, \"note\": {\"N\": {\"text\": \"t\", \"scratch\": \"s\", "
        u"\"recent\": \"7\", \"inner\": {\"text\": \"i\"}}}}",
        true));
    // The members "N" is written with, by name: their order follows key identity.
    const auto written = [&sheet](bool includeTemporary) {
      Json::Value document{Json::Object()};
      sheet.ExportJson(document, includeTemporary);
      std::map<std::string, std::string> members;
      const Json::Object& style = document.Get<Json::Object>()
                                      .Find(u"note")
                                      ->Get<Json::Object>()
                                      .Find(u"N")
                                      ->Get<Json::Object>();
      for (std::size_t i = 0; i < style.GetSize(); ++i)
        members[U8(style.GetValueName(i))] = U8(Json::ValueToString(style.GetValue(i), false));
      return members;
    };
    using Members = std::map<std::string, std::string>;
    EXPECT_EQ(written(false),
              (Members{{"text", "\"t\""}, {"recent", "\"7\""}, {"inner", R"({"text":"i"})"}}))
        << "temporary properties stay out unless asked for";
    sheet.SetVersion(2);
    EXPECT_EQ(written(true), (Members{{"text", "\"t\""}, {"scratch", "\"s\""}}))
        << "properties newer than the sheet stay out, substyles included";

    // A per-style value is the style's own or the default, never a parent's.
    StyleSheet marks;
    ASSERT_TRUE(marks.ImportFromString(
        u"{\"note\": {\"P\": {\"mark\": \"p\", \"text\": \"t\"}, \"C\": {\"inherits\": \"P\"}}}",
        true));
    Style& child = *marks.GetStyle(u"C");
    const PropertyKey mark(u"mark"), text(u"text");
    EXPECT_EQ(ResolveProperty(child, mark).source, ValueSource::Default);
    EXPECT_EQ(ResolveProperty(child, text).source, ValueSource::Ancestor);
    std::unique_ptr<Style> flat(child.CreateFlattenedStyle());
    EXPECT_FALSE(flat->DoesOverrideProperty(mark));
    EXPECT_TRUE(flat->DoesOverrideProperty(text));
    child.MergeParentProperties(marks.GetStyle(u"P"));
    EXPECT_FALSE(child.DoesOverrideProperty(mark));
    EXPECT_TRUE(child.DoesOverrideProperty(text));
  }
  DeregisterSchema(registration);
  EXPECT_FALSE(GetStyleManager().CategoryExists(u"style"));
  EXPECT_FALSE(GetStyleManager().CategoryExists(u"note"));
}

} // namespace
} // namespace Tools
} // namespace Styles
