// Reading the files of the Linux machine that is the host: below its root, without allocation
// where a bound is known, and with failures as statuses.
#pragma once

#include <dirent.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>

#include "base/bytes.h"
#include "base/number.h"
#include "zellibs.h"

// An open file descriptor, closed with its owner. -1: none.
class Descriptor {
 public:
  explicit Descriptor(int fd = -1) : fd_(fd) {}
  ~Descriptor() { Reset(-1); }
  Descriptor(Descriptor &&other) noexcept : fd_(other.Release()) {}
  Descriptor &operator=(Descriptor &&other) noexcept {
    Reset(other.Release());
    return *this;
  }

  int fd() const { return fd_; }
  bool valid() const { return fd_ >= 0; }
  int Release() {
    const int fd = fd_;
    fd_ = -1;
    return fd;
  }
  void Reset(int fd) {
    if (fd_ >= 0) close(fd_);
    fd_ = fd;
  }

 private:
  int fd_;
};

// As Bytes::ReadAll, with a status.
KIF_Status ReadWhole(const Descriptor &file, Bytes *bytes, size_t most = size_t{64} << 20);

// True where the host is a tree of files taken from elsewhere, and system calls about processes
// or devices do not speak of it.
bool IsForeignRoot();

// Opens `path`, absolute on the host ("/proc/uptime"), with O_CLOEXEC added to `flags`. The status
// tells why it could not. In a foreign tree no path leads out of it, and what is neither a regular
// file nor a folder is not found.
KIF_Status OpenHostFile(const char *path, int flags, Descriptor *file);

// The same for a path below an open directory.
KIF_Status OpenBelow(int directory, const char *path, int flags, Descriptor *file);

// Reads a file, at most `size` - 1 bytes of it, into `buffer` and terminates it; `*length` (may be
// null) is the number of bytes read.
KIF_Status ReadHostFile(const char *path, char *buffer, size_t size, size_t *length = nullptr);
KIF_Status ReadBelow(int directory, const char *path, char *buffer, size_t size,
                     size_t *length = nullptr);

// The same for a file that the kernel gives in one piece, as it does for those of a process that
// hold one line: one read, and no second one to see the end.
KIF_Status ReadPieceBelow(int directory, const char *path, char *buffer, size_t size,
                          size_t *length);

// The target of a symbolic link below `directory` (AT_FDCWD with an absolute path of the host is
// not for here), terminated, at most `size` - 1 bytes of it.
KIF_Status ReadLinkBelow(int directory, const char *path, char *buffer, size_t size,
                         size_t *length = nullptr);

// The entries of an open directory, in the kernel's order, without "." and "..".
class DirectoryReader {
 public:
  // Opens the directory at `path` below `directory`, or an absolute one of the host.
  KIF_Status Open(const char *path);
  KIF_Status OpenBelow(int directory, const char *path);

  // The next name, valid up to the next call; null at the end or after a failure (status()).
  const char *Next();
  KIF_Status status() const { return status_; }
  int fd() const { return directory_.fd(); }

 private:
  Descriptor directory_;
  KIF_Status status_ = 0;
  size_t filled_ = 0;
  size_t place_ = 0;
  alignas(8) char block_[8192];
};

// Copies a text of the machine into a field of `size` bytes: printable, cut at a character's end,
// terminated.
void CopyText(char *field, size_t size, const char *text, size_t length);
