#include "replace_file.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string>

#include "base/io.h"

namespace {

bool Fail(const char *path, int error) {
  fprintf(stderr, "kifcache: %s: %s\n", path, strerror(error));
  return false;
}

// Keeps the signals that end a program back for as long as it lives, so that no half-written file
// stays behind.
class SignalsHeld {
 public:
  SignalsHeld() {
    sigset_t held;
    sigemptyset(&held);
    for (const int signal : {SIGHUP, SIGINT, SIGQUIT, SIGTERM}) sigaddset(&held, signal);
    sigprocmask(SIG_BLOCK, &held, &before_);
  }
  ~SignalsHeld() { sigprocmask(SIG_SETMASK, &before_, nullptr); }
  SignalsHeld(const SignalsHeld &) = delete;
  SignalsHeld &operator=(const SignalsHeld &) = delete;

 private:
  sigset_t before_;
};

// A rename is on disk when its directory is; a directory that cannot be flushed is left at that.
void FlushDirectory(const std::string &path) {
  const size_t slash = path.rfind('/');
  const std::string directory = slash == path.npos ? "." : path.substr(0, slash + 1);
  const int descriptor = open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (descriptor == -1) return;
  (void)fsync(descriptor);
  close(descriptor);
}

}  // namespace

bool ReplaceFile(const char *path, const void *bytes, size_t size) {
  struct stat status;
  if (lstat(path, &status) == 0 && !S_ISREG(status.st_mode)) {
    fprintf(stderr, "kifcache: %s: not a regular file\n", path);
    return false;
  }
  std::string temporary = std::string(path) + ".XXXXXX";
  const SignalsHeld held;
  const int descriptor = mkostemp(temporary.data(), O_CLOEXEC);  // mode 0600
  if (descriptor == -1) return Fail(path, errno);
  int error = WriteAll(descriptor, bytes, size);
  if (error == 0 && fsync(descriptor) != 0) error = errno;
  if (close(descriptor) != 0 && error == 0) error = errno;
  if (error == 0 && rename(temporary.c_str(), path) != 0) error = errno;
  if (error != 0) {
    unlink(temporary.c_str());
    return Fail(path, error);
  }
  FlushDirectory(path);
  return true;
}
