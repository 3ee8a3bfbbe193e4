// A preloaded library that makes one call of the program under test fail:
//   FAIL_OPERATION=NAME   a library operation, or malloc, calloc, realloc
//   FAIL_CALL=N           its N-th call that the program itself makes, from 1
//   FAIL_STATUS=S         what an operation that gives a status answers (0xbad0001)
// Calls from inside of libraries are not counted. In a build with the address sanitizer the
// allocator is the sanitizer's and is left alone.
#include <dlfcn.h>
#include <elf.h>
#include <errno.h>
#include <link.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>
#include <sys/auxv.h>

#include "kif/zellibs.h"

#if defined(__SANITIZE_ADDRESS__)
#define OWN_ALLOCATOR 0
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define OWN_ALLOCATOR 0
#endif
#endif
#ifndef OWN_ALLOCATOR
#define OWN_ALLOCATOR 1
#endif

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

bool Fails(const char *operation, const void *caller, uint32_t *calls) {
  if (!IsInProgram(caller)) return false;
  const char *failing = getenv("FAIL_OPERATION");
  if (failing == nullptr || strcmp(failing, operation) != 0) return false;
  return ++*calls == NumberFrom("FAIL_CALL", 1);
}

KIF_Status FailStatus() {
  return NumberFrom("FAIL_STATUS", KIF_STATUS_FAILURE);
}

template <typename Operation>
Operation *Next(const char *name) {
  return reinterpret_cast<Operation *>(dlsym(RTLD_NEXT, name));
}

}  // namespace

#define OPERATION(Result, name, failure, parameters, arguments)                          \
  Result name parameters {                                                               \
    static uint32_t calls;                                                               \
    static auto *next = Next<decltype(name)>(#name);                                     \
    return Fails(#name, __builtin_return_address(0), &calls) ? failure : next arguments; \
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

#if OWN_ALLOCATOR

// dlsym() allocates, so the allocator is reached by its other names.
extern "C" {
void *__libc_malloc(size_t size);
void *__libc_calloc(size_t count, size_t size);
void *__libc_realloc(void *block, size_t size);

#define ALLOCATION(name, parameters, arguments)               \
  void *name parameters {                                     \
    static uint32_t calls;                                    \
    if (!Fails(#name, __builtin_return_address(0), &calls)) { \
      return __libc_##name arguments;                         \
    }                                                         \
    errno = ENOMEM;                                           \
    return nullptr;                                           \
  }

ALLOCATION(malloc, (size_t size) noexcept, (size))
ALLOCATION(calloc, (size_t count, size_t size) noexcept, (count, size))
ALLOCATION(realloc, (void *block, size_t size) noexcept, (block, size))
}

#endif
