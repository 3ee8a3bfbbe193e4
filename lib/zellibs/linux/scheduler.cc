// system_ntpclock_upTime, sched_globalStats, sched_groups (load averages), the CPUs that a world
// may run on, and hardware_cpu.
#include <errno.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>

#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "linux/processes.h"
#include "records/platform.h"
#include "records/worlds.h"

namespace {

// A load average as it stands in /proc/loadavg, "0.25", times 100.
bool TakeHundredths(const char **text, uint32_t *hundredths) {
  uint64_t whole;
  uint64_t fraction;
  if (!TakeNumber(text, &whole) || **text != '.') return false;
  ++*text;
  const char *start = *text;
  if (!TakeNumber(text, &fraction) || *text - start != 2) return false;
  *hundredths = static_cast<uint32_t>(whole * 100 + fraction);
  return true;
}

// Documentation/admin-guide/cputopology.rst: a list of ranges, "0-3,8".
KIF_Status CountOnlineCpus(uint32_t *online) {
  char text[4096];
  const KIF_Status status = ReadHostFile("/sys/devices/system/cpu/online", text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  const char *place = text;
  uint64_t first;
  *online = 0;
  while (TakeNumber(&place, &first)) {
    uint64_t last = first;
    if (*place == '-') {
      ++place;
      if (!TakeNumber(&place, &last) || last < first) return KIF_STATUS_IO_ERROR;
    }
    *online += static_cast<uint32_t>(last - first + 1);
    if (*place != ',') break;
    ++place;
  }
  return *online > 0 ? KIF_STATUS_OK : KIF_STATUS_IO_ERROR;
}

template <typename Record>
KIF_Status PutOnlineCpus(Record *record) {
  uint32_t online;
  const KIF_Status status = CountOnlineCpus(&online);
  if (status == KIF_STATUS_OK) record->numPcpus = online;
  return status;
}

// A mask of CPUs as a list of ranges.
void FormatCpus(const unsigned char *mask, size_t maskSize, char *text, size_t size) {
  const auto isSet = [&](size_t cpu) {
    return cpu < maskSize * 8 && (mask[cpu / 8] >> (cpu % 8) & 1) != 0;
  };
  size_t length = 0;
  text[0] = '\0';
  for (size_t first = 0; first < maskSize * 8; ++first) {
    if (!isSet(first)) continue;
    size_t last = first;
    while (isSet(last + 1)) ++last;
    const char *comma = length > 0 ? "," : "";
    const int wanted =
        first == last ? snprintf(text + length, size - length, "%s%zu", comma, first)
                      : snprintf(text + length, size - length, "%s%zu-%zu", comma, first, last);
    if (wanted < 0 || static_cast<size_t>(wanted) >= size - length) {
      text[length] = '\0';
      return;
    }
    length += static_cast<size_t>(wanted);
    first = last;
  }
}

// In a tree taken from elsewhere the kernel's own list stands in the thread's status.
KIF_Status ReadRecordedCpus(int64_t thread, char *text, size_t size) {
  const Thread *found;
  const Process *process;
  KIF_Status read = FindThread(thread, ThreadValue::kCpus, &found, &process);
  if (read != KIF_STATUS_OK) return read;
  char path[64];
  char status[8192];
  snprintf(path, sizeof(path), "/proc/%d/task/%d/status", process->id, found->id);
  read = ReadHostFile(path, status, sizeof(status));
  if (read == KIF_STATUS_NOT_FOUND && process->id == found->id) {
    snprintf(path, sizeof(path), "/proc/%d/status", process->id);
    read = ReadHostFile(path, status, sizeof(status));
  }
  if (read != KIF_STATUS_OK) return read;
  static constexpr char kKey[] = "\nCpus_allowed_list:\t";
  const char *list = strstr(status, kKey);
  if (list == nullptr) return KIF_STATUS_NOT_FOUND;
  list += sizeof(kKey) - 1;
  CopyText(text, size, list, strcspn(list, "\n"));
  return KIF_STATUS_OK;
}

// The threads of a machine mostly may run on the same CPUs, so the last list is kept.
KIF_Status ReadAllowedCpus(int64_t id, char *text, size_t size) {
  if (id <= 0 || id > INT32_MAX) return KIF_STATUS_NOT_FOUND;
  unsigned char mask[8192 / 8] = {};  // NR_CPUS is at most 8192
  static unsigned char lastMask[sizeof(mask)];
  static char lastText[sizeof(SchedAffinity::cpuText)];
  // The system call itself tells how much of the mask the kernel has; libc's wrapper does not.
  const long given = syscall(SYS_sched_getaffinity, static_cast<pid_t>(id), sizeof(mask), mask);
  if (given < 0) return StatusOfErrno(errno);
  if (lastText[0] == '\0' || memcmp(mask, lastMask, sizeof(mask)) != 0) {
    memcpy(lastMask, mask, sizeof(mask));
    FormatCpus(mask, static_cast<size_t>(given), lastText, sizeof(lastText));
  }
  snprintf(text, size, "%s", lastText);
  return KIF_STATUS_OK;
}

}  // namespace

// See proc(5), /proc/uptime: seconds with two decimals.
KIF_Status GetUpTime(const NodeInfo &, const KIF_ParamList *, void *record) {
  char text[64];
  const KIF_Status status = ReadHostFile("/proc/uptime", text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  const char *place = text;
  uint64_t seconds;
  if (!TakeNumber(&place, &seconds)) return KIF_STATUS_IO_ERROR;
  static_cast<UptimeRecord *>(record)->seconds = static_cast<uint32_t>(seconds);
  return KIF_STATUS_OK;
}

KIF_Status GetNumPcpus(const NodeInfo &, const KIF_ParamList *, void *record) {
  return PutOnlineCpus(static_cast<PcpuRecord *>(record));
}

KIF_Status GetCpuInfo(const NodeInfo &, const KIF_ParamList *, void *record) {
  return PutOnlineCpus(static_cast<CpuInfo *>(record));
}

// The whole machine is group 0; there are no others.
KIF_Status GetLoadHistory(const NodeInfo &node, const KIF_ParamList *instance, void *record) {
  if (Integer(instance, 0) != 0) return KIF_STATUS_NOT_FOUND;
  char text[128];
  const KIF_Status status = ReadHostFile("/proc/loadavg", text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  const size_t wanted =
      IndexOf(node) - kNode_sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory1MinInPct;
  const char *place = text;
  for (size_t i = 0; i < 3; ++i) {
    uint32_t hundredths;
    if (!TakeHundredths(&place, &hundredths)) return KIF_STATUS_IO_ERROR;
    if (i == wanted) static_cast<LoadHistoryRecord *>(record)->loadInPct = hundredths;
    while (*place == ' ') ++place;
  }
  return KIF_STATUS_OK;
}

// As a list, "0-3,8".
KIF_Status GetAffinity(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *affinity = static_cast<SchedAffinity *>(record);
  const int64_t id = instance->params[0].integer;
  return IsForeignRoot() ? ReadRecordedCpus(id, affinity->cpuText, sizeof(affinity->cpuText))
                         : ReadAllowedCpus(id, affinity->cpuText, sizeof(affinity->cpuText));
}
