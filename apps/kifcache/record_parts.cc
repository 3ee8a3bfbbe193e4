#include "record_parts.h"

#include <algorithm>
#include <cstring>

namespace {

// Zeros that stand between two bytes of a run: more of them end it.
constexpr size_t kMostZeros = 8;

// Where the run that begins at `start` ends: bytes of `rest` that are not zero, and a few zeros
// between them where the record has zeros, too.
size_t EndOfRun(std::string_view record, std::string_view rest, size_t start) {
  size_t end = start + 1;
  for (size_t i = end; i < rest.size() && i - end < kMostZeros; ++i) {
    if (rest[i] == '\0' && record[i] != '\0') break;
    if (rest[i] != '\0') end = i + 1;
  }
  return end;
}

}  // namespace

std::vector<RecordPart> PartsOf(const Description *node, std::string_view record) {
  std::vector<RecordPart> parts;
  std::string rest(record);
  for (size_t i = 0; node != nullptr && i < node->fieldCount; ++i) {
    const NodeField *field = &node->fields[i];
    std::string bytes(record.substr(std::min<size_t>(field->offset, record.size()), field->size));
    if (field->type == FieldType::kText) bytes.resize(strnlen(bytes.data(), bytes.size()));
    if (!bytes.empty()) rest.replace(field->offset, bytes.size(), bytes.size(), '\0');
    const bool isNumber = field->type == FieldType::kUnsigned || field->type == FieldType::kSigned;
    if (isNumber) bytes.resize(field->size);
    parts.push_back({field, field->offset, std::move(bytes)});
  }
  size_t start = 0;
  while ((start = rest.find_first_not_of('\0', start)) != rest.npos) {
    const size_t end = EndOfRun(record, rest, start);
    parts.push_back({nullptr, static_cast<uint32_t>(start), rest.substr(start, end - start)});
    start = end;
  }
  return parts;
}

std::string Decimal(const RecordPart &part) {
  uint64_t value = 0;
  memcpy(&value, part.bytes.data(), part.bytes.size());
  if (part.field->type != FieldType::kSigned) return std::to_string(value);
  const size_t unused = 64 - part.bytes.size() * 8;
  return std::to_string(static_cast<int64_t>(value << unused) >> unused);
}
