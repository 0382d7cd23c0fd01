/// @file
/// ZelUtils::Singleton<T>: one instance of T per process, created on first use
/// (thread-safe) and destroyed when the program or library is unloaded.
/// Instantiate Get() inside the one library that owns T so that every caller
/// shares the same instance.
#pragma once

namespace ZelUtils {

/// The process's one instance of `T`.
template <class T> class Singleton {
public:
  /// The instance, created on first call; never null, owned by the process.
  static T& Get() {
    static T instance;
    return instance;
  }
};

} // namespace ZelUtils
