/// @file
/// The process-wide registry of style categories. The host registers its
/// categories and their property behaviours at start-up, before any style
/// exists; styles then ask the manager for behaviours and default values.
#pragma once

#include <Styles/Export.h>
#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>

#include <map>
#include <memory>
#include <unordered_map>
#include <unordered_set>
#include <vector>

namespace ZelPref {
class ConversionPolicy;
}

namespace Styles {

class BaseStyleProperty;
class StyleCategory;

/// Bookkeeping the host fills before an import: parent names an import must
/// not resolve, and old style names to use another name for.
struct STYLES_API WImportStyleInfo {
  WImportStyleInfo();
  /// Parent names (exact text) that an import leaves unresolved: the style
  /// gets no parent.
  std::unordered_set<ZelStringT<char16_t>> names;
  /// Parent names (exact text) mapped to the name to resolve instead.
  std::unordered_map<ZelStringT<char16_t>, ZelStringT<char16_t>> renames;
};

/// The registry of categories and their behaviours. Styles and sheets consult
/// the process's one, which GetStyleManager() returns.
class STYLES_API StyleManager {
public:
  /// An empty registry of version -1. Styles never consult it: only the
  /// process's manager counts.
  StyleManager();
  StyleManager(const StyleManager&) = delete;
  StyleManager& operator=(const StyleManager&) = delete;
  /// Deletes the remaining behaviours in reverse order of category registration.
  ~StyleManager();

  /// The category registered under `key`, created on first registration; a
  /// later call returns it unchanged (its name and flags stay as first given).
  /// With `addToStyleCategory` the category is remembered for the category of
  /// ordinary styles.
  std::shared_ptr<StyleCategory> RegisterCategory(const PropertyKey& key,
                                                  const ZelStringT<char16_t>& uiName,
                                                  bool addToStyleCategory, bool flag);
  /// Deletes the category's behaviours and forgets it; nothing for an unknown key.
  void DeregisterCategory(const PropertyKey& key);
  /// Names `property` and hands it to the category, which owns it from then on
  /// (unless the key is taken). Nothing happens, and the caller keeps the
  /// object, when the category is unknown.
  void RegisterProperty(const PropertyKey& categoryKey, const PropertyKey& propertyKey,
                        BaseStyleProperty* property);

  /// Throws std::exception for an unknown category.
  std::shared_ptr<StyleCategory> GetCategory(const PropertyKey& key) const;
  /// The category, or null; never throws.
  const std::shared_ptr<StyleCategory>* FindCategory(const PropertyKey& key) const;
  /// Whether some category's key text equals `name` exactly.
  bool CategoryExists(const ZelStringT<char16_t>& name) const;
  /// Null when the category or the property is unknown.
  BaseStyleProperty* GetStyleProperty(const PropertyKey& categoryKey,
                                      const PropertyKey& propertyKey) const;
  /// Throws std::exception for an unknown category or property.
  const ZelUtils::Any& GetDefaultValue(const PropertyKey& categoryKey,
                                       const PropertyKey& propertyKey) const;
  /// Null when the category or the property is unknown.
  ZelPref::ConversionPolicy* GetConversionPolicy(const PropertyKey& categoryKey,
                                                 const PropertyKey& propertyKey) const;
  /// Category keys in key (identity) order.
  std::vector<PropertyKey> GetCategoryNames() const;
  /// The category's property keys in registration order; empty when unknown.
  std::vector<PropertyKey> GetStylePropertyNames(const PropertyKey& categoryKey) const;
  /// The category's UI name; throws std::exception when unknown.
  ZelStringT<char16_t> TranslateCategory(const PropertyKey& key) const;
  /// The key of the first category (in key order) with that UI name, else Empty.
  PropertyKey UntranslateCategory(const ZelStringT<char16_t>& uiName) const;
  /// Keys of the categories registered with addToStyleCategory, in order.
  const std::vector<PropertyKey>& GetSubstyleSetCategories() const noexcept {
    return m_substyleSetCategories;
  }

  ///@{

  /// The document version that new and cleared sheets start with; -1 until set.
  void SetCurrentVersion(int version) noexcept { m_currentVersion = version; }
  int GetCurrentVersion() const noexcept { return m_currentVersion; }
  ///@}

  /// The bookkeeping every import consults, owned by the manager; the host
  /// fills it before an import and clears it afterwards.
  WImportStyleInfo& GetImportStyleInfo() noexcept { return m_importStyleInfo; }
  /// Empties both lists of the import bookkeeping.
  void ClearImportStyleInfo();

  /// Deletes every behaviour (reverse registration order) and forgets every
  /// category; the current version and the import info are kept.
  void Reset();

private:
  void PreDestroyAllInReverseOrder();

  std::map<PropertyKey, std::shared_ptr<StyleCategory>> m_categories;
  std::vector<PropertyKey> m_categoryOrder;
  std::vector<PropertyKey> m_substyleSetCategories;
  int m_currentVersion = -1;
  WImportStyleInfo m_importStyleInfo;
};

/// The manager singleton, created on first use.
STYLES_API StyleManager& GetStyleManager();
/// Removes the category of ordinary styles ("style").
STYLES_API void DeregisterStyleCategory();
/// Reset() on the singleton.
STYLES_API void ResetStyleManager();

} // namespace Styles
