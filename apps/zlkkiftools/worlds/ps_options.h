// What the modules of ps share: the display options and the values that carry the selection and
// the column widths between them.
#pragma once

#include <stdint.h>

// A set of display options, one bit each.
using PsOptions = uint32_t;

enum PsOption : PsOptions {
  PS_GID = 1 << 0,
  PS_PCID = 1 << 1,
  PS_TYPE = 1 << 2,
  PS_STATE = 1 << 3,
  PS_TIME = 1 << 4,
  PS_VERBOSE = 1 << 5,
  PS_COMMAND = 1 << 6,
  PS_USERWORLDS_ONLY = 1 << 7,
  PS_PGID_SID = 1 << 8,
  PS_CARTELS_ONLY = 1 << 9,
  PS_SECURITY_DOMAIN = 1 << 10,
  PS_USERSPACE = 1 << 11,
  PS_TREE = 1 << 12,
  PS_SUMMARY = 1 << 13,
  PS_NCHILDREN = 1 << 14,
  PS_NTHREADS = 1 << 15,
  PS_ZOMBIES = 1 << 16,
};

extern uint32_t requestedUserspace;  // 0: no selection
extern uint32_t maxWorldID;          // of the records kept; the width of the ID columns
extern uint32_t maxNameLength;       // of the records kept, in bytes
extern int32_t deepestLevel;         // of the tree printed; a root is level 0
