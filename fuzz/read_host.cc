#include "read_host.h"

#include <stdlib.h>
#include <string.h>

#include "nodes.h"
#include "zellibs.h"

namespace {

constexpr int32_t kMostEntries = 12;  // of one list

unsigned char record[1 << 18];

bool IsAsked(const NodeInfo &node, const char *const *prefixes) {
  if (prefixes == nullptr) return true;
  for (; *prefixes != nullptr; ++prefixes) {
    if (strncmp(node.path, *prefixes, strlen(*prefixes)) == 0) return true;
  }
  return false;
}

void ReadContent(uint32_t number, KIF_ParamList *instance) {
  uint32_t length = 0;
  if (KIF_GetDataLength(number, instance, &length) != 0) return;
  const uint32_t wanted = length < 100000 ? length + 1 : 100000;
  const uint32_t request[] = {length > 3 ? 2u : 0u, wanted};
  KIFData *input = KIFData_Create(sizeof(request), request, sizeof(request));
  KIFData *output = KIFData_Create(wanted, nullptr, 0);
  if (KIF_SetData(number, instance, input, output) == 0 &&
      *reinterpret_cast<uint32_t *>(output) > wanted) {
    abort();
  }
  KIFData_Destroy(input);
  KIFData_Destroy(output);
}

void ReadInstances(const char *const *prefixes, KIF_ParamList *selector, size_t count);

void ReadBelow(const char *const *prefixes, KIF_ParamList *list, KIF_ParamList *selector,
               size_t count) {
  for (int32_t i = 0; i < KIF_ParamListUsedCount(list) && i < kMostEntries; ++i) {
    KIF_Param *entry = KIF_ParamListGetParam(list, static_cast<uint32_t>(i));
    const KIF_Status status = entry->type == KIF_PARAM_INTEGER
                                  ? KIF_ParamListAddInt(selector, KIF_ParamGetInt(entry))
                                  : KIF_ParamListAddString(selector, KIF_ParamGetString(entry));
    if (status != 0) abort();
    ReadInstances(prefixes, selector, count + 1);
    KIF_ParamListRemoveLastParam(selector);
  }
}

// Tries a selector on every node: it fits those whose instances it names, and is a wrong one to
// others.
void ReadInstances(const char *const *prefixes, KIF_ParamList *selector, size_t count) {
  for (uint32_t number = 1; number <= kNodeCount; ++number) {
    const NodeInfo &node = kNodes[number - 1];
    if (!IsAsked(node, prefixes)) continue;
    const bool fits = node.parameterCount == count;
    // Every text of a record ends within its field or fills it; the sanitizer sees the rest.
    if (fits && node.hasRecords) KIF_Get(number, selector, record, node.recordSize);
    if (fits && node.hasContents) ReadContent(number, selector);
    if (!node.hasLists || CountOfListParameters(node) != count) continue;
    KIF_ParamList *list = nullptr;
    if (KIF_GetInstanceListAlloc(number, selector, &list) != 0) continue;
    ReadBelow(prefixes, list, selector, count);
    KIF_ParamListDestroy(list);
  }
}

}  // namespace

void ReadHost(const char *const *prefixes) {
  KIF_ParamList *selector = KIF_ParamListCreate(1, 1);
  ReadInstances(prefixes, selector, 0);
  KIF_ParamListDestroy(selector);
}
