// Taking out of a recording what may be private, as the marks of the catalogue say. Texts that name
// a thing stay, but for addresses, and so do bytes that no field names.
#pragma once

#include <string>

#include "nodes.h"

// The rules that are followed here, as they stand in the facts of a recording.
constexpr char kRedactionRules[] = "rules 1";

// Redacts a record of `node`, whole in `*record`, or a content.
void RedactRecord(const NodeInfo &node, std::string *record);
void RedactContent(const NodeInfo &node, std::string *content);
