// A growing run of bytes whose failure to grow is a result.
#pragma once

#include <errno.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <utility>

// Owns its bytes; they are always followed by a NUL that does not count.
class Bytes {
 public:
  Bytes() = default;
  ~Bytes() { free(data_); }
  Bytes(const Bytes &) = delete;
  Bytes &operator=(const Bytes &) = delete;

  // Makes room for `more` bytes behind the present ones. False without memory.
  bool Reserve(size_t more) {
    if (more >= SIZE_MAX / 2 - size_) return false;
    const size_t wanted = size_ + more + 1;
    if (wanted <= capacity_) return true;
    const size_t grown = wanted > capacity_ * 2 ? wanted : capacity_ * 2;
    void *data = realloc(data_, grown);
    if (data == nullptr) return false;
    data_ = static_cast<char *>(data);
    capacity_ = grown;
    data_[size_] = '\0';
    return true;
  }

  bool Append(const void *bytes, size_t size) {
    if (!Reserve(size)) return false;
    if (size > 0) memcpy(data_ + size_, bytes, size);
    size_ += size;
    data_[size_] = '\0';
    return true;
  }

  void Clear() { size_ = 0; }

  // Forgets the bytes behind the first `size`, of which there are that many.
  void Truncate(size_t size) {
    size_ = size;
    if (data_ != nullptr) data_[size] = '\0';
  }

  // Hands the bytes over to the caller, who frees them; null where none were ever held.
  char *Release() {
    size_ = capacity_ = 0;
    return std::exchange(data_, nullptr);
  }

  char *data() { return data_; }
  const char *text() const { return data_ != nullptr ? data_ : ""; }
  size_t size() const { return size_; }

  // Reads `file` from its present place to its end behind the present bytes. 0, or the errno:
  // ENOMEM without memory, EFBIG where there are more than `most` bytes. What was read until then
  // is kept.
  int ReadAll(int file, size_t most = size_t{64} << 20) {
    constexpr size_t kStep = 16384;
    const size_t before = size_;
    while (true) {
      if (!Reserve(kStep)) return ENOMEM;
      const ssize_t got = read(file, data_ + size_, capacity_ - size_ - 1);
      if (got < 0 && errno == EINTR) continue;
      if (got < 0) return errno;
      size_ += static_cast<size_t>(got);
      data_[size_] = '\0';
      if (got == 0) return 0;
      if (size_ - before > most) return EFBIG;
    }
  }

 private:
  char *data_ = nullptr;
  size_t size_ = 0;
  size_t capacity_ = 0;
};
