// The functions on the PCI bus, and finding one of them.
#pragma once

#include <cstddef>
#include <cstdint>

#include "linux/files.h"
#include "param_list.h"

struct PciAddress {
  uint32_t part[4];  // segment, bus, slot and function
};

// Opens the folder in /sys/bus/pci/devices of the function that `instance` selects, and tells the
// function's address.
KIF_Status OpenPciFunction(const KIF_ParamList *instance, PciAddress *address,
                           DirectoryReader *folder);

// Number of the slot in the machine's case that holds the function; -1: none is known. The status
// is that of reading the bus.
KIF_Status FindPhysicalSlot(const PciAddress &address, int32_t *number);

// Converts the hexadecimal number that `*text` begins with, moves `*text` behind it and behind the
// character `end` that must follow. False where there is no such number.
bool TakeHex(const char **text, char end, uint32_t *number);
