// Data objects, from the inside.
#pragma once

#include <cstdint>

#include "zellibs.h"

// A data object, beginning as callers see it; the bytes follow it in the same allocation.
struct Data {
  uint32_t length;    // valid bytes
  uint32_t capacity;  // bytes there is room for
  unsigned char bytes[];
};

inline Data *DataOf(KIFData *data) {
  return reinterpret_cast<Data *>(data);
}
