// The records of the nodes that tell of the machine as a whole (see worlds.h).
#pragma once

#include <stddef.h>
#include <stdint.h>

// KIF_NODE_system_ntpclock_upTime.
struct __attribute__((packed)) UptimeRecord {
  uint32_t seconds;
  uint8_t unused4[4];
};
static_assert(sizeof(UptimeRecord) == 8);
static_assert(offsetof(UptimeRecord, seconds) == 0);

// KIF_NODE_sched_globalStats_numPcpus.
struct __attribute__((packed)) PcpuRecord {
  uint8_t unused0[4];
  uint32_t numPcpus;
  uint8_t unused8[4];
};
static_assert(sizeof(PcpuRecord) == 12);
static_assert(offsetof(PcpuRecord, numPcpus) == 4);

// KIF_NODE_sched_groups_stats_cpuStatsDir_cpuLoadHistory_*, for a group.
struct __attribute__((packed)) LoadHistoryRecord {
  uint8_t unused0[4];
  uint32_t loadInPct;
  uint8_t unused8[136];
};
static_assert(sizeof(LoadHistoryRecord) == 144);
static_assert(offsetof(LoadHistoryRecord, loadInPct) == 4);

// KIF_NODE_hardware_cpu_cpuInfo.
struct __attribute__((packed)) CpuInfo {
  uint8_t unused0[16];
  uint32_t numPcpus;
  uint8_t unused20[16];
};
static_assert(sizeof(CpuInfo) == 36);
static_assert(offsetof(CpuInfo, numPcpus) == 16);

// KIF_NODE_hardware_interrupts_cookieList_UsageStatus, for an interrupt cookie.
struct __attribute__((packed)) UsageStatus {
  uint8_t unused0[8];
  uint8_t usage;  // 0: a device of the kernel itself
  uint8_t unused9[3];
};
static_assert(sizeof(UsageStatus) == 12);
static_assert(offsetof(UsageStatus, usage) == 8);

// KIF_NODE_hardware_interrupts_cookieList_PCPU, for an interrupt cookie and a PCPU number.
struct __attribute__((packed)) PcpuCount {
  uint64_t count;
};
static_assert(sizeof(PcpuCount) == 8);

constexpr size_t kAcpiSignatureLength = 4;

// KIF_NODE_hardware_acpi_tables_buffers, for a table and the place of a piece of it.
struct __attribute__((packed)) TableBuffer {
  char signature[kAcpiSignatureLength + 1];  // the kernel does not end it
  uint32_t length;                           // bytes of `data`
  uint8_t data[131075];
};
static_assert(sizeof(TableBuffer) == 131084);
static_assert(offsetof(TableBuffer, length) == 5);
static_assert(offsetof(TableBuffer, data) == 9);

// KIF_NODE_hardware_chipset_rtc.
struct __attribute__((packed)) ClockRecord {
  int32_t hour;
  int32_t minute;
  int32_t second;
  int32_t day;
  int32_t month;
  int32_t year;
  uint8_t unused24[8];
};
static_assert(sizeof(ClockRecord) == 32);
static_assert(offsetof(ClockRecord, hour) == 0);
static_assert(offsetof(ClockRecord, minute) == 4);
static_assert(offsetof(ClockRecord, second) == 8);
static_assert(offsetof(ClockRecord, day) == 12);
static_assert(offsetof(ClockRecord, month) == 16);
static_assert(offsetof(ClockRecord, year) == 20);

// KIF_NODE_system_version.
struct __attribute__((packed)) VersionRecord {
  char product[32];
  char version[64];
  char releaseLevel[64];
  char update[132];
  int32_t buildNumber;
  uint8_t unused296[16];
};
static_assert(sizeof(VersionRecord) == 312);
static_assert(offsetof(VersionRecord, product) == 0);
static_assert(offsetof(VersionRecord, version) == 32);
static_assert(offsetof(VersionRecord, releaseLevel) == 96);
static_assert(offsetof(VersionRecord, update) == 160);
static_assert(offsetof(VersionRecord, buildNumber) == 292);

// KIF_NODE_system_bootOption.
struct __attribute__((packed)) BootFlags {
  uint8_t auditMode;
  uint8_t fsCheck;
  uint8_t rollback;
  uint8_t unused3;
};
static_assert(sizeof(BootFlags) == 4);
static_assert(offsetof(BootFlags, auditMode) == 0);
static_assert(offsetof(BootFlags, fsCheck) == 1);
static_assert(offsetof(BootFlags, rollback) == 2);

// KIF_NODE_system_bootCmdLine: the kernel and, after a blank, its options.
struct __attribute__((packed)) BootCommandLine {
  char text[4096];
};
static_assert(sizeof(BootCommandLine) == 4096);

// KIF_NODE_system_bootMAC.
struct __attribute__((packed)) BootMac {
  char address[24];  // empty: not booted over the network
};
static_assert(sizeof(BootMac) == 24);

// A request for a piece of a content, the input of KIF_SetData.
struct __attribute__((packed)) ContentRequest {
  uint32_t offset;  // bytes
  uint32_t wanted;  // bytes
};
static_assert(sizeof(ContentRequest) == 8);
static_assert(offsetof(ContentRequest, offset) == 0);
static_assert(offsetof(ContentRequest, wanted) == 4);
