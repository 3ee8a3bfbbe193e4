// system_os and system_serial: what runs here, and on what.
#include <fcntl.h>

#include <cstring>

#include "linux/attributes.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/system.h"

namespace {

enum OsField : unsigned { kId, kName, kVersion, kVendor, kModel, kFirmwareVersion, kFirmwareDate };
enum SerialField : unsigned { kSerial, kUuid };

constexpr char kDmi[] = "/sys/class/dmi/id";
constexpr char kDeviceTree[] = "/proc/device-tree";

// os-release(5): NAME=value, the value in quotes or not, with '\' before what a shell would read.
bool PutRelease(const char *text, const char *name, char *field, size_t size) {
  const size_t length = strlen(name);
  while (strncmp(text, name, length) != 0 || text[length] != '=') {
    text += strcspn(text, "\n");
    if (*text++ == '\0') return false;
  }
  text += length + 1;
  const char quote = *text == '"' || *text == '\'' ? *text++ : '\n';
  char value[512];
  size_t filled = 0;
  while (*text != '\0' && *text != '\n' && *text != quote && filled < sizeof(value)) {
    if (*text == '\\' && quote != '\'' && text[1] != '\0' && text[1] != '\n') ++text;
    value[filled++] = *text++;
  }
  CopyText(field, size, value, filled);
  return filled > 0;
}

void PutOs(SystemOs *os, uint64_t *known) {
  char text[8192];
  if (ReadHostFile("/etc/os-release", text, sizeof(text)) != KIF_STATUS_OK &&
      ReadHostFile("/usr/lib/os-release", text, sizeof(text)) != KIF_STATUS_OK) {
    return;
  }
  Know(known, kId, PutRelease(text, "ID", os->id, sizeof(os->id)));
  Know(known, kName, PutRelease(text, "NAME", os->name, sizeof(os->name)));
  Know(known, kVersion,
       PutRelease(text, "VERSION", os->version, sizeof(os->version)) ||
           PutRelease(text, "VERSION_ID", os->version, sizeof(os->version)));
}

void PutMachine(SystemOs *os, uint64_t *known) {
  Descriptor folder;
  if (OpenHostFile(kDmi, O_PATH | O_DIRECTORY, &folder) == KIF_STATUS_OK) {
    const int dmi = folder.fd();
    Know(known, kVendor, ReadLine(dmi, "sys_vendor", os->vendor, sizeof(os->vendor)));
    Know(known, kModel, ReadLine(dmi, "product_name", os->model, sizeof(os->model)));
    Know(known, kFirmwareVersion,
         ReadLine(dmi, "bios_version", os->firmwareVersion, sizeof(os->firmwareVersion)));
    Know(known, kFirmwareDate,
         ReadLine(dmi, "bios_date", os->firmwareDate, sizeof(os->firmwareDate)));
  } else if (OpenHostFile(kDeviceTree, O_PATH | O_DIRECTORY, &folder) == KIF_STATUS_OK) {
    char model[sizeof(os->model)];
    if (ReadBelow(folder.fd(), "model", model, sizeof(model)) != KIF_STATUS_OK) return;
    CopyText(os->model, sizeof(os->model), model, strlen(model));
    Know(known, kModel, os->model[0] != '\0');
  }
}

// Puts a text that only some may read; the status of the file where it cannot be.
KIF_Status PutSecret(const char *path, char *field, size_t size) {
  char text[256];
  const KIF_Status status = ReadHostFile(path, text, sizeof(text));
  if (status == KIF_STATUS_OK) CopyText(field, size, text, strcspn(text, "\n"));
  return status;
}

}  // namespace

KIF_Status GetOs(const NodeInfo &, const KIF_ParamList *, void *record) {
  auto *os = static_cast<SystemOs *>(record);
  uint64_t known = 0;
  PutOs(os, &known);
  PutMachine(os, &known);
  os->known = known;
  return known != 0 ? KIF_STATUS_OK : KIF_STATUS_NOT_FOUND;
}

KIF_Status GetSystemSerial(const NodeInfo &, const KIF_ParamList *, void *record) {
  auto *answer = static_cast<SystemSerial *>(record);
  KIF_Status status =
      PutSecret("/sys/class/dmi/id/product_serial", answer->serial, sizeof(answer->serial));
  if (status == KIF_STATUS_NOT_FOUND) {
    status = PutSecret("/proc/device-tree/serial-number", answer->serial, sizeof(answer->serial));
  }
  const KIF_Status other =
      PutSecret("/sys/class/dmi/id/product_uuid", answer->uuid, sizeof(answer->uuid));
  uint64_t known = 0;
  Know(&known, kSerial, answer->serial[0] != '\0');
  Know(&known, kUuid, answer->uuid[0] != '\0');
  answer->known = known;
  if (known != 0) return KIF_STATUS_OK;
  if (status == KIF_STATUS_OK) status = other;
  return status != KIF_STATUS_OK ? status : KIF_STATUS_NOT_FOUND;
}
