// system_bootCmdLine, system_bootOption, system_bootMAC and system_bootOptionFiles.
#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "base/io.h"
#include "linux/files.h"
#include "linux/kernel_release.h"
#include "linux/linux_nodes.h"
#include "records/platform.h"

namespace {

constexpr size_t kCommandLineSize = sizeof(BootCommandLine::commandLine);

// The kernel's own limit is far lower on every architecture.
using CommandLine = char[16384];

KIF_Status ReadCommandLine(CommandLine &line) {
  size_t length;
  const KIF_Status status = ReadHostFile("/proc/cmdline", line, sizeof(line), &length);
  while (length > 0 && line[length - 1] == '\n') line[--length] = '\0';
  return status;
}

// The end of the word that begins at `word`: the next blank outside of double quotes.
const char *EndOfWord(const char *word) {
  bool quoted = false;
  for (; *word != '\0' && (quoted || *word != ' '); ++word) {
    if (*word == '"') quoted = !quoted;
  }
  return word;
}

// The value of the last word that begins with `key` ("audit="), or null; `*length` is its length.
const char *FindValue(const char *line, const char *key, size_t *length) {
  const size_t keyLength = strlen(key);
  const char *value = nullptr;
  while (*line != '\0') {
    const char *end = EndOfWord(line);
    if (strncmp(line, key, keyLength) == 0) {
      value = line + keyLength;
      *length = static_cast<size_t>(end - value);
    }
    line = *end == ' ' ? end + 1 : end;
  }
  return value;
}

bool HasValue(const char *line, const char *key, const char *wanted) {
  size_t length = 0;
  const char *value = FindValue(line, key, &length);
  return value != nullptr && length == strlen(wanted) && memcmp(value, wanted, length) == 0;
}

// The boot option files that have a name of their own, and the folder of those that don't; in the
// order of their paths.
constexpr char kEntries[] = "/boot/loader/entries/";
constexpr size_t kEntriesLength = sizeof(kEntries) - 1;
constexpr const char *kBefore[] = {"/boot/grub/grub.cfg"};
constexpr const char *kBehind[] = {"/etc/default/grub", "/etc/kernel/cmdline"};

// Whether a name in the folder of entries is that of a boot option file. Names that cannot be
// printed could not be asked for either.
bool IsEntryName(const char *name) {
  const size_t length = strlen(name);
  if (length < 6 || name[0] == '.' || strcmp(name + length - 5, ".conf") != 0) return false;
  char printed[256];
  CopyText(printed, sizeof(printed), name, length);
  return strchr(name, '/') == nullptr && strcmp(printed, name) == 0;
}

bool IsBootOptionFile(const char *path) {
  for (const char *known : kBefore) {
    if (strcmp(path, known) == 0) return true;
  }
  for (const char *known : kBehind) {
    if (strcmp(path, known) == 0) return true;
  }
  return strncmp(path, kEntries, kEntriesLength) == 0 && IsEntryName(path + kEntriesLength);
}

// What is no plain file has no content; without O_NONBLOCK a pipe would have us wait for it.
KIF_Status OpenBootOptionFile(const char *path, Descriptor *file, struct stat *facts) {
  if (!IsBootOptionFile(path)) return KIF_STATUS_NOT_FOUND;
  const KIF_Status status = OpenHostFile(path, O_RDONLY | O_NONBLOCK, file);
  if (status != KIF_STATUS_OK) return status;
  if (fstat(file->fd(), facts) != 0) return StatusOfErrno(errno);
  return S_ISREG(facts->st_mode) ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

bool IsPlainFile(const char *path) {
  Descriptor file;
  struct stat facts;
  return OpenHostFile(path, O_PATH, &file) == KIF_STATUS_OK && fstat(file.fd(), &facts) == 0 &&
         S_ISREG(facts.st_mode);
}

template <size_t Count>
KIF_Status ListExisting(const char *const (&paths)[Count], KIF_ParamList *list) {
  for (const char *path : paths) {
    if (!IsPlainFile(path)) continue;
    const KIF_Status status = KIF_ParamListAddString(list, path);
    if (status != KIF_STATUS_OK) return status;
  }
  return KIF_STATUS_OK;
}

int CompareTexts(const void *left, const void *right) {
  return strcmp(static_cast<const Param *>(left)->text, static_cast<const Param *>(right)->text);
}

// A folder that is not there or closed to the reader has nothing to list.
KIF_Status ListEntries(KIF_ParamList *list) {
  DirectoryReader entries;
  if (entries.Open(kEntries) != KIF_STATUS_OK) return KIF_STATUS_OK;
  const uint32_t first = CountOf(list);
  while (const char *name = entries.Next()) {
    if (!IsEntryName(name)) continue;
    char path[kEntriesLength + 256];
    snprintf(path, sizeof(path), "%s%s", kEntries, name);
    if (!IsPlainFile(path)) continue;
    const KIF_Status status = KIF_ParamListAddString(list, path);
    if (status != KIF_STATUS_OK) return status;
  }
  if (CountOf(list) > first) {
    qsort(list->params + first, CountOf(list) - first, sizeof(Param), CompareTexts);
  }
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status GetBootOption(const NodeInfo &, const KIF_ParamList *, void *record) {
  CommandLine line;
  const KIF_Status status = ReadCommandLine(line);
  if (status != KIF_STATUS_OK) return status;
  auto *option = static_cast<BootFlags *>(record);
  option->auditMode = HasValue(line, "audit=", "1");
  option->fsCheck = HasValue(line, "fsck.mode=", "force");
  return KIF_STATUS_OK;
}

// Boot loaders put the kernel's own file in front; where none did, there is the name that every
// distribution gives that file.
KIF_Status GetBootCommandLine(const NodeInfo &, const KIF_ParamList *, void *record) {
  static constexpr char kImage[] = "BOOT_IMAGE=";
  CommandLine line;
  KIF_Status status = ReadCommandLine(line);
  if (status != KIF_STATUS_OK) return status;
  auto *text = static_cast<char *>(record);
  if (strncmp(line, kImage, sizeof(kImage) - 1) == 0) {
    const char *kernel = line + sizeof(kImage) - 1;
    CopyText(text, kCommandLineSize, kernel, strlen(kernel));
    return KIF_STATUS_OK;
  }
  char release[65];
  status = ReadKernelRelease(release, sizeof(release));
  if (status != KIF_STATUS_OK) return status;
  const int length =
      snprintf(text, kCommandLineSize, "vmlinuz-%s%s", release, line[0] != '\0' ? " " : "");
  CopyText(text + length, kCommandLineSize - static_cast<size_t>(length), line, strlen(line));
  return KIF_STATUS_OK;
}

KIF_Status GetBootMac(const NodeInfo &, const KIF_ParamList *, void *record) {
  CommandLine line;
  const KIF_Status status = ReadCommandLine(line);
  if (status != KIF_STATUS_OK) return status;
  size_t length = 0;
  const char *address = FindValue(line, "BOOTIF=", &length);
  if (address != nullptr)
    CopyText(static_cast<char *>(record), sizeof(BootMac::address), address, length);
  return KIF_STATUS_OK;
}

KIF_Status ListBootOptionFiles(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ListExisting(kBefore, list);
  if (status == KIF_STATUS_OK) status = ListEntries(list);
  if (status == KIF_STATUS_OK) status = ListExisting(kBehind, list);
  return status;
}

KIF_Status GetBootOptionFileLength(const NodeInfo &, const KIF_ParamList *instance,
                                   uint32_t *length) {
  Descriptor file;
  struct stat facts;
  const KIF_Status status = OpenBootOptionFile(TextAt(instance, 0), &file, &facts);
  if (status != KIF_STATUS_OK) return status;
  constexpr off_t kMostBytes = 64 << 20;
  if (facts.st_size > kMostBytes) return KIF_STATUS_TOO_LARGE;
  *length = static_cast<uint32_t>(facts.st_size);
  return KIF_STATUS_OK;
}

KIF_Status ReadBootOptionFile(const NodeInfo &, const KIF_ParamList *instance, uint32_t offset,
                              uint32_t wanted, void *bytes, uint32_t *given) {
  Descriptor file;
  struct stat facts;
  const KIF_Status status = OpenBootOptionFile(TextAt(instance, 0), &file, &facts);
  if (status != KIF_STATUS_OK) return status;
  size_t read;
  const int error = ReadAt(file.fd(), bytes, wanted, static_cast<off_t>(offset), &read);
  *given = static_cast<uint32_t>(read);
  return error == 0 ? KIF_STATUS_OK : StatusOfErrno(error);
}
