// Any bytes as the text form of a host. What can be read makes a whole cache file, and the dump of
// that makes the same file again.
#include <fstream>
#include <iterator>

#include "cache_file.h"
#include "cache_writer.h"
#include "check.h"
#include "host_model.h"
#include "surroundings.h"
#include "text_reader.h"
#include "text_writer.h"

namespace {

const std::string path = folder + "/host.kif";

std::string Build(const HostModel &model) {
  if (!WriteCacheFile(model, path.c_str())) abort();
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

std::string Dump() {
  CacheFile file;
  std::string problem;
  if (OpenCacheFile(path.c_str(), &file) != 0 || !CheckFile(path.c_str(), file, true, nowhere))
    abort();
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

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  HostModel model;
  if (!ReadText({reinterpret_cast<const char *>(data), size}, "text", &model)) return 0;
  const std::string first = Build(model);
  HostModel again;
  if (!ReadText(Dump(), "dump", &again)) abort();
  if (Build(again) != first) abort();
  return 0;
}
