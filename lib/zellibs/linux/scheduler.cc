// system_ntpclock_upTime, sched_globalStats, sched_groups (load averages) and hardware_cpu.
#include <cstring>

#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/platform.h"

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
  int64_t group;
  if (!IntegerAt(instance, 0, &group) || group != 0) return KIF_STATUS_NOT_FOUND;
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
