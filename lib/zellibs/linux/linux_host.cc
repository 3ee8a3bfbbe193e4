// The Linux machine as a host: hands what is asked of a node to the routines that its row names.
#include "linux/linux_nodes.h"

namespace {

// Whether `list` holds the first `count` parameters of a node; texts must have a value.
bool Selects(const KIF_ParamList *list, const NodeInfo &node, size_t count) {
  for (uint32_t i = 0; i < count; ++i) {
    int64_t integer;
    const bool fits = ParameterOf(node, i).type == kInteger ? IntegerAt(list, i, &integer)
                                                            : TextAt(list, i) != nullptr;
    if (!fits) return false;
  }
  return CountOf(list) == count;
}

// Of a row the routine that answers, where it names one of the kind that is asked for; jumps,
// unlike a table of pointers, cost a process that starts nothing.
#define CASE(path, group, parameters, ...) \
  case kNode_##path:                       \
    __VA_ARGS__                            \
    break;

KIF_Status GetLinuxRecord(const NodeInfo &node, const KIF_ParamList *instance, void *record) {
  if (!Selects(instance, node, node.parameterCount)) return KIF_STATUS_BAD_PARAMETER;
  switch (IndexOf(node)) {
#define NODE CASE
#define RECORD(type, routine, ...) return routine(node, instance, record);
#include "nodes.def"
    default:
      break;
  }
  return KIF_STATUS_NOT_SUPPORTED;
}

KIF_Status GetLinuxInstances(const NodeInfo &node, const KIF_ParamList *parent,
                             KIF_ParamList *list) {
  if (!Selects(parent, node, CountOfListParameters(node))) return KIF_STATUS_BAD_PARAMETER;
  switch (IndexOf(node)) {
#define NODE CASE
#define LIST(routine) return routine(node, parent, list);
#include "nodes.def"
    default:
      break;
  }
  return KIF_STATUS_NOT_SUPPORTED;
}

KIF_Status GetLinuxContentLength(const NodeInfo &node, const KIF_ParamList *instance,
                                 uint32_t *length) {
  if (!Selects(instance, node, node.parameterCount)) return KIF_STATUS_BAD_PARAMETER;
  switch (IndexOf(node)) {
#define NODE CASE
#define CONTENT(lengthRoutine, ...) return lengthRoutine(node, instance, length);
#include "nodes.def"
    default:
      break;
  }
  return KIF_STATUS_NOT_SUPPORTED;
}

KIF_Status GetLinuxContent(const NodeInfo &node, const KIF_ParamList *instance, uint32_t offset,
                           uint32_t wanted, void *bytes, uint32_t *given) {
  if (!Selects(instance, node, node.parameterCount)) return KIF_STATUS_BAD_PARAMETER;
  switch (IndexOf(node)) {
#define NODE CASE
#define CONTENT(lengthRoutine, readRoutine, ...) \
  return readRoutine(node, instance, offset, wanted, bytes, given);
#include "nodes.def"
    default:
      break;
  }
  return KIF_STATUS_NOT_SUPPORTED;
}

KIF_Status SetOnLinux(const NodeInfo &node, const KIF_ParamList *instance,
                      const KIF_ParamList *input) {
  switch (IndexOf(node)) {
#define NODE CASE
#define SET(routine) return routine(node, instance, input);
#include "nodes.def"
    default:
      break;
  }
  return KIF_STATUS_NOT_SUPPORTED;
}

KIF_Status CheckLinuxSignature(char *date, bool *matches) {
  *matches = true;  // what is published here is published in the library's own interface
  return GetKernelBuildDate(date);
}

}  // namespace

const Host kLinuxHost = {
    GetLinuxRecord,  GetLinuxInstances, GetLinuxContentLength,
    GetLinuxContent, SetOnLinux,        CheckLinuxSignature,
};
