#include <SystemIO/FileSystem.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

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

TEST_F(FileSystemTest, ReplaceAndRemoveChangeNothingWhenTheyFail) {
  EXPECT_TRUE(File::Replace(PathOf(u"new"), PathOf(u"old")));
  EXPECT_EQ(Read("old"), "new");
  EXPECT_FALSE(fs::exists(m_folder / "new"));
  EXPECT_FALSE(File::Replace(PathOf(u"new"), PathOf(u"b")));    // no source
  EXPECT_FALSE(File::Replace(PathOf(u"b"), PathOf(u"folder"))); // a folder as target
  EXPECT_FALSE(File::Replace(PathOf(u"b"), PathOf(std::u16string(u"x\0y", 3))));
  EXPECT_EQ(Read("b"), "b");

  EXPECT_TRUE(File::Remove(PathOf(u"b")));
  EXPECT_FALSE(fs::exists(m_folder / "b"));
  EXPECT_FALSE(File::Remove(PathOf(u"b")));
  EXPECT_FALSE(File::Remove(PathOf(u"folder")));
  EXPECT_TRUE(fs::is_directory(m_folder / "folder"));
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
