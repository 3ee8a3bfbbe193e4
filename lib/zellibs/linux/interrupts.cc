// hardware_interrupts: the numbered rows of /proc/interrupts.
#include <fcntl.h>

#include <algorithm>
#include <cstddef>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/platform.h"

namespace {

struct Row {
  uint64_t number;
  const char *counts;  // behind the colon; the row ends with the line
};

// The file, as it was when the rows were last listed, and the count that was read last: counts are
// asked for in their order.
struct Interrupts {
  bool read = false;
  Bytes text;
  Array<Row> rows;
  Array<uint32_t> cpus;  // those of the columns, ascending
  size_t lastRow = 0;
  size_t nextColumn = 0;
  const char *nextCount = nullptr;  // null: none was read yet
};

Everlasting<Interrupts> snapshot;

const char *SkipBlanks(const char *text) {
  while (*text == ' ') ++text;
  return text;
}

const char *NextLine(const char *line) {
  line += strcspn(line, "\n");
  return *line == '\n' ? line + 1 : line;
}

// The first line names the columns, "CPU0 CPU2", one for each CPU online.
KIF_Status FindColumns(const char *line) {
  Array<uint32_t> &cpus = snapshot->cpus;
  for (line = SkipBlanks(line); *line != '\0' && *line != '\n'; line = SkipBlanks(line)) {
    const char *place = line + (strncmp(line, "CPU", 3) == 0 ? 3 : 0);
    uint64_t number;
    const size_t count = cpus.size();
    const bool goesOn = TakeNumber(&place, &number) && number < UINT32_MAX &&
                        (count == 0 || number > cpus[count - 1]);
    if (!goesOn) return KIF_STATUS_OK;
    if (!cpus.Append(static_cast<uint32_t>(number))) return KIF_STATUS_NO_MEMORY;
    line += strcspn(line, " \n");
  }
  return KIF_STATUS_OK;
}

// Rows without a number are those of the processor itself.
KIF_Status FindRows(const char *line) {
  const KIF_Status status = FindColumns(line);
  if (status != KIF_STATUS_OK) return status;
  for (line = NextLine(line); *line != '\0'; line = NextLine(line)) {
    const char *place = SkipBlanks(line);
    uint64_t number;
    if (!TakeNumber(&place, &number) || *place != ':') continue;
    if (!snapshot->rows.Append({number, place + 1})) return KIF_STATUS_NO_MEMORY;
  }
  return KIF_STATUS_OK;
}

KIF_Status ReadInterrupts() {
  snapshot->read = false;
  snapshot->text.Clear();
  snapshot->rows.Clear();
  snapshot->cpus.Clear();
  snapshot->lastRow = 0;
  snapshot->nextCount = nullptr;
  Descriptor file;
  KIF_Status status = OpenHostFile("/proc/interrupts", O_RDONLY, &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &snapshot->text);
  if (status == KIF_STATUS_OK) status = FindRows(snapshot->text.text());
  snapshot->read = status == KIF_STATUS_OK;
  return status;
}

// Finds the row that `list` selects. Rows are read in their order, many times each, so the search
// begins at the last one.
KIF_Status FindRow(const KIF_ParamList *list, size_t *row) {
  const KIF_Status status = snapshot->read ? KIF_STATUS_OK : ReadInterrupts();
  if (status != KIF_STATUS_OK) return status;
  const auto number = static_cast<uint64_t>(Integer(list, 0));
  const size_t count = snapshot->rows.size();
  for (size_t i = 0; i < count; ++i) {
    *row = (snapshot->lastRow + i) % count;
    if (snapshot->rows[*row].number == number) return KIF_STATUS_OK;
  }
  return KIF_STATUS_NOT_FOUND;
}

// Moves behind the count in a column of a row, and gives it. False where the row has none there.
bool TakeCount(size_t row, size_t wanted, const char **behind, uint64_t *count) {
  const bool goesOn =
      snapshot->nextCount != nullptr && row == snapshot->lastRow && wanted >= snapshot->nextColumn;
  size_t column = goesOn ? snapshot->nextColumn : 0;
  const char *place = goesOn ? snapshot->nextCount : snapshot->rows[row].counts;
  for (; column <= wanted; ++column) {
    place = SkipBlanks(place);
    if (!TakeNumber(&place, count)) return false;
  }
  snapshot->lastRow = row;
  snapshot->nextColumn = column;
  snapshot->nextCount = place;
  *behind = place;
  return true;
}

// Whether a text is what stands before the devices: the controller's own number and the kind of
// the interrupt, "5-edge", "27 Level" or "-event".
bool IsSource(const char *text, size_t length) {
  const char *end = text + length;
  while (text < end && *text >= '0' && *text <= '9') ++text;
  if (text < end && *text == '-') {
    while (text < end && *text != ' ') ++text;
  }
  const auto rest = static_cast<size_t>(end - text);
  return rest == 0 || (rest == 6 && memcmp(text, " Level", 6) == 0) ||
         (rest == 5 && memcmp(text, " Edge", 5) == 0);
}

// The devices that use an interrupt, "i801_smbus, ahci", stand at the row's end, two blanks behind
// the controller and its number. Both of these may have such gaps too.
const char *FindDevices(size_t row, size_t *length) {
  const char *start = snapshot->rows[row].counts;
  uint64_t count;
  *length = 0;
  const size_t columns = snapshot->cpus.size();
  if (columns > 0 && !TakeCount(row, columns - 1, &start, &count)) return start;
  start = SkipBlanks(start);
  const char *end = start + strcspn(start, "\n");
  while (end > start && end[-1] == ' ') --end;
  const char *devices = end;
  while (devices > start && !(devices[-1] == ' ' && devices - start > 1 && devices[-2] == ' ')) {
    --devices;
  }
  const auto found = static_cast<size_t>(end - devices);
  if (devices > start && !IsSource(devices, found)) *length = found;
  return devices;
}

KIF_Status AddDevice(const char *name, size_t length, KIF_ParamList *list) {
  char text[256];
  CopyText(text, sizeof(text), name, length);
  return KIF_ParamListAddString(list, text);
}

}  // namespace

KIF_Status ListInterrupts(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadInterrupts();
  for (size_t i = 0; status == KIF_STATUS_OK && i < snapshot->rows.size(); ++i) {
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(snapshot->rows[i].number));
  }
  return status;
}

// The kernel's own interrupts have no number, so the users of all these have names.
KIF_Status GetInterruptUsage(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  size_t row;
  const KIF_Status status = FindRow(instance, &row);
  if (status == KIF_STATUS_OK) static_cast<UsageStatus *>(record)->usage = 1;
  return status;
}

// One that is offline has no column, and counts nothing.
KIF_Status GetInterruptCount(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  size_t row;
  const KIF_Status status = FindRow(instance, &row);
  if (status != KIF_STATUS_OK) return status;
  const int64_t cpu = Integer(instance, 1);
  const Array<uint32_t> &cpus = snapshot->cpus;
  const uint32_t *column = std::lower_bound(cpus.begin(), cpus.end(), cpu);
  if (cpu < 0 || column == cpus.end()) return KIF_STATUS_NOT_FOUND;
  uint64_t count = 0;
  const char *behind;
  if (*column == cpu &&
      !TakeCount(row, static_cast<size_t>(column - cpus.begin()), &behind, &count)) {
    return KIF_STATUS_NOT_FOUND;
  }
  static_cast<PcpuCount *>(record)->count = count;
  return KIF_STATUS_OK;
}

KIF_Status ListInterruptDevices(const NodeInfo &, const KIF_ParamList *parent,
                                KIF_ParamList *list) {
  static constexpr char kComma[] = ", ";
  size_t row;
  KIF_Status status = FindRow(parent, &row);
  if (status != KIF_STATUS_OK) return status;
  size_t length;
  const char *name = FindDevices(row, &length);
  const char *end = name + length;
  while (status == KIF_STATUS_OK && name < end) {
    const auto left = static_cast<size_t>(end - name);
    const void *comma = memmem(name, left, kComma, sizeof(kComma) - 1);
    const char *stop = comma != nullptr ? static_cast<const char *>(comma) : end;
    status = AddDevice(name, static_cast<size_t>(stop - name), list);
    name = comma != nullptr ? stop + sizeof(kComma) - 1 : end;
  }
  return status;
}
