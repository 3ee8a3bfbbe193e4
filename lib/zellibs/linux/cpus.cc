// hardware_cpu_cpus and hardware_cpu_vulnerabilities: the CPUs one by one, and what they suffer
// from.
#include <fcntl.h>
#include <stdio.h>

#include <algorithm>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/system.h"

namespace {

constexpr uint64_t kMostCpus = 65536;
constexpr char kCpus[] = "/sys/devices/system/cpu";
constexpr char kVulnerabilities[] = "/sys/devices/system/cpu/vulnerabilities";

enum CpuField : unsigned {
  kFamily,
  kModel,
  kStepping,
  kMicrocode,
  kSocket,
  kCore,
  kOnline,
  kGovernor,
  kVendor,
  kModelName,
  kFlags
};

// /proc/cpuinfo when the CPUs were listed last: where the lines of each begin.
struct CpuInfoFile {
  struct Block {
    uint64_t cpu;
    size_t begin;
    size_t end;
  };
  bool read = false;
  Bytes text;
  Array<Block> blocks;
};

Everlasting<CpuInfoFile> snapshot;

// Moves behind "name : " where a line begins so.
bool TakeKey(const char **line, const char *name) {
  const size_t length = strlen(name);
  if (strncmp(*line, name, length) != 0) return false;
  const char *place = *line + length;
  place += strspn(place, " \t");
  if (*place != ':') return false;
  *line = place + 1 + strspn(place + 1, " \t");
  return true;
}

KIF_Status ReadCpuInfoFile() {
  CpuInfoFile &file = *snapshot;
  Descriptor opened;
  file.read = false;
  file.text.Clear();
  file.blocks.Clear();
  KIF_Status status = OpenHostFile("/proc/cpuinfo", O_RDONLY, &opened);
  if (status == KIF_STATUS_OK) status = ReadWhole(opened, &file.text);
  const char *text = file.text.text();
  for (const char *line = text; status == KIF_STATUS_OK && *line != '\0';) {
    const char *value = line;
    uint64_t cpu;
    const auto place = static_cast<size_t>(line - text);
    if (TakeKey(&value, "processor") && TakeNumber(&value, &cpu)) {
      if (file.blocks.size() > 0) file.blocks[file.blocks.size() - 1].end = place;
      if (!file.blocks.Append({cpu, place, file.text.size()})) status = KIF_STATUS_NO_MEMORY;
    }
    line += strcspn(line, "\n");
    if (*line != '\0') ++line;
  }
  file.read = status == KIF_STATUS_OK;
  return status;
}

// The value of the first of two keys in the lines of a CPU, and its length; null where it has none.
const char *FindKey(const CpuInfoFile::Block &block, const char *key, const char *other,
                    size_t *length) {
  const char *end = snapshot->text.text() + block.end;
  for (const char *line = snapshot->text.text() + block.begin; line < end;) {
    const char *value = line;
    if (TakeKey(&value, key) || (other != nullptr && TakeKey(&value, other))) {
      *length = strcspn(value, "\n");
      return value;
    }
    line += strcspn(line, "\n") + 1;
  }
  return nullptr;
}

bool PutKey(const CpuInfoFile::Block &block, const char *key, const char *other, char *field,
            size_t size) {
  size_t length;
  const char *value = FindKey(block, key, other, &length);
  if (value == nullptr) return false;
  CopyText(field, size, value, length);
  return length > 0;
}

bool FindNumber(const CpuInfoFile::Block &block, const char *key, const char *other,
                uint64_t *number) {
  size_t length;
  const char *value = FindKey(block, key, other, &length);
  if (value == nullptr || length == 0) return false;
  if (strncmp(value, "0x", 2) != 0) return TakeNumber(&value, number);
  char *end;
  *number = strtoull(value, &end, 16);
  return end > value + 2;
}

void PutCpuInfo(const CpuInfoFile::Block &block, CpuFacts *cpu, uint64_t *known) {
  uint64_t number = 0;
  bool is = FindNumber(block, "cpu family", "CPU architecture", &number);
  cpu->family = KnownNumber<uint32_t>(known, kFamily, is, number);
  is = FindNumber(block, "model", nullptr, &number);
  cpu->model = KnownNumber<uint32_t>(known, kModel, is, number);
  is = FindNumber(block, "stepping", "CPU revision", &number);
  cpu->stepping = KnownNumber<uint32_t>(known, kStepping, is, number);
  is = FindNumber(block, "microcode", nullptr, &number);
  cpu->microcode = KnownNumber<uint32_t>(known, kMicrocode, is, number);
  Know(known, kVendor,
       PutKey(block, "vendor_id", "CPU implementer", cpu->vendor, sizeof(cpu->vendor)));
  Know(known, kModelName,
       PutKey(block, "model name", "CPU part", cpu->modelName, sizeof(cpu->modelName)));
  Know(known, kFlags, PutKey(block, "flags", "Features", cpu->flags, sizeof(cpu->flags)));
}

// "0-3,8".
KIF_Status AddRange(const char *place, KIF_ParamList *list) {
  uint64_t first;
  while (TakeNumber(&place, &first)) {
    uint64_t last = first;
    if (*place == '-') {
      ++place;
      if (!TakeNumber(&place, &last)) return KIF_STATUS_IO_ERROR;
    }
    for (uint64_t cpu = first; cpu <= last && cpu < kMostCpus; ++cpu) {
      const KIF_Status status = KIF_ParamListAddInt(list, static_cast<int64_t>(cpu));
      if (status != KIF_STATUS_OK) return status;
      if (list->count > kMostCpus) return KIF_STATUS_TOO_LARGE;
    }
    if (*place++ != ',') break;
  }
  return KIF_STATUS_OK;
}

// A CPU that cannot be switched off has no file that says so.
bool IsOnline(int folder, bool inFile, uint64_t *online) {
  if (ReadNumber(folder, "online", online)) return true;
  *online = inFile ? 1 : 0;
  return inFile;
}

bool IsName(const char *name) {
  return name[0] != '\0' && name[0] != '.' && strchr(name, '/') == nullptr;
}

}  // namespace

KIF_Status ListCpus(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  char present[4096];
  const KIF_Status read = ReadCpuInfoFile();
  if (ReadHostFile("/sys/devices/system/cpu/present", present, sizeof(present)) == KIF_STATUS_OK) {
    return AddRange(present, list);
  }
  KIF_Status status = read;
  for (const CpuInfoFile::Block &block : snapshot->blocks) {
    if (status != KIF_STATUS_OK || block.cpu >= kMostCpus) break;
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(block.cpu));
  }
  return status;
}

KIF_Status GetCpu(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *cpu = static_cast<CpuFacts *>(record);
  const int64_t number = Integer(instance, 0);
  if (number < 0 || static_cast<uint64_t>(number) >= kMostCpus) return KIF_STATUS_NOT_FOUND;
  if (!snapshot->read) (void)ReadCpuInfoFile();
  const CpuInfoFile::Block *block = std::find_if(
      snapshot->blocks.begin(), snapshot->blocks.end(), [number](const CpuInfoFile::Block &other) {
        return other.cpu == static_cast<uint64_t>(number);
      });
  const bool inFile = block != snapshot->blocks.end();
  uint64_t known = 0;
  if (inFile) PutCpuInfo(*block, cpu, &known);
  char path[64];
  snprintf(path, sizeof(path), "%s/cpu%d", kCpus, static_cast<int>(number));
  Descriptor folder;
  const KIF_Status status = OpenHostFile(path, O_PATH | O_DIRECTORY, &folder);
  if (status == KIF_STATUS_OK) {
    uint64_t value = 0;
    bool is = ReadNumber(folder.fd(), "topology/physical_package_id", &value);
    cpu->socket = KnownNumber<uint32_t>(&known, kSocket, is, value);
    is = ReadNumber(folder.fd(), "topology/core_id", &value);
    cpu->core = KnownNumber<uint32_t>(&known, kCore, is, value);
    is = IsOnline(folder.fd(), inFile, &value);
    cpu->online = KnownNumber<uint8_t>(&known, kOnline, is, value);
    Know(&known, kGovernor,
         ReadLine(folder.fd(), "cpufreq/scaling_governor", cpu->governor, sizeof(cpu->governor)));
  }
  cpu->known = known;
  return inFile ? KIF_STATUS_OK : status;
}

KIF_Status ListVulnerabilities(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  DirectoryReader folder;
  KIF_Status status = folder.Open(kVulnerabilities);
  while (const char *name = status == KIF_STATUS_OK ? folder.Next() : nullptr) {
    status = KIF_ParamListAddString(list, name);
  }
  if (status == KIF_STATUS_OK) status = folder.status();
  std::sort(list->params, list->params + list->count,
            [](const Param &a, const Param &b) { return strcmp(a.text, b.text) < 0; });
  return status;
}

KIF_Status GetVulnerability(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  auto *answer = static_cast<CpuVulnerability *>(record);
  const char *name = TextAt(instance, 0);
  char text[1024];
  Descriptor folder;
  if (!IsName(name)) return KIF_STATUS_NOT_FOUND;
  KIF_Status status = OpenHostFile(kVulnerabilities, O_PATH | O_DIRECTORY, &folder);
  if (status == KIF_STATUS_OK) status = ReadBelow(folder.fd(), name, text, sizeof(text));
  if (status != KIF_STATUS_OK) return status;
  CopyText(answer->state, sizeof(answer->state), text, strcspn(text, "\n"));
  answer->known = answer->state[0] != '\0' ? 1 : 0;
  return KIF_STATUS_OK;
}
