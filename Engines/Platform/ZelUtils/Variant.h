/// @file
/// ZelUtils::Variant: a value of one of a fixed list of kinds, with checked
/// access that throws std::bad_cast on a kind mismatch.
#pragma once

#include <cstddef>
#include <type_traits>
#include <typeinfo>
#include <utility>
#include <variant>

namespace ZelUtils {

/// A value of exactly one of `Kinds`; default-constructed, the first kind's default.
template <class... Kinds> class Variant {
public:
  /// The standard variant that holds the value.
  using Storage = std::variant<Kinds...>;

  Variant() = default;
  /// Holds the kind that `value` converts to, as std::variant chooses it.
  template <class T, class = std::enable_if_t<std::is_constructible<Storage, T&&>::value &&
                                              !std::is_base_of<Variant, std::decay_t<T>>::value>>
  Variant(T&& value) : m_value(std::forward<T>(value)) {}

  /// True when the held kind is exactly `T`.
  template <class T> bool Is() const noexcept { return std::holds_alternative<T>(m_value); }
  ///@{

  /// The held value; throws std::bad_cast when another kind is held.
  template <class T> T& Get() {
    if (T* held = std::get_if<T>(&m_value))
      return *held;
    throw std::bad_cast();
  }
  template <class T> const T& Get() const {
    if (const T* held = std::get_if<T>(&m_value))
      return *held;
    throw std::bad_cast();
  }
  ///@}

  ///@{

  /// The held value, or null when another kind is held.
  template <class T> T* GetIf() noexcept { return std::get_if<T>(&m_value); }
  template <class T> const T* GetIf() const noexcept { return std::get_if<T>(&m_value); }
  ///@}

  /// Replaces the held value by a T built from args; returns it.
  template <class T, class... Args> T& Emplace(Args&&... args) {
    return m_value.template emplace<T>(std::forward<Args>(args)...);
  }
  /// The position of the held kind in `Kinds`, from 0.
  std::size_t Index() const noexcept { return m_value.index(); }
  ///@{

  /// The standard variant itself, for std::visit.
  const Storage& GetStorage() const noexcept { return m_value; }
  Storage& GetStorage() noexcept { return m_value; }
  ///@}

  ///@{

  /// Equal when the same kind is held and the values compare equal.
  friend bool operator==(const Variant& a, const Variant& b) { return a.m_value == b.m_value; }
  friend bool operator!=(const Variant& a, const Variant& b) { return !(a == b); }
  ///@}

private:
  Storage m_value;
};

} // namespace ZelUtils
