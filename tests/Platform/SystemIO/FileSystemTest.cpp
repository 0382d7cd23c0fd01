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
    fs::create_directories(m_folder);
  }
  void TearDown() override { fs::remove_all(m_folder); }
  // The UTF-16 path of `name` inside the folder (ASCII folder names only).
  Text PathOf(const std::u16string& name) const {
    const std::string folder = m_folder.string() + "/";
    return Text(std::u16string(folder.begin(), folder.end()) + name);
  }
  void Write(const std::string& name, const std::string& bytes) const {
    std::ofstream(m_folder / name, std::ios::binary) << bytes;
  }
  std::string Read(const std::string& name) const {
    std::ifstream in(m_folder / name, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
  }
  const fs::path m_folder =
      fs::path(::testing::TempDir()) / ("FileSystemTest-" + std::to_string(::getpid()));
};

TEST_F(FileSystemTest, ReplaceAndRemove) {
  Write("new", "new bytes");
  Write("old", "old bytes");
  fs::create_directory(m_folder / "folder");
  EXPECT_TRUE(File::Replace(PathOf(u"new"), PathOf(u"old")));
  EXPECT_EQ(Read("old"), "new bytes");
  EXPECT_FALSE(fs::exists(m_folder / "new"));
  EXPECT_TRUE(File::Replace(PathOf(u"old"), PathOf(u"caf\u00e9"))); // no file to replace
  EXPECT_EQ(Read("caf\xC3\xA9"), "new bytes");

  // Failures change nothing.
  Write("source", "source bytes");
  struct Case {
    const char* label;
    Text source, target;
  };
  const Case cases[] = {
      {"missing source", PathOf(u"missing"), PathOf(u"other")},
      {"target is a folder", PathOf(u"source"), PathOf(u"folder")},
      {"NUL in target", PathOf(u"source"), PathOf(std::u16string(u"a\0b", 3))},
      {"unpaired surrogate", PathOf(u"source"), PathOf(u"x\xD800")},
      {"empty target", PathOf(u"source"), Text()},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.label);
    EXPECT_FALSE(File::Replace(c.source, c.target));
    EXPECT_EQ(Read("source"), "source bytes");
  }

  EXPECT_TRUE(File::Remove(PathOf(u"source")));
  EXPECT_FALSE(fs::exists(m_folder / "source"));
  EXPECT_FALSE(File::Remove(PathOf(u"source")));
  EXPECT_FALSE(File::Remove(PathOf(u"folder")));
  EXPECT_TRUE(fs::is_directory(m_folder / "folder"));
  EXPECT_FALSE(File::Remove(Text()));
}

TEST_F(FileSystemTest, GetFileNamesListsRegularFilesSorted) {
  for (const char* name : {"b.qsty", "A.qsty", "\xC3\xBC.qsty", "bad\xFF.qsty"})
    Write(name, "x");
  fs::create_directory(m_folder / "sub.qsty");
  fs::create_symlink(m_folder / "b.qsty", m_folder / "link.qsty");
  fs::create_symlink(m_folder / "missing", m_folder / "dangling.qsty");
  EXPECT_EQ(Directory::GetFileNames(PathOf(u"")),
            (std::vector<Text>{u"A.qsty", u"b.qsty", u"link.qsty", u"\u00fc.qsty"}));
  EXPECT_TRUE(Directory::GetFileNames(PathOf(u"missing")).empty());
  EXPECT_TRUE(Directory::GetFileNames(PathOf(u"b.qsty")).empty());
}

} // namespace
