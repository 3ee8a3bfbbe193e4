// Reading the records of a volume, for the tools that show volumes.
#pragma once

#include "kif/kif.h"
#include "records/morelfs.h"

// Reads the statistics of the volume `name` from `node`, which must be the one of the Record.
template <typename Record>
KIF_Status ReadVolumeStats(KIF_NodeId node, const char *name, Record *record) {
  const ParamListHandle instance = CreateInstance();
  if (instance == nullptr) return KIF_STATUS_NO_MEMORY;
  const KIF_Status status = KIF_ParamListAddString(instance.get(), name);
  return status != 0 ? status : ReadRecord(node, instance.get(), record);
}
