#include "output.h"

#include <errno.h>
#include <string.h>

#include "kiftools.h"

namespace {

constexpr size_t kBlockSize = 1 << 16;
char block[kBlockSize];

}  // namespace

void OpenOutput() {
  if (!IsTerminal(stdout)) setvbuf(stdout, block, _IOFBF, sizeof(block));
}

int CloseOutput(int status) {
  const bool failedBefore = ferror(stdout) != 0;
  const bool failed = fflush(stdout) != 0;
  if (!failedBefore && !failed) return status;
  if (errno != EPIPE) Warning("zlkkiftools: write error: %s\n", strerror(errno));
  return (status & 0xff) == 0 ? 1 : status;  // the system keeps eight bits
}
