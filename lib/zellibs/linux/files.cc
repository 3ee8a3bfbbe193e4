#include "linux/files.h"

#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>

#include "base/everlasting.h"
#include "base/utf8.h"
#include "host.h"
#include "status.h"

namespace {

// The directory that stands for "/" and may be a stranger's; null: this machine's own. The
// environment that it comes from stays as it is.
const char *hostRoot;

// The same, open since its first use.
Everlasting<Descriptor> openRoot;

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

KIF_Status OpenRoot(int *root) {
  if (!openRoot->valid()) openRoot->Reset(open(hostRoot, O_PATH | O_DIRECTORY | O_CLOEXEC));
  *root = openRoot->fd();
  return openRoot->valid() ? KIF_STATUS_OK : StatusOfErrno(errno);
}

bool IsSame(const struct stat &a, const struct stat &b) {
  return a.st_dev == b.st_dev && a.st_ino == b.st_ino;
}

// Whether the way up from `directory` leads to the root, not past it: somebody may move a folder
// out of the tree while a path leads through it.
bool IsInside(int directory, int root) {
  struct stat rootFacts;
  struct stat facts;
  if (fstat(root, &rootFacts) != 0 || fstat(directory, &facts) != 0) return false;
  Descriptor upper;
  while (!IsSame(facts, rootFacts)) {
    const struct stat lower = facts;
    const int from = upper.valid() ? upper.fd() : directory;
    upper = Descriptor(openat(from, "..", O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!upper.valid() || fstat(upper.fd(), &facts) != 0 || IsSame(facts, lower)) return false;
  }
  return true;
}

// A path on its way through a foreign tree: the folder it has come to and what is left of it. A
// link in the tree means a place in the tree, wherever the tree stands now. The kernel would
// resolve so too, from the root alone and not everywhere: old ones and containers refuse it.
struct Way {
  Descriptor folder;
  char rest[2 * PATH_MAX];
  bool wentUp = false;
  int links = 0;
};

KIF_Status StepTo(int root, const char *name, Way *way) {
  const bool up = strcmp(name, "..") == 0;
  struct stat rootFacts;
  struct stat facts;
  if (fstat(root, &rootFacts) != 0 || fstat(way->folder.fd(), &facts) != 0) {
    return StatusOfErrno(errno);
  }
  if (up && IsSame(facts, rootFacts)) return KIF_STATUS_OK;
  way->wentUp = way->wentUp || up;
  const int flags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
  return Opened(openat(way->folder.fd(), name, flags), &way->folder);
}

// Puts a link's target, `length` bytes, in front of what is left.
KIF_Status FollowLink(int root, const char *target, size_t length, Way *way) {
  constexpr int kMostLinks = 40;  // the kernel's own number
  const size_t left = strlen(way->rest);
  if (++way->links > kMostLinks || length + left >= sizeof(way->rest)) return StatusOfErrno(ELOOP);
  memmove(way->rest + length, way->rest, left + 1);
  memcpy(way->rest, target, length);
  if (target[0] != '/') return KIF_STATUS_OK;
  return Opened(fcntl(root, F_DUPFD_CLOEXEC, 0), &way->folder);
}

// Cuts the next name off what is left; "." at its end.
void TakeName(Way *way, char (&name)[NAME_MAX + 2]) {
  const char *begin = way->rest + strspn(way->rest, "/");
  const size_t length = strcspn(begin, "/");
  const size_t kept = length < sizeof(name) ? length : sizeof(name) - 1;  // too long: not found
  memcpy(name, begin, kept);
  name[kept] = '\0';
  if (length == 0) strcpy(name, ".");
  memmove(way->rest, begin + length, strlen(begin + length) + 1);
}

// Finds `path`, absolute or below `directory`: the folder it is in, and its name there, which is no
// link unless `keepLink`, nor "..".
KIF_Status FindInRoot(int directory, const char *path, bool keepLink, Descriptor *folder,
                      char (&name)[NAME_MAX + 2]) {
  int root;
  KIF_Status status = OpenRoot(&root);
  if (status != KIF_STATUS_OK) return status;
  Way way;
  if (strlen(path) >= PATH_MAX) return KIF_STATUS_TOO_LARGE;
  strcpy(way.rest, path);
  const int start = path[0] == '/' ? root : directory;
  status = Opened(fcntl(start, F_DUPFD_CLOEXEC, 0), &way.folder);
  bool found = false;
  while (status == KIF_STATUS_OK && !found) {
    char target[PATH_MAX];
    TakeName(&way, name);
    const bool last = way.rest[0] == '\0';
    const bool isUp = strcmp(name, "..") == 0;
    const ssize_t length = isUp ? -1 : readlinkat(way.folder.fd(), name, target, sizeof(target));
    if (length > 0 && !(last && keepLink)) {
      status = FollowLink(root, target, static_cast<size_t>(length), &way);
    } else if (last && !isUp) {
      found = true;
    } else {
      status = StepTo(root, name, &way);
    }
  }
  if (status == KIF_STATUS_OK && way.wentUp && !IsInside(way.folder.fd(), root)) {
    status = KIF_STATUS_NOT_FOUND;
  }
  *folder = static_cast<Descriptor &&>(way.folder);
  return status;
}

// What is neither a regular file nor a folder is not looked into, nor waited for.
KIF_Status OpenInRoot(int directory, const char *path, int flags, Descriptor *file) {
  Descriptor folder;
  char name[NAME_MAX + 2];
  KIF_Status status = FindInRoot(directory, path, false, &folder, name);
  if (status != KIF_STATUS_OK) return status;
  struct stat facts;
  if (fstatat(folder.fd(), name, &facts, AT_SYMLINK_NOFOLLOW) != 0) return StatusOfErrno(errno);
  if (!S_ISREG(facts.st_mode) && !S_ISDIR(facts.st_mode)) return KIF_STATUS_NOT_FOUND;
  const int careful = O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
  status = Opened(openat(folder.fd(), name, flags | careful), file);
  if (status != KIF_STATUS_OK) return status;
  if (fstat(file->fd(), &facts) != 0) return StatusOfErrno(errno);
  return S_ISREG(facts.st_mode) || S_ISDIR(facts.st_mode) ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

}  // namespace

void SetLinuxRoot(const char *root) {
  hostRoot = root;
}

bool IsForeignRoot() {
  return hostRoot != nullptr;
}

KIF_Status OpenHostFile(const char *path, int flags, Descriptor *file) {
  return OpenBelow(AT_FDCWD, path, flags, file);
}

KIF_Status OpenBelow(int directory, const char *path, int flags, Descriptor *file) {
  if (hostRoot != nullptr) return OpenInRoot(directory, path, flags, file);
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
  Descriptor folder;
  char name[NAME_MAX + 2];
  buffer[0] = '\0';
  if (hostRoot != nullptr) {
    const KIF_Status status = FindInRoot(directory, path, true, &folder, name);
    if (status != KIF_STATUS_OK) return status;
    directory = folder.fd();
    path = name;
  }
  const ssize_t got = readlinkat(directory, path, buffer, size - 1);
  buffer[got > 0 ? got : 0] = '\0';
  if (length != nullptr) *length = got > 0 ? static_cast<size_t>(got) : 0;
  return got >= 0 ? KIF_STATUS_OK : StatusOfErrno(errno);
}

KIF_Status ReadWhole(const Descriptor &file, Bytes *bytes, size_t most) {
  const int error = bytes->ReadAll(file.fd(), most);
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
