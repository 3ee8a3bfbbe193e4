// The volumes in memory: mounted archives (tardisks) and mounts in memory (ramdisks).
#pragma once

#include <cstddef>
#include <cstdint>

#include "linux/files.h"
#include "linux/mounts.h"

struct Volume {
  const Mount *mount;
  bool isTardisk;
};

// The volumes, as they were when they were last asked for, in the order of their names.
struct VolumeTable {
  bool read = false;
  MountTable mounts;
  Array<Volume> volumes;
};

// Reads the volumes afresh (`refresh`), or hands out the last ones.
KIF_Status NeedVolumes(bool refresh, const VolumeTable **table);

// Opens the top folder of a volume. There is none where the host is a tree of files.
KIF_Status OpenVolume(const Volume &volume, Descriptor *folder);
