// userworld_cartel_mem_mmaps: /proc/PID/maps.
#include <fcntl.h>
#include <stdio.h>

#include <cstddef>
#include <cstring>
#include <initializer_list>

#include "base/everlasting.h"
#include "base/hex.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "linux/process_directory.h"
#include "records/worlds.h"

namespace {

constexpr uint32_t kOther = 1;

struct Mapping {
  uint64_t start;
  uint64_t end;
  uint32_t protection;
  bool hasFile;
  const char *name;
  size_t nameLength;
};

// The file of the process asked for last.
struct KeptMaps {
  int64_t process = -1;
  Bytes text;
  size_t next = 0;  // place of the line behind the one that was asked for last
};

Everlasting<KeptMaps> snapshot;

// The directory that is open may be that of a process that had the same number.
KIF_Status OpenMaps(int64_t process, Descriptor *file) {
  KIF_Status status = KIF_STATUS_NOT_FOUND;
  for (const bool fresh : {false, true}) {
    int directory;
    status = OpenProcessDirectory(process, fresh, &directory);
    if (status == KIF_STATUS_OK) status = OpenBelow(directory, "maps", O_RDONLY, file);
    if (status != KIF_STATUS_NOT_FOUND) break;
  }
  return status;
}

KIF_Status ReadMaps(int64_t process) {
  snapshot->process = -1;
  snapshot->text.Clear();
  snapshot->next = 0;
  Descriptor file;
  KIF_Status status = OpenMaps(process, &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &snapshot->text);
  if (status == KIF_STATUS_OK) snapshot->process = process;
  return status;
}

// An address, and the character `end` behind it.
bool TakeAddress(const char **text, char end, uint64_t *address) {
  constexpr int kMostDigits = 16;
  const char *place = *text;
  *address = 0;
  for (int digit; (digit = HexDigit(*place)) >= 0; ++place) {
    *address = *address << 4 | static_cast<uint64_t>(digit);
  }
  if (place == *text || place - *text > kMostDigits || *place != end) return false;
  *text = place + 1;
  return true;
}

// See proc(5): "7f0000000000-7f0000001000 r--p 00000000 08:01 1234      /usr/lib/libc.so.6".
bool ParseLine(const char *line, size_t length, Mapping *mapping) {
  const char *place = line;
  if (!TakeAddress(&place, '-', &mapping->start) || !TakeAddress(&place, ' ', &mapping->end) ||
      mapping->end < mapping->start || strcspn(place, " \n") < 2) {
    return false;
  }
  mapping->protection =
      (place[0] == 'r' ? kMappingReadable : 0u) | (place[1] == 'w' ? kMappingWritable : 0u);
  for (int field = 0; field < 4; ++field) {
    mapping->hasFile = place[0] != '0';  // the last of the four is the file's inode
    place += strcspn(place, " \n");
    place += strspn(place, " ");
  }
  mapping->name = place;
  mapping->nameLength = length - static_cast<size_t>(place - line);
  return true;
}

// Takes the mapping at or behind `*place` in the text and moves `*place` behind its line. False at
// the end.
bool NextMapping(size_t *place, Mapping *mapping) {
  const char *text = snapshot->text.text();
  bool found = false;
  while (!found && *place < snapshot->text.size()) {
    const char *line = text + *place;
    const size_t rest = snapshot->text.size() - *place;
    const void *newline = memchr(line, '\n', rest);
    const size_t length =
        newline != nullptr ? static_cast<size_t>(static_cast<const char *>(newline) - line) : rest;
    found = ParseLine(line, length, mapping);
    *place += length + (newline != nullptr ? 1 : 0);
  }
  return found;
}

// Mappings are asked for in the order of their list, mostly.
bool FindMapping(uint64_t start, Mapping *mapping) {
  const size_t first = snapshot->next;
  size_t place = first;
  bool found = false;
  while (!found && NextMapping(&place, mapping)) found = mapping->start == start;
  if (!found) place = 0;
  while (!found && place < first && NextMapping(&place, mapping)) found = mapping->start == start;
  snapshot->next = place;
  return found;
}

}  // namespace

KIF_Status ListMappings(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  KIF_Status status = ReadMaps(Integer(parent, 0));
  Mapping mapping;
  size_t place = 0;
  while (status == KIF_STATUS_OK && NextMapping(&place, &mapping)) {
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(mapping.start));
  }
  return status;
}

KIF_Status GetMapping(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *filled = static_cast<MappingRecord *>(record);
  const int64_t process = Integer(instance, 0);
  const KIF_Status status = process == snapshot->process ? KIF_STATUS_OK : ReadMaps(process);
  if (status != KIF_STATUS_OK) return status;
  Mapping mapping;
  if (!FindMapping(static_cast<uint64_t>(Integer(instance, 1)), &mapping))
    return KIF_STATUS_NOT_FOUND;
  const uint64_t length = mapping.end - mapping.start;
  filled->length = length < UINT32_MAX ? static_cast<uint32_t>(length) : UINT32_MAX;
  filled->kind = mapping.hasFile ? kMappingOfFile : kOther;
  filled->protection = mapping.protection;
  filled->descriptor = -1;
  CopyText(filled->description, sizeof(filled->description), mapping.name, mapping.nameLength);
  return KIF_STATUS_OK;
}
