// Numbers of worlds and userspaces on a command line.
#pragma once

#include <stdint.h>
#include <stdlib.h>

// As strtoul takes it, with a sign and without bounds; the low 32 bits are the number.
inline uint32_t ParseId(const char *text) {
  return static_cast<uint32_t>(strtoul(text, nullptr, 10));
}
