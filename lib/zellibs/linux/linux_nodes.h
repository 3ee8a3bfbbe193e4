// What the Linux host answers: the routines that the rows of nodes.def name. All of them have the
// methods of Host (host.h): parameters are checked for number and type before they are called,
// records are zero, lists empty.
#pragma once

#include "host.h"
#include "param_list.h"
#include "status.h"

// The integer at `index` of a list that has been checked.
inline int64_t Integer(const KIF_ParamList *list, uint32_t index) {
  return list->params[index].integer;
}

using RecordRoutine = KIF_Status(const NodeInfo &node, const KIF_ParamList *instance, void *record);
using InstancesRoutine = KIF_Status(const NodeInfo &node, const KIF_ParamList *parent,
                                    KIF_ParamList *list);
using LengthRoutine = KIF_Status(const NodeInfo &node, const KIF_ParamList *instance,
                                 uint32_t *length);
using ReadRoutine = KIF_Status(const NodeInfo &node, const KIF_ParamList *instance, uint32_t offset,
                               uint32_t wanted, void *bytes, uint32_t *given);
using SetRoutine = KIF_Status(const NodeInfo &node, const KIF_ParamList *instance,
                              const KIF_ParamList *input);

#define LIST(routine) InstancesRoutine routine;
#define RECORD(type, routine, ...) RecordRoutine routine;
#define CONTENT(lengthRoutine, readRoutine, ...) \
  LengthRoutine lengthRoutine;                   \
  ReadRoutine readRoutine;
#define SET(routine) SetRoutine routine;
#define NODE(path, group, parameters, ...) __VA_ARGS__
#include "nodes.def"

// Writes the kernel's build date to `date` (21 bytes, terminated).
KIF_Status GetKernelBuildDate(char *date);
