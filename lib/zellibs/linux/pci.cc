// hardware_pci: the functions in /sys/bus/pci/devices.
#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "base/io.h"
#include "linux/driver_product.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "linux/modules.h"
#include "linux/pci_bus.h"
#include "records/pci.h"

namespace {

constexpr uint8_t kDisplayClass = 3;  // a base class

enum HeaderType : uint8_t { kPlainFunction = 0, kPciBridge = 1, kCardBusBridge = 2 };
enum MemberFlag : uint8_t { kBootConsole = 1, kOwnDriver = 2, kGivenToGuests = 4 };

// The standard part of a function's configuration space, which every reader may see.
struct __attribute__((packed)) ConfigSpace {
  uint16_t vendor;
  uint16_t device;
  uint8_t unused4[6];
  uint16_t classCode;
  uint8_t unused12[2];
  uint8_t headerType;  // below the bit that marks further functions
  uint8_t unused15[10];
  uint8_t secondaryBus;  // of bridges
  uint8_t unused26[18];
  uint16_t subVendor;  // of plain functions
  uint16_t subDevice;
  uint8_t unused48[12];
  uint8_t interruptLine;
  uint8_t interruptPin;
  uint8_t unused62[2];
};
static_assert(sizeof(ConfigSpace) == 64);
static_assert(offsetof(ConfigSpace, classCode) == 10);
static_assert(offsetof(ConfigSpace, headerType) == 14);
static_assert(offsetof(ConfigSpace, secondaryBus) == 25);
static_assert(offsetof(ConfigSpace, subVendor) == 44);
static_assert(offsetof(ConfigSpace, interruptLine) == 60);
static_assert(offsetof(ConfigSpace, interruptPin) == 61);

constexpr size_t kNameSize = 64;  // of a driver

// What is known of a function before its attributes are read.
struct FolderContents {
  bool hasDriver = false;
  bool hasMsi = false;
  ProductFolders products;
};

FolderContents LookAround(DirectoryReader *folder) {
  FolderContents contents;
  while (const char *name = folder->Next()) {
    if (strcmp(name, "driver") == 0) contents.hasDriver = true;
    if (strcmp(name, "msi_irqs") == 0) contents.hasMsi = true;
    NoteProductFolder(name, &contents.products);
  }
  return contents;
}

// Reads an attribute, which the kernel hands out whole in one read; false where it is not there.
bool ReadAttribute(int function, const char *name, char *text, size_t size) {
  Descriptor file;
  if (OpenBelow(function, name, O_RDONLY, &file) != KIF_STATUS_OK) return false;
  const ssize_t got = read(file.fd(), text, size - 1);
  text[got > 0 ? got : 0] = '\0';
  return got > 0;
}

// An attribute that holds one number, "0x8086".
bool ReadHexAttribute(int function, const char *name, uint32_t *number) {
  char text[32];
  if (!ReadAttribute(function, name, text, sizeof(text))) return false;
  text[strcspn(text, "\n")] = '\0';
  const char *place = text;
  if (place[0] == '0' && place[1] == 'x') place += 2;
  return TakeHex(&place, '\0', number);
}

bool IsAsleep(int function) {
  char state[16];
  if (!ReadAttribute(function, "power_state", state, sizeof(state))) return false;
  return strncmp(state, "D3hot", 5) == 0 || strncmp(state, "D3cold", 6) == 0;
}

// The value of a line of `uevent`, "PCI_ID=8086:1237", or null.
const char *FindValue(const char *event, const char *key) {
  const size_t length = strlen(key);
  while (*event != '\0' && strncmp(event, key, length) != 0) {
    event += strcspn(event, "\n");
    if (*event == '\n') ++event;
  }
  return *event != '\0' ? event + length : nullptr;
}

bool TakePair(const char *event, const char *key, uint16_t *first, uint16_t *second) {
  const char *place = FindValue(event, key);
  uint32_t numbers[2];
  if (place == nullptr || !TakeHex(&place, ':', &numbers[0]) ||
      !TakeHex(&place, '\n', &numbers[1])) {
    return false;
  }
  *first = static_cast<uint16_t>(numbers[0]);
  *second = static_cast<uint16_t>(numbers[1]);
  return true;
}

// Reads all that the attributes tell of a function in one file, and its driver. False where that
// is not so.
bool UseEvent(int function, PciConfigHeader *header, char (&driver)[kNameSize]) {
  char event[1024];
  if (!ReadAttribute(function, "uevent", event, sizeof(event))) return false;
  uint16_t pairs[4];
  uint32_t classCode;
  const char *place = FindValue(event, "PCI_CLASS=");
  if (place == nullptr || !TakeHex(&place, '\n', &classCode) ||
      !TakePair(event, "PCI_ID=", &pairs[0], &pairs[1]) ||
      !TakePair(event, "PCI_SUBSYS_ID=", &pairs[2], &pairs[3])) {
    return false;
  }
  header->vendorID = pairs[0];
  header->deviceID = pairs[1];
  header->subVendorID = pairs[2];
  header->subDeviceID = pairs[3];
  header->classCode = static_cast<uint16_t>(classCode >> 8);
  const char *name = FindValue(event, "DRIVER=");
  CopyText(driver, sizeof(driver), name != nullptr ? name : "",
           name != nullptr ? strcspn(name, "\n") : 0);
  return true;
}

// The same from one attribute at a time; false where they do not tell what the function is.
bool UseAttributes(int function, PciConfigHeader *header) {
  uint32_t number;
  if (ReadHexAttribute(function, "subsystem_vendor", &number)) {
    header->subVendorID = static_cast<uint16_t>(number);
  }
  if (ReadHexAttribute(function, "subsystem_device", &number)) {
    header->subDeviceID = static_cast<uint16_t>(number);
  }
  if (ReadHexAttribute(function, "class", &number)) {
    header->classCode = static_cast<uint16_t>(number >> 8);
  }
  uint32_t vendor;
  if (!ReadHexAttribute(function, "vendor", &vendor) ||
      !ReadHexAttribute(function, "device", &number)) {
    return false;
  }
  header->vendorID = static_cast<uint16_t>(vendor);
  header->deviceID = static_cast<uint16_t>(number);
  return true;
}

// What a function is, by its own account: the least that is known of it.
void UseConfig(const ConfigSpace &config, PciConfigHeader *header) {
  header->vendorID = config.vendor;
  header->deviceID = config.device;
  header->classCode = config.classCode;
  if ((config.headerType & 0x7f) != kPlainFunction) return;
  header->subVendorID = config.subVendor;
  header->subDeviceID = config.subDevice;
}

// The kernel's number of the function's interrupt: `msi`, the first of those that it sends as
// messages, or that of its pin where it sends none.
uint8_t ReadIrq(int function, uint64_t msi) {
  constexpr uint8_t kNone = 255;
  uint64_t number = msi;
  char text[32];
  if (msi == 0) {
    const char *place = text;
    const bool isThere = ReadAttribute(function, "irq", text, sizeof(text));
    if (!isThere || !TakeNumber(&place, &number)) return kNone;
  }
  if (number == 0 || number >= kNone) return kNone;
  return static_cast<uint8_t>(number);
}

// The lowest of the numbers in `msi_irqs`; 0 where there is none.
uint64_t ReadFirstMsi(int function) {
  DirectoryReader reader;
  if (reader.OpenBelow(function, "msi_irqs") != KIF_STATUS_OK) return 0;
  uint64_t lowest = 0;
  while (const char *name = reader.Next()) {
    uint64_t number;
    if (TakeNumber(&name, &number) && (lowest == 0 || number < lowest)) lowest = number;
  }
  return lowest;
}

bool IsBridge(const ConfigSpace &config) {
  const int type = config.headerType & 0x7f;
  return type == kPciBridge || type == kCardBusBridge;
}

// The part of the header that only the function itself tells.
void UseInterruptsAndBus(const ConfigSpace &config, bool hasMsi, PciConfigHeader *header) {
  header->isaIrq = config.interruptLine;
  header->intPin = static_cast<uint8_t>(config.interruptPin - 1);
  if (config.interruptPin != 0 || hasMsi) header->infoFlags |= kPciInterruptValid;
  if (!IsBridge(config)) return;
  header->infoFlags |= kPciSpawnedBusValid;
  header->spawnedBus = config.secondaryBus;
}

uint8_t MemberFlags(int function, uint16_t classCode, const char *driver) {
  uint8_t flags = 0;
  char text[8];
  if (classCode >> 8 == kDisplayClass && ReadAttribute(function, "boot_vga", text, sizeof(text)) &&
      text[0] == '1') {
    flags |= kBootConsole;
  }
  const bool forGuests = strcmp(driver, "vfio-pci") == 0 || strcmp(driver, "pci-stub") == 0 ||
                         strcmp(driver, "xen-pciback") == 0 || strcmp(driver, "pciback") == 0;
  if (driver[0] != '\0') flags |= forGuests ? kGivenToGuests : kOwnDriver;
  return flags;
}

bool ReadConfigPart(int config, size_t offset, size_t size, ConfigSpace *space) {
  size_t given;
  return ReadAt(config, reinterpret_cast<char *>(space) + offset, size, static_cast<off_t>(offset),
                &given) == 0 &&
         given == size;
}

// Reads the standard header of a function, false where it cannot be seen: reading wakes a function
// that sleeps, which can take more than a second, and one that does not answer shows nothing but
// ones. Each four bytes are a round trip to the bus, so where the function is `known` from its
// attributes only what they don't tell is read.
bool ReadStandardHeader(int function, bool known, ConfigSpace *space) {
  Descriptor file;
  if (IsAsleep(function) || OpenBelow(function, "config", O_RDONLY, &file) != KIF_STATUS_OK) {
    return false;
  }
  const int config = file.fd();
  if (!known) return ReadConfigPart(config, 0, sizeof(*space), space) && space->headerType != 0xff;
  constexpr size_t kWord = 4;
  constexpr size_t kTypeWord = offsetof(ConfigSpace, headerType) / kWord * kWord;
  constexpr size_t kBusWord = offsetof(ConfigSpace, secondaryBus) / kWord * kWord;
  constexpr size_t kInterruptWord = offsetof(ConfigSpace, interruptLine);
  return ReadConfigPart(config, kTypeWord, kWord, space) && space->headerType != 0xff &&
         ReadConfigPart(config, kInterruptWord, kWord, space) &&
         (!IsBridge(*space) || ReadConfigPart(config, kBusWord, kWord, space));
}

}  // namespace

KIF_Status GetPciConfigHeader(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  PciAddress address;
  DirectoryReader folder;
  KIF_Status status = OpenPciFunction(instance, &address, &folder);
  if (status != KIF_STATUS_OK) return status;
  const int function = folder.fd();
  const FolderContents contents = LookAround(&folder);

  auto *header = static_cast<PciConfigHeader *>(record);
  char driver[kNameSize] = "";
  ConfigSpace config = {};
  const bool hasEvent = UseEvent(function, header, driver);
  const bool isSeen = ReadStandardHeader(function, hasEvent, &config);
  if (!hasEvent && isSeen) UseConfig(config, header);
  const bool isKnown = hasEvent || UseAttributes(function, header) || isSeen;
  if (!isKnown) return KIF_STATUS_NOT_FOUND;
  if (contents.hasDriver && driver[0] == '\0') {
    CopyLinkName(function, "driver", driver, sizeof(driver));
  }

  uint32_t module;
  int32_t slot;
  status = FindModule(driver, &module);
  if (status == KIF_STATUS_OK) status = FindPhysicalSlot(address, &slot);
  if (status != KIF_STATUS_OK) return status;
  const uint64_t msi = contents.hasMsi ? ReadFirstMsi(function) : 0;
  if (isSeen) UseInterruptsAndBus(config, msi != 0, header);
  header->irq = ReadIrq(function, msi);
  header->vector = static_cast<uint8_t>(msi);
  header->mFlags = MemberFlags(function, header->classCode, driver);
  header->moduleID = module;
  header->physSlot = slot;
  if (driver[0] != '\0') {
    CopyDriverProduct(function, contents.products, header->name, sizeof(header->name));
  }
  return KIF_STATUS_OK;
}

// The kernel shows a reader without privileges the standard header alone, and some functions have
// no extended space.
KIF_Status GetPciConfigSpace(const NodeInfo &node, const KIF_ParamList *instance, void *record) {
  constexpr uint32_t kWithoutExtension = 256;
  PciAddress address;
  DirectoryReader folder;
  Descriptor file;
  struct stat facts;
  KIF_Status status = OpenPciFunction(instance, &address, &folder);
  if (status == KIF_STATUS_OK) status = OpenBelow(folder.fd(), "config", O_RDONLY, &file);
  if (status != KIF_STATUS_OK) return status;
  if (fstat(file.fd(), &facts) != 0) return StatusOfErrno(errno);
  const uint32_t size = node.recordSize;
  if (facts.st_size == kWithoutExtension && size > kWithoutExtension) return KIF_STATUS_NOT_FOUND;
  size_t given;
  const int error = ReadAt(file.fd(), record, size, 0, &given);
  if (error != 0) return StatusOfErrno(error);
  if (given == size) return KIF_STATUS_OK;
  return given < kWithoutExtension ? KIF_STATUS_NO_PERMISSION : KIF_STATUS_NOT_FOUND;
}
