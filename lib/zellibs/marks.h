// The marks of the catalogue: what of a node's answers is private, and what changes by itself. What
// no mark says is private, as is everything of a node that the catalogue does not have.
#pragma once

#include <cstdint>
#include <string_view>

#include "nodes.h"

enum class Change : uint8_t {
  kFact,      // stays, until somebody changes it
  kKey,       // tells its instance from the others, across boots too
  kThisBoot,  // is valid until the next boot: numbers that the kernel gave
  kMoving,    // changes by itself
};

enum class Privacy : uint8_t {
  kPublic,
  kPrivate,          // as a whole
  kCommandLine,      // but for its first word, the program
  kBootCommandLine,  // but for its first word, the kernel, and the names of options
  kSocket,           // but for its first word, the protocol
  // Texts that name a thing.
  kAddress,
  kPath,
  kMountPoint,
  kBootEntry,
};

// An answer by which a mark may depend on the instance or the value. A record is shorter than its
// node's by the zeros at its end.
struct MarkedParameter {
  int64_t integer;
  std::string_view text;
};
struct MarkedAnswer {
  const MarkedParameter *instance;  // node.parameterCount of them
  std::string_view record;          // or content
};

// A mark, or the routine that tells it.
template <typename Mark>
struct MarkRule {
  Mark mark;
  Mark (*routine)(const MarkedAnswer &answer) = nullptr;

  constexpr MarkRule(Mark given) : mark(given) {}
  constexpr MarkRule(Mark (*given)(const MarkedAnswer &)) : mark(), routine(given) {}
  Mark Of(const MarkedAnswer &answer) const { return routine != nullptr ? routine(answer) : mark; }
};

struct Marks {
  MarkRule<Change> change = Change::kFact;
  MarkRule<Privacy> privacy = Privacy::kPrivate;
};

// Of a field of a node's record, by its place among the node's fields; of the bytes of its records
// that no field names, or of its contents; and of one of its parameters.
const Marks &MarksOfField(const NodeInfo &node, size_t field);
const Marks &MarksOfOtherBytes(const NodeInfo &node);
const Marks &MarksOfParameter(const NodeInfo &node, size_t parameter);
