#include "output.h"

#include <errno.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "kiftools.h"
#include "printable/printable.h"

namespace {

constexpr size_t kBlockSize = 1 << 16;
char block[kBlockSize];

// Asked once for each stream: the answer does not change while a tool runs.
bool IsTerminal(FILE *stream) {
  static signed char answers[2] = {-1, -1};
  signed char &answer = answers[stream == stderr ? 1 : 0];
  if (answer < 0) answer = isatty(fileno(stream)) ? 1 : 0;
  return answer != 0;
}

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

Shown::Shown(const char *text, FILE *stream) : text_(text) {
  if (!IsTerminal(stream)) return;
  masked_ = strdup(text);
  if (masked_ != nullptr) printable::MaskControls(masked_, strlen(masked_));
  text_ = masked_ != nullptr ? masked_ : "?";
}

Shown::~Shown() {
  free(masked_);
}
