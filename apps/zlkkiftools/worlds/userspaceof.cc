// userspaceof: prints the userspace of a world.
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>

#include "kif/kif.h"
#include "records/worlds.h"
#include "tools.h"

namespace {

// As strtoul where a long has the 32 bits of a world ID: a minus sign negates within them, and what
// has too many digits for them is the largest ID.
uint32_t ParseWorldId(const char *text) {
  const long long value = strtoll(text, nullptr, 10);
  const bool fits = value >= -int64_t{UINT32_MAX} && value <= UINT32_MAX;
  return fits ? static_cast<uint32_t>(value) : UINT32_MAX;
}

// Prints the userspace of every world with this ID. False when there is none, or the walk failed.
bool PrintUserspace(uint32_t worldID) {
  const ParamListHandle selector = CreateInstance();
  if (selector == nullptr) {
    fputs("CartelList: Not enough memory\n", stderr);
    return false;
  }
  ParamListHandle worlds;
  const KIF_Status status = GetInstanceList(KIF_NODE_world, nullptr, &worlds);
  if (status != 0) {
    fprintf(stderr, "CartelList: error fetching cartel list 0x%x\n", status);
    return false;
  }
  bool found = false;
  InstanceWalk walk(worlds.get(), selector.get());
  while (walk.Next()) {
    WorldInfo info = {};
    if (ReadRecord(KIF_NODE_world_info, selector.get(), &info) != 0) continue;
    if (info.worldID != worldID) continue;
    printf("%d ", static_cast<int32_t>(info.userspaceID));
    found = true;
  }
  if (walk.failed() || !found) return false;
  putchar('\n');
  return true;
}

}  // namespace

int UserspaceofEntry(int argc, char **argv) {
  if (argc < 2) {
    fputs("find the userspace ID of running programs\nuserspaceof WID\n", stderr);
    return 1;
  }
  const uint32_t worldID = ParseWorldId(argv[1]);
  if (worldID == 0) {
    puts("bad world ID");
    return 1;
  }
  return PrintUserspace(worldID) ? 0 : 1;
}
