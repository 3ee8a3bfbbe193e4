// A record taken apart into its named fields and the rest.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "description.h"

// A part of a record: a named field, or bytes without a name where `field` is null.
struct RecordPart {
  const NodeField *field;
  uint32_t offset;
  std::string bytes;  // of a text field: the text
};

// The parts of `record`, which may be shorter than its node's by the zeros at its end: every named
// field, in the table's order, then every other byte that is not zero, in runs by offset. `node`
// may be null: then nothing has a name.
std::vector<RecordPart> PartsOf(const Description *node, std::string_view record);

// The integer that the bytes of a field hold, printed in decimal.
std::string Decimal(const RecordPart &part);
