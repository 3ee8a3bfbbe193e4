// A preloaded library that makes a tree of files look like the in-memory root file system to mdu:
// lstat says that every file is on device 1, but for those whose name begins with "mounted".
#include <dlfcn.h>
#include <string.h>
#include <sys/stat.h>

extern "C" __attribute__((visibility("default"))) int lstat(const char *path,
                                                            struct stat *status) noexcept {
  using Lstat = int (*)(const char *, struct stat *);
  static const auto next = reinterpret_cast<Lstat>(dlsym(RTLD_NEXT, "lstat"));
  const int result = next(path, status);
  if (result != 0) return result;
  const char *slash = strrchr(path, '/');
  const char *name = slash != nullptr ? slash + 1 : path;
  status->st_dev = strncmp(name, "mounted", 7) == 0 ? 2 : 1;
  return result;
}
