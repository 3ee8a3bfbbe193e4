#include "worlds/world_reader.h"

#include <stdio.h>
#include <string.h>

#include "kif/kif.h"
#include "output.h"
#include "records/worlds.h"

namespace {

// What becomes of a world after one of its reads.
enum class Reading { kKept, kSkipped, kFailed };

// The record under way, and the texts that the one before it had.
struct Reader {
  PsOptions options;
  WorldInventory *inventory;
  size_t lastCpuText = 0;
  size_t lastCommandLine = 0;
};

bool NoMemory() {
  fputs("WorldList: Not enough memory\n", Messages());
  return false;
}

void FillInfo(const WorldInfo &info, WorldRecord *record) {
  record->worldID = info.worldID;
  record->groupID = info.groupID;
  record->userspaceID = info.userspaceID;
  record->cartelID = info.cartelID;
  record->parentCartelID = info.parentCartelID;
  record->processGroupID = info.processGroupID;
  record->sessionID = info.sessionID;
  record->worldType = info.worldType;
  record->securityDomain = info.securityDomain;
}

// A world may lack the scheduler's records and is listed all the same; but one that loses them
// half-way has gone.
Reading ReadSchedStats(KIF_ParamList *instance, SchedAffinity *affinity, WorldRecord *record) {
  SchedSummary summary;
  SchedStateTimes times;
  if (ReadRecord(KIF_NODE_sched_Vcpus_stats_summaryStats, instance, &summary) != 0 ||
      ReadRecord(KIF_NODE_sched_Vcpus_stats_affinity, instance, affinity) != 0) {
    return Reading::kKept;
  }
  if (ReadRecord(KIF_NODE_sched_Vcpus_stats_stateTimes, instance, &times) != 0) {
    return Reading::kSkipped;
  }
  record->hasSchedStats = true;
  record->runState = summary.runState;
  record->waitState = summary.waitState;
  record->usedTime = times.usedTime;
  return Reading::kKept;
}

bool FetchChildren(uint32_t cartelID, ParamListHandle *children) {
  const ParamListHandle parent = CreateInstance();
  if (parent == nullptr) {
    fputs("failed to alloc paramlist for children\n", Messages());
    return false;
  }
  const AppendedInt cartel(parent.get(), cartelID);
  if (cartel.status() != 0) {
    fputs("failed to add int to child param list\n", Messages());
    return false;
  }
  // A cartel whose children cannot be listed has none to show.
  (void)GetInstanceList(KIF_NODE_userworld_cartel_child, parent.get(), children);
  return true;
}

bool ReadChild(uint32_t cartelID, int32_t childID, ChildRecord *child) {
  const ParamListHandle instance = CreateInstance();
  if (instance == nullptr) {
    fputs("failed to create children list\n", Messages());
    return false;
  }
  if (KIF_ParamListAddInt(instance.get(), cartelID) != 0) {
    fputs("failed to add cartel ID to list\n", Messages());
    return false;
  }
  if (KIF_ParamListAddInt(instance.get(), childID) != 0) {
    fputs("failed to add child ID to list\n", Messages());
    return false;
  }
  const KIF_Status status = ReadRecord(KIF_NODE_userworld_cartel_child, instance.get(), child);
  if (status != 0) {
    fprintf(Messages(), "failed to get child info for child %d, status %s\n", childID,
            ZLK_ReturnStatusToString(status));
  }
  return status == 0;
}

WorldRecord ZombieOf(const WorldRecord &parent, int32_t childID) {
  WorldRecord zombie = {};
  zombie.worldID = zombie.cartelID = static_cast<uint32_t>(childID);
  zombie.parentCartelID = static_cast<int32_t>(parent.cartelID);
  zombie.processGroupID = parent.processGroupID;
  zombie.sessionID = parent.sessionID;
  zombie.userspaceID = parent.userspaceID;
  zombie.isZombie = true;
  return zombie;
}

// Every world of a cartel looks at the cartel's children; its main world keeps the zombies.
bool CollectZombies(WorldInventory *inventory, WorldRecord *record) {
  ParamListHandle children;
  if (!FetchChildren(record->cartelID, &children)) return false;
  const int32_t count = children != nullptr ? KIF_ParamListUsedCount(children.get()) : 0;
  if (count > 0 && !inventory->zombies.Reserve(static_cast<size_t>(count))) {
    fputs("failed to allocate array for zombies\n", Messages());
    return false;
  }
  record->zombies = inventory->zombies.size();
  for (int32_t i = 0; i < count; ++i) {
    int32_t childID;
    if (KIF_ParamListGetInt32(children.get(), static_cast<uint32_t>(i), &childID) != 0) {
      fputs("failed to get child ID\n", Messages());
      return false;
    }
    ChildRecord child;
    if (!ReadChild(record->cartelID, childID, &child)) return false;
    if (child.childState != kChildStateZombie || record->worldID != record->cartelID) continue;
    inventory->zombies.Append(ZombieOf(*record, childID));  // there is room
    ++record->zombieCount;
  }
  return true;
}

bool ReadCommandLine(Reader *reader, InstanceWalk *walk, WorldRecord *record) {
  CartelCommandLine commandLine;
  const char *text = "<unavailable>";
  if (walk->Replace(record->cartelID) == 0 &&
      ReadRecord(KIF_NODE_userworld_cartel_cmdline, walk->selector(), &commandLine) == 0) {
    text = FieldText(commandLine.cmdline);
  }
  if (!reader->inventory->texts.Add(text, reader->lastCommandLine, &record->commandLine)) {
    return NoMemory();
  }
  reader->lastCommandLine = record->commandLine;
  return true;
}

void RaiseWidths(const WorldRecord &record, size_t nameLength) {
  if (nameLength > maxNameLength) maxNameLength = static_cast<uint32_t>(nameLength);
  if (record.worldID > maxWorldID) maxWorldID = record.worldID;
}

Reading ReadWorld(Reader *reader, InstanceWalk *walk, WorldRecord *record) {
  WorldName name;
  WorldInfo info;
  SchedAffinity affinity;
  KIF_ParamList *instance = walk->selector();
  record->nThreads = 1;
  if (ReadRecord(KIF_NODE_world_name, instance, &name) != 0 ||
      ReadRecord(KIF_NODE_world_info, instance, &info) != 0) {
    return Reading::kSkipped;
  }
  FillInfo(info, record);
  if (ReadSchedStats(instance, &affinity, record) == Reading::kSkipped) return Reading::kSkipped;
  if ((reader->options & PS_USERWORLDS_ONLY) != 0 && record->cartelID == 0) {
    return Reading::kSkipped;
  }
  RaiseWidths(*record, strlen(FieldText(name.name)));
  WorldTexts &texts = reader->inventory->texts;
  const char *cpuText = record->hasSchedStats ? FieldText(affinity.cpuText) : "";
  if (!texts.Add(name.name, 0, &record->name) ||
      !texts.Add(cpuText, reader->lastCpuText, &record->cpuText)) {
    NoMemory();
    return Reading::kFailed;
  }
  reader->lastCpuText = record->cpuText;
  if (record->cartelID == 0) return Reading::kKept;
  if (!ReadCommandLine(reader, walk, record)) return Reading::kFailed;
  const bool wantsZombies = (reader->options & PS_ZOMBIES) != 0;
  if (wantsZombies && !CollectZombies(reader->inventory, record)) return Reading::kFailed;
  return Reading::kKept;
}

}  // namespace

bool WorldTexts::Add(const char *text, size_t same, size_t *place) {
  if (texts_.size() > 0 && strcmp(text, At(same)) == 0) {
    *place = same;
    return true;
  }
  // The empty text, and room for those of a small host at once.
  if (texts_.size() == 0 && !(texts_.Reserve(65535) && texts_.Append("", 1))) return false;
  *place = texts_.size();
  return texts_.Append(text, strlen(text) + 1);
}

bool ReadWorlds(PsOptions options, WorldInventory *inventory, uint32_t *total) {
  const ParamListHandle instance = CreateInstance();
  if (instance == nullptr) return NoMemory();
  ParamListHandle worlds;
  const KIF_Status status =
      GetInstanceList((options & PS_CARTELS_ONLY) != 0 ? KIF_NODE_userworld_cartel : KIF_NODE_world,
                      nullptr, &worlds);
  if (status != 0) {
    fprintf(Messages(), "WorldList: error fetching world list 0x%x\n", status);
    return false;
  }
  InstanceWalk walk(worlds.get(), instance.get());
  *total = walk.count();
  inventory->worlds.reset(
      static_cast<WorldRecord *>(calloc(size_t{*total} + 1, sizeof(WorldRecord))));
  if (inventory->worlds == nullptr) {
    fputs("WorldList: malloc failed when allocating root tree node\n", Messages());
    return false;
  }
  Reader reader = {options, inventory};
  while (walk.Next()) {
    WorldRecord *record = &inventory->worlds[inventory->worldCount];
    const Reading reading = ReadWorld(&reader, &walk, record);
    if (reading == Reading::kFailed) return false;
    if (reading == Reading::kKept) {
      ++inventory->worldCount;
    } else {
      *record = {};
    }
  }
  return !walk.failed();
}
