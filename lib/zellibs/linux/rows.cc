#include "linux/rows.h"

#include <fcntl.h>

#include <cstring>

#include "linux/files.h"

KIF_Status AddRows(const char *path, const char *prefix, NamedRows *rows) {
  constexpr size_t kMost = size_t{8} << 20;
  Descriptor file;
  Bytes text;
  KIF_Status status = OpenHostFile(path, O_RDONLY, &file);
  if (status == KIF_STATUS_OK) status = ReadWhole(file, &text, kMost);
  if (status != KIF_STATUS_OK) return status;
  for (const char *line = text.text(); *line != '\0';) {
    const size_t length = strcspn(line, "\n");
    const bool wanted = strncmp(line, prefix, strlen(prefix)) == 0;
    if (wanted && (!rows->text.Append(line, length) || !rows->text.Append("\n", 1))) {
      return KIF_STATUS_NO_MEMORY;
    }
    line += length;
    if (*line != '\0') ++line;
  }
  return KIF_STATUS_OK;
}

KIF_Status FinishRows(NamedRows *rows) {
  rows->rows.Clear();
  rows->next = 0;
  char *line = rows->text.data();
  while (line != nullptr && *line != '\0') {
    char *end = line + strcspn(line, "\n");
    char *next = *end != '\0' ? end + 1 : end;
    *end = '\0';
    char *value = line + strcspn(line, ": \t");
    if (value != line && *value != '\0') {
      *value++ = '\0';
      value += strspn(value, ": \t");
      if (!rows->rows.Append({line, value})) return KIF_STATUS_NO_MEMORY;
    }
    line = next;
  }
  rows->read = true;
  return KIF_STATUS_OK;
}

KIF_Status ListRows(const NamedRows &rows, KIF_ParamList *list) {
  KIF_Status status = KIF_STATUS_OK;
  for (const NamedRow &row : rows.rows) {
    if (status == KIF_STATUS_OK) status = KIF_ParamListAddString(list, row.name);
  }
  return status;
}

const char *FindRow(NamedRows *rows, const char *name) {
  const size_t count = rows->rows.size();
  for (size_t i = 0; i < count; ++i) {
    const size_t place = (rows->next + i) % count;
    const NamedRow &row = rows->rows[place];
    if (strcmp(row.name, name) != 0) continue;
    rows->next = place + 1;
    return row.value;
  }
  return nullptr;
}
