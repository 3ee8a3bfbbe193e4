// system_morelfs_tardisks and system_morelfs_ramdisks.
#include <errno.h>
#include <fcntl.h>
#include <sys/statfs.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "base/everlasting.h"
#include "linux/linux_nodes.h"
#include "linux/volumes.h"
#include "records/morelfs.h"

namespace {

constexpr const char *kArchiveTypes[] = {"squashfs", "erofs", "cramfs", "iso9660"};
constexpr const char *kMemoryTypes[] = {"tmpfs", "ramfs", "rootfs"};

Everlasting<VolumeTable> snapshot;

template <size_t Count>
bool IsOneOf(const char *text, const char *const (&texts)[Count]) {
  for (const char *candidate : texts) {
    if (strcmp(text, candidate) == 0) return true;
  }
  return false;
}

uint32_t Saturated(uint64_t value) {
  return value > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(value);
}

bool IsWhole(const Mount &mount) {
  return strcmp(mount.root, "/") == 0;
}

bool IsSameFileSystem(const Mount &a, const Mount &b) {
  return a.major == b.major && a.minor == b.minor;
}

// Whether a file system that is mounted in several places is rather shown at `other`: where it is
// mounted whole, then at the shortest point, then at the first.
bool IsBetterShownAt(const Mount &other, const Mount &mount) {
  if (other.hidden || !IsSameFileSystem(other, mount)) return false;
  if (strcmp(other.root, mount.root) != 0) return IsWhole(other) && !IsWhole(mount);
  const size_t length = strlen(mount.point);
  const size_t otherLength = strlen(other.point);
  return otherLength != length ? otherLength < length : &other < &mount;
}

bool IsShownElsewhere(const MountTable &mounts, const Mount &mount) {
  for (const Mount &other : mounts.mounts) {
    if (IsBetterShownAt(other, mount)) return true;
  }
  return false;
}

KIF_Status ReadVolumes() {
  snapshot->read = false;
  snapshot->volumes.Clear();
  const KIF_Status status = ReadMounts(&snapshot->mounts);
  if (status != KIF_STATUS_OK) return status;
  for (const Mount &mount : snapshot->mounts.mounts) {
    const bool isTardisk = IsOneOf(mount.type, kArchiveTypes);
    if (!isTardisk && !IsOneOf(mount.type, kMemoryTypes)) continue;
    if (mount.hidden || IsShownElsewhere(snapshot->mounts, mount)) continue;
    if (!snapshot->volumes.Append(Volume{&mount, isTardisk})) return KIF_STATUS_NO_MEMORY;
  }
  snapshot->read = true;
  return KIF_STATUS_OK;
}

KIF_Status ReadSpace(const Volume &volume, struct statfs *space) {
  Descriptor folder;
  const KIF_Status status = OpenVolume(volume, &folder);
  if (status != KIF_STATUS_OK) return status;
  return fstatfs(folder.fd(), space) == 0 ? KIF_STATUS_OK : StatusOfErrno(errno);
}

// A ramfs, and a tmpfs without a limit, which the kernel does not count.
bool HasNoSize(const Volume &volume) {
  if (volume.isTardisk) return false;
  struct statfs space;
  return strcmp(volume.mount->type, "ramfs") == 0 ||
         (ReadSpace(volume, &space) == KIF_STATUS_OK && space.f_blocks == 0);
}

KIF_Status ListVolumes(bool tardisks, KIF_ParamList *list) {
  const VolumeTable *table;
  KIF_Status status = NeedVolumes(true, &table);
  if (status != KIF_STATUS_OK) return status;
  for (const Volume &volume : table->volumes) {
    if (volume.isTardisk != tardisks || HasNoSize(volume)) continue;
    status = KIF_ParamListAddString(list, volume.mount->point);
    if (status != KIF_STATUS_OK) return status;
  }
  return KIF_STATUS_OK;
}

KIF_Status FindVolume(const KIF_ParamList *list, bool isTardisk, const Volume **volume) {
  const VolumeTable *table;
  const KIF_Status status = NeedVolumes(false, &table);
  if (status != KIF_STATUS_OK) return status;
  const char *name = TextAt(list, 0);
  for (const Volume &candidate : table->volumes) {
    *volume = &candidate;
    if (candidate.isTardisk == isTardisk && strcmp(candidate.mount->point, name) == 0) {
      return KIF_STATUS_OK;
    }
  }
  return KIF_STATUS_NOT_FOUND;
}

// The size of the device below an archive, which a tree of files can tell: a number of sectors.
KIF_Status ReadDeviceSize(const Mount &mount, uint64_t *bytes) {
  constexpr uint64_t kSector = 512;
  char path[64];
  char text[32];
  snprintf(path, sizeof(path), "/sys/dev/block/%u:%u/size", mount.major, mount.minor);
  const KIF_Status status = ReadHostFile(path, text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  const char *place = text;
  if (!TakeNumber(&place, bytes)) return KIF_STATUS_IO_ERROR;
  *bytes *= kSector;
  return KIF_STATUS_OK;
}

KIF_Status ReadArchiveSize(const Volume &volume, uint64_t *bytes) {
  if (IsForeignRoot()) return ReadDeviceSize(*volume.mount, bytes);
  struct statfs space;
  const KIF_Status status = ReadSpace(volume, &space);
  if (status == KIF_STATUS_OK) *bytes = space.f_blocks * static_cast<uint64_t>(space.f_bsize);
  return status;
}

// Whether one of an overlay's lower layers, "/archive:/other" or the value up to a comma, lies on
// the mount `point`.
bool IsLayer(const char *layers, const char *point) {
  const size_t length = strcmp(point, "/") == 0 ? 0 : strlen(point);
  while (*layers != '\0' && *layers != ',') {
    const bool within = strncmp(layers, point, length) == 0 && strchr("/:,", layers[length]);
    if (within) return true;
    layers += strcspn(layers, ":,");
    if (*layers == ':') ++layers;
  }
  return false;
}

// Whether a mount is that of the root file system or of a lower layer of it.
bool IsBelowRoot(const char *point) {
  if (strcmp(point, "/") == 0) return true;
  for (const Mount &root : snapshot->mounts.mounts) {
    if (root.hidden || strcmp(root.point, "/") != 0 || strcmp(root.type, "overlay") != 0) continue;
    for (const char *option = root.options; option != nullptr; option = strchr(option, ',')) {
      if (*option == ',') ++option;
      static constexpr char kLower[] = "lowerdir";
      if (strncmp(option, kLower, sizeof(kLower) - 1) != 0) continue;
      const char *layers = option + sizeof(kLower) - 1;
      if (*layers == '+') ++layers;
      if (*layers == '=' && IsLayer(layers + 1, point)) return true;
    }
  }
  return false;
}

// A layer may be named by another of its mounts than the one that is shown.
bool IsUsedToBoot(const Volume &volume) {
  for (const Mount &mount : snapshot->mounts.mounts) {
    if (IsSameFileSystem(mount, *volume.mount) && IsBelowRoot(mount.point)) return true;
  }
  return false;
}

}  // namespace

KIF_Status NeedVolumes(bool refresh, const VolumeTable **table) {
  *table = &*snapshot;
  return snapshot->read && !refresh ? KIF_STATUS_OK : ReadVolumes();
}

KIF_Status OpenVolume(const Volume &volume, Descriptor *folder) {
  if (IsForeignRoot()) return KIF_STATUS_NOT_FOUND;
  return OpenHostFile(volume.mount->point, O_PATH, folder);
}

KIF_Status ListTardisks(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  return ListVolumes(true, list);
}

KIF_Status ListRamdisks(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  return ListVolumes(false, list);
}

KIF_Status GetTardisk(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Volume *volume;
  KIF_Status status = FindVolume(instance, true, &volume);
  if (status != KIF_STATUS_OK) return status;
  uint64_t bytes;
  status = ReadArchiveSize(*volume, &bytes);
  if (status != KIF_STATUS_OK) return status;
  auto *tardisk = static_cast<TardiskStats *>(record);
  tardisk->used = Saturated(bytes);
  tardisk->usedToBoot = IsUsedToBoot(*volume);
  return KIF_STATUS_OK;
}

// A limit below one MiB counts as one: a volume is never smaller than what it holds. Where there is
// no limit the kernel does not count either.
KIF_Status GetRamdisk(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  constexpr uint64_t kMiB = 1 << 20;
  constexpr uint64_t kPage = 4096;
  const Volume *volume;
  KIF_Status status = FindVolume(instance, false, &volume);
  if (status != KIF_STATUS_OK) return status;
  struct statfs space;
  status = ReadSpace(*volume, &space);
  if (status != KIF_STATUS_OK) return status;
  if (space.f_blocks == 0) return KIF_STATUS_NOT_FOUND;
  const auto block = static_cast<uint64_t>(space.f_bsize);
  auto *ramdisk = static_cast<RamdiskStats *>(record);
  ramdisk->maximum = Saturated((space.f_blocks * block + kMiB - 1) / kMiB);
  ramdisk->used = Saturated((space.f_blocks - space.f_bfree) * block / kPage);
  ramdisk->peakUsed = ramdisk->used;
  return KIF_STATUS_OK;
}
