/// @file
/// Property behaviours: the strategy objects that give the values of one
/// property their meaning. A style never interprets a value itself; it asks
/// the behaviour its category registers for the key to copy, destroy, compare,
/// merge, flatten, walk and serialize the value. Hosts subclass these classes:
/// the order of the virtual operations is part of the interface.
#pragma once

#include <Styles/Export.h>
#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>
#include <ZelUtils/Delegate.h>
#include <ZelUtils/Span.h>

#include <functional>
#include <map>
#include <utility>
#include <vector>

namespace ZelPref {
class ConversionPolicy;
}

namespace Styles {

class StyleSheet;

/// Optional check of values, owned by the behaviour it is given to.
class STYLES_API PropertyValidator {
public:
  virtual ~PropertyValidator();
  /// Whether `value` is acceptable; it may be adjusted in place.
  virtual bool Validate(ZelUtils::Any& value, const ZelUtils::Any& defaultValue) const = 0;
};

/// The interface of every behaviour, with defaults that fit plain values.
class STYLES_API BaseStyleProperty {
public:
  /// A behaviour whose values default to `defaultValue`, for documents of
  /// `minimumVersion` or later.
  explicit BaseStyleProperty(ZelUtils::Any defaultValue, int minimumVersion = 0);
  BaseStyleProperty(const BaseStyleProperty&) = delete;
  BaseStyleProperty& operator=(const BaseStyleProperty&) = delete;

  /// Deletes the validator; the default value goes with the object.
  virtual ~BaseStyleProperty();
  /// The category of the substyles this property holds; empty for plain values.
  virtual PropertyKey GetElementCategoryName() const;
  /// Writes `value` into `out`; false leaves the property out of the document.
  virtual bool Serialize(const StyleSheet& sheet, const Style* style, const ZelUtils::Any& value,
                         JsonValue& out) const = 0;
  /// Reads `in` and stores the result in `style`; false when nothing was stored.
  virtual bool Deserialize(const StyleSheet& sheet, Style* style, const JsonValue& in) const = 0;
  /// True makes style reading call AdjustAfterDeserialize once the style is read.
  virtual bool NeedAdjustementsForStyleIO() const;
  /// Repairs `style` once it is read whole; the default does nothing.
  virtual void AdjustAfterDeserialize(const StyleSheet& sheet, Style* style) const;
  /// The policy that turns values into text and back; not owned by the caller.
  virtual ZelPref::ConversionPolicy* GetConversionPolicy() const;
  /// Releases what a stored value owns (owned substyles); plain values own nothing.
  virtual void DestroyPropertyData(const ZelUtils::Any& value) const;
  /// Turns a value about to be stored in `owner` into the value to store; an
  /// empty result stores nothing.
  virtual ZelUtils::Any MovePropertyData(Style* owner, ZelUtils::Any&& value) const;
  /// The styles of `styles` that `value` depends on, for Style::GetDependencies;
  /// plain values depend on none.
  virtual std::vector<Style*> GetDependencies(const ZelUtils::Any& value, StyleSpan styles,
                                              bool parentOnly) const;
  /// Whether `value` depends on a style of `styles`, for Style::HasDependency.
  virtual bool HasDependency(const ZelUtils::Any& value, StyleSpan styles, bool parentOnly) const;
  /// Cuts the dependencies of `value` on `styles`, keeping what it resolves to.
  virtual void RemoveDependency(ZelUtils::Any& value, StyleSpan styles, bool parentOnly) const;
  /// Whether a substyle held in `value` inherits from another style.
  virtual bool HasParentalDependency(const ZelUtils::Any& value) const;
  /// Folds the parent chains of the substyles held in `value` into them.
  virtual void RemoveAllDependencies(ZelUtils::Any& value) const;
  /// Redirects the links held in `value` from old styles to new ones.
  virtual void RemapDependency(ZelUtils::Any& value, const std::map<Style*, Style*>& map) const;
  /// Replaces pointer-like data in `value` by the (old, new) `pairs`; the default
  /// does nothing, for host values that hold pointers of their own.
  virtual void
  RemapPointer(ZelUtils::Any& value,
               const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>& pairs) const;
  /// Points the substyles held in `value` back at their holder.
  virtual void SetOwner(ZelUtils::Any& value, Style* owner, const PropertyKey& key) const;
  /// Calls `fn` on the value (plain values) or inside the substyles it holds.
  virtual bool ProcessProperty(ZelUtils::Any& value, const PropertyVisitor& fn, Style* style,
                               const PropertyKey& key) const;
  /// Unless `overwrite` is false and `target` sets `key` itself, the effective
  /// value of `source` becomes `target`'s own value.
  virtual void MergeProperty(Style* target, const Style* source, const PropertyKey& key,
                             bool overwrite) const;
  /// Unless `target` sets `key` itself, a non-default value found on `parent`
  /// becomes `target`'s own value.
  virtual void MergeParentProperty(Style* target, const Style* parent,
                                   const PropertyKey& key) const;
  /// Makes the effective value of `key` the style's own; true when one was found.
  virtual bool FlattenProperty(Style* style, const PropertyKey& key) const;
  /// Whether two values of the property are equal, for Style::operator==; the
  /// default compares the Any values.
  virtual bool IsEqual(const ZelUtils::Any& a, const ZelUtils::Any& b) const;
  /// True makes style reading read this property after all current ones.
  virtual bool IsDeprecated() const;
  /// A strict order of values for Style::operator<; the default orders the Any values.
  virtual bool IsLess(const ZelUtils::Any& a, const ZelUtils::Any& b) const;
  /// Calls `fn` on every substyle held in `value`; plain values report false.
  virtual bool ProcessStylesInProperty(const ZelUtils::Any& value, const StyleVisitor& fn) const;
  /// Whether `value` has the kind this property accepts.
  virtual bool CheckType(const ZelUtils::Any& value) const = 0;
  /// True leaves the property out of written styles unless asked otherwise.
  virtual bool IsTemporary() const;
  /// True for a property that holds one substyle.
  virtual bool IsSubstyle() const;

  /// Called by the manager when the behaviour is registered.
  void SetName(const PropertyKey& categoryKey, const PropertyKey& name);
  ///@{

  /// The category and the key the behaviour is registered under; empty before.
  const PropertyKey& GetCategoryKey() const noexcept { return m_categoryKey; }
  const PropertyKey& GetName() const noexcept { return m_name; }
  ///@}

  /// One stable object per behaviour: lookups compare addresses with it.
  const ZelUtils::Any& GetDefaultValue() const noexcept { return m_defaultValue; }
  /// The oldest document version that holds the property; the stock behaviours
  /// write nothing to older sheets.
  int GetMinimumVersion() const noexcept { return m_minimumVersion; }
  /// Takes ownership of `validator` (may be null), deleting the previous one.
  void SetValidator(PropertyValidator* validator);
  /// False without a validator; otherwise the validator's verdict.
  bool Validate(ZelUtils::Any& value) const;

private:
  PropertyKey m_categoryKey;
  PropertyKey m_name;
  PropertyValidator* m_validator = nullptr;
  ZelUtils::Any m_defaultValue;
  int m_minimumVersion;
};

/// The behaviour of a plain value whose JSON form is the text that its
/// conversion policy makes.
class STYLES_API StyleProperty : public BaseStyleProperty {
public:
  /// Decides whether a value has the property's kind.
  using TypeCheck = bool (*)(const ZelUtils::Any&);

  /// Takes ownership of `policy` (may be null: the value is then written as
  /// null and never read). `typeCheck` decides CheckType; null accepts nothing.
  StyleProperty(ZelUtils::Any defaultValue, ZelPref::ConversionPolicy* policy, TypeCheck typeCheck,
                int minimumVersion = 0);
  ~StyleProperty() override;

  /// Not written (false) for a sheet older than the minimum version.
  bool Serialize(const StyleSheet& sheet, const Style* style, const ZelUtils::Any& value,
                 JsonValue& out) const override;
  /// Reads a string, a number (as "%g" text) or a bool ("1"/"0") through the
  /// policy. Unreadable text for "xScale"/"yScale" stores 1, for "angle"/"skew"
  /// stores 0, so that old documents still load; for other names the
  /// policy's ZelPref::Detail::BadConversion is thrown on.
  bool Deserialize(const StyleSheet& sheet, Style* style, const JsonValue& in) const override;
  ZelPref::ConversionPolicy* GetConversionPolicy() const override;
  bool CheckType(const ZelUtils::Any& value) const override;

private:
  ZelPref::ConversionPolicy* m_policy;
  TypeCheck m_typeCheck;
};

/// The behaviour of a property whose value is one substyle: an Any holding a
/// Style* (null for none) of the element category, owned by the holding style,
/// which it names as owner under this property's name.
class STYLES_API StyleSetProperty : public BaseStyleProperty {
public:
  /// The default value is a null Style*.
  explicit StyleSetProperty(const PropertyKey& elementCategory);
  /// Deletes a substyle held by the default value; a default of another kind
  /// ends the process (std::bad_cast in a destructor).
  ~StyleSetProperty() override;

  PropertyKey GetElementCategoryName() const override;
  /// The substyle's JSON object without temporary properties; JSON null for
  /// no substyle. Not written (false) for a sheet older than the minimum version.
  bool Serialize(const StyleSheet& sheet, const Style* style, const ZelUtils::Any& value,
                 JsonValue& out) const override;
  /// Reads a JSON object into a new substyle that `style` adopts without a
  /// copy; an own value already there is kept. False for anything but an object.
  bool Deserialize(const StyleSheet& sheet, Style* style, const JsonValue& in) const override;
  void DestroyPropertyData(const ZelUtils::Any& value) const override;
  /// A copy of the held Style* or const Style*, owned by `owner`; empty for null.
  ZelUtils::Any MovePropertyData(Style* owner, ZelUtils::Any&& value) const override;
  /// Without `parentOnly` what the substyle depends on; with it, the
  /// substyle's parent when that is in `styles`.
  std::vector<Style*> GetDependencies(const ZelUtils::Any& value, StyleSpan styles,
                                      bool parentOnly) const override;
  bool HasDependency(const ZelUtils::Any& value, StyleSpan styles, bool parentOnly) const override;
  void RemoveDependency(ZelUtils::Any& value, StyleSpan styles, bool parentOnly) const override;
  bool HasParentalDependency(const ZelUtils::Any& value) const override;
  void RemoveAllDependencies(ZelUtils::Any& value) const override;
  void RemapDependency(ZelUtils::Any& value, const std::map<Style*, Style*>& map) const override;
  void
  RemapPointer(ZelUtils::Any& value,
               const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>& pairs) const override;
  void SetOwner(ZelUtils::Any& value, Style* owner, const PropertyKey& key) const override;
  /// Visits the values inside the substyle, not this value.
  bool ProcessProperty(ZelUtils::Any& value, const PropertyVisitor& fn, Style* style,
                       const PropertyKey& key) const override;
  /// A substyle the target holds itself is merged into, never replaced
  /// (`overwrite` applies inside it); otherwise the target gets a copy of the
  /// source's own substyle.
  void MergeProperty(Style* target, const Style* source, const PropertyKey& key,
                     bool overwrite) const override;
  /// A parentless own substyle takes over the parent's substyle and its
  /// parent; without an own substyle the target gets a copy of the parent's.
  void MergeParentProperty(Style* target, const Style* parent,
                           const PropertyKey& key) const override;
  /// Gives the style an own substyle that carries every inherited value.
  bool FlattenProperty(Style* style, const PropertyKey& key) const override;
  bool IsEqual(const ZelUtils::Any& a, const ZelUtils::Any& b) const override;
  bool IsLess(const ZelUtils::Any& a, const ZelUtils::Any& b) const override;
  /// Calls `fn` on the substyle, also when it is null.
  bool ProcessStylesInProperty(const ZelUtils::Any& value, const StyleVisitor& fn) const override;
  bool CheckType(const ZelUtils::Any& value) const override;
  bool IsSubstyle() const override;

private:
  PropertyKey m_elementCategory;
};

/// The behaviour of a property whose value is an ordered list of substyles:
/// an Any holding std::vector<Style*>, whose elements may be null. The holding
/// style owns the substyles; they are not linked back to it as owner.
class STYLES_API StyleArrayProperty : public BaseStyleProperty {
public:
  /// The default value is an empty list; an empty `elementCategory` means the
  /// category that registers this property.
  explicit StyleArrayProperty(const PropertyKey& elementCategory);
  ~StyleArrayProperty() override;

  PropertyKey GetElementCategoryName() const override;
  /// A JSON array of the objects of the non-null substyles, without temporary
  /// properties. Not written (false) for a sheet older than the minimum version.
  bool Serialize(const StyleSheet& sheet, const Style* style, const ZelUtils::Any& value,
                 JsonValue& out) const override;
  /// Reads the objects of a JSON array (other elements are dropped) and stores
  /// the list, also when empty. False for anything but an array.
  bool Deserialize(const StyleSheet& sheet, Style* style, const JsonValue& in) const override;
  void DestroyPropertyData(const ZelUtils::Any& value) const override;
  /// A list of copies of the elements (null stays null), without owner links;
  /// the caller keeps the styles of `value`.
  ZelUtils::Any MovePropertyData(Style* owner, ZelUtils::Any&& value) const override;
  /// Without `parentOnly` what the substyles depend on; with it, the substyles
  /// themselves that are in `styles` (unlike HasDependency, which then looks
  /// at their parents).
  std::vector<Style*> GetDependencies(const ZelUtils::Any& value, StyleSpan styles,
                                      bool parentOnly) const override;
  bool HasDependency(const ZelUtils::Any& value, StyleSpan styles, bool parentOnly) const override;
  void RemoveDependency(ZelUtils::Any& value, StyleSpan styles, bool parentOnly) const override;
  bool HasParentalDependency(const ZelUtils::Any& value) const override;
  void RemoveAllDependencies(ZelUtils::Any& value) const override;
  void RemapDependency(ZelUtils::Any& value, const std::map<Style*, Style*>& map) const override;
  void
  RemapPointer(ZelUtils::Any& value,
               const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>& pairs) const override;
  /// Visits the values inside every non-null substyle; false when stopped.
  bool ProcessProperty(ZelUtils::Any& value, const PropertyVisitor& fn, Style* style,
                       const PropertyKey& key) const override;
  /// Stores flattened copies of the effective list; false when there is none.
  bool FlattenProperty(Style* style, const PropertyKey& key) const override;
  bool IsEqual(const ZelUtils::Any& a, const ZelUtils::Any& b) const override;
  /// Shorter lists first, then the first differing element.
  bool IsLess(const ZelUtils::Any& a, const ZelUtils::Any& b) const override;
  /// Calls `fn` on every element, null ones included; false when stopped.
  bool ProcessStylesInProperty(const ZelUtils::Any& value, const StyleVisitor& fn) const override;
  bool CheckType(const ZelUtils::Any& value) const override;

private:
  PropertyKey m_elementCategory;
};

} // namespace Styles
