// hardware_pci: the functions in /sys/bus/pci/devices.
#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "linux/driver_product.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "linux/modules.h"
#include "linux/pci_bus.h"

namespace {

constexpr uint8_t kDisplayClass = 3;  // base classes
constexpr uint8_t kBridgeClass = 6;

enum InfoFlag : uint8_t { kInterruptValid = 1, kSpawnedBusValid = 2 };
enum HeaderType : uint8_t { kPlainFunction = 0, kPciBridge = 1, kCardBusBridge = 2 };
enum MemberFlag : uint8_t { kBootConsole = 1, kOwnDriver = 2, kGivenToGuests = 4 };

struct __attribute__((packed)) PciConfigHeader {
  uint16_t vendorID;
  uint16_t deviceID;
  uint16_t subVendorID;
  uint16_t subDeviceID;
  uint16_t classCode;  // base class and subclass
  uint8_t unused10[2];
  uint8_t isaIrq;
  uint8_t irq;
  uint8_t vector;
  uint8_t intPin;
  uint8_t spawnedBus;
  uint8_t infoFlags;
  uint8_t mFlags;
  uint32_t moduleID;
  char name[33];
  int32_t physSlot;
  uint8_t unused60[68];
};
static_assert(sizeof(PciConfigHeader) == 128);
static_assert(offsetof(PciConfigHeader, classCode) == 8);
static_assert(offsetof(PciConfigHeader, isaIrq) == 12);
static_assert(offsetof(PciConfigHeader, infoFlags) == 17);
static_assert(offsetof(PciConfigHeader, moduleID) == 19);
static_assert(offsetof(PciConfigHeader, name) == 23);
static_assert(offsetof(PciConfigHeader, physSlot) == 56);

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

// An attribute that holds one number, "0x8086"; false where it is not there.
bool ReadHexAttribute(int function, const char *name, uint32_t *number) {
  char text[32];
  if (ReadBelow(function, name, text, sizeof(text)) != KIF_STATUS_OK) return false;
  text[strcspn(text, "\n")] = '\0';
  const char *place = text;
  if (place[0] == '0' && place[1] == 'x') place += 2;
  return TakeHex(&place, '\0', number);
}

bool IsAsleep(int function) {
  char state[16];
  if (ReadBelow(function, "power_state", state, sizeof(state)) != KIF_STATUS_OK) return false;
  return strncmp(state, "D3hot", 5) == 0 || strncmp(state, "D3cold", 6) == 0;
}

// One value of `uevent`, the numbers before and behind its colon: "PCI_ID=8086:1237".
bool TakePair(const char *uevent, const char *key, uint16_t *first, uint16_t *second) {
  const char *place = strstr(uevent, key);
  if (place == nullptr) return false;
  place += strlen(key);
  uint32_t numbers[2];
  if (!TakeHex(&place, ':', &numbers[0]) || !TakeHex(&place, '\n', &numbers[1])) return false;
  *first = static_cast<uint16_t>(numbers[0]);
  *second = static_cast<uint16_t>(numbers[1]);
  return true;
}

bool TakeClass(const char *uevent, uint32_t *number) {
  static constexpr char kKey[] = "PCI_CLASS=";
  const char *place = strstr(uevent, kKey);
  if (place == nullptr) return false;
  place += sizeof(kKey) - 1;
  return TakeHex(&place, '\n', number);
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

// All that the attributes tell in one file. False where that is not so.
bool UseEvent(int function, PciConfigHeader *header) {
  char event[1024];
  uint16_t pairs[4];
  uint32_t classCode;
  if (ReadBelow(function, "uevent", event, sizeof(event)) != KIF_STATUS_OK ||
      !TakePair(event, "PCI_ID=", &pairs[0], &pairs[1]) ||
      !TakePair(event, "PCI_SUBSYS_ID=", &pairs[2], &pairs[3]) || !TakeClass(event, &classCode)) {
    return false;
  }
  header->vendorID = pairs[0];
  header->deviceID = pairs[1];
  header->subVendorID = pairs[2];
  header->subDeviceID = pairs[3];
  header->classCode = static_cast<uint16_t>(classCode >> 8);
  return true;
}

// False where the attributes do not tell what the function is.
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

// The kernel's number of the function's interrupt.
uint8_t ReadIrq(int function) {
  constexpr uint8_t kNone = 255;
  char text[32];
  if (ReadBelow(function, "irq", text, sizeof(text)) != KIF_STATUS_OK) return kNone;
  const char *place = text;
  uint64_t number;
  if (!TakeNumber(&place, &number) || number == 0 || number >= kNone) return kNone;
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

// The part of the header that only the function itself tells.
void UseInterruptsAndBus(const ConfigSpace &config, bool hasMsi, PciConfigHeader *header) {
  header->isaIrq = config.interruptLine;
  header->intPin = static_cast<uint8_t>(config.interruptPin - 1);
  if (config.interruptPin != 0 || hasMsi) header->infoFlags |= kInterruptValid;
  const int type = config.headerType & 0x7f;
  if (type != kPciBridge && type != kCardBusBridge) return;
  header->infoFlags |= kSpawnedBusValid;
  header->spawnedBus = config.secondaryBus;
}

uint8_t MemberFlags(int function, uint16_t classCode, const char *driver) {
  uint8_t flags = 0;
  char text[8];
  if (classCode >> 8 == kDisplayClass &&
      ReadBelow(function, "boot_vga", text, sizeof(text)) == KIF_STATUS_OK && text[0] == '1') {
    flags |= kBootConsole;
  }
  const bool forGuests = strcmp(driver, "vfio-pci") == 0 || strcmp(driver, "pci-stub") == 0 ||
                         strcmp(driver, "xen-pciback") == 0 || strcmp(driver, "pciback") == 0;
  if (driver[0] != '\0') flags |= forGuests ? kGivenToGuests : kOwnDriver;
  return flags;
}

// Reads `size` bytes of a function's configuration space. The kernel shows a reader without
// privileges the standard header alone, and some functions have no extended space.
KIF_Status ReadConfig(int function, char *bytes, size_t size) {
  constexpr off_t kWithoutExtension = 256;
  Descriptor file;
  const KIF_Status status = OpenBelow(function, "config", O_RDONLY, &file);
  if (status != KIF_STATUS_OK) return status;
  struct stat facts;
  if (fstat(file.fd(), &facts) != 0) return StatusOfErrno(errno);
  if (facts.st_size == kWithoutExtension && size > kWithoutExtension) return KIF_STATUS_NOT_FOUND;
  size_t filled = 0;
  while (filled < size) {
    const ssize_t got = pread(file.fd(), bytes + filled, size - filled, static_cast<off_t>(filled));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return StatusOfErrno(errno);
    if (got == 0) break;
    filled += static_cast<size_t>(got);
  }
  if (filled == size) return KIF_STATUS_OK;
  return filled < kWithoutExtension ? KIF_STATUS_NO_PERMISSION : KIF_STATUS_NOT_FOUND;
}

// Reads the standard header of a function that is awake. Reading it of one that sleeps would wake
// it, which can take more than a second; one that does not answer shows nothing but ones.
KIF_Status ReadHeader(int function, ConfigSpace *config) {
  if (IsAsleep(function)) return KIF_STATUS_NOT_FOUND;
  const KIF_Status status = ReadConfig(function, reinterpret_cast<char *>(config), sizeof(*config));
  if (status != KIF_STATUS_OK) return status;
  return config->headerType != 0xff ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

// Fills in what does not need the standard header. `*msi` is the first MSI of the function, 0:
// none.
KIF_Status DescribeFunction(const PciFunction &function, PciConfigHeader *header, uint64_t *msi) {
  const int folder = function.folder.fd();
  PciDriver driver;
  ReadPciDriver(function.devices.fd(), function.name, &driver);
  uint32_t module;
  KIF_Status status = FindModule(driver, &module);
  if (status != KIF_STATUS_OK) return status;
  int32_t slot;
  status = FindPhysicalSlot(function.address, &slot);
  if (status != KIF_STATUS_OK) return status;

  header->irq = ReadIrq(folder);
  *msi = ReadFirstMsi(folder);
  header->vector = static_cast<uint8_t>(*msi);
  header->mFlags = MemberFlags(folder, header->classCode, driver.name);
  header->moduleID = module;
  header->physSlot = slot;
  const bool makesNothing = driver.name[0] == '\0' || header->classCode >> 8 == kBridgeClass;
  if (!makesNothing) CopyDriverProduct(folder, header->name, sizeof(header->name));
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status GetPciConfigHeader(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  PciFunction function;
  KIF_Status status = OpenPciFunction(instance, &function);
  if (status != KIF_STATUS_OK) return status;
  auto *header = static_cast<PciConfigHeader *>(record);
  const int folder = function.folder.fd();
  ConfigSpace config = {};
  const KIF_Status configStatus = ReadHeader(folder, &config);
  const bool awake = configStatus == KIF_STATUS_OK;
  if (awake) UseConfig(config, header);
  if (!UseEvent(folder, header) && !UseAttributes(folder, header) && !awake) return configStatus;
  uint64_t msi;
  status = DescribeFunction(function, header, &msi);
  if (status == KIF_STATUS_OK && awake) UseInterruptsAndBus(config, msi != 0, header);
  return status;
}

KIF_Status GetPciConfigSpace(const NodeInfo &node, const KIF_ParamList *instance, void *record) {
  PciFunction function;
  const KIF_Status status = OpenPciFunction(instance, &function);
  if (status != KIF_STATUS_OK) return status;
  return ReadConfig(function.folder.fd(), static_cast<char *>(record), node.offers.recordSize);
}
