// Replacing a file in one step.
#pragma once

#include <cstddef>

// Gives the file at `path` new bytes, readable by its owner alone: they are written to a file
// beside it, which has no name where the file system can do without, flushed to disk and renamed,
// so that the path holds the old bytes or all of the new ones whatever happens. On failure says so
// on standard error and gives false.
bool ReplaceFile(const char *path, const void *bytes, size_t size);
