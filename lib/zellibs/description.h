// What a node's answers look like, in words: "group=files by=cartel:integer,descriptor:integer
// lists records=2084 kind@4:text96 description@100:text1984". A cache file has such a text for each
// of its nodes, so that a reader whose catalogue is another one can read it, and the text form of a
// host has it for the nodes that kifcache does not know so. A word of another kind is passed over.
#pragma once

#include <cstddef>
#include <cstdint>

#include "nodes.h"

constexpr size_t kMostFields = 128;
constexpr uint32_t kMostRecordSize = uint32_t{1} << 20;  // in bytes

struct Description {
  char group[32];
  ParameterInfo parameters[kMostParameters];
  uint32_t parameterCount;
  bool hasLists;
  bool hasRecords;
  bool hasContents;
  bool settable;
  uint32_t recordSize;
  uint32_t fieldCount;
  NodeField fields[kMostFields];

  uint32_t ListParameterCount() const {
    return hasLists && parameterCount > 0 ? parameterCount - 1 : 0;
  }
};

// Of a row of the catalogue.
void Describe(const NodeInfo &node, Description *description);

// From a text of `length` bytes, which may be any; false where it is no description.
bool ReadDescription(const char *text, size_t length, Description *description);

// Told of each difference with which a description cannot be used: a field's name, "parameters" or
// "record size".
using ConflictTeller = void (*)(const char *what, void *context);

// Whether answers of this description can be read as those of `node`. What one of them alone knows
// is no conflict. `tell` may be null.
bool Fits(const NodeInfo &node, const Description &description, ConflictTeller tell, void *context);
