/// @file
/// A style category: one named set of property behaviours. Every style belongs
/// to one category, which says which properties exist for it and which
/// behaviour governs each. Categories are created and owned by the manager.
#pragma once

#include <Styles/Export.h>
#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>

#include <map>
#include <string_view>
#include <utility>
#include <vector>

namespace ZelPref {
class ConversionPolicy;
}

namespace Styles {

class BaseStyleProperty;

/// A category and the behaviours of its properties, which it owns.
class STYLES_API StyleCategory {
public:
  /// `flag` is kept for the host; the library never reads it.
  StyleCategory(const PropertyKey& key, const ZelStringT<char16_t>& uiName, bool flag);
  StyleCategory(const StyleCategory&) = delete;
  StyleCategory& operator=(const StyleCategory&) = delete;
  /// Frees only the containers: behaviours are deleted by PreDestroyProperties.
  virtual ~StyleCategory();

  /// Takes ownership of `property` under `key`. The first registration wins: a
  /// second one for the same key is ignored and the caller keeps its object.
  void RegisterProperty(const PropertyKey& key, BaseStyleProperty* property);
  /// The behaviour registered under `key`, or null. Not owned by the caller.
  BaseStyleProperty* GetStyleProperty(const PropertyKey& key) const;
  /// The behaviour registered under the key whose text is `name`, or null:
  /// names read from documents are looked up without being pooled.
  BaseStyleProperty* FindStyleProperty(std::u16string_view name) const;
  /// The behaviour's default value, one stable object per key. Throws
  /// std::exception when no behaviour is registered under `key`.
  const ZelUtils::Any& GetDefaultValue(const PropertyKey& key) const;
  /// The behaviour's conversion policy; null for an unknown key.
  ZelPref::ConversionPolicy* GetConversionPolicy(const PropertyKey& key) const;
  /// Deletes every behaviour and empties the map; the registration order stays.
  void PreDestroyProperties();

  /// The key the category is registered under.
  const PropertyKey& GetKey() const noexcept { return m_key; }
  /// The name shown to users, as first registered.
  const ZelStringT<char16_t>& GetUIName() const noexcept { return m_uiName; }
  /// The host's flag, as first registered.
  bool GetFlag() const noexcept { return m_flag; }
  /// Property keys in registration order.
  const std::vector<PropertyKey>& GetPropertyOrder() const noexcept { return m_propertyOrder; }
  /// The behaviours in key (identity) order.
  const std::map<PropertyKey, BaseStyleProperty*>& GetProperties() const noexcept {
    return m_properties;
  }

private:
  // Puts `property` under `key` into a by-key table with a free slot.
  static void PlaceByKey(std::vector<std::pair<PropertyKey, BaseStyleProperty*>>& table,
                         const PropertyKey& key, BaseStyleProperty* property);
  // Puts `property` under `name` into a by-name table with a free slot.
  static void PlaceByName(std::vector<std::pair<std::u16string_view, BaseStyleProperty*>>& table,
                          std::u16string_view name, BaseStyleProperty* property);

  PropertyKey m_key;
  ZelStringT<char16_t> m_uiName;
  std::vector<PropertyKey> m_propertyOrder;
  std::map<PropertyKey, BaseStyleProperty*> m_properties;
  bool m_flag;
  // The same behaviours for fast lookups, by key identity and by key text,
  // each in a small open-addressing table (half full at most).
  std::vector<std::pair<PropertyKey, BaseStyleProperty*>> m_byKey;
  std::vector<std::pair<std::u16string_view, BaseStyleProperty*>> m_byName;
};

} // namespace Styles
