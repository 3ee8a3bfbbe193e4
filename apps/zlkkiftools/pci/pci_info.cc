// pci-info: the IRQ, the physical slot or the configuration space of one PCI function.
#include <errno.h>
#include <getopt.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <utility>

#include "base/io.h"
#include "kif/kif.h"
#include "kiftools.h"
#include "output.h"
#include "records/pci.h"
#include "tools.h"

namespace {

constexpr char kUsage[] =
    "pci-info\n"
    "  -n <segment>      device segment (default: 0)\n"
    "  -b <bus>          device bus\n"
    "  -s <slot>         device slot\n"
    "  -f <function>     device function\n"
    "  -h                help\n"
    "  -i                print IRQ vector\n"
    "  -c                print PCI config space\n"
    "  -e                print PCI extended config space\n"
    "  -S                print physical slot\n";

// As given on the command line; -1 is no function's number.
struct Address {
  int32_t segment = 0;
  int32_t bus = -1;
  int32_t slot = -1;
  int32_t function = -1;
};

struct Options {
  Address address;
  bool irq = false;
  bool space = false;
  bool extendedSpace = false;
  bool physicalSlot = false;
};

enum class Parsed { kRun, kHelp, kBadUsage };

int32_t Number(const char *text) {
  return static_cast<int32_t>(strtol(text, nullptr, 10));
}

Parsed ParseOptions(int argc, char **argv, Options *options) {
  int letter;
  while ((letter = getopt(argc, argv, "n:b:s:f:hiceS")) != -1) {
    switch (letter) {
      case 'n':
        options->address.segment = Number(optarg);
        break;
      case 'b':
        options->address.bus = Number(optarg);
        break;
      case 's':
        options->address.slot = Number(optarg);
        break;
      case 'f':
        options->address.function = Number(optarg);
        break;
      case 'i':
        options->irq = true;
        break;
      case 'c':
        options->space = true;
        break;
      case 'e':
        options->extendedSpace = true;
        break;
      case 'S':
        options->physicalSlot = true;
        break;
      case 'h':
        return Parsed::kHelp;
      default:
        return Parsed::kBadUsage;
    }
  }
  const bool any =
      options->irq || options->space || options->extendedSpace || options->physicalSlot;
  return any ? Parsed::kRun : Parsed::kBadUsage;
}

// Appends the instance of `node` below `device` whose number is `number` to `device`.
KIF_Status AppendInstance(KIF_NodeId node, const char *level, int32_t number, bool first,
                          KIF_ParamList *device) {
  ParamListHandle instances;
  const KIF_Status status = GetInstanceList(node, first ? nullptr : device, &instances);
  if (status != 0) return status;
  const int32_t count = KIF_ParamListUsedCount(instances.get());
  for (int32_t i = 0; i < count; ++i) {
    KIF_Param *param = KIF_ParamListGetParam(instances.get(), static_cast<uint32_t>(i));
    if (param == nullptr || static_cast<int32_t>(KIF_ParamGetInt(param)) != number) continue;
    return CopyParamToList(param, device) ? 0 : KIF_STATUS_FAILURE;
  }
  fprintf(Messages(), "%s: invalid %s %d\n", "GetDevice", level, number);
  return KIF_STATUS_BAD_PARAMETER;
}

// Finds the function at `address` in the host's lists; `*device` then selects it.
KIF_Status GetDevice(const Address &address, ParamListHandle *device) {
  ParamListHandle list = CreateInstance();
  if (!list) {
    fputs("Failed to allocate param list (size = 1)\n", Messages());
    return KIF_STATUS_NO_RESOURCES;
  }
  const struct {
    KIF_NodeId node;
    const char *level;
    int32_t number;
  } steps[] = {
      {KIF_NODE_hardware_pci_seg, "seg", address.segment},
      {KIF_NODE_hardware_pci_seg_bus, "bus", address.bus},
      {KIF_NODE_hardware_pci_seg_bus_slot, "slot", address.slot},
      {KIF_NODE_hardware_pci_seg_bus_slot_func, "func", address.function},
  };
  for (const auto &step : steps) {
    const KIF_Status status =
        AppendInstance(step.node, step.level, step.number, &step == steps, list.get());
    if (status != 0) return status;
  }
  *device = std::move(list);
  return 0;
}

// Reads a record of the function at `address`; says in the name of `routine` why it cannot.
template <typename Record>
bool ReadFunction(const char *routine, const Address &address, KIF_NodeId node, Record *record) {
  ParamListHandle device;
  if (GetDevice(address, &device) != 0) {
    fprintf(Messages(), "%s: invalid device: %d:%d.%d\n", routine, address.bus, address.slot,
            address.function);
    return false;
  }
  const KIF_Status status = ReadRecord(node, device.get(), record);
  if (status != 0) {
    fprintf(Messages(), "%s: error fetching PCI information 0x%x\n", routine, status);
  }
  return status == 0;
}

bool GetPCIInfo(const Address &address, PciConfigHeader *header) {
  return ReadFunction("GetPCIInfo", address,
                      KIF_NODE_hardware_pci_seg_bus_slot_func_pciConfigHeader, header);
}

// Writes all `size` bytes to descriptor 1, past the buffer of standard output.
bool WriteBytes(const uint8_t *bytes, size_t size) {
  const int error = WriteAll(STDOUT_FILENO, bytes, size);
  if (error != 0 && error != EPIPE) Warning("pci-info: write error: %s\n", strerror(error));
  return error == 0;
}

// These give false only when the bytes were read but could not be written.
bool PrintConfigSpace(const Address &address) {
  PciConfigSpace space;
  if (!ReadFunction("PrintConfigSpace", address,
                    KIF_NODE_hardware_pci_seg_bus_slot_func_pciConfigSpace, &space)) {
    return true;
  }
  return WriteBytes(space.bytes, sizeof(space.bytes));
}

bool PrintExtConfigSpace(const Address &address) {
  PciExtConfigSpace space;
  if (!ReadFunction("PrintExtConfigSpace", address,
                    KIF_NODE_hardware_pci_seg_bus_slot_func_pciExtConfigSpace, &space)) {
    return true;
  }
  return WriteBytes(space.bytes, sizeof(space.bytes));
}

}  // namespace

int PciInfoEntry(int argc, char **argv) {
  Options options;
  const Parsed parsed = ParseOptions(argc, argv, &options);
  if (parsed != Parsed::kRun) {
    fputs(kUsage, Messages());
    return parsed == Parsed::kHelp ? 0 : 1;
  }
  bool written = true;
  PciConfigHeader header;
  if (options.irq && GetPCIInfo(options.address, &header)) printf("%3d", header.irq);
  if (options.space) written &= PrintConfigSpace(options.address);
  if (options.extendedSpace) written &= PrintExtConfigSpace(options.address);
  if (options.physicalSlot && GetPCIInfo(options.address, &header)) printf("%3d", header.physSlot);
  return written ? 0 : 1;
}
