#include <Styles/FolderPresetManager.h>

#include <Styles/StyleSheet.h>

#include "PresetFixture.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

namespace Styles {
namespace {

using testing::Text;
using Names = std::vector<Text>;

class FolderPresetManagerTest : public testing::PresetFixture {};

TEST_F(FolderPresetManagerTest, SetsRoundTripThroughAFreshManager) {
  const Names presetNames = {u"Heading 1", u"\u00dcberschrift \u2713 \U0001F600", u"a/../b",
                             u"quote \" back \\ tab\t", Text(u"nul\0inside", 10)};
  Names stored;
  {
    FolderPresetManager manager(Folder());
    StyleSheet* sheet = manager.CreatePresetSet(u"Body");
    ASSERT_NE(sheet, nullptr);
    EXPECT_EQ(manager.CreatePresetSet(u"Body"), nullptr);
    EXPECT_EQ(manager.GetPresetStyleSheet(u"Body"), sheet);
    for (std::size_t i = 0; i < presetNames.size(); ++i) {
      const std::unique_ptr<Style> style(MakeStyle(presetNames[i], static_cast<double>(i)));
      ASSERT_TRUE(manager.AddPreset(u"Body", presetNames[i], style.get(), false));
    }
    stored = manager.GetPresetNames(u"Body");
    ASSERT_TRUE(manager.Save(u"Empty"));
  }

  FolderPresetManager fresh(Folder());
  EXPECT_EQ(fresh.GetPresetSetNames(), (Names{u"Body", u"Empty"}));
  EXPECT_EQ(fresh.GetPresetNames(u"Body"), stored);
  for (std::size_t i = 0; i < presetNames.size(); ++i) {
    const Style* preset = fresh.GetPreset(u"Body", presetNames[i]);
    ASSERT_NE(preset, nullptr);
    EXPECT_EQ(Tag(preset), presetNames[i]);
    EXPECT_EQ(Size(preset), static_cast<double>(i));
  }
  // An empty file holds no set yet, so a set can be started there.
  EXPECT_EQ(fresh.GetPresetStyleSheet(u"Empty"), nullptr);
  EXPECT_NE(fresh.CreatePresetSet(u"Empty"), nullptr);

  // A set is read once: another manager's change shows after a reload.
  EXPECT_EQ(fresh.GetPresetStyleSheet(u"Body"), fresh.GetPresetStyleSheet(u"Body"));
  EXPECT_TRUE(FolderPresetManager(Folder()).DeletePreset(u"Body", u"heading 1"));
  EXPECT_TRUE(fresh.DoesPresetNameExist(u"Body", u"Heading 1"));
  fresh.ReloadPresetSets();
  EXPECT_FALSE(fresh.DoesPresetNameExist(u"Body", u"Heading 1"));
  EXPECT_EQ(fresh.GetPresetNames(u"Body").size(), presetNames.size() - 1);
}

TEST_F(FolderPresetManagerTest, DamagedFilesAreNeverOverwrittenByLoads) {
  FolderPresetManager manager(Folder());
  EXPECT_EQ(manager.GetPresetStyleSheet(u"Missing"), nullptr);
  const std::unique_ptr<Style> style(MakeStyle(u"source"));
  const std::string cases[] = {
      "not json",
      "[1]",
      R"({"presetTestParagraph": {"A": {"size": "1)",
      R"({"presetTestParagraph": {"A": 5}})",                      // a style that is no object
      R"({"presetTestParagraph": {"A": {"size": "x"}, "B": {}}})", // a value the behaviour refuses
      std::string("\xff\xfe\x00{", 4),
  };
  for (const std::string& bytes : cases) {
    SCOPED_TRACE(bytes);
    WriteFile("Damaged.qsty", bytes);
    EXPECT_EQ(manager.GetPresetStyleSheet(u"Damaged"), nullptr);
    EXPECT_FALSE(manager.AddPreset(u"Damaged", u"A", style.get(), true));
    EXPECT_FALSE(manager.DeletePreset(u"Damaged", u"A"));
    EXPECT_TRUE(manager.GetPresetNames(u"Damaged").empty());
    EXPECT_EQ(manager.CreatePresetSet(u"Damaged"), nullptr);
    EXPECT_EQ(manager.GetPresetSetNames(), Names{u"Damaged"});
    EXPECT_EQ(ReadFile("Damaged.qsty"), bytes);
  }
}

} // namespace
} // namespace Styles
