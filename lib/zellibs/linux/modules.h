// The kernel's modules, by number.
#pragma once

#include <cstddef>
#include <cstdint>

#include "zellibs.h"

// Copies the last component of the target of a link below the open folder `directory`, printable
// and terminated, to `name`; empty where there is no such link.
void CopyLinkName(int directory, const char *path, char *name, size_t size);

// Number, in the list of modules, of the one that a driver of the PCI bus belongs to; 0 where it is
// in none.
KIF_Status FindModule(const char *driver, uint32_t *number);
