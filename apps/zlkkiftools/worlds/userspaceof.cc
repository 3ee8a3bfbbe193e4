// userspaceof: prints the userspace of a world.
#include <stdint.h>
#include <stdio.h>

#include "kif/kif.h"
#include "output.h"
#include "records/worlds.h"
#include "tools.h"
#include "worlds/id_argument.h"

namespace {

// Prints the userspace of every world with this ID. False when there is none, or the walk failed.
bool PrintUserspace(uint32_t worldID) {
  const ParamListHandle selector = CreateInstance();
  if (selector == nullptr) {
    fputs("CartelList: Not enough memory\n", Messages());
    return false;
  }
  ParamListHandle worlds;
  const KIF_Status status = GetInstanceList(KIF_NODE_world, nullptr, &worlds);
  if (status != 0) {
    fprintf(Messages(), "CartelList: error fetching cartel list 0x%x\n", status);
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
    fputs("find the userspace ID of running programs\nuserspaceof WID\n", Messages());
    return 1;
  }
  const uint32_t worldID = ParseId(argv[1]);
  if (worldID == 0) {
    puts("bad world ID");
    return 1;
  }
  return PrintUserspace(worldID) ? 0 : 1;
}
