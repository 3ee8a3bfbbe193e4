#include "description_text.h"

namespace {

std::string Type(const NodeField &field) {
  const std::string bits = std::to_string(field.size * 8);
  switch (field.type) {
    case FieldType::kUnsigned:
      return "u" + bits;
    case FieldType::kSigned:
      return "i" + bits;
    case FieldType::kText:
      return "text" + std::to_string(field.size);
    case FieldType::kBytes:
      break;
  }
  return "bytes" + std::to_string(field.size);
}

}  // namespace

std::string DescriptionText(const NodeInfo &node) {
  std::string text = std::string("group=") + GroupName(node.group);
  for (size_t i = 0; i < node.parameterCount; ++i) {
    const ParameterInfo &parameter = ParameterOf(node, i);
    text += std::string(i == 0 ? " by=" : ",") + parameter.name +
            (parameter.type == kInteger ? ":integer" : ":text");
  }
  if (node.hasLists) text += " lists";
  if (node.hasRecords) text += " records=" + std::to_string(node.recordSize);
  if (node.hasContents) text += " contents";
  if (node.settable) text += " set";
  const NodeField *fields = FieldsOf(node);
  for (size_t i = 0; i < node.fieldCount; ++i) {
    text += std::string(" ") + fields[i].name + "@" + std::to_string(fields[i].offset) + ":" +
            Type(fields[i]);
  }
  return text;
}
