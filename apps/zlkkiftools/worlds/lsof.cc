// lsof: lists the open descriptors and mapped files of every cartel.
#include <stddef.h>
#include <stdint.h>
#include <stdio.h>

#include "kif/kif.h"
#include "output.h"
#include "records/worlds.h"
#include "tools.h"

namespace {

struct Cartel {
  int32_t cartelID;
  const char *name;  // of its main world
};

void PrintRow(const Cartel &cartel, int32_t descriptor, DescriptorRecord *record) {
  const Shown name(cartel.name);
  const Shown kind(FieldText(record->kind));
  const Shown description(FieldText(record->description));
  printf("%-10d  %-20s  %-20s   %6d   %s\n", cartel.cartelID, name.text(), kind.text(), descriptor,
         description.text());
}

void PrintRow(const Cartel &cartel, int32_t, MappingRecord *record) {
  if (record->kind != kMappingOfFile) return;
  const Shown name(cartel.name);
  const Shown description(FieldText(record->description));
  printf("%-10d  %-20s  %-20s   %6d   %s (prot:%s%s/len:%u)\n", cartel.cartelID, name.text(),
         "MMAP", record->descriptor, description.text(),
         (record->protection & kMappingReadable) != 0 ? "R" : "-",
         (record->protection & kMappingWritable) != 0 ? "W" : "-", record->length);
}

// Prints the rows of the `objects`, instances of `node`, of the cartel that `selector` holds;
// `what` is their name in the message. Fails only where an object cannot be selected.
template <typename Record>
KIF_Status PrintObjects(KIF_NodeId node, const char *what, const Cartel &cartel,
                        KIF_ParamList *objects, KIF_ParamList *selector) {
  const int32_t count = KIF_ParamListUsedCount(objects);
  for (int32_t i = 0; i < count; ++i) {
    KIF_Param *param = KIF_ParamListGetParam(objects, static_cast<uint32_t>(i));
    if (param == nullptr) continue;
    const int64_t value = KIF_ParamGetInt(param);
    const AppendedInt object(selector, value);
    if (object.status() != 0) {
      printf("failed to add %s to KIF parameter list\n", what);
      return object.status();
    }
    Record record = {};
    if (ReadRecord(node, selector, &record) == 0) {
      PrintRow(cartel, static_cast<int32_t>(value), &record);
    }
  }
  return 0;
}

// Prints the rows of the cartel that `walk` is at, as far as it can be read.
KIF_Status PrintCartel(InstanceWalk *walk) {
  KIF_ParamList *selector = walk->selector();
  const auto cartelID = static_cast<int32_t>(KIF_ParamGetInt(walk->param()));
  WorldName world = {};
  if (ReadRecord(KIF_NODE_world_name, selector, &world) != 0) return 0;
  const Cartel cartel = {cartelID, FieldText(world.name)};

  ParamListHandle descriptors;
  if (GetInstanceList(KIF_NODE_userworld_cartel_fd_fds, selector, &descriptors) != 0) return 0;
  KIF_Status status = PrintObjects<DescriptorRecord>(KIF_NODE_userworld_cartel_fd_fds, "fd", cartel,
                                                     descriptors.get(), selector);
  descriptors.reset();
  if (status != 0) return status;

  ParamListHandle mappings;
  if (GetInstanceList(KIF_NODE_userworld_cartel_mem_mmaps, selector, &mappings) != 0) return 0;
  status = PrintObjects<MappingRecord>(KIF_NODE_userworld_cartel_mem_mmaps, "mmap", cartel,
                                       mappings.get(), selector);
  if (status == 0) walk->TakeOff();  // before the list goes
  return status;
}

KIF_Status WalkWorldList() {
  const ParamListHandle selector = CreateInstance();
  if (selector == nullptr) {
    fputs("WalkWorldList: Not enough memory\n", Messages());
    return 0;
  }
  ParamListHandle cartels;
  KIF_Status status = GetInstanceList(KIF_NODE_userworld_cartel, nullptr, &cartels);
  if (status != 0) {
    fprintf(Messages(), "WalkWorldList: error fetching world list 0x%x\n", status);
    return status;
  }
  puts("Cartel    |      World name     |        Type         |   fd   |  Description     ");
  puts("----------+---------------------+---------------------+--------+------------------");
  InstanceWalk walk(cartels.get(), selector.get());
  while (walk.Next()) {
    status = PrintCartel(&walk);
    if (status != 0) return status;
  }
  return walk.failed() ? KIF_STATUS_FAILURE : 0;
}

}  // namespace

int LsofEntry(int, char **) {
  return static_cast<int>(WalkWorldList());
}
