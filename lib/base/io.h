// All of a transfer, whatever the system gives or takes at a time.
#pragma once

#include <errno.h>
#include <unistd.h>

#include <cstddef>

// Reads up to `size` bytes of `file` from `offset`; `*given` is how many there were. 0, or the
// errno.
inline int ReadAt(int file, void *bytes, size_t size, off_t offset, size_t *given) {
  *given = 0;
  while (*given < size) {
    const ssize_t got = pread(file, static_cast<char *>(bytes) + *given, size - *given,
                              offset + static_cast<off_t>(*given));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return errno;
    if (got == 0) break;
    *given += static_cast<size_t>(got);
  }
  return 0;
}

// Writes `size` bytes to `file`. 0, or the errno.
inline int WriteAll(int file, const void *bytes, size_t size) {
  const char *rest = static_cast<const char *>(bytes);
  while (size > 0) {
    const ssize_t written = write(file, rest, size);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return written == 0 ? ENOSPC : errno;
    rest += written;
    size -= static_cast<size_t>(written);
  }
  return 0;
}
