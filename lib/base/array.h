// A growing array of plain records whose failure to grow is a result.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <type_traits>
#include <utility>

template <typename T>
class Array {
  static_assert(std::is_trivially_copyable_v<T>);

 public:
  Array() = default;
  ~Array() { free(items_); }
  Array(Array &&other) noexcept { Swap(other); }
  Array &operator=(Array &&other) noexcept {
    Swap(other);
    return *this;
  }

  // False without memory; the array is then as it was.
  bool Append(const T &item) {
    if (!Reserve(1)) return false;
    items_[size_++] = item;
    return true;
  }
  // Makes room for `more` items behind the present ones, so that appending them cannot fail. False
  // without memory.
  bool Reserve(size_t more) {
    if (more <= capacity_ - size_) return true;
    const size_t doubled = capacity_ == 0 ? 64 : capacity_ * 2;
    const size_t capacity = size_ + more > doubled ? size_ + more : doubled;
    // NOLINTNEXTLINE(bugprone-sizeof-expression): the items may be pointers
    void *grown = realloc(items_, capacity * sizeof(T));
    if (grown == nullptr) return false;
    items_ = static_cast<T *>(grown);
    capacity_ = capacity;
    return true;
  }
  void Clear() { size_ = 0; }
  // Forgets the items behind the first `size`, of which there are that many.
  void Truncate(size_t size) { size_ = size; }
  void Swap(Array &other) {
    std::swap(items_, other.items_);
    std::swap(size_, other.size_);
    std::swap(capacity_, other.capacity_);
  }

  size_t size() const { return size_; }
  T &operator[](size_t index) { return items_[index]; }
  const T &operator[](size_t index) const { return items_[index]; }
  T *begin() { return items_; }
  T *end() { return items_ + size_; }
  const T *begin() const { return items_; }
  const T *end() const { return items_ + size_; }

 private:
  T *items_ = nullptr;
  size_t size_ = 0;
  size_t capacity_ = 0;
};
