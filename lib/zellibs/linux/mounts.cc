#include "linux/mounts.h"

#include <fcntl.h>

#include <cstring>

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
  TakeWord(&line);  // the mount's own options
  while (*line != '\0' && strcmp(TakeWord(&line), "-") != 0) {
  }
  char *type = TakeWord(&line);
  TakeWord(&line);  // the source
  char *options = TakeWord(&line);
  if (point[0] != '/' || type[0] == '\0') return false;
  Unescape(root);
  Unescape(point);
  Unescape(options);
  mount->root = root;
  mount->point = point;
  mount->type = type;
  mount->options = options;
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

// Whether the directory `path` is `folder` or lies below it.
bool LiesWithin(const char *path, const char *folder) {
  const size_t length = strcmp(folder, "/") == 0 ? 0 : strlen(folder);
  return strncmp(path, folder, length) == 0 && (path[length] == '/' || path[length] == '\0');
}

// The mount that a mount stands on; null for the root's, whose parent lies outside of the table.
const Mount *FindParent(const MountTable &table, const Mount &mount) {
  for (const Mount &other : table.mounts) {
    if (other.id == mount.parent && &other != &mount) return &other;
  }
  return nullptr;
}

// Whether another mount stands on the mount's own point, so that nothing of it is seen.
bool IsStackedOn(const MountTable &table, const Mount &mount) {
  for (const Mount &other : table.mounts) {
    if (other.parent == mount.id && &other != &mount && strcmp(other.point, mount.point) == 0) {
      return true;
    }
  }
  return false;
}

// Whether another mount on the same parent covers a folder on the way to the mount's point.
bool IsCovered(const MountTable &table, const Mount &mount) {
  for (const Mount &other : table.mounts) {
    if (other.parent == mount.parent && other.id != other.parent &&
        strcmp(other.point, mount.point) != 0 && LiesWithin(mount.point, other.point)) {
      return true;
    }
  }
  return false;
}

// The way to a mount leads over the mounts below it. A table in the making may name mounts in a
// circle, so the way ends when it is longer than the table.
bool IsHidden(const MountTable &table, const Mount &mount) {
  if (IsStackedOn(table, mount)) return true;
  const Mount *upper = &mount;
  for (size_t steps = 0; steps < table.mounts.size(); ++steps) {
    const Mount *lower = FindParent(table, *upper);
    if (lower == nullptr) return false;
    if (IsCovered(table, *upper)) return true;
    if (strcmp(lower->point, upper->point) != 0 && IsStackedOn(table, *lower)) return true;
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
  if (status == KIF_STATUS_OK) status = table->text.ReadAll(file.fd());
  if (status == KIF_STATUS_OK) status = ParseLines(table->text.data(), table);
  if (status != KIF_STATUS_OK || table->mounts.size() == 0) return status;
  qsort(table->mounts.begin(), table->mounts.size(), sizeof(Mount), CompareMounts);
  for (Mount &mount : table->mounts) mount.hidden = IsHidden(*table, mount);
  return KIF_STATUS_OK;
}
