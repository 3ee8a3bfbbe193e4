// The files "stat" of processes and threads.
#pragma once

#include <cstdint>

#include "linux/processes.h"

// The fields that are used; see proc(5), /proc/pid/stat.
struct Stat {
  char state;
  int32_t parent;
  int32_t group;
  int32_t session;
  bool isKernel;  // a kernel thread
  uint64_t cpuTicks;
  uint64_t startTicks;  // since the boot; kNoTicks where it is not told
  uint32_t threads;
  char name[kThreadNameSize];
};

// Whether a state letter is that of what runs no more.
inline bool IsDead(char state) {
  return state == 'Z' || state == 'X' || state == 'x';
}

// Reads the file at `path` below `directory`.
KIF_Status ReadStat(int directory, const char *path, Stat *stat);
