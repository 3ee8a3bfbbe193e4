#include "output.h"

#include <errno.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string>
#include <string_view>

#include "gzip.h"
#include "input.h"
#include "messages.h"
#include "replace_file.h"

bool MayWriteRecording(const char *path) {
  if (IsStandardStream(path)) {
    return isatty(STDOUT_FILENO) != 1 ||
           Complain("standard output",
                    "a recording is not for a terminal: name a file, or write - > FILE");
  }
  struct stat status;
  if (lstat(path, &status) == 0 && !S_ISREG(status.st_mode)) {
    const bool isFolder = S_ISDIR(status.st_mode);
    return Complain(path, isFolder ? "a directory" : "not a regular file: - is standard output");
  }
  const std::string folder(path, static_cast<size_t>(basename(path) - path));
  if (access(folder.empty() ? "." : folder.c_str(), W_OK | X_OK) == 0) return true;
  return Complain(path, strerror(errno));
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
