// The records of the PCI functions and of the kernel's modules (see worlds.h).
#pragma once

#include <cstddef>
#include <cstdint>

struct __attribute__((packed)) PciConfigHeader {
  uint16_t vendorID;
  uint16_t deviceID;
  uint16_t subVendorID;
  uint16_t subDeviceID;
  uint16_t classCode;  // base class in the high byte, subclass in the low byte
  uint8_t unused10[2];
  uint8_t isaIrq;
  uint8_t irq;         // 255: none
  uint8_t vector;      // 0: none
  uint8_t intPin;      // 0 is pin A
  uint8_t spawnedBus;  // the bus behind the function
  uint8_t infoFlags;   // kPciInterruptValid, kPciSpawnedBusValid
  uint8_t mFlags;
  uint32_t moduleID;  // 0 and kNoModule: none
  char name[33];      // the kernel's name for the device; empty: none
  int32_t physSlot;
  uint8_t unused60[68];
};

// Bits of PciConfigHeader::infoFlags.
constexpr uint8_t kPciInterruptValid = 1;   // isaIrq, irq, vector and intPin hold something
constexpr uint8_t kPciSpawnedBusValid = 2;  // spawnedBus does

constexpr uint32_t kNoModule = 0xFFFFFFFF;

struct __attribute__((packed)) PciConfigSpace {
  uint8_t bytes[256];
};

struct __attribute__((packed)) PciExtConfigSpace {
  uint8_t bytes[4096];
};

struct __attribute__((packed)) ModuleRecord {
  char name[288];
  uint32_t moduleID;
  uint8_t unused292[408];
};
