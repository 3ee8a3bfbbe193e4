#include "file_bytes.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>

#include "cache_generated.h"
#include "status.h"

namespace {

constexpr size_t kFirstRead = size_t{1} << 16;

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

bool MayBeRecording(const FileBytes &bytes) {
  return bytes.size < kLeastFileBytes || IsGzip(bytes) ||
         flatbuffers::BufferHasIdentifier(bytes.map, cache::FileIdentifier());
}

KIF_Status Map(int descriptor, const struct stat &status, FileBytes *bytes) {
  if (status.st_size < static_cast<off_t>(kLeastFileBytes) ||
      static_cast<uint64_t>(status.st_size) > kMostFileBytes) {
    return KIF_STATUS_NOT_A_CACHE_FILE;
  }
  const auto size = static_cast<size_t>(status.st_size);
  void *map = mmap(nullptr, size, PROT_READ, MAP_PRIVATE, descriptor, 0);
  if (map == MAP_FAILED) return StatusOfErrno(errno);
  *bytes = {static_cast<const uint8_t *>(map), size};
  return KIF_STATUS_OK;
}

// As read, for a descriptor that may have been set not to wait.
ssize_t ReadSome(int descriptor, void *place, size_t size) {
  for (;;) {
    const ssize_t count = read(descriptor, place, size);
    if (count >= 0 || (errno != EINTR && errno != EAGAIN)) return count;
    struct pollfd waiting = {descriptor, POLLIN, 0};
    if (errno == EAGAIN) (void)poll(&waiting, 1, -1);
  }
}

// Reads until the end or for as long as it may be a recording; `*size` of `*room` bytes are then in
// use. The room is doubled when it is full.
KIF_Status ReadInto(int descriptor, FileBytes *room, size_t *size) {
  for (;;) {
    if (*size == room->size) {
      void *map = mremap(const_cast<uint8_t *>(room->map), *size, *size * 2, MREMAP_MAYMOVE);
      if (map == MAP_FAILED) return KIF_STATUS_NO_MEMORY;
      *room = {static_cast<uint8_t *>(map), *size * 2};
    }
    uint8_t *place = const_cast<uint8_t *>(room->map) + *size;
    const ssize_t count = ReadSome(descriptor, place, room->size - *size);
    if (count < 0) return StatusOfErrno(errno);
    *size += static_cast<size_t>(count);
    if (*size > kMostFileBytes) return KIF_STATUS_TOO_LARGE;
    if (count == 0 || !MayBeRecording({room->map, *size})) break;
  }
  return *size > 0 ? KIF_STATUS_OK : KIF_STATUS_NOT_A_CACHE_FILE;
}

KIF_Status ReadAll(int descriptor, FileBytes *bytes) {
  FileBytes room;
  size_t size = 0;
  if (!AllocateFileBytes(kFirstRead, &room)) return KIF_STATUS_NO_MEMORY;
  const KIF_Status status = ReadInto(descriptor, &room, &size);
  if (status != KIF_STATUS_OK) {
    ReleaseFileBytes(&room);
    return status;
  }
  (void)mremap(const_cast<uint8_t *>(room.map), room.size, size, 0);
  *bytes = {room.map, size};
  return KIF_STATUS_OK;
}

KIF_Status OpenStandardInput(FileBytes *bytes) {
  struct stat status;
  if (fstat(STDIN_FILENO, &status) != 0) return StatusOfErrno(errno);
  if (S_ISDIR(status.st_mode) || isatty(STDIN_FILENO) == 1) return KIF_STATUS_NOT_A_CACHE_FILE;
  const bool isWhole = S_ISREG(status.st_mode) && lseek(STDIN_FILENO, 0, SEEK_CUR) == 0;
  return isWhole ? Map(STDIN_FILENO, status, bytes) : ReadAll(STDIN_FILENO, bytes);
}

}  // namespace

KIF_Status OpenFileBytes(const char *path, FileBytes *bytes) {
  if (strcmp(path, kStandardInput) == 0) return OpenStandardInput(bytes);
  // Opening a device may do something, and opening a FIFO waits: neither is opened.
  struct stat status;
  if (stat(path, &status) != 0) return StatusOfOpen(errno);
  if (!S_ISREG(status.st_mode)) return KIF_STATUS_NOT_A_CACHE_FILE;
  const int descriptor = open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
  if (descriptor == -1) return StatusOfOpen(errno);
  const bool isKnown = fstat(descriptor, &status) == 0;
  KIF_Status result = isKnown ? KIF_STATUS_NOT_A_CACHE_FILE : StatusOfErrno(errno);
  if (isKnown && S_ISREG(status.st_mode)) result = Map(descriptor, status, bytes);
  close(descriptor);
  return result;
}

bool AllocateFileBytes(size_t size, FileBytes *bytes) {
  void *map = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (map == MAP_FAILED) return false;
  *bytes = {static_cast<uint8_t *>(map), size};
  return true;
}

void ReleaseFileBytes(FileBytes *bytes) {
  if (bytes->map != nullptr) munmap(const_cast<uint8_t *>(bytes->map), bytes->size);
  *bytes = {};
}

bool IsGzip(const FileBytes &bytes) {
  return bytes.size >= 2 && bytes.map[0] == 0x1f && bytes.map[1] == 0x8b;
}
