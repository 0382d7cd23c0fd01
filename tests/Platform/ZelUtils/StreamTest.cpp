#include <ZelUtils/Stream.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <iterator>
#include <string>

#include <unistd.h>

namespace {

using ZelUtils::FileStream;
using ZelUtils::MemoryStream;
using ZelUtils::Stream;
using Text = ZelStringT<char16_t>;

// A fresh folder under the test temp folder, removed with the fixture.
class StreamTest : public ::testing::Test {
protected:
  void SetUp() override {
    std::filesystem::remove_all(m_folder);
    std::filesystem::create_directories(m_folder);
  }
  void TearDown() override { std::filesystem::remove_all(m_folder); }
  // The UTF-16 path of `name` inside the folder (ASCII folder names only).
  Text PathOf(const std::u16string& name) const {
    const std::string folder = m_folder.string() + "/";
    return Text(std::u16string(folder.begin(), folder.end()) + name);
  }
  const std::filesystem::path m_folder =
      std::filesystem::path(::testing::TempDir()) / ("StreamTest-" + std::to_string(::getpid()));
};

std::string ReadAll(Stream stream) {
  std::string bytes;
  char buffer[3]; // small on purpose: reads come in pieces
  while (const std::size_t count = stream.Read(buffer, sizeof buffer))
    bytes.append(buffer, count);
  return bytes;
}

TEST_F(StreamTest, FileRoundTripAndTruncation) {
  const auto openFiles = [] {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                         std::filesystem::directory_iterator());
  };
  const auto before = openFiles();
  const Text path = PathOf(u"caf\u00e9-\U0001F600.bin");
  const std::string bytes("one\0two\xFF", 8);
  {
    Stream stream = FileStream::Create(path);
    ASSERT_TRUE(stream && stream.IsWritable() && !stream.IsReadable());
    Stream copy = stream; // both handles write to one file, one after the other
    EXPECT_TRUE(stream.Write(bytes.data(), 4));
    stream = Stream(); // the last handle closes the file
    EXPECT_EQ(openFiles(), before + 1);
    EXPECT_TRUE(copy.Write(bytes.data() + 4, 4));
  }
  EXPECT_EQ(openFiles(), before);
  // Non-ASCII paths are UTF-8 on disk.
  EXPECT_TRUE(std::filesystem::exists(m_folder / "caf\xC3\xA9-\xF0\x9F\x98\x80.bin"));
  Stream reader = FileStream::Open(path);
  EXPECT_FALSE(reader.Write("x", 1));
  EXPECT_EQ(ReadAll(reader), bytes);
  ASSERT_TRUE(FileStream::Create(path)); // creating again empties the file
  EXPECT_EQ(ReadAll(FileStream::Open(path)), "");
}

TEST_F(StreamTest, BadPathsGiveUnusableStreams) {
  const std::u16string folder = PathOf(u"").GetStdString();
  struct Case {
    const char* name;
    Text path;
  };
  const Case cases[] = {
      {"empty path", Text()},
      {"missing folder", PathOf(u"missing/file.txt")},
      {"a folder", Text(folder)},
      {"embedded NUL", Text(folder + std::u16string(u"a\0b", 3))},
      {"unpaired surrogate", Text(folder + u"x\xD800y")},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_FALSE(FileStream::Create(c.path));
    EXPECT_FALSE(FileStream::Open(c.path));
  }
  EXPECT_FALSE(FileStream::Open(PathOf(u"never-written.txt")));
  EXPECT_FALSE(std::filesystem::exists(m_folder / "a")); // not truncated at the NUL

  Stream unusable;
  char byte = 'x';
  EXPECT_EQ(unusable.Read(&byte, 1), 0u);
  EXPECT_FALSE(unusable.Write(&byte, 1) || unusable.Flush());
  EXPECT_EQ(MemoryStream::GetBytes(unusable), "");
}

TEST_F(StreamTest, MemoryStreamsShareBytesAndPosition) {
  Stream stream = MemoryStream::FromBytes("abcdef");
  Stream copy = stream;
  char buffer[4] = {};
  EXPECT_EQ(stream.Read(buffer, 2), 2u);
  EXPECT_EQ(copy.Read(buffer, 4), 4u); // continues where the other handle stopped
  EXPECT_EQ(std::string(buffer, 4), "cdef");
  EXPECT_TRUE(stream.Write("gh", 2));
  EXPECT_EQ(MemoryStream::GetBytes(copy), "abcdefgh");
  EXPECT_EQ(ReadAll(copy), "gh");
}

} // namespace
