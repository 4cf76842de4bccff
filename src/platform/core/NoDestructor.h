#pragma once

#include <new>
#include <utility>

namespace kyn::platform {

/// Holds a process-wide object that is never destroyed, so that it stays usable while other
/// statics are torn down (a completion that logs while the plug-in unloads, for instance).
template <class T>
class NoDestructor {
 public:
  template <class... Args>
  explicit NoDestructor(Args&&... args) {
    new (storage_) T(std::forward<Args>(args)...);
  }
  NoDestructor(const NoDestructor&) = delete;
  NoDestructor& operator=(const NoDestructor&) = delete;

  T& get() noexcept { return *std::launder(reinterpret_cast<T*>(storage_)); }
  T* operator->() noexcept { return &get(); }
  T& operator*() noexcept { return get(); }

 private:
  alignas(T) unsigned char storage_[sizeof(T)];
};

}  // namespace kyn::platform
