#include <Styles/StyleManager.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>

#include "HostBehaviours.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

namespace Styles {
namespace {

using testing::Log;
using testing::LoggingProperty;
using testing::ThrowsPlainException;

// Three keys sorted by identity, so that tests can register them out of key order.
std::vector<PropertyKey> SortedKeys(const ZelStringT<char16_t>& prefix) {
  std::vector<PropertyKey> keys{prefix + u"1", prefix + u"2", prefix + u"3"};
  std::sort(keys.begin(), keys.end());
  return keys;
}

// Most cases use a manager of their own; the singleton is shared with every suite.
TEST(StyleManagerTest, FirstRegistrationWins) {
  StyleManager manager;
  Log log;
  const PropertyKey cat(u"ManagerTest.Para");
  const auto keys = SortedKeys(u"ManagerTest.p");
  const auto first = manager.RegisterCategory(cat, u"Paragraph", false, true);
  EXPECT_EQ(manager.RegisterCategory(cat, u"Other", true, false), first);
  EXPECT_EQ(first->GetUIName(), ZelStringT<char16_t>(u"Paragraph"));
  EXPECT_TRUE(manager.GetSubstyleSetCategories().empty());

  // Refused objects (unknown category, key taken) still belong to the caller.
  auto* orphan = new LoggingProperty(&log, "orphan");
  manager.RegisterProperty(PropertyKey(u"ManagerTest.Unknown"), keys[0], orphan);
  auto* b = new LoggingProperty(&log, "b");
  manager.RegisterProperty(cat, keys[1], b);
  manager.RegisterProperty(cat, keys[0], new LoggingProperty(&log, "a"));
  auto* duplicate = new LoggingProperty(&log, "duplicate");
  manager.RegisterProperty(cat, keys[1], duplicate);
  manager.RegisterProperty(cat, keys[2], new LoggingProperty(&log, "c"));

  EXPECT_EQ(manager.GetStyleProperty(cat, keys[1]), b);
  EXPECT_EQ(manager.GetStylePropertyNames(cat),
            (std::vector<PropertyKey>{keys[1], keys[0], keys[2]}));
  delete orphan;
  delete duplicate;
  manager.DeregisterCategory(cat);
  EXPECT_EQ(log, (Log{"orphan", "duplicate", "a", "b", "c"}));
}

TEST(StyleManagerTest, OnlyDefaultsAndCategoriesThrowForUnknownKeys) {
  StyleManager manager;
  const PropertyKey cat(u"ManagerTest.Para"), width(u"ManagerTest.width");
  const PropertyKey unknown(u"ManagerTest.unknown");
  manager.RegisterCategory(cat, u"Paragraph", false, false);
  manager.RegisterProperty(cat, width, new StyleProperty(ZelUtils::Any(3.0), nullptr, nullptr));
  EXPECT_EQ(manager.GetDefaultValue(cat, width).Get<double>(), 3.0);

  EXPECT_TRUE(ThrowsPlainException([&] { manager.GetCategory(unknown); }));
  EXPECT_TRUE(ThrowsPlainException([&] { manager.GetDefaultValue(unknown, width); }));
  EXPECT_TRUE(ThrowsPlainException([&] { manager.GetDefaultValue(cat, unknown); }));
  EXPECT_TRUE(ThrowsPlainException([&] { manager.TranslateCategory(unknown); }));
  EXPECT_EQ(manager.FindCategory(unknown), nullptr);
  EXPECT_EQ(manager.GetStyleProperty(unknown, width), nullptr);
  EXPECT_EQ(manager.GetStyleProperty(cat, unknown), nullptr);
  EXPECT_EQ(manager.GetConversionPolicy(unknown, width), nullptr);
  EXPECT_EQ(manager.GetConversionPolicy(cat, unknown), nullptr);
  EXPECT_TRUE(manager.GetStylePropertyNames(unknown).empty());
  // Category names match the key text exactly, never the UI name or another case.
  EXPECT_TRUE(manager.CategoryExists(u"ManagerTest.Para"));
  for (const char16_t* name : {u"managertest.para", u"Paragraph", u"ManagerTest.Par", u""})
    EXPECT_FALSE(manager.CategoryExists(name));
}

TEST(StyleManagerTest, UntranslateTakesTheFirstInKeyOrder) {
  StyleManager manager;
  const auto keys = SortedKeys(u"ManagerTest.U");
  manager.RegisterCategory(keys[2], u"Shared", false, false);
  manager.RegisterCategory(keys[1], u"Shared", false, false);
  manager.RegisterCategory(keys[0], u"Own", false, false);
  EXPECT_EQ(manager.UntranslateCategory(u"Shared"), keys[1]);
  EXPECT_EQ(manager.UntranslateCategory(u"own"), PropertyKey::Empty);
  EXPECT_EQ(manager.GetCategoryNames(), keys);
}

TEST(StyleManagerTest, BehavioursGoInReverseOrderOfCategoryRegistration) {
  const auto keys = SortedKeys(u"ManagerTest.R");
  const PropertyKey width(u"ManagerTest.width");
  Log log;
  // Registered as 1, 0, 2: the reverse is neither the key order nor its reverse.
  auto fill = [&](StyleManager& manager) {
    for (int i : {1, 0, 2}) {
      manager.RegisterCategory(keys[i], u"Category", i == 0, false);
      manager.RegisterProperty(keys[i], width, new LoggingProperty(&log, std::to_string(i)));
    }
  };
  {
    StyleManager manager;
    fill(manager);
    const std::shared_ptr<StyleCategory> kept = manager.GetCategory(keys[0]);
    manager.SetCurrentVersion(7);
    manager.GetImportStyleInfo().renames.emplace(u"Old", u"New");
    manager.Reset();
    EXPECT_EQ(log, (Log{"2", "0", "1"}));
    EXPECT_TRUE(manager.GetCategoryNames().empty());
    EXPECT_TRUE(manager.GetSubstyleSetCategories().empty());
    EXPECT_EQ(manager.GetCurrentVersion(), 7);
    EXPECT_EQ(manager.GetImportStyleInfo().renames.at(u"Old"), ZelStringT<char16_t>(u"New"));
    EXPECT_EQ(kept->GetStyleProperty(width), nullptr); // a held category outlives, emptied

    // Deregistering deletes one category's behaviours; registered again, it goes last.
    fill(manager);
    log.clear();
    manager.DeregisterCategory(keys[0]);
    manager.DeregisterCategory(PropertyKey(u"ManagerTest.Unknown"));
    EXPECT_EQ(log, Log{"0"});
    EXPECT_EQ(manager.GetSubstyleSetCategories(), std::vector<PropertyKey>{keys[0]});
    manager.RegisterCategory(keys[0], u"Again", false, false);
    manager.RegisterProperty(keys[0], width, new LoggingProperty(&log, "0 again"));
    log.clear();
  }
  EXPECT_EQ(log, (Log{"0 again", "2", "1"}));
}

} // namespace
} // namespace Styles
