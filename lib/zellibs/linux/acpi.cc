// hardware_acpi_tables: the tables that the kernel shows in /sys/firmware/acpi/tables, cut into
// records.
#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cstddef>
#include <cstring>

#include "linux/array.h"
#include "linux/everlasting.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/platform.h"

namespace {

// Bytes of a table in one record.
constexpr uint32_t kMostData = sizeof(TableBuffer::data);

// Tables that were loaded after boot have a folder of their own.
constexpr const char *kFolders[] = {"/sys/firmware/acpi/tables",
                                    "/sys/firmware/acpi/tables/dynamic"};

struct AcpiTable {
  char name[32];   // the signature and, where there are several, a number: "SSDT3"
  uint8_t folder;  // place in kFolders
};

struct TableList {
  bool read = false;
  Array<AcpiTable> tables;
};

Everlasting<TableList> known;  // as of the last list

KIF_Status AddTable(const char *name, uint8_t folder) {
  AcpiTable table = {"", folder};
  if (strlen(name) >= sizeof(table.name)) return KIF_STATUS_OK;
  memcpy(table.name, name, strlen(name));
  return known->tables.Append(table) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
}

KIF_Status AddFolder(uint8_t folder) {
  DirectoryReader reader;
  KIF_Status status = reader.Open(kFolders[folder]);
  while (status == KIF_STATUS_OK) {
    const char *name = reader.Next();
    if (name == nullptr) return reader.status();
    struct stat facts;
    const bool isTable =
        fstatat(reader.fd(), name, &facts, AT_SYMLINK_NOFOLLOW) == 0 && S_ISREG(facts.st_mode);
    if (isTable) status = AddTable(name, folder);
  }
  return status;
}

int CompareTables(const void *left, const void *right) {
  const auto *a = static_cast<const AcpiTable *>(left);
  const auto *b = static_cast<const AcpiTable *>(right);
  const int order = strcmp(a->name, b->name);
  return order != 0 ? order : a->folder - b->folder;
}

KIF_Status ReadTables() {
  known->read = false;
  known->tables.Clear();
  KIF_Status status = AddFolder(0);
  if (status != KIF_STATUS_OK) return status;
  status = AddFolder(1);
  const bool isClosed = status == KIF_STATUS_NOT_FOUND || status == KIF_STATUS_NO_PERMISSION;
  if (status != KIF_STATUS_OK && !isClosed) return status;
  known->read = true;
  if (known->tables.size() > 0) {
    qsort(known->tables.begin(), known->tables.size(), sizeof(AcpiTable), CompareTables);
  }
  return KIF_STATUS_OK;
}

// Finds the table that `list` selects and opens it.
KIF_Status OpenTable(const KIF_ParamList *list, const AcpiTable **table, Descriptor *file) {
  if (!known->read) {
    const KIF_Status status = ReadTables();
    if (status != KIF_STATUS_OK) return status;
  }
  int64_t place;
  if (!IntegerAt(list, 0, &place) || place < 0 ||
      static_cast<uint64_t>(place) >= known->tables.size()) {
    return KIF_STATUS_NOT_FOUND;
  }
  *table = &known->tables[static_cast<size_t>(place)];
  Descriptor folder;
  const KIF_Status status = OpenHostFile(kFolders[(*table)->folder], O_PATH | O_DIRECTORY, &folder);
  return status == KIF_STATUS_OK ? OpenBelow(folder.fd(), (*table)->name, O_RDONLY, file) : status;
}

// Reads up to kMostData bytes from `offset`; the kernel hands out a page at a time.
KIF_Status ReadData(const Descriptor &file, off_t offset, TableBuffer *record) {
  uint32_t filled = 0;
  while (filled < kMostData) {
    const ssize_t got =
        pread(file.fd(), record->data + filled, kMostData - filled, offset + filled);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return StatusOfErrno(errno);
    if (got == 0) break;
    filled += static_cast<uint32_t>(got);
  }
  record->length = filled;
  return KIF_STATUS_OK;
}

}  // namespace

KIF_Status ListAcpiTables(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadTables();
  for (size_t i = 0; status == KIF_STATUS_OK && i < known->tables.size(); ++i) {
    status = KIF_ParamListAddInt(list, static_cast<int64_t>(i));
  }
  return status;
}

KIF_Status ListAcpiBuffers(const NodeInfo &, const KIF_ParamList *parent, KIF_ParamList *list) {
  const AcpiTable *table;
  Descriptor file;
  KIF_Status status = OpenTable(parent, &table, &file);
  if (status != KIF_STATUS_OK) return status;
  struct stat facts;
  if (fstat(file.fd(), &facts) != 0) return StatusOfErrno(errno);
  const int64_t count = (facts.st_size + kMostData - 1) / kMostData;
  for (int64_t i = 0; status == KIF_STATUS_OK && i < count; ++i) {
    status = KIF_ParamListAddInt(list, i);
  }
  return status;
}

KIF_Status GetAcpiBuffer(const NodeInfo &, const KIF_ParamList *instance, void *record) {
  const AcpiTable *table;
  Descriptor file;
  KIF_Status status = OpenTable(instance, &table, &file);
  if (status != KIF_STATUS_OK) return status;
  int64_t place;
  if (!IntegerAt(instance, 1, &place) || place < 0 || place > INT32_MAX) {
    return KIF_STATUS_NOT_FOUND;
  }
  auto *buffer = static_cast<TableBuffer *>(record);
  status = ReadData(file, static_cast<off_t>(place) * kMostData, buffer);
  if (status != KIF_STATUS_OK) return status;
  if (buffer->length == 0) return KIF_STATUS_NOT_FOUND;
  CopyText(buffer->signature, sizeof(buffer->signature), table->name, strlen(table->name));
  return KIF_STATUS_OK;
}
