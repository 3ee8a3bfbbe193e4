#include "linux/userspaces.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "base/array.h"
#include "base/own_process.h"
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

// No namespace of the kernel's has a number above 32 bits: those that nothing but the nesting
// tells of are numbered from there, by their first process.
constexpr uint64_t kUntold = uint64_t{1} << 32;

// The namespace that this /proc is mounted for, where its first process does not show it: the
// reader's, if the reader has the same number there.
uint64_t NamespaceOfProc(int proc) {
  const bool isReaders = IsForeignRoot() || OwnProcessInProc() == getpid();
  return isReaders ? ReadPidNamespace(proc, "self/ns/pid") : kUntold;
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
  char path[64];
  for (size_t i = 0; i < count; ++i) {
    if (!IsUser(processes[i]) || processes[i].isZombie) continue;
    snprintf(path, sizeof(path), "%d/ns/pid", processes[i].id);
    processes[i].pidNamespace = ReadPidNamespace(proc, path);
    if (processes[i].pidNamespace != 0 || processes[i].living == processes[i].id) continue;
    snprintf(path, sizeof(path), "%d/task/%d/ns/pid", processes[i].id, processes[i].living);
    processes[i].pidNamespace = ReadPidNamespace(proc, path);
  }
  // The first process of the reader's own namespace may not be readable, but the reader is.
  if (count > 0 && processes[0].id == 1 && processes[0].pidNamespace == 0) {
    processes[0].pidNamespace = NamespaceOfProc(proc);
  }
}

// What `NSpid:` in `status` tells: how many namespaces below the one of this /proc a process
// stands, and its number in its own. Both 0 where nothing is told.
struct Nesting {
  uint32_t depth;
  int32_t number;
};

Nesting ReadNesting(int proc, int32_t id) {
  char path[32];
  char text[8192];
  Nesting nesting = {};
  snprintf(path, sizeof(path), "%d/status", id);
  if (ReadBelow(proc, path, text, sizeof(text)) != KIF_STATUS_OK) return nesting;
  const char *place = strstr(text, "\nNSpid:");
  if (place == nullptr) return nesting;
  place += strlen("\nNSpid:");
  uint32_t count = 0;
  uint64_t number = 0;
  for (; place += strspn(place, " \t"), TakeNumber(&place, &number); ++count) {
  }
  if (count == 0 || number > INT32_MAX) return nesting;
  return {count - 1, static_cast<int32_t>(number)};
}

// The namespace of a process whose own link cannot be read and whose parent's is known: the first
// process of one, which stands deeper than its parent, has the number 1 there.
uint64_t NamespaceBelow(int proc, const Process &process, const Process &parent) {
  const Nesting nesting = ReadNesting(proc, process.id);
  const bool isFirst = nesting.number == 1 && nesting.depth > 0 &&
                       nesting.depth > ReadNesting(proc, parent.id).depth;
  return isFirst ? kUntold + static_cast<uint32_t>(process.id) : parent.pidNamespace;
}

// A process whose namespace cannot be read belongs to its parent's, unless it is the first of one
// below that. Each round settles the processes whose parent was settled before; parents mostly have
// lower numbers, so that one round does nearly all.
void InheritPidNamespaces(int proc, Process *processes, size_t count) {
  bool settled = true;
  while (settled) {
    settled = false;
    for (size_t i = 0; i < count; ++i) {
      Process &process = processes[i];
      if (!IsUser(process) || process.pidNamespace != 0) continue;
      const size_t parent = PlaceOf(processes, count, process.parent);
      if (parent == count || processes[parent].pidNamespace == 0) continue;
      process.pidNamespace = NamespaceBelow(proc, process, processes[parent]);
      settled = true;
    }
  }
}

// A namespace that only the nesting tells of has the number that a process in it shows whose parent
// does not.
void NumberUntold(int proc, Process *processes, size_t count) {
  for (size_t i = 0; i < count; ++i) {
    const uint64_t shown = processes[i].pidNamespace;
    if (shown == 0 || shown >= kUntold) continue;
    const size_t parent = PlaceOf(processes, count, processes[i].parent);
    const uint64_t untold = parent != count ? processes[parent].pidNamespace : 0;
    if (untold < kUntold) continue;
    const uint32_t depth = ReadNesting(proc, processes[parent].id).depth;
    if (ReadNesting(proc, processes[i].id).depth != depth) continue;
    for (size_t of = 0; of < count; ++of) {
      if (processes[of].pidNamespace == untold) processes[of].pidNamespace = shown;
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
  if (own == 0) own = NamespaceOfProc(proc);
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

// Whether a parent, which is not in the picture as a user process, runs and is kept from the
// reader: a /proc may hide the processes of others (hidepid).
bool IsHidden(int proc, int32_t parent) {
  char path[32];
  char text[512];
  if (parent <= 0) return false;
  snprintf(path, sizeof(path), "%d/stat", parent);
  const KIF_Status status = ReadBelow(proc, path, text, sizeof(text));
  if (status == KIF_STATUS_NO_PERMISSION) return true;
  return status == KIF_STATUS_NOT_FOUND && !IsForeignRoot() && getpgid(parent) >= 0;
}

// The root of a userspace is its first process with no parent inside; in a tree of inconsistent
// files every process may have one, and then it is the first of all. A parent that is hidden stays
// one that nobody sees.
void LinkTrees(int proc, Process *processes, size_t count, Array<Userspace> *userspaces) {
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
    if (root == i) continue;
    process.treeParent = IsHidden(proc, process.parent) ? process.parent : processes[root].id;
  }
}

}  // namespace

KIF_Status AssignUserspaces(int proc, Process *processes, size_t count) {
  Array<Userspace> userspaces;
  ReadPidNamespaces(proc, processes, count);
  InheritPidNamespaces(proc, processes, count);
  NumberUntold(proc, processes, count);
  const KIF_Status status = NumberUserspaces(proc, processes, count, &userspaces);
  if (status == KIF_STATUS_OK) LinkTrees(proc, processes, count, &userspaces);
  return status;
}
