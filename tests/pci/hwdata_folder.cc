// A preloaded library that gives the program the PCI ID files of a test:
//   HWDATA_FOLDER=FOLDER   what is opened below /usr/share/hwdata is opened below FOLDER
#include <dirent.h>
#include <fcntl.h>
#include <limits.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

namespace {

constexpr char kReplaced[] = "/usr/share/hwdata/";

// `path`, or what stands for it, written into `buffer`.
const char *Redirected(const char *path, char (&buffer)[PATH_MAX]) {
  const char *folder = getenv("HWDATA_FOLDER");
  if (folder == nullptr || strncmp(path, kReplaced, strlen(kReplaced)) != 0) return path;
  snprintf(buffer, sizeof(buffer), "%s/%s", folder, path + strlen(kReplaced));
  return buffer;
}

}  // namespace

// Neither asks the loader for the function it stands before, so that a sanitizer may be at work.
extern "C" {
int open(const char *path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & (O_CREAT | __O_TMPFILE)) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  char buffer[PATH_MAX];
  return openat(AT_FDCWD, Redirected(path, buffer), flags, mode);
}

int open64(const char *path, int flags, ...) __attribute__((alias("open")));

DIR *opendir(const char *path) {
  char buffer[PATH_MAX];
  const int folder = openat(AT_FDCWD, Redirected(path, buffer), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  return folder >= 0 ? fdopendir(folder) : nullptr;
}
}
