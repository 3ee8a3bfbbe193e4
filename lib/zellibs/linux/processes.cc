#include "linux/processes.h"

#include <fcntl.h>
#include <stdio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/files.h"
#include "linux/process_command_lines.h"
#include "linux/process_stat.h"
#include "linux/userspaces.h"
#include "status.h"

namespace {

// How much the picture shows; each level includes the ones before it: the processes that may be
// cartels; those with their userspaces; all processes; all threads.
enum class Level : uint8_t { kNothing, kCartels, kUserspaces, kProcesses, kThreads };

struct ThreadPlace {
  int32_t id;
  uint32_t place;
};

struct ChildPlace {
  int32_t parent;
  uint32_t place;
};

// A pathname below /proc: "PID/task/TID/" and the longest file name used here.
constexpr size_t kPathSize = 64;

struct Picture {
  Level level = Level::kNothing;
  bool hasAnyone = false;     // a process, listed or not
  bool worldsListed = false;  // and no cartels yet
  bool kernelThreadsSought = false;
  bool hasKernelThreads = false;
  Descriptor proc;
  Array<Process> processes;    // by ID
  Array<Thread> threads;       // as they are listed
  Array<ThreadPlace> byId;     // the threads by ID; made when it is needed
  Array<ChildPlace> byParent;  // the processes by parent, then ID; made when it is needed
  uint32_t nextThread = 0;     // where the next thread asked for is likely to stand
  uint32_t nextProcess = 0;
};

Everlasting<Picture> snapshot;

// The main thread's own file: for that of the process the kernel adds up all its threads.
KIF_Status ReadThreadStat(int32_t process, int32_t thread, Stat *stat) {
  char path[kPathSize];
  snprintf(path, sizeof(path), "%d/task/%d/stat", process, thread);
  const KIF_Status status = ReadStat(snapshot->proc.fd(), path, stat);
  if (status != KIF_STATUS_NOT_FOUND || !IsForeignRoot() || process != thread) return status;
  snprintf(path, sizeof(path), "%d/stat", process);  // a tree written by hand may hold no tasks
  return ReadStat(snapshot->proc.fd(), path, stat);
}

// A directory of numbers, ascending; other names are passed over.
KIF_Status ListNumbers(DirectoryReader *directory, Array<int32_t> *numbers) {
  bool sorted = true;
  while (const char *name = directory->Next()) {
    const char *place = name;
    uint64_t number;
    if (!TakeNumber(&place, &number) || *place != '\0' || number == 0 || number > INT32_MAX) {
      continue;
    }
    const auto id = static_cast<int32_t>(number);
    sorted = sorted && (numbers->size() == 0 || (*numbers)[numbers->size() - 1] < id);
    if (!numbers->Append(id)) return KIF_STATUS_NO_MEMORY;
  }
  if (!sorted) std::sort(numbers->begin(), numbers->end());
  return directory->status();
}

// The first thread of a process, whose main thread has ended, that still runs; 0 where none does.
KIF_Status SeekLivingThread(int32_t process, int32_t *living) {
  char path[kPathSize];
  DirectoryReader tasks;
  Array<int32_t> ids;
  *living = 0;
  snprintf(path, sizeof(path), "%d/task", process);
  if (tasks.OpenBelow(snapshot->proc.fd(), path) != KIF_STATUS_OK) return KIF_STATUS_OK;
  if (ListNumbers(&tasks, &ids) == KIF_STATUS_NO_MEMORY) return KIF_STATUS_NO_MEMORY;
  for (const int32_t id : ids) {
    Stat stat;
    snprintf(path, sizeof(path), "%d/stat", id);
    const bool runs = id != process && ReadStat(tasks.fd(), path, &stat) == KIF_STATUS_OK;
    if (!runs || IsDead(stat.state)) continue;
    *living = id;
    break;
  }
  return KIF_STATUS_OK;
}

// A foreign tree need not agree with what the kernel once counted.
bool MayHaveOtherThreads(const Stat &stat) {
  return stat.threads > 1 || IsForeignRoot();
}

KIF_Status FillProcess(const Stat &stat, Process *process) {
  process->hasStat = true;
  process->parent = stat.parent;
  process->group = stat.group;
  process->session = stat.session;
  process->startTicks = stat.startTicks;
  process->isKernel = stat.isKernel;
  process->living = process->id;
  if (IsDead(stat.state)) {
    process->living = 0;
    const KIF_Status status =
        MayHaveOtherThreads(stat) ? SeekLivingThread(process->id, &process->living) : KIF_STATUS_OK;
    if (status != KIF_STATUS_OK) return status;
  }
  process->isZombie = process->living == 0;
  return KIF_STATUS_OK;
}

void FillThread(const Stat &stat, Thread *thread) {
  thread->state = stat.state;
  thread->served = 0;
  thread->cpuTicks = stat.cpuTicks;
  memcpy(thread->name, stat.name, sizeof(thread->name));
}

KIF_Status AppendThread(uint32_t process, int32_t id, const Stat &stat) {
  Thread thread = {};
  thread.id = id;
  thread.process = process;
  FillThread(stat, &thread);
  return snapshot->threads.Append(thread) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

// Begins a new picture: nothing in it but /proc, open, and its processes' IDs in `ids`.
KIF_Status BeginPicture(Array<int32_t> *ids) {
  snapshot->level = Level::kNothing;
  snapshot->hasAnyone = snapshot->worldsListed = snapshot->kernelThreadsSought = false;
  snapshot->processes.Clear();
  snapshot->threads.Clear();
  snapshot->byId.Clear();
  snapshot->byParent.Clear();
  snapshot->nextThread = snapshot->nextProcess = 0;
  ForgetCommandLine();
  DirectoryReader proc;
  KIF_Status status = proc.Open("/proc");
  if (status != KIF_STATUS_OK) return status;
  status = ListNumbers(&proc, ids);
  if (status != KIF_STATUS_OK) return status;
  return OpenBelow(proc.fd(), ".", O_PATH | O_DIRECTORY, &snapshot->proc);
}

Process NewProcess(int32_t id) {
  Process process = {};
  process.id = process.living = id;
  process.mainThread = kNoThread;
  process.commandLine = kNoCommandLine;
  return process;
}

KIF_Status AppendOtherThreads(uint32_t place) {
  const int32_t id = snapshot->processes[place].id;
  char path[kPathSize];
  snprintf(path, sizeof(path), "%d/task", id);
  DirectoryReader tasks;
  if (tasks.OpenBelow(snapshot->proc.fd(), path) != KIF_STATUS_OK) return KIF_STATUS_OK;  // gone
  Array<int32_t> ids;
  const KIF_Status listed = ListNumbers(&tasks, &ids);
  if (listed == KIF_STATUS_NO_MEMORY) return listed;
  for (const int32_t thread : ids) {
    if (thread == id) continue;
    Stat stat;
    snprintf(path, sizeof(path), "%d/stat", thread);
    if (ReadStat(tasks.fd(), path, &stat) != KIF_STATUS_OK || IsDead(stat.state)) continue;
    const KIF_Status status = AppendThread(place, thread, stat);
    if (status != KIF_STATUS_OK) return status;
  }
  return KIF_STATUS_OK;
}

KIF_Status AppendProcess(int32_t id, bool withThreads) {
  Process process = NewProcess(id);
  Stat stat = {};
  const KIF_Status read = ReadThreadStat(id, id, &stat);
  if (read == KIF_STATUS_NO_MEMORY || read == KIF_STATUS_NO_RESOURCES) return read;
  if (read == KIF_STATUS_OK) {
    const KIF_Status filled = FillProcess(stat, &process);
    if (filled != KIF_STATUS_OK) return filled;
  } else if (read != KIF_STATUS_NO_PERMISSION) {
    return KIF_STATUS_OK;  // gone
  }
  snapshot->hasAnyone = true;
  const auto place = static_cast<uint32_t>(snapshot->processes.size());
  if (!process.isZombie) {
    process.mainThread = static_cast<uint32_t>(snapshot->threads.size());
    const KIF_Status status = AppendThread(place, id, stat);
    if (status != KIF_STATUS_OK) return status;
  }
  if (!snapshot->processes.Append(process)) return KIF_STATUS_NO_MEMORY;
  const bool hasOthers = withThreads && MayHaveOtherThreads(stat);
  return hasOthers ? AppendOtherThreads(place) : KIF_STATUS_OK;
}

KIF_Status TakePicture(Level level) {
  Array<int32_t> ids;
  KIF_Status status = BeginPicture(&ids);
  for (size_t i = 0; status == KIF_STATUS_OK && i < ids.size(); ++i) {
    status = AppendProcess(ids[i], level == Level::kThreads);
  }
  if (status == KIF_STATUS_OK && !snapshot->hasAnyone) status = KIF_STATUS_NOT_FOUND;
  if (status != KIF_STATUS_OK) return status;
  status = AssignUserspaces(snapshot->proc.fd(), snapshot->processes.begin(),
                            snapshot->processes.size());
  if (status == KIF_STATUS_OK) snapshot->level = level;
  return status;
}

KIF_Status NeedLevel(Level level) {
  return snapshot->level >= level ? KIF_STATUS_OK : TakePicture(level);
}

Process *FindProcess(int64_t id) {
  const uint32_t next = snapshot->nextProcess;
  Process *found = nullptr;
  if (next < snapshot->processes.size() && snapshot->processes[next].id == id) {
    found = &snapshot->processes[next];
  } else {
    Process *place = std::lower_bound(
        snapshot->processes.begin(), snapshot->processes.end(), id,
        [](const Process &process, int64_t wanted) { return process.id < wanted; });
    if (place != snapshot->processes.end() && place->id == id) found = place;
  }
  if (found != nullptr) {
    snapshot->nextProcess = static_cast<uint32_t>(found - snapshot->processes.begin()) + 1;
  }
  return found;
}

// Sorts the threads' places by ID, once for each picture that is asked out of order.
KIF_Status IndexThreads() {
  if (snapshot->byId.size() == snapshot->threads.size()) return KIF_STATUS_OK;
  snapshot->byId.Clear();
  for (uint32_t i = 0; i < snapshot->threads.size(); ++i) {
    if (!snapshot->byId.Append({snapshot->threads[i].id, i})) return KIF_STATUS_NO_MEMORY;
  }
  std::sort(snapshot->byId.begin(), snapshot->byId.end(),
            [](const ThreadPlace &a, const ThreadPlace &b) { return a.id < b.id; });
  return KIF_STATUS_OK;
}

KIF_Status PlaceOfThread(int64_t id, uint32_t *found) {
  // Readers ask for a thread's values in a row, and for the threads in the order of the list.
  for (const uint32_t step : {0u, 1u}) {
    const uint32_t place = snapshot->nextThread + step;
    if (place < snapshot->threads.size() && snapshot->threads[place].id == id) {
      *found = snapshot->nextThread = place;
      return KIF_STATUS_OK;
    }
  }
  const KIF_Status status = IndexThreads();
  if (status != KIF_STATUS_OK) return status;
  const ThreadPlace *place = std::lower_bound(
      snapshot->byId.begin(), snapshot->byId.end(), id,
      [](const ThreadPlace &thread, int64_t wanted) { return thread.id < wanted; });
  if (place == snapshot->byId.end() || place->id != id) return KIF_STATUS_NOT_FOUND;
  *found = snapshot->nextThread = place->place;
  return KIF_STATUS_OK;
}

// In a picture of cartels a process is read when it is asked for. One that has ended since counts
// as a zombie.
KIF_Status ReadMainThread(Process *process) {
  if (process->mainThread != kNoThread) return KIF_STATUS_OK;
  Stat stat;
  KIF_Status status = ReadThreadStat(process->id, process->id, &stat);
  if (status == KIF_STATUS_OK) status = FillProcess(stat, process);
  if (status == KIF_STATUS_OK && process->isZombie) status = KIF_STATUS_NOT_FOUND;
  process->isZombie = status == KIF_STATUS_NOT_FOUND;
  if (status != KIF_STATUS_OK) return status;
  process->mainThread = static_cast<uint32_t>(snapshot->threads.size());
  return AppendThread(static_cast<uint32_t>(process - snapshot->processes.begin()), process->id,
                      stat);
}

// Reads what the userspaces of a picture of cartels are worked out from.
KIF_Status AddUserspaces() {
  for (Process &process : snapshot->processes) {
    const KIF_Status status = ReadMainThread(&process);
    if (status == KIF_STATUS_NO_MEMORY || status == KIF_STATUS_NO_RESOURCES) return status;
  }
  snapshot->level = Level::kUserspaces;
  return AssignUserspaces(snapshot->proc.fd(), snapshot->processes.begin(),
                          snapshot->processes.size());
}

KIF_Status RefreshThread(Thread *thread) {
  Stat stat;
  Process *process = &snapshot->processes[thread->process];
  KIF_Status status = ReadThreadStat(process->id, thread->id, &stat);
  const bool hasEnded = status == KIF_STATUS_OK && IsDead(stat.state);
  if (hasEnded && thread->id == process->id) status = FillProcess(stat, process);
  if (status != KIF_STATUS_OK) return status;
  if (hasEnded && (thread->id != process->id || process->isZombie)) return KIF_STATUS_NOT_FOUND;
  FillThread(stat, thread);
  return KIF_STATUS_OK;
}

KIF_Status LookUpCartel(Process *process, ThreadValue value, uint32_t *place) {
  KIF_Status status = KIF_STATUS_OK;
  if (value == ThreadValue::kInfo && snapshot->level == Level::kCartels) status = AddUserspaces();
  if (status == KIF_STATUS_OK) status = ReadMainThread(process);
  *place = process->mainThread;
  return status;
}

// Finds the thread in the picture, or takes one of more detail where this one cannot have it.
KIF_Status LookUpThread(int64_t id, ThreadValue value, uint32_t *place) {
  if (snapshot->level != Level::kNothing && snapshot->level < Level::kThreads) {
    Process *process = FindProcess(id);
    if (process == nullptr) {
      snapshot->level = Level::kNothing;
    } else if (snapshot->level < Level::kProcesses) {
      return LookUpCartel(process, value, place);
    }
  }
  const KIF_Status status =
      NeedLevel(snapshot->level == Level::kNothing ? Level::kThreads : snapshot->level);
  return status == KIF_STATUS_OK ? PlaceOfThread(id, place) : status;
}

// Kernel threads and zombies have no memory and so no program: one look at a link tells, where the
// reader may look. KIF_STATUS_NOT_SUPPORTED where the rest of the process has to tell: a tree need
// not hold the links, and what is in a process group is no kernel thread, which costs less to see.
KIF_Status FindProgram(int32_t id) {
  if (IsForeignRoot() || getpgid(id) != 0) return KIF_STATUS_NOT_SUPPORTED;
  char path[kPathSize];
  char program[2];
  snprintf(path, sizeof(path), "%d/exe", id);
  return ReadLinkBelow(snapshot->proc.fd(), path, program, sizeof(program));
}

// Fills what tells a kernel thread or zombie where its program may not be looked at.
KIF_Status TellByStat(Process *process) {
  Stat stat;
  const KIF_Status status = ReadThreadStat(process->id, process->id, &stat);
  return status == KIF_STATUS_OK ? FillProcess(stat, process) : status;
}

// Whether the kernel's own threads are in this /proc: all of them descend from number 2.
bool HasKernelThreads() {
  if (!snapshot->kernelThreadsSought) {
    Stat stat;
    snapshot->kernelThreadsSought = true;
    snapshot->hasKernelThreads = ReadThreadStat(2, 2, &stat) == KIF_STATUS_OK && stat.isKernel;
  }
  return snapshot->hasKernelThreads;
}

KIF_Status AppendCartel(int32_t id) {
  Process process = NewProcess(id);
  char text[kCommandLineSize];
  const KIF_Status program = FindProgram(id);
  // A main thread that has ended shows no program, either.
  if (program == KIF_STATUS_NOT_FOUND && HasKernelThreads()) {
    snapshot->hasAnyone = true;
    return KIF_STATUS_OK;
  }
  KIF_Status read = ReadCommandLineFile(snapshot->proc.fd(), id, id, text);
  if (read == KIF_STATUS_NO_MEMORY || read == KIF_STATUS_NO_RESOURCES) return read;
  // In a tree of files a command line proves nothing.
  if ((read != KIF_STATUS_OK && program != KIF_STATUS_OK) || IsForeignRoot()) {
    const KIF_Status told = TellByStat(&process);
    if (told != KIF_STATUS_OK && read != KIF_STATUS_OK) return KIF_STATUS_OK;  // gone
    if (told == KIF_STATUS_NO_MEMORY) return told;
    snapshot->hasAnyone = true;
    if (process.isKernel || process.isZombie) return KIF_STATUS_OK;
    if (process.living != id) {
      read = ReadCommandLineFile(snapshot->proc.fd(), id, process.living, text);
    }
  }
  if (read == KIF_STATUS_OK && !KeepCommandLine(text, &process)) return KIF_STATUS_NO_MEMORY;
  snapshot->hasAnyone = true;
  return snapshot->processes.Append(process) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

KIF_Status IndexChildren() {
  if (snapshot->byParent.size() == snapshot->processes.size()) return KIF_STATUS_OK;
  snapshot->byParent.Clear();
  for (uint32_t i = 0; i < snapshot->processes.size(); ++i) {
    if (!snapshot->byParent.Append({snapshot->processes[i].parent, i})) return KIF_STATUS_NO_MEMORY;
  }
  std::sort(snapshot->byParent.begin(), snapshot->byParent.end(),
            [](const ChildPlace &a, const ChildPlace &b) {
              return a.parent != b.parent ? a.parent < b.parent : a.place < b.place;
            });
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status TakeThreads(const Thread **threads, size_t *count) {
  snapshot->level = Level::kNothing;
  const KIF_Status status = TakePicture(Level::kThreads);
  snapshot->worldsListed = status == KIF_STATUS_OK;
  *threads = snapshot->threads.begin();
  *count = snapshot->threads.size();
  return status;
}

KIF_Status TakeCartels() {
  if (snapshot->worldsListed) {
    snapshot->worldsListed = false;
    return KIF_STATUS_OK;
  }
  Array<int32_t> ids;
  KIF_Status status = BeginPicture(&ids);
  ClearCommandLines();
  for (size_t i = 0; status == KIF_STATUS_OK && i < ids.size(); ++i) status = AppendCartel(ids[i]);
  if (status == KIF_STATUS_OK && !snapshot->hasAnyone) status = KIF_STATUS_NOT_FOUND;
  if (status == KIF_STATUS_OK) snapshot->level = Level::kCartels;
  return status;
}

KIF_Status ForEachCartel(KIF_Status (*give)(int32_t id, void *context), void *context) {
  KIF_Status status = KIF_STATUS_OK;
  for (const Process &process : snapshot->processes) {
    if (process.isKernel || process.isZombie) continue;
    status = give(process.id, context);
    if (status != KIF_STATUS_OK) break;
  }
  return status;
}

KIF_Status FindThread(int64_t id, ThreadValue value, const Thread **thread,
                      const Process **process) {
  uint32_t place;
  KIF_Status status = LookUpThread(id, value, &place);
  if (status != KIF_STATUS_OK) return status;
  Thread &found = snapshot->threads[place];
  if (!snapshot->processes[found.process].hasStat) return KIF_STATUS_NO_PERMISSION;
  const auto bit = static_cast<uint8_t>(value);
  if ((found.served & bit) != 0) {
    status = RefreshThread(&found);
    if (status != KIF_STATUS_OK) return status;
  }
  found.served |= bit;
  *thread = &found;
  *process = &snapshot->processes[found.process];
  if (value == ThreadValue::kInfo) AllowLastCommandLine((*process)->id);
  return KIF_STATUS_OK;
}

int32_t FindLivingThread(int64_t process) {
  Process *found = FindProcess(process);
  if (found != nullptr && !found->hasStat) (void)ReadMainThread(found);
  return found != nullptr && found->living != 0 ? found->living : static_cast<int32_t>(process);
}

KIF_Status ForEachChild(int64_t parent, KIF_Status (*give)(int32_t id, void *context),
                        void *context) {
  KIF_Status status = NeedLevel(Level::kProcesses);
  if (status == KIF_STATUS_OK) status = IndexChildren();
  if (status != KIF_STATUS_OK) return status;
  if (FindProcess(parent) == nullptr) return KIF_STATUS_NOT_FOUND;
  const ChildPlace *child = std::lower_bound(
      snapshot->byParent.begin(), snapshot->byParent.end(), parent,
      [](const ChildPlace &place, int64_t wanted) { return place.parent < wanted; });
  for (; child != snapshot->byParent.end() && child->parent == parent; ++child) {
    status = give(snapshot->processes[child->place].id, context);
    if (status != KIF_STATUS_OK) return status;
  }
  return KIF_STATUS_OK;
}

KIF_Status FindChild(int64_t parent, int64_t child, const Process **process) {
  const KIF_Status status = NeedLevel(Level::kProcesses);
  if (status != KIF_STATUS_OK) return status;
  *process = FindProcess(child);
  return *process != nullptr && (*process)->parent == parent ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

KIF_Status ReadCommandLine(int64_t id, char *text) {
  if (id <= 0 || id > INT32_MAX) return KIF_STATUS_NOT_FOUND;
  if (snapshot->level == Level::kNothing) {
    const KIF_Status status = TakeCartels();
    if (status != KIF_STATUS_OK) return status;
  }
  return TakeCommandLine(snapshot->proc.fd(), static_cast<int32_t>(id), FindProcess(id), text);
}
