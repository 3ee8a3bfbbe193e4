// The subtrees world, sched_Vcpus and userworld_cartel: threads as worlds, processes as cartels.
#include <cstddef>
#include <cstring>

#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "linux/processes.h"
#include "records/cartels.h"
#include "records/worlds.h"
#include "states.h"

namespace {

// The run and wait states that a state letter of proc(5) stands for.
struct State {
  char letter;
  uint32_t run;
  uint32_t wait;
};

constexpr State kStates[] = {
    {'R', kRun, kNone},
    {'S', kSleep, kInterruptible},
    {'D', kDisk, kUninterruptible},
    {'T', kStop, kSignal},
    {'t', kTrace, kTracer},
    {'P', kPark, kUnpark},
    {'I', kIdle, kUninterruptible},
    {'Z', kZombie, kNone},
    {'X', kDead, kNone},
};

constexpr uint64_t kTicksPerSecond = 100;  // USER_HZ, the same on every architecture but one

KIF_Status AppendInteger(int32_t id, void *list) {
  return KIF_ParamListAddInt(static_cast<KIF_ParamList *>(list), id);
}

// KVM names the threads of a guest's processors "CPU 0/KVM".
bool IsVirtualCpu(const char *name) {
  uint64_t number;
  if (strncmp(name, "CPU ", 4) != 0) return false;
  name += 4;
  return TakeNumber(&name, &number) && strcmp(name, "/KVM") == 0;
}

uint32_t TypeOf(const Thread &thread, const Process &process) {
  if (process.isKernel) return kWorldTypeSystem;
  uint32_t type = kWorldTypeUser;
  if (thread.id != process.id) type |= kWorldTypeClone;
  if (IsVirtualCpu(thread.name)) type |= kWorldTypeVmm;
  return type;
}

}  // namespace

KIF_Status ListWorlds(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  const Thread *threads;
  size_t count;
  KIF_Status status = TakeThreads(&threads, &count);
  if (status == KIF_STATUS_OK && !ReserveParams(list, static_cast<uint32_t>(count))) {
    status = KIF_STATUS_NO_MEMORY;
  }
  for (size_t i = 0; status == KIF_STATUS_OK && i < count; ++i) {
    status = AppendInteger(threads[i].id, list);
  }
  return status;
}

KIF_Status GetWorldName(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Thread *thread;
  const Process *process;
  const KIF_Status status = FindThread(Integer(instance, 0), ThreadValue::kName, &thread, &process);
  if (status == KIF_STATUS_OK) strcpy(static_cast<char *>(record), thread->name);
  return status;
}

KIF_Status GetWorldInfo(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Thread *thread;
  const Process *process;
  const KIF_Status status = FindThread(Integer(instance, 0), ThreadValue::kInfo, &thread, &process);
  if (status != KIF_STATUS_OK) return status;
  auto *info = static_cast<WorldInfo *>(record);
  info->worldID = static_cast<uint32_t>(thread->id);
  info->groupID = process->id;
  info->processGroupID = process->group;
  info->sessionID = process->session;
  info->worldType = TypeOf(*thread, *process);
  if (process->isKernel) return KIF_STATUS_OK;
  info->userspaceID = process->userspace;
  info->cartelID = static_cast<uint32_t>(process->id);
  info->parentCartelID = thread->id == process->id ? process->treeParent : process->id;
  return KIF_STATUS_OK;
}

KIF_Status GetSummaryStats(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Thread *thread;
  const Process *process;
  const KIF_Status status =
      FindThread(Integer(instance, 0), ThreadValue::kState, &thread, &process);
  if (status != KIF_STATUS_OK) return status;
  State found = {thread->state, kOther, kNone};
  for (const State &state : kStates) {
    if (state.letter == thread->state) found = state;
  }
  auto *summary = static_cast<SchedSummary *>(record);
  summary->runState = found.run;
  summary->waitState = found.wait;
  return KIF_STATUS_OK;
}

KIF_Status GetStateTimes(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Thread *thread;
  const Process *process;
  const KIF_Status status =
      FindThread(Integer(instance, 0), ThreadValue::kTimes, &thread, &process);
  if (status != KIF_STATUS_OK) return status;
  static_cast<SchedStateTimes *>(record)->usedTime = thread->cpuTicks * (1000000 / kTicksPerSecond);
  return KIF_STATUS_OK;
}

KIF_Status ListCartels(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  const KIF_Status status = TakeCartels();
  return status == KIF_STATUS_OK ? ForEachCartel(AppendInteger, list) : status;
}

KIF_Status GetCommandLine(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  return ReadCommandLine(Integer(instance, 0), static_cast<char *>(record));
}

KIF_Status GetCartelStart(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Thread *thread;
  const Process *process;
  const KIF_Status status =
      FindThread(Integer(instance, 0), ThreadValue::kStart, &thread, &process);
  if (status != KIF_STATUS_OK) return status;
  if (thread->id != process->id) return KIF_STATUS_NOT_FOUND;
  if (process->startTicks == kNoTicks) return KIF_STATUS_OK;
  *static_cast<CartelStart *>(record) = {kCartelStartKnown,
                                         process->startTicks * (1000 / kTicksPerSecond)};
  return KIF_STATUS_OK;
}

KIF_Status ListChildren(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  return ForEachChild(Integer(parent, 0), AppendInteger, list);
}

KIF_Status GetChild(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const Process *child;
  const KIF_Status status = FindChild(Integer(instance, 0), Integer(instance, 1), &child);
  if (status != KIF_STATUS_OK) return status;
  static_cast<ChildRecord *>(record)->childState = child->isZombie ? kChildStateZombie : 0;
  return KIF_STATUS_OK;
}
