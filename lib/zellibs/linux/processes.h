// The processes and threads of the machine, read from /proc in one pass and kept: listing worlds
// or cartels takes a new picture, and what is asked of a world afterwards comes from it. A value
// that is asked for a second time is read anew, so that a reader who polls does not see the past;
// cartels that are listed for the first time since the worlds were are those of the same picture,
// so that the two lists agree.
#pragma once

#include <cstddef>
#include <cstdint>

#include "records/worlds.h"
#include "zellibs.h"

constexpr size_t kThreadNameSize = 64;  // proc(5): comm is cut to 15 bytes, kernel threads' to 63
constexpr size_t kCommandLineSize = sizeof(CartelCommandLine::cmdline);

struct Process {
  int32_t id;
  int32_t parent;         // process ID
  int32_t group;          // process group ID
  int32_t session;        // session ID
  uint64_t startTicks;    // since the boot; kNoTicks where it is not told
  bool hasStat;           // the fields above and below are read
  bool isKernel;          // a kernel thread
  bool isZombie;          // its main thread has ended, and no other one is left
  int32_t living;         // the thread whose files tell of it: the main one, unless that has ended
  uint64_t pidNamespace;  // inode number; 0 where it may not be read
  uint32_t userspace;     // 0 none
  int32_t treeParent;     // process under which it hangs in the tree of its userspace; 0 its root
  uint32_t mainThread;    // place in the threads; kNoThread when it has none there
  uint32_t commandLine;   // place in the command lines kept; kNoCommandLine
};

struct Thread {
  int32_t id;
  uint32_t process;   // place in the processes
  char state;         // state letter of proc(5)
  uint8_t served;     // values given since they were read, a bit each
  uint64_t cpuTicks;  // user plus system time, in clock ticks
  char name[kThreadNameSize];
};

constexpr uint64_t kNoTicks = UINT64_MAX;
constexpr uint32_t kNoThread = UINT32_MAX;
constexpr uint32_t kNoCommandLine = UINT32_MAX;

// What of a thread a reader asks for.
enum class ThreadValue : uint8_t {
  kName = 1,
  kInfo = 2,
  kState = 4,
  kTimes = 8,
  kCpus = 16,
  kStart = 32
};

// Takes a new picture of every thread, and gives the threads to list: processes ascending, each
// one's main thread first, no zombies. The pointers live until the next picture. Of this and the
// next: KIF_STATUS_NOT_FOUND where there is no process at all.
KIF_Status TakeThreads(const Thread **threads, size_t *count);

// Takes a new picture of the processes only, or keeps one of the threads that no cartels were
// listed from.
KIF_Status TakeCartels();

// Calls `give` with the ID of every process of the picture that is neither a kernel thread nor a
// zombie, ascending, until it gives a status.
KIF_Status ForEachCartel(KIF_Status (*give)(int32_t id, void *context), void *context);

// The thread with an ID and its process, for one of its values. KIF_STATUS_NOT_FOUND where it has
// gone. kInfo has the userspaces and the tree worked out.
KIF_Status FindThread(int64_t id, ThreadValue value, const Thread **thread,
                      const Process **process);

// The thread of a process whose files tell of it; the process itself where the picture has none.
int32_t FindLivingThread(int64_t process);

// The children of a process, zombies included, ascending.
KIF_Status ForEachChild(int64_t parent, KIF_Status (*give)(int32_t id, void *context),
                        void *context);

// A child of a process, by ID.
KIF_Status FindChild(int64_t parent, int64_t child, const Process **process);

// The command line of a process, as the record has it: at most kCommandLineSize - 1 bytes and a
// NUL. KIF_STATUS_NO_COMMAND_LINE where it has none, or has gone.
KIF_Status ReadCommandLine(int64_t id, char *text);
