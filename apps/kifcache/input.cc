#include "input.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string>
#include <string_view>

#include "gzip.h"
#include "messages.h"
#include "status.h"

namespace {

// A text takes more than its recording.
constexpr size_t kMostText = 2 * kMostFileBytes;

std::string_view View(const FileBytes &bytes) {
  return {reinterpret_cast<const char *>(bytes.map), bytes.size};
}

// What kifcache does not expand itself: the first bytes, the name, and what expands it.
struct Compression {
  std::string_view magic;
  const char *name;
  const char *command;
};
constexpr Compression kCompressions[] = {
    {"\x28\xb5\x2f\xfd", "zstd", "zstdcat"},
    {"\xfd\x37zXZ", "xz", "xzcat"},
    {"BZh", "bzip2", "bzcat"},
    {"\x04\x22\x4d\x18", "lz4", "lz4cat"},
    {"LZIP", "lzip", "lzip -dc"},
    {"\x1f\x9d", "compress", "zcat"},
    {"PK\x03\x04", "zip", "unzip -p"},
};

// What is to be done about something that is no recording; empty: nothing is known.
std::string AdviceOnOther(const char *path, std::string_view bytes) {
  const bool isFile = !IsStandardStream(path);
  const std::string name = isFile ? path : "";
  for (const Compression &known : kCompressions) {
    if (!bytes.starts_with(known.magic)) continue;
    return std::string("compressed with ") + known.name + ": " + known.command +
           (isFile ? " " + name : "") + " | kifcache check -";
  }
  for (const char *beginning : {"host ", "list ", "record ", "content ", "#"}) {
    if (!bytes.starts_with(beginning)) continue;
    return "a text: kifcache build " + (isFile ? name : "-") + " FILE makes a recording of it";
  }
  struct stat status;
  if (isFile && stat(path, &status) == 0 && !S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) {
    return "only - waits for a pipe";
  }
  return "";
}

std::string Advice(const char *path, KIF_Status status, const FileBytes &bytes) {
  switch (status) {
    case KIF_STATUS_NO_PERMISSION:
      return "its owner and root can read it";
    case KIF_STATUS_TOO_LARGE:
      return "a recording has less than 2 GiB";
    case KIF_STATUS_DAMAGED_CACHE_FILE:
      return "copy or record it again";
    case KIF_STATUS_CACHE_VERSION:
      // The version has been verified before it is refused.
      return "a kifcache for file format " +
             std::to_string(flatbuffers::GetRoot<cache::Version>(bytes.map)->major_version()) +
             ".x reads it, this one is for " + std::to_string(kCacheMajorVersion) + ".x";
    case KIF_STATUS_NOT_A_CACHE_FILE:
      return AdviceOnOther(path, View(bytes));
    default:
      return "";
  }
}

// Puts the expanded bytes in the place of those of a gzip file.
bool Expand(const char *path, FileBytes *bytes) {
  FileBytes expanded = {};
  const char *problem = Gunzip(*bytes, &expanded);
  if (problem != nullptr) return Complain(InputName(path), problem);
  ReleaseFileBytes(bytes);
  *bytes = expanded;
  return true;
}

bool Open(const char *path, FileBytes *bytes, CacheFile *file) {
  if (IsStandardStream(path) && isatty(STDIN_FILENO) == 1) {
    return Complain(InputName(path), "a terminal: name a file, or send a recording through a pipe");
  }
  KIF_Status status = OpenFileBytes(IsStandardStream(path) ? kStandardInput : path, bytes);
  if (status == KIF_STATUS_OK && IsGzip(*bytes) && !Expand(path, bytes)) return false;
  if (status == KIF_STATUS_OK) status = OpenCacheBytes(*bytes, file);
  if (status == KIF_STATUS_OK) return true;
  const std::string advice = Advice(path, status, *bytes);
  const std::string reason = ZLK_ReturnStatusToString(status);
  return Complain(InputName(path), advice.empty() ? reason : reason + ": " + advice);
}

}  // namespace

InputRecording::InputRecording(const char *path) {
  FileBytes bytes = {};
  isOpen_ = Open(path, &bytes, &file_);
  if (!isOpen_) ReleaseFileBytes(&bytes);
}

bool IsStandardStream(const char *path) {
  return strcmp(path, "-") == 0;
}

const char *InputName(const char *path) {
  return IsStandardStream(path) ? "standard input" : path;
}

bool InputText::Read(const char *path) {
  const bool isInput = IsStandardStream(path) || strcmp(path, kStandardInput) == 0;
  const int descriptor = isInput ? STDIN_FILENO : open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  struct stat status;
  if (!isInput && descriptor != -1 && fstat(descriptor, &status) == 0 && !S_ISREG(status.st_mode) &&
      !S_ISDIR(status.st_mode)) {
    close(descriptor);
    return Complain(path, "not a regular file: only - waits for a pipe");
  }
  const int error = descriptor == -1 ? errno : read_.ReadAll(descriptor, kMostText);
  if (!isInput && descriptor != -1) close(descriptor);
  if (error != 0) return Complain(InputName(path), strerror(error));
  const FileBytes bytes = {reinterpret_cast<const uint8_t *>(read_.text()), read_.size()};
  const char *problem = IsGzip(bytes) ? Gunzip(bytes, &expanded_) : nullptr;
  if (problem != nullptr) return Complain(InputName(path), problem);
  if (text().size() < kLeastFileBytes || text().substr(4, 4) != cache::FileIdentifier())
    return true;
  return Complain(InputName(path), "a recording, and no text: kifcache dump prints one");
}
