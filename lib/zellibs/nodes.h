// The table of nodes: the only place that knows what nodes there are. The node variables, the
// interface signature and kifcache are made from it.
#pragma once

#include <cstddef>
#include <cstdint>

enum class FieldType : uint8_t {
  kUnsigned,  // little-endian, 1, 2, 4 or 8 bytes
  kSigned,    // little-endian, 4 bytes
  kText,      // ends at its first NUL, or at the end of the field
};

struct NodeField {
  const char *name;  // null ends a list of fields
  uint32_t offset;   // in bytes from the start of the record
  uint32_t size;     // in bytes
  FieldType type;
};

// Where a recorder finds the instances of a node's records.
enum class Instances : uint8_t {
  kNone,          // the record has no instance
  kGroupZero,     // the integer 0
  kWorlds,        // the entries of the lists world and userworld_cartel
  kParent,        // the instances of the node above it: the longest list path that is a prefix
  kParentByPcpu,  // those, each with every PCPU number from 0 (hardware_cpu_cpuInfo)
  kOwnList,       // the entries of the node's own instance lists
  kOwnListIndex,  // the places 0 to count - 1 of the node's own instance lists
};

// The types ('i' integer, 's' text) of the parameters that select an answer, where there are
// answers at all.
struct ParameterTypes {
  bool offered = false;
  char types[5] = "";

  constexpr ParameterTypes() = default;
  template <size_t Size>
  constexpr ParameterTypes(const char (&given)[Size]) : offered(true) {
    static_assert(Size <= sizeof(types));
    for (size_t i = 0; i < Size; ++i) types[i] = given[i];
  }
};

// What a node offers.
struct NodeOffers {
  ParameterTypes list = {};  // instance lists, by the instance above them
  ParameterTypes record = {};
  uint32_t recordSize = 0;  // in bytes
  ParameterTypes content = {};
  bool settable = false;
  Instances instances = Instances::kNone;

  constexpr NodeOffers AndRecords(const ParameterTypes &parameters, uint32_t size,
                                  Instances found) const {
    NodeOffers offers = *this;
    offers.record = parameters;
    offers.recordSize = size;
    offers.instances = found;
    return offers;
  }
  constexpr NodeOffers AndSettable() const {
    NodeOffers offers = *this;
    offers.settable = true;
    return offers;
  }
};

// Without pointers, so that the table is mapped as it is and a process that starts has nothing of
// it to relocate.
struct NodeInfo {
  char path[72];
  NodeOffers offers;
};

// The places of the nodes in the table, kNode_<path>; the number of a node is its place plus 1.
enum NodeIndex : uint16_t {
#define NODE(path, ...) kNode_##path,
#include "nodes.def"
#undef NODE
  kNodeCount
};

extern const NodeInfo kNodes[kNodeCount];

// The named fields of a node's record, ended by one without a name.
const NodeField *FieldsOf(const NodeInfo &node);

// The node with the number `node`, or null.
const NodeInfo *FindNode(uint32_t node);

// Place of a node that the table holds.
inline NodeIndex IndexOf(const NodeInfo &node) {
  return static_cast<NodeIndex>(&node - kNodes);
}

// The node with a path of `length` bytes, or null.
const NodeInfo *FindNodeByPath(const char *path, size_t length);

// A hash over every row of the table: two libraries with the same one agree on every record.
uint64_t InterfaceSignature();

// When the interface last changed: 20 characters, as the kernel writes a date.
extern const char kInterfaceDate[21];
