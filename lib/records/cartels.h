// The records of cartels that recordings alone have (see worlds.h).
#pragma once

#include <stdint.h>

// Node userworld_cartel_start, for a cartel ID.
struct __attribute__((packed)) CartelStart {
  uint64_t known;
  uint64_t start;  // milliseconds since the boot
};

constexpr uint64_t kCartelStartKnown = 0x1;
