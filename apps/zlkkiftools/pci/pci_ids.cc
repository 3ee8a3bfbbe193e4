#include "pci/pci_ids.h"

#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <string_view>
#include <utility>

#include "base/everlasting.h"
#include "base/shown.h"
#include "output.h"
#include "pci/ids_line.h"

const char not_avail_prefix[] = "Name not available for ";

namespace {

constexpr char kPublishedFile[] = "/usr/share/hwdata/pci.ids";
constexpr const char *kOverrideDirectories[] = {
    "/usr/share/hwdata/oem.pciids.d",      "/usr/share/hwdata/ihv.pciids.d",
    "/usr/share/hwdata/default.pciids.d",  "/usr/share/hwdata/driver.pciids.d",
    "/usr/share/hwdata/fallback.pciids.d",
};

constexpr size_t kVendorNameRoom = sizeof(PciDevEntry::vendorName);
constexpr size_t kDeviceNameRoom = sizeof(PciDevEntry::name);
constexpr size_t kClassNameRoom = sizeof(PciClassCodeEntry::className);

// The published file has tens of thousands of devices, of which a run names a handful. So the rows
// point into the lines, and a PciDevEntry is made for what a look-up finds. The rows of PciDevTable
// stand in groups, one for each vendor line, which is also what makes the look-up quick.
struct DeviceRow {
  const char *name;  // null: to be made up from the vendor's
  uint16_t deviceID;
  uint16_t subVendorID;
  uint16_t subDeviceID;
  uint8_t nameLength;
};

struct VendorRow {
  const char *name;
  size_t firstDevice;  // the group goes up to that of the next row
  uint16_t vendorID;
  uint8_t nameLength;
};

Everlasting<PciIdsFileList> idsFiles;  // the names' bytes
VendorRow *VendorTable;  // the first row is for the devices above the first vendor line
size_t nvendor;
DeviceRow *PciDevTable;
size_t ndevid;
size_t overrideCount;  // rows of PciDevTable that come from override files; they are the first ones
PciClassCodeEntry *PciClassCodeTable;
size_t nclass;

template <size_t Room>
void CopyName(char (&field)[Room], std::string_view name) {
  if (!name.empty()) memcpy(field, name.data(), name.size());
  memset(field + name.size(), 0, Room - name.size());
}

void ReportMalformed(int message) {
  fprintf(Messages(), "%s: line %d improperly formatted(%d)\n",
          Printable(idsFiles->CurrentPath()).text(), idsFiles->LineNumber(), message);
}

// ndevid, and the rows that VendorTable needs, from the lines of the device section.
void CountDevices() {
  ndevid = 0;
  nvendor = 1;
  std::string_view line;
  while (idsFiles->NextLine(&line)) {
    switch (DeviceLineKind(line)) {
      case DeviceLine::kIgnored:
        break;
      case DeviceLine::kVendor:
        ++nvendor;
        break;
      case DeviceLine::kDevice:
      case DeviceLine::kSubsystem:
        ++ndevid;
        break;
      case DeviceLine::kEnd:
        return;
    }
  }
}

// nclass, from the lines after the device section.
void CountClasses() {
  nclass = 0;
  ClassLine last = ClassLine::kIgnored;
  std::string_view line;
  while (idsFiles->NextLine(&line)) {
    const ClassLine kind = ClassLineKind(line);
    if (kind == ClassLine::kIgnored) continue;
    // The first prog-if line under a subclass takes the place of the subclass.
    if (kind == ClassLine::kSubclass) ++nclass;
    if (kind == ClassLine::kProgIf && last != ClassLine::kSubclass) ++nclass;
    last = kind;
  }
}

// Zeroed rows; an empty table has an address, too.
template <typename Row>
Row *AllocateRows(size_t count) {
  return static_cast<Row *>(calloc(count > 0 ? count : 1, sizeof(Row)));
}

bool AllocateTables() {
  VendorTable = AllocateRows<VendorRow>(nvendor);
  PciDevTable = AllocateRows<DeviceRow>(ndevid);
  const bool haveDevices = VendorTable != nullptr && PciDevTable != nullptr;
  if (!haveDevices) {
    fprintf(Messages(), "couldn't allocate PciDevTable (%zu bytes)\n",
            ndevid * sizeof(PciDevEntry));
  }
  PciClassCodeTable = AllocateRows<PciClassCodeEntry>(nclass);
  if (PciClassCodeTable == nullptr) {
    fprintf(Messages(), "couldn't allocate PciClassCodeTable (%zu bytes)\n",
            nclass * sizeof(PciClassCodeEntry));
  }
  return haveDevices && PciClassCodeTable != nullptr;
}

// How far the device section has come into its tables.
struct DevicePass {
  size_t vendors = 1;
  size_t devices = 0;
  uint16_t deviceID = 0;  // of the device line read last

  bool HasVendor() const { return vendors > 1; }
};

bool AddVendor(DevicePass *pass, std::string_view line) {
  uint32_t number;
  std::string_view name;
  if (!ParseIdAndName(line, kVendorNameRoom, &number, &name)) {
    ReportMalformed(1);
    return false;
  }
  VendorTable[pass->vendors++] = {.name = name.data(),
                                  .firstDevice = pass->devices,
                                  .vendorID = static_cast<uint16_t>(number),
                                  .nameLength = static_cast<uint8_t>(name.size())};
  return true;
}

void AppendDevice(DevicePass *pass, uint16_t subVendorID, uint16_t subDeviceID,
                  std::string_view name) {
  PciDevTable[pass->devices++] = {.name = name.data(),
                                  .deviceID = pass->deviceID,
                                  .subVendorID = subVendorID,
                                  .subDeviceID = subDeviceID,
                                  .nameLength = static_cast<uint8_t>(name.size())};
  if (idsFiles->InOverrideFile()) ++overrideCount;
}

bool AddDevice(DevicePass *pass, std::string_view line) {
  uint32_t number = pass->deviceID;
  std::string_view name;  // stays without a text when there is none in the line
  if (!ParseIdAndName(TextFrom(line, 1), kDeviceNameRoom, &number, &name) && !pass->HasVendor()) {
    fprintf(Messages(), "%s: can't synthesize device name for line %d\n",
            Printable(idsFiles->CurrentPath()).text(), idsFiles->LineNumber());
    return false;
  }
  pass->deviceID = static_cast<uint16_t>(number);
  AppendDevice(pass, 0, 0, name);
  return true;
}

bool AddSubsystem(DevicePass *pass, std::string_view line) {
  constexpr size_t kSubDeviceAt = 7;  // after two tabs, four digits and a blank
  uint32_t subVendorID;
  uint32_t subDeviceID;
  std::string_view name;
  if (!ParseIdAndName(TextFrom(line, 2), 0, &subVendorID, nullptr)) {
    ReportMalformed(3);
    return false;
  }
  if (line.size() <= kSubDeviceAt ||
      !ParseIdAndName(TextFrom(line, kSubDeviceAt), kDeviceNameRoom, &subDeviceID, &name)) {
    ReportMalformed(4);
    return false;
  }
  if (!pass->HasVendor()) {
    fprintf(Messages(), "no vendor information for subvendor 0%04x: subsystem 0%04x",
            subVendorID & 0xffff, subDeviceID & 0xffff);
    return false;
  }
  AppendDevice(pass, static_cast<uint16_t>(subVendorID), static_cast<uint16_t>(subDeviceID), name);
  return true;
}

bool AddDeviceLine(DevicePass *pass, DeviceLine kind, std::string_view line) {
  switch (kind) {
    case DeviceLine::kVendor:
      return AddVendor(pass, line);
    case DeviceLine::kDevice:
      return AddDevice(pass, line);
    case DeviceLine::kSubsystem:
      return AddSubsystem(pass, line);
    default:
      return true;
  }
}

// Fills VendorTable and PciDevTable up to the end of the device section or the first malformed
// line. False when lines that were counted are missing.
bool FillDevices() {
  DevicePass pass;
  overrideCount = 0;
  VendorTable[0] = {};
  std::string_view line;
  while (idsFiles->NextLine(&line)) {
    const DeviceLine kind = DeviceLineKind(line);
    if (kind == DeviceLine::kEnd || !AddDeviceLine(&pass, kind, line)) break;
  }
  nvendor = pass.vendors;
  if (pass.devices == ndevid) return true;
  fprintf(Messages(), "parsing problem: devices %u ndevid %u\n",
          static_cast<unsigned>(pass.devices), static_cast<unsigned>(ndevid));
  return false;
}

// How far the class section has come into its table.
struct ClassPass {
  size_t stored = 0;
  bool subclassPending = false;
  PciClassCodeEntry entry = {};  // the numbers and names read last
};

// A pass that began above the place where counting did may have more to store than was counted.
void StoreClass(ClassPass *pass, const PciClassCodeEntry &entry) {
  if (pass->stored < nclass) PciClassCodeTable[pass->stored] = entry;
  ++pass->stored;
}

void StoreSubclass(ClassPass *pass) {
  PciClassCodeEntry entry = pass->entry;
  entry.progIf = 0;
  CopyName(entry.progIfName, {});
  StoreClass(pass, entry);
  pass->subclassPending = false;
}

// Reads a number and a name into the fields of an entry, as far as they can be read.
bool ReadClassFields(std::string_view text, uint8_t *number, char (&field)[kClassNameRoom]) {
  uint32_t value = *number;
  std::string_view name;
  const bool read = ParseIdAndName(text, kClassNameRoom, &value, &name);
  *number = static_cast<uint8_t>(value);
  if (read) CopyName(field, name);
  return read;
}

// These take one line each. On a malformed one they say so, store what is left to store and give
// false.
bool AddClass(ClassPass *pass, std::string_view line) {
  if (pass->subclassPending) StoreSubclass(pass);
  if (ReadClassFields(TextFrom(line, 1), &pass->entry.baseClass, pass->entry.className))
    return true;
  ReportMalformed(5);
  return false;
}

bool AddSubclass(ClassPass *pass, std::string_view line) {
  if (pass->subclassPending) StoreSubclass(pass);
  pass->subclassPending = true;
  if (ReadClassFields(TextFrom(line, 1), &pass->entry.subClass, pass->entry.subClassName))
    return true;
  ReportMalformed(6);
  StoreSubclass(pass);
  return false;
}

bool AddProgIf(ClassPass *pass, std::string_view line) {
  const bool read = ReadClassFields(TextFrom(line, 2), &pass->entry.progIf, pass->entry.progIfName);
  if (!read) ReportMalformed(7);
  StoreClass(pass, pass->entry);
  pass->subclassPending = false;
  return read;
}

bool AddClassLine(ClassPass *pass, std::string_view line) {
  switch (ClassLineKind(line)) {
    case ClassLine::kClass:
      return AddClass(pass, line);
    case ClassLine::kSubclass:
      return AddSubclass(pass, line);
    case ClassLine::kProgIf:
      return AddProgIf(pass, line);
    default:
      return true;
  }
}

// Fills PciClassCodeTable from the next line on. False when the entries are not as many as counted.
bool FillClasses() {
  ClassPass pass;
  std::string_view line;
  while (idsFiles->NextLine(&line) && AddClassLine(&pass, line)) {
  }
  if (pass.subclassPending) StoreSubclass(&pass);
  if (pass.stored == nclass) return true;
  fprintf(Messages(), "internal error: classes %u nclass %u\n", static_cast<unsigned>(pass.stored),
          static_cast<unsigned>(nclass));
  return false;
}

void CountEntries() {
  CountDevices();
  if (ndevid == 0) {
    fputs("no device entries in the pci ids files\nPerhaps, corrupted file?\n", Messages());
  }
  CountClasses();
  if (nclass == 0) {
    fprintf(Messages(), "no class entries in %s\nPerhaps, corrupted file?\n", kPublishedFile);
  }
  idsFiles->Rewind();
}

bool IsSynthesized(const DeviceRow &row) {
  return row.name == nullptr ||
         std::string_view(row.name, row.nameLength).starts_with(not_avail_prefix);
}

PciDevEntry EntryOf(const VendorRow &vendor, const DeviceRow &device) {
  PciDevEntry entry;
  entry.vendorID = vendor.vendorID;
  entry.deviceID = device.deviceID;
  entry.subVendorID = device.subVendorID;
  entry.subDeviceID = device.subDeviceID;
  CopyName(entry.vendorName, {vendor.name, vendor.nameLength});
  if (device.name != nullptr) {
    CopyName(entry.name, {device.name, device.nameLength});
  } else {
    CopyName(entry.name, {});
    snprintf(entry.name, sizeof(entry.name), "%s%s device", not_avail_prefix, entry.vendorName);
  }
  return entry;
}

bool IsOverride(const DeviceRow *row) {
  return static_cast<size_t>(row - PciDevTable) < overrideCount;
}

// A look-up on its way through PciDevTable.
struct DeviceSearch {
  uint16_t deviceID;
  uint16_t subVendorID;
  uint16_t subDeviceID;
  const VendorRow *vendor = nullptr;  // of the best entry
  const DeviceRow *best = nullptr;
  bool ended = false;
};

void SearchVendor(const VendorRow *vendor, DeviceSearch *search) {
  const bool last = vendor + 1 == VendorTable + nvendor;
  const DeviceRow *end = PciDevTable + (last ? ndevid : vendor[1].firstDevice);
  for (const DeviceRow *row = PciDevTable + vendor->firstDevice; row != end; ++row) {
    if (row->deviceID != search->deviceID) continue;
    const DeviceRow *best = search->best;
    bool better;
    if (row->subVendorID == 0) {
      better = best == nullptr || (IsSynthesized(*best) && !IsSynthesized(*row));
    } else if (row->subVendorID == search->subVendorID && row->subDeviceID == search->subDeviceID) {
      better = IsOverride(row) || best == nullptr || !IsOverride(best) || IsSynthesized(*best);
      search->ended = true;
    } else {
      continue;
    }
    if (better) {
      search->best = row;
      search->vendor = vendor;
    }
    if (search->ended) return;
  }
}

}  // namespace

void ReleasePciTables() {
  free(VendorTable);
  free(PciDevTable);
  free(PciClassCodeTable);
  VendorTable = nullptr;
  PciDevTable = nullptr;
  PciClassCodeTable = nullptr;
  nvendor = ndevid = nclass = overrideCount = 0;
  *idsFiles = PciIdsFileList();
}

bool BuildPciTablesFrom(PciIdsFileList files) {
  ReleasePciTables();
  *idsFiles = std::move(files);
  CountEntries();
  if (AllocateTables() && FillDevices() && FillClasses()) return true;
  ReleasePciTables();
  fputs("Failed to build PCI tables\n", Messages());
  return false;
}

void BuildPciTables() {
  PciIdsFileList files;
  for (const char *directory : kOverrideDirectories) files.AddDirectory(directory);
  files.AddPath(kPublishedFile);
  BuildPciTablesFrom(std::move(files));
}

PciClassCodeEntry LookupPciClass(uint16_t classCode) {
  for (size_t i = 0; i < nclass; ++i) {
    const PciClassCodeEntry &entry = PciClassCodeTable[i];
    if (entry.baseClass == classCode >> 8 && entry.subClass == (classCode & 0xff)) return entry;
  }
  return {};
}

PciDevEntry LookupPciDevice(uint16_t vendorID, uint16_t deviceID, uint16_t subVendorID,
                            uint16_t subDeviceID) {
  DeviceSearch search = {deviceID, subVendorID, subDeviceID};
  for (size_t i = 0; i < nvendor && !search.ended; ++i) {
    if (VendorTable[i].vendorID == vendorID) SearchVendor(&VendorTable[i], &search);
  }
  return search.best != nullptr ? EntryOf(*search.vendor, *search.best) : PciDevEntry{};
}
