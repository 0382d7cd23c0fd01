#include <SystemIO/AtomicFile.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <sstream>
#include <string>

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

namespace fs = std::filesystem;

class AtomicFileTest : public ::testing::Test {
protected:
  void SetUp() override {
    fs::remove_all(m_folder);
    fs::create_directories(m_folder / "sub");
    std::ofstream(m_folder / "old") << "old";
    fs::permissions(m_folder / "old", fs::perms(0640));
    fs::create_symlink(m_folder / "old", m_folder / "link");
    fs::create_symlink(m_folder / "missing", m_folder / "dangling");
    ASSERT_EQ(::mkfifo((m_folder / "fifo").c_str(), 0600), 0);
  }
  void TearDown() override { fs::remove_all(m_folder); }
  std::string Read(const std::string& name) const {
    std::ifstream in(m_folder / name);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
  }
  std::set<std::string> Names() const {
    std::set<std::string> names;
    for (const auto& entry : fs::directory_iterator(m_folder))
      names.insert(entry.path().filename().string());
    return names;
  }
  const fs::path m_folder =
      fs::path(::testing::TempDir()) / ("AtomicFileTest-" + std::to_string(::getpid()));
  const std::set<std::string> m_initial = {"old", "link", "dangling", "fifo", "sub"};
};

// What each target becomes: written (through links, keeping the permission
// bits) or refused with a reason and nothing changed. No row leaves a file
// behind, and none hangs on the pipe.
TEST_F(AtomicFileTest, WritesRegularFilesAndRefusesTheRest) {
  struct Case {
    const char* name;
    const char* reason; // null: written
    const char* holder; // the file that receives the bytes
  };
  for (const Case& c :
       {Case{"new", nullptr, "new"}, Case{"old", nullptr, "old"}, Case{"link", nullptr, "old"},
        Case{"dangling", "missing", nullptr}, Case{"sub", "not a regular file", nullptr},
        Case{"fifo", "not a regular file", nullptr}, Case{"absent/x", "No such file", nullptr}}) {
    SCOPED_TRACE(c.name);
    SetUp();
    std::string error;
    const bool written =
        SystemIO::WriteFileAtomically((m_folder / c.name).string(), "bytes", &error);
    std::set<std::string> expected = m_initial;
    if (c.reason) {
      EXPECT_FALSE(written);
      EXPECT_NE(error.find(c.reason), std::string::npos) << error;
    } else {
      ASSERT_TRUE(written) << error;
      EXPECT_EQ(Read(c.holder), "bytes");
      expected.insert(c.name);
    }
    EXPECT_EQ(Names(), expected);
    EXPECT_EQ(fs::status(m_folder / "old").permissions(), fs::perms(0640));
    EXPECT_TRUE(fs::is_symlink(m_folder / "link"));
  }
}

unsigned long long OwnStartTime() {
  std::ifstream in("/proc/self/stat");
  const std::string stat{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
  std::istringstream fields(stat.substr(stat.rfind(')') + 2));
  std::string field;
  for (int index = 3; index < 22; ++index)
    fields >> field;
  unsigned long long start = 0;
  fields >> start;
  return start;
}

// Temporaries of ended writers go, those of live ones and foreign files stay;
// a reused process id with another start time counts as ended.
TEST_F(AtomicFileTest, StaleTemporariesOfEndedWritersAreRemoved) {
  const pid_t child = ::fork();
  ASSERT_GE(child, 0);
  if (child == 0)
    ::_exit(0);
  ASSERT_EQ(::waitpid(child, nullptr, 0), child);
  const std::string self = std::to_string(::getpid());
  const std::string start = std::to_string(OwnStartTime());
  const std::string hex = "-0123456789abcdef";
  struct Case {
    std::string name;
    bool removed;
  };
  const Case cases[] = {{".tmp-" + std::to_string(child) + "-" + start + hex, true},
                        {".tmp-" + self + "-" + start + "1" + hex, true},
                        {".tmp-" + self + "-" + start + hex, false},
                        {".tmp-0123456789abcdef", false}};
  for (const Case& c : cases)
    std::ofstream(m_folder / c.name) << "debris";
  ASSERT_TRUE(SystemIO::WriteFileAtomically((m_folder / "old").string(), "new"));
  for (const Case& c : cases)
    EXPECT_EQ(fs::exists(m_folder / c.name), !c.removed) << c.name;
}

} // namespace
