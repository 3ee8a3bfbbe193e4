// system_version, and the build date of the kernel.
#include <sys/utsname.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "linux/files.h"
#include "linux/kernel_release.h"
#include "linux/linux_nodes.h"
#include "records/platform.h"

namespace {

using Field = char[sizeof(utsname::release)];

KIF_Status ReadLine(const char *path, Field &field) {
  const KIF_Status status = ReadHostFile(path, field, sizeof(field));
  field[strcspn(field, "\n")] = '\0';
  return status;
}

void CopyField(Field &field, const char *text, size_t length) {
  if (length >= sizeof(field)) length = sizeof(field) - 1;
  memcpy(field, text, length);
  field[length] = '\0';
}

// "Linux version 6.1.0-9-amd64 (builder@host) (gcc ...) #1 SMP ...": see proc(5), /proc/version.
KIF_Status ReadBanner(utsname *name) {
  char banner[1024];
  const KIF_Status status = ReadHostFile("/proc/version", banner, sizeof(banner));
  if (status != KIF_STATUS_OK) return status;
  banner[strcspn(banner, "\n")] = '\0';
  static constexpr char kVersion[] = " version ";
  const char *end = strstr(banner, kVersion);
  if (end == nullptr) return KIF_STATUS_IO_ERROR;
  const char *release = end + sizeof(kVersion) - 1;
  const char *number = strrchr(release, '#');
  CopyField(name->sysname, banner, static_cast<size_t>(end - banner));
  CopyField(name->release, release, strcspn(release, " "));
  CopyField(name->version, number != nullptr ? number : "", number != nullptr ? strlen(number) : 0);
  return KIF_STATUS_OK;
}

// uname() speaks of this machine alone; a tree of files has the same names in /proc.
KIF_Status ReadNames(utsname *name) {
  memset(name, 0, sizeof(*name));
  if (!IsForeignRoot()) return uname(name) == 0 ? KIF_STATUS_OK : KIF_STATUS_IO_ERROR;
  KIF_Status status = ReadLine("/proc/sys/kernel/ostype", name->sysname);
  if (status == KIF_STATUS_OK) status = ReadLine("/proc/sys/kernel/osrelease", name->release);
  if (status == KIF_STATUS_OK) status = ReadLine("/proc/sys/kernel/version", name->version);
  return status != KIF_STATUS_NOT_FOUND ? status : ReadBanner(name);
}

template <size_t Size>
void PutText(char (&field)[Size], const char *text) {
  CopyText(field, Size, text, strlen(text));
}

// Splits `text` at blanks and keeps the last `Count` words; false where there are fewer.
template <size_t Count>
bool LastWords(char *text, const char *(&words)[Count]) {
  char *end = text + strlen(text);
  for (size_t i = Count; i > 0; --i) {
    while (end > text && end[-1] == ' ') --end;
    *end = '\0';
    while (end > text && end[-1] != ' ') --end;
    words[i - 1] = end;
    if (*end == '\0') return false;
  }
  return true;
}

}  // namespace

KIF_Status ReadKernelRelease(char *release, size_t size) {
  utsname name;
  const KIF_Status status = ReadNames(&name);
  if (status == KIF_STATUS_OK) CopyText(release, size, name.release, strlen(name.release));
  return status;
}

KIF_Status GetVersion(const NodeInfo &, const KIF_ParamList *, void *record) {
  utsname name;
  const KIF_Status status = ReadNames(&name);
  if (status != KIF_STATUS_OK) return status;
  auto *version = static_cast<VersionRecord *>(record);
  PutText(version->product, name.sysname);
  PutText(version->version, name.release);
  PutText(version->releaseLevel, "Release");
  PutText(version->update, "0");
  const char *number = strchr(name.version, '#');
  uint64_t build = 0;
  if (number != nullptr) {
    ++number;
    if (TakeNumber(&number, &build) && build > INT32_MAX) build = INT32_MAX;
  }
  version->buildNumber = static_cast<int32_t>(build);
  return KIF_STATUS_OK;
}

// The version ends like "Fri Nov 22 15:44:03 UTC 2024". Builds that are meant to be reproducible
// have no date, and a tree of files may have no version at all: no reason to refuse the host.
KIF_Status GetKernelBuildDate(char *date) {
  constexpr size_t kDateSize = 21;
  static constexpr char kUnknown[] = "unknown";
  memcpy(date, kUnknown, sizeof(kUnknown));
  utsname name;
  const char *words[5];  // month, day, time, zone, year
  if (ReadNames(&name) != KIF_STATUS_OK || !LastWords(name.version, words)) {
    return KIF_STATUS_OK;
  }
  const size_t day = strlen(words[1]);
  if (strlen(words[0]) != 3 || day < 1 || day > 2 || strlen(words[2]) != 8 || words[2][2] != ':' ||
      strlen(words[4]) != 4) {
    return KIF_STATUS_OK;
  }
  snprintf(date, kDateSize, "%.3s %2.2s %.4s %.8s", words[0], words[1], words[4], words[2]);
  return KIF_STATUS_OK;
}
