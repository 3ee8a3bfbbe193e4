#include "linux/process_directory.h"

#include <fcntl.h>

#include <cstdio>

#include "base/everlasting.h"
#include "linux/files.h"
#include "linux/processes.h"
#include "status.h"

namespace {

struct KeptDirectory {
  int64_t process = -1;
  Descriptor directory;
};

Everlasting<KeptDirectory> snapshot;

}  // namespace

KIF_Status OpenProcessDirectory(int64_t process, bool fresh, int *directory) {
  if (fresh || process != snapshot->process) {
    char path[64];
    const int32_t living = FindLivingThread(process);
    if (living == process) {
      snprintf(path, sizeof(path), "/proc/%lld", static_cast<long long>(process));
    } else {
      snprintf(path, sizeof(path), "/proc/%lld/task/%d", static_cast<long long>(process), living);
    }
    snapshot->process = -1;
    const KIF_Status status = OpenHostFile(path, O_PATH | O_DIRECTORY, &snapshot->directory);
    if (status != KIF_STATUS_OK) return status;
    snapshot->process = process;
  }
  *directory = snapshot->directory.fd();
  return KIF_STATUS_OK;
}
