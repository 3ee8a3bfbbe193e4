#include "description.h"

#include <cstring>

namespace {

// What is left of a text.
struct Rest {
  const char *place;
  const char *end;

  bool AtEnd() const { return place == end; }
  bool Take(char wanted) {
    if (AtEnd() || *place != wanted) return false;
    ++place;
    return true;
  }
  bool Take(const char *word) {
    const size_t length = strlen(word);
    if (static_cast<size_t>(end - place) < length || memcmp(place, word, length) != 0) return false;
    place += length;
    return true;
  }
};

bool IsNameByte(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

template <size_t Room>
bool TakeName(Rest *rest, char (&name)[Room]) {
  size_t length = 0;
  for (; !rest->AtEnd() && IsNameByte(*rest->place); ++rest->place) {
    if (length == Room - 1) return false;
    name[length++] = *rest->place;
  }
  name[length] = '\0';
  return length > 0;
}

bool TakeNumber(Rest *rest, uint32_t *number) {
  uint64_t value = 0;
  const char *start = rest->place;
  for (; !rest->AtEnd() && *rest->place >= '0' && *rest->place <= '9'; ++rest->place) {
    value = value * 10 + static_cast<uint64_t>(*rest->place - '0');
    if (value > UINT32_MAX) return false;
  }
  *number = static_cast<uint32_t>(value);
  return rest->place != start;
}

bool TakeParameters(Rest *rest, Description *description) {
  do {
    if (description->parameterCount == kMostParameters) return false;
    ParameterInfo *parameter = &description->parameters[description->parameterCount++];
    if (!TakeName(rest, parameter->name) || !rest->Take(':')) return false;
    const bool isInteger = rest->Take("integer");
    if (!isInteger && !rest->Take("text")) return false;
    parameter->type = isInteger ? kInteger : kText;
  } while (rest->Take(','));
  return true;
}

// A width that a number can have.
bool TakeBits(Rest *rest, uint32_t *size) {
  uint32_t bits;
  if (!TakeNumber(rest, &bits)) return false;
  *size = bits / 8;
  return bits == 8 || bits == 16 || bits == 32 || bits == 64;
}

// What comes behind the name of a field.
bool TakeField(Rest *rest, Description *description, NodeField *field) {
  if (!TakeNumber(rest, &field->offset) || !rest->Take(':')) return false;
  bool good;
  if (rest->Take("text")) {
    field->type = FieldType::kText;
    good = TakeNumber(rest, &field->size);
  } else if (rest->Take("bytes")) {
    field->type = FieldType::kBytes;
    good = TakeNumber(rest, &field->size);
  } else {
    field->type = rest->Take('i') ? FieldType::kSigned : FieldType::kUnsigned;
    if (field->type == FieldType::kUnsigned && !rest->Take('u')) return false;
    good = TakeBits(rest, &field->size);
  }
  if (!good || field->size == 0 || field->offset > description->recordSize) return false;
  if (field->size > description->recordSize - field->offset) return false;
  ++description->fieldCount;
  return true;
}

bool TakeWord(Rest *rest, Description *description) {
  if (rest->Take("group=")) return TakeName(rest, description->group);
  if (rest->Take("by=")) return TakeParameters(rest, description);
  if (rest->Take("records=")) {
    description->hasRecords = true;
    return TakeNumber(rest, &description->recordSize) && description->recordSize <= kMostRecordSize;
  }
  NodeField unnamed;
  const bool hasRoom = description->fieldCount < kMostFields;
  NodeField *field = hasRoom ? &description->fields[description->fieldCount] : &unnamed;
  if (!TakeName(rest, field->name)) return false;
  if (rest->Take('@')) return hasRoom && TakeField(rest, description, field);
  description->hasLists = description->hasLists || strcmp(field->name, "lists") == 0;
  description->hasContents = description->hasContents || strcmp(field->name, "contents") == 0;
  description->settable = description->settable || strcmp(field->name, "set") == 0;
  while (!rest->AtEnd() && *rest->place > ' ' && *rest->place < 0x7f) ++rest->place;
  return true;
}

bool SameParameters(const NodeInfo &node, const Description &description) {
  if (node.parameterCount != description.parameterCount) return false;
  for (size_t i = 0; i < node.parameterCount; ++i) {
    const ParameterInfo &ours = ParameterOf(node, i);
    const ParameterInfo &theirs = description.parameters[i];
    if (ours.type != theirs.type || strcmp(ours.name, theirs.name) != 0) return false;
  }
  return true;
}

const NodeField *FieldNamed(const NodeInfo &node, const char *name) {
  for (const NodeField *field = FieldsOf(node); field < FieldsOf(node) + node.fieldCount; ++field) {
    if (strcmp(field->name, name) == 0) return field;
  }
  return nullptr;
}

}  // namespace

void Describe(const NodeInfo &node, Description *description) {
  description->parameterCount = node.parameterCount;
  for (size_t i = 0; i < node.parameterCount; ++i) {
    description->parameters[i] = ParameterOf(node, i);
  }
  strcpy(description->group, GroupName(node.group));
  description->hasLists = node.hasLists;
  description->hasRecords = node.hasRecords;
  description->hasContents = node.hasContents;
  description->settable = node.settable;
  description->recordSize = node.recordSize;
  description->fieldCount = node.fieldCount;
  memcpy(description->fields, FieldsOf(node), node.fieldCount * sizeof(NodeField));
}

bool ReadDescription(const char *text, size_t length, Description *description) {
  memset(description, 0, offsetof(Description, fields));
  Rest rest = {text, text + length};
  while (!rest.AtEnd()) {
    if (!TakeWord(&rest, description)) return false;
    if (!rest.AtEnd() && (!rest.Take(' ') || rest.AtEnd())) return false;
  }
  return description->parameterCount > 0 || !description->hasLists;
}

bool Fits(const NodeInfo &node, const Description &description, ConflictTeller tell,
          void *context) {
  bool fits = true;
  const auto conflict = [&](const char *what) {
    fits = false;
    if (tell != nullptr) tell(what, context);
  };
  if (!SameParameters(node, description)) conflict("parameters");
  const bool bothHaveRecords = node.hasRecords && description.hasRecords;
  if (bothHaveRecords && node.hasVariable && node.recordSize != description.recordSize) {
    conflict("record size");
  }
  for (size_t i = 0; i < description.fieldCount; ++i) {
    const NodeField &theirs = description.fields[i];
    const NodeField *ours = FieldNamed(node, theirs.name);
    if (ours != nullptr &&
        (ours->offset != theirs.offset || ours->size != theirs.size || ours->type != theirs.type)) {
      conflict(theirs.name);
    }
  }
  return fits;
}
