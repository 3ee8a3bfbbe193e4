// The file systems that are mounted and can be reached.
#pragma once

#include <cstddef>
#include <cstdint>

#include "base/array.h"
#include "linux/files.h"

struct Mount {
  uint64_t id;
  uint64_t parent;
  uint32_t major;
  uint32_t minor;
  const char *root;     // what of the file system is mounted, "/" for all of it
  const char *point;    // where, absolute
  const char *type;     // "tmpfs"
  const char *source;   // a device, a server, or what the file system calls it
  const char *options;  // of the file system as a whole
  const char *ownOptions;
  bool hidden;  // something else is mounted over it
};

struct MountTable {
  Array<Mount> mounts;  // in the order of their points
  Bytes text;           // holds the texts
};

// Reads the mounts that this process sees afresh.
KIF_Status ReadMounts(MountTable *table);
