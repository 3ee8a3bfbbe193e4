#include "worlds/world_list.h"

#include <stdio.h>

#include <algorithm>

#include "output.h"
#include "records/worlds.h"
#include "worlds/ps_printer.h"
#include "worlds/world_reader.h"
#include "worlds/world_record.h"

uint32_t requestedUserspace = 0;
uint32_t maxWorldID = 0;
uint32_t maxNameLength = 0;
int32_t deepestLevel = 0;

namespace {

constexpr uint32_t kUserspaces = 128;
constexpr uint32_t kHighestUserspace = kUserspaces - 1;

// Entry n - 1 is the root record of userspace n; the last entry stays empty.
struct UserspaceTable {
  WorldRecord *roots[kUserspaces] = {};
};

// A record that others can hang under, by its ID.
struct WorldPlace {
  uint32_t worldID;
  uint32_t place;
};

void RegisterRoot(WorldRecord *record, UserspaceTable *table) {
  if (!IsUserspaceRoot(*record)) return;
  if (record->userspaceID > kHighestUserspace) {
    fputs("Warning: maximum number of userspaces reached...\n", Messages());
  } else {
    table->roots[record->userspaceID - 1] = record;
  }
}

bool BuildInventory(WorldInventory *inventory, UserspaceTable *table) {
  const size_t count = inventory->worldCount + inventory->zombies.size();
  inventory->all.reset(static_cast<WorldRecord **>(calloc(count + 1, sizeof(void *))));
  if (inventory->all == nullptr) {
    fputs("WorldList: malloc failed when allocating allNodes list\n", Messages());
    return false;
  }
  for (size_t i = 0; i < inventory->worldCount; ++i) {
    WorldRecord *record = &inventory->worlds[i];
    inventory->all[inventory->allCount++] = record;
    RegisterRoot(record, table);
    for (uint32_t j = 0; j < record->zombieCount; ++j) {
      inventory->all[inventory->allCount++] = &inventory->zombies[record->zombies + j];
    }
  }
  return true;
}

bool IsRunning(const UserspaceTable &table, uint32_t userspace) {
  return userspace <= kUserspaces && table.roots[userspace - 1] != nullptr;
}

void ReportNotRunning(const UserspaceTable &table) {
  fprintf(Messages(), "Requested userspace (%d) is not running.\nAvailable userspaces:\n ",
          static_cast<int>(requestedUserspace));
  for (uint32_t i = 0; i < kUserspaces; ++i) {
    if (table.roots[i] == nullptr) continue;
    fprintf(Messages(), "%3u ", i + 1);
    if (i != 0 && i % 10 == 0) fputc('\n', Messages());
  }
  fputc('\n', Messages());
}

void LinkUnder(WorldRecord *parent, WorldRecord *record) {
  if (parent->firstChild == nullptr) {
    parent->firstChild = record;
  } else {
    parent->lastChild->nextSibling = record;
  }
  parent->lastChild = record;
  record->parent = parent;
  ++parent->nChildren;
  if ((record->worldType & kWorldTypeClone) != 0) ++parent->nThreads;
}

// The userworlds by ID; among equal IDs the first of the inventory comes first.
size_t SortById(const WorldInventory &inventory, WorldPlace *places) {
  size_t count = 0;
  for (size_t i = 0; i < inventory.allCount; ++i) {
    if (inventory.all[i]->cartelID == 0) continue;
    places[count++] = {inventory.all[i]->worldID, static_cast<uint32_t>(i)};
  }
  std::sort(places, places + count, [](const WorldPlace &a, const WorldPlace &b) {
    return a.worldID != b.worldID ? a.worldID < b.worldID : a.place < b.place;
  });
  return count;
}

// Every record hangs under at most one other and a root under none, so that no cycle of parents
// can be reached from a root.
bool LinkTree(WorldInventory *inventory) {
  const std::unique_ptr<WorldPlace[], FreeDeleter> places(
      static_cast<WorldPlace *>(calloc(inventory->allCount + 1, sizeof(WorldPlace))));
  if (places == nullptr) {
    fputs("WorldList: malloc failed when allocating allNodes list\n", Messages());
    return false;
  }
  const WorldPlace *end = places.get() + SortById(*inventory, places.get());
  for (size_t i = 0; i < inventory->allCount; ++i) {
    WorldRecord *record = inventory->all[i];
    if (record->cartelID == 0 || IsUserspaceRoot(*record)) continue;
    const WorldPlace *parent = std::lower_bound(
        static_cast<const WorldPlace *>(places.get()), end,
        static_cast<uint32_t>(record->parentCartelID),
        [](const WorldPlace &place, uint32_t wanted) { return place.worldID < wanted; });
    if (parent == end || parent->worldID != static_cast<uint32_t>(record->parentCartelID)) continue;
    LinkUnder(inventory->all[parent->place], record);
  }
  return true;
}

bool PrintTrees(PsOptions options, const WorldInventory &inventory, const UserspaceTable &table) {
  PsPrinter printer(options, inventory.texts);
  if (!printer.ReserveBranches(inventory)) return false;
  printf("%c)0\n", 27);
  for (uint32_t i = 0; i < kUserspaces; ++i) {
    if (table.roots[i] == nullptr) continue;
    if (requestedUserspace != 0 && i != requestedUserspace - 1) continue;
    printer.PrintHeader();
    printer.PrintTree(*table.roots[i]);
    putchar('\n');
  }
  return true;
}

void PrintFlat(PsOptions options, const WorldInventory &inventory) {
  PsPrinter printer(options, inventory.texts);
  printer.PrintHeader();
  for (size_t i = 0; i < inventory.allCount; ++i) {
    const WorldRecord &record = *inventory.all[i];
    if ((options & PS_USERWORLDS_ONLY) != 0 && record.cartelID == 0) continue;
    if (requestedUserspace != 0 && record.userspaceID != requestedUserspace) continue;
    printer.PrintRow(record);
  }
  putchar('\n');
}

void PrintSummary(PsOptions options, uint32_t total, const WorldInventory &inventory,
                  const UserspaceTable &table) {
  printf("Total worlds:         %u\n", total);
  printf("Total printed worlds: %zu\n", inventory.worldCount);
  if ((options & PS_TREE) != 0) printf("Deepest child:        %d\n", deepestLevel + 1);
  if ((options & PS_ZOMBIES) != 0) printf("Zombie worlds:        %zu\n", inventory.zombies.size());
  const auto filled = std::count_if(table.roots, table.roots + kUserspaces,
                                    [](const WorldRecord *root) { return root != nullptr; });
  printf("Total userspaces:     %d\n", static_cast<int>(filled));
}

}  // namespace

bool WorldList(PsOptions options) {
  WorldInventory inventory;
  UserspaceTable table;
  uint32_t total;
  if (!ReadWorlds(options, &inventory, &total) || !BuildInventory(&inventory, &table)) return false;
  if ((options & PS_USERSPACE) != 0 && requestedUserspace != 0 &&
      !IsRunning(table, requestedUserspace)) {
    ReportNotRunning(table);
    return true;
  }
  if ((options & PS_TREE) != 0) {
    if (!LinkTree(&inventory) || !PrintTrees(options, inventory, table)) return false;
  } else {
    PrintFlat(options, inventory);
  }
  if ((options & PS_SUMMARY) != 0) PrintSummary(options, total, inventory, table);
  return true;
}
