// userworld_cartel_fd_fds: /proc/PID/fd.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <sys/xattr.h>

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <iterator>

#include "base/everlasting.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "linux/process_directory.h"
#include "linux/socket_holders.h"
#include "linux/sockets.h"
#include "records/worlds.h"

namespace {

// The process asked for last.
struct KeptProcess {
  int64_t id = -1;
  Descriptor descriptors;    // its fd directory
  bool socketsRead = false;  // those of its network namespace are known
  bool socketsReadAgain = false;
  bool refused = false;  // the kernel refused a descriptor; it decides on processes as a whole
};

Everlasting<KeptProcess> snapshot;

void Keep(int64_t process, int descriptors) {
  snapshot->id = process;
  snapshot->descriptors.Reset(descriptors);
  snapshot->socketsRead = snapshot->socketsReadAgain = snapshot->refused = false;
}

KIF_Status KeepProcess(int64_t process) {
  if (process == snapshot->id) return KIF_STATUS_OK;
  int directory;
  Descriptor descriptors;
  KIF_Status status = OpenProcessDirectory(process, false, &directory);
  if (status == KIF_STATUS_OK) {
    status = OpenBelow(directory, "fd", O_PATH | O_DIRECTORY, &descriptors);
  }
  if (status == KIF_STATUS_OK) Keep(process, descriptors.Release());
  return status;
}

constexpr char kSocket[] = "socket:[";

bool BeginsWith(const char *text, const char *beginning) {
  return strncmp(text, beginning, strlen(beginning)) == 0;
}

const char *KindOfMode(unsigned mode) {
  switch (mode & S_IFMT) {
    case S_IFDIR:
      return "DIR";
    case S_IFCHR:
      return "CHAR";
    case S_IFBLK:
      return "BLOCK";
    case S_IFIFO:
      return "PIPE";
    case S_IFSOCK:
      return "SOCKET";
    default:
      return "FILE";
  }
}

// In a tree taken from elsewhere there is no file to ask, only well-known names.
const char *KindOfRecordedPath(const char *path) {
  static constexpr const char *kCharacterDevices[] = {
      "/dev/null", "/dev/zero", "/dev/full", "/dev/random",  "/dev/urandom",
      "/dev/tty",  "/dev/pts/", "/dev/ptmx", "/dev/console",
  };
  const auto matches = [path](const char *device) { return BeginsWith(path, device); };
  return std::any_of(std::begin(kCharacterDevices), std::end(kCharacterDevices), matches) ? "CHAR"
                                                                                          : "FILE";
}

// The kind of the descriptor `name` of the process, whose link reads `target`. What has no place in
// a file system shows it in its name; only the others are looked at, with what the kernel already
// knows of them, for a file server may not answer.
const char *KindOf(const char *name, const char *target) {
  if (BeginsWith(target, kSocket)) return "SOCKET";
  if (BeginsWith(target, "pipe:[")) return "PIPE";
  if (BeginsWith(target, "anon_inode:")) return "ANON";
  if (target[0] != '/' && strstr(target, ":[") != nullptr) return "ANON";  // "mnt:[4026531840]"
  if (IsForeignRoot()) return KindOfRecordedPath(target);
  struct statx file;
  const int flags = AT_STATX_DONT_SYNC | AT_NO_AUTOMOUNT;
  const bool known = statx(snapshot->descriptors.fd(), name, flags, STATX_TYPE, &file) == 0;
  return KindOfMode(known ? file.stx_mode : S_IFREG);
}

KIF_Status ReadSocketsOfKept(bool again) {
  bool *done = again ? &snapshot->socketsReadAgain : &snapshot->socketsRead;
  if (*done) return KIF_STATUS_OK;
  int directory;
  KIF_Status status = OpenProcessDirectory(snapshot->id, false, &directory);
  if (status == KIF_STATUS_OK) status = ReadSocketsOf(directory, again);
  *done = status == KIF_STATUS_OK;
  return status;
}

// The protocol of the socket behind a descriptor, as the kernel itself calls it; empty where it
// does not say.
void ReadProtocol(const char *name, char *text, size_t size) {
  char path[64];
  snprintf(path, sizeof(path), "/proc/self/fd/%d/%s", snapshot->descriptors.fd(), name);
  const ssize_t length = getxattr(path, "system.sockprotoname", text, size - 1);
  text[length > 0 ? length : 0] = '\0';
}

// Tells whether the tables say what a socket is: `protocol` is what its attribute says, and an
// unknown one may be newer than they are. A foreign tree has no attributes.
KIF_Status FindInTables(const char *name, uint64_t inode, char *protocol, size_t size,
                        bool *found) {
  SocketRow row = FindSocketRow(inode);
  *found = row == SocketRow::kOther || (row == SocketRow::kUnix && IsForeignRoot());
  if (*found || IsForeignRoot()) return KIF_STATUS_OK;
  ReadProtocol(name, protocol, size);
  const bool isUnix = IsUnixProtocol(protocol);
  *found = row == SocketRow::kUnix && isUnix;
  if (*found || !HasTable(protocol)) return KIF_STATUS_OK;
  const KIF_Status status = ReadSocketsOfKept(true);
  row = FindSocketRow(inode);
  *found = row == SocketRow::kOther || (row == SocketRow::kUnix && isUnix);
  return status;
}

// Puts the description of the socket in place of its link's text: what the tables say of it, else
// its protocol.
KIF_Status NameSocket(const char *name, char *text, size_t size, size_t *length) {
  const char *place = text + strlen(kSocket);
  uint64_t inode;
  if (!TakeNumber(&place, &inode)) return KIF_STATUS_OK;
  KIF_Status status = NoteHolder(snapshot->id, inode);
  if (status == KIF_STATUS_OK) status = ReadSocketsOfKept(false);
  char protocol[64] = "";
  bool found = false;
  if (status == KIF_STATUS_OK) {
    status = FindInTables(name, inode, protocol, sizeof(protocol), &found);
  }
  if (status != KIF_STATUS_OK) return status;
  if (!found && protocol[0] != '\0') {
    *length = static_cast<size_t>(snprintf(text, size, "%s", protocol));
  } else if (found && DescribeSocket(inode, text, size)) {
    *length = strlen(text);
  }
  return status;
}

KIF_Status ReadLink(const char *name, char *text, size_t size, size_t *length) {
  if (snapshot->refused) return KIF_STATUS_NO_PERMISSION;
  const KIF_Status status = ReadLinkBelow(snapshot->descriptors.fd(), name, text, size, length);
  snapshot->refused = status == KIF_STATUS_NO_PERMISSION;
  if (snapshot->refused) NoteRefusal();
  return status;
}

}  // namespace

KIF_Status ListDescriptors(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  const int64_t process = Integer(parent, 0);
  int directory;
  DirectoryReader descriptors;
  KIF_Status status = OpenProcessDirectory(process, true, &directory);
  if (status == KIF_STATUS_OK) status = descriptors.OpenBelow(directory, "fd");
  if (status != KIF_STATUS_OK) return status;
  const int duplicate = fcntl(descriptors.fd(), F_DUPFD_CLOEXEC, 0);
  if (duplicate < 0) return StatusOfErrno(errno);
  Keep(process, duplicate);
  status = NoteDescriptorsOf(process);
  if (status != KIF_STATUS_OK) return status;
  while (const char *name = descriptors.Next()) {
    uint64_t number;
    if (!TakeNumber(&name, &number) || *name != '\0' || number > INT32_MAX) continue;
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(number));
    if (status != KIF_STATUS_OK) return status;
  }
  std::sort(list->params, list->params + list->count,
            [](const Param &a, const Param &b) { return a.integer < b.integer; });
  return descriptors.status();
}

KIF_Status GetDescriptor(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *descriptor = static_cast<DescriptorRecord *>(record);
  const int64_t number = Integer(instance, 1);
  KIF_Status status = KeepProcess(Integer(instance, 0));
  if (status != KIF_STATUS_OK) return status;
  char name[24];
  snprintf(name, sizeof(name), "%lld", static_cast<long long>(number));
  char text[4096];  // the kernel's longest pathname
  size_t length;
  status = ReadLink(name, text, sizeof(text), &length);
  if (status != KIF_STATUS_OK) return status;
  snprintf(descriptor->kind, sizeof(descriptor->kind), "%s", KindOf(name, text));
  if (BeginsWith(text, kSocket)) status = NameSocket(name, text, sizeof(text), &length);
  CopyText(descriptor->description, sizeof(descriptor->description), text, length);
  return status;
}
