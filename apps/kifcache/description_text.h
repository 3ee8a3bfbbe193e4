// The description of a node in words; see description.h.
#pragma once

#include <string>

#include "description.h"

std::string DescriptionText(const NodeInfo &node);

// Whether the file's node can be shown with the catalogue's own description.
inline bool IsOurs(const NodeInfo *node, const std::string &description) {
  return node != nullptr && description == DescriptionText(*node);
}
