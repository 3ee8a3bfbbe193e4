// The records of the nodes that tell of the machine as a whole (see worlds.h).
#pragma once

#include <stddef.h>
#include <stdint.h>

// KIF_NODE_system_ntpclock_upTime.
struct __attribute__((packed)) UptimeRecord {
  uint32_t seconds;
  uint8_t unused4[4];
};

// KIF_NODE_sched_globalStats_numPcpus.
struct __attribute__((packed)) PcpuRecord {
  uint8_t unused0[4];
  uint32_t numPcpus;
  uint8_t unused8[4];
};

// KIF_NODE_sched_groups_stats_cpuStatsDir_cpuLoadHistory_*, for a group.
struct __attribute__((packed)) LoadHistoryRecord {
  uint8_t unused0[4];
  uint32_t loadInPct;
  uint8_t unused8[136];
};

// KIF_NODE_hardware_cpu_cpuInfo.
struct __attribute__((packed)) CpuInfo {
  uint8_t unused0[16];
  uint32_t numPcpus;
  uint8_t unused20[16];
};

// KIF_NODE_hardware_interrupts_cookieList_UsageStatus, for an interrupt cookie.
struct __attribute__((packed)) UsageStatus {
  uint8_t unused0[8];
  uint8_t usage;  // 0: a device of the kernel itself
  uint8_t unused9[3];
};

// KIF_NODE_hardware_interrupts_cookieList_PCPU, for an interrupt cookie and a PCPU number.
struct __attribute__((packed)) PcpuCount {
  uint64_t count;
};

constexpr size_t kAcpiSignatureLength = 4;

// KIF_NODE_hardware_acpi_tables_buffers, for a table and the place of a piece of it.
struct __attribute__((packed)) TableBuffer {
  char signature[kAcpiSignatureLength];
  uint8_t unused4[1];
  uint32_t length;  // bytes of `data`
  uint8_t data[131075];
};

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

// KIF_NODE_system_version.
struct __attribute__((packed)) VersionRecord {
  char product[32];
  char version[64];
  char releaseLevel[64];
  char update[132];
  int32_t buildNumber;
  uint8_t unused296[16];
};

// KIF_NODE_system_bootOption.
struct __attribute__((packed)) BootFlags {
  uint8_t auditMode;
  uint8_t fsCheck;
  uint8_t rollback;
  uint8_t unused3;
};

// KIF_NODE_system_bootCmdLine: the kernel and, after a blank, its options.
struct __attribute__((packed)) BootCommandLine {
  char commandLine[4096];
};

// KIF_NODE_system_bootMAC.
struct __attribute__((packed)) BootMac {
  char address[24];  // empty: not booted over the network
};

// A request for a piece of a content, the input of KIF_SetData.
struct __attribute__((packed)) ContentRequest {
  uint32_t offset;  // bytes
  uint32_t wanted;  // bytes
};
