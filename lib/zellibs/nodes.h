// The table of nodes, as nodes.def lists them.
#pragma once

#include <cstddef>
#include <cstdint>

enum class FieldType : uint8_t {
  kUnsigned,  // little-endian, 1, 2, 4 or 8 bytes
  kSigned,    // the same, in two's complement
  kText,      // ends at its first NUL, or at the end of the field
  kBytes,
};

// Names are in the tables themselves: these are mapped as they are, and a process that starts has
// nothing of them to relocate.
struct NodeField {
  char name[32];
  uint32_t offset;  // in bytes from the start of the record
  uint32_t size;    // in bytes
  FieldType type;
};

// Where a recorder finds the instances of a node's records.
enum class Instances : uint8_t {
  kNone,          // the record has no instance
  kGroupZero,     // the integer 0
  kWorlds,        // the entries of the lists world and userworld_cartel
  kParent,        // the instances of the node above it: the longest list path that is a prefix;
                  // where there is none beyond the tools, the first list of the same parameters
  kParentByPcpu,  // those, each with every PCPU number from 0 (hardware_cpu_cpuInfo)
  kOwnList,       // the entries of the node's own instance lists
  kOwnListIndex,  // the places 0 to count - 1 of the node's own instance lists
};

enum ParameterType : char { kInteger = 'i', kText = 's' };

struct ParameterInfo {
  char name[16];
  ParameterType type;
};

enum class Group : uint8_t {
#define GROUP(name) name,
#include "nodes.def"
};

constexpr size_t kMostParameters = 8;

struct NodeInfo {
  char path[72];
  Group group;
  bool hasVariable;  // the tools know it: its record never changes
  bool hasLists;
  bool hasRecords;
  bool hasContents;
  bool settable;
  Instances instances;
  uint8_t parameterCount;
  uint8_t parameters[kMostParameters];  // places in kParameters
  uint16_t fieldCount;
  uint16_t firstField;  // place in kFields
  uint32_t recordSize;  // in bytes
};

// The places of the nodes in the table, kNode_<path>; the number of a node is its place plus 1.
enum NodeIndex : uint16_t {
#define NODE(path, ...) kNode_##path,
#include "nodes.def"
  kNodeCount
};

extern const NodeInfo kNodes[kNodeCount];
extern const ParameterInfo kParameters[];

// How many parameters select an instance list of a node, and a record or content.
inline size_t CountOfListParameters(const NodeInfo &node) {
  return node.hasLists ? size_t{node.parameterCount} - 1 : 0;
}
inline const ParameterInfo &ParameterOf(const NodeInfo &node, size_t place) {
  return kParameters[node.parameters[place]];
}

// The named fields of a node's record: node.fieldCount of them.
const NodeField *FieldsOf(const NodeInfo &node);

// The word for a group of nodes.
const char *GroupName(Group group);

// The node with the number `node`, or null.
const NodeInfo *FindNode(uint32_t node);

// Place of a node that the table holds.
inline NodeIndex IndexOf(const NodeInfo &node) {
  return static_cast<NodeIndex>(&node - kNodes);
}

// The node with a path of `length` bytes, or null.
const NodeInfo *FindNodeByPath(const char *path, size_t length);

// A hash over the nodes of the tools: two libraries with the same one agree on every record that a
// tool asks for.
uint64_t InterfaceSignature();
constexpr uint64_t kSignatureOfInterfaceDate = 0x7dc27bb44c95f944;

// A hash over every row, group and parameter. Asked for by a number that no node can have, a
// library of ours gives its own, so that a recorder knows that both number their nodes alike.
uint64_t CatalogueHash();
constexpr uint32_t kCatalogueNumber = 0x4B494643;

// When the interface last changed: 20 characters, as the kernel writes a date.
extern const char kInterfaceDate[21];
