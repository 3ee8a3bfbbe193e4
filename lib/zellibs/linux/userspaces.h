// The userspaces of the machine: one for each PID namespace that has user processes.
#pragma once

#include <cstddef>

#include "linux/processes.h"
#include "zellibs.h"

// Reads the PID namespaces of `count` processes, ascending by ID, below `proc`, an open /proc, and
// fills their pidNamespace, userspace and treeParent.
KIF_Status AssignUserspaces(int proc, Process *processes, size_t count);
