// Any bytes as a cache file: opened, served, checked, shown in both forms, redacted. What `kifcache
// check` calls whole, every answer of which was visited, must also be shown to its end.
#include "cache_file.h"
#include "check.h"
#include "file_model.h"
#include "json_writer.h"
#include "read_host.h"
#include "redact.h"
#include "surroundings.h"
#include "text_writer.h"
#include "zellibs.h"

namespace {

const std::string path = folder + "/host.kif";

bool Show(const CacheFile &file, Visitor *writer) {
  std::string problem;
  return VisitAll(file, writer, &problem);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Write("/host.kif", data, size);
  CacheFile file;
  if (OpenCacheFile(path.c_str(), &file) != 0) return 0;
  TextWriter text(nowhere);
  JsonWriter json(nowhere);
  const bool isShown = Show(file, &text);
  if (isShown != Show(file, &json)) abort();
  if (CheckFile(path.c_str(), file, true, nowhere) && !isShown) abort();
  HostModel model;
  if (isShown && FitsCatalogue(file, nullptr, nullptr) && ReadKnown("", file, &model)) {
    RedactModel("", &model);
  }
  CloseCacheFile(&file);
  if (KIF_UseCache(path.c_str(), 0) != 0) abort();
  char date[21];
  const char *ours;
  KIF_CheckSig(date, sizeof(date), &ours);
  ReadHost(nullptr);
  return 0;
}
