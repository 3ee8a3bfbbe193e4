// The number of this process in /proc.
#pragma once

#include <unistd.h>

#include <cstdint>
#include <cstdlib>

// The number that /proc gives this process, which is not getpid() where it is mounted for another
// PID namespace; 0 where it does not show the process, or is not there.
inline int32_t OwnProcessInProc() {
  char number[16];
  const ssize_t length = readlink("/proc/self", number, sizeof(number) - 1);
  if (length <= 0) return 0;
  number[length] = '\0';
  return static_cast<int32_t>(strtol(number, nullptr, 10));
}
