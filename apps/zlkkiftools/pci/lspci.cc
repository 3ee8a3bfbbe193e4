// lspci: every PCI function of the host, one line each, with names, numbers, dumps or details.
#include <getopt.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <memory>

#include "base/free_deleter.h"
#include "base/hex.h"
#include "kif/kif.h"
#include "output.h"
#include "pci/pci_ids.h"
#include "records/pci.h"
#include "tools.h"

namespace {

constexpr char kUsage[] =
    "lspci   -p --pciinfo   Print detailed info on all PCI devices\n"
    "        -n --nolookup  Don't look up PCI device names and info\n"
    "        -d --dump      Print hex dump of the standard config space\n"
    "        -e --extdump   Print hex dump of the extended config space\n"
    "        -v --verbose   Verbose information\n"
    "        -h --help      Print this help message\n";

constexpr option kLongOptions[] = {
    {"pciinfo", no_argument, nullptr, 'p'},
    {"nolookup", no_argument, nullptr, 'n'},
    {"dump", no_argument, nullptr, 'd'},
    {"extdump", no_argument, nullptr, 'e'},
    {"verbose", no_argument, nullptr, 'v'},
    {"help", no_argument, nullptr, 'h'},
    {nullptr, 0, nullptr, 0},
};

struct Options {
  bool numbers;
  bool verbose;
  bool details;
  bool dump;
  bool extendedDump;
};

struct ModuleName {
  uint32_t moduleID;
  char name[32];
};

// One element for each module and an end element, whose moduleID is kNoModule; null while it has
// not been built.
using ModuleNameCache = std::unique_ptr<ModuleName[], FreeDeleter>;

// A listing on its way through the tree of functions.
struct Listing {
  Options options;
  ParamListHandle selector;  // segment, bus, slot and function, as far as the walk has come
  ModuleNameCache moduleNames;
};

struct PciFunction {
  uint32_t segment;
  uint32_t bus;
  uint32_t slot;
  uint32_t number;
  PciConfigHeader header;
  PciConfigSpace space;
  PciExtConfigSpace extendedSpace;
};

// False when the usage text is due.
bool ParseOptions(int argc, char **argv, Options *options) {
  int letter;
  while ((letter = getopt_long(argc, argv, "pndevh", kLongOptions, nullptr)) != -1) {
    switch (letter) {
      case 'n':
        options->numbers = true;
        break;
      case 'v':
        options->verbose = true;
        break;
      case 'p':
        options->details = true;
        break;
      case 'd':
        options->dump = true;
        break;
      case 'e':
        options->extendedDump = true;
        break;
      default:
        return false;
    }
  }
  return true;
}

// Fills the elements of `names`, which has room for every module and the end element.
bool ReadModules(KIF_ParamList *modules, KIF_ParamList *selector, ModuleName *names) {
  InstanceWalk walk(modules, selector);
  while (walk.Next()) {
    ModuleRecord record;
    const KIF_Status status = ReadRecord(KIF_NODE_system_modules_general, selector, &record);
    if (status != 0) {
      fprintf(Messages(), "ListModules: error fetching module info - 0x%x\n", status);
      return false;
    }
    names->moduleID = record.moduleID;
    snprintf(names->name, sizeof(names->name), "%.31s", FieldText(record.name));
    ++names;
  }
  if (walk.failed()) {
    fprintf(Messages(), "ListModules: error requesting module info - 0x%x\n", 0);
    return false;
  }
  names->moduleID = kNoModule;
  return true;
}

// The names of the loaded modules; null, after a message, when they cannot be read.
ModuleNameCache ListModules() {
  ParamListHandle selector = CreateInstance();
  if (!selector) {
    fputs("ListModules: Not enough memory\n", Messages());
    return nullptr;
  }
  ParamListHandle modules;
  const KIF_Status status = GetInstanceList(KIF_NODE_system_modules, nullptr, &modules);
  if (status != 0) {
    fprintf(Messages(), "ListModules: error fetching zelkernel module list - 0x%x\n", status);
    return nullptr;
  }
  const int32_t count = KIF_ParamListUsedCount(modules.get());
  const size_t elements = static_cast<size_t>(count > 0 ? count : 0) + 1;
  ModuleNameCache names(static_cast<ModuleName *>(calloc(elements, sizeof(ModuleName))));
  if (!names) {
    fputs("ListModules: Not enough memory\n", Messages());
    return nullptr;
  }
  if (!ReadModules(modules.get(), selector.get(), names.get())) return nullptr;
  return names;
}

const char *ModuleText(Listing *listing, uint32_t moduleID) {
  if (moduleID == 0 || moduleID == kNoModule) return "";
  if (!listing->moduleNames) listing->moduleNames = ListModules();
  if (!listing->moduleNames) return "error";
  const ModuleName *element = listing->moduleNames.get();
  while (element->moduleID != moduleID && element->moduleID != kNoModule) ++element;
  return element->moduleID == moduleID ? element->name : "error";
}

void FormatInterrupt(const PciConfigHeader &header, char (&text)[16]) {
  const int pin = 'A' + header.intPin;
  text[0] = '\0';
  if ((header.infoFlags & kPciInterruptValid) == 0) return;
  if (header.vector == 0) {
    snprintf(text, sizeof(text), "%3d/   /     %c", header.isaIrq, pin);
  } else if (header.irq == 255) {
    snprintf(text, sizeof(text), "%3d/   /0x%02x %c", header.isaIrq, header.vector, pin);
  } else {
    snprintf(text, sizeof(text), "%3d/%3d/0x%02x %c", header.isaIrq, header.irq, header.vector,
             pin);
  }
}

const char *OwnerLetter(uint8_t mFlags) {
  if ((mFlags & 1) != 0) return "C";
  if ((mFlags & 2) != 0) return "V";
  return (mFlags & 4) != 0 ? "P" : "U";
}

void PrintDetailHeader() {
  constexpr char kFormat[] = "%-12s %-19s %-14s %-1s %-12s %-8s\n";
  printf(kFormat, "Segm:Bu:De.F", "Vend:Dvid Subv:Subd", "ISA/irq/Vect P", "M", "Module", "Name");
  printf(kFormat, "", "", "Spawned bus", "", "", "");
}

void PrintDetails(Listing *listing, PciFunction *function) {
  PciConfigHeader &header = function->header;
  char interrupt[16];
  FormatInterrupt(header, interrupt);
  printf("%04x:%02x:%02x.%x %04x:%04x %04x:%04x %-14s %-1s %-12s %s\n", function->segment,
         function->bus, function->slot, function->number, header.vendorID, header.deviceID,
         header.subVendorID, header.subDeviceID, Shown(interrupt).text(),
         OwnerLetter(header.mFlags), Shown(ModuleText(listing, header.moduleID)).text(),
         Shown(FieldText(header.name)).text());
  if ((header.infoFlags & kPciSpawnedBusValid) != 0) {
    char spawnedBus[8];
    snprintf(spawnedBus, sizeof(spawnedBus), " %02x", header.spawnedBus);
    printf("%-12s %-19s %-14s\n", "", "", spawnedBus);
  }
}

template <size_t Size>
void PrintHexDump(const uint8_t (&bytes)[Size]) {
  constexpr size_t kRow = 16;
  static_assert(Size % kRow == 0);
  for (size_t row = 0; row < Size; row += kRow) {
    char text[kRow * 3 + 1] = "";
    for (size_t i = 0; i < kRow; ++i) {
      text[i * 3] = ' ';
      PutHex(bytes[row + i], &text[i * 3 + 1]);
    }
    printf("%02zx:%s\n", row, text);
  }
}

void PrintNames(const PciConfigHeader &header, bool verbose) {
  const PciClassCodeEntry classEntry = LookupPciClass(header.classCode);
  const PciDevEntry device =
      LookupPciDevice(header.vendorID, header.deviceID, header.subVendorID, header.subDeviceID);
  if (verbose) printf("%s ", Shown(classEntry.subClassName).text());
  printf("%s: %s %s ", Shown(classEntry.className).text(), Shown(device.vendorName).text(),
         Shown(device.name).text());
}

void PrintFunction(const Options &options, PciFunction *function) {
  PciConfigHeader &header = function->header;
  printf("%04x:%02x:%02x.%x ", function->segment, function->bus, function->slot, function->number);
  if (options.numbers) {
    printf("Class %.4x: %04x:%04x ", header.classCode, header.vendorID, header.deviceID);
  } else {
    PrintNames(header, options.verbose);
  }
  const char *name = FieldText(header.name);
  if (*name != '\0') printf("[%s]", Shown(name).text());
  putchar('\n');
  if (options.verbose && !options.numbers) {
    printf("\t Class %.4x: %04x:%04x\n\n", header.classCode, header.vendorID, header.deviceID);
  }
  if (options.dump) PrintHexDump(function->space.bytes);
  if (options.extendedDump) PrintHexDump(function->extendedSpace.bytes);
}

// The low 32 bits of the selecting parameter at `index`.
uint32_t NumberAt(KIF_ParamList *selector, uint32_t index) {
  KIF_Param *param = KIF_ParamListGetParam(selector, index);
  return param != nullptr ? static_cast<uint32_t>(KIF_ParamGetInt(param)) : 0;
}

bool ReadSpaces(const Options &options, KIF_ParamList *selector, PciFunction *function) {
  KIF_Status status = 0;
  if (options.dump) {
    status = ReadRecord(KIF_NODE_hardware_pci_seg_bus_slot_func_pciConfigSpace, selector,
                        &function->space);
  }
  if (status == 0 && options.extendedDump) {
    status = ReadRecord(KIF_NODE_hardware_pci_seg_bus_slot_func_pciExtConfigSpace, selector,
                        &function->extendedSpace);
  }
  if (status != 0) {
    fprintf(Messages(), "ListPCI: error fetching PCI configuration space 0x%x\n", status);
  }
  return status == 0;
}

bool ShowFunction(Listing *listing) {
  KIF_ParamList *selector = listing->selector.get();
  PciFunction function;
  const KIF_Status status = ReadRecord(KIF_NODE_hardware_pci_seg_bus_slot_func_pciConfigHeader,
                                       selector, &function.header);
  if (status != 0) {
    fprintf(Messages(), "ListPCI: error fetching PCI information 0x%x\n", status);
    return false;
  }
  if (!ReadSpaces(listing->options, selector, &function)) return false;
  function.segment = NumberAt(selector, 0);
  function.bus = NumberAt(selector, 1);
  function.slot = NumberAt(selector, 2);
  function.number = NumberAt(selector, 3);
  if (listing->options.details) {
    PrintDetails(listing, &function);
  } else {
    PrintFunction(listing->options, &function);
  }
  return true;
}

struct Level {
  const char *name;
  KIF_NodeId node;
};

// Lists what is below the instance that `above` is at (null: the top), and takes it off the
// selecting list.
bool ListLevel(Listing *listing, int level, InstanceWalk *above) {
  const Level kLevels[] = {
      {"seg", KIF_NODE_hardware_pci_seg},
      {"bus", KIF_NODE_hardware_pci_seg_bus},
      {"slot", KIF_NODE_hardware_pci_seg_bus_slot},
      {"func", KIF_NODE_hardware_pci_seg_bus_slot_func},
  };
  constexpr int kFunctionLevel = 3;
  KIF_ParamList *selector = listing->selector.get();
  ParamListHandle instances;
  const KIF_Status status =
      GetInstanceList(kLevels[level].node, level > 0 ? selector : nullptr, &instances);
  if (status != 0) {
    fprintf(Messages(), "ListPCI: error fetching PCI %s list 0x%x\n", kLevels[level].name, status);
    return false;
  }
  InstanceWalk walk(instances.get(), selector);
  while (walk.Next()) {
    const bool listed =
        level == kFunctionLevel ? ShowFunction(listing) : ListLevel(listing, level + 1, &walk);
    if (!listed) return false;
  }
  if (walk.failed()) return false;
  if (above != nullptr) above->TakeOff();  // before the list goes
  return true;
}

bool ListPCI(const Options &options) {
  Listing listing = {options, CreateInstance(), nullptr};
  if (!listing.selector) {
    fputs("ListPCI: Not enough memory\n", Messages());
    return false;
  }
  return ListLevel(&listing, 0, nullptr);
}

}  // namespace

int LspciEntry(int argc, char **argv) {
  Options options = {};
  if (!ParseOptions(argc, argv, &options)) {
    fputs(kUsage, Messages());
    return 1;
  }
  BuildPciTables();
  if (options.details) PrintDetailHeader();
  return ListPCI(options) ? 0 : 1;
}
