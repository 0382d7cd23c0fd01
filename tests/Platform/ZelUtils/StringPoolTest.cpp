#include <ZelUtils/StringPool.h>

#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

namespace {

using ZelUtils::StringPool;

struct TestPool {
  static StringPool& Get() {
    static StringPool pool;
    return pool;
  }
};
using Key = ZelUtils::PooledString<TestPool>;

std::u16string Numbered(const char* prefix, int number) {
  const std::string text = prefix + std::to_string(number);
  return std::u16string(text.begin(), text.end());
}

TEST(StringPoolTest, KeysCompareAndHashByEntry) {
  const Key a(u"alpha");
  const Key b(ZelStringT<char16_t>(u"beta"));
  EXPECT_EQ(Key(static_cast<const char16_t*>(nullptr)), Key(u""));
  EXPECT_EQ(a, Key(u"alpha"));
  EXPECT_NE(a, Key(u"Alpha"));
  EXPECT_EQ(std::hash<Key>()(a), std::hash<const void*>()(&a.GetString()));
  // Order follows the entries' addresses, not the texts.
  EXPECT_EQ(a < b, std::less<const void*>()(&a.GetString(), &b.GetString()));
  // Find answers for pooled texts only and never adds.
  const std::size_t size = TestPool::Get().GetSize();
  EXPECT_EQ(Key::Find(u"alpha"), a);
  EXPECT_FALSE(Key::Find(u"gamma").has_value());
  EXPECT_EQ(TestPool::Get().GetSize(), size);
}

// Entries never move, and threads interning the same texts in racing orders
// agree on one entry per text.
TEST(StringPoolTest, EntriesAreStableAcrossThreadsAndGrowth) {
  StringPool pool;
  const StringPool::Entry* early = pool.AddString(u"k"); // short texts live inside the entry
  constexpr int kThreads = 4;
  constexpr int kTexts = 20000;
  std::vector<std::vector<const StringPool::Entry*>> results(
      kThreads, std::vector<const StringPool::Entry*>(kTexts));
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&pool, &results, t] {
      for (int n = 0; n < kTexts; ++n) {
        const int i = t % 2 == 0 ? n : kTexts - 1 - n;
        results[t][i] = pool.AddString(Numbered("shared-", i));
      }
    });
  }
  for (std::thread& thread : threads)
    thread.join();
  for (int i = 0; i < kTexts; ++i) {
    for (int t = 1; t < kThreads; ++t)
      ASSERT_EQ(results[t][i], results[0][i]) << "text " << i << " thread " << t;
    ASSERT_TRUE(*results[0][i] == Numbered("shared-", i).c_str());
  }
  EXPECT_EQ(pool.GetSize(), kTexts + 2u); // with "" and "k"
  EXPECT_TRUE(*early == u"k");
  EXPECT_EQ(pool.AddString(std::u16string(u"k")), early);
}

} // namespace
