#include "node_table.h"

#include <string>

#include "nodes.h"

namespace {

// The parameters that select, as in "(integer, text)".
std::string Parameters(const char *types) {
  std::string written = "(";
  for (; *types != '\0'; ++types) {
    if (written.size() > 1) written += ", ";
    written += *types == 'i' ? "integer" : "text";
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
    const NodeOffers &offers = node.offers;
    fprintf(stream, "%s\n", node.path);
    if (offers.listParameters != nullptr) {
      fprintf(stream, "  list %s\n", Parameters(offers.listParameters).c_str());
    }
    if (offers.recordParameters != nullptr) {
      fprintf(stream, "  record %s: %u bytes\n", Parameters(offers.recordParameters).c_str(),
              offers.recordSize);
    }
    if (offers.contentParameters != nullptr) {
      fprintf(stream, "  content %s\n", Parameters(offers.contentParameters).c_str());
    }
    if (offers.settable) fputs("  set\n", stream);
    for (const NodeField *field = node.fields; field->name != nullptr; ++field) {
      fprintf(stream, "  %6u  %s: %s\n", field->offset, field->name, Type(*field).c_str());
    }
  }
}
