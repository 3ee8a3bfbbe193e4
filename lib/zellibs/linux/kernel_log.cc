// system_log: the newest of the kernel's ring buffer, as /dev/kmsg has it.
#include <errno.h>
#include <fcntl.h>

#include <algorithm>
#include <cstring>

#include "base/bytes.h"
#include "base/everlasting.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"

namespace {

constexpr size_t kMostLog = size_t{256} << 10;
constexpr size_t kMostRecords = size_t{1} << 20;  // of a kernel that goes on writing

// The log when its length was asked for last.
struct KernelLog {
  bool read = false;
  Bytes text;
};

Everlasting<KernelLog> snapshot;

// Leaves the newest records, whole ones.
void KeepNewest(Bytes *text) {
  if (text->size() <= kMostLog) return;
  const char *begin = text->text() + text->size() - kMostLog;
  // A record ends at a newline; the lines that go on with it begin with a blank.
  do {
    begin += strcspn(begin, "\n");
    if (*begin != '\0') ++begin;
  } while (*begin == ' ');
  const auto kept = static_cast<size_t>(text->text() + text->size() - begin);
  memmove(text->data(), begin, kept);
  text->Truncate(kept);
}

// One record a read. What was overwritten meanwhile (EPIPE) is skipped; at the end it would block.
KIF_Status ReadLog() {
  char record[8192];
  Descriptor file;
  snapshot->read = false;
  snapshot->text.Clear();
  if (IsForeignRoot()) return KIF_STATUS_NOT_FOUND;
  const KIF_Status status = OpenHostFile("/dev/kmsg", O_RDONLY | O_NONBLOCK, &file);
  if (status != KIF_STATUS_OK) return status;
  for (size_t i = 0; i < kMostRecords; ++i) {
    const ssize_t got = read(file.fd(), record, sizeof(record));
    if (got == 0 || (got < 0 && errno == EAGAIN)) break;
    if (got < 0 && errno != EPIPE && errno != EINTR) return StatusOfErrno(errno);
    if (got < 0) continue;
    if (snapshot->text.size() > 2 * kMostLog) KeepNewest(&snapshot->text);
    if (!snapshot->text.Append(record, static_cast<size_t>(got))) return KIF_STATUS_NO_MEMORY;
  }
  KeepNewest(&snapshot->text);
  snapshot->read = true;
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status GetLogLength(const NodeInfo &, const KIF_ParamList *, uint32_t *length) {
  const KIF_Status status = ReadLog();
  *length = static_cast<uint32_t>(snapshot->text.size());
  return status;
}

KIF_Status ReadLogText(const NodeInfo &, const KIF_ParamList *, uint32_t offset, uint32_t wanted,
                       void *bytes, uint32_t *given) {
  const KIF_Status status = snapshot->read ? KIF_STATUS_OK : ReadLog();
  if (status != KIF_STATUS_OK) return status;
  const size_t size = snapshot->text.size();
  const size_t left = offset < size ? size - offset : 0;
  *given = static_cast<uint32_t>(std::min(left, size_t{wanted}));
  if (*given > 0) memcpy(bytes, snapshot->text.text() + offset, *given);
  return KIF_STATUS_OK;
}
