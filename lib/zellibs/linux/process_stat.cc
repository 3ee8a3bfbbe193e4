#include "linux/process_stat.h"

#include <cstring>

#include "linux/files.h"
#include "status.h"

namespace {

// Long enough for the fields up to starttime, with any name.
constexpr size_t kStatSize = 1024;

constexpr unsigned long kKernelThreadFlag = 0x00200000;  // PF_KTHREAD, include/linux/sched.h

bool TakeSigned(const char **text, int32_t *value) {
  while (**text == ' ') ++*text;
  const bool negative = **text == '-';
  if (negative) ++*text;
  uint64_t number;
  if (!TakeNumber(text, &number)) return false;
  *value = static_cast<int32_t>(negative ? 0 - number : number);
  return true;
}

bool TakeUnsigned(const char **text, uint64_t *value) {
  while (**text == ' ') ++*text;
  if (**text == '-') ++*text;
  return TakeNumber(text, value);
}

// See proc(5), /proc/pid/stat. The name may hold anything, ')' and blanks too.
bool ParseStat(const char *text, size_t length, Stat *stat) {
  const char *open = static_cast<const char *>(memchr(text, '(', length));
  const char *close = static_cast<const char *>(memrchr(text, ')', length));
  if (open == nullptr || close == nullptr || close < open || close[1] != ' ') return false;
  CopyText(stat->name, sizeof(stat->name), open + 1, static_cast<size_t>(close - open - 1));
  const char *place = close + 2;
  stat->state = *place;
  if (stat->state == '\0') return false;
  ++place;
  uint64_t skipped;
  uint64_t userTicks;
  uint64_t systemTicks;
  uint64_t flags;
  uint64_t threads;
  bool good = TakeSigned(&place, &stat->parent) && TakeSigned(&place, &stat->group) &&
              TakeSigned(&place, &stat->session) && TakeUnsigned(&place, &skipped) &&
              TakeUnsigned(&place, &skipped) && TakeUnsigned(&place, &flags);
  for (int field = 10; good && field <= 13; ++field) good = TakeUnsigned(&place, &skipped);
  good = good && TakeUnsigned(&place, &userTicks) && TakeUnsigned(&place, &systemTicks);
  for (int field = 16; good && field <= 19; ++field) good = TakeUnsigned(&place, &skipped);
  if (!good || !TakeUnsigned(&place, &threads)) return false;
  // A tree that somebody wrote need not have the rest.
  if (!TakeUnsigned(&place, &skipped) || !TakeUnsigned(&place, &stat->startTicks)) {
    stat->startTicks = kNoTicks;
  }
  stat->isKernel = (flags & kKernelThreadFlag) != 0;
  stat->cpuTicks = userTicks + systemTicks;
  stat->threads = static_cast<uint32_t>(threads);
  return true;
}

}  // namespace

KIF_Status ReadStat(int directory, const char *path, Stat *stat) {
  char text[kStatSize];
  size_t length;
  const KIF_Status status = ReadPieceBelow(directory, path, text, sizeof(text), &length);
  if (status != KIF_STATUS_OK) return status;
  return ParseStat(text, length, stat) ? KIF_STATUS_OK : KIF_STATUS_IO_ERROR;
}
