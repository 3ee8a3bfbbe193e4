// Any bytes as a cache file: opened, served, checked, shown in both forms. What `kifcache check`
// calls whole, every answer of which was visited, must also be shown to its end.
#include <stdio.h>
#include <stdlib.h>
#include <sys/mman.h>
#include <unistd.h>

#include "cache_file.h"
#include "check.h"
#include "json_writer.h"
#include "read_host.h"
#include "text_writer.h"
#include "zellibs.h"

namespace {

char path[64];
int memory;
FILE *nowhere;

bool Show(const CacheFile &file, Visitor *writer) {
  std::string problem;
  return VisitAll(file, writer, &problem);
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int *, char ***) {
  memory = memfd_create("cache", MFD_CLOEXEC);
  snprintf(path, sizeof(path), "/proc/self/fd/%d", memory);
  stderr = nowhere = fopen("/dev/null", "w");  // the messages; the fuzzer writes to descriptor 2
  setenv("ZELLIBS_HOST", "none", 1);
  return nowhere != nullptr ? 0 : 1;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  if (ftruncate(memory, 0) != 0 || pwrite(memory, data, size, 0) != static_cast<ssize_t>(size)) {
    abort();
  }
  CacheFile file;
  if (OpenCacheFile(path, &file) != 0) return 0;
  TextWriter text(nowhere);
  JsonWriter json(nowhere);
  const bool isShown = Show(file, &text);
  if (isShown != Show(file, &json)) abort();
  if (CheckFile(path, file, true, nowhere) && !isShown) abort();
  CloseCacheFile(&file);
  if (KIF_UseCache(path, 0) != 0) abort();
  char date[21];
  const char *ours;
  KIF_CheckSig(date, sizeof(date), &ours);
  ReadHost(nullptr);
  return 0;
}
