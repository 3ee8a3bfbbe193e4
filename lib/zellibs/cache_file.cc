#include "cache_file.h"

#include <cstring>

#include "status.h"

namespace {

KIF_Status ReadVersion(const CacheFile &file) {
  if (IsGzip({file.map, file.size})) return KIF_STATUS_COMPRESSED_CACHE_FILE;
  if (!flatbuffers::BufferHasIdentifier(file.map, cache::FileIdentifier())) {
    return KIF_STATUS_NOT_A_CACHE_FILE;
  }
  flatbuffers::Verifier verifier(file.map, file.size);
  if (!verifier.VerifyBuffer<cache::Version>()) return KIF_STATUS_DAMAGED_CACHE_FILE;
  const auto *version = flatbuffers::GetRoot<cache::Version>(file.map);
  return version->major_version() == kCacheMajorVersion ? KIF_STATUS_OK : KIF_STATUS_CACHE_VERSION;
}

// The content reaches to the file's last byte, so that no cut and no addition goes unseen.
bool VerifyHeader(CacheFile *file) {
  flatbuffers::Verifier verifier(file->map, file->size);
  if (!verifier.VerifyBuffer<cache::File>()) return false;
  file->header = flatbuffers::GetRoot<cache::File>(file->map);
  const uint8_t *content = file->header->content()->data();
  const size_t place = static_cast<size_t>(content - file->map);
  return place % alignof(cache::Parameter) == 0 &&
         file->size - place == file->header->content()->size();
}

bool VerifyContent(CacheFile *file) {
  const auto *bytes = file->header->content();
  flatbuffers::Verifier verifier(bytes->data(), bytes->size());
  if (!verifier.VerifyBuffer<cache::Content>()) return false;
  file->contentStart = bytes->data();
  file->content = flatbuffers::GetRoot<cache::Content>(bytes->data());
  const auto *parameters = file->content->parameters();
  if (parameters != nullptr && parameters->size() > 0) {  // an empty vector is not aligned
    const uint8_t *data = parameters->Data();
    // The verifier sees to the alignment of a vector's size only.
    if (static_cast<size_t>(data - file->map) % alignof(cache::Parameter) != 0) return false;
    file->parameters = reinterpret_cast<const cache::Parameter *>(data);
    file->parameterCount = parameters->size();
  }
  if (const auto *pool = file->content->bytes(); pool != nullptr) {
    file->bytes = pool->data();
    file->byteCount = pool->size();
  }
  return true;
}

KIF_Status Verify(CacheFile *file) {
  const KIF_Status status = ReadVersion(*file);
  if (status != KIF_STATUS_OK) return status;
  const bool sound = VerifyHeader(file) && VerifyContent(file);
  return sound ? KIF_STATUS_OK : KIF_STATUS_DAMAGED_CACHE_FILE;
}

}  // namespace

KIF_Status OpenCacheFile(const char *path, CacheFile *file) {
  FileBytes bytes = {};
  if (path == nullptr) return KIF_STATUS_BAD_PARAMETER;
  KIF_Status status = OpenFileBytes(path, &bytes);
  if (status == KIF_STATUS_OK) status = OpenCacheBytes(bytes, file);
  if (status != KIF_STATUS_OK) ReleaseFileBytes(&bytes);
  return status;
}

KIF_Status OpenCacheBytes(const FileBytes &bytes, CacheFile *file) {
  if (bytes.size < kLeastFileBytes) return KIF_STATUS_NOT_A_CACHE_FILE;
  CacheFile opened = {};
  opened.map = bytes.map;
  opened.size = bytes.size;
  const KIF_Status status = Verify(&opened);
  if (status == KIF_STATUS_OK) *file = opened;
  return status;
}

void CloseCacheFile(CacheFile *file) {
  FileBytes bytes = {file->map, file->size};
  ReleaseFileBytes(&bytes);
  *file = {};
}

bool HasParameters(const CacheFile &file, uint32_t first, uint32_t count) {
  return first <= file.parameterCount && count <= file.parameterCount - first;
}

bool HasBytes(const CacheFile &file, uint32_t place, uint32_t length) {
  return place <= file.byteCount && length <= file.byteCount - place;
}

const char *ParameterText(const CacheFile &file, const cache::Parameter &parameter) {
  const uint64_t place = static_cast<uint64_t>(parameter.value());
  if (place >= file.byteCount || parameter.length() >= file.byteCount - place) return nullptr;
  const uint8_t *text = file.bytes + place;
  return text[parameter.length()] == 0 ? reinterpret_cast<const char *>(text) : nullptr;
}

bool ReadDescriptionAt(const CacheFile &file, uint32_t place, Description *description) {
  const auto *all = file.content->descriptions();
  if (all == nullptr || place >= all->size()) return false;
  const cache::Bytes &text = *all->Get(place);
  return HasBytes(file, text.place(), text.length()) &&
         ReadDescription(reinterpret_cast<const char *>(file.bytes) + text.place(), text.length(),
                         description);
}

bool HasSameCatalogue(const CacheFile &file) {
  const cache::Recording &facts = *file.content->recording();
  return file.header->minor_version() == 0 ? facts.signature() == kSignatureOfVersion1_0
                                           : facts.catalogue() == CatalogueHash();
}

bool FitsCatalogue(const CacheFile &file, CatalogueConflictTeller tell, void *context) {
  if (file.header->minor_version() == 0) return HasSameCatalogue(file);
  struct Told {
    const char *path;
    CatalogueConflictTeller tell;
    void *context;
  };
  const auto tellOfNode = [](const char *what, void *given) {
    const auto *told = static_cast<Told *>(given);
    if (told->tell != nullptr) told->tell(told->path, what, told->context);
  };
  bool fits = true;
  const auto *nodes = file.content->nodes();
  for (uint32_t i = 0; nodes != nullptr && i < nodes->size(); ++i) {
    const flatbuffers::String *path = nodes->Get(i)->path();
    const NodeInfo *node = FindNodeByPath(path->c_str(), path->size());
    if (node == nullptr) continue;
    Told told = {node->path, tell, context};
    Description description;
    if (!ReadDescriptionAt(file, i, &description)) {
      fits = false;
      tellOfNode("description", &told);
    } else {
      fits = Fits(*node, description, tellOfNode, &told) && fits;
    }
  }
  return fits;
}
