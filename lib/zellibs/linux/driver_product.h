// What a driver made of a device.
#pragma once

#include <cstddef>

// Copies the kernel's name for what the driver of the device in the open folder `device` made of
// it, the interface, disk controller or card ("eth0", "nvme0", "card0"), to `field`, printable and
// terminated; empty where there is none.
void CopyDriverProduct(int device, char *field, size_t size);
