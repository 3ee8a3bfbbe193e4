// Any bytes as PCI ID files: the input is cut into files at its bytes 0xFF, the last one being the
// published file. Whatever the tables hold then, a look-up gives what was asked for or nothing.
#include <string.h>

#include "pci/pci_ids.h"
#include "surroundings.h"

namespace {

PciIdsFileList FilesOf(const uint8_t *data, size_t size) {
  PciIdsFileList files;
  for (;;) {
    const void *end = size > 0 ? memchr(data, 0xFF, size) : nullptr;
    const size_t length = end != nullptr ? static_cast<const uint8_t *>(end) - data : size;
    files.AddBytes("file.ids", reinterpret_cast<const char *>(data), length);
    if (end == nullptr) return files;
    data += length + 1;
    size -= length + 1;
  }
}

template <size_t Room>
void CheckText(const char (&field)[Room]) {
  if (memchr(field, '\0', Room) == nullptr) abort();
}

void CheckDevice(uint16_t vendorID, uint16_t deviceID, uint16_t subVendorID, uint16_t subDeviceID) {
  const PciDevEntry entry = LookupPciDevice(vendorID, deviceID, subVendorID, subDeviceID);
  CheckText(entry.vendorName);
  CheckText(entry.name);
  const bool nothing = entry.name[0] == '\0' && entry.vendorName[0] == '\0';
  if (nothing) return;
  if (entry.vendorID != vendorID || entry.deviceID != deviceID) abort();
  if (entry.subVendorID == 0) return;
  if (entry.subVendorID != subVendorID || entry.subDeviceID != subDeviceID) abort();
}

void CheckClass(uint16_t classCode) {
  const PciClassCodeEntry entry = LookupPciClass(classCode);
  CheckText(entry.className);
  CheckText(entry.subClassName);
  CheckText(entry.progIfName);
  const bool nothing = entry.className[0] == '\0' && entry.subClassName[0] == '\0';
  if (!nothing && (entry.baseClass << 8 | entry.subClass) != classCode) abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  BuildPciTablesFrom(FilesOf(data, size));
  for (unsigned number = 0; number < 64; ++number) {
    const auto vendorID = static_cast<uint16_t>(number >> 4);
    const auto deviceID = static_cast<uint16_t>(number >> 2 & 3);
    CheckDevice(vendorID, deviceID, static_cast<uint16_t>(number & 3), 1);
    CheckClass(static_cast<uint16_t>(vendorID << 8 | (number & 15)));
  }
  ReleasePciTables();
  return 0;
}
