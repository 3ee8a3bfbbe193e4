// The records of the in-memory file system: its volumes (tardisks, backed by archives, and
// ramdisks, backed by memory) and its inodes (see worlds.h).
#pragma once

#include <stddef.h>
#include <stdint.h>

struct __attribute__((packed)) TardiskStats {
  uint32_t used;  // bytes
  uint8_t unused4[4];
  uint32_t usedToBoot;  // lowest byte not 0: one of the modules that the host was booted from
  uint8_t unused12[16];
};

struct __attribute__((packed)) RamdiskStats {
  uint32_t minimum;   // MiB
  uint32_t maximum;   // MiB
  uint32_t used;      // pages of 4096 bytes
  uint32_t peakUsed;  // pages
  uint8_t unused16[164];
};

enum InodeFlags : uint32_t {
  kInodeOnTardisk = 0x1,   // else on a ramdisk
  kInodeUncharged = 0x40,  // its size counts as 0 bytes
};

constexpr int32_t kInodeUnlinked = -4;

struct __attribute__((packed)) InodeStats {
  uint8_t unused0[4];
  uint32_t flags;  // InodeFlags
  uint8_t unused8[12];
  int32_t linkState;  // kInodeUnlinked: no directory entry leads to it
  uint8_t unused24[4];
  uint32_t size;  // bytes
  char tardisk[128];
  char ramdisk[128];
  char name[256];
};
