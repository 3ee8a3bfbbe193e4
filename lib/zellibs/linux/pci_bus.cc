// hardware_pci: the functions in /sys/bus/pci/devices, level by level.
#include "linux/pci_bus.h"

#include <fcntl.h>

#include <cstdio>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "base/hex.h"
#include "linux/linux_nodes.h"

namespace {

constexpr char kDevices[] = "/sys/bus/pci/devices";
constexpr char kSlots[] = "/sys/bus/pci/slots";

constexpr uint32_t kEverySlot = UINT32_MAX;

struct PhysicalSlot {
  uint32_t segment;
  uint32_t bus;
  uint32_t slot;  // or kEverySlot of the bus
  int32_t number;
};

// The bus, as it was when its segments were last listed.
struct Bus {
  bool read = false;
  Array<PciAddress> functions;  // ascending
  Array<PhysicalSlot> slots;
};

Everlasting<Bus> snapshot;

// "0000:00:1f.2". Segments beyond four digits are those of virtual buses.
bool ParseAddress(const char *text, PciAddress *address) {
  return TakeHex(&text, ':', &address->part[0]) && TakeHex(&text, ':', &address->part[1]) &&
         TakeHex(&text, '.', &address->part[2]) && TakeHex(&text, '\0', &address->part[3]);
}

int CompareAddresses(const void *left, const void *right) {
  const auto *a = static_cast<const PciAddress *>(left);
  const auto *b = static_cast<const PciAddress *>(right);
  for (size_t i = 0; i < 4; ++i) {
    if (a->part[i] != b->part[i]) return a->part[i] < b->part[i] ? -1 : 1;
  }
  return 0;
}

KIF_Status ReadFunctions() {
  snapshot->functions.Clear();
  DirectoryReader reader;
  const KIF_Status status = reader.Open(kDevices);
  if (status != KIF_STATUS_OK) return status;
  while (const char *name = reader.Next()) {
    PciAddress address;
    const bool isFunction = ParseAddress(name, &address);
    if (isFunction && !snapshot->functions.Append(address)) return KIF_STATUS_NO_MEMORY;
  }
  if (snapshot->functions.size() > 0) {
    qsort(snapshot->functions.begin(), snapshot->functions.size(), sizeof(PciAddress),
          CompareAddresses);
  }
  return reader.status();
}

// A slot's folder has its number for a name ("3", or "3-1" where the firmware numbers twice) and
// names the segment, the bus and mostly the slot of the card in it.
bool ReadSlot(int slots, const char *name, PhysicalSlot *slot) {
  char path[300];
  char text[32];
  const char *digits = name;
  uint64_t number;
  if (!TakeNumber(&digits, &number) || number > INT32_MAX) return false;
  snprintf(path, sizeof(path), "%s/address", name);
  if (ReadBelow(slots, path, text, sizeof(text)) != KIF_STATUS_OK) return false;
  text[strcspn(text, "\n")] = '\0';
  const char *place = text;
  slot->number = static_cast<int32_t>(number);
  slot->slot = kEverySlot;
  if (!TakeHex(&place, ':', &slot->segment)) return false;
  return TakeHex(&place, '\0', &slot->bus) ||
         (TakeHex(&place, ':', &slot->bus) && TakeHex(&place, '\0', &slot->slot));
}

KIF_Status ReadSlots() {
  snapshot->slots.Clear();
  DirectoryReader reader;
  if (reader.Open(kSlots) != KIF_STATUS_OK) return KIF_STATUS_OK;
  while (const char *name = reader.Next()) {
    PhysicalSlot slot;
    const bool isSlot = ReadSlot(reader.fd(), name, &slot);
    if (isSlot && !snapshot->slots.Append(slot)) return KIF_STATUS_NO_MEMORY;
  }
  return KIF_STATUS_OK;
}

KIF_Status ReadBus() {
  snapshot->read = false;
  KIF_Status status = ReadFunctions();
  if (status == KIF_STATUS_OK) status = ReadSlots();
  snapshot->read = status == KIF_STATUS_OK;
  return status;
}

KIF_Status NeedBus() {
  return snapshot->read ? KIF_STATUS_OK : ReadBus();
}

// The different numbers at `level` of the functions that begin with the numbers in `parent`.
KIF_Status ListLevel(uint32_t level, const KIF_ParamList *parent, KIF_ParamList *list) {
  const KIF_Status busStatus = level == 0 ? ReadBus() : NeedBus();
  if (busStatus != KIF_STATUS_OK) return busStatus;
  bool known = level == 0;
  for (const PciAddress &function : snapshot->functions) {
    const uint32_t *part = function.part;
    uint32_t same = 0;
    while (same < level && Integer(parent, same) == part[same]) ++same;
    if (same < level) continue;
    known = true;
    const uint32_t count = CountOf(list);
    int64_t last;
    if (IntegerAt(list, count - 1, &last) && last == part[level]) continue;
    const KIF_Status status = KIF_ParamListAddInt(list, part[level]);
    if (status != KIF_STATUS_OK) return status;
  }
  return known ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

}  // namespace

bool TakeHex(const char **text, char end, uint32_t *number) {
  const char *digit = *text;
  uint32_t value = 0;
  for (int worth; digit - *text < 8 && (worth = HexDigit(*digit)) >= 0; ++digit) {
    value = value << 4 | static_cast<uint32_t>(worth);
  }
  if (digit == *text || *digit != end) return false;
  *text = end != '\0' ? digit + 1 : digit;
  *number = value;
  return true;
}

KIF_Status OpenPciFunction(const KIF_ParamList *instance, PciAddress *address,
                           DirectoryReader *folder) {
  uint32_t *part = address->part;
  for (uint32_t i = 0; i < 4; ++i) {
    const int64_t number = Integer(instance, i);
    if (number < 0 || number > UINT32_MAX) return KIF_STATUS_NOT_FOUND;
    part[i] = static_cast<uint32_t>(number);
  }
  char path[sizeof(kDevices) + 40];
  snprintf(path, sizeof(path), "%s/%04x:%02x:%02x.%x", kDevices, part[0], part[1], part[2],
           part[3]);
  return folder->Open(path);
}

KIF_Status FindPhysicalSlot(const PciAddress &address, int32_t *number) {
  *number = -1;
  const KIF_Status status = NeedBus();
  if (status != KIF_STATUS_OK) return status;
  for (const PhysicalSlot &slot : snapshot->slots) {
    const bool same = slot.segment == address.part[0] && slot.bus == address.part[1] &&
                      (slot.slot == address.part[2] || slot.slot == kEverySlot);
    if (same) *number = slot.number;
  }
  return KIF_STATUS_OK;
}

KIF_Status ListPciSegments(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  return ListLevel(0, parent, list);
}

KIF_Status ListPciBuses(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  return ListLevel(1, parent, list);
}

KIF_Status ListPciSlots(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  return ListLevel(2, parent, list);
}

KIF_Status ListPciFunctions(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  return ListLevel(3, parent, list);
}
