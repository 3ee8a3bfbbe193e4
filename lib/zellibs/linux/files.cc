#include "linux/files.h"

#include <errno.h>
#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstring>

#include "base/utf8.h"
#include "host.h"
#include "status.h"

namespace {

// The directory that stands for "/"; null: the machine's own. The environment that it comes from
// stays as it is.
const char *hostRoot;

KIF_Status Opened(int fd, Descriptor *file) {
  file->Reset(fd);
  return fd >= 0 ? KIF_STATUS_OK : StatusOfErrno(errno);
}

KIF_Status ReadOpened(KIF_Status status, const Descriptor &file, char *buffer, size_t size,
                      size_t *length) {
  size_t filled = 0;
  while (status == KIF_STATUS_OK && filled < size - 1) {
    const ssize_t got = read(file.fd(), buffer + filled, size - 1 - filled);
    if (got == 0) break;
    if (got > 0) {
      filled += static_cast<size_t>(got);
    } else if (errno != EINTR) {
      status = StatusOfErrno(errno);
    }
  }
  buffer[filled] = '\0';
  if (length != nullptr) *length = filled;
  return status;
}

}  // namespace

void SetLinuxRoot(const char *root) {
  hostRoot = strcmp(root, "/") == 0 || root[0] == '\0' ? nullptr : root;
}

bool IsForeignRoot() {
  return hostRoot != nullptr;
}

KIF_Status OpenHostFile(const char *path, int flags, Descriptor *file) {
  if (hostRoot == nullptr) return Opened(open(path, flags | O_CLOEXEC, 0), file);
  const Descriptor root(open(hostRoot, O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!root.valid()) return StatusOfErrno(errno);
  // A link in the tree means a place in the tree, wherever the tree stands now.
  open_how how = {};
  how.flags = static_cast<unsigned>(flags) | O_CLOEXEC;
  how.resolve = RESOLVE_IN_ROOT;
  const long opened = syscall(SYS_openat2, root.fd(), path, &how, sizeof(how));
  return Opened(static_cast<int>(opened), file);
}

KIF_Status OpenBelow(int directory, const char *path, int flags, Descriptor *file) {
  return Opened(openat(directory, path, flags | O_CLOEXEC, 0), file);
}

KIF_Status ReadHostFile(const char *path, char *buffer, size_t size, size_t *length) {
  Descriptor file;
  const KIF_Status status = OpenHostFile(path, O_RDONLY, &file);
  return ReadOpened(status, file, buffer, size, length);
}

KIF_Status ReadBelow(int directory, const char *path, char *buffer, size_t size, size_t *length) {
  Descriptor file;
  const KIF_Status status = OpenBelow(directory, path, O_RDONLY, &file);
  return ReadOpened(status, file, buffer, size, length);
}

KIF_Status ReadPieceBelow(int directory, const char *path, char *buffer, size_t size,
                          size_t *length) {
  Descriptor file;
  const KIF_Status status = OpenBelow(directory, path, O_RDONLY, &file);
  ssize_t got = 0;
  if (status == KIF_STATUS_OK) {
    do {
      got = read(file.fd(), buffer, size - 1);
    } while (got < 0 && errno == EINTR);
  }
  *length = got > 0 ? static_cast<size_t>(got) : 0;
  buffer[*length] = '\0';
  return got < 0 ? StatusOfErrno(errno) : status;
}

KIF_Status ReadLinkBelow(int directory, const char *path, char *buffer, size_t size,
                         size_t *length) {
  const ssize_t got = readlinkat(directory, path, buffer, size - 1);
  buffer[got > 0 ? got : 0] = '\0';
  if (length != nullptr) *length = got > 0 ? static_cast<size_t>(got) : 0;
  return got >= 0 ? KIF_STATUS_OK : StatusOfErrno(errno);
}

KIF_Status ReadWhole(const Descriptor &file, Bytes *bytes) {
  const int error = bytes->ReadAll(file.fd());
  return error == 0 ? KIF_STATUS_OK : StatusOfErrno(error);
}

KIF_Status DirectoryReader::Open(const char *path) {
  filled_ = place_ = 0;
  status_ = OpenHostFile(path, O_RDONLY | O_DIRECTORY, &directory_);
  return status_;
}

KIF_Status DirectoryReader::OpenBelow(int directory, const char *path) {
  filled_ = place_ = 0;
  status_ = ::OpenBelow(directory, path, O_RDONLY | O_DIRECTORY, &directory_);
  return status_;
}

const char *DirectoryReader::Next() {
  while (status_ == KIF_STATUS_OK) {
    if (place_ == filled_) {
      const ssize_t got = getdents64(directory_.fd(), block_, sizeof(block_));
      if (got < 0) status_ = StatusOfErrno(errno);
      if (got <= 0) return nullptr;
      filled_ = static_cast<size_t>(got);
      place_ = 0;
    }
    const auto *entry = reinterpret_cast<const dirent64 *>(block_ + place_);
    place_ += entry->d_reclen;
    const char *name = entry->d_name;
    if (strcmp(name, ".") != 0 && strcmp(name, "..") != 0) return name;
  }
  return nullptr;
}

void CopyText(char *field, size_t size, const char *text, size_t length) {
  const size_t kept = CutAtCharacter(text, length, size - 1);
  memcpy(field, text, kept);
  MaskControls(field, kept);
  field[kept] = '\0';
}
