#include <ZelUtils/Singleton.h>

#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

namespace {

struct Registry {
  Registry() { ++constructed; }
  static std::atomic<int> constructed;
};
std::atomic<int> Registry::constructed{0};

TEST(SingletonTest, CreatedOnceAcrossThreads) {
  std::vector<Registry*> seen(4);
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < seen.size(); ++i)
    threads.emplace_back([&seen, i] { seen[i] = &ZelUtils::Singleton<Registry>::Get(); });
  for (std::thread& thread : threads)
    thread.join();
  for (Registry* instance : seen)
    EXPECT_EQ(instance, seen[0]);
  EXPECT_EQ(Registry::constructed.load(), 1);
}

} // namespace
