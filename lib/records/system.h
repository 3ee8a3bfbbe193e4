// The records of the machine as a whole, which recordings alone have (see worlds.h).
#pragma once

#include <stdint.h>

// Node system_os.
struct __attribute__((packed)) SystemOs {
  uint64_t known;
  char id[64];
  char name[128];
  char version[128];
  char vendor[128];  // of the machine, as the next ones
  char model[128];
  char firmwareVersion[128];
  char firmwareDate[32];
};

// Node system_serial.
struct __attribute__((packed)) SystemSerial {
  uint64_t known;
  char serial[128];
  char uuid[64];
};

// Node hardware_cpu_cpus, for a CPU number.
struct __attribute__((packed)) CpuFacts {
  uint64_t known;
  uint32_t family;
  uint32_t model;
  uint32_t stepping;  // or revision
  uint32_t microcode;
  uint32_t socket;
  uint32_t core;
  uint8_t online;
  char governor[32];
  char vendor[64];      // or implementer
  char modelName[128];  // or part
  char flags[4096];     // or features
};

// Node hardware_cpu_vulnerabilities, for a name.
struct __attribute__((packed)) CpuVulnerability {
  uint64_t known;
  char state[512];
};

// Node hardware_memory, for a row.
struct __attribute__((packed)) MemoryRow {
  uint64_t known;
  uint64_t value;  // in bytes; of a row without a unit the count
};

// Node system_pressure, for a resource and kind, "memory full".
struct __attribute__((packed)) PressureRow {
  uint64_t known;
  uint32_t average10;  // of 10 seconds, in hundredths of a percent, as the next ones
  uint32_t average60;
  uint32_t average300;
  uint64_t total;  // milliseconds
};

// Node system_counters, for a row: a value, or the times of a CPU in milliseconds.
struct __attribute__((packed)) CounterRow {
  uint64_t known;
  uint64_t value;
  uint64_t user;
  uint64_t nice;
  uint64_t system;
  uint64_t idle;
  uint64_t ioWait;
  uint64_t interrupt;
  uint64_t softInterrupt;
  uint64_t steal;
  uint64_t guest;
  uint64_t guestNice;
};
