// The bytes of a file that may be a recording, in memory as a whole.
#pragma once

#include <cstddef>
#include <cstdint>

#include "zellibs.h"

// Mapped from a file, or read into memory of their own; all zero: none.
struct FileBytes {
  const uint8_t *map;
  size_t size;
};

// A place in a recording is a 32-bit number, of which FlatBuffers keeps one bit.
constexpr size_t kMostFileBytes = 0x7ffffffe;

constexpr size_t kLeastFileBytes = 8;  // the root's place and the identifier

// The name of standard input, whatever is behind it.
constexpr char kStandardInput[] = "/dev/stdin";

// Gives the bytes of the regular file at `path`. Standard input may be a pipe or socket too, and
// alone is waited for; it is read to its end as long as it begins like a recording, and is
// KIF_STATUS_TOO_LARGE above kMostFileBytes. What is no such file is KIF_STATUS_NOT_A_CACHE_FILE,
// other failures are those of the system. ReleaseFileBytes gives them back.
KIF_Status OpenFileBytes(const char *path, FileBytes *bytes);
void ReleaseFileBytes(FileBytes *bytes);

// `size` zeros that may be written to. False without memory.
bool AllocateFileBytes(size_t size, FileBytes *bytes);

bool IsGzip(const FileBytes &bytes);
