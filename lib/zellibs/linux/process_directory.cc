#include "linux/process_directory.h"

#include <fcntl.h>

#include <cstdio>

#include "linux/everlasting.h"
#include "linux/files.h"
#include "status.h"

namespace {

struct KeptDirectory {
  int64_t process = -1;
  Descriptor directory;
};

Everlasting<KeptDirectory> kept;

}  // namespace

KIF_Status OpenProcessDirectory(int64_t process, bool fresh, int *directory) {
  if (fresh || process != kept->process) {
    char path[32];
    snprintf(path, sizeof(path), "/proc/%lld", static_cast<long long>(process));
    kept->process = -1;
    const KIF_Status status = OpenHostFile(path, O_PATH | O_DIRECTORY, &kept->directory);
    if (status != KIF_STATUS_OK) return status;
    kept->process = process;
  }
  *directory = kept->directory.fd();
  return KIF_STATUS_OK;
}
