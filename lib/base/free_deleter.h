// Ownership of memory that malloc, calloc or realloc gave: std::unique_ptr<T[], FreeDeleter>.
#pragma once

#include <stdlib.h>

struct FreeDeleter {
  void operator()(void *memory) const { free(memory); }
};
