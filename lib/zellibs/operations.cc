// The operations on nodes and on the host as a whole, the node variables and the state tables.
#include <cstdio>
#include <cstring>

#include "data.h"
#include "host.h"
#include "nodes.h"
#include "param_list.h"
#include "records/platform.h"
#include "states.h"
#include "status.h"
#include "trace.h"
#include "zellibs.h"

#define NODE(path, ...) const KIF_NodeId KIF_NODE_##path = kNode_##path + 1;
#define BEYOND(...)
#include "nodes.def"

#define STATE(place, name) {{0, 0}, name},
const CpuSched_StateElement CpuSched_RunStateElements[] = {
    RUN_STATES(STATE){{0, 0}, nullptr},
};
const CpuSched_StateElement CpuSched_WaitStateElements[] = {
    WAIT_STATES(STATE){{0, 0}, nullptr},
};
#undef STATE

namespace {

KIF_Status FindNodeAndHost(uint32_t number, const NodeInfo **node, const Host **host) {
  *node = FindNode(number);
  const KIF_Status status = CurrentHost(host);
  if (status != KIF_STATUS_OK) return status;
  return *node != nullptr ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

KIF_Status GetCatalogueHash(void *buffer, uint32_t size) {
  const uint64_t hash = CatalogueHash();
  if (buffer == nullptr || size != sizeof(hash)) return KIF_STATUS_BAD_PARAMETER;
  memcpy(buffer, &hash, sizeof(hash));
  return KIF_STATUS_OK;
}

KIF_Status GetRecord(uint32_t number, const KIF_ParamList *instance, void *buffer, uint32_t size) {
  const NodeInfo *node;
  const Host *host;
  if (number == kCatalogueNumber) return GetCatalogueHash(buffer, size);
  const KIF_Status status = FindNodeAndHost(number, &node, &host);
  if (status != KIF_STATUS_OK) return status;
  if (!node->hasRecords) return KIF_STATUS_NOT_SUPPORTED;
  if (buffer == nullptr || size < node->recordSize) return KIF_STATUS_BAD_PARAMETER;
  memset(buffer, 0, size);
  return host->getRecord(*node, instance, buffer);
}

KIF_Status GetInstances(uint32_t number, const KIF_ParamList *parent, KIF_ParamList **list) {
  const NodeInfo *node;
  const Host *host;
  KIF_Status status = FindNodeAndHost(number, &node, &host);
  if (status != KIF_STATUS_OK) return status;
  if (!node->hasLists) return KIF_STATUS_NOT_SUPPORTED;
  if (list == nullptr) return KIF_STATUS_BAD_PARAMETER;
  KIF_ParamList *instances = KIF_ParamListCreate(KIF_PARAMLIST_INSTANCE, 0);
  if (instances == nullptr) return KIF_STATUS_NO_MEMORY;
  status = host->getInstances(*node, parent, instances);
  if (status == KIF_STATUS_OK) {
    *list = instances;
  } else {
    KIF_ParamListDestroy(instances);
  }
  return status;
}

KIF_Status GetContentLength(uint32_t number, const KIF_ParamList *instance, uint32_t *length) {
  const NodeInfo *node;
  const Host *host;
  if (length == nullptr) return KIF_STATUS_BAD_PARAMETER;
  *length = 0;
  const KIF_Status status = FindNodeAndHost(number, &node, &host);
  if (status != KIF_STATUS_OK) return status;
  if (!node->hasContents) return KIF_STATUS_NOT_SUPPORTED;
  return host->getContentLength(*node, instance, length);
}

KIF_Status GetContent(uint32_t number, const KIF_ParamList *instance, KIFData *input,
                      KIFData *output) {
  const NodeInfo *node;
  const Host *host;
  const KIF_Status status = FindNodeAndHost(number, &node, &host);
  if (status != KIF_STATUS_OK) return status;
  if (!node->hasContents) return KIF_STATUS_NOT_SUPPORTED;
  ContentRequest request;
  if (input == nullptr || output == nullptr || DataOf(input)->length < sizeof(request)) {
    return KIF_STATUS_BAD_PARAMETER;
  }
  memcpy(&request, DataOf(input)->bytes, sizeof(request));
  Data *answer = DataOf(output);
  answer->length = 0;
  const uint32_t room = request.wanted < answer->capacity ? request.wanted : answer->capacity;
  return host->getContent(*node, instance, request.offset, room, answer->bytes, &answer->length);
}

KIF_Status Set(uint32_t number, const KIF_ParamList *instance, const KIF_ParamList *input) {
  const NodeInfo *node;
  const Host *host;
  const KIF_Status status = FindNodeAndHost(number, &node, &host);
  if (status != KIF_STATUS_OK) return status;
  if (!node->settable) return KIF_STATUS_NOT_SUPPORTED;
  return host->set(*node, instance, input);
}

KIF_Status CheckSignature(char *date) {
  const Host *host;
  KIF_Status status = CurrentHost(&host);
  // No file, no mismatch: the first read fails with what is wrong.
  if (TellOfUnusableHost()) return KIF_STATUS_OK;
  if (status != KIF_STATUS_OK) return status;
  bool matches = false;
  status = host->checkSignature(date, &matches);
  if (status != KIF_STATUS_OK) return status;
  return matches ? KIF_STATUS_OK : KIF_STATUS_FAILURE;
}

}  // namespace

KIF_Status KIF_Get(uint32_t node, KIF_ParamList *instance, void *buffer, uint32_t size) {
  const KIF_Status status = GetRecord(node, instance, buffer, size);
  TraceOperation("KIF_Get", node, instance, nullptr, status);
  return status;
}

// No node of a host answers a write with a record, so `output` stays as it is.
KIF_Status KIF_Set(uint32_t node, KIF_ParamList *instance, KIF_ParamList *input, void *, uint32_t) {
  const KIF_Status status = Set(node, instance, input);
  TraceOperation("KIF_Set", node, instance, input, status);
  return status;
}

KIF_Status KIF_GetDataLength(uint32_t node, KIF_ParamList *instance, uint32_t *length) {
  const KIF_Status status = GetContentLength(node, instance, length);
  TraceOperation("KIF_GetDataLength", node, instance, nullptr, status);
  return status;
}

KIF_Status KIF_SetData(uint32_t node, KIF_ParamList *instance, KIFData *input, KIFData *output) {
  const KIF_Status status = GetContent(node, instance, input, output);
  TraceOperation("KIF_SetData", node, instance, nullptr, status);
  return status;
}

KIF_Status KIF_GetInstanceListAlloc(uint32_t node, KIF_ParamList *parent, KIF_ParamList **list) {
  const KIF_Status status = GetInstances(node, parent, list);
  TraceOperation("KIF_GetInstanceListAlloc", node, parent, nullptr, status);
  return status;
}

KIF_Status KIF_GetInstanceListAllocHint(uint32_t node, KIF_ParamList *parent, uint32_t,
                                        KIF_ParamList **list) {
  const KIF_Status status = GetInstances(node, parent, list);
  TraceOperation("KIF_GetInstanceListAllocHint", node, parent, nullptr, status);
  return status;
}

KIF_Status KIF_UseCache(const char *path, uint32_t) {
  const KIF_Status status = path != nullptr ? UseRecordedHost(path) : KIF_STATUS_BAD_PARAMETER;
  TraceCall("KIF_UseCache", path, status);
  return status;
}

int32_t ZlkSyscall_Init(uint32_t, uint32_t, uint32_t) {
  TraceCall("ZlkSyscall_Init", nullptr, 0);
  return 0;
}

KIF_Status KIF_CheckSig(char *kernelBuildDate, uint32_t size, const char **programBuildDate) {
  char date[sizeof(kInterfaceDate)] = "unknown";
  const KIF_Status status = CheckSignature(date);
  if (kernelBuildDate != nullptr && size > 0) snprintf(kernelBuildDate, size, "%s", date);
  if (programBuildDate != nullptr) *programBuildDate = kInterfaceDate;
  TraceCall("KIF_CheckSig", nullptr, status);
  return status;
}

bool HostType_OSIsZLK() {
  TraceCall("HostType_OSIsZLK", nullptr, 0);
  return false;
}

bool HostType_OSIsSimulator() {
  const bool simulator = HasLiveHost();
  TraceCall("HostType_OSIsSimulator", nullptr, simulator ? 1 : 0);
  return simulator;
}

bool KIF_HostIsForeign() {
  const bool foreign = IsForeignHost();
  TraceCall("KIF_HostIsForeign", nullptr, foreign ? 1 : 0);
  return foreign;
}
