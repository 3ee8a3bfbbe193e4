// userworld_cartel_identity, userworld_cartel_paths and userworld_cartel_limits: who a process is.
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <sys/stat.h>

#include <cstddef>
#include <cstring>

#include "linux/attributes.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "linux/process_directory.h"
#include "records/cartels.h"

namespace {

enum IdentityField : unsigned {
  kRealUser,
  kEffectiveUser,
  kRealGroup,
  kEffectiveGroup,
  kResidentMemory,
  kPeakMemory,
  kOomAdjustment,
  kFirstNamespace,  // device and inode of each, in the order of the record
};
enum PathField : unsigned { kContainer, kRoot, kExecutable, kWorkingDirectory, kControlGroup };

// What stands behind the beginning of a line, and the blanks behind that; null where no line
// begins so.
const char *FindLine(const char *text, const char *beginning) {
  const size_t length = strlen(beginning);
  while (strncmp(text, beginning, length) != 0) {
    text += strcspn(text, "\n");
    if (*text++ == '\0') return nullptr;
  }
  return text + length + strspn(text + length, " \t");
}

// Takes the next number of a line and the blanks behind it.
bool TakeNext(const char **place, uint64_t *number) {
  if (*place == nullptr || !TakeNumber(place, number)) return false;
  *place += strspn(*place, " \t");
  return true;
}

void PutStatus(const char *text, CartelIdentity *identity, uint64_t *known) {
  uint64_t number = 0;
  const char *users = FindLine(text, "Uid:");
  const char *groups = FindLine(text, "Gid:");
  bool is = TakeNext(&users, &number);
  identity->realUser = KnownNumber<uint32_t>(known, kRealUser, is, number);
  is = is && TakeNext(&users, &number);
  identity->effectiveUser = KnownNumber<uint32_t>(known, kEffectiveUser, is, number);
  is = TakeNext(&groups, &number);
  identity->realGroup = KnownNumber<uint32_t>(known, kRealGroup, is, number);
  is = is && TakeNext(&groups, &number);
  identity->effectiveGroup = KnownNumber<uint32_t>(known, kEffectiveGroup, is, number);
  const char *resident = FindLine(text, "VmRSS:");
  const char *peak = FindLine(text, "VmHWM:");
  is = TakeNext(&resident, &number) && number <= UINT64_MAX / 1024;
  identity->residentMemory = KnownNumber<uint64_t>(known, kResidentMemory, is, number * 1024);
  is = TakeNext(&peak, &number) && number <= UINT64_MAX / 1024;
  identity->peakMemory = KnownNumber<uint64_t>(known, kPeakMemory, is, number * 1024);
}

void PutOomAdjustment(int directory, CartelIdentity *identity, uint64_t *known) {
  constexpr uint64_t kMost = 1000;
  char text[32];
  uint64_t number;
  if (ReadBelow(directory, "oom_score_adj", text, sizeof(text)) != KIF_STATUS_OK) return;
  const char *place = text;
  const bool isNegative = *place == '-';
  if (isNegative) ++place;
  if (!TakeNumber(&place, &number) || number > kMost) return;
  const auto value = static_cast<int32_t>(number);
  identity->oomAdjustment = isNegative ? -value : value;
  Know(known, kOomAdjustment, true);
}

// A tree's links tell the inode alone, "net:[4026531840]".
void PutNamespaces(int directory, CartelIdentity *identity, uint64_t *known) {
  static constexpr const char *kLinks[] = {"ns/pid", "ns/net", "ns/mnt", "ns/user"};
  constexpr size_t kPlace = offsetof(CartelIdentity, pidNamespaceDevice);
  static_assert(sizeof(CartelIdentity) - kPlace == sizeof(kLinks) / sizeof(*kLinks) * 16);
  char *place = reinterpret_cast<char *>(identity) + kPlace;
  unsigned field = kFirstNamespace;
  for (const char *link : kLinks) {
    uint64_t ids[2] = {};
    struct stat facts;
    char target[64];
    if (IsForeignRoot()) {
      const bool read = ReadLinkBelow(directory, link, target, sizeof(target)) == KIF_STATUS_OK;
      const char *number = read ? strchr(target, '[') : nullptr;
      Know(known, field + 1, number != nullptr && TakeNumber(&++number, &ids[1]));
    } else if (fstatat(directory, link, &facts, 0) == 0) {
      ids[0] = facts.st_dev;
      ids[1] = facts.st_ino;
      Know(known, field, true);
      Know(known, field + 1, true);
    }
    memcpy(place, ids, sizeof(ids));
    place += sizeof(ids);
    field += 2;
  }
}

bool PutLink(int directory, const char *link, char *field, size_t size) {
  char target[PATH_MAX];
  size_t length;
  if (ReadLinkBelow(directory, link, target, sizeof(target), &length) != KIF_STATUS_OK) {
    return false;
  }
  CopyText(field, size, target, length);
  return length > 0;
}

// Container engines call a control group by the container's ID, 64 hexadecimal digits: the
// innermost counts.
bool PutContainer(const char *group, size_t length, char *field, size_t size) {
  constexpr size_t kIdLength = 64;
  const char *found = nullptr;
  for (const char *place = group; place < group + length;) {
    const size_t run = strspn(place, "0123456789abcdef");
    if (run == kIdLength) found = place;
    place += run > 0 ? run : 1;
  }
  if (found != nullptr) CopyText(field, size, found, kIdLength);
  return found != nullptr;
}

void PutControlGroup(int directory, CartelPaths *paths, uint64_t *known) {
  char text[8192];
  if (ReadBelow(directory, "cgroup", text, sizeof(text)) != KIF_STATUS_OK) return;
  const char *group = FindLine(text, "0::");
  if (group == nullptr) {
    group = strstr(text, ":name=systemd:");
    if (group != nullptr) group += strlen(":name=systemd:");
  }
  if (group == nullptr) return;
  const size_t length = strcspn(group, "\n");
  CopyText(paths->controlGroup, sizeof(paths->controlGroup), group, length);
  Know(known, kControlGroup, length > 0);
  Know(known, kContainer, PutContainer(group, length, paths->container, sizeof(paths->container)));
}

bool TakeLimit(const char **place, uint64_t *limit) {
  constexpr char kNone[] = "unlimited";
  if (*place == nullptr || strncmp(*place, kNone, strlen(kNone)) != 0) {
    return TakeNext(place, limit);
  }
  *limit = UINT64_MAX;
  *place += strlen(kNone);
  *place += strspn(*place, " ");
  return true;
}

}  // namespace

KIF_Status GetCartelIdentity(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *identity = static_cast<CartelIdentity *>(record);
  int directory;
  char text[8192];
  KIF_Status status = OpenProcessDirectory(Integer(instance, 0), false, &directory);
  if (status == KIF_STATUS_OK) status = ReadBelow(directory, "status", text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  uint64_t known = 0;
  PutStatus(text, identity, &known);
  PutOomAdjustment(directory, identity, &known);
  PutNamespaces(directory, identity, &known);
  identity->known = known;
  return KIF_STATUS_OK;
}

KIF_Status GetCartelPaths(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *paths = static_cast<CartelPaths *>(record);
  int directory;
  const KIF_Status status = OpenProcessDirectory(Integer(instance, 0), false, &directory);
  if (status != KIF_STATUS_OK) return status;
  uint64_t known = 0;
  Know(&known, kRoot, PutLink(directory, "root", paths->root, sizeof(paths->root)));
  Know(&known, kExecutable,
       PutLink(directory, "exe", paths->executable, sizeof(paths->executable)));
  Know(&known, kWorkingDirectory,
       PutLink(directory, "cwd", paths->workingDirectory, sizeof(paths->workingDirectory)));
  PutControlGroup(directory, paths, &known);
  paths->known = known;
  return KIF_STATUS_OK;
}

KIF_Status GetCartelLimits(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  static constexpr const char *kNames[] = {"Max open files", "Max processes", "Max address space",
                                           "Max core file size"};
  auto *limits = static_cast<CartelLimits *>(record);
  int directory;
  char text[4096];
  KIF_Status status = OpenProcessDirectory(Integer(instance, 0), false, &directory);
  if (status == KIF_STATUS_OK) status = ReadBelow(directory, "limits", text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  uint64_t values[sizeof(kNames) / sizeof(*kNames) * 2] = {};
  unsigned field = 0;
  uint64_t known = 0;
  for (const char *name : kNames) {
    const char *place = FindLine(text, name);
    const bool hasSoft = TakeLimit(&place, &values[field]);
    Know(&known, field, hasSoft);
    Know(&known, field + 1, hasSoft && TakeLimit(&place, &values[field + 1]));
    field += 2;
  }
  constexpr size_t kPlace = offsetof(CartelLimits, openFilesSoft);
  static_assert(sizeof(values) == sizeof(*limits) - kPlace);
  memcpy(reinterpret_cast<char *>(limits) + kPlace, values, sizeof(values));
  limits->known = known;
  return KIF_STATUS_OK;
}
