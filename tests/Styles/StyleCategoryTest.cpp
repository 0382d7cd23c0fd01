#include <Styles/StyleCategory.h>

#include <Styles/StyleProperty.h>

#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <exception>
#include <string>
#include <typeinfo>
#include <vector>

namespace Styles {
namespace {

// A behaviour that records its destruction in a shared log.
class LoggingProperty final : public BaseStyleProperty {
public:
  LoggingProperty(std::vector<std::string>* log, std::string tag)
      : BaseStyleProperty(ZelUtils::Any(0.0)), m_log(log), m_tag(std::move(tag)) {}
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

// Three keys in identity order, so that tests can register them out of it.
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

TEST(StyleCategoryTest, RegistrationOrderIsKeptBesideKeyOrder) {
  const std::vector<PropertyKey> keys =
      KeysInIdentityOrder(u"CategoryTest.a", u"CategoryTest.b", u"CategoryTest.c");
  std::vector<std::string> log;
  {
    StyleCategory category(PropertyKey(u"CategoryTest.Cat"), u"Category", true);
    EXPECT_TRUE(category.GetFlag());
    EXPECT_EQ(category.GetUIName(), ZelStringT<char16_t>(u"Category"));
    // Registered as b, a, c: neither the key order nor its reverse.
    for (int i : {1, 0, 2})
      category.RegisterProperty(keys[i], new LoggingProperty(&log, std::to_string(i)));

    EXPECT_EQ(category.GetPropertyOrder(), (std::vector<PropertyKey>{keys[1], keys[0], keys[2]}));
    std::vector<PropertyKey> mapOrder;
    for (const auto& entry : category.GetProperties())
      mapOrder.push_back(entry.first);
    EXPECT_EQ(mapOrder, keys);

    // Behaviours go in key order, once each; the registration order stays.
    category.PreDestroyProperties();
    EXPECT_EQ(log, (std::vector<std::string>{"0", "1", "2"}));
    EXPECT_TRUE(category.GetProperties().empty());
    EXPECT_EQ(category.GetPropertyOrder().size(), 3u);
    for (const PropertyKey& key : keys) {
      EXPECT_EQ(category.GetStyleProperty(key), nullptr);
      ExpectPlainException([&] { category.GetDefaultValue(key); });
    }
  }
  // The destructor deletes nothing more.
  EXPECT_EQ(log.size(), 3u);
}

TEST(StyleCategoryTest, FirstRegistrationWins) {
  std::vector<std::string> log;
  const PropertyKey key(u"CategoryTest.width");
  StyleCategory category(PropertyKey(u"CategoryTest.Cat"), u"Category", false);
  auto* first = new LoggingProperty(&log, "first");
  auto* second = new LoggingProperty(&log, "second");
  category.RegisterProperty(key, first);
  category.RegisterProperty(key, second);

  EXPECT_EQ(category.GetStyleProperty(key), first);
  EXPECT_EQ(category.GetPropertyOrder(), std::vector<PropertyKey>{key});
  // The refused object still belongs to the caller; a double delete would
  // show under AddressSanitizer.
  delete second;
  category.PreDestroyProperties();
  EXPECT_EQ(log, (std::vector<std::string>{"second", "first"}));
}

TEST(StyleCategoryTest, DefaultValueIsOneStableObjectPerKey) {
  const PropertyKey width(u"CategoryTest.width");
  const PropertyKey text(u"CategoryTest.text");
  StyleCategory category(PropertyKey(u"CategoryTest.Cat"), u"Category", false);
  auto* policy = new ZelPref::NumberConversionPolicy();
  auto* widthProperty = new StyleProperty(ZelUtils::Any(2.0), policy, nullptr);
  std::vector<std::string> log;
  category.RegisterProperty(width, widthProperty);
  category.RegisterProperty(text, new LoggingProperty(&log, "text"));

  const ZelUtils::Any& value = category.GetDefaultValue(width);
  EXPECT_EQ(&value, &widthProperty->GetDefaultValue());
  EXPECT_EQ(&value, &category.GetDefaultValue(width));
  EXPECT_EQ(value.Get<double>(), 2.0);

  EXPECT_EQ(category.GetConversionPolicy(width), policy);
  EXPECT_EQ(category.GetConversionPolicy(text), nullptr);
  const PropertyKey unknown(u"CategoryTest.unknown");
  EXPECT_EQ(category.GetConversionPolicy(unknown), nullptr);
  EXPECT_EQ(category.GetStyleProperty(unknown), nullptr);
  ExpectPlainException([&] { category.GetDefaultValue(unknown); });

  // A null entry counts as no behaviour.
  const PropertyKey empty(u"CategoryTest.null");
  category.RegisterProperty(empty, nullptr);
  ExpectPlainException([&] { category.GetDefaultValue(empty); });
  EXPECT_EQ(category.GetConversionPolicy(empty), nullptr);

  category.PreDestroyProperties();
  EXPECT_EQ(log, std::vector<std::string>{"text"});
}

} // namespace
} // namespace Styles
