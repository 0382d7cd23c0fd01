/// @file
/// The style object and the keys that name its properties. A PropertyKey is
/// an interned UTF-16 name, one word wide, compared by identity; the process
/// pool that holds the names is Styles::StringPool::Get().
#pragma once

#include <Styles/Export.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>
#include <ZelUtils/Delegate.h>
#include <ZelUtils/Span.h>
#include <ZelUtils/StringPool.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <iterator>
#include <map>
#include <memory>
#include <set>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

namespace Json {
class Value;
class Object;
class Writer;
} // namespace Json

namespace Styles {

/// Tag of the process-wide pool of property and category names.
struct STYLES_API StringPool {
  /// The pool, created on first use (thread-safe) and destroyed at exit.
  static ZelUtils::StringPool& Get();
};

/// An interned name. Equality, ordering and hashing go by pool entry, so maps
/// of keys iterate in identity order, not alphabetically.
using PropertyKey = ZelUtils::PooledString<StringPool>;

class Style;
class StyleCategory;
class StyleSheet;
class BaseStyleProperty;
namespace detail {
class StyleJson;
} // namespace detail

/// The JSON value written and read by styles and behaviours.
using JsonValue = Json::Value;
/// A read-only set of styles that knows whether it is sorted by address.
using StyleSpan = ZelUtils::maybe_sorted_span<Style* const, std::less<void>>;
/// Visitor of property values: (value, holding style, key); false stops.
using PropertyVisitor =
    ZelUtils::PortableVersion::Delegate<bool(ZelUtils::Any&, Style*, const PropertyKey&)>;
/// Visitor of styles; false stops.
using StyleVisitor = ZelUtils::PortableVersion::Delegate<bool(Style*)>;

/// The own values of a style, sorted by key identity, in one block: the keys
/// side by side (so that a lookup scans 8 bytes a key), then the values.
/// Searched linearly while small and by bisection when large; a 64-bit mask of
/// the keys' hashes, kept beside the block pointer, answers most lookups of an
/// absent key without touching the block. Iteration is in
/// key order and yields (key, value) pairs of references.
class STYLES_API PropertyMap {
public:
  /// A key and its value, both referring into the map; valid until the map
  /// changes. A mutable entry converts to a read-only one.
  template <class Value> struct BasicEntry {
    const PropertyKey& first; ///< the key
    Value& second;            ///< its value
    /// A read-only view of a mutable entry.
    template <class Other, class = std::enable_if_t<std::is_convertible<Other&, Value&>::value>>
    BasicEntry(const BasicEntry<Other>& other) noexcept
        : first(other.first), second(other.second) {}
    /// The entry of `key` and `value`, both kept by reference.
    BasicEntry(const PropertyKey& key, Value& value) noexcept : first(key), second(value) {}
  };
  ///@{

  /// An entry whose value may be changed, and a read-only one.
  using Entry = BasicEntry<ZelUtils::Any>;
  using ConstEntry = BasicEntry<const ZelUtils::Any>;
  ///@}

  /// Iterator over the entries, in key order; dereferencing yields an entry
  /// by value.
  template <class Value> class BasicIterator {
  public:
    ///@{

    /// The standard iterator traits.
    using iterator_category = std::forward_iterator_tag;
    using value_type = BasicEntry<Value>;
    using difference_type = std::ptrdiff_t;
    using pointer = void;
    using reference = BasicEntry<Value>;
    ///@}

    /// The position of `key` and `value`, which are parallel.
    BasicIterator(const PropertyKey* key, Value* value) noexcept : m_key(key), m_value(value) {}
    /// The entry at this position.
    BasicEntry<Value> operator*() const noexcept { return {*m_key, *m_value}; }
    ///@{

    /// Steps to the next entry.
    BasicIterator& operator++() noexcept {
      ++m_key;
      ++m_value;
      return *this;
    }
    BasicIterator operator++(int) noexcept {
      BasicIterator before = *this;
      ++*this;
      return before;
    }
    ///@}
    ///@{

    /// Same position.
    friend bool operator==(const BasicIterator& a, const BasicIterator& b) noexcept {
      return a.m_key == b.m_key;
    }
    friend bool operator!=(const BasicIterator& a, const BasicIterator& b) noexcept {
      return a.m_key != b.m_key;
    }
    ///@}

  private:
    const PropertyKey* m_key;
    Value* m_value;
  };
  ///@{

  /// Iterator types over the entries.
  using iterator = BasicIterator<ZelUtils::Any>;
  using const_iterator = BasicIterator<const ZelUtils::Any>;
  ///@}

  /// An empty map; it allocates on its first insert.
  PropertyMap() noexcept = default;
  /// Takes the other map's entries, leaving it empty.
  PropertyMap(PropertyMap&& other) noexcept : m_block(other.m_block), m_keyMask(other.m_keyMask) {
    other.m_block = nullptr;
    other.m_keyMask = 0;
  }
  /// Destroys the own entries and takes the other map's, leaving it empty.
  PropertyMap& operator=(PropertyMap&& other) noexcept {
    PropertyMap taken(std::move(other));
    Swap(taken);
    return *this;
  }
  ///@{

  /// Not copyable: a style copies values through their behaviours.
  PropertyMap(const PropertyMap&) = delete;
  PropertyMap& operator=(const PropertyMap&) = delete;
  ///@}
  /// Destroys the values (releasing nothing they own, as Clear).
  ~PropertyMap();

  ///@{

  /// The entries in key order.
  const_iterator begin() const noexcept { return {Keys(), Values()}; }
  const_iterator end() const noexcept { return {Keys() + size(), Values() + size()}; }
  iterator begin() noexcept { return {Keys(), Values()}; }
  iterator end() noexcept { return {Keys() + size(), Values() + size()}; }
  ///@}

  ///@{

  /// The number of entries.
  std::size_t size() const noexcept { return m_block ? m_block->size : 0; }
  bool empty() const noexcept { return size() == 0; }
  ///@}

  ///@{

  /// Entry i in key order; i must be below size().
  ConstEntry operator[](std::size_t i) const noexcept { return {Keys()[i], Values()[i]}; }
  Entry operator[](std::size_t i) noexcept { return {Keys()[i], Values()[i]}; }
  ///@}

  ///@{

  /// The value stored under `key`, or null.
  const ZelUtils::Any* Find(const PropertyKey& key) const noexcept {
    if (!(m_keyMask & MaskBit(key)))
      return nullptr;
    const std::size_t i = LowerBound(key);
    return i < size() && Keys()[i] == key ? Values() + i : nullptr;
  }
  ZelUtils::Any* Find(const PropertyKey& key) noexcept {
    return const_cast<ZelUtils::Any*>(static_cast<const PropertyMap*>(this)->Find(key));
  }
  ///@}

  /// Whether `key` has an entry.
  bool Contains(const PropertyKey& key) const noexcept { return Find(key) != nullptr; }
  /// Stores `value` under `key` unless the key is present; true when stored.
  bool Insert(const PropertyKey& key, ZelUtils::Any&& value);
  /// Removes the entry of `key`; true when there was one.
  bool Erase(const PropertyKey& key);
  /// Removes every entry. Like Erase, it releases nothing a value owns: a
  /// style releases its substyles through their behaviours first.
  void Clear() noexcept;
  /// Makes room for `count` entries in all: a hint, never needed. The room
  /// is exact, so a document's values take no more than they need.
  void Reserve(std::size_t count);
  /// Exchanges the entries of the two maps without copying a value.
  void Swap(PropertyMap& other) noexcept {
    std::swap(m_block, other.m_block);
    std::swap(m_keyMask, other.m_keyMask);
  }

private:
  // The block's head; `capacity` keys follow it, then `capacity` values.
  struct Block {
    std::uint32_t size;
    std::uint32_t capacity;
  };
  static_assert(sizeof(Block) % alignof(PropertyKey) == 0 &&
                    sizeof(PropertyKey) % alignof(ZelUtils::Any) == 0,
                "keys follow the head and values follow the keys unpadded");

  PropertyKey* Keys() const noexcept {
    return m_block ? reinterpret_cast<PropertyKey*>(m_block + 1) : nullptr;
  }
  ZelUtils::Any* Values() const noexcept {
    return m_block ? reinterpret_cast<ZelUtils::Any*>(Keys() + m_block->capacity) : nullptr;
  }
  // The key's bit in the mask: the pool keeps its entries side by side, so
  // keys pooled one after another, as a category's are, get distinct bits.
  static std::uint64_t MaskBit(const PropertyKey& key) noexcept {
    const std::size_t slot = key.getHash() / sizeof(ZelStringT<char16_t>);
    return std::uint64_t(1) << (slot & 63);
  }
  // Moves the entries into a new block with room for `capacity`.
  void Reallocate(std::size_t capacity);

  // Index of the first entry whose key is not less than `key`.
  std::size_t LowerBound(const PropertyKey& key) const noexcept {
    constexpr std::size_t kLinearLimit = 16;
    const std::size_t count = size();
    const PropertyKey* keys = Keys();
    if (count <= kLinearLimit) {
      std::size_t i = 0;
      while (i < count && keys[i] < key)
        ++i;
      return i;
    }
    std::size_t first = 0, length = count;
    while (length > 0) {
      const std::size_t half = length / 2;
      if (keys[first + half] < key) {
        first += half + 1;
        length -= half + 1;
      } else {
        length = half;
      }
    }
    return first;
  }

  Block* m_block = nullptr;
  std::uint64_t m_keyMask = 0; // the MaskBit of every key present
};

/// A set of property values of one category, with a parent to inherit from
/// and, for a substyle, the style (owner) whose property holds it. Every
/// value-specific decision goes through the behaviour that the category
/// registers for the key. The style owns its values and the substyles in them;
/// parent and owner are never owned.
class STYLES_API Style {
public:
  /// A free style without category, parent or values; see SetCategory.
  Style();
  /// A free style of the category registered under `categoryName` (none when
  /// unknown) inheriting from `parent` (not owned).
  Style(Style* parent, const PropertyKey& categoryName);
  /// A copy has the source's parent, category, strings and copied values but
  /// no owner.
  Style(const Style& other);
  /// Takes the source's values as move assignment does.
  Style(Style&& other);
  /// Destroys the own values, then takes the source's parent, category and
  /// strings and copies of its values; the owner stays.
  Style& operator=(const Style& other);
  /// Takes the source's values; the source keeps its parent, category and
  /// strings but no values.
  Style& operator=(Style&& other);
  /// Destroys the own values (and so the owned substyles).
  ~Style();

  /// Makes the style inherit from `parent` (not owned; may be null). Not
  /// checked for cycles: sheets refuse them when they read documents.
  void SetParent(Style* parent) noexcept { m_parent = parent; }
  /// The style this one inherits from, or null; not owned.
  Style* GetParent() const noexcept { return m_parent; }
  ///@{

  /// The style whose property holds this substyle, and that property's key;
  /// null and empty for a top-level style. Not owned.
  Style* GetOwner() const noexcept { return m_owner; }
  const PropertyKey& GetOwnerPropertyKey() const noexcept { return m_ownerPropertyKey; }
  ///@}

  /// Used by substyle behaviours to point a held substyle back at its holder.
  void SetOwner(Style* owner, const PropertyKey& ownerPropertyKey) noexcept {
    m_owner = owner;
    m_ownerPropertyKey = ownerPropertyKey;
  }
  /// Binds the style to the registered category `name`; on any failure the
  /// previous category stays. Own values for which the new category has no
  /// behaviour of the same kind are destroyed, as nothing could free them
  /// later. Never throws.
  void SetCategory(const PropertyKey& name);
  ///@{

  /// The category's key and object; empty and null without category. The
  /// category object is shared with the manager.
  PropertyKey GetCategoryName() const noexcept;
  const std::shared_ptr<const StyleCategory>& GetCategory() const noexcept { return m_category; }
  ///@}

  ///@{

  /// Sets the ID (or name) of the external style this one stands for.
  /// Also sets the same field of the single substyles held directly by a
  /// style of the "style" category (one level deep).
  void SetExternalID(const ZelStringT<char16_t>& id);
  void SetExternalName(const ZelStringT<char16_t>& name);
  ///@}

  ///@{

  /// The ID and name of the external style; empty when not set.
  const ZelStringT<char16_t>& GetExternalID() const noexcept;
  const ZelStringT<char16_t>& GetExternalName() const noexcept;
  ///@}

  /// True when the style has an external ID.
  bool IsExternal() const noexcept { return m_external && !m_external->id.IsEmpty(); }
  /// The own values in key order.
  const PropertyMap& GetProperties() const noexcept { return m_properties; }

  /// Points the substyles of every own value back at this style.
  void RepairSubstyleOwnerPointers();
  /// Exchanges everything but owner and owner key, then repairs both styles.
  void SwapData(Style& other);

  ///@{

  /// Same category object, parent, strings and values; owners are ignored and
  /// a key without behaviour makes the styles unequal.
  bool operator==(const Style& other) const;
  bool operator!=(const Style& other) const { return !(*this == other); }
  ///@}

  /// A strict order for sorting; a key without behaviour counts as equal.
  bool operator<(const Style& other) const;
  /// Like operator<, but equal parentless substyles are ordered by the
  /// substyle their owners would inherit from.
  bool substyle_less_including_owner_based_inheritance(const Style& other) const;

  /// @name Lookup
  /// References point into styles or categories and are never copies.
  ///@{

  /// The own value, else the inherited one, else the category default. Throws
  /// std::exception for a key nobody holds that the category does not register.
  const ZelUtils::Any& GetProperty(const PropertyKey& key) const;
  /// The value the style would have without its own value.
  const ZelUtils::Any& GetInheritedProperty(const PropertyKey& key) const;
  /// False for an unregistered key or when only the default is found; else
  /// copies the value into `out`.
  bool GetProperty(const PropertyKey& key, ZelUtils::Any& out) const;
  /// False when only the default is found; else copies into `out`.
  bool GetInheritedProperty(const PropertyKey& key, ZelUtils::Any& out) const;
  /// Copies the own value into `out`; false when there is none.
  bool GetOverrideProperty(const PropertyKey& key, ZelUtils::Any& out) const;
  /// Whether the style sets `key` itself.
  bool DoesOverrideProperty(const PropertyKey& key) const noexcept;
  /// The single substyle under `key`. With `inherited` the effective value
  /// counts and must hold a Style* (else std::bad_cast); without, only an own
  /// Style* value counts (else null). Owned by the holding style.
  Style* GetSubstyle(const PropertyKey& key, bool inherited) const;
  /// The own substyle under `key`, created from an empty style of
  /// `categoryName` when missing; null when nothing can be stored.
  Style* GetSubstyleAndCreateIfMissing(const PropertyKey& key, const PropertyKey& categoryName);
  /// The effective value at the end of `path`; where the path leaves the own
  /// substyles, the default of the category reached through element
  /// categories. Throws std::exception for an empty path or a lost category.
  const ZelUtils::Any& GetPathProperty(const std::vector<PropertyKey>& path) const;
  ///@}

  /// @name Editing
  /// A key without behaviour in the category is never stored.
  ///@{

  /// Copying form: destroys the old value, then stores what the behaviour
  /// makes of a copy of `value` (an empty result clears the key).
  void SetProperty(const PropertyKey& key, const ZelUtils::Any& value);
  /// Moving form: does nothing without category or behaviour; an empty result
  /// removes the entry without destroying the old value.
  void SetProperty(const PropertyKey& key, ZelUtils::Any&& value);
  /// Wraps `value` in an Any and calls the moving form.
  template <class T, class = std::enable_if_t<!std::is_same<std::decay_t<T>, ZelUtils::Any>::value>>
  void SetProperty(const PropertyKey& key, T value) {
    SetProperty(key, ZelUtils::Any(std::move(value)));
  }
  /// Releases what `value` owns through the behaviour of `key`, if any.
  void DestroyPropertyData(const PropertyKey& key, const ZelUtils::Any& value) const;
  /// Removes the own value of `key`; false when there was none.
  bool ClearProperty(const PropertyKey& key);
  /// ClearProperty at the end of `path` through own substyles.
  bool ClearPathProperty(const std::vector<PropertyKey>& path);
  /// Clears only where clearing lets a value be inherited (or when `force`).
  bool RevertPathProperty(const std::vector<PropertyKey>& path, bool force);
  /// Clears every key that `keysOf` holds itself; nothing for null.
  void ClearProperties(const Style* keysOf);
  /// Destroys and removes every own value; links, category and strings stay.
  void ClearAllProperties();
  /// A new free style of the same category holding the effective values of
  /// `keys` (defaults included) as its own. The caller owns it.
  Style* CopyProperties(const std::set<PropertyKey>& keys) const;
  /// Sets the last key of `path`, creating own substyles along the way.
  void SetPathProperty(const std::vector<PropertyKey>& path, const ZelUtils::Any& value);
  /// The same, moving `value`.
  void SetPathProperty(const std::vector<PropertyKey>& path, ZelUtils::Any&& value);
  /// Copies the own value at `path` of `source` (not null), clearing where
  /// the source holds none.
  void SetPathProperty(const std::vector<PropertyKey>& path, const Style* source);
  /// The same for every path of `paths`, in order.
  void SetProperties(const std::vector<std::vector<PropertyKey>>& paths, const Style* source);
  ///@}

  /// @name Resetting and structural queries
  ///@{

  /// Removes every own value but the single substyles, which are emptied the
  /// same way; true when anything was removed at any depth. Links, category
  /// and strings stay.
  bool RevertAllProperties();
  /// Destroys every own value, substyles included, and cuts the parent link;
  /// owner, category and strings stay.
  void Clear();
  /// Whether a substyle at any depth has a parent.
  bool SubstylesHaveAnyParentalRelationships() const;
  /// Whether the style holds nothing but substyles that are empty the same way.
  bool IsEmptyWithEmptySubstyles() const;
  /// Whether the style reached along `path` through own substyles sets the
  /// last key itself. A last key "*" asks whether it sets or inherits anything
  /// at all (a parent, a value, a substyle with a parent).
  bool DoesOverridePathProperty(const std::vector<PropertyKey>& path) const;
  /// The UI name of the style's category; empty without category.
  ZelStringT<char16_t> GetCategoryUIName() const;
  /// The number of own single-substyle values; arrays do not count.
  unsigned GetNumSubstyles() const;
  /// The own substyle of the last single-substyle entry in key order, looked
  /// up under that behaviour's element category name; null when none.
  Style* GetLastSubstyle() const;
  ///@}

  /// @name Merging and flattening
  ///@{

  /// Merges every own value of `other` through the behaviours of `other`'s
  /// category; with `overwrite` false values this style sets itself stay.
  void MergeProperties(const Style* other, bool overwrite);
  /// Takes over the values `parent` sets itself where this style sets none.
  void MergeParentProperties(const Style* parent);
  /// Makes every effective value of the category's keys the style's own and
  /// cuts the parent link. Keys flattened are added to `flattenedKeys`; the
  /// result is whether that set is non-empty (it is not cleared on entry).
  bool Flatten(std::set<PropertyKey>& flattenedKeys);
  /// The same without reporting the keys; true when any key was flattened.
  bool Flatten();
  /// A flattened free copy, resolved as this style resolves in its owner.
  /// The caller owns it.
  Style* CreateFlattenedStyle(std::set<PropertyKey>& flattenedKeys) const;
  /// The same without reporting the keys. The caller owns the result.
  Style* CreateFlattenedStyle() const;
  /// True when some values can only be resolved through the owners.
  bool StylePropertiesHasDependencyOnOwner() const;
  /// Makes this style's substyle under `key` resolve as `source`'s does.
  void CopySubstyleProperties(const Style* source, const PropertyKey& key);
  /// A free copy of the substyle under `key` that resolves on its own as the
  /// original does inside its owners. The caller owns the result.
  Style* CreateSubStyleCloneWithNoDependencyOnOwner(const PropertyKey& key) const;
  /// The same for the style itself. The caller owns the result.
  Style* CreateStyleCloneWithNoDependencyOnOwner() const;
  ///@}

  /// @name Dependencies on other styles
  /// A style depends on itself, its parents and what its values hold.
  /// Every walk along the parent chain is a loop: any length of chain is
  /// answered in linear time and constant stack.
  ///@{

  /// Whether the style is one of `styles`, inherits from one, or holds a value
  /// that depends on one; with `parentOnly`, only the style itself, its parent
  /// and the parents of its substyles count.
  bool HasDependency(StyleSpan styles, bool parentOnly) const;
  /// The styles of `styles` this style depends on, sorted, without repeats.
  std::vector<Style*> GetDependencies(StyleSpan styles, bool parentOnly) const;
  /// The same for a span that is sorted.
  std::vector<Style*> GetDependenciesImpl(StyleSpan styles, bool parentOnly) const;
  /// Whether an ancestor is in `styles` or depends on one of them.
  bool HasParentalDependency(StyleSpan styles) const;
  /// Whether the style inherits from any other style.
  bool HasParentalDependency() const;
  /// Cuts the dependencies on `styles`, keeping every effective value.
  void RemoveDependency(StyleSpan styles, bool parentOnly);
  /// Folds the whole parent chain into the style and cuts every dependency.
  void RemoveAllDependencies();
  /// Redirects the parent and the values from old styles to new ones; a
  /// mapping to null is ignored.
  void RemapDependency(const std::map<Style*, Style*>& map);
  /// Redirects pointer-like values held in the values; the parent stays.
  void RemapPointer(const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>& pairs);
  /// Visits every own value in key order; false when the visitor stopped.
  bool ProcessProperties(const PropertyVisitor& visit);
  /// Visits the own values at `paths`; false when the visitor stopped.
  bool ProcessProperties(const std::vector<std::vector<PropertyKey>>& paths,
                         const PropertyVisitor& visit);
  ///@}

  /// @name JSON form
  ///@{

  /// Fills `out` with the style's object: "inherits" (the parent's
  /// name in `sheet`), "id", "original", then the own values in key order.
  void Serialize(const StyleSheet& sheet, JsonValue& out, bool includeTemporary) const;
  /// The same as text.
  ZelStringT<char16_t> Serialize(const StyleSheet& sheet, bool format, bool includeTemporary) const;
  /// Reads `object` into this style (which has its category); parent names
  /// resolve in `sheet`. Exceptions of behaviours pass through.
  void DeserializeJson(const StyleSheet& sheet, const Json::Object& object);
  /// A new parentless style of `category` read from `object`; the caller owns it.
  static Style* Deserialize(const StyleSheet& sheet, const Json::Object& object,
                            const PropertyKey& category);
  ///@}

private:
  // Adopts deserialized substyles into the property map without copying.
  friend class StyleSetProperty;

  // The behaviour of `key` in this style's category, or null.
  BaseStyleProperty* FindBehaviour(const PropertyKey& key) const;
  void DestroyOwnValues() noexcept;
  // DestroyOwnValues, then the source's parent, category and strings.
  void DestroyValuesAndTakeLinks(const Style& source);
  // The external ID and name, held apart since few styles have them.
  struct ExternalNames {
    ZelStringT<char16_t> id;
    ZelStringT<char16_t> name;
  };
  void SetExternalField(ZelStringT<char16_t> ExternalNames::*field,
                        const ZelStringT<char16_t>& text);
  // Takes over the parent's own values, then inherits from its parent.
  void MergeParent();
  // Whether one of the style's own values depends on `styles`.
  bool ValuesDepend(StyleSpan styles, bool parentOnly) const;
  // Whether an ancestor is in `styles` or holds a value depending on them.
  bool AncestorsDepend(StyleSpan styles) const;
  // Appends the dependencies of the style's own values.
  void AppendValueDependencies(StyleSpan styles, bool parentOnly, std::vector<Style*>& out) const;

  // Reads and writes the style's JSON members.
  friend class detail::StyleJson;
  const ZelUtils::Any& DefaultValue(const PropertyKey& key) const;

  PropertyMap m_properties;
  Style* m_parent = nullptr;
  Style* m_owner = nullptr;
  PropertyKey m_ownerPropertyKey;
  std::shared_ptr<const StyleCategory> m_category;
  std::unique_ptr<ExternalNames> m_external; // null while both are empty
};

} // namespace Styles

namespace ZelUtils {
/// The key of the empty text.
template <>
STYLES_API const PooledString<Styles::StringPool> PooledString<Styles::StringPool>::Empty;
} // namespace ZelUtils
