// Behaviours a host would write, for tests: a plain number property that
// counts how often its values are destroyed, and a property that owns one
// substyle the way a host's substyle property would.
#pragma once

#include <Styles/Style.h>
#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <memory>
#include <string>

namespace Styles {
namespace testing {

inline bool IsNumber(const ZelUtils::Any& value) { return value.IsTypeCompatible<double>(); }

// A number property whose DestroyPropertyData calls are counted.
class CountingNumberProperty : public StyleProperty {
public:
  CountingNumberProperty(double defaultValue, int* destroyed)
      : StyleProperty(ZelUtils::Any(defaultValue), new ZelPref::NumberConversionPolicy(),
                      &IsNumber),
        m_destroyed(destroyed) {}
  void DestroyPropertyData(const ZelUtils::Any&) const override { ++*m_destroyed; }

private:
  int* m_destroyed;
};

// Owns one substyle of `element`: stores copies, deletes them, keeps owner
// links and compares substyles by content.
class HostSubstyleProperty : public BaseStyleProperty {
public:
  explicit HostSubstyleProperty(const PropertyKey& element)
      : BaseStyleProperty(ZelUtils::Any(static_cast<Style*>(nullptr))), m_element(element) {}

  PropertyKey GetElementCategoryName() const override { return m_element; }
  bool Serialize(const StyleSheet&, const Style*, const ZelUtils::Any&, JsonValue&) const override {
    return false;
  }
  bool Deserialize(const StyleSheet&, Style*, const JsonValue&) const override { return false; }
  void DestroyPropertyData(const ZelUtils::Any& value) const override {
    delete value.Get<Style*>();
  }
  ZelUtils::Any MovePropertyData(Style* owner, ZelUtils::Any&& value) const override {
    const Style* source =
        value.IsTypeCompatible<Style*>() ? value.Get<Style*>() : value.Get<const Style*>();
    if (!source)
      return ZelUtils::Any();
    Style* copy = new Style(*source);
    copy->SetOwner(owner, GetName());
    return ZelUtils::Any(copy);
  }
  void SetOwner(ZelUtils::Any& value, Style* owner, const PropertyKey& key) const override {
    if (Style* substyle = value.Get<Style*>())
      substyle->SetOwner(owner, key);
  }
  // A substyle the target holds itself is merged into; otherwise copied.
  void MergeProperty(Style* target, const Style* source, const PropertyKey& key,
                     bool overwrite) const override {
    const Style* sourceSubstyle = source->GetSubstyle(key, false);
    if (Style* own = target->GetSubstyle(key, false))
      own->MergeProperties(sourceSubstyle, overwrite);
    else
      target->SetProperty(key, ZelUtils::Any(sourceSubstyle));
  }
  void MergeParentProperty(Style* target, const Style* parent,
                           const PropertyKey& key) const override {
    const Style* parentSubstyle = parent->GetSubstyle(key, false);
    if (Style* own = target->GetSubstyle(key, false)) {
      if (!own->GetParent()) {
        own->MergeParentProperties(parentSubstyle);
        own->SetParent(parentSubstyle->GetParent());
      }
    } else {
      target->SetProperty(key, ZelUtils::Any(parentSubstyle));
    }
  }
  bool IsEqual(const ZelUtils::Any& a, const ZelUtils::Any& b) const override {
    const Style* x = a.Get<Style*>();
    const Style* y = b.Get<Style*>();
    return x == y || (x && y && *x == *y);
  }
  bool IsSubstyle() const override { return true; }
  bool CheckType(const ZelUtils::Any& value) const override {
    return value.IsTypeCompatible<const Style*>();
  }

private:
  PropertyKey m_element;
};

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

} // namespace testing
} // namespace Styles
