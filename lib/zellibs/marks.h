// The marks of the catalogue: what of a node's answers is private, and what changes by itself. What
// no mark says is private, as is everything of a node that the catalogue does not have.
//
// Of a new row, mark
// - numbers, and texts that the kernel or a driver chose from words of its own: kPublic. They stay
//   in a redacted recording as they are, and kifcache(1) lists the texts among them;
// - a text that names a thing which another answer may name, too: by what it names. Each such name
//   becomes a numbered one of its kind, "address-3", the same everywhere in a recording. As a
//   parameter it still tells its instance from the others;
// - any other text (values, options, arguments) and any content: kPrivate, or nothing at all. It
//   becomes "…"; a parameter becomes a numbered name. Parameters that are numbers are kPublic;
// - numbers and bytes that are private (a serial number): kPrivate. They become zeros, and of a
//   record that begins with `known` the field's bit is cleared;
// - the bytes of a record that no field names: nothing, and they become zeros. kWithheld where the
//   record would then say what is not so: it is answered with "no permission".
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
  kPrivate,   // as a whole
  kWithheld,  // and its record with it; of bytes that no field names
  // Texts of which something stays, as kifcache(1) tells.
  kCommandLine,      // of the cartel that is the first parameter
  kBootCommandLine,  // the kernel, and options
  kSocket,           // protocol, addresses, state
  // Texts that name a thing.
  kAddress,
  kPath,
  kMountPoint,
  kBootEntry,
  kUser,
  kDevice,
  kName,  // of anything else
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
// that no field names; of its contents; and of one of its parameters.
const Marks &MarksOfField(const NodeInfo &node, size_t field);
const Marks &MarksOfOtherBytes(const NodeInfo &node);
const Marks &MarksOfContent(const NodeInfo &node);
const Marks &MarksOfParameter(const NodeInfo &node, size_t parameter);
