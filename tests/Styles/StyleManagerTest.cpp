#include <Styles/StyleManager.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleUtilities.h>

#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <exception>
#include <memory>
#include <string>
#include <typeinfo>
#include <vector>

namespace Styles {
namespace {

// A behaviour that records its destruction in a shared log.
class LoggingProperty final : public BaseStyleProperty {
public:
  LoggingProperty(std::vector<std::string>* log, std::string tag)
      : BaseStyleProperty(ZelUtils::Any(1.5)), m_log(log), m_tag(std::move(tag)) {}
  ~LoggingProperty() override { m_log->push_back(m_tag); }

  bool Serialize(const StyleSheet&, const Style*, const ZelUtils::Any&, JsonValue&) const override {
    return false;
  }
  bool Deserialize(const StyleSheet&, Style*, const JsonValue&) const override { return false; }
  bool CheckType(const ZelUtils::Any&) const override { return true; }

private:
  std::vector<std::string>* m_log;
  std::string m_tag;
};

std::vector<PropertyKey> KeysInIdentityOrder(const char16_t* a, const char16_t* b,
                                             const char16_t* c) {
  std::vector<PropertyKey> keys{PropertyKey(a), PropertyKey(b), PropertyKey(c)};
  std::sort(keys.begin(), keys.end());
  return keys;
}

template <class F> void ExpectPlainException(F&& call) {
  try {
    call();
    ADD_FAILURE() << "no exception";
  } catch (const std::exception& e) {
    EXPECT_EQ(typeid(e), typeid(std::exception));
  }
}

// Most cases use a manager of their own; the singleton is shared with every
// other suite of the program.
TEST(StyleManagerTest, RegisterCategoryTwiceKeepsTheFirst) {
  StyleManager manager;
  const PropertyKey key(u"ManagerTest.Para");
  const auto first = manager.RegisterCategory(key, u"Paragraph", false, true);
  const auto second = manager.RegisterCategory(key, u"Other", true, false);
  EXPECT_EQ(first, second);
  EXPECT_EQ(first->GetUIName(), ZelStringT<char16_t>(u"Paragraph"));
  EXPECT_TRUE(first->GetFlag());
  EXPECT_TRUE(manager.GetSubstyleSetCategories().empty());
  EXPECT_EQ(manager.GetCategory(key), first);
  EXPECT_EQ(manager.GetCategoryNames(), std::vector<PropertyKey>{key});
}

TEST(StyleManagerTest, LookupsOfUnknownKeys) {
  StyleManager manager;
  const PropertyKey cat(u"ManagerTest.Para");
  const PropertyKey width(u"ManagerTest.width");
  const PropertyKey unknown(u"ManagerTest.unknown");
  manager.RegisterCategory(cat, u"Paragraph", false, false);
  auto* policy = new ZelPref::NumberConversionPolicy();
  manager.RegisterProperty(cat, width, new StyleProperty(ZelUtils::Any(3.0), policy, nullptr));

  EXPECT_EQ(manager.GetConversionPolicy(cat, width), policy);
  EXPECT_EQ(manager.GetDefaultValue(cat, width).Get<double>(), 3.0);
  EXPECT_EQ(&manager.GetDefaultValue(cat, width), &manager.GetDefaultValue(cat, width));
  EXPECT_EQ(manager.TranslateCategory(cat), ZelStringT<char16_t>(u"Paragraph"));

  // Thrown: a plain std::exception for unknown categories and defaults.
  ExpectPlainException([&] { manager.GetCategory(unknown); });
  ExpectPlainException([&] { manager.GetDefaultValue(unknown, width); });
  ExpectPlainException([&] { manager.GetDefaultValue(cat, unknown); });
  ExpectPlainException([&] { manager.TranslateCategory(unknown); });
  // Reported by an empty result.
  EXPECT_EQ(manager.FindCategory(unknown), nullptr);
  EXPECT_EQ(manager.GetStyleProperty(unknown, width), nullptr);
  EXPECT_EQ(manager.GetStyleProperty(cat, unknown), nullptr);
  EXPECT_EQ(manager.GetConversionPolicy(unknown, width), nullptr);
  EXPECT_EQ(manager.GetConversionPolicy(cat, unknown), nullptr);
  EXPECT_TRUE(manager.GetStylePropertyNames(unknown).empty());
  EXPECT_EQ(manager.UntranslateCategory(u"Nothing"), PropertyKey::Empty);
}

TEST(StyleManagerTest, CategoryExistsMatchesKeyTextExactly) {
  StyleManager manager;
  manager.RegisterCategory(PropertyKey(u"ManagerTest.Para"), u"Paragraph", false, false);
  struct Case {
    const char* label;
    const char16_t* name;
    bool exists;
  };
  for (const Case& c :
       {Case{"key", u"ManagerTest.Para", true}, Case{"other case", u"managertest.para", false},
        Case{"UI name", u"Paragraph", false}, Case{"prefix", u"ManagerTest.Par", false},
        Case{"empty", u"", false}}) {
    SCOPED_TRACE(c.label);
    EXPECT_EQ(manager.CategoryExists(c.name), c.exists);
  }
}

TEST(StyleManagerTest, UntranslateTakesTheFirstInKeyOrder) {
  StyleManager manager;
  const auto keys = KeysInIdentityOrder(u"ManagerTest.U1", u"ManagerTest.U2", u"ManagerTest.U3");
  manager.RegisterCategory(keys[2], u"Shared", false, false);
  manager.RegisterCategory(keys[1], u"Shared", false, false);
  manager.RegisterCategory(keys[0], u"Own", false, false);
  EXPECT_EQ(manager.UntranslateCategory(u"Shared"), keys[1]);
  EXPECT_EQ(manager.UntranslateCategory(u"Own"), keys[0]);
  EXPECT_EQ(manager.UntranslateCategory(u"own"), PropertyKey::Empty);
  EXPECT_EQ(manager.GetCategoryNames(), keys);
}

TEST(StyleManagerTest, RegisterPropertyNamesAndKeepsFirst) {
  StyleManager manager;
  std::vector<std::string> log;
  const PropertyKey cat(u"ManagerTest.Para");
  const auto keys = KeysInIdentityOrder(u"ManagerTest.a", u"ManagerTest.b", u"ManagerTest.c");
  manager.RegisterCategory(cat, u"Paragraph", false, false);

  auto* orphan = new LoggingProperty(&log, "orphan");
  manager.RegisterProperty(PropertyKey(u"ManagerTest.Unknown"), keys[0], orphan);
  EXPECT_EQ(orphan->GetName(), PropertyKey::Empty);

  auto* b = new LoggingProperty(&log, "b");
  manager.RegisterProperty(cat, keys[1], b);
  manager.RegisterProperty(cat, keys[0], new LoggingProperty(&log, "a"));
  auto* duplicate = new LoggingProperty(&log, "duplicate");
  manager.RegisterProperty(cat, keys[1], duplicate);
  manager.RegisterProperty(cat, keys[2], new LoggingProperty(&log, "c"));

  EXPECT_EQ(b->GetCategoryKey(), cat);
  EXPECT_EQ(b->GetName(), keys[1]);
  EXPECT_EQ(manager.GetStyleProperty(cat, keys[1]), b);
  EXPECT_EQ(manager.GetStylePropertyNames(cat),
            (std::vector<PropertyKey>{keys[1], keys[0], keys[2]}));

  // Both refused objects still belong to the caller.
  delete orphan;
  delete duplicate;
  manager.DeregisterCategory(cat);
  EXPECT_EQ(log, (std::vector<std::string>{"orphan", "duplicate", "a", "b", "c"}));
}

TEST(StyleManagerTest, BehavioursGoInReverseOrderOfCategoryRegistration) {
  const auto keys = KeysInIdentityOrder(u"ManagerTest.R1", u"ManagerTest.R2", u"ManagerTest.R3");
  const PropertyKey property(u"ManagerTest.width");
  // Registered as 1, 0, 2: reverse registration order is neither the key
  // order nor its reverse.
  const std::vector<int> registration{1, 0, 2};
  const std::vector<std::string> expected{"2", "0", "1"};

  std::vector<std::string> log;
  auto fill = [&](StyleManager& manager) {
    for (int i : registration) {
      manager.RegisterCategory(keys[i], u"Category", i == 0, false);
      manager.RegisterProperty(keys[i], property, new LoggingProperty(&log, std::to_string(i)));
    }
  };

  {
    SCOPED_TRACE("destructor");
    {
      StyleManager manager;
      fill(manager);
    }
    EXPECT_EQ(log, expected);
  }
  {
    SCOPED_TRACE("Reset");
    log.clear();
    StyleManager manager;
    fill(manager);
    const std::shared_ptr<StyleCategory> kept = manager.GetCategory(keys[0]);
    manager.SetCurrentVersion(7);
    manager.GetImportStyleInfo().names.insert(u"Body");
    manager.GetImportStyleInfo().renames.emplace(u"Old", u"New");

    manager.Reset();
    EXPECT_EQ(log, expected);
    EXPECT_TRUE(manager.GetCategoryNames().empty());
    EXPECT_TRUE(manager.GetSubstyleSetCategories().empty());
    EXPECT_EQ(manager.GetCurrentVersion(), 7);
    EXPECT_EQ(manager.GetImportStyleInfo().names.count(u"Body"), 1u);
    EXPECT_EQ(manager.GetImportStyleInfo().renames.at(u"Old"), ZelStringT<char16_t>(u"New"));
    // A category held elsewhere outlives the reset, without behaviours.
    EXPECT_EQ(kept->GetStyleProperty(property), nullptr);
    EXPECT_TRUE(kept->GetProperties().empty());

    // Nothing is left for the destructor.
    log.clear();
  }
  EXPECT_TRUE(log.empty());
}

TEST(StyleManagerTest, DeregisterForgetsOneCategory) {
  const auto keys = KeysInIdentityOrder(u"ManagerTest.D1", u"ManagerTest.D2", u"ManagerTest.D3");
  const PropertyKey property(u"ManagerTest.width");
  std::vector<std::string> log;
  {
    StyleManager manager;
    for (int i : {0, 1, 2}) {
      manager.RegisterCategory(keys[i], u"Category", true, false);
      manager.RegisterProperty(keys[i], property, new LoggingProperty(&log, std::to_string(i)));
    }
    manager.DeregisterCategory(keys[0]);
    manager.DeregisterCategory(PropertyKey(u"ManagerTest.Unknown"));
    EXPECT_EQ(log, std::vector<std::string>{"0"});
    EXPECT_EQ(manager.FindCategory(keys[0]), nullptr);
    EXPECT_EQ(manager.GetCategoryNames(), (std::vector<PropertyKey>{keys[1], keys[2]}));
    // The substyle-set list is left as it was.
    EXPECT_EQ(manager.GetSubstyleSetCategories(), keys);

    // Registered again, the category moves to the end of the order.
    manager.RegisterCategory(keys[0], u"Again", false, false);
    manager.RegisterProperty(keys[0], property, new LoggingProperty(&log, "0 again"));
    EXPECT_EQ(manager.TranslateCategory(keys[0]), ZelStringT<char16_t>(u"Again"));
    log.clear();
  }
  EXPECT_EQ(log, (std::vector<std::string>{"0 again", "2", "1"}));
}

TEST(StyleManagerTest, ImportStyleInfo) {
  StyleManager manager;
  WImportStyleInfo& info = manager.GetImportStyleInfo();
  EXPECT_EQ(info.names.max_load_factor(), 1.0f);
  EXPECT_EQ(info.renames.max_load_factor(), 1.0f);
  info.names.insert(u"Heading");
  manager.ClearImportStyleInfo();
  EXPECT_TRUE(info.names.empty());
  info.renames.emplace(u"A", u"B");
  manager.ClearImportStyleInfo();
  EXPECT_TRUE(info.renames.empty());
  EXPECT_EQ(&manager.GetImportStyleInfo(), &info);
  EXPECT_EQ(manager.GetCurrentVersion(), -1);
}

TEST(StyleManagerTest, SingletonAndFreeFunctions) {
  StyleManager& manager = GetStyleManager();
  EXPECT_EQ(&manager, &GetStyleManager());
  if (manager.FindCategory(StyleCategoryName))
    GTEST_SKIP() << "another suite holds the category of ordinary styles";

  std::vector<std::string> log;
  manager.RegisterCategory(StyleCategoryName, u"Style", false, false);
  manager.RegisterProperty(StyleCategoryName, PropertyKey(u"ManagerTest.width"),
                           new LoggingProperty(&log, "style"));
  DeregisterStyleCategory();
  EXPECT_EQ(log, std::vector<std::string>{"style"});
  EXPECT_EQ(manager.FindCategory(StyleCategoryName), nullptr);
  DeregisterStyleCategory();
}

TEST(StyleManagerTest, ResetStyleManagerKeepsVersion) {
  StyleManager& manager = GetStyleManager();
  if (!manager.GetCategoryNames().empty())
    GTEST_SKIP() << "other suites hold categories in the shared manager";

  std::vector<std::string> log;
  const PropertyKey cat(u"ManagerTest.Singleton");
  manager.RegisterCategory(cat, u"Singleton", true, false);
  manager.RegisterProperty(cat, PropertyKey(u"ManagerTest.width"),
                           new LoggingProperty(&log, "singleton"));
  const int version = manager.GetCurrentVersion();
  manager.SetCurrentVersion(version + 1);

  ResetStyleManager();
  EXPECT_EQ(log, std::vector<std::string>{"singleton"});
  EXPECT_TRUE(manager.GetCategoryNames().empty());
  EXPECT_TRUE(manager.GetSubstyleSetCategories().empty());
  EXPECT_EQ(manager.GetCurrentVersion(), version + 1);
  manager.SetCurrentVersion(version);
}

} // namespace
} // namespace Styles
