// storage_disks and storage_serials: the block devices in /sys/block.
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>

#include <algorithm>
#include <cstring>
#include <iterator>

#include "linux/attributes.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/storage.h"

namespace {

constexpr char kDisks[] = "/sys/block";
constexpr uint64_t kSector = 512;  // of the kernel's counts, whatever the disk's own

// The places of the fields behind `known`.
enum DiskField : unsigned {
  kSize,
  kRotational,
  kRemovable,
  kReadOnly,
  kReads,
  kWrites,
  kBytesRead,
  kBytesWritten,
  kBusyTime,
  kScheduler,
  kPciFunction,
  kModel
};
enum SerialField : unsigned { kSerial, kWorldWideName };

// Opens the folder of a disk; `*path` (may be null) is where its link leads.
KIF_Status OpenDisk(const KIF_ParamList *instance, Descriptor *folder, char (*path)[PATH_MAX]) {
  const char *name = TextAt(instance, 0);
  if (name[0] == '\0' || name[0] == '.' || strchr(name, '/') != nullptr) {
    return KIF_STATUS_NOT_FOUND;
  }
  Descriptor disks;
  KIF_Status status = OpenHostFile(kDisks, O_PATH | O_DIRECTORY, &disks);
  if (status == KIF_STATUS_OK) {
    status = OpenBelow(disks.fd(), name, O_PATH | O_DIRECTORY, folder);
  }
  if (status == KIF_STATUS_OK && path != nullptr) {
    (void)ReadLinkBelow(disks.fd(), name, *path, sizeof(*path));
  }
  return status;
}

void PutFlag(int folder, const char *path, DiskField field, uint64_t *known, uint8_t *flag) {
  uint64_t number = 0;
  const bool is = ReadNumber(folder, path, &number);
  PutNumber(known, field, is, number, flag);
}

// "none [mq-deadline] kyber", or the only one.
bool PutScheduler(int folder, StorageDisk *disk) {
  char line[256];
  if (!ReadLine(folder, "queue/scheduler", line, sizeof(line))) return false;
  const char *open = strchr(line, '[');
  const char *name = open != nullptr ? open + 1 : line;
  CopyText(disk->scheduler, sizeof(disk->scheduler), name, strcspn(name, "] "));
  return disk->scheduler[0] != '\0';
}

// See the kernel's Documentation/block/stat.rst.
bool PutCounts(int folder, StorageDisk *disk) {
  constexpr size_t kReadsAt = 0, kReadSectorsAt = 2, kWritesAt = 4, kWrittenSectorsAt = 6;
  constexpr size_t kBusyAt = 9, kCount = 10;
  char text[512];
  uint64_t counts[kCount];
  if (ReadBelow(folder, "stat", text, sizeof(text)) != KIF_STATUS_OK) return false;
  const char *place = text;
  for (uint64_t &count : counts) {
    place += strspn(place, " ");
    if (!TakeNumber(&place, &count)) return false;
  }
  disk->reads = counts[kReadsAt];
  disk->writes = counts[kWritesAt];
  disk->bytesRead = counts[kReadSectorsAt] * kSector;
  disk->bytesWritten = counts[kWrittenSectorsAt] * kSector;
  disk->busyTime = counts[kBusyAt];
  return true;
}

// The first of some files that has a line.
template <size_t kCount>
bool ReadFirst(int folder, const char *const (&paths)[kCount], char *field, size_t size) {
  return std::any_of(std::begin(paths), std::end(paths),
                     [&](const char *path) { return ReadLine(folder, path, field, size); });
}

// Page 0x80 of a SCSI disk: four bytes of header, the last of them the length.
bool ReadSerialPage(int folder, char *field, size_t size) {
  constexpr size_t kHeader = 4;
  char page[256 + kHeader];
  size_t length;
  if (ReadBelow(folder, "device/vpd_pg80", page, sizeof(page), &length) != KIF_STATUS_OK ||
      length <= kHeader) {
    return false;
  }
  const size_t told = std::min(size_t{static_cast<unsigned char>(page[3])}, length - kHeader);
  const char *begin = page + kHeader;
  const char *end = begin + strnlen(begin, told);
  while (begin < end && *begin == ' ') ++begin;
  while (begin < end && end[-1] == ' ') --end;
  CopyText(field, size, begin, static_cast<size_t>(end - begin));
  return begin < end;
}

}  // namespace

KIF_Status ListDisks(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  DirectoryReader disks;
  KIF_Status status = disks.Open(kDisks);
  while (const char *name = status == KIF_STATUS_OK ? disks.Next() : nullptr) {
    status = KIF_ParamListAddString(list, name);
  }
  if (status == KIF_STATUS_OK) status = disks.status();
  // Numbers as numbers: sda, sdb, sdaa, loop2, loop10.
  std::sort(list->params, list->params + list->count,
            [](const Param &a, const Param &b) { return strverscmp(a.text, b.text) < 0; });
  return status;
}

KIF_Status GetDisk(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *disk = static_cast<StorageDisk *>(record);
  Descriptor folder;
  char path[PATH_MAX] = "";
  const KIF_Status status = OpenDisk(instance, &folder, &path);
  if (status != KIF_STATUS_OK) return status;
  uint64_t known = 0;
  uint64_t sectors = 0;
  const bool hasSize = ReadNumber(folder.fd(), "size", &sectors) && sectors <= UINT64_MAX / kSector;
  if (hasSize) disk->size = sectors * kSector;
  Know(&known, kSize, hasSize);
  PutFlag(folder.fd(), "queue/rotational", kRotational, &known, &disk->rotational);
  PutFlag(folder.fd(), "removable", kRemovable, &known, &disk->removable);
  PutFlag(folder.fd(), "ro", kReadOnly, &known, &disk->readOnly);
  Know(&known, kPciFunction, FindPciFunction(path, disk->pciFunction, sizeof(disk->pciFunction)));
  static constexpr const char *kModels[] = {"device/model", "device/name"};
  Know(&known, kModel, ReadFirst(folder.fd(), kModels, disk->model, sizeof(disk->model)));
  Know(&known, kScheduler, PutScheduler(folder.fd(), disk));
  const bool counted = PutCounts(folder.fd(), disk);
  for (unsigned field = kReads; field <= kBusyTime; ++field) Know(&known, field, counted);
  disk->known = known;
  return KIF_STATUS_OK;
}

KIF_Status GetDiskSerial(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *disk = static_cast<StorageSerial *>(record);
  Descriptor folder;
  const KIF_Status status = OpenDisk(instance, &folder, nullptr);
  if (status != KIF_STATUS_OK) return status;
  static constexpr const char *kSerials[] = {"serial", "device/serial"};
  static constexpr const char *kNames[] = {"wwid", "device/wwid"};
  uint64_t known = 0;
  Know(&known, kSerial,
       ReadFirst(folder.fd(), kSerials, disk->serial, sizeof(disk->serial)) ||
           ReadSerialPage(folder.fd(), disk->serial, sizeof(disk->serial)));
  Know(&known, kWorldWideName,
       ReadFirst(folder.fd(), kNames, disk->worldWideName, sizeof(disk->worldWideName)));
  disk->known = known;
  return known != 0 ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}
