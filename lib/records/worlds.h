// The records of worlds and cartels. All records are the wire format between the platform library
// and the program: packed and little-endian; the bytes named unused are the kernel's own.
#pragma once

#include <stddef.h>
#include <stdint.h>

// KIF_NODE_world_info, for a world ID; a cartel ID gives the cartel's main world.
struct __attribute__((packed)) WorldInfo {
  uint32_t worldID;
  int32_t groupID;
  uint32_t userspaceID;    // 0: none
  uint32_t cartelID;       // 0: a kernel world
  int32_t parentCartelID;  // 0: the root of its userspace
  int32_t processGroupID;
  int32_t sessionID;
  uint32_t worldType;  // set of WorldType bits
  unsigned char unused32[13];
  int32_t securityDomain;
  unsigned char unused49[23];
};

enum WorldType : uint32_t {
  kWorldTypeSystem = 0x1,
  kWorldTypeIdle = 0x2,
  kWorldTypeUser = 0x4,
  kWorldTypeVmm = 0x8,
  kWorldTypeHelper = 0x10,
  kWorldTypeClone = 0x20,  // a thread of the world under which it hangs
  kWorldTypeTest = 0x40,
  kWorldTypeAssistant = 0x100,
};

// KIF_NODE_world_name, for a world or cartel ID.
struct __attribute__((packed)) WorldName {
  char name[128];
};

// KIF_NODE_sched_Vcpus_stats_summaryStats, for a world ID. The states are places in the library's
// state tables.
struct __attribute__((packed)) SchedSummary {
  unsigned char unused0[4];
  uint32_t runState;
  uint32_t waitState;
  unsigned char unused12[236];
};

// KIF_NODE_sched_Vcpus_stats_affinity, for a world ID. The text has no length of its own: it may
// fill the record.
struct __attribute__((packed)) SchedAffinity {
  char cpuText[2304];
};

// KIF_NODE_sched_Vcpus_stats_stateTimes, for a world ID.
struct __attribute__((packed)) SchedStateTimes {
  unsigned char unused0[8];
  uint64_t usedTime;  // in microseconds
  unsigned char unused16[104];
};

// KIF_NODE_userworld_cartel_cmdline, for a cartel ID: the program and its arguments, separated by
// blanks.
struct __attribute__((packed)) CartelCommandLine {
  char cmdline[1024];
};

// KIF_NODE_userworld_cartel_child, for a cartel ID and one of its child cartel IDs.
struct __attribute__((packed)) ChildRecord {
  unsigned char unused0[4];
  int32_t childState;  // kChildStateZombie, or anything else
  unsigned char unused8[20];
};

constexpr int32_t kChildStateZombie = 1;

// KIF_NODE_userworld_cartel_fd_fds, for a cartel ID and a descriptor number.
struct __attribute__((packed)) DescriptorRecord {
  unsigned char unused0[4];
  char kind[96];
  char description[1984];
};

// KIF_NODE_userworld_cartel_mem_mmaps, for a cartel ID and a mapping of its list.
struct __attribute__((packed)) MappingRecord {
  unsigned char unused0[8];
  uint32_t length;  // in bytes
  unsigned char unused12[4];
  uint32_t kind;        // kMappingOfFile, or anything else
  uint32_t protection;  // set of kMappingReadable, kMappingWritable
  int32_t descriptor;
  char description[2008];
};

constexpr uint32_t kMappingOfFile = 2;
constexpr uint32_t kMappingReadable = 0x1;
constexpr uint32_t kMappingWritable = 0x2;
