#include "linux/userspaces.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "base/array.h"
#include "linux/files.h"
#include "status.h"

namespace {

struct Userspace {
  uint64_t pidNamespace;
  uint32_t root;   // place of its root among the processes; kNoRoot
  uint32_t first;  // place of its first process
};

constexpr uint32_t kNoRoot = UINT32_MAX;

// The number in the target of a namespace link, "pid:[4026531836]"; 0 where it may not be read.
uint64_t ReadPidNamespace(int proc, const char *path) {
  char target[64];
  if (ReadLinkBelow(proc, path, target, sizeof(target)) != KIF_STATUS_OK) return 0;
  const char *place = strchr(target, '[');
  uint64_t number = 0;
  if (place != nullptr && TakeNumber(&++place, &number)) return number;
  return 0;
}

bool IsUser(const Process &process) {
  return process.hasStat && !process.isKernel;
}

// The place of a process by ID, or `count`.
size_t PlaceOf(const Process *processes, size_t count, int32_t id) {
  const Process *place =
      std::lower_bound(processes, processes + count, id,
                       [](const Process &process, int32_t wanted) { return process.id < wanted; });
  return place != processes + count && place->id == id ? static_cast<size_t>(place - processes)
                                                       : count;
}

void ReadPidNamespaces(int proc, Process *processes, size_t count) {
  char path[32];
  for (size_t i = 0; i < count; ++i) {
    if (!IsUser(processes[i]) || processes[i].isZombie) continue;
    snprintf(path, sizeof(path), "%d/ns/pid", processes[i].id);
    processes[i].pidNamespace = ReadPidNamespace(proc, path);
  }
  // The first process of the reader's own namespace may not be readable, but the reader is.
  if (count > 0 && processes[0].id == 1 && processes[0].pidNamespace == 0) {
    processes[0].pidNamespace = ReadPidNamespace(proc, "self/ns/pid");
  }
}

// A process whose namespace cannot be read belongs to its parent's. Each round settles the
// processes whose parent was settled before; parents mostly have lower numbers, so that one round
// does nearly all.
void InheritPidNamespaces(Process *processes, size_t count) {
  bool settled = true;
  while (settled) {
    settled = false;
    for (size_t i = 0; i < count; ++i) {
      Process &process = processes[i];
      if (!IsUser(process) || process.pidNamespace != 0) continue;
      const size_t parent = PlaceOf(processes, count, process.parent);
      if (parent == count || processes[parent].pidNamespace == 0) continue;
      process.pidNamespace = processes[parent].pidNamespace;
      settled = true;
    }
  }
}

uint32_t NumberOf(const Array<Userspace> &userspaces, uint64_t pidNamespace) {
  for (size_t i = userspaces.size(); i > 0; --i) {
    if (userspaces[i - 1].pidNamespace == pidNamespace) return static_cast<uint32_t>(i);
  }
  return 0;
}

KIF_Status NumberUserspaces(int proc, Process *processes, size_t count,
                            Array<Userspace> *userspaces) {
  uint64_t own = count > 0 && processes[0].id == 1 ? processes[0].pidNamespace : 0;
  if (own == 0) own = ReadPidNamespace(proc, "self/ns/pid");
  if (!userspaces->Append({own, kNoRoot, kNoRoot})) return KIF_STATUS_NO_MEMORY;
  for (size_t i = 0; i < count; ++i) {
    Process &process = processes[i];
    if (!IsUser(process)) continue;
    // What nothing tells the namespace of is seen by the reader, in the reader's.
    if (process.pidNamespace == 0) process.pidNamespace = own;
    process.userspace = NumberOf(*userspaces, process.pidNamespace);
    if (process.userspace == 0 && !process.isZombie) {
      const auto place = static_cast<uint32_t>(i);
      if (!userspaces->Append({process.pidNamespace, kNoRoot, place})) return KIF_STATUS_NO_MEMORY;
      process.userspace = static_cast<uint32_t>(userspaces->size());
    }
    if (process.userspace == 0 || process.isZombie) continue;
    Userspace &userspace = (*userspaces)[process.userspace - 1];
    if (userspace.first == kNoRoot) userspace.first = static_cast<uint32_t>(i);
  }
  return KIF_STATUS_OK;
}

// The root of a userspace is its first process with no parent inside; in a tree of inconsistent
// files every process may have one, and then it is the first of all.
void LinkTrees(Process *processes, size_t count, Array<Userspace> *userspaces) {
  for (size_t i = 0; i < count; ++i) {
    Process &process = processes[i];
    if (process.userspace == 0 || process.isZombie) continue;
    const size_t parent = PlaceOf(processes, count, process.parent);
    const bool inside = parent != count && parent != i && IsUser(processes[parent]) &&
                        !processes[parent].isZombie &&
                        processes[parent].userspace == process.userspace;
    process.treeParent = inside ? process.parent : 0;
    Userspace &userspace = (*userspaces)[process.userspace - 1];
    if (!inside && userspace.root == kNoRoot) userspace.root = static_cast<uint32_t>(i);
  }
  for (Userspace &userspace : *userspaces) {
    if (userspace.root != kNoRoot || userspace.first == kNoRoot) continue;
    userspace.root = userspace.first;
    processes[userspace.root].treeParent = 0;
  }
  for (size_t i = 0; i < count; ++i) {
    Process &process = processes[i];
    if (process.userspace == 0 || process.isZombie || process.treeParent != 0) continue;
    const uint32_t root = (*userspaces)[process.userspace - 1].root;
    if (root != i) process.treeParent = processes[root].id;
  }
}

}  // namespace

KIF_Status AssignUserspaces(int proc, Process *processes, size_t count) {
  Array<Userspace> userspaces;
  ReadPidNamespaces(proc, processes, count);
  InheritPidNamespaces(processes, count);
  const KIF_Status status = NumberUserspaces(proc, processes, count, &userspaces);
  if (status == KIF_STATUS_OK) LinkTrees(processes, count, &userspaces);
  return status;
}
