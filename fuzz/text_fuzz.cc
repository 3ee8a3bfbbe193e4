// Any bytes as the text form of a host. What can be read makes a whole cache file, and the dump of
// that makes the same file again.
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <string>

#include "cache_file.h"
#include "cache_writer.h"
#include "check.h"
#include "host_model.h"
#include "text_reader.h"
#include "text_writer.h"

namespace {

FILE *nowhere;
char folder[] = "/dev/shm/text_fuzz.XXXXXX";
std::string path;

std::string Build(const HostModel &model) {
  if (!WriteCacheFile(model, path.c_str())) abort();
  std::string bytes;
  FILE *file = fopen(path.c_str(), "r");
  for (int byte = getc(file); byte != EOF; byte = getc(file)) bytes += static_cast<char>(byte);
  fclose(file);
  return bytes;
}

std::string Dump() {
  CacheFile file;
  std::string problem;
  if (OpenCacheFile(path.c_str(), &file) != 0 || !CheckFile(path.c_str(), file, true, nowhere)) abort();
  char *text = nullptr;
  size_t size = 0;
  FILE *stream = open_memstream(&text, &size);
  TextWriter writer(stream);
  if (!VisitAll(file, &writer, &problem)) abort();
  fclose(stream);
  CloseCacheFile(&file);
  std::string dump(text, size);
  free(text);
  return dump;
}

void RemoveFolder() {
  unlink(path.c_str());
  rmdir(folder);
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int *, char ***) {
  if (mkdtemp(folder) == nullptr) return 1;
  path = std::string(folder) + "/host.kif";
  atexit(RemoveFolder);
  stderr = nowhere = fopen("/dev/null", "w");  // the messages; the fuzzer writes to descriptor 2
  return nowhere != nullptr ? 0 : 1;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  HostModel model;
  if (!ReadText({reinterpret_cast<const char *>(data), size}, "text", &model)) return 0;
  const std::string first = Build(model);
  HostModel again;
  if (!ReadText(Dump(), "dump", &again)) abort();
  if (Build(again) != first) abort();
  return 0;
}
