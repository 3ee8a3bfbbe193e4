// A recording as a model, to be changed and written again.
#pragma once

#include "cache_file.h"
#include "host_model.h"

// Reads all of `file` that this kifcache's catalogue knows into `model`, which is empty before.
// False after a message, which names the file as `name`.
bool ReadKnown(const char *name, const CacheFile &file, HostModel *model);
