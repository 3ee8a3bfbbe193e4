// What a cache file says of itself.
#pragma once

#include <stdio.h>

#include "cache_file.h"

// Verifies the file at `path`, open as `file`, to its last byte, and prints to `stream` what is in
// it and what is missing; verbose, the number of answers of each node too. Where it is damaged says
// on standard error what is, and gives false.
bool CheckFile(const char *path, const CacheFile &file, bool isVerbose, FILE *stream);
