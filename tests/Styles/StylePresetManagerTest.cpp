#include <Styles/StylePresetManager.h>

#include <Styles/FolderPresetManager.h>
#include <Styles/StyleSheet.h>

#include "PresetFixture.h"

#include <gtest/gtest.h>

#include <csignal>
#include <memory>

#include <sys/resource.h>

namespace Styles {
namespace {

using testing::DestroyedTags;
using testing::Names;
using testing::Text;

class StylePresetManagerTest : public testing::PresetFixture {};

// Refused edits write nothing; names ignore case; a replaced, deleted or
// dropped copy is destroyed at once; deleting a missing preset still writes.
TEST_F(StylePresetManagerTest, EditingRules) {
  FolderPresetManager manager(Folder());
  ASSERT_NE(manager.CreatePresetSet(u"Set"), nullptr);
  std::filesystem::remove(FileOf("Set.qsty")); // any save brings it back
  const std::unique_ptr<Style> a(MakeStyle(u"a")), b(MakeStyle(u"b")), c(MakeStyle(u"c"));
  EXPECT_FALSE(manager.AddPreset(u"Unknown", u"A", a.get(), true));
  EXPECT_FALSE(manager.AddPreset(u"Set", u"", a.get(), true));
  EXPECT_FALSE(manager.AddPreset(u"Set", u"A", nullptr, true));
  EXPECT_FALSE(manager.DeletePreset(u"Set", u""));
  EXPECT_TRUE(Entries() == std::set<std::string>{"presets"});

  EXPECT_TRUE(manager.AddPreset(u"Set", u"Red", a.get(), false));
  EXPECT_TRUE(manager.AddPreset(u"Set", u"RED", b.get(), false)); // the copy is dropped
  EXPECT_EQ(Tag(manager.GetPreset(u"Set", u"red")), Text(u"a"));
  EXPECT_TRUE(manager.AddPreset(u"Set", u"rED", c.get(), true));
  EXPECT_EQ(DestroyedTags(), (Names{u"b", u"a"}));
  EXPECT_EQ(manager.GetPresetNames(u"Set"), Names{u"rED"});
  EXPECT_EQ(Tag(manager.GetPreset(u"Set", u"Red")), Text(u"c"));
  EXPECT_TRUE(manager.DoesPresetNameExist(u"Set", u"RED"));
  EXPECT_FALSE(manager.DoesPresetNameExist(u"Set", u"Blue"));
  EXPECT_EQ(manager.GetUnusedPresetName(u"Set", u""), Text());
  EXPECT_NE(manager.GetUnusedPresetName(u"Set", u"red").CompareNoCase(u"red"), 0);

  std::filesystem::remove(FileOf("Set.qsty"));
  EXPECT_FALSE(manager.DeletePreset(u"Set", u"Blue"));
  EXPECT_TRUE(std::filesystem::exists(FileOf("Set.qsty")));
  EXPECT_TRUE(manager.DeletePreset(u"Set", u"red"));
  EXPECT_EQ(DestroyedTags(), (Names{u"b", u"a", u"c"}));
  EXPECT_EQ(manager.GetPreset(u"Set", u"red"), nullptr);
}

// A preset keeps its source's effective values but no link to it, its
// parents or their sheet; presets read from a file that refer to one being
// destroyed take over its values first.
TEST_F(StylePresetManagerTest, PresetsStandAlone) {
  FolderPresetManager manager(Folder());
  ASSERT_NE(manager.CreatePresetSet(u"Set"), nullptr);
  auto document = std::make_unique<StyleSheet>();
  Style* base = MakeStyle(u"base", 20.0);
  base->SetProperty(kFont, Text(u"Mono"));
  document->AddStyle(u"Base", base, false);
  Style* child = new Style(base, kCategory);
  document->AddStyle(u"Child", child, false);
  ASSERT_TRUE(manager.AddPreset(u"Set", u"P", child, false));
  child->SetProperty(kSize, 99.0);
  document.reset();
  const Style* preset = manager.GetPreset(u"Set", u"P");
  EXPECT_FALSE(preset->HasParentalDependency());
  EXPECT_EQ(Size(preset), 20.0);
  EXPECT_EQ(preset->GetProperty(kFont).Get<Text>(), Text(u"Mono"));

  for (const bool replace : {false, true}) {
    SCOPED_TRACE(replace ? "replaced" : "deleted");
    WriteFile("Linked.qsty",
              R"({"presetTestParagraph": {"A": {"font": "Mono"}, "B": {"inherits": "A"}}})");
    manager.ReloadPresetSets();
    ASSERT_NE(manager.GetPreset(u"Linked", u"B")->GetParent(), nullptr);
    const std::unique_ptr<Style> other(MakeStyle(u"other"));
    EXPECT_TRUE(replace ? manager.AddPreset(u"Linked", u"A", other.get(), true)
                        : manager.DeletePreset(u"Linked", u"A"));
    // A replaced preset's followers follow its name; a deleted one's take
    // over its values.
    const Style* b = manager.GetPreset(u"Linked", u"B");
    EXPECT_EQ(b->GetParent(), replace ? manager.GetPreset(u"Linked", u"A") : nullptr);
    EXPECT_EQ(b->GetProperty(kFont).Get<Text>(), Text(replace ? u"Serif" : u"Mono"));
  }
}

TEST_F(StylePresetManagerTest, SaveWritesWholeFilesOrNothing) {
  FolderPresetManager manager(Folder());
  // A set without a sheet leaves an empty file; when no file can be made,
  // nothing is written and the save still counts as done.
  WriteFile("NoSheet.qsty", "old");
  EXPECT_TRUE(manager.Save(u"NoSheet"));
  EXPECT_EQ(ReadFile("NoSheet.qsty"), "");
  EXPECT_TRUE(FolderPresetManager((m_root / "missing").u16string()).Save(u"Set"));

  ASSERT_NE(manager.CreatePresetSet(u"Set"), nullptr);
  for (int i = 0; i < 50; ++i) {
    const std::unique_ptr<Style> style(MakeStyle(Text::FormatInternal("tag %d", i)));
    manager.AddPreset(u"Set", Text::FormatInternal("Preset %d", i), style.get(), false);
  }
  const std::string saved = ReadFile("Set.qsty");
  const std::set<std::string> entries = Entries();
  ASSERT_GT(saved.size(), 1024u);

  // A write that fails part way (the file size limit) reports false; a
  // behaviour's exception passes through. Both keep the old file and leave
  // no temporary file; the edit stays in memory.
  rlimit limit;
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &limit), 0);
  const rlimit small{1024, limit.rlim_max};
  const auto previousHandler = std::signal(SIGXFSZ, SIG_IGN);
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
  const bool saveResult = manager.Save(u"Set");
  ::setrlimit(RLIMIT_FSIZE, &limit);
  std::signal(SIGXFSZ, previousHandler);
  EXPECT_FALSE(saveResult);
  EXPECT_EQ(ReadFile("Set.qsty"), saved);
  const std::unique_ptr<Style> refused(MakeStyle(u"explode"));
  EXPECT_THROW(manager.AddPreset(u"Set", u"Refused", refused.get(), false), std::runtime_error);
  EXPECT_TRUE(manager.DoesPresetNameExist(u"Set", u"Refused"));
  EXPECT_EQ(ReadFile("Set.qsty"), saved);
  EXPECT_EQ(Entries(), entries);
}

// Set names from users never reach outside the folder; names that the file
// system refuses fail without leaving anything behind.
TEST_F(StylePresetManagerTest, UnsafeSetNamesWriteNothing) {
  FolderPresetManager manager(Folder());
  const std::unique_ptr<Style> style(MakeStyle(u"source"));
  const Text names[] = {u"",
                        u".",
                        u"..",
                        u"../up",
                        u"a/b",
                        u"/absolute",
                        u"a\\b",
                        Text(u"a\0b", 3),
                        Text(std::u16string(300, u'x')),
                        u"x\xD800"};
  for (const Text& name : names) {
    SCOPED_TRACE(::testing::PrintToString(name.GetStdString()));
    EXPECT_EQ(manager.CreatePresetSet(name), nullptr);
    EXPECT_FALSE(manager.Save(name));
    EXPECT_FALSE(manager.AddPreset(name, u"A", style.get(), true));
    EXPECT_FALSE(manager.DeletePreset(name, u"A"));
    EXPECT_EQ(manager.GetPreset(name, u"A"), nullptr);
    EXPECT_TRUE(manager.GetPresetNames(name).empty());
    EXPECT_FALSE(manager.DoesPresetNameExist(name, u"A"));
    EXPECT_EQ(manager.GetUnusedPresetName(name, u"A"), Text());
  }
  EXPECT_TRUE(Entries() == std::set<std::string>{"presets"});
}

} // namespace
} // namespace Styles
