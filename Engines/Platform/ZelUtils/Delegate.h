/// @file
/// ZelUtils::PortableVersion::Delegate: the callable wrapper used for visitors.
/// It is built from any callable (lambdas included) and called like a function.
#pragma once

#include <functional>
#include <type_traits>
#include <utility>

namespace ZelUtils {
namespace PortableVersion {

template <class Signature> class Delegate;

/// A copyable callable of the signature `R(Args...)`, or nothing.
template <class R, class... Args> class Delegate<R(Args...)> {
public:
  Delegate() = default;
  /// Wraps any callable whose result converts to `R`; implicit, so that lambdas
  /// pass where a delegate is expected.
  template <class F, class = std::enable_if_t<!std::is_same<std::decay_t<F>, Delegate>::value &&
                                              std::is_invocable_r<R, F&, Args...>::value>>
  Delegate(F&& callable) : m_function(std::forward<F>(callable)) {}

  /// Calling an empty delegate throws std::bad_function_call.
  R operator()(Args... args) const { return m_function(std::forward<Args>(args)...); }
  /// False for an empty delegate.
  explicit operator bool() const noexcept { return static_cast<bool>(m_function); }

private:
  std::function<R(Args...)> m_function;
};

} // namespace PortableVersion
} // namespace ZelUtils
