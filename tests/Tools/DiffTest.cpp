#include <StylesTools/Diff.h>

#include "ToolsFixture.h"

#include <Styles/StyleSheet.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace Styles {
namespace Tools {
namespace {

using testing::U16;
using testing::U8;

using DiffTest = testing::DefaultSchemaTest;

std::string Line(const Difference& d) {
  static const char* const kKinds[] = {"added", "removed", "parent", "value", "effective"};
  return std::string(kKinds[static_cast<int>(d.kind)]) + " " + U8(d.category.GetString()) + " " +
         U8(d.style) + (d.path.IsEmpty() ? "" : " " + U8(d.path)) + ": " +
         (d.hasOld ? U8(d.oldValue) : "-") + " > " + (d.hasNew ? U8(d.newValue) : "-");
}

TEST_F(DiffTest, StylesMatchByNameAndReportWhatChanged) {
  struct Case {
    const char* name;
    const char* oldDocument;
    const char* newDocument;
    bool effective;
    std::vector<std::string> expected;
  };
  const Case cases[] = {
      {"names ignore letter case and keep the new spelling",
       R"({"paragraph": {"body": {"spaceAfter": "1"}}})",
       R"({"paragraph": {"Body": {"spaceAfter": "1"}}})",
       true,
       {}},
      {"same name in another category is another style",
       R"({"paragraph": {"X": {}}})",
       R"({"character": {"X": {}}})",
       false,
       {"added character X: - > -", "removed paragraph X: - > -"}},
      {"parents, values set, cleared and changed",
       R"({"paragraph": {"A": {}, "B": {}, "C": {"inherits": "A", "spaceAfter": "1", "alignment": "left"}}})",
       R"({"paragraph": {"A": {}, "B": {}, "C": {"inherits": "B", "spaceAfter": "2", "lineSpacing": "2"}}})",
       false,
       {"parent paragraph C: A > B", "value paragraph C spaceAfter: 1 > 2",
        "value paragraph C lineSpacing: - > 2", "value paragraph C alignment: left > -"}},
      {"substyles and list elements by path",
       R"({"paragraph": {"P": {"character": {"bold": "1"}}}, "table": {"T": {"cells": [{"padding": "1"}]}}})",
       R"({"character": {"S": {}}, "paragraph": {"P": {"character": {"inherits": "S", "bold": "0"}}},
           "table": {"T": {"cells": [{"padding": "2"}, {}]}}})",
       false,
       {"added character S: - > -", "parent paragraph P character: - > S",
        "value paragraph P character.bold: 1 > 0", "value table T cells: 1 style > 2 styles",
        "value table T cells[0].padding: 1 > 2"}},
      {"effective values changed through a parent, own changes listed once",
       R"({"paragraph": {"A": {"spaceAfter": "1"}, "B": {"inherits": "A", "lineSpacing": "1"}}})",
       R"({"paragraph": {"A": {"spaceAfter": "3"}, "B": {"inherits": "A", "lineSpacing": "2"}}})",
       true,
       {"value paragraph A spaceAfter: 1 > 3", "value paragraph B lineSpacing: 1 > 2",
        "effective paragraph B spaceAfter: 1 > 3"}},
      {"an inherited substyle appears as effective values",
       R"({"paragraph": {"A": {}, "B": {"inherits": "A"}}})",
       R"({"paragraph": {"A": {"character": {"italic": "1"}}, "B": {"inherits": "A"}}})",
       true,
       {"value paragraph A character.italic: - > 1",
        "effective paragraph A character.fontName: - > Times New Roman",
        "effective paragraph A character.fontSize: - > 12",
        "effective paragraph A character.colour: - > #000000",
        "effective paragraph A character.bold: - > 0",
        "effective paragraph A character.tracking: - > 0",
        "effective paragraph B character.fontName: - > Times New Roman",
        "effective paragraph B character.fontSize: - > 12",
        "effective paragraph B character.colour: - > #000000",
        "effective paragraph B character.bold: - > 0",
        "effective paragraph B character.italic: - > 1",
        "effective paragraph B character.tracking: - > 0"}},
      {"a chain resolves through the nearest own value",
       R"({"paragraph": {"A": {"spaceAfter": "1"}, "B": {"inherits": "A"},
           "C": {"inherits": "B", "spaceAfter": "2"}, "D": {"inherits": "C"}, "E": {"inherits": "D"}}})",
       R"({"paragraph": {"A": {"spaceAfter": "3"}, "B": {"inherits": "A"},
           "C": {"inherits": "B"}, "D": {"inherits": "C"}, "E": {"inherits": "D"}}})",
       true,
       {"value paragraph A spaceAfter: 1 > 3", "effective paragraph B spaceAfter: 1 > 3",
        "value paragraph C spaceAfter: 2 > -", "effective paragraph D spaceAfter: 2 > 3",
        "effective paragraph E spaceAfter: 2 > 3"}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    StyleSheet oldSheet, newSheet;
    ASSERT_TRUE(oldSheet.ImportFromString(U16(c.oldDocument), true));
    ASSERT_TRUE(newSheet.ImportFromString(U16(c.newDocument), true));
    std::vector<std::string> lines;
    for (const Difference& d : DiffSheets(oldSheet, newSheet, c.effective))
      lines.push_back(Line(d));
    EXPECT_EQ(lines, c.expected);
  }
}

// Each style's effective values cost its own properties, not its depth: a
// chain of 200k styles, every one changed through the root, takes seconds
// (a walk up the chain per style would take hours).
TEST_F(DiffTest, EffectiveDiffOfALongChainIsLinear) {
  constexpr int kStyles = 200000;
  StyleSheet sheets[2];
  for (int version = 0; version < 2; ++version) {
    std::string text = R"({"paragraph": {"P0": {"spaceAfter": ")" + std::to_string(version) + "\"}";
    for (int i = 1; i < kStyles; ++i)
      text += ",\"P" + std::to_string(i) + R"(": {"inherits": "P)" + std::to_string(i - 1) + "\"}";
    ASSERT_TRUE(sheets[version].ImportFromString(U16(text + "}}"), true));
  }
  const std::vector<Difference> differences = DiffSheets(sheets[0], sheets[1], true);
  ASSERT_EQ(differences.size(), static_cast<std::size_t>(kStyles));
  EXPECT_EQ(Line(differences.back()), "effective paragraph P99999 spaceAfter: 0 > 1");
}

} // namespace
} // namespace Tools
} // namespace Styles
