// The records of disks and mounts, which recordings alone have (see worlds.h).
#pragma once

#include <stdint.h>

// Node storage_disks, for a block device that is no partition. Times in milliseconds.
struct __attribute__((packed)) StorageDisk {
  uint64_t known;
  uint64_t size;  // in bytes
  uint8_t rotational;
  uint8_t removable;
  uint8_t readOnly;
  uint64_t reads;  // completed since the boot, as the next ones
  uint64_t writes;
  uint64_t bytesRead;
  uint64_t bytesWritten;
  uint64_t busyTime;  // with requests under way
  char scheduler[32];
  char pciFunction[16];  // the one that it stands behind, "0000:00:1f.2"
  char model[64];
};

// Node storage_serials, for the same.
struct __attribute__((packed)) StorageSerial {
  uint64_t known;
  char serial[64];
  char worldWideName[128];
};

// Node storage_mounts, for a mount point.
struct __attribute__((packed)) StorageMount {
  uint64_t known;
  char type[64];
  char device[1024];   // or server, or whatever the file system calls its source
  char options[4096];  // of the mount, then of the file system
};

// Node storage_mounts_size, for a mount point. A file system that counts no blocks, or no inodes,
// does not know them.
struct __attribute__((packed)) StorageMountSize {
  uint64_t known;
  uint64_t size;  // in bytes, as the next ones
  uint64_t used;
  uint64_t available;  // to users without privileges
  uint64_t inodesUsed;
  uint64_t inodesFree;
};
