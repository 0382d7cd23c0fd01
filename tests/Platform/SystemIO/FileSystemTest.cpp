#include <SystemIO/FileSystem.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include <sys/stat.h>
#include <unistd.h>

namespace {

using SystemIO::Directory;
using SystemIO::File;
using Text = ZelStringT<char16_t>;
namespace fs = std::filesystem;

class FileSystemTest : public ::testing::Test {
protected:
  void SetUp() override {
    fs::remove_all(m_folder);
    fs::create_directories(m_folder / "folder");
    for (const char* name : {"old", "new", "b", "\xC3\xBC", "bad\xFF"})
      std::ofstream(m_folder / name) << name;
  }
  void TearDown() override { fs::remove_all(m_folder); }
  Text PathOf(const std::u16string& name) const { return (m_folder / name).u16string(); }
  std::string Read(const std::string& name) const {
    std::ifstream in(m_folder / name);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
  }
  const fs::path m_folder =
      fs::path(::testing::TempDir()) / ("FileSystemTest-" + std::to_string(::getpid()));
};

TEST_F(FileSystemTest, MoveAsideAndRemoveChangeNothingWhenTheyFail) {
  EXPECT_TRUE(File::MoveAside(PathOf(u"new"), PathOf(u"moved")));
  EXPECT_EQ(Read("moved"), "new");
  EXPECT_FALSE(File::Exists(PathOf(u"new")));
  EXPECT_FALSE(File::MoveAside(PathOf(u"b"), PathOf(u"old")));    // never replaces
  EXPECT_FALSE(File::MoveAside(PathOf(u"b"), PathOf(u"folder"))); // nor a folder
  EXPECT_FALSE(File::MoveAside(PathOf(u"new"), PathOf(u"x")));    // no source
  EXPECT_FALSE(File::MoveAside(PathOf(u"b"), PathOf(std::u16string(u"x\0y", 3))));
  EXPECT_EQ(Read("b"), "b");
  EXPECT_EQ(Read("old"), "old");

  EXPECT_TRUE(File::Remove(PathOf(u"b")));
  EXPECT_FALSE(File::Exists(PathOf(u"b")));
  EXPECT_FALSE(File::Remove(PathOf(u"b")));
  EXPECT_FALSE(File::Remove(PathOf(u"folder")));
  EXPECT_TRUE(File::Exists(PathOf(u"folder")));
}

// Only regular files within the limit are read; pipes and devices are refused
// without waiting or reading.
TEST_F(FileSystemTest, ReadRegularRefusesWhatIsNotASmallRegularFile) {
  ASSERT_EQ(::mkfifo((m_folder / "fifo").c_str(), 0600), 0);
  fs::create_symlink("/dev/zero", m_folder / "zero");
  struct Case {
    const char16_t* name;
    std::size_t limit;
    const char* result; // the bytes, or a part of the reason
  };
  for (const Case& c :
       {Case{u"old", 3, "old"}, Case{u"old", 2, "larger than 2 bytes"},
        Case{u"fifo", 99, "not a regular file"}, Case{u"zero", 99, "not a regular file"},
        Case{u"folder", 99, "not a regular file"}, Case{u"missing", 99, "No such file"}}) {
    SCOPED_TRACE(::testing::PrintToString(std::u16string(c.name)));
    std::string bytes = "stale", error;
    if (File::ReadRegular(PathOf(c.name), c.limit, bytes, &error)) {
      EXPECT_EQ(bytes, c.result);
    } else {
      EXPECT_EQ(bytes, "");
      EXPECT_NE(error.find(c.result), std::string::npos) << error;
    }
  }
}

// Links to regular files count; folders, dangling links and names that no
// UTF-16 path can name do not.
TEST_F(FileSystemTest, GetFileNamesListsRegularFilesSorted) {
  fs::create_symlink(m_folder / "b", m_folder / "link");
  fs::create_symlink(m_folder / "missing", m_folder / "dangling");
  EXPECT_EQ(Directory::GetFileNames(m_folder.u16string()),
            (std::vector<Text>{u"b", u"link", u"new", u"old", u"\u00fc"}));
  EXPECT_TRUE(Directory::GetFileNames(PathOf(u"missing")).empty());
  EXPECT_TRUE(Directory::GetFileNames(PathOf(u"b")).empty());
}

} // namespace
