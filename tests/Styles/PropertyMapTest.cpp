#include <Styles/Style.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

namespace Styles {
namespace {

using Text = ZelStringT<char16_t>;

// Text values live behind a pointer, so a value lost or freed twice while the
// block shifts or grows shows under the sanitizers; 20 keys pass the size
// where lookups switch to bisection.
TEST(PropertyMapTest, KeepsKeyOrderThroughInsertsAndErases) {
  std::vector<PropertyKey> sorted;
  for (int i = 0; i < 20; ++i)
    sorted.emplace_back(Text(u"PropertyMapTest.key" + std::u16string(1, char16_t(u'a' + i))));
  std::sort(sorted.begin(), sorted.end());
  const auto valueOf = [](const PropertyKey& key) {
    return Text(u"long enough value of " + key.GetString().GetStdString());
  };

  struct Case {
    const char* name;
    bool reverse;
    std::size_t reserve;
  };
  for (const Case& c :
       {Case{"ascending", false, 0}, Case{"descending", true, 0}, Case{"reserved", true, 20}}) {
    SCOPED_TRACE(c.name);
    PropertyMap map;
    map.Reserve(c.reserve);
    std::vector<PropertyKey> order = sorted;
    if (c.reverse)
      std::reverse(order.begin(), order.end());
    for (const PropertyKey& key : order)
      EXPECT_TRUE(map.Insert(key, ZelUtils::Any(valueOf(key))));
    EXPECT_FALSE(map.Insert(order[3], ZelUtils::Any(1.0))); // present: the first value stays
    // Erase the first, the last and every third key, then look everything up.
    for (std::size_t i = 0; i < sorted.size(); ++i)
      if (i % 3 == 0 || i + 1 == sorted.size()) {
        EXPECT_TRUE(map.Erase(sorted[i]));
      }
    EXPECT_FALSE(map.Erase(sorted[0]));
    std::vector<PropertyKey> left;
    for (const PropertyMap::ConstEntry& entry : static_cast<const PropertyMap&>(map)) {
      left.push_back(entry.first);
      EXPECT_EQ(entry.second.Get<Text>(), valueOf(entry.first));
    }
    for (std::size_t i = 0; i < sorted.size(); ++i) {
      const bool kept = i % 3 != 0 && i + 1 != sorted.size();
      EXPECT_EQ(map.Contains(sorted[i]), kept);
      EXPECT_EQ(std::count(left.begin(), left.end(), sorted[i]), kept ? 1 : 0);
    }
    EXPECT_TRUE(std::is_sorted(left.begin(), left.end()));
    PropertyMap moved(std::move(map));
    EXPECT_TRUE(map.empty());
    EXPECT_EQ(moved.size(), left.size());
    moved.Clear();
    EXPECT_FALSE(moved.Contains(sorted[1]));
  }
}

} // namespace
} // namespace Styles
