/// @file
/// ZelUtils::Any: the type-erased value of every style property. It holds one
/// copyable value of any kind (or nothing), copies deeply, keeps one-word values
/// inline, and compares values: kinds are identified by their type name so a
/// kind made in a host library and in the style library is the same kind.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <cstring>
#include <new>
#include <type_traits>
#include <typeinfo>
#include <utility>
#include <vector>

namespace ZelUtils {

namespace detail {

template <class T, class = void> struct HasEqualOperator : std::false_type {};
template <class T>
struct HasEqualOperator<T,
                        std::void_t<decltype(std::declval<const T&>() == std::declval<const T&>())>>
    : std::true_type {};

template <class T, class = void> struct HasLessOperator : std::false_type {};
template <class T>
struct HasLessOperator<T,
                       std::void_t<decltype(std::declval<const T&>() < std::declval<const T&>())>>
    : std::true_type {};

// The standard containers declare == and < for any element type, so their
// comparability is that of their elements.
template <class T> struct HasEqual : HasEqualOperator<T> {};
template <class T, class A> struct HasEqual<std::vector<T, A>> : HasEqual<T> {};
template <class A, class B>
struct HasEqual<std::pair<A, B>> : std::conjunction<HasEqual<A>, HasEqual<B>> {};

template <class T> struct HasLess : HasLessOperator<T> {};
template <class T, class A> struct HasLess<std::vector<T, A>> : HasLess<T> {};
template <class A, class B>
struct HasLess<std::pair<A, B>> : std::conjunction<HasLess<A>, HasLess<B>> {};

using CompareFunction = bool (*)(const void* a, const void* b);

// The comparison functions of a kind, null where the kind has none; kept out
// of line so that a kind without == or < never instantiates them.
template <class T, bool = HasEqual<T>::value> struct EqualOf {
  static constexpr CompareFunction kFunction = nullptr;
};
template <class T> struct EqualOf<T, true> {
  static bool Call(const void* a, const void* b) {
    return static_cast<bool>(*static_cast<const T*>(a) == *static_cast<const T*>(b));
  }
  static constexpr CompareFunction kFunction = &Call;
};
template <class T, bool = HasLess<T>::value> struct LessOf {
  static constexpr CompareFunction kFunction = nullptr;
};
template <class T> struct LessOf<T, true> {
  static bool Call(const void* a, const void* b) {
    return static_cast<bool>(*static_cast<const T*>(a) < *static_cast<const T*>(b));
  }
  static constexpr CompareFunction kFunction = &Call;
};

// What Any needs to know about a held kind; one table per kind and library.
struct KindOps {
  const std::type_info* type;
  // All three take the Any's storage (the value itself, or the pointer to it).
  void (*copy)(void* to, const void* from);    // copy-constructs into `to`
  void (*move)(void* to, void* from) noexcept; // moves into `to`; `from` is then raw
  void (*destroy)(void* storage) noexcept;
  CompareFunction equal; // null: the kind has no equality
  CompareFunction less;  // null: the kind has no ordering
  bool isEnum;
  long long (*enumAsInt)(const void* object);
  bool onHeap;
};

// Same kind: same type_info, or the same type name (types made in two
// shared libraries may have two type_info objects). type_info's own equality
// compares the name pointers, then the texts, except for types local to one
// translation unit, which must stay distinct even when their names agree.
inline bool SameKind(const std::type_info& a, const std::type_info& b) noexcept {
  return &a == &b || a == b;
}

// The kind Any stores for a value of type T: UTF-16 character pointers (string
// literals) become the text kind.
template <class T>
using StoredKind =
    std::conditional_t<std::is_same<T, const char16_t*>::value || std::is_same<T, char16_t*>::value,
                       ZelStringT<char16_t>, T>;

} // namespace detail

/// One value of any copyable kind, or nothing (the empty value). Copies are
/// deep; Get and GetIf reach the held value itself, never a copy.
class Any {
  // Room for one word: numbers, flags, enumerations and pointers live inline;
  // text and lists live behind a pointer, which keeps a stored value at 16
  // bytes for the many numbers a sheet holds.
  static constexpr std::size_t kInlineSize = sizeof(void*);
  static constexpr std::size_t kInlineAlign = alignof(double);

  template <class T>
  static constexpr bool
      kInline = (sizeof(T) <= kInlineSize) &&
                (alignof(T) <= kInlineAlign) && std::is_nothrow_move_constructible<T>::value;

public:
  Any() noexcept {}
  ///@{

  /// Copies the held value deeply; moving leaves `other` empty.
  Any(const Any& other) : m_ops(nullptr) { CopyFrom(other); }
  Any(Any&& other) noexcept : m_ops(nullptr) { MoveFrom(other); }
  ///@}

  /// Holds a copy of `value`. A UTF-16 literal is held as ZelStringT<char16_t>,
  /// the kind of all text values, rather than as a pointer.
  template <class T, class D = std::decay_t<T>,
            class = std::enable_if_t<!std::is_same<D, Any>::value &&
                                     std::is_copy_constructible<D>::value>>
  Any(T&& value) {
    Emplace<detail::StoredKind<D>>(std::forward<T>(value));
  }

  ~Any() { Reset(); }

  ///@{

  /// Destroys the held value and holds a deep copy of `other`'s; moving takes
  /// `other`'s value and leaves it empty. A copy that throws changes nothing.
  Any& operator=(const Any& other) {
    if (this != &other) {
      Any copy(other);
      Reset();
      MoveFrom(copy);
    }
    return *this;
  }
  Any& operator=(Any&& other) noexcept {
    if (this != &other) {
      Reset();
      MoveFrom(other);
    }
    return *this;
  }
  ///@}

  /// Same kind: assigns in place; another kind: replaces value and kind. A
  /// UTF-16 literal is held as text, as in the constructor.
  template <class T, class D = std::decay_t<T>,
            class = std::enable_if_t<!std::is_same<D, Any>::value &&
                                     std::is_copy_constructible<D>::value>>
  Any& operator=(T&& value) {
    using Kind = detail::StoredKind<D>;
    if constexpr (std::is_assignable<Kind&, T&&>::value) {
      if (Kind* held = GetIf<Kind>()) {
        *held = std::forward<T>(value);
        return *this;
      }
    }
    // Built before the old value goes: `value` may live inside it.
    Kind copy(std::forward<T>(value));
    Reset();
    Emplace<Kind>(std::move(copy));
    return *this;
  }

  /// True when nothing is held.
  bool IsEmpty() const noexcept { return m_ops == nullptr; }
  /// Destroys the held value; the Any is empty afterwards.
  void Reset() noexcept {
    if (m_ops) {
      m_ops->destroy(m_storage);
      m_ops = nullptr;
    }
  }

  /// The held kind; typeid(void) for the empty value.
  const std::type_info& Type() const noexcept { return m_ops ? *m_ops->type : typeid(void); }

  /// True when the held kind is T; a `const U*` also accepts a held `U*`.
  template <class T> bool IsTypeCompatible() const noexcept {
    if (!m_ops)
      return false;
    if (detail::SameKind(*m_ops->type, typeid(T)))
      return true;
    if constexpr (std::is_pointer<T>::value && std::is_const<std::remove_pointer_t<T>>::value) {
      using Mutable = std::add_pointer_t<std::remove_const_t<std::remove_pointer_t<T>>>;
      return detail::SameKind(*m_ops->type, typeid(Mutable));
    }
    return false;
  }

  ///@{

  /// The held value; throws std::bad_cast unless the held kind is exactly T.
  template <class T> T& Get() {
    if (T* held = GetIf<T>())
      return *held;
    throw std::bad_cast();
  }
  template <class T> const T& Get() const {
    if (const T* held = GetIf<T>())
      return *held;
    throw std::bad_cast();
  }
  ///@}

  ///@{

  /// The held value, or null when the held kind is not exactly T.
  template <class T> T* GetIf() noexcept {
    if (!m_ops || !detail::SameKind(*m_ops->type, typeid(T)))
      return nullptr;
    // Where T lives is known from T itself, the same rule in every library.
    void* storage = m_storage;
    if constexpr (kInline<T>)
      return static_cast<T*>(storage);
    else
      return *static_cast<T**>(storage);
  }
  template <class T> const T* GetIf() const noexcept { return const_cast<Any*>(this)->GetIf<T>(); }
  ///@}

  /// True when the held kind is an enumeration.
  bool HasEnum() const noexcept { return m_ops && m_ops->isEnum; }
  /// The held enumeration's value as an integer; 0 when no enumeration is held.
  long long GetEnumAsInt() const { return HasEnum() ? m_ops->enumAsInt(Object()) : 0; }

  ///@{

  /// Different kinds are unequal; two empty values are equal; a kind without
  /// an equality of its own never compares equal.
  friend bool operator==(const Any& a, const Any& b) {
    if (!a.m_ops || !b.m_ops)
      return !a.m_ops && !b.m_ops;
    if (!detail::SameKind(*a.m_ops->type, *b.m_ops->type))
      return false;
    return a.m_ops->equal && a.m_ops->equal(a.Object(), b.Object());
  }
  friend bool operator!=(const Any& a, const Any& b) { return !(a == b); }
  ///@}

  /// Values of different kinds are ordered by kind (a fixed ranking by type
  /// name, the empty kind first); same kinds by their own `<`, never less for
  /// kinds without one.
  friend bool operator<(const Any& a, const Any& b) {
    if (!a.m_ops || !b.m_ops)
      return !a.m_ops && b.m_ops;
    if (!detail::SameKind(*a.m_ops->type, *b.m_ops->type))
      return std::strcmp(a.m_ops->type->name(), b.m_ops->type->name()) < 0;
    return a.m_ops->less && a.m_ops->less(a.Object(), b.Object());
  }

private:
  template <class T> struct Ops {
    static void Copy(void* to, const void* from) {
      if constexpr (kInline<T>)
        ::new (to) T(*static_cast<const T*>(from));
      else
        *static_cast<void**>(to) = new T(*static_cast<const T*>(*static_cast<void* const*>(from)));
    }
    static void Move(void* to, void* from) noexcept {
      if constexpr (kInline<T>) {
        ::new (to) T(std::move(*static_cast<T*>(from)));
        static_cast<T*>(from)->~T();
      } else {
        *static_cast<void**>(to) = *static_cast<void**>(from);
      }
    }
    static void Destroy(void* storage) noexcept {
      if constexpr (kInline<T>)
        static_cast<T*>(storage)->~T();
      else
        delete static_cast<T*>(*static_cast<void**>(storage));
    }
    static long long EnumAsInt(const void* object) {
      if constexpr (std::is_enum<T>::value)
        return static_cast<long long>(*static_cast<const T*>(object));
      else
        return 0;
    }
    static constexpr detail::KindOps kTable = {&typeid(T),
                                               &Copy,
                                               &Move,
                                               &Destroy,
                                               detail::EqualOf<T>::kFunction,
                                               detail::LessOf<T>::kFunction,
                                               std::is_enum<T>::value,
                                               &EnumAsInt,
                                               !kInline<T>};
  };

  template <class T, class... Args> void Emplace(Args&&... args) {
    if constexpr (kInline<T>)
      ::new (static_cast<void*>(m_storage)) T(std::forward<Args>(args)...);
    else
      *reinterpret_cast<void**>(m_storage) = new T(std::forward<Args>(args)...);
    m_ops = &Ops<T>::kTable;
  }

  // Address of the held object (inline, or behind the heap pointer).
  void* Object() const noexcept {
    void* storage = const_cast<unsigned char*>(m_storage);
    return m_ops->onHeap ? *static_cast<void**>(storage) : storage;
  }
  void CopyFrom(const Any& other) {
    if (other.m_ops) {
      other.m_ops->copy(m_storage, other.m_storage);
      m_ops = other.m_ops;
    }
  }
  void MoveFrom(Any& other) noexcept {
    if (other.m_ops) {
      other.m_ops->move(m_storage, other.m_storage);
      m_ops = other.m_ops;
      other.m_ops = nullptr;
    }
  }

  const detail::KindOps* m_ops = nullptr;
  alignas(kInlineAlign) unsigned char m_storage[kInlineSize];
};

} // namespace ZelUtils
