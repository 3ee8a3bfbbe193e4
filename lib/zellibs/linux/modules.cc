// system_modules: the loaded modules in the order of /proc/modules, then the drivers built into the
// kernel that own a PCI function, by name. A module's number is its place in this list, from 1.
#include "linux/modules.h"

#include <fcntl.h>

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/pci.h"

namespace {

struct Module {
  char name[64];
};

struct Driver {
  char name[64];
  char module[64];  // empty: the kernel names none
};

// The list, as it was when it was last asked for.
struct ModuleTable {
  bool read = false;
  Array<Module> modules;
  size_t loaded = 0;      // so many of them are loaded, the others built in
  Array<Driver> drivers;  // of functions, each once
};

Everlasting<ModuleTable> snapshot;

KIF_Status AddModule(const char *name, size_t length) {
  Module module = {};
  CopyText(module.name, sizeof(module.name), name, length);
  return snapshot->modules.Append(module) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

// proc(5), /proc/modules: a line each, which begins with the name.
KIF_Status AddLoadedModules() {
  Descriptor file;
  Bytes lines;
  KIF_Status status = OpenHostFile("/proc/modules", O_RDONLY, &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &lines);
  const char *line = lines.text();
  while (status == KIF_STATUS_OK && *line != '\0') {
    const size_t name = strcspn(line, " \n");
    if (name > 0) status = AddModule(line, name);
    line += strcspn(line, "\n");
    if (*line == '\n') ++line;
  }
  snapshot->loaded = snapshot->modules.size();
  return status;
}

// Place of a loaded module plus 1, or 0. Drivers write '-' where modules have '_'.
uint32_t FindLoaded(const char *name) {
  for (uint32_t i = 0; i < snapshot->loaded; ++i) {
    const char *module = snapshot->modules[i].name;
    size_t k = 0;
    while (name[k] != '\0' && (name[k] == module[k] || (name[k] == '-' && module[k] == '_'))) ++k;
    if (name[k] == module[k]) return i + 1;
  }
  return 0;
}

uint32_t FindBuiltIn(const char *name) {
  for (size_t i = snapshot->loaded; i < snapshot->modules.size(); ++i) {
    if (strcmp(snapshot->modules[i].name, name) == 0) return static_cast<uint32_t>(i + 1);
  }
  return 0;
}

uint32_t FindInTable(const Driver &driver) {
  uint32_t number = driver.module[0] != '\0' ? FindLoaded(driver.module) : 0;
  if (number == 0) number = FindLoaded(driver.name);
  return number != 0 ? number : FindBuiltIn(driver.name);
}

const Driver *FindDriver(const char *name) {
  for (const Driver &driver : snapshot->drivers) {
    if (strcmp(driver.name, name) == 0) return &driver;
  }
  return nullptr;
}

int CompareModules(const void *left, const void *right) {
  return strcmp(static_cast<const Module *>(left)->name, static_cast<const Module *>(right)->name);
}

// Takes up the driver of the function `address`, a folder below `devices`, and with it the module
// that it makes itself when it is built in.
KIF_Status AddDriver(int devices, const char *address) {
  char path[300];
  Driver driver;
  snprintf(path, sizeof(path), "%s/driver", address);
  CopyLinkName(devices, path, driver.name, sizeof(driver.name));
  if (driver.name[0] == '\0' || FindDriver(driver.name) != nullptr) return KIF_STATUS_OK;
  snprintf(path, sizeof(path), "%s/driver/module", address);
  CopyLinkName(devices, path, driver.module, sizeof(driver.module));
  if (!snapshot->drivers.Append(driver)) return KIF_STATUS_NO_MEMORY;
  return FindInTable(driver) != 0 ? KIF_STATUS_OK : AddModule(driver.name, strlen(driver.name));
}

KIF_Status AddDrivers() {
  DirectoryReader devices;
  KIF_Status status = devices.Open("/sys/bus/pci/devices");
  while (status == KIF_STATUS_OK) {
    const char *address = devices.Next();
    if (address == nullptr) break;
    status = AddDriver(devices.fd(), address);
  }
  if (status == KIF_STATUS_OK) status = devices.status();
  const size_t builtIn = snapshot->modules.size() - snapshot->loaded;
  if (builtIn > 0) {
    qsort(snapshot->modules.begin() + snapshot->loaded, builtIn, sizeof(Module), CompareModules);
  }
  return status;
}

// A kernel may do without modules or without a PCI bus, but where neither is seen there is no list.
KIF_Status ReadModules() {
  snapshot->read = false;
  snapshot->modules.Clear();
  snapshot->drivers.Clear();
  KIF_Status status = AddLoadedModules();
  const bool hasModules = status == KIF_STATUS_OK;
  if (status == KIF_STATUS_OK || status == KIF_STATUS_NOT_FOUND) status = AddDrivers();
  if (status == KIF_STATUS_NOT_FOUND && hasModules) status = KIF_STATUS_OK;
  snapshot->read = status == KIF_STATUS_OK;
  return status;
}

KIF_Status NeedModules() {
  return snapshot->read ? KIF_STATUS_OK : ReadModules();
}

}  // namespace

void CopyLinkName(int directory, const char *path, char *name, size_t size) {
  char target[1024];
  name[0] = '\0';
  if (ReadLinkBelow(directory, path, target, sizeof(target)) != KIF_STATUS_OK) return;
  const char *slash = strrchr(target, '/');
  const char *last = slash != nullptr ? slash + 1 : target;
  CopyText(name, size, last, strlen(last));
}

KIF_Status FindModule(const char *name, uint32_t *number) {
  *number = 0;
  if (name[0] == '\0') return KIF_STATUS_OK;
  const KIF_Status status = NeedModules();
  if (status == KIF_STATUS_NO_PERMISSION) return KIF_STATUS_OK;
  if (status != KIF_STATUS_OK) return status;
  const Driver *driver = FindDriver(name);
  if (driver != nullptr) *number = FindInTable(*driver);
  return KIF_STATUS_OK;
}

KIF_Status ListModuleNumbers(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadModules();
  for (uint32_t i = 0; status == KIF_STATUS_OK && i < snapshot->modules.size(); ++i) {
    status = KIF_ParamListAddInt(list, i + 1);
  }
  return status;
}

KIF_Status GetModule(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const KIF_Status status = NeedModules();
  if (status != KIF_STATUS_OK) return status;
  const int64_t number = Integer(instance, 0);
  if (number < 1 || static_cast<uint64_t>(number) > snapshot->modules.size()) {
    return KIF_STATUS_NOT_FOUND;
  }
  auto *module = static_cast<ModuleRecord *>(record);
  const Module &known = snapshot->modules[static_cast<size_t>(number) - 1];
  memcpy(module->name, known.name, sizeof(known.name));
  module->moduleID = static_cast<uint32_t>(number);
  return KIF_STATUS_OK;
}
