// hardware_memory, system_pressure and system_counters: the rows of the kernel's own statistics.
#include <stdio.h>

#include <cstddef>
#include <cstring>

#include "base/everlasting.h"
#include "linux/attributes.h"
#include "linux/files.h"
#include "linux/rows.h"
#include "records/system.h"

namespace {

constexpr const char *kResources[] = {"cpu", "io", "memory", "irq"};
constexpr const char *kKinds[] = {"some", "full"};
constexpr uint64_t kMillisecondsPerTick = 10;

Everlasting<NamedRows> memory;
Everlasting<NamedRows> counters;

void Begin(NamedRows *rows) {
  rows->read = false;
  rows->text.Clear();
}

KIF_Status ReadMemory() {
  Begin(&*memory);
  const KIF_Status status = AddRows("/proc/meminfo", "", &*memory);
  return status == KIF_STATUS_OK ? FinishRows(&*memory) : status;
}

// Either file may be missing, not both.
KIF_Status ReadCounters() {
  Begin(&*counters);
  KIF_Status status = AddRows("/proc/vmstat", "", &*counters);
  if (status != KIF_STATUS_OK && status != KIF_STATUS_NOT_FOUND) return status;
  const KIF_Status other = AddRows("/proc/stat", "cpu", &*counters);
  if (other != KIF_STATUS_NOT_FOUND) status = other;
  return status == KIF_STATUS_OK ? FinishRows(&*counters) : status;
}

KIF_Status ReadPressureFile(const char *resource, char *text, size_t size) {
  char path[64];
  snprintf(path, sizeof(path), "/proc/pressure/%s", resource);
  return ReadHostFile(path, text, size);
}

// The line of a kind, behind its first word, or null.
const char *FindKind(const char *text, const char *kind) {
  const size_t length = strlen(kind);
  while (strncmp(text, kind, length) != 0 || text[length] != ' ') {
    text += strcspn(text, "\n");
    if (*text++ == '\0') return nullptr;
  }
  return text + length;
}

// "avg10=1.25": hundredths.
bool TakeAverage(const char *line, const char *name, uint64_t *hundredths) {
  uint64_t whole;
  const char *place = strstr(line, name);
  if (place == nullptr) return false;
  place += strlen(name);
  if (!TakeNumber(&place, &whole) || whole > 1000 || *place != '.') return false;
  *hundredths = whole * 100;
  uint64_t scale = 10;
  for (++place; *place >= '0' && *place <= '9' && scale > 0; ++place, scale /= 10) {
    *hundredths += static_cast<uint64_t>(*place - '0') * scale;
  }
  return true;
}

}  // namespace

KIF_Status ListMemoryRows(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  const KIF_Status status = ReadMemory();
  return status == KIF_STATUS_OK ? ListRows(*memory, list) : status;
}

KIF_Status GetMemoryRow(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const KIF_Status status = memory->read ? KIF_STATUS_OK : ReadMemory();
  if (status != KIF_STATUS_OK) return status;
  const char *value = FindRow(&*memory, TextAt(instance, 0));
  if (value == nullptr) return KIF_STATUS_NOT_FOUND;
  uint64_t number = 0;
  bool is = TakeNumber(&value, &number);
  if (strncmp(value, " kB", 3) == 0) {
    is = is && number <= UINT64_MAX / 1024;
    number *= 1024;
  }
  auto *row = static_cast<MemoryRow *>(record);
  if (is) *row = {1, number};
  return KIF_STATUS_OK;
}

KIF_Status ListPressures(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status found = KIF_STATUS_NOT_FOUND;
  for (const char *resource : kResources) {
    char text[512];
    const KIF_Status status = ReadPressureFile(resource, text, sizeof(text));
    if (status != KIF_STATUS_OK) {
      // A kernel told to leave pressure alone has the files, and does not read them.
      if (found == KIF_STATUS_NOT_FOUND) found = status;
      continue;
    }
    found = KIF_STATUS_OK;
    for (const char *kind : kKinds) {
      if (FindKind(text, kind) == nullptr) continue;
      char name[32];
      snprintf(name, sizeof(name), "%s %s", resource, kind);
      const KIF_Status added = KIF_ParamListAddString(list, name);
      if (added != KIF_STATUS_OK) return added;
    }
  }
  return found;
}

KIF_Status GetPressure(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const char *name = TextAt(instance, 0);
  for (const char *resource : kResources) {
    const size_t length = strlen(resource);
    if (strncmp(name, resource, length) != 0 || name[length] != ' ') continue;
    char text[512];
    const KIF_Status status = ReadPressureFile(resource, text, sizeof(text));
    if (status != KIF_STATUS_OK) return status;
    const char *line = FindKind(text, name + length + 1);
    if (line == nullptr) return KIF_STATUS_NOT_FOUND;
    auto *row = static_cast<PressureRow *>(record);
    uint64_t known = 0;
    uint64_t number = 0;
    const bool has10 = TakeAverage(line, "avg10=", &number);
    row->average10 = KnownNumber<uint32_t>(&known, 0, has10, number);
    const bool has60 = TakeAverage(line, "avg60=", &number);
    row->average60 = KnownNumber<uint32_t>(&known, 1, has60, number);
    const bool has300 = TakeAverage(line, "avg300=", &number);
    row->average300 = KnownNumber<uint32_t>(&known, 2, has300, number);
    const char *total = strstr(line, "total=");
    if (total != nullptr) total += strlen("total=");
    const bool hasTotal = total != nullptr && TakeNumber(&total, &number);
    row->total = KnownNumber<uint64_t>(&known, 3, hasTotal, number / 1000);
    row->known = known;
    return KIF_STATUS_OK;
  }
  return KIF_STATUS_NOT_FOUND;
}

KIF_Status ListSystemCounters(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  const KIF_Status status = ReadCounters();
  return status == KIF_STATUS_OK ? ListRows(*counters, list) : status;
}

KIF_Status GetSystemCounter(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const KIF_Status status = counters->read ? KIF_STATUS_OK : ReadCounters();
  if (status != KIF_STATUS_OK) return status;
  const char *name = TextAt(instance, 0);
  const char *value = FindRow(&*counters, name);
  if (value == nullptr) return KIF_STATUS_NOT_FOUND;
  // A row of a CPU has several numbers; those of /proc/vmstat have one, whatever they are called.
  constexpr size_t kTimes = 10;
  uint64_t numbers[kTimes] = {};
  size_t count = 0;
  while (count < kTimes && TakeNumber(&value, &numbers[count])) {
    ++count;
    value += strspn(value, " ");
  }
  auto *row = static_cast<CounterRow *>(record);
  if (count == 1) {
    row->value = numbers[0];
    row->known = 1;
  } else if (count > 1) {
    for (uint64_t &number : numbers) {
      number =
          number <= UINT64_MAX / kMillisecondsPerTick ? number * kMillisecondsPerTick : UINT64_MAX;
    }
    static_assert(sizeof(numbers) == sizeof(*row) - offsetof(CounterRow, user));
    memcpy(reinterpret_cast<char *>(row) + offsetof(CounterRow, user), numbers, sizeof(numbers));
    row->known = ((uint64_t{1} << count) - 1) << 1;
  }
  return KIF_STATUS_OK;
}
