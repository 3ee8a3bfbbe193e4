// Writing a cache file: see docs/cache-format.md.
#pragma once

#include "host_model.h"

// Writes a sorted model to the file at `path`, which has its old bytes or all of the new ones
// whatever happens, and is readable by its owner alone. The same model gives the same bytes. On
// failure says so on standard error and gives false.
bool WriteCacheFile(const HostModel &model, const char *path);
