// What a driver made of a device.
#pragma once

#include <cstddef>

// The folders of a device in which something that its driver made may stand, as far as the names
// in the device's own folder have been looked at.
struct ProductFolders {
  const struct ProductKind *best = nullptr;
  char product[256] = "";  // of a kind that stands in the device's folder itself
  char carried[256] = "";  // the first folder of a bus that the device carries: virtio0, ata1
};

// Looks at one more name in the device's folder.
void NoteProductFolder(const char *name, ProductFolders *folders);

// Copies the kernel's name for the interface, disk controller or card ("eth0", "nvme0", "card0")
// that the driver of the device with the open folder `device` made, to `field`, printable and
// terminated; empty where there is none.
void CopyDriverProduct(int device, const ProductFolders &folders, char *field, size_t size);
