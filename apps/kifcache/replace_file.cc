#include "replace_file.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string>

#include "base/io.h"
#include "messages.h"

namespace {

bool Fail(const char *path, int error) {
  return Complain(path, strerror(error));
}

// Keeps every signal that can be kept back until later, for as long as it lives: while a name of
// ours stands beside the file, none leaves it behind.
class SignalsHeld {
 public:
  SignalsHeld() {
    sigset_t all;
    sigfillset(&all);
    sigprocmask(SIG_BLOCK, &all, &before_);
  }
  ~SignalsHeld() { sigprocmask(SIG_SETMASK, &before_, nullptr); }
  SignalsHeld(const SignalsHeld &) = delete;
  SignalsHeld &operator=(const SignalsHeld &) = delete;

 private:
  sigset_t before_;
};

std::string DirectoryOf(const std::string &path) {
  const size_t slash = path.rfind('/');
  return slash == path.npos ? "." : path.substr(0, slash + 1);
}

// A rename is on disk when its directory is; a directory that cannot be flushed is left at that.
void FlushDirectory(const std::string &path) {
  const int descriptor = open(DirectoryOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (descriptor == -1) return;
  (void)fsync(descriptor);
  close(descriptor);
}

int WriteAndFlush(int descriptor, const void *bytes, size_t size) {
  const int error = WriteAll(descriptor, bytes, size);
  return error == 0 && fsync(descriptor) != 0 ? errno : error;
}

int RenameOrRemove(const std::string &temporary, const char *path) {
  if (rename(temporary.c_str(), path) == 0) return 0;
  const int error = errno;
  unlink(temporary.c_str());
  return error;
}

// Gives the file without a name one beside `path`, and then that.
int NameFile(int descriptor, const char *path) {
  const std::string file = "/proc/self/fd/" + std::to_string(descriptor);
  constexpr int kMostAttempts = 100;
  const SignalsHeld held;
  for (int attempt = 0; attempt < kMostAttempts; ++attempt) {
    uint32_t number = 0;
    if (getrandom(&number, sizeof(number), 0) != sizeof(number)) return errno;
    char suffix[16];
    snprintf(suffix, sizeof(suffix), ".%08x", number);
    const std::string temporary = path + std::string(suffix);
    if (linkat(AT_FDCWD, file.c_str(), AT_FDCWD, temporary.c_str(), AT_SYMLINK_FOLLOW) == 0) {
      return RenameOrRemove(temporary, path);
    }
    if (errno != EEXIST) return errno;
  }
  return EEXIST;
}

// A file that has a name from its beginning.
int WriteNamed(const char *path, const void *bytes, size_t size) {
  std::string temporary = path + std::string(".XXXXXX");
  const SignalsHeld held;
  const int descriptor = mkostemp(temporary.data(), O_CLOEXEC);  // mode 0600
  if (descriptor == -1) return errno;
  int error = WriteAndFlush(descriptor, bytes, size);
  if (close(descriptor) != 0 && error == 0) error = errno;
  if (error == 0) return RenameOrRemove(temporary, path);
  unlink(temporary.c_str());
  return error;
}

// A file that has no name until it is whole: whatever ends the program leaves nothing behind. Not
// every file system can, nor can it be named without /proc.
int WriteNameless(const char *path, const void *bytes, size_t size, bool *possible) {
  const int descriptor = open(DirectoryOf(path).c_str(), O_TMPFILE | O_WRONLY | O_CLOEXEC, 0600);
  *possible = descriptor != -1 && access("/proc/self/fd", X_OK) == 0;
  int error = 0;
  if (*possible) error = WriteAndFlush(descriptor, bytes, size);
  if (*possible && error == 0) error = NameFile(descriptor, path);
  if (descriptor != -1) close(descriptor);
  return error;
}

}  // namespace

bool ReplaceFile(const char *path, const void *bytes, size_t size) {
  struct stat status;
  if (lstat(path, &status) == 0 && !S_ISREG(status.st_mode)) {
    return Complain(path, "not a regular file");
  }
  bool nameless = false;
  int error = WriteNameless(path, bytes, size, &nameless);
  if (!nameless) error = WriteNamed(path, bytes, size);
  if (error != 0) return Fail(path, error);
  FlushDirectory(path);
  return true;
}
