#include <ZelUtils/StringPool.h>

#include <gtest/gtest.h>

#include <string>

namespace {

using ZelUtils::StringPool;

struct TestPool {
  static StringPool& Get() {
    static StringPool pool;
    return pool;
  }
};
using Key = ZelUtils::PooledString<TestPool>;

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

} // namespace
