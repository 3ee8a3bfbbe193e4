// storage_mounts and storage_mounts_size: what is mounted, and how full it is.
#include <errno.h>
#include <fcntl.h>
#include <sys/statfs.h>

#include <algorithm>
#include <cstring>

#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/linux_nodes.h"
#include "linux/mounts.h"
#include "records/storage.h"

namespace {

enum MountField : unsigned { kType, kDevice, kOptions };
enum SizeField : unsigned { kSize, kUsed, kAvailable, kInodesUsed, kInodesFree };

// The mounts when they were listed last.
struct Mounts {
  bool read = false;
  MountTable table;
};

Everlasting<Mounts> snapshot;

KIF_Status ReadTable() {
  snapshot->read = false;
  const KIF_Status status = ReadMounts(&snapshot->table);
  snapshot->read = status == KIF_STATUS_OK;
  return status;
}

// The mount that is seen at a point. The mounts are in the order of their points.
KIF_Status FindMount(const KIF_ParamList *instance, const Mount **mount) {
  const KIF_Status status = snapshot->read ? KIF_STATUS_OK : ReadTable();
  if (status != KIF_STATUS_OK) return status;
  const char *point = TextAt(instance, 0);
  const Array<Mount> &mounts = snapshot->table.mounts;
  const Mount *found = std::lower_bound(
      mounts.begin(), mounts.end(), point,
      [](const Mount &other, const char *wanted) { return strcmp(other.point, wanted) < 0; });
  while (found != mounts.end() && found->hidden && strcmp(found->point, point) == 0) ++found;
  if (found == mounts.end() || strcmp(found->point, point) != 0) return KIF_STATUS_NOT_FOUND;
  *mount = found;
  return KIF_STATUS_OK;
}

bool IsReadOnly(const char *options) {
  return strncmp(options, "ro", 2) == 0 && (options[2] == ',' || options[2] == '\0');
}

// The options behind the first one, which is "rw" or "ro", with the comma before them.
const char *Rest(const char *options) {
  return options + strcspn(options, ",");
}

// As /proc/mounts has them: what can be written to is what both allow.
bool PutOptions(const Mount &mount, char *field, size_t size) {
  Bytes text;
  const char *first = IsReadOnly(mount.ownOptions) || IsReadOnly(mount.options) ? "ro" : "rw";
  const char *own = Rest(mount.ownOptions);
  const char *others = Rest(mount.options);
  if (!text.Append(first, strlen(first)) || !text.Append(own, strlen(own)) ||
      !text.Append(others, strlen(others))) {
    return false;
  }
  CopyText(field, size, text.text(), text.size());
  return true;
}

}  // namespace

KIF_Status ListMounts(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadTable();
  for (const Mount &mount : snapshot->table.mounts) {
    if (status != KIF_STATUS_OK) break;
    if (!mount.hidden) status = KIF_ParamListAddString(list, mount.point);
  }
  return status;
}

KIF_Status GetMount(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *answer = static_cast<StorageMount *>(record);
  const Mount *mount;
  const KIF_Status status = FindMount(instance, &mount);
  if (status != KIF_STATUS_OK) return status;
  uint64_t known = 0;
  CopyText(answer->type, sizeof(answer->type), mount->type, strlen(mount->type));
  CopyText(answer->device, sizeof(answer->device), mount->source, strlen(mount->source));
  if (!PutOptions(*mount, answer->options, sizeof(answer->options))) return KIF_STATUS_NO_MEMORY;
  for (const unsigned field : {kType, kDevice, kOptions}) Know(&known, field, true);
  answer->known = known;
  return KIF_STATUS_OK;
}

// An automounter is not asked: the question would mount.
KIF_Status GetMountSize(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *answer = static_cast<StorageMountSize *>(record);
  const Mount *mount;
  KIF_Status status = FindMount(instance, &mount);
  if (status != KIF_STATUS_OK) return status;
  if (IsForeignRoot() || strcmp(mount->type, "autofs") == 0) return KIF_STATUS_NOT_FOUND;
  Descriptor folder;
  struct statfs space;
  status = OpenHostFile(mount->point, O_PATH, &folder);
  if (status != KIF_STATUS_OK) return status;
  if (fstatfs(folder.fd(), &space) != 0) return StatusOfErrno(errno);
  const auto block = static_cast<uint64_t>(space.f_frsize != 0 ? space.f_frsize : space.f_bsize);
  uint64_t known = 0;
  if (space.f_blocks != 0) {
    answer->size = space.f_blocks * block;
    answer->used = (space.f_blocks - std::min(space.f_bfree, space.f_blocks)) * block;
    answer->available = space.f_bavail * block;
    for (const unsigned field : {kSize, kUsed, kAvailable}) Know(&known, field, true);
  }
  if (space.f_files != 0) {
    answer->inodesUsed = space.f_files - std::min(space.f_ffree, space.f_files);
    answer->inodesFree = space.f_ffree;
    for (const unsigned field : {kInodesUsed, kInodesFree}) Know(&known, field, true);
  }
  answer->known = known;
  return KIF_STATUS_OK;
}
