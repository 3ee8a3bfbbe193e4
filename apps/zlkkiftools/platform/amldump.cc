// amldump: writes every ACPI table into a file of its own in the current directory.
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "base/array.h"
#include "base/io.h"
#include "kif/kif.h"
#include "output.h"
#include "records/platform.h"
#include "tools.h"

namespace {

// How often each signature came up, in the order in which they came up first.
class SignatureCounter {
 public:
  // Counts `signature` in; `*before` is how often it had come up before. False without memory.
  bool Count(const char (&signature)[kAcpiSignatureLength], int *before) {
    size_t i = 0;
    while (i < entries_.size() && memcmp(entries_[i].signature, signature, sizeof(signature)) != 0)
      ++i;
    if (i == entries_.size()) {
      Entry entry = {};
      memcpy(entry.signature, signature, sizeof(signature));
      if (!entries_.Append(entry)) return false;
    }
    *before = entries_[i].count++;
    return true;
  }

 private:
  struct Entry {
    char signature[kAcpiSignatureLength];
    int count;
  };

  Array<Entry> entries_;
};

// A file to be written, or none. One that is not finished is removed: a truncated table looks like
// a table.
class OutputFile {
 public:
  OutputFile() = default;
  ~OutputFile() {
    if (descriptor_ < 0) return;
    close(descriptor_);
    unlink(name_);
  }
  OutputFile(const OutputFile &) = delete;
  OutputFile &operator=(const OutputFile &) = delete;

  bool Create(const char *name) {
    snprintf(name_, sizeof(name_), "%s", name);
    descriptor_ = open(name, O_WRONLY | O_CREAT | O_EXCL | O_TRUNC | O_CLOEXEC, 0600);
    return descriptor_ >= 0;
  }

  bool Write(const uint8_t *bytes, size_t length) const {
    return WriteAll(descriptor_, bytes, length) == 0;
  }

  // False when the system could not keep what was written.
  bool Finish() {
    const bool closed = descriptor_ < 0 || close(descriptor_) == 0;
    if (!closed) unlink(name_);
    descriptor_ = -1;
    return closed;
  }

 private:
  int descriptor_ = -1;
  char name_[32];
};

bool FailWithErrno() {
  fprintf(Messages(), "amldump: : %s\n", strerror(errno));
  return false;
}

bool CreateFile(const TableBuffer &record, SignatureCounter *counter, OutputFile *file) {
  int before = 0;
  if (!counter->Count(record.signature, &before)) return FailWithErrno();
  char name[32];
  if (before != 0) {
    snprintf(name, sizeof(name), "%.4s-%d.aml", record.signature, before);
  } else {
    snprintf(name, sizeof(name), "%.4s.aml", record.signature);
  }
  if (strchr(name, '/') != nullptr) {  // a table is no reason to leave the current directory
    fprintf(Messages(), "amldump: the signature %.4s cannot name a file\n", Printable(name).text());
    return false;
  }
  printf("Writing file %s\n", Shown(name).text());
  return file->Create(name) || FailWithErrno();
}

// Writes the buffer number `number` of the table that `table` selects; number 0 creates the file.
// A failure ends the run, so `table` is put back on success alone.
bool DumpBuffer(KIF_ParamList *table, int32_t number, SignatureCounter *counter, OutputFile *file) {
  static TableBuffer record;
  if (KIF_ParamListAddInt(table, number) != 0) return false;
  if (ReadRecord(KIF_NODE_hardware_acpi_tables_buffers, table, &record) != 0) return false;
  if (record.length > sizeof(record.data)) {
    fprintf(Messages(), "amldump: a buffer of %u bytes does not fit its record\n", record.length);
    return false;
  }
  if (number == 0 && !CreateFile(record, counter, file)) return false;
  if (!file->Write(record.data, record.length)) return FailWithErrno();
  KIF_ParamListRemoveLastParam(table);
  return true;
}

// Dumps the table `value`; `selector` is the list that selects it, put back on success alone.
bool DumpTable(int32_t value, KIF_ParamList *selector, SignatureCounter *counter) {
  if (KIF_ParamListAddInt(selector, value) != 0) return false;
  ParamListHandle buffers;
  if (GetInstanceList(KIF_NODE_hardware_acpi_tables_buffers, selector, &buffers) != 0) {
    return false;
  }
  const int32_t count = KIF_ParamListUsedCount(buffers.get());
  OutputFile file;
  for (int32_t number = 0; number < count; ++number) {
    if (!DumpBuffer(selector, number, counter, &file)) return false;
  }
  if (!file.Finish()) return FailWithErrno();
  KIF_ParamListRemoveLastParam(selector);
  return true;
}

}  // namespace

int AmldumpEntry(int, char **) {
  ParamListHandle tables;
  if (GetInstanceList(KIF_NODE_hardware_acpi_tables, nullptr, &tables) != 0) return 1;
  const int32_t count = KIF_ParamListUsedCount(tables.get());
  if (count <= 0) return 0;

  const ParamListHandle selector(KIF_ParamListCreate(KIF_PARAMLIST_INSTANCE, 2));
  if (selector == nullptr) return 1;
  SignatureCounter counter;
  for (int32_t i = 0; i < count; ++i) {
    int32_t value = 0;
    if (KIF_ParamListGetInt32(tables.get(), static_cast<uint32_t>(i), &value) != 0) return 1;
    if (!DumpTable(value, selector.get(), &counter)) return 1;
  }
  return 0;
}
