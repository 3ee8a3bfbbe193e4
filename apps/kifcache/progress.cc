#include "progress.h"

#include <stdio.h>
#include <time.h>
#include <unistd.h>

#include <cinttypes>

namespace {

constexpr int64_t kBeforeFirst = 500;  // milliseconds
constexpr int64_t kBetween = 100;

bool isShown = false;  // there is one standard error

int64_t Now() {
  struct timespec now = {};
  clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return now.tv_sec * int64_t{1000} + now.tv_nsec / 1000000;
}

}  // namespace

Progress::Progress(const char *unit)
    : unit_(unit), next_(Now() + kBeforeFirst), isTerminal_(isatty(STDERR_FILENO) == 1) {}

void Progress::ShowInTime(const char *where) {
  const int64_t now = Now();
  if (now < next_) return;
  next_ = now + kBetween;
  isShown = true;
  fprintf(stderr, "\rkifcache: %" PRIu64 " %s, %.45s\033[K", count_, unit_, where);
}

void ClearProgress() {
  if (isShown) fputs("\r\033[K", stderr);
  isShown = false;
}
