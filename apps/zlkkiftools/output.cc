#include "output.h"

#include <errno.h>
#include <signal.h>
#include <string.h>

namespace {

constexpr size_t kBlockSize = 1 << 16;
char block[kBlockSize];
int writeError = 0;  // the errno of the first write of ours that failed

bool WriteOut() {
  if (fflush(stdout) == 0) return true;
  if (writeError == 0) writeError = errno;
  return false;
}

}  // namespace

void OpenOutput() {
  signal(SIGXFSZ, SIG_IGN);  // a file that may not grow further is a write that fails, and is told
  if (!IsTerminal(stdout)) setvbuf(stdout, block, _IOFBF, sizeof(block));
}

FILE *Messages() {
  const int before = errno;
  (void)WriteOut();
  errno = before;
  return stderr;
}

int CloseOutput(int status) {
  const bool failedBefore = ferror(stdout) != 0;
  const bool failed = !WriteOut();
  if (!failedBefore && !failed) return status;
  const int reason = writeError != 0 ? writeError : errno;
  if (reason != EPIPE) fprintf(stderr, "zlkkiftools: write error: %s\n", strerror(reason));
  return (status & 0xff) == 0 ? 1 : status;  // the system keeps eight bits
}
