// system_packages: what the package managers that keep a text say is installed. A package's number
// is its place in this list, from 1.
#include <fcntl.h>

#include <cstring>

#include "base/array.h"
#include "base/bytes.h"
#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/packages.h"

namespace {

enum PackageField : unsigned { kManager, kArchitecture, kState, kVersion, kName };

// A text of packages: lines "KEY value", a blank line between packages.
struct Manager {
  const char *name;
  const char *path;
  const char *nameKey;
  const char *architectureKey;
  const char *versionKey;
  const char *stateKey;  // null: what stands there is installed
};

constexpr Manager kManagers[] = {
    {"dpkg", "/var/lib/dpkg/status", "Package:", "Architecture:", "Version:", "Status:"},
    {"apk", "/lib/apk/db/installed", "P:", "A:", "V:", nullptr},
};

struct Place {
  const Manager *manager;
  size_t begin;
};

// The texts when the packages were listed last, and where each package begins.
struct PackageTable {
  bool read = false;
  Bytes text;
  Array<Place> places;
};

Everlasting<PackageTable> snapshot;

// Moves to the next line; false at the end of a package.
bool NextLine(const char **line) {
  *line += strcspn(*line, "\n");
  if (**line != '\0') ++*line;
  return **line != '\0' && **line != '\n';
}

KIF_Status AddPackages(const Manager &manager) {
  PackageTable &table = *snapshot;
  Descriptor file;
  KIF_Status status = OpenHostFile(manager.path, O_RDONLY, &file);
  const size_t before = table.text.size();
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &table.text);
  if (status != KIF_STATUS_OK) return status;
  // What one text lacks at its end is no part of the next one.
  if (!table.text.Append("\n\n", 2)) return KIF_STATUS_NO_MEMORY;
  const char *text = table.text.text();
  for (const char *line = text + before; *line != '\0';) {
    if (*line == '\n') {
      ++line;
      continue;
    }
    if (!table.places.Append({&manager, static_cast<size_t>(line - text)})) {
      return KIF_STATUS_NO_MEMORY;
    }
    while (NextLine(&line)) {
    }
  }
  return KIF_STATUS_OK;
}

KIF_Status ReadPackages() {
  snapshot->read = false;
  snapshot->text.Clear();
  snapshot->places.Clear();
  KIF_Status found = KIF_STATUS_NOT_FOUND;
  for (const Manager &manager : kManagers) {
    const KIF_Status status = AddPackages(manager);
    if (status == KIF_STATUS_OK) found = status;
    if (status != KIF_STATUS_OK && status != KIF_STATUS_NOT_FOUND) return status;
  }
  snapshot->read = found == KIF_STATUS_OK;
  return found;
}

bool PutValue(const char *package, const char *key, char *field, size_t size) {
  const size_t length = strlen(key);
  const char *line = package;
  do {
    if (strncmp(line, key, length) != 0) continue;
    const char *value = line + length + strspn(line + length, " ");
    const size_t valueLength = strcspn(value, "\n");
    CopyText(field, size, value, valueLength);
    return valueLength > 0;
  } while (NextLine(&line));
  return false;
}

}  // namespace

KIF_Status ListPackages(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadPackages();
  for (size_t i = 0; status == KIF_STATUS_OK && i < snapshot->places.size(); ++i) {
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(i + 1));
  }
  return status;
}

KIF_Status GetPackage(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const KIF_Status status = snapshot->read ? KIF_STATUS_OK : ReadPackages();
  if (status != KIF_STATUS_OK) return status;
  const int64_t number = Integer(instance, 0);
  if (number < 1 || static_cast<uint64_t>(number) > snapshot->places.size()) {
    return KIF_STATUS_NOT_FOUND;
  }
  const Place &place = snapshot->places[static_cast<size_t>(number) - 1];
  const Manager &manager = *place.manager;
  const char *text = snapshot->text.text() + place.begin;
  auto *package = static_cast<Package *>(record);
  uint64_t known = 0;
  CopyText(package->manager, sizeof(package->manager), manager.name, strlen(manager.name));
  Know(&known, kManager, true);
  Know(&known, kName, PutValue(text, manager.nameKey, package->name, sizeof(package->name)));
  Know(&known, kArchitecture,
       PutValue(text, manager.architectureKey, package->architecture,
                sizeof(package->architecture)));
  Know(&known, kVersion,
       PutValue(text, manager.versionKey, package->version, sizeof(package->version)));
  if (manager.stateKey == nullptr) {
    strcpy(package->state, "installed");
    Know(&known, kState, true);
  } else {
    Know(&known, kState, PutValue(text, manager.stateKey, package->state, sizeof(package->state)));
  }
  package->known = known;
  return KIF_STATUS_OK;
}
