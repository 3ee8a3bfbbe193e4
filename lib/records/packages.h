// The records of installed packages, which recordings alone have (see worlds.h).
#pragma once

#include <stdint.h>

// Node system_packages, for a place in the list, from 1.
struct __attribute__((packed)) Package {
  uint64_t known;
  char manager[8];
  char architecture[32];
  char state[64];
  char version[128];
  char name[256];
};
