// ZELLIBS_TRACE=FILE: one line for every operation, and at the end of the process the lists and
// data objects that were never destroyed. Costs one test of a flag where it is not asked for.
#pragma once

#include "nodes.h"
#include "zellibs.h"

enum class TraceKind { kList, kData };

// An operation on a node: its name, the node's number, the selecting list, an extra list (the
// input of KIF_Set; may be null) and the status it gave.
void TraceOperation(const char *operation, uint32_t node, const KIF_ParamList *instance,
                    const KIF_ParamList *input, KIF_Status status);

// An operation on no node: its name, an argument (may be null) and its result.
void TraceCall(const char *operation, const char *argument, uint32_t result);

// A list or data object was made (null: could not be made) or destroyed.
void TraceCreated(TraceKind kind, const void *object);
void TraceDestroyed(TraceKind kind, const void *object);
