// The network namespaces that visible processes are in, by number: 1 is the reader's own, the
// others have that of their inode.
#pragma once

#include <cstdint>

#include "linux/files.h"
#include "zellibs.h"

constexpr int64_t kOwnNetwork = 1;

struct Network {
  int64_t number;
  uint64_t device;
  uint64_t inode;   // 0 where a tree of files does not tell
  int32_t process;  // the first one that is in it; 0 where none is seen
};

// The namespace with a number, as it was when they were listed last.
KIF_Status FindNetwork(int64_t number, const Network **network);

// Opens the directory of a process in the namespace, or that of the reader.
KIF_Status OpenProcessIn(const Network &network, Descriptor *process);

// Opens a file of /proc/PID/net for reading.
KIF_Status OpenNetworkFile(const Network &network, const char *name, Descriptor *file);
