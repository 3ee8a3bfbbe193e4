// A preloaded library that makes a tree of files look like the in-memory root file system to mdu:
// lstat says that every file is on device 1, but for those whose name begins with "mounted", and
// has the number that its name ends with; one without a number has the number 0. The host passes
// for the machine that they are on.
#include <fcntl.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>

extern "C" int lstat(const char *path, struct stat *status) noexcept {
  const int result = fstatat(AT_FDCWD, path, status, AT_SYMLINK_NOFOLLOW);
  if (result != 0) return result;
  const char *slash = strrchr(path, '/');
  const char *name = slash != nullptr && slash[1] != '\0' ? slash + 1 : path;
  status->st_dev = strncmp(name, "mounted", 7) == 0 ? 2 : 1;
  status->st_ino = strtoul(name + strcspn(name, "0123456789"), nullptr, 10);
  return result;
}
