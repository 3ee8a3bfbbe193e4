// system_ntpclock_upTime, sched_globalStats, sched_groups (load averages), the CPUs that a world
// may run on, and hardware_cpu.
#include <errno.h>
#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "base/own_process.h"
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

struct OnlineCpus {
  uint32_t count;
  uint32_t end;  // the highest number, plus 1
};

bool AddCpus(uint64_t first, uint64_t last, OnlineCpus *cpus) {
  if (last < first || last >= UINT32_MAX) return false;
  cpus->count += static_cast<uint32_t>(last - first + 1);
  cpus->end = std::max(cpus->end, static_cast<uint32_t>(last + 1));
  return true;
}

// Documentation/admin-guide/cputopology.rst: a list of ranges, "0-3,8".
bool ParseCpuList(const char *place, OnlineCpus *cpus) {
  uint64_t first;
  while (TakeNumber(&place, &first)) {
    uint64_t last = first;
    if (*place == '-') {
      ++place;
      if (!TakeNumber(&place, &last)) return false;
    }
    if (!AddCpus(first, last, cpus)) return false;
    if (*place != ',') break;
    ++place;
  }
  return cpus->count > 0;
}

// See proc(5), /proc/stat: a row for each CPU online, "cpu0 1 2 ...".
KIF_Status CountRowsOfCpus(OnlineCpus *cpus) {
  Descriptor file;
  Bytes text;
  KIF_Status status = OpenHostFile("/proc/stat", O_RDONLY, &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &text);
  if (status != KIF_STATUS_OK) return status;
  for (const char *line = text.text(); *line != '\0';) {
    const char *place = line + 3;
    uint64_t number;
    const bool isCpu = strncmp(line, "cpu", 3) == 0 && TakeNumber(&place, &number);
    if (isCpu && !AddCpus(number, number, cpus)) return KIF_STATUS_IO_ERROR;
    line += strcspn(line, "\n");
    if (*line != '\0') ++line;
  }
  return cpus->count > 0 ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

KIF_Status ReadOnlineCpus(OnlineCpus *cpus) {
  char text[4096];
  *cpus = {};
  const KIF_Status status = ReadHostFile("/sys/devices/system/cpu/online", text, sizeof(text));
  if (status == KIF_STATUS_NOT_FOUND) return CountRowsOfCpus(cpus);
  if (status != KIF_STATUS_OK) return status;
  return ParseCpuList(text, cpus) ? KIF_STATUS_OK : KIF_STATUS_IO_ERROR;
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

// Where the numbers are not those of this process's PID namespace, in a tree taken from elsewhere
// too, the kernel's own list stands in the thread's status.
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
  OnlineCpus cpus;
  const KIF_Status status = ReadOnlineCpus(&cpus);
  if (status == KIF_STATUS_OK) static_cast<PcpuRecord *>(record)->numPcpus = cpus.count;
  return status;
}

// Interrupts are counted under the CPUs' own numbers, so those offline have a place too.
KIF_Status GetCpuInfo(const NodeInfo &, const KIF_ParamList *, void *record) {
  OnlineCpus cpus;
  const KIF_Status status = ReadOnlineCpus(&cpus);
  if (status == KIF_STATUS_OK) static_cast<CpuInfo *>(record)->numPcpus = cpus.end;
  return status;
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
  static const bool hasOwnNumbers = !IsForeignRoot() && OwnProcessInProc() == getpid();
  return hasOwnNumbers ? ReadAllowedCpus(id, affinity->cpuText, sizeof(affinity->cpuText))
                       : ReadRecordedCpus(id, affinity->cpuText, sizeof(affinity->cpuText));
}
