#include "linux/mounts.h"

#include <fcntl.h>

#include <algorithm>
#include <cstring>
#include <string_view>

#include "status.h"

namespace {

// Replaces "\040" and the like by the character they stand for, in place.
void Unescape(char *text) {
  char *to = text;
  for (const char *from = text; *from != '\0';) {
    const bool escaped = from[0] == '\\' && from[1] >= '0' && from[1] <= '3' && from[2] >= '0' &&
                         from[2] <= '7' && from[3] >= '0' && from[3] <= '7';
    if (escaped) {
      *to++ = static_cast<char>((from[1] - '0') << 6 | (from[2] - '0') << 3 | (from[3] - '0'));
      from += 4;
    } else {
      *to++ = *from++;
    }
  }
  *to = '\0';
}

// Cuts the next word off `*line`; an empty text at the end.
char *TakeWord(char **line) {
  char *word = *line;
  char *end = word + strcspn(word, " ");
  *line = *end != '\0' ? end + 1 : end;
  *end = '\0';
  return word;
}

bool TakeDevice(const char *text, Mount *mount) {
  uint64_t major;
  uint64_t minor;
  if (!TakeNumber(&text, &major) || *text++ != ':' || !TakeNumber(&text, &minor)) return false;
  mount->major = static_cast<uint32_t>(major);
  mount->minor = static_cast<uint32_t>(minor);
  return true;
}

// See proc(5), /proc/pid/mountinfo:
// 36 35 98:0 /mnt1 /mnt2 rw,noatime master:1 - ext3 /dev/root rw,errors=continue
bool ParseMount(char *line, Mount *mount) {
  const char *id = TakeWord(&line);
  const char *parent = TakeWord(&line);
  if (!TakeNumber(&id, &mount->id) || !TakeNumber(&parent, &mount->parent)) return false;
  if (!TakeDevice(TakeWord(&line), mount)) return false;
  char *root = TakeWord(&line);
  char *point = TakeWord(&line);
  char *ownOptions = TakeWord(&line);
  while (*line != '\0' && strcmp(TakeWord(&line), "-") != 0) {
  }
  char *type = TakeWord(&line);
  char *source = TakeWord(&line);
  char *options = TakeWord(&line);
  if (point[0] != '/' || type[0] == '\0') return false;
  Unescape(root);
  Unescape(point);
  Unescape(options);
  Unescape(source);
  mount->root = root;
  mount->point = point;
  mount->type = type;
  mount->source = source;
  mount->options = options;
  mount->ownOptions = ownOptions;
  mount->hidden = false;
  return true;
}

KIF_Status ParseLines(char *text, MountTable *table) {
  char *rest;
  for (char *line = strtok_r(text, "\n", &rest); line != nullptr;
       line = strtok_r(nullptr, "\n", &rest)) {
    Mount mount;
    if (ParseMount(line, &mount) && !table->mounts.Append(mount)) return KIF_STATUS_NO_MEMORY;
  }
  return KIF_STATUS_OK;
}

// The mounts in two orders, so that the ones above, below and beside a mount are found without
// looking at all of them: hosts of containers have thousands.
struct MountIndex {
  const MountTable *table;
  Array<const Mount *> byId;
  Array<const Mount *> byPlace;  // by the mount that they stand on, then by point
};

int ComparePlace(const Mount &mount, uint64_t parent, std::string_view point) {
  if (mount.parent != parent) return mount.parent < parent ? -1 : 1;
  return std::string_view(mount.point).compare(point);
}

KIF_Status MakeIndex(const MountTable &table, MountIndex *index) {
  index->table = &table;
  for (const Mount &mount : table.mounts) {
    if (!index->byId.Append(&mount) || !index->byPlace.Append(&mount)) return KIF_STATUS_NO_MEMORY;
  }
  std::sort(index->byId.begin(), index->byId.end(),
            [](const Mount *a, const Mount *b) { return a->id < b->id; });
  std::sort(index->byPlace.begin(), index->byPlace.end(), [](const Mount *a, const Mount *b) {
    return ComparePlace(*a, b->parent, b->point) < 0;
  });
  return KIF_STATUS_OK;
}

// The mount that a mount stands on; null for the root's, whose parent lies outside of the table.
const Mount *FindParent(const MountIndex &index, const Mount &mount) {
  const Mount *const *found =
      std::lower_bound(index.byId.begin(), index.byId.end(), mount.parent,
                       [](const Mount *other, uint64_t id) { return other->id < id; });
  const bool isThere = found != index.byId.end() && (*found)->id == mount.parent;
  return isThere && *found != &mount ? *found : nullptr;
}

// Whether a mount that is not the root's stands at `point` on the mount `parent`.
bool HasMountAt(const MountIndex &index, uint64_t parent, std::string_view point) {
  const Mount *const *found = std::lower_bound(
      index.byPlace.begin(), index.byPlace.end(), parent,
      [&](const Mount *other, uint64_t) { return ComparePlace(*other, parent, point) < 0; });
  for (; found != index.byPlace.end() && ComparePlace(**found, parent, point) == 0; ++found) {
    if ((*found)->id != parent) return true;
  }
  return false;
}

// Whether another mount stands on the mount's own point, so that nothing of it is seen.
bool IsStackedOn(const MountIndex &index, const Mount &mount) {
  return HasMountAt(index, mount.id, mount.point);
}

// Whether another mount on the same parent covers a folder on the way to the mount's point.
bool IsCovered(const MountIndex &index, const Mount &mount) {
  const std::string_view point = mount.point;
  if (point.size() > 1 && HasMountAt(index, mount.parent, "/")) return true;
  for (size_t slash = point.find('/', 1); slash != point.npos; slash = point.find('/', slash + 1)) {
    if (HasMountAt(index, mount.parent, std::string_view(point.data(), slash))) return true;
  }
  return false;
}

// The way to a mount leads over the mounts below it. A table in the making may name mounts in a
// circle, so the way ends when it is longer than the table.
bool IsHidden(const MountIndex &index, const Mount &mount) {
  if (IsStackedOn(index, mount)) return true;
  const Mount *upper = &mount;
  for (size_t steps = 0; steps < index.table->mounts.size(); ++steps) {
    const Mount *lower = FindParent(index, *upper);
    if (lower == nullptr) return false;
    if (IsCovered(index, *upper)) return true;
    if (strcmp(lower->point, upper->point) != 0 && IsStackedOn(index, *lower)) return true;
    upper = lower;
  }
  return true;
}

int CompareMounts(const void *left, const void *right) {
  const auto *a = static_cast<const Mount *>(left);
  const auto *b = static_cast<const Mount *>(right);
  const int order = strcmp(a->point, b->point);
  if (order != 0) return order;
  return a->id < b->id ? -1 : a->id > b->id;
}

}  // namespace

KIF_Status ReadMounts(MountTable *table) {
  table->mounts.Clear();
  table->text.Clear();
  Descriptor file;
  KIF_Status status = OpenHostFile("/proc/self/mountinfo", O_RDONLY, &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &table->text);
  if (status == KIF_STATUS_OK) status = ParseLines(table->text.data(), table);
  if (status != KIF_STATUS_OK || table->mounts.size() == 0) return status;
  qsort(table->mounts.begin(), table->mounts.size(), sizeof(Mount), CompareMounts);
  MountIndex index = {};
  status = MakeIndex(*table, &index);
  if (status != KIF_STATUS_OK) return status;
  for (Mount &mount : table->mounts) mount.hidden = IsHidden(index, mount);
  return KIF_STATUS_OK;
}
