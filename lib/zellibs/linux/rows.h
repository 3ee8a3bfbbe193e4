// Files of rows, each a name and what stands behind it.
#pragma once

#include <cstddef>

#include "base/array.h"
#include "base/bytes.h"
#include "linux/linux_nodes.h"

struct NamedRow {
  const char *name;
  const char *value;  // both terminated
};

// The rows of files when they were listed last; what is asked of a row comes from them.
struct NamedRows {
  bool read = false;
  Bytes text;
  Array<NamedRow> rows;
  size_t next = 0;  // where the row asked for next is looked for first
};

// Appends the rows of the file at `path`, "name value" or "name: value", whose names begin with
// `prefix`, behind those that `rows` has, which are valid again after FinishRows.
KIF_Status AddRows(const char *path, const char *prefix, NamedRows *rows);

// Cuts the text that was added to rows.
KIF_Status FinishRows(NamedRows *rows);

KIF_Status ListRows(const NamedRows &rows, KIF_ParamList *list);

// The value of a row, or null.
const char *FindRow(NamedRows *rows, const char *name);
