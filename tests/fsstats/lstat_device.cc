// A preloaded library that makes a tree of files look like the in-memory root file system to mdu:
// lstat says that every file is on device 1, but for those whose name begins with "mounted".
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>

extern "C" __attribute__((visibility("default"))) int lstat(const char *path,
                                                            struct stat *status) noexcept {
  const int result = fstatat(AT_FDCWD, path, status, AT_SYMLINK_NOFOLLOW);
  if (result != 0) return result;
  const char *slash = strrchr(path, '/');
  const char *name = slash != nullptr ? slash + 1 : path;
  status->st_dev = strncmp(name, "mounted", 7) == 0 ? 2 : 1;
  return result;
}
