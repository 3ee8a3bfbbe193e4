// The records of cartels that recordings alone have (see worlds.h).
#pragma once

#include <stdint.h>

// Node userworld_cartel_start, for a cartel ID.
struct __attribute__((packed)) CartelStart {
  uint64_t known;
  uint64_t start;  // milliseconds since the boot
};

constexpr uint64_t kCartelStartKnown = 0x1;

// Node userworld_cartel_identity, for a cartel ID.
struct __attribute__((packed)) CartelIdentity {
  uint64_t known;
  uint32_t realUser;
  uint32_t effectiveUser;
  uint32_t realGroup;
  uint32_t effectiveGroup;
  uint64_t residentMemory;  // in bytes
  uint64_t peakMemory;      // in bytes, resident
  int32_t oomAdjustment;
  uint64_t pidNamespaceDevice;
  uint64_t pidNamespace;  // an inode, as the next ones
  uint64_t netNamespaceDevice;
  uint64_t netNamespace;
  uint64_t mountNamespaceDevice;
  uint64_t mountNamespace;
  uint64_t userNamespaceDevice;
  uint64_t userNamespace;
};

// Node userworld_cartel_paths, for a cartel ID.
struct __attribute__((packed)) CartelPaths {
  uint64_t known;
  char container[72];
  char root[256];
  char executable[512];
  char workingDirectory[512];
  char controlGroup[1024];
};

// Node userworld_cartel_limits, for a cartel ID. The largest number is no limit.
struct __attribute__((packed)) CartelLimits {
  uint64_t known;
  uint64_t openFilesSoft;
  uint64_t openFilesHard;
  uint64_t processesSoft;
  uint64_t processesHard;
  uint64_t memorySoft;  // address space, in bytes
  uint64_t memoryHard;
  uint64_t coreSoft;  // in bytes
  uint64_t coreHard;
};
