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
  std::vector<PropertyKey> sorted, kept;
  for (int i = 0; i < 20; ++i)
    sorted.emplace_back(Text(u"PropertyMapTest.key" + std::u16string(1, char16_t(u'a' + i))));
  std::sort(sorted.begin(), sorted.end());
  for (std::size_t i = 0; i + 1 < sorted.size(); ++i)
    if (i % 3 != 0) // the first, the last and every third key are erased
      kept.push_back(sorted[i]);
  for (const std::size_t reserve : {0u, 20u}) {
    SCOPED_TRACE(reserve);
    PropertyMap map;
    map.Reserve(reserve);
    for (std::size_t i = sorted.size(); i-- > 0;) // each insert goes before all others
      EXPECT_TRUE(map.Insert(sorted[i], ZelUtils::Any(sorted[i].GetString())));
    EXPECT_FALSE(map.Insert(sorted[3], ZelUtils::Any(1.0))); // present: the first value stays
    for (const PropertyKey& key : sorted)
      if (std::find(kept.begin(), kept.end(), key) == kept.end()) {
        EXPECT_TRUE(map.Erase(key));
      }
    std::vector<PropertyKey> left;
    for (const PropertyMap::ConstEntry& entry : static_cast<const PropertyMap&>(map)) {
      left.push_back(entry.first);
      EXPECT_EQ(entry.second.Get<Text>(), entry.first.GetString());
    }
    EXPECT_EQ(left, kept);
    PropertyMap moved(std::move(map)); // a lookup must find exactly the kept keys
    for (const PropertyKey& key : sorted)
      EXPECT_EQ(moved.Find(key) != nullptr,
                std::find(kept.begin(), kept.end(), key) != kept.end());
    EXPECT_EQ(map.Find(kept[0]), nullptr);
  }
}

} // namespace
} // namespace Styles
