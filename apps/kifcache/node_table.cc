#include "node_table.h"

#include <string>

#include "nodes.h"

namespace {

// The parameters that select, as in "(integer, text)".
std::string Parameters(const ParameterTypes &parameters) {
  std::string written = "(";
  for (const char *types = parameters.types; *types != '\0'; ++types) {
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
    if (offers.list.offered) {
      fprintf(stream, "  list %s\n", Parameters(offers.list).c_str());
    }
    if (offers.record.offered) {
      fprintf(stream, "  record %s: %u bytes\n", Parameters(offers.record).c_str(),
              offers.recordSize);
    }
    if (offers.content.offered) {
      fprintf(stream, "  content %s\n", Parameters(offers.content).c_str());
    }
    if (offers.settable) fputs("  set\n", stream);
    for (const NodeField *field = FieldsOf(node); field->name != nullptr; ++field) {
      fprintf(stream, "  %6u  %s: %s\n", field->offset, field->name, Type(*field).c_str());
    }
  }
}
