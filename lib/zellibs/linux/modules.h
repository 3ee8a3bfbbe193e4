// The kernel's modules, by number.
#pragma once

#include <cstdint>

#include "kif/zellibs.h"

// The name of the driver that owns a PCI function, and of its module; empty where there is none.
struct PciDriver {
  char name[64];
  char module[64];
};

// Reads which driver owns the function `address` (a folder of /sys/bus/pci/devices) below the open
// directory `devices`.
void ReadPciDriver(int devices, const char *address, PciDriver *driver);

// Number of the driver's module in the list of modules; 0 where it is in none.
KIF_Status FindModule(const PciDriver &driver, uint32_t *number);
