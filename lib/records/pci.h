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
static_assert(sizeof(PciConfigHeader) == 128);
static_assert(offsetof(PciConfigHeader, vendorID) == 0);
static_assert(offsetof(PciConfigHeader, deviceID) == 2);
static_assert(offsetof(PciConfigHeader, subVendorID) == 4);
static_assert(offsetof(PciConfigHeader, subDeviceID) == 6);
static_assert(offsetof(PciConfigHeader, classCode) == 8);
static_assert(offsetof(PciConfigHeader, isaIrq) == 12);
static_assert(offsetof(PciConfigHeader, irq) == 13);
static_assert(offsetof(PciConfigHeader, vector) == 14);
static_assert(offsetof(PciConfigHeader, intPin) == 15);
static_assert(offsetof(PciConfigHeader, spawnedBus) == 16);
static_assert(offsetof(PciConfigHeader, infoFlags) == 17);
static_assert(offsetof(PciConfigHeader, mFlags) == 18);
static_assert(offsetof(PciConfigHeader, moduleID) == 19);
static_assert(offsetof(PciConfigHeader, name) == 23);
static_assert(offsetof(PciConfigHeader, physSlot) == 56);

// Bits of PciConfigHeader::infoFlags.
constexpr uint8_t kPciInterruptValid = 1;   // isaIrq, irq, vector and intPin hold something
constexpr uint8_t kPciSpawnedBusValid = 2;  // spawnedBus does

constexpr uint32_t kNoModule = 0xFFFFFFFF;

struct __attribute__((packed)) PciConfigSpace {
  uint8_t bytes[256];
};
static_assert(sizeof(PciConfigSpace) == 256);

struct __attribute__((packed)) PciExtConfigSpace {
  uint8_t bytes[4096];
};
static_assert(sizeof(PciExtConfigSpace) == 4096);

struct __attribute__((packed)) ModuleRecord {
  char name[288];
  uint32_t moduleID;
  uint8_t unused292[408];
};
static_assert(sizeof(ModuleRecord) == 700);
static_assert(offsetof(ModuleRecord, name) == 0);
static_assert(offsetof(ModuleRecord, moduleID) == 288);
