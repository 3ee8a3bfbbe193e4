#include "node_table.h"

#include <string>

#include "nodes.h"

namespace {

// The parameters that select, as in "(integer, text)".
std::string Parameters(const NodeInfo &node, size_t count) {
  std::string written = "(";
  for (size_t i = 0; i < count; ++i) {
    if (written.size() > 1) written += ", ";
    written += ParameterOf(node, i).type == kInteger ? "integer" : "text";
  }
  return written + ")";
}

std::string Type(const NodeField &field) {
  std::string type = field.type == FieldType::kSigned ? "i" : "u";
  if (field.type == FieldType::kText) return "text, " + std::to_string(field.size) + " bytes";
  return type.append(std::to_string(field.size * 8));
}

}  // namespace

void PrintNodes(FILE *stream) {
  for (const NodeInfo &node : kNodes) {
    const std::string selects = Parameters(node, node.parameterCount);
    fprintf(stream, "%s\n", node.path);
    if (node.hasLists) {
      fprintf(stream, "  list %s\n", Parameters(node, CountOfListParameters(node)).c_str());
    }
    if (node.hasRecords)
      fprintf(stream, "  record %s: %u bytes\n", selects.c_str(), node.recordSize);
    if (node.hasContents) fprintf(stream, "  content %s\n", selects.c_str());
    if (node.settable) fputs("  set\n", stream);
    const NodeField *fields = FieldsOf(node);
    for (const NodeField *field = fields; field < fields + node.fieldCount; ++field) {
      fprintf(stream, "  %6u  %s: %s\n", field->offset, field->name, Type(*field).c_str());
    }
  }
}
