// The C face of the platform library, libzellibs.so. Every symbol carries the version tag
// NEVRAPLATFORM. The library includes this header too, so that the compiler compares the two sides.
#pragma once

#include <stdbool.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

// Identifier of a node; the numbers differ from library to library and are read at run time.
typedef uint16_t KIF_NodeId;

// Result of an operation; 0 is success.
typedef uint32_t KIF_Status;

// An ordered list of parameters: it selects an instance of a node (outermost level first), or is
// a list of instances that the library hands out.
typedef struct KIF_ParamList KIF_ParamList;

// One parameter. `type` is all that callers read directly; the rest is the library's.
typedef struct KIF_Param {
  uint32_t type;
} KIF_Param;

enum { KIF_PARAM_INTEGER = 0, KIF_PARAM_STRING = 1 };

// The kinds of KIF_ParamListCreate.
enum { KIF_PARAMLIST_INPUT = 0, KIF_PARAMLIST_INSTANCE = 1 };

// A byte buffer. `length`, the number of valid bytes, is all that callers read directly.
typedef struct KIFData {
  uint32_t length;
} KIFData;

// One row of a state table; the row whose `name` is null ends the table.
typedef struct CpuSched_StateElement {
  uint32_t reserved[2];
  const char *name;
} CpuSched_StateElement;

// Reads the record of `node` for `instance` (null: none) into `size` bytes of `buffer`.
KIF_Status KIF_Get(uint32_t node, KIF_ParamList *instance, void *buffer, uint32_t size);

// Writes `input` to `node`; the answer, if any, goes to `outputSize` bytes of `output`.
KIF_Status KIF_Set(uint32_t node, KIF_ParamList *instance, KIF_ParamList *input, void *output,
                   uint32_t outputSize);

// Total length in bytes of the content of `node`; 0 in `length` where there is none.
KIF_Status KIF_GetDataLength(uint32_t node, KIF_ParamList *instance, uint32_t *length);

// Sends the request `input` to the content of `node`; the answer and its length go to `output`.
KIF_Status KIF_SetData(uint32_t node, KIF_ParamList *instance, KIFData *input, KIFData *output);

// The instances of `node` below `parent` (null: none), as a new list that the caller destroys.
// `*list` is written only when the status is 0. `hint` is always 0.
KIF_Status KIF_GetInstanceListAlloc(uint32_t node, KIF_ParamList *parent, KIF_ParamList **list);
KIF_Status KIF_GetInstanceListAllocHint(uint32_t node, KIF_ParamList *parent, uint32_t hint,
                                        KIF_ParamList **list);

// A new data object of `capacity` bytes that holds the first `length` of `bytes` (null: none);
// null without memory.
KIFData *KIFData_Create(uint32_t capacity, const void *bytes, uint32_t length);
void *KIFData_GetData(KIFData *data);
void KIFData_Destroy(KIFData *data);

// A new list of KIF_PARAMLIST_* `kind` with room for `size` parameters, growing beyond that as
// needed; null without memory.
KIF_ParamList *KIF_ParamListCreate(uint32_t kind, uint32_t size);
void KIF_ParamListDestroy(KIF_ParamList *list);
KIF_Status KIF_ParamListAddInt(KIF_ParamList *list, int64_t value);
KIF_Status KIF_ParamListAddString(KIF_ParamList *list, const char *text);
void KIF_ParamListRemoveLastParam(KIF_ParamList *list);
int32_t KIF_ParamListUsedCount(KIF_ParamList *list);
KIF_Param *KIF_ParamListGetParam(KIF_ParamList *list, uint32_t index);
KIF_Status KIF_ParamListGetInt32(KIF_ParamList *list, uint32_t index, int32_t *value);
KIF_Status KIF_ParamListGetUInt64(KIF_ParamList *list, uint32_t index, uint64_t *value);
KIF_Status KIF_ParamListGetString(KIF_ParamList *list, uint32_t index, const char **text);
int64_t KIF_ParamGetInt(KIF_Param *param);
const char *KIF_ParamGetString(KIF_Param *param);  // may be null

// Makes the cache file `path` the host that later operations read; `flags` is 0.
KIF_Status KIF_UseCache(const char *path, uint32_t flags);

// Readies live access; called with 1, 0, 0.
int32_t ZlkSyscall_Init(uint32_t first, uint32_t second, uint32_t third);

// 0 when the library's interface signature is the kernel's. Otherwise `kernelBuildDate` (`size`
// bytes) and `*programBuildDate` tell when the two sides were built.
KIF_Status KIF_CheckSig(char *kernelBuildDate, uint32_t size, const char **programBuildDate);

bool HostType_OSIsZLK(void);
bool HostType_OSIsSimulator(void);

// Whether the live host is not the machine that this process runs on: a file or a tree of files.
// A library need not have it: callers take it as a weak symbol.
bool KIF_HostIsForeign(void);

// Constant text for a status; never null.
const char *ZLK_ReturnStatusToString(KIF_Status status);

extern const CpuSched_StateElement CpuSched_RunStateElements[];
extern const CpuSched_StateElement CpuSched_WaitStateElements[];

// KIF_NODE_<path>, for every node that the tools read.
#define NODE(path, ...) extern const KIF_NodeId KIF_NODE_##path;
#define BEYOND(...)
#include "nodes.def"

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop
