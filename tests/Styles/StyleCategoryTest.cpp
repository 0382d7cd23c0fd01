#include <Styles/StyleCategory.h>

#include <Styles/StyleProperty.h>

#include "HostBehaviours.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

namespace Styles {
namespace {

using testing::Log;
using testing::LoggingProperty;
using testing::ThrowsPlainException;

TEST(StyleCategoryTest, OrdersOwnershipAndLookups) {
  std::vector<PropertyKey> keys{u"CategoryTest.a", u"CategoryTest.b", u"CategoryTest.c"};
  std::sort(keys.begin(), keys.end());
  Log log;
  {
    StyleCategory category(PropertyKey(u"CategoryTest.Cat"), u"Category", true);
    // Registered as b, a, c: neither the key order nor its reverse.
    for (int i : {1, 0, 2})
      category.RegisterProperty(keys[i], new LoggingProperty(&log, std::to_string(i)));
    // A second registration is ignored; the refused object is still the caller's.
    auto* refused = new LoggingProperty(&log, "refused");
    category.RegisterProperty(keys[0], refused);
    const BaseStyleProperty* first = category.GetStyleProperty(keys[0]);
    EXPECT_NE(first, refused);
    delete refused;
    // Lookups compare addresses with the behaviour's own default value.
    EXPECT_EQ(&category.GetDefaultValue(keys[0]), &first->GetDefaultValue());

    EXPECT_EQ(category.GetPropertyOrder(), (std::vector<PropertyKey>{keys[1], keys[0], keys[2]}));
    std::vector<PropertyKey> mapOrder;
    for (const auto& entry : category.GetProperties())
      mapOrder.push_back(entry.first);
    EXPECT_EQ(mapOrder, keys);

    // Behaviours go in key order, once each; the registration order stays.
    category.PreDestroyProperties();
    EXPECT_EQ(log, (Log{"refused", "0", "1", "2"}));
    EXPECT_EQ(category.GetPropertyOrder().size(), 3u);
    for (const PropertyKey& key : {keys[0], keys[1], keys[2], PropertyKey(u"CategoryTest.x")}) {
      EXPECT_EQ(category.GetStyleProperty(key), nullptr);
      EXPECT_EQ(category.GetConversionPolicy(key), nullptr);
      EXPECT_TRUE(ThrowsPlainException([&] { category.GetDefaultValue(key); }));
    }
  }
  EXPECT_EQ(log.size(), 4u); // the destructor deletes nothing more
}

} // namespace
} // namespace Styles
