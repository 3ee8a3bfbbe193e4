// An object of static storage that is made at its first use and never destroyed, so that the
// library does nothing when it is loaded and nothing when the process ends.
#pragma once

#include <new>

template <typename T>
class Everlasting {
 public:
  T *operator->() { return &**this; }
  T &operator*() {
    if (!made_) new (storage_) T();
    made_ = true;
    return *std::launder(reinterpret_cast<T *>(storage_));
  }

 private:
  bool made_;
  alignas(T) unsigned char storage_[sizeof(T)];
};
