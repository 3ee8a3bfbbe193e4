// hardware_acpi_tables: the tables that the kernel shows in /sys/firmware/acpi/tables, cut into
// records.
#include <fcntl.h>
#include <sys/stat.h>

#include <cstddef>
#include <cstring>

#include "base/array.h"
#include "base/everlasting.h"
#include "base/io.h"
#include "linux/files.h"
#include "linux/linux_nodes.h"
#include "records/platform.h"

namespace {

// Bytes of a table in one record.
constexpr uint32_t kMostData = sizeof(TableBuffer::data);

// No firmware comes near it, but a file of holes in somebody's tree may have any length.
constexpr off_t kMostBytes = 16 << 20;

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

Everlasting<TableList> snapshot;  // as of the last list

KIF_Status AddTable(const char *name, uint8_t folder) {
  AcpiTable table = {"", folder};
  if (strlen(name) >= sizeof(table.name)) return KIF_STATUS_OK;
  memcpy(table.name, name, strlen(name));
  return snapshot->tables.Append(table) ? KIF_STATUS_OK : KIF_STATUS_NO_MEMORY;
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
  const int order = strverscmp(a->name, b->name);
  return order != 0 ? order : a->folder - b->folder;
}

KIF_Status ReadTables() {
  snapshot->read = false;
  snapshot->tables.Clear();
  KIF_Status status = AddFolder(0);
  if (status != KIF_STATUS_OK) return status;
  status = AddFolder(1);
  const bool isClosed = status == KIF_STATUS_NOT_FOUND || status == KIF_STATUS_NO_PERMISSION;
  if (status != KIF_STATUS_OK && !isClosed) return status;
  snapshot->read = true;
  if (snapshot->tables.size() > 0) {
    qsort(snapshot->tables.begin(), snapshot->tables.size(), sizeof(AcpiTable), CompareTables);
  }
  return KIF_STATUS_OK;
}

// Finds the table that `list` selects and opens it.
KIF_Status OpenTable(const KIF_ParamList *list, const AcpiTable **table, Descriptor *file) {
  if (!snapshot->read) {
    const KIF_Status status = ReadTables();
    if (status != KIF_STATUS_OK) return status;
  }
  const int64_t place = Integer(list, 0);
  if (place < 0 || static_cast<uint64_t>(place) >= snapshot->tables.size()) {
    return KIF_STATUS_NOT_FOUND;
  }
  *table = &snapshot->tables[static_cast<size_t>(place)];
  Descriptor folder;
  const KIF_Status status = OpenHostFile(kFolders[(*table)->folder], O_PATH | O_DIRECTORY, &folder);
  return status == KIF_STATUS_OK ? OpenBelow(folder.fd(), (*table)->name, O_RDONLY, file) : status;
}

}  // namespace

KIF_Status ListAcpiTables(const NodeInfo &, const KIF_ParamList *, KIF_ParamList *list) {
  KIF_Status status = ReadTables();
  for (size_t i = 0; status == KIF_STATUS_OK && i < snapshot->tables.size(); ++i) {
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
  if (facts.st_size > kMostBytes) return KIF_STATUS_TOO_LARGE;
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
  const int64_t place = Integer(instance, 1);
  if (place < 0 || place > INT32_MAX) return KIF_STATUS_NOT_FOUND;
  auto *buffer = static_cast<TableBuffer *>(record);
  size_t given;
  const int error =
      ReadAt(file.fd(), buffer->data, kMostData, static_cast<off_t>(place) * kMostData, &given);
  if (error != 0) return StatusOfErrno(error);
  if (given == 0) return KIF_STATUS_NOT_FOUND;
  buffer->length = static_cast<uint32_t>(given);
  char signature[sizeof(buffer->signature) + 1] = {};
  CopyText(signature, sizeof(signature), table->name, strlen(table->name));
  memcpy(buffer->signature, signature, sizeof(buffer->signature));
  return KIF_STATUS_OK;
}
