// Names of PCI functions, from the published PCI ID file and local override files.
#pragma once

#include <cstddef>
#include <cstdint>

#include "pci/ids_files.h"

extern "C" {

// What a name begins with that was made up for a device without one.
__attribute__((visibility("default"))) extern const char not_avail_prefix[];
}

// What is known about a device (subVendorID 0) or about one subsystem of it.
struct PciDevEntry {
  uint16_t vendorID;
  uint16_t deviceID;
  uint16_t subVendorID;
  uint16_t subDeviceID;
  char vendorName[64];
  char name[128];
};
static_assert(sizeof(PciDevEntry) == 200);

// The names of a programming interface, or of a subclass that has none (progIf 0, no name).
struct PciClassCodeEntry {
  uint8_t baseClass;
  uint8_t subClass;
  uint8_t progIf;
  char className[64];
  char subClassName[64];
  char progIfName[64];
};
static_assert(sizeof(PciClassCodeEntry) == 195);

// Builds the tables behind the look-ups from the files under /usr/share/hwdata. Reports every
// problem on standard error. On failure the look-ups find nothing; a bad file list and the want of
// memory for it end the process with status 1.
void BuildPciTables();

// The same from a list of files, which it takes over. False on failure.
bool BuildPciTablesFrom(PciIdsFileList files);

// Releases the tables; the look-ups then find nothing.
void ReleasePciTables();

// The names of a class (high byte) and subclass (low byte): the first entry of them, whatever its
// programming interface. All zero when there is none.
PciClassCodeEntry LookupPciClass(uint16_t classCode);

// The names of a device or of the given subsystem of it. The first name of a device wins, but for
// made-up ones; a matching subsystem wins over that, unless the device's name is from an override
// file and the subsystem is not. All zero when nothing is known.
PciDevEntry LookupPciDevice(uint16_t vendorID, uint16_t deviceID, uint16_t subVendorID,
                            uint16_t subDeviceID);
