// system_morelfs_inodes: the files of the volumes in memory, found by a walk, and the deleted ones
// that processes still hold open.
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/linux_nodes.h"
#include "linux/volumes.h"
#include "records/morelfs.h"
#include "status.h"

namespace {

constexpr size_t kNameSize = sizeof(InodeStats::name);

// Stands first in the list for the files that the reader may not see. No file has this number.
constexpr int64_t kUnseen = 0;

struct Inode {
  uint64_t number;  // the file system's; what several volumes number alike is told apart on top
  uint32_t major;
  uint32_t minor;
  uint32_t volume;  // place in the volumes
  uint32_t size;
  bool deleted;
  size_t path;  // place in the paths
};

struct VolumeName {
  bool isTardisk;
  char name[sizeof(InodeStats::ramdisk)];
};

// The files as they were at the last walk, by number.
struct InodeTable {
  bool read = false;
  bool partial = false;  // there may be deleted files that the reader may not see
  Array<Inode> inodes;
  Bytes paths;  // terminated texts
  Array<VolumeName> volumes;
};

Everlasting<InodeTable> snapshot;

// A walk under way.
struct Walk {
  const VolumeTable *volumes;
  Bytes pending;  // folders still to be read, terminated paths below the volume's top folder
};

bool IsOnVolume(const struct stat &facts, const Mount &mount) {
  return major(facts.st_dev) == mount.major && minor(facts.st_dev) == mount.minor;
}

KIF_Status AddInode(uint32_t volume, const struct stat &facts, const char *path, bool deleted) {
  char printed[kNameSize];
  CopyText(printed, sizeof(printed), path, strlen(path));
  const uint64_t size = facts.st_size > 0 ? static_cast<uint64_t>(facts.st_size) : 0;
  const Inode inode = {facts.st_ino,
                       major(facts.st_dev),
                       minor(facts.st_dev),
                       volume,
                       size < UINT32_MAX ? static_cast<uint32_t>(size) : UINT32_MAX,
                       deleted,
                       snapshot->paths.size()};
  const bool added =
      snapshot->inodes.Append(inode) && snapshot->paths.Append(printed, strlen(printed) + 1);
  return added ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

bool HasMountsBelow(const MountTable &mounts, const Mount &mount) {
  for (const Mount &other : mounts.mounts) {
    if (other.parent == mount.id && &other != &mount) return true;
  }
  return false;
}

// Looking at a mount point looks at what is mounted there, and that may not answer.
bool IsMountPoint(const MountTable &mounts, const Mount &mount, const char *path) {
  for (const Mount &other : mounts.mounts) {
    if (other.parent == mount.id && strcmp(other.point, path) == 0) return true;
  }
  return false;
}

// Removes the folder that was put off last and copies its path.
bool TakePending(Bytes *pending, char (&path)[PATH_MAX]) {
  if (pending->size() == 0) return false;
  const char *texts = pending->data();
  size_t start = pending->size() - 1;
  while (start > 0 && texts[start - 1] != '\0') --start;
  snprintf(path, sizeof(path), "%s", texts + start);
  pending->Truncate(start);
  return true;
}

// Adds the files in one folder of a volume, and puts its folders off. What changes under the walk
// or is closed to the reader is passed over.
KIF_Status WalkFolder(Walk *walk, uint32_t place, int top, bool watchMounts,
                      const char (&folder)[PATH_MAX]) {
  const MountTable &mounts = walk->volumes->mounts;
  const Mount &mount = *walk->volumes->volumes[place].mount;
  DirectoryReader reader;
  struct stat facts;
  if (reader.OpenBelow(top, folder[0] != '\0' ? folder : ".") != KIF_STATUS_OK ||
      fstat(reader.fd(), &facts) != 0 || !IsOnVolume(facts, mount)) {
    return KIF_STATUS_OK;
  }
  const char *point = strcmp(mount.point, "/") == 0 ? "" : mount.point;
  KIF_Status status = KIF_STATUS_OK;
  while (status == KIF_STATUS_OK) {
    const char *name = reader.Next();
    if (name == nullptr) break;
    char path[PATH_MAX];
    char full[2 * PATH_MAX];
    const char *slash = folder[0] != '\0' ? "/" : "";
    const int length = snprintf(path, sizeof(path), "%s%s%s", folder, slash, name);
    if (length < 0 || static_cast<size_t>(length) >= sizeof(path)) continue;
    snprintf(full, sizeof(full), "%s/%s", point, path);
    if (watchMounts && IsMountPoint(mounts, mount, full)) continue;
    constexpr int kFlags = AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT;
    if (fstatat(reader.fd(), name, &facts, kFlags) != 0 || !IsOnVolume(facts, mount)) continue;
    status = AddInode(place, facts, full, false);
    const bool goesOn = status == KIF_STATUS_OK && S_ISDIR(facts.st_mode);
    if (goesOn && !walk->pending.Append(path, strlen(path) + 1)) status = KIF_STATUS_NO_MEMORY;
  }
  return status;
}

KIF_Status WalkVolume(Walk *walk, uint32_t place) {
  const Volume &volume = walk->volumes->volumes[place];
  Descriptor top;
  struct stat facts;
  if (OpenVolume(volume, &top) != KIF_STATUS_OK || fstat(top.fd(), &facts) != 0 ||
      !IsOnVolume(facts, *volume.mount)) {
    return KIF_STATUS_OK;
  }
  KIF_Status status = AddInode(place, facts, volume.mount->point, false);
  const bool watchMounts = HasMountsBelow(walk->volumes->mounts, *volume.mount);
  char folder[PATH_MAX] = "";
  while (status == KIF_STATUS_OK) {
    status = WalkFolder(walk, place, top.fd(), watchMounts, folder);
    if (!TakePending(&walk->pending, folder)) break;
  }
  return status;
}

bool FindVolumeOf(const VolumeTable &volumes, uint32_t majorNumber, uint32_t minorNumber,
                  uint32_t *place) {
  for (uint32_t i = 0; i < volumes.volumes.size(); ++i) {
    const Mount &mount = *volumes.volumes[i].mount;
    *place = i;
    if (majorNumber == mount.major && minorNumber == mount.minor) return true;
  }
  return false;
}

// Finds the volume of the file behind a descriptor, without asking a file server that may not
// answer for more than the kernel knows.
bool FindVolumeBehind(const VolumeTable &volumes, int descriptors, const char *name,
                      uint32_t *place) {
  struct statx facts;
  const int flags = AT_STATX_DONT_SYNC | AT_NO_AUTOMOUNT;
  return statx(descriptors, name, flags, STATX_TYPE, &facts) == 0 &&
         FindVolumeOf(volumes, facts.stx_dev_major, facts.stx_dev_minor, place);
}

constexpr char kDeleted[] = " (deleted)";
constexpr size_t kDeletedLength = sizeof(kDeleted) - 1;

// Takes what the kernel puts behind the path of a deleted file off it; false where it is not there.
bool CutDeleted(char *path, size_t length) {
  if (length <= kDeletedLength || strcmp(path + length - kDeletedLength, kDeleted) != 0) {
    return false;
  }
  path[length - kDeletedLength] = '\0';
  return true;
}

// The files of other users' processes are closed to an unprivileged reader.
bool IsRefused(KIF_Status status) {
  if (status == KIF_STATUS_NO_PERMISSION) snapshot->partial = true;
  return status != KIF_STATUS_OK;
}

// Adds the file behind a descriptor where its link says that it was deleted.
KIF_Status AddIfDeleted(const VolumeTable &volumes, int descriptors, const char *name) {
  char target[PATH_MAX + kDeletedLength];
  size_t length;
  if (IsRefused(ReadLinkBelow(descriptors, name, target, sizeof(target), &length)) ||
      !CutDeleted(target, length)) {
    return KIF_STATUS_OK;
  }
  struct stat facts;
  uint32_t place;
  if (!FindVolumeBehind(volumes, descriptors, name, &place) ||
      fstatat(descriptors, name, &facts, AT_NO_AUTOMOUNT) != 0 || facts.st_nlink != 0) {
    return KIF_STATUS_OK;
  }
  return AddInode(place, facts, target, true);
}

KIF_Status WalkDescriptors(const VolumeTable &volumes, int process) {
  DirectoryReader descriptors;
  if (IsRefused(descriptors.OpenBelow(process, "fd"))) return KIF_STATUS_OK;
  KIF_Status status = KIF_STATUS_OK;
  while (status == KIF_STATUS_OK) {
    const char *name = descriptors.Next();
    if (name == nullptr) break;
    status = AddIfDeleted(volumes, descriptors.fd(), name);
  }
  return status;
}

// Adds the file of one line of /proc/PID/maps, whose path says that it was deleted, see proc(5):
// "7f0000000000-7f0000001000 r--p 00000000 00:19 1234      /dev/shm/x (deleted)".
KIF_Status AddMapping(const VolumeTable &volumes, int process, const char *line) {
  unsigned long start;
  unsigned long end;
  unsigned majorNumber;
  unsigned minorNumber;
  int path = 0;
  if (sscanf(line, "%lx-%lx %*s %*s %x:%x %*s %n", &start, &end, &majorNumber, &minorNumber,
             &path) != 4 ||
      path == 0) {
    return KIF_STATUS_OK;
  }
  uint32_t place;
  if (!FindVolumeOf(volumes, majorNumber, minorNumber, &place)) return KIF_STATUS_OK;
  char link[64];
  snprintf(link, sizeof(link), "map_files/%lx-%lx", start, end);
  struct stat facts;
  if (fstatat(process, link, &facts, AT_NO_AUTOMOUNT) != 0) {
    (void)IsRefused(StatusOfErrno(errno));
    return KIF_STATUS_OK;
  }
  return facts.st_nlink == 0 ? AddInode(place, facts, line + path, true) : KIF_STATUS_OK;
}

// The lines tell which of the many mappings have to be looked at.
KIF_Status WalkMappings(const VolumeTable &volumes, int process) {
  Descriptor file;
  Bytes text;
  if (IsRefused(OpenBelow(process, "maps", O_RDONLY, &file))) return KIF_STATUS_OK;
  KIF_Status status = ReadWhole(file, &text);
  if (status != KIF_STATUS_OK) return status == KIF_STATUS_NO_MEMORY ? status : KIF_STATUS_OK;
  char *rest;
  for (char *line = strtok_r(text.data(), "\n", &rest); line != nullptr && status == KIF_STATUS_OK;
       line = strtok_r(nullptr, "\n", &rest)) {
    if (CutDeleted(line, strlen(line))) status = AddMapping(volumes, process, line);
  }
  return status;
}

KIF_Status WalkProcesses(const VolumeTable &volumes) {
  DirectoryReader processes;
  KIF_Status status = processes.Open("/proc");
  bool seesFirst = false;
  while (status == KIF_STATUS_OK) {
    const char *name = processes.Next();
    if (name == nullptr) break;
    if (name[0] < '1' || name[0] > '9') continue;
    if (strcmp(name, "1") == 0) seesFirst = true;
    Descriptor process;
    if (OpenBelow(processes.fd(), name, O_PATH | O_DIRECTORY, &process) != KIF_STATUS_OK) continue;
    status = WalkDescriptors(volumes, process.fd());
    if (status == KIF_STATUS_OK) status = WalkMappings(volumes, process.fd());
  }
  if (!seesFirst) snapshot->partial = true;  // processes of others are hidden
  return status == KIF_STATUS_OK ? processes.status() : status;
}

int CompareNumbers(const void *left, const void *right) {
  const auto *a = static_cast<const Inode *>(left);
  const auto *b = static_cast<const Inode *>(right);
  return a->number < b->number ? -1 : a->number > b->number;
}

bool IsSameFile(const Inode &a, const Inode &b) {
  return a.number == b.number && a.major == b.major && a.minor == b.minor;
}

// Device 1 is the root in memory: its files keep their numbers. Then the volumes in their order.
int CompareFiles(const void *left, const void *right) {
  const auto *a = static_cast<const Inode *>(left);
  const auto *b = static_cast<const Inode *>(right);
  if (a->number != b->number) return CompareNumbers(left, right);
  const bool aFirst = a->major == 0 && a->minor == 1;
  const bool bFirst = b->major == 0 && b->minor == 1;
  if (aFirst != bFirst) return aFirst ? -1 : 1;
  if (a->volume != b->volume) return a->volume < b->volume ? -1 : 1;
  return a->path < b->path ? -1 : a->path > b->path;
}

// Leaves each file once, and each number to one file.
void NumberInodes(Array<Inode> *inodes) {
  constexpr int kVolumeShift = 48;
  if (inodes->size() == 0) return;
  qsort(inodes->begin(), inodes->size(), sizeof(Inode), CompareFiles);
  Inode previous = {};
  size_t kept = 0;
  for (size_t i = 0; i < inodes->size(); ++i) {
    Inode inode = (*inodes)[i];
    const bool isFirst = i == 0 || inode.number != previous.number;
    if (!isFirst && IsSameFile(inode, previous)) continue;
    previous = inode;
    if (!isFirst) inode.number |= (uint64_t{inode.volume} + 1) << kVolumeShift;
    (*inodes)[kept++] = inode;
  }
  inodes->Truncate(kept);
  qsort(inodes->begin(), inodes->size(), sizeof(Inode), CompareNumbers);
}

// The volumes may be read anew while the files are not.
KIF_Status KeepVolumeNames(const VolumeTable &volumes) {
  for (const Volume &volume : volumes.volumes) {
    VolumeName name = {volume.isTardisk, ""};
    CopyText(name.name, sizeof(name.name), volume.mount->point, strlen(volume.mount->point));
    if (!snapshot->volumes.Append(name)) return KIF_STATUS_NO_MEMORY;
  }
  return KIF_STATUS_OK;
}

KIF_Status ReadInodes() {
  snapshot->read = false;
  snapshot->partial = false;
  snapshot->inodes.Clear();
  snapshot->paths.Clear();
  snapshot->volumes.Clear();
  if (IsForeignRoot()) return KIF_STATUS_NOT_FOUND;
  Walk walk;
  KIF_Status status = NeedVolumes(true, &walk.volumes);
  if (status == KIF_STATUS_OK) status = KeepVolumeNames(*walk.volumes);
  if (status != KIF_STATUS_OK) return status;
  for (uint32_t i = 0; status == KIF_STATUS_OK && i < walk.volumes->volumes.size(); ++i) {
    status = WalkVolume(&walk, i);
  }
  if (status == KIF_STATUS_OK) status = WalkProcesses(*walk.volumes);
  if (status != KIF_STATUS_OK) return status;
  NumberInodes(&snapshot->inodes);
  snapshot->read = true;
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status ListInodes(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadInodes();
  if (status == KIF_STATUS_OK && snapshot->partial) status = KIF_ParamListAddInt(list, kUnseen);
  for (size_t i = 0; status == KIF_STATUS_OK && i < snapshot->inodes.size(); ++i) {
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(snapshot->inodes[i].number));
  }
  return status;
}

KIF_Status GetInode(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const KIF_Status status = snapshot->read ? KIF_STATUS_OK : ReadInodes();
  if (status != KIF_STATUS_OK) return status;
  const int64_t number = Integer(instance, 0);
  if (number == kUnseen && snapshot->partial) return KIF_STATUS_NO_PERMISSION;
  if (snapshot->inodes.size() == 0) return KIF_STATUS_NOT_FOUND;
  Inode wanted = {};
  wanted.number = static_cast<uint64_t>(number);
  const auto *inode = static_cast<const Inode *>(bsearch(
      &wanted, snapshot->inodes.begin(), snapshot->inodes.size(), sizeof(Inode), CompareNumbers));
  if (inode == nullptr) return KIF_STATUS_NOT_FOUND;
  const VolumeName &volume = snapshot->volumes[inode->volume];
  auto *stats = static_cast<InodeStats *>(record);
  stats->flags = volume.isTardisk ? kInodeOnTardisk : InodeFlags{};
  stats->linkState = inode->deleted ? kInodeUnlinked : 0;
  stats->size = inode->size;
  memcpy(volume.isTardisk ? stats->tardisk : stats->ramdisk, volume.name, sizeof(volume.name));
  snprintf(stats->name, sizeof(stats->name), "%s", snapshot->paths.text() + inode->path);
  return KIF_STATUS_OK;
}
