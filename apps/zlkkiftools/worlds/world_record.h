// Everything that is known about one world while ps runs. Only what is shown is kept of the
// kernel's records, so that a host of a million worlds fits in memory.
#pragma once

#include <stddef.h>
#include <stdint.h>

#include <memory>

#include "base/array.h"
#include "base/bytes.h"
#include "base/free_deleter.h"

struct WorldRecord {
  uint64_t usedTime;  // in microseconds
  size_t name;        // places in the inventory's texts
  size_t cpuText;
  size_t commandLine;  // an empty text for a kernel world
  WorldRecord *nextSibling;
  WorldRecord *firstChild;
  WorldRecord *lastChild;
  WorldRecord *parent;
  size_t zombies;  // place of its first zombie record among the inventory's
  uint32_t zombieCount;
  uint32_t worldID;
  uint32_t userspaceID;
  uint32_t cartelID;
  uint32_t worldType;
  uint32_t runState;
  uint32_t waitState;
  int32_t groupID;
  int32_t parentCartelID;
  int32_t processGroupID;
  int32_t sessionID;
  int32_t securityDomain;
  int32_t nChildren;
  int32_t nThreads;
  bool hasSchedStats;
  bool isZombie;
};

inline bool IsUserspaceRoot(const WorldRecord &record) {
  return record.userspaceID != 0 && record.parentCartelID == 0;
}

// The texts of the records, one after the other, each terminated. The first one is empty.
class WorldTexts {
 public:
  // Adds a text and gives its place. A text equal to the one at `same` is not added again: the
  // worlds of one cartel share their command line, and nearly all worlds their CPUs. False
  // without memory.
  bool Add(const char *text, size_t same, size_t *place);
  const char *At(size_t place) const { return texts_.text() + place; }

 private:
  Bytes texts_;
};

// The records that are listed: those of the worlds that were kept, in the order of the host's list,
// each followed by its zombie records.
struct WorldInventory {
  std::unique_ptr<WorldRecord[], FreeDeleter> worlds;
  size_t worldCount = 0;
  Array<WorldRecord> zombies;
  WorldTexts texts;
  std::unique_ptr<WorldRecord *[], FreeDeleter> all;
  size_t allCount = 0;
};
