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
#include <errno.h>
#include <fcntl.h>
#include <link.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include "kif/kif.h"

namespace {

// Whether `address` lies in the program's own code. Waits for no lock of the loader, which may be
// at work, and is asked before the sanitizer has begun.
[[gnu::no_sanitize_address]] bool IsInProgram(const void *address) {
  dl_find_object object;
  return _dl_find_object(const_cast<void *>(address), &object) == 0 &&
         object.dlfo_link_map->l_name[0] == '\0';
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

bool IsFailing(const char *operation, bool isAllocation, const void *caller) {
  const char *failing = getenv("FAIL_OPERATION");
  if (failing == nullptr) return false;
  if (isAllocation && strcmp(failing, "allocations") == 0) return isInMain;
  if (!IsInProgram(caller)) return false;
  if (!isAllocation && strcmp(failing, "operations") == 0) return isInMain;
  return strcmp(failing, operation) == 0;
}

bool Fails(const char *operation, bool isAllocation, const void *caller) {
  if (!IsFailing(operation, isAllocation, caller)) return false;
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

#define OPERATION(Result, name, failure, parameters, arguments)          \
  Result name parameters {                                               \
    static auto *next = Next<decltype(name)>(#name);                     \
    const bool fails = Fails(#name, false, __builtin_return_address(0)); \
    return fails ? failure : next arguments;                             \
  }
// The parameters are of the types A to E.
#define ONE(Result, name, failure, A) OPERATION(Result, name, failure, (A a), (a))
#define TWO(Result, name, failure, A, B) OPERATION(Result, name, failure, (A a, B b), (a, b))
#define THREE(Result, name, failure, A, B, C) \
  OPERATION(Result, name, failure, (A a, B b, C c), (a, b, c))
#define FIVE(name, A, B, C, D, E) \
  OPERATION(KIF_Status, name, FailStatus(), (A a, B b, C c, D d, E e), (a, b, c, d, e))
#define FOUR(name, A, B, C, D) \
  OPERATION(KIF_Status, name, FailStatus(), (A a, B b, C c, D d), (a, b, c, d))

FOUR(KIF_Get, uint32_t, KIF_ParamList *, void *, uint32_t)
FIVE(KIF_Set, uint32_t, KIF_ParamList *, KIF_ParamList *, void *, uint32_t)
FOUR(KIF_SetData, uint32_t, KIF_ParamList *, KIFData *, KIFData *)
FOUR(KIF_GetInstanceListAllocHint, uint32_t, KIF_ParamList *, uint32_t, KIF_ParamList **)
THREE(KIF_Status, KIF_GetInstanceListAlloc, FailStatus(), uint32_t, KIF_ParamList *,
      KIF_ParamList **)
THREE(KIF_Status, KIF_GetDataLength, FailStatus(), uint32_t, KIF_ParamList *, uint32_t *)
THREE(KIF_Status, KIF_CheckSig, FailStatus(), char *, uint32_t, const char **)
THREE(KIF_Status, KIF_ParamListGetInt32, FailStatus(), KIF_ParamList *, uint32_t, int32_t *)
THREE(KIF_Status, KIF_ParamListGetUInt64, FailStatus(), KIF_ParamList *, uint32_t, uint64_t *)
THREE(KIF_Status, KIF_ParamListGetString, FailStatus(), KIF_ParamList *, uint32_t, const char **)
THREE(KIFData *, KIFData_Create, nullptr, uint32_t, const void *, uint32_t)
TWO(KIF_ParamList *, KIF_ParamListCreate, nullptr, uint32_t, uint32_t)
TWO(KIF_Status, KIF_ParamListAddInt, FailStatus(), KIF_ParamList *, int64_t)
TWO(KIF_Status, KIF_ParamListAddString, FailStatus(), KIF_ParamList *, const char *)
TWO(KIF_Param *, KIF_ParamListGetParam, nullptr, KIF_ParamList *, uint32_t)
TWO(KIF_Status, KIF_UseCache, FailStatus(), const char *, uint32_t)
ONE(void *, KIFData_GetData, nullptr, KIFData *)
ONE(const char *, KIF_ParamGetString, nullptr, KIF_Param *)

// dlsym() allocates, so the allocator is reached by its other names. With the address sanitizer it
// is the sanitizer's.
#if defined(UNDER_ADDRESS_SANITIZER)
#define ALLOCATOR(name) __interceptor_##name
#else
#define ALLOCATOR(name) __libc_##name
#endif

extern "C" {
void *ALLOCATOR(malloc)(size_t size);
void *ALLOCATOR(calloc)(size_t count, size_t size);
void *ALLOCATOR(realloc)(void *block, size_t size);

#define ALLOCATION(name, parameters, arguments)                                             \
  void *name parameters {                                                                   \
    if (!Fails(#name, true, __builtin_return_address(0))) return ALLOCATOR(name) arguments; \
    errno = ENOMEM;                                                                         \
    return nullptr;                                                                         \
  }

ALLOCATION(malloc, (size_t size) noexcept, (size))
ALLOCATION(calloc, (size_t count, size_t size) noexcept, (count, size))
ALLOCATION(realloc, (void *block, size_t size) noexcept, (block, size))

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
