// Behaviours a host would write, for tests: a plain number property that
// counts the values it stores and destroys, one that logs its destruction, a
// scoped category, and a check of the owner links of a tree of substyles.
#pragma once

#include <Styles/Style.h>
#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <exception>
#include <memory>
#include <string>
#include <typeinfo>
#include <utility>
#include <vector>

namespace Styles {
namespace testing {

inline bool IsNumber(const ZelUtils::Any& value) { return value.IsTypeCompatible<double>(); }

// How many values of one counting property were stored and destroyed.
struct ValueCounts {
  int stored = 0;
  int destroyed = 0;
  int Live() const { return stored - destroyed; }
};

// A number property that counts every value it stores (set, read or copied
// into a style) and destroys. A test that gives each of its styles one such
// value sees how many of them were made and freed.
class CountingNumberProperty : public StyleProperty {
public:
  CountingNumberProperty(double defaultValue, ValueCounts* counts)
      : StyleProperty(ZelUtils::Any(defaultValue), new ZelPref::NumberConversionPolicy(),
                      &IsNumber),
        m_counts(counts) {}
  ZelUtils::Any MovePropertyData(Style* owner, ZelUtils::Any&& value) const override {
    m_counts->stored += value.IsEmpty() ? 0 : 1;
    return StyleProperty::MovePropertyData(owner, std::move(value));
  }
  void DestroyPropertyData(const ZelUtils::Any&) const override { ++m_counts->destroyed; }

private:
  ValueCounts* m_counts;
};

using Log = std::vector<std::string>;

// A behaviour that records its destruction in a shared log.
struct LoggingProperty final : StyleProperty {
  LoggingProperty(Log* log, std::string tag)
      : StyleProperty(ZelUtils::Any(0.0), nullptr, nullptr), log(log), tag(std::move(tag)) {}
  ~LoggingProperty() override { log->push_back(tag); }
  Log* log;
  std::string tag;
};

// Whether `call` throws a plain std::exception rather than a subclass.
template <class F> bool ThrowsPlainException(F&& call) try {
  call();
  return false;
} catch (const std::exception& e) {
  return typeid(e) == typeid(std::exception);
}

// Registers a category under a key unique to the test and removes it again.
class ScopedCategory {
public:
  ScopedCategory(const std::u16string& key, const std::u16string& uiName = u"")
      : m_key(key), m_category(GetStyleManager().RegisterCategory(m_key, uiName, false, false)) {}
  ~ScopedCategory() { GetStyleManager().DeregisterCategory(m_key); }
  ScopedCategory(const ScopedCategory&) = delete;
  ScopedCategory& operator=(const ScopedCategory&) = delete;

  // Registers `property` (owned by the category from then on) under `name`.
  PropertyKey Add(const std::u16string& name, BaseStyleProperty* property) {
    const PropertyKey key(name);
    GetStyleManager().RegisterProperty(m_key, key, property);
    return key;
  }
  PropertyKey Number(const std::u16string& name, double defaultValue = 0.0) {
    return Add(name, new StyleProperty(ZelUtils::Any(defaultValue),
                                       new ZelPref::NumberConversionPolicy(), &IsNumber));
  }
  const PropertyKey& Key() const noexcept { return m_key; }

private:
  PropertyKey m_key;
  std::shared_ptr<StyleCategory> m_category;
};

inline double Number(const ZelUtils::Any& value) { return value.Get<double>(); }

// Checks that every single substyle below `style` names its holder and key as
// owner, while list elements have none; returns how many substyles it saw
// (null list elements not counted).
inline int CheckOwnerLinks(const Style& style) {
  int seen = 0;
  for (const auto& [key, value] : style.GetProperties()) {
    if (Style* const* substyle = value.GetIf<Style*>(); substyle && *substyle) {
      EXPECT_EQ((*substyle)->GetOwner(), &style);
      EXPECT_EQ((*substyle)->GetOwnerPropertyKey(), key);
      seen += 1 + CheckOwnerLinks(**substyle);
    } else if (const auto* list = value.GetIf<std::vector<Style*>>()) {
      for (const Style* element : *list) {
        if (!element)
          continue;
        EXPECT_EQ(element->GetOwner(), nullptr);
        seen += 1 + CheckOwnerLinks(*element);
      }
    }
  }
  return seen;
}

} // namespace testing
} // namespace Styles
