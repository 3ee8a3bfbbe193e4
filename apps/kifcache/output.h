// Where a command writes a recording: a file, or standard output for "-".
#pragma once

#include <cstddef>

// Whether a recording may be written there; says why not.
bool MayWriteRecording(const char *path);

// Writes a recording, compressed where the name ends with ".gz". A file gets its name when it is
// whole (replace_file.h). False after a message; a failure of standard output is left to the end of
// the program.
bool WriteRecording(const char *path, const void *bytes, size_t size);
