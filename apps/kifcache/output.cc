#include "output.h"

#include <stdio.h>
#include <unistd.h>

#include <string_view>

#include "gzip.h"
#include "input.h"
#include "messages.h"
#include "replace_file.h"

bool MayWriteRecording(const char *path) {
  if (!IsStandardStream(path) || isatty(STDOUT_FILENO) != 1) return true;
  return Complain("standard output",
                  "a recording is not for a terminal: name a file, or write - > FILE");
}

bool WriteRecording(const char *path, const void *bytes, size_t size) {
  if (IsStandardStream(path)) {
    (void)fwrite(bytes, 1, size, stdout);
    return true;
  }
  if (!std::string_view(path).ends_with(".gz")) return ReplaceFile(path, bytes, size);
  std::string compressed;
  if (!Gzip(bytes, size, &compressed)) return Complain(path, "Out of memory");
  return ReplaceFile(path, compressed.data(), compressed.size());
}
