#include "cache_file.h"

#include <cstring>

#include <errno.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include "status.h"

namespace {

constexpr size_t kLeastSize = 8;  // the root's place and the identifier

KIF_Status StatusOfOpen(int error) {
  switch (error) {
    case ENOENT:
    case ENOTDIR:
    case ENAMETOOLONG:
    case ELOOP:
      return KIF_STATUS_NO_CACHE_FILE;
    default:
      return StatusOfErrno(error);
  }
}

// Maps the file behind `descriptor`, which may be anything.
KIF_Status Map(int descriptor, CacheFile *file) {
  struct stat status;
  if (fstat(descriptor, &status) != 0) return StatusOfErrno(errno);
  if (!S_ISREG(status.st_mode) || status.st_size < static_cast<off_t>(kLeastSize)) {
    return KIF_STATUS_NOT_A_CACHE_FILE;
  }
  if (static_cast<uint64_t>(status.st_size) >= FLATBUFFERS_MAX_BUFFER_SIZE) {
    return KIF_STATUS_NOT_A_CACHE_FILE;
  }
  file->size = static_cast<size_t>(status.st_size);
  void *map = mmap(nullptr, file->size, PROT_READ, MAP_PRIVATE, descriptor, 0);
  if (map == MAP_FAILED) return StatusOfErrno(errno);
  file->map = static_cast<const uint8_t *>(map);
  return KIF_STATUS_OK;
}

KIF_Status OpenAndMap(const char *path, CacheFile *file) {
  // Opening a device may do something, and opening a FIFO waits: neither is opened.
  struct stat status;
  if (stat(path, &status) != 0) return StatusOfOpen(errno);
  if (!S_ISREG(status.st_mode)) return KIF_STATUS_NOT_A_CACHE_FILE;
  const int descriptor = open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
  if (descriptor == -1) return StatusOfOpen(errno);
  const KIF_Status result = Map(descriptor, file);
  close(descriptor);
  return result;
}

KIF_Status ReadVersion(const CacheFile &file) {
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
  CacheFile opened = {};
  if (path == nullptr) return KIF_STATUS_BAD_PARAMETER;
  KIF_Status status = OpenAndMap(path, &opened);
  if (status == KIF_STATUS_OK) status = Verify(&opened);
  if (status == KIF_STATUS_OK) {
    *file = opened;
  } else {
    CloseCacheFile(&opened);
  }
  return status;
}

void CloseCacheFile(CacheFile *file) {
  if (file->map != nullptr) munmap(const_cast<uint8_t *>(file->map), file->size);
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
