// uptime: the time of day, how long the host has been up, and its load averages.
#include <stdio.h>
#include <time.h>

#include "kif/kif.h"
#include "output.h"
#include "records/platform.h"
#include "tools.h"

namespace {

struct LoadHistory {
  KIF_NodeId node;
  int minutes;
};

constexpr int kHistories = 3;

void PrintTimeOfDay() {
  const time_t now = time(nullptr);
  const struct tm *local = localtime(&now);
  const struct tm midnight = {};
  if (local == nullptr) local = &midnight;
  printf(" %2d:%02d:%02d ", local->tm_hour, local->tm_min, local->tm_sec);
}

void UptimeFormat(uint32_t uptime) {
  const uint32_t days = uptime / 86400;
  const uint32_t hours = uptime / 3600 % 24;
  const uint32_t minutes = uptime / 60 % 60;
  printf("up ");
  if (days != 0) printf("%u days, ", days);
  printf("%02u:%02u:%02u, ", hours, minutes, uptime % 60);
}

// `loads` gets the three load figures, each in percent of one processor.
KIF_Status ReadLoads(uint32_t (&loads)[kHistories]) {
  const LoadHistory histories[kHistories] = {
      {KIF_NODE_sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory1MinInPct, 1},
      {KIF_NODE_sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory5MinInPct, 5},
      {KIF_NODE_sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory15MinInPct, 15},
  };
  const ParamListHandle group = CreateInstance();
  if (group == nullptr) {
    fputs("Failed to allocate inputparam.\n", Messages());
    return 1;
  }
  KIF_Status status = KIF_ParamListAddInt(group.get(), 0);
  if (status != 0) fputs("Failed to add inputparams.\n", Messages());
  for (int i = 0; i < kHistories && status == 0; ++i) {
    LoadHistoryRecord record = {};
    status = ReadRecord(histories[i].node, group.get(), &record);
    if (status != 0) {
      fprintf(Messages(), "Failed to get %d minute cpu load history.\n", histories[i].minutes);
    }
    loads[i] = record.loadInPct;
  }
  return status;
}

// The figure is in percent of one processor, the average in all of them.
double Average(uint32_t load, uint32_t numPcpus) {
  const uint32_t full = 100 * numPcpus;
  return full != 0 ? static_cast<double>(load) / full : 0.0;
}

KIF_Status LoadAverage() {
  PcpuRecord pcpus = {};
  KIF_Status status = ReadRecord(KIF_NODE_sched_globalStats_numPcpus, nullptr, &pcpus);
  if (status != 0) {
    fputs("Failed to get number of pcups.\n", Messages());
    return status;
  }
  uint32_t loads[kHistories] = {};
  status = ReadLoads(loads);
  if (status != 0) return status;
  printf("load average: %.2f, %.2f, %.2f\n", Average(loads[0], pcpus.numPcpus),
         Average(loads[1], pcpus.numPcpus), Average(loads[2], pcpus.numPcpus));
  return 0;
}

}  // namespace

int UptimeEntry(int, char **) {
  PrintTimeOfDay();
  UptimeRecord uptime = {};
  const KIF_Status status = ReadRecord(KIF_NODE_system_ntpclock_upTime, nullptr, &uptime);
  if (status != 0) {
    fputs("Failed to get ntpclock_uptime.\n", Messages());
    return static_cast<int>(status);
  }
  UptimeFormat(uptime.seconds);
  return static_cast<int>(LoadAverage());
}
