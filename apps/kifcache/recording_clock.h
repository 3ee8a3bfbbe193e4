// The moments of a recording.
#pragma once

#include <stdlib.h>
#include <time.h>

#include "host_model.h"

constexpr int64_t kNanoseconds = 1000000000;

// SOURCE_DATE_EPOCH fixes the moments of the wall clock, in seconds, and takes away what differs
// from run to run; the time since the boot is that of this machine alone.
class RecordingClock {
 public:
  explicit RecordingClock(bool isThisMachine)
      : fixed_(secure_getenv("SOURCE_DATE_EPOCH")),
        tellsBoot_(isThisMachine && fixed_ == nullptr) {}

  bool isFixed() const { return fixed_ != nullptr; }
  Moments Begin(const char *name) const {
    const int64_t now = Now();
    const int64_t sinceBoot = SinceBoot();
    return {name, now, now, sinceBoot, sinceBoot};
  }
  void End(Moments *of) const {
    of->end = Now();
    of->endSinceBoot = SinceBoot();
  }

 private:
  static int64_t Read(clockid_t clock) {
    struct timespec time = {};
    clock_gettime(clock, &time);
    return int64_t{time.tv_sec} * kNanoseconds + time.tv_nsec;
  }
  int64_t Now() const {
    return fixed_ != nullptr ? strtoll(fixed_, nullptr, 10) * kNanoseconds : Read(CLOCK_REALTIME);
  }
  int64_t SinceBoot() const { return tellsBoot_ ? Read(CLOCK_BOOTTIME) : 0; }

  const char *const fixed_;
  const bool tellsBoot_;
};
