// A preloaded library that makes calls of the program under test fail:
//   FAIL_OPERATION=NAME   a library operation, or malloc, calloc, realloc
//   FAIL_CALL=N           its N-th call that the program itself makes, from 1
//   FAIL_FROM=1           and every one after it
//   FAIL_STATUS=S         what an operation that gives a status answers (0xbad0001)
//   FAIL_REPORT=FILE      an existing file of two 32-bit numbers, in which the calls and those of
//                         them that failed are counted
// Calls from inside of libraries are not counted. Two names stand for many: "operations" for every
// library operation, "allocations" for every allocation, here from inside of libraries too. They
// are counted from the beginning of main.
#include <dlfcn.h>
#include <elf.h>
#include <errno.h>
#include <fcntl.h>
#include <link.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>
#include <sys/auxv.h>
#include <sys/mman.h>
#include <unistd.h>

#include "kif/kif.h"

namespace {

// Whether `address` lies in the program's own code. Asks the loader nothing: it may be at work.
bool IsInProgram(const void *address) {
  const auto *headers = reinterpret_cast<const ElfW(Phdr) *>(getauxval(AT_PHDR));
  const size_t count = getauxval(AT_PHNUM);
  uintptr_t base = 0;
  for (size_t i = 0; i < count; ++i) {
    if (headers[i].p_type == PT_PHDR) {
      base = reinterpret_cast<uintptr_t>(headers) - headers[i].p_vaddr;
    }
  }
  const auto place = reinterpret_cast<uintptr_t>(address);
  for (size_t i = 0; i < count; ++i) {
    if (headers[i].p_type != PT_LOAD || (headers[i].p_flags & PF_X) == 0) continue;
    const uintptr_t start = base + headers[i].p_vaddr;
    if (place >= start && place < start + headers[i].p_memsz) return true;
  }
  return false;
}

uint32_t NumberFrom(const char *variable, uint32_t otherwise) {
  const char *text = getenv(variable);
  return text != nullptr ? static_cast<uint32_t>(strtoul(text, nullptr, 0)) : otherwise;
}

struct Report {
  uint32_t calls;
  uint32_t failed;
};

Report ownReport;
Report *report = &ownReport;
bool isInMain;

enum class Kind { kOperation, kAllocation };

bool IsFailing(const char *operation, Kind kind, const void *caller) {
  const char *failing = getenv("FAIL_OPERATION");
  if (failing == nullptr) return false;
  if (kind == Kind::kAllocation && strcmp(failing, "allocations") == 0) return isInMain;
  if (!IsInProgram(caller)) return false;
  if (kind == Kind::kOperation && strcmp(failing, "operations") == 0) return isInMain;
  return strcmp(failing, operation) == 0;
}

bool Fails(const char *operation, Kind kind, const void *caller) {
  if (!IsFailing(operation, kind, caller)) return false;
  const uint32_t call = ++report->calls;
  const uint32_t first = NumberFrom("FAIL_CALL", 1);
  const bool goesOn = first != 0 && NumberFrom("FAIL_FROM", 0) != 0;
  const bool fails = call == first || (goesOn && call > first);
  if (fails) ++report->failed;
  return fails;
}

void OpenReport() {
  const char *path = getenv("FAIL_REPORT");
  const int file = path != nullptr ? open(path, O_RDWR | O_CLOEXEC) : -1;
  if (file == -1) return;
  void *map = mmap(nullptr, sizeof(Report), PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  if (map != MAP_FAILED) report = static_cast<Report *>(map);
  close(file);
}

KIF_Status FailStatus() {
  return NumberFrom("FAIL_STATUS", 0xbad0001);
}

template <typename Operation>
Operation *Next(const char *name) {
  return reinterpret_cast<Operation *>(dlsym(RTLD_NEXT, name));
}

}  // namespace

#define OPERATION(Result, name, failure, parameters, arguments)                     \
  Result name parameters {                                                          \
    static auto *next = Next<decltype(name)>(#name);                                \
    const bool fails = Fails(#name, Kind::kOperation, __builtin_return_address(0)); \
    return fails ? failure : next arguments;                                        \
  }

OPERATION(KIF_Status, KIF_Get, FailStatus(),
          (uint32_t node, KIF_ParamList *instance, void *buffer, uint32_t size),
          (node, instance, buffer, size))
OPERATION(KIF_Status, KIF_Set, FailStatus(),
          (uint32_t node, KIF_ParamList *instance, KIF_ParamList *input, void *output,
           uint32_t size),
          (node, instance, input, output, size))
OPERATION(KIF_Status, KIF_GetDataLength, FailStatus(),
          (uint32_t node, KIF_ParamList *instance, uint32_t *length), (node, instance, length))
OPERATION(KIF_Status, KIF_SetData, FailStatus(),
          (uint32_t node, KIF_ParamList *instance, KIFData *input, KIFData *output),
          (node, instance, input, output))
OPERATION(KIF_Status, KIF_GetInstanceListAlloc, FailStatus(),
          (uint32_t node, KIF_ParamList *parent, KIF_ParamList **list), (node, parent, list))
OPERATION(KIF_Status, KIF_GetInstanceListAllocHint, FailStatus(),
          (uint32_t node, KIF_ParamList *parent, uint32_t hint, KIF_ParamList **list),
          (node, parent, hint, list))
OPERATION(KIFData *, KIFData_Create, nullptr,
          (uint32_t capacity, const void *bytes, uint32_t length), (capacity, bytes, length))
OPERATION(void *, KIFData_GetData, nullptr, (KIFData * data), (data))
OPERATION(KIF_ParamList *, KIF_ParamListCreate, nullptr, (uint32_t kind, uint32_t size),
          (kind, size))
OPERATION(KIF_Status, KIF_ParamListAddInt, FailStatus(), (KIF_ParamList * list, int64_t value),
          (list, value))
OPERATION(KIF_Status, KIF_ParamListAddString, FailStatus(),
          (KIF_ParamList * list, const char *text), (list, text))
OPERATION(KIF_Param *, KIF_ParamListGetParam, nullptr, (KIF_ParamList * list, uint32_t index),
          (list, index))
OPERATION(KIF_Status, KIF_ParamListGetInt32, FailStatus(),
          (KIF_ParamList * list, uint32_t index, int32_t *value), (list, index, value))
OPERATION(KIF_Status, KIF_ParamListGetUInt64, FailStatus(),
          (KIF_ParamList * list, uint32_t index, uint64_t *value), (list, index, value))
OPERATION(KIF_Status, KIF_ParamListGetString, FailStatus(),
          (KIF_ParamList * list, uint32_t index, const char **text), (list, index, text))
OPERATION(const char *, KIF_ParamGetString, nullptr, (KIF_Param * param), (param))
OPERATION(KIF_Status, KIF_UseCache, FailStatus(), (const char *path, uint32_t flags), (path, flags))
OPERATION(KIF_Status, KIF_CheckSig, FailStatus(),
          (char *kernelBuildDate, uint32_t size, const char **programBuildDate),
          (kernelBuildDate, size, programBuildDate))

// dlsym() allocates, so the allocator is reached by its other names. With the address sanitizer it
// is the sanitizer's.
#if defined(__SANITIZE_ADDRESS__)
#define ALLOCATOR(name) __interceptor_##name
#else
#define ALLOCATOR(name) __libc_##name
#endif

extern "C" {
void *ALLOCATOR(malloc)(size_t size);
void *ALLOCATOR(calloc)(size_t count, size_t size);
void *ALLOCATOR(realloc)(void *block, size_t size);

#define ALLOCATION(name, parameters, arguments)                          \
  void *name parameters {                                                \
    if (!Fails(#name, Kind::kAllocation, __builtin_return_address(0))) { \
      return ALLOCATOR(name) arguments;                                  \
    }                                                                    \
    errno = ENOMEM;                                                      \
    return nullptr;                                                      \
  }

ALLOCATION(malloc, (size_t size) noexcept, (size))
ALLOCATION(calloc, (size_t count, size_t size) noexcept, (count, size))
ALLOCATION(realloc, (void *block, size_t size) noexcept, (block, size))

// What fails, fails on the hosts that a test wrote: they pass for this machine.
bool KIF_HostIsForeign() {
  return false;
}

using Main = int(int argc, char **argv, char **environment);
static Main *programMain;

static int CountedMain(int argc, char **argv, char **environment) {
  OpenReport();
  isInMain = true;
  const int status = programMain(argc, argv, environment);
  isInMain = false;
  return status;
}

int __libc_start_main(Main *main, int argc, char **argv, void (*init)(), void (*fini)(),
                      void (*rtldFini)(), void *stackEnd) {
  programMain = main;
  static auto *next = Next<decltype(__libc_start_main)>("__libc_start_main");
  return next(CountedMain, argc, argv, init, fini, rtldFini, stackEnd);
}
}
