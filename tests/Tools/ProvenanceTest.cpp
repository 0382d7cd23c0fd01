#include <StylesTools/Provenance.h>

#include "ToolsFixture.h"

#include <StylesTools/Diagnostics.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>
#include <Styles/StyleUtilities.h>

#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <random>
#include <string>
#include <typeinfo>
#include <vector>

namespace Styles {
namespace Tools {
namespace {

using testing::Text;
using testing::U16;
using testing::U8;

// Substyles nested two deep (top holds mid, mid holds leaf) beside a list of
// mids, so that owner-based inheritance runs through several owners.
constexpr const char* kNestedSchema = R"({"categories": [
  {"key": "leaf", "properties": [{"key": "size", "type": "number", "default": 1},
                                 {"key": "tag", "type": "text"}]},
  {"key": "mid", "properties": [{"key": "gap", "type": "number"},
                                {"key": "leaf", "type": "substyle", "category": "leaf"}]},
  {"key": "top", "properties": [{"key": "width", "type": "number"},
                                {"key": "mid", "type": "substyle", "category": "mid"},
                                {"key": "leaf", "type": "substyle", "category": "leaf"},
                                {"key": "items", "type": "array", "category": "mid"}]}]})";

class ProvenanceTest : public ::testing::Test {
protected:
  void SetUp() override {
    Schema schema;
    SchemaError error;
    ASSERT_TRUE(ParseSchema(U16(kNestedSchema), schema, error)) << U8(error.message);
    ASSERT_TRUE(RegisterSchema(schema, m_registration, error));
  }
  void TearDown() override { DeregisterSchema(m_registration); }

  SchemaRegistration m_registration;
};

// A random sheet: styles of each category inherit from earlier ones (now and
// then from one of another category, which makes lookups throw), and own
// values and substyles at random; substyles may inherit too.
std::string RandomSheet(std::mt19937& random, int count) {
  const auto chance = [&](int percent) { return static_cast<int>(random() % 100) < percent; };
  const auto pick = [&](int n) { return static_cast<int>(random() % static_cast<unsigned>(n)); };
  const char* const kCategories[] = {"leaf", "mid", "top"};
  const auto name = [&](int category, int i) {
    return std::string(1, "lmt"[category]) + std::to_string(i);
  };
  // Top-level styles mostly inherit, substyles seldom: they mostly resolve
  // through their owners.
  const auto inherits = [&](int category, int below, int depth) -> std::string {
    if (below == 0 || !chance(depth == 0 ? 70 : 15))
      return "";
    const int from = chance(4) ? pick(3) : category;
    return "\"inherits\": \"" + name(from, pick(below)) + "\", ";
  };
  std::function<std::string(int, int, int)> body = [&](int category, int index, int depth) {
    std::string text = "{" + inherits(category, index, depth);
    if (category == 0) {
      if (chance(50))
        text += "\"size\": \"" + std::to_string(pick(20)) + "\", ";
      if (chance(30))
        text += "\"tag\": \"t" + std::to_string(pick(5)) + "\", ";
    } else {
      if (chance(50))
        text += category == 1 ? "\"gap\": \"" + std::to_string(pick(9)) + "\", "
                              : "\"width\": \"" + std::to_string(pick(9)) + "\", ";
      if (depth < 3 && chance(60))
        text += "\"leaf\": " + body(0, count, depth + 1) + ", ";
      if (category == 2 && chance(60))
        text += "\"mid\": " + body(1, count, depth + 1) + ", ";
      if (category == 2 && chance(25))
        text +=
            "\"items\": [" + body(1, count, depth + 1) + ", " + body(1, count, depth + 1) + "], ";
    }
    if (text.size() > 1 && text[text.size() - 2] == ',')
      text.resize(text.size() - 2);
    return text + "}";
  };
  std::string document = "{";
  for (int category = 0; category < 3; ++category) {
    document += std::string(category ? ", " : "") + "\"" + kCategories[category] + "\": {";
    for (int i = 0; i < count; ++i)
      document += (i ? ", \"" : "\"") + name(category, i) + "\": " + body(category, i, 0);
    document += "}";
  }
  return document + "}";
}

// Calls `visit` on `style` and on every substyle and list element below it.
void ForEachStyle(const Style& style, const std::function<void(const Style&)>& visit) {
  visit(style);
  for (const auto& entry : style.GetProperties()) {
    if (Style* const* substyle = entry.second.GetIf<Style*>(); substyle && *substyle)
      ForEachStyle(**substyle, visit);
    else if (const auto* list = entry.second.GetIf<std::vector<Style*>>())
      for (const Style* element : *list)
        if (element)
          ForEachStyle(*element, visit);
  }
}

// What a lookup gives: the address of the value, or the kind of exception.
template <class Lookup> std::string Outcome(Lookup lookup) {
  try {
    return std::to_string(reinterpret_cast<std::uintptr_t>(lookup()));
  } catch (const std::bad_cast&) {
    return "bad_cast";
  } catch (const std::exception&) {
    return "exception";
  }
}

bool IsAncestor(const Style& style, const Style* candidate) {
  for (const Style* parent = style.GetParent(); parent; parent = parent->GetParent())
    if (parent == candidate)
      return true;
  return false;
}

TEST_F(ProvenanceTest, ResolutionAgreesWithTheCoreOnGeneratedSheets) {
  std::mt19937 random(4711);
  const std::vector<PropertyPath> paths = {
      SplitPath(u"width"),    SplitPath(u"mid.gap"),   SplitPath(u"mid.leaf.size"),
      SplitPath(u"leaf.tag"), SplitPath(u"items.gap"), SplitPath(u"mid.leaf.nothing")};
  int compared = 0, thrown = 0, throughOwners = 0, severalOwnersUp = 0, flattened = 0;
  for (int round = 0; round < 100; ++round) {
    StyleSheet sheet;
    ASSERT_TRUE(sheet.ImportFromString(U16(RandomSheet(random, 12)), true));
    for (Style* top : sheet.GetStyles()) {
      ForEachStyle(*top, [&](const Style& style) {
        // A substyle reads as its owner's path (list elements have none).
        const Style* owner = style.GetOwner();
        if (const Text above = owner ? DescribeStyle(sheet, owner) : Text(); !above.IsEmpty()) {
          EXPECT_EQ(U8(DescribeStyle(sheet, &style)),
                    U8(above + u" \u203A " + style.GetOwnerPropertyKey().GetString()));
        }
        for (const PropertyKey& key : style.GetCategory()->GetPropertyOrder()) {
          Resolution resolution;
          const std::string expected = Outcome([&] { return &style.GetProperty(key); });
          EXPECT_EQ(Outcome([&] { return (resolution = ResolveProperty(style, key)).value; }),
                    expected);
          ++compared;
          if (expected == "bad_cast" || expected == "exception") {
            ++thrown;
            continue;
          }
          switch (resolution.source) {
          case ValueSource::Own:
            EXPECT_EQ(resolution.holder, &style);
            break;
          case ValueSource::Ancestor:
            EXPECT_TRUE(IsAncestor(style, resolution.holder));
            break;
          case ValueSource::Owner:
            ++throughOwners;
            ASSERT_NE(resolution.owner, nullptr);
            severalOwnersUp += resolution.owner != style.GetOwner() ? 1 : 0;
            EXPECT_TRUE(resolution.holder->GetProperties().Find(key));
            break;
          case ValueSource::Default:
            EXPECT_EQ(resolution.value, &resolution.category->GetDefaultValue(key));
            break;
          }
        }
      });
      for (const PropertyPath& path : paths)
        EXPECT_EQ(Outcome([&] { return ResolvePathProperty(*top, path).value; }),
                  Outcome([&] { return &top->GetPathProperty(path); }));

      // The effective values are what the flattened copy holds.
      std::vector<EffectiveValue> effective;
      std::unique_ptr<Style> copy;
      try {
        effective = ListEffectiveValues(*top);
        copy.reset(top->CreateFlattenedStyle());
      } catch (const std::exception&) {
        continue;
      }
      const std::vector<EffectiveValue> expected = ListEffectiveValues(*copy);
      ASSERT_EQ(effective.size(), expected.size()) << U8(sheet.GetStyleName(top));
      for (std::size_t i = 0; i < effective.size(); ++i) {
        EXPECT_EQ(U8(effective[i].path), U8(expected[i].path));
        EXPECT_EQ(U8(FormatValue(*effective[i].behaviour, *effective[i].resolution.value)),
                  U8(FormatValue(*expected[i].behaviour, *expected[i].resolution.value)))
            << U8(effective[i].path);
        EXPECT_NE(expected[i].resolution.source, ValueSource::Ancestor);
      }
      ++flattened;
    }
  }
  // The generator must reach every branch often enough to mean something.
  EXPECT_GT(compared, 15000);
  EXPECT_GT(thrown, 100);
  EXPECT_GT(throughOwners, 300);
  EXPECT_GT(severalOwnersUp, 30);
  EXPECT_GT(flattened, 2500);
}

TEST(ProvenanceSampleTest, HeadingOneExplainsEachValue) {
  SchemaRegistration registration;
  SchemaError error;
  ASSERT_TRUE(RegisterSchema(DefaultSchema(), registration, error));
  {
    ZelUtils::Stream file = ZelUtils::FileStream::Open(U16(STYLES_SAMPLE_SHEET));
    StyleSheet sheet;
    ASSERT_TRUE(ImportChecked(
        sheet, ZelUtils::TextStreamReader(file, ZelUtils::TextStream::UTF8).ReadToEnd(), true,
        nullptr));
    const Style* heading1 = sheet.GetStyle(u"heading 1");
    ASSERT_NE(heading1, nullptr);
    struct Case {
      const char* path;
      const char* value;
      ValueSource source;
      const char* from;
    };
    const Case cases[] = {
        {"spaceBefore", "24", ValueSource::Own, "Heading 1"},
        {"spaceAfter", "6", ValueSource::Ancestor, "Normal"},
        {"alignment", "left", ValueSource::Default, ""},
        {"character.fontName", "Avenir Next", ValueSource::Owner, "Heading \u203A character"},
        {"character.fontSize", "20", ValueSource::Own, "Heading 1 \u203A character"},
        {"character.bold", "0", ValueSource::Default, ""},
    };
    const std::vector<EffectiveValue> values = ListEffectiveValues(*heading1);
    for (const Case& c : cases) {
      SCOPED_TRACE(c.path);
      const auto found = std::find_if(values.begin(), values.end(), [&](const EffectiveValue& v) {
        return U8(v.path) == c.path;
      });
      ASSERT_NE(found, values.end());
      EXPECT_EQ(U8(FormatValue(*found->behaviour, *found->resolution.value)), c.value);
      EXPECT_EQ(found->resolution.source, c.source);
      EXPECT_EQ(U8(DescribeStyle(sheet, found->resolution.holder)), c.from);
    }
  }
  DeregisterSchema(registration);
}

} // namespace
} // namespace Tools
} // namespace Styles
