#include <Styles/FolderPresetManager.h>

#include <Styles/StyleSheet.h>

#include "PresetFixture.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace Styles {
namespace {

using testing::Names;
using testing::Text;

class FolderPresetManagerTest : public testing::PresetFixture {};

TEST_F(FolderPresetManagerTest, SetsRoundTripThroughAFreshManager) {
  const Names presetNames = {u"Heading 1", u"\u00dcberschrift \U0001F600", u"a/../b",
                             u"quote \" back \\ tab\t", Text(u"nul\0inside", 10)};
  {
    FolderPresetManager manager(Folder());
    ASSERT_NE(manager.CreatePresetSet(u"Body"), nullptr);
    EXPECT_EQ(manager.CreatePresetSet(u"Body"), nullptr);
    for (std::size_t i = 0; i < presetNames.size(); ++i) {
      const std::unique_ptr<Style> style(MakeStyle(presetNames[i], static_cast<double>(i)));
      ASSERT_TRUE(manager.AddPreset(u"Body", presetNames[i], style.get(), false));
    }
    ASSERT_TRUE(manager.Save(u"Empty"));
  }
  WriteFile(".tmp-1-0-0123456789abcdef", "{}"); // a live writer's file is no set
  WriteFile("Notes.json", "{}");                 // nor a file of another extension
  FolderPresetManager fresh(Folder());
  EXPECT_EQ(fresh.GetPresetSetNames(), (Names{u"Body", u"Empty"}));
  EXPECT_EQ(fresh.GetPresetNames(u"Body").size(), presetNames.size());
  for (std::size_t i = 0; i < presetNames.size(); ++i) {
    const Style* preset = fresh.GetPreset(u"Body", presetNames[i]);
    ASSERT_NE(preset, nullptr);
    EXPECT_EQ(Tag(preset), presetNames[i]);
    EXPECT_EQ(Size(preset), static_cast<double>(i));
  }
  // An empty file holds no set yet, so one can be started there.
  EXPECT_EQ(fresh.GetPresetStyleSheet(u"Empty"), nullptr);
  EXPECT_NE(fresh.CreatePresetSet(u"Empty"), nullptr);

  // A set is read once: another manager's change shows after a reload.
  EXPECT_TRUE(FolderPresetManager(Folder()).DeletePreset(u"Body", u"heading 1"));
  EXPECT_TRUE(fresh.DoesPresetNameExist(u"Body", u"Heading 1"));
  fresh.ReloadPresetSets();
  EXPECT_FALSE(fresh.DoesPresetNameExist(u"Body", u"Heading 1"));
}

// Damaged files and special files load as nothing and are never overwritten
// by the editing operations; SetAsideDamagedSet moves them out of the way.
TEST_F(FolderPresetManagerTest, DamagedSetsLoadAsNothingUntilSetAside) {
  FolderPresetManager manager(Folder());
  EXPECT_EQ(manager.GetPresetStyleSheet(u"Missing"), nullptr);
  const std::unique_ptr<Style> style(MakeStyle(u"source"));
  const std::string cases[] = {
      "not json",
      "[1]",
      R"({"presetTestParagraph": {"A": {"size": "1)",
      R"({"presetTestParagraph": {"A": 5}})",                      // a style that is no object
      R"({"presetTestParagraph": {"A": {"size": "x"}, "B": {}}})", // a value that is refused
      std::string("\xff\xfe\x00{", 4),
      "fifo", // a pipe, and a link to a device: never read
      "/dev/zero",
  };
  for (const std::string& bytes : cases) {
    SCOPED_TRACE(bytes);
    const bool special = bytes == "fifo" || bytes == "/dev/zero";
    if (bytes == "fifo")
      ASSERT_EQ(::mkfifo(FileOf("Damaged.qsty").c_str(), 0600), 0);
    else if (bytes == "/dev/zero")
      std::filesystem::create_symlink(bytes, FileOf("Damaged.qsty"));
    else
      WriteFile("Damaged.qsty", bytes);
    EXPECT_EQ(manager.GetPresetStyleSheet(u"Damaged"), nullptr);
    EXPECT_FALSE(manager.AddPreset(u"Damaged", u"A", style.get(), true));
    EXPECT_FALSE(manager.DeletePreset(u"Damaged", u"A"));
    EXPECT_EQ(manager.CreatePresetSet(u"Damaged"), nullptr);
    EXPECT_EQ(manager.GetPresetSetNames(), special ? Names{} : Names{u"Damaged"});

    Text movedTo;
    ASSERT_TRUE(manager.SetAsideDamagedSet(u"Damaged", &movedTo));
    const std::string moved = std::filesystem::path(movedTo.GetStdString()).filename().string();
    EXPECT_EQ(moved.rfind("Damaged.qsty.damaged-", 0), 0u);
    EXPECT_EQ(special ? bytes : ReadFile(moved), bytes); // a pipe would block the read
    EXPECT_TRUE(manager.GetPresetSetNames().empty());
    EXPECT_NE(manager.CreatePresetSet(u"Damaged"), nullptr);
    EXPECT_FALSE(manager.SetAsideDamagedSet(u"Damaged")); // it loads now
    manager.ReloadPresetSets();
    std::filesystem::remove(FileOf("Damaged.qsty"));
  }
  EXPECT_EQ(Entries().size(), 1 + std::size(cases));
}

// A child process saves a large set over and over, flipping every preset
// between two generations and reporting each save it starts through a pipe.
// It is killed at a random moment after its first save starts, every third
// time after its second (the first one's generation alternating): the file
// must always hold one whole generation, never a truncation or a mix.
TEST_F(FolderPresetManagerTest, KilledSavesLeaveTheOldOrTheNewFile) {
  constexpr int kPresets = 150;
  constexpr int kKills = 200;
  const Text padding(std::u16string(100, u'p'));
  FolderPresetManager writer(Folder());
  StyleSheet* sheet = writer.CreatePresetSet(u"Big");
  ASSERT_NE(sheet, nullptr);
  for (int i = 0; i < kPresets; ++i) {
    const Text name = Text::FormatInternal("Preset %d", i);
    sheet->AddStyle(name, MakeStyle(name + padding, 0.0), false);
  }
  const auto start = std::chrono::steady_clock::now();
  ASSERT_TRUE(writer.Save(u"Big"));
  const auto saveTime = std::chrono::steady_clock::now() - start;
  ASSERT_GT(ReadFile("Big.qsty").size(), 20000u);

  std::mt19937 random(2024);
  // Kills spread over about two saves; fsync times vary widely, hence the
  // bounds that keep the test short.
  const long long saveMicroseconds =
      std::chrono::duration_cast<std::chrono::microseconds>(saveTime).count();
  std::uniform_int_distribution<long long> delay(0,
                                                 std::clamp(2 * saveMicroseconds, 5000LL, 40000LL));
  int seen[2] = {0, 0};
  for (int kill = 0; kill < kKills; ++kill) {
    int progress[2];
    ASSERT_EQ(::pipe(progress), 0);
    const pid_t child = ::fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      ::close(progress[0]);
      // Bounded, in case the parent dies before it can kill the child.
      const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
      for (int generation = kill / 3 % 2; std::chrono::steady_clock::now() < deadline;
           generation ^= 1) {
        for (Style* style : sheet->GetStyles())
          style->SetProperty(kSize, static_cast<double>(generation));
        const char starting = 1;
        if (::write(progress[1], &starting, 1) != 1)
          break;
        writer.Save(u"Big");
      }
      ::_exit(0);
    }
    ::close(progress[1]);
    // Until the first save starts, or every third time the second one.
    char starting[2];
    const ssize_t wanted = kill % 3 == 0 ? 2 : 1;
    ssize_t got = 0;
    for (ssize_t count = 1; got < wanted && count > 0; got += count)
      count = ::read(progress[0], starting + got, wanted - got);
    std::this_thread::sleep_for(std::chrono::microseconds(delay(random)));
    ::kill(child, SIGKILL);
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    ::close(progress[0]);
    ASSERT_EQ(got, wanted) << "kill " << kill;
    ASSERT_TRUE(WIFSIGNALED(status)) << "kill " << kill;

    FolderPresetManager reader(Folder());
    const StyleSheet* read = reader.GetPresetStyleSheet(u"Big");
    ASSERT_NE(read, nullptr) << "kill " << kill;
    const std::vector<Style*> presets = read->GetStyles();
    ASSERT_EQ(presets.size(), static_cast<std::size_t>(kPresets)) << "kill " << kill;
    const double generation = Size(presets.front());
    ASSERT_TRUE(generation == 0.0 || generation == 1.0);
    for (const Style* preset : presets) {
      ASSERT_EQ(Size(preset), generation) << "kill " << kill;
      ASSERT_EQ(Tag(preset), read->GetStyleName(preset) + padding) << "kill " << kill;
    }
    ++seen[static_cast<int>(generation)];
  }
  // Both generations were seen: kills landed between saves and inside them.
  // What the killed saves left goes with one more ordinary save.
  EXPECT_GT(seen[0], 0);
  EXPECT_GT(seen[1], 0);
  ASSERT_TRUE(writer.Save(u"Big"));
  EXPECT_EQ(Entries(), (std::set<std::string>{"presets", "presets/Big.qsty"}));
}

} // namespace
} // namespace Styles
