#include "marks.h"

#include <cstddef>

#include "records/worlds.h"

namespace {

using enum Change;
using enum Privacy;

// Of a socket the addresses, of anything else what is open.
Privacy PrivacyOfDescriptor(const MarkedAnswer &answer) {
  constexpr std::string_view kSocketKind("SOCKET\0", 7);
  std::string_view record = answer.record;
  if (record.size() < sizeof(DescriptorRecord::unused0)) return kPath;
  record.remove_prefix(offsetof(DescriptorRecord, kind));
  return record.starts_with(kSocketKind) ? kSocket : kPath;
}

// Only the recorder's own network namespace has a number that is not the kernel's.
Change ChangeOfNetwork(const MarkedAnswer &answer) {
  return answer.instance[0].integer == 1 ? kKey : kThisBoot;
}

#define UNPACKED(...) __VA_ARGS__

constexpr Marks kFieldMarks[] = {
#define NODE(path, group, parameters, ...) __VA_ARGS__
#define RECORD(type, routine, found, marks, ...) __VA_ARGS__ __VA_OPT__(, )
#define FIELD(member, marks) \
  { UNPACKED marks }
#include "nodes.def"
};

constexpr Marks kOtherMarks[] = {
#define NODE(path, group, parameters, ...) {__VA_ARGS__},
#define RECORD(type, routine, found, marks, ...) UNPACKED marks
#include "nodes.def"
};
static_assert(sizeof(kOtherMarks) / sizeof(kOtherMarks[0]) == kNodeCount);

constexpr Marks kContentMarks[] = {
#define NODE(path, group, parameters, ...) {__VA_ARGS__},
#define CONTENT(lengthRoutine, readRoutine, found, marks) UNPACKED marks
#include "nodes.def"
};

constexpr Marks kParameterMarks[] = {
#define PARAMETER(name, type, marks) {UNPACKED marks},
#include "nodes.def"
};

// A private text becomes another one; there is nothing that a private number would become.
constexpr ParameterType kTypes[] = {
#define PARAMETER(name, type, marks) type,
#include "nodes.def"
};
constexpr bool AreNumbersPublic() {
  for (size_t i = 0; i < sizeof(kTypes) / sizeof(kTypes[0]); ++i) {
    const MarkRule<Privacy> &privacy = kParameterMarks[i].privacy;
    const bool isPublic = privacy.routine == nullptr && privacy.mark == kPublic;
    if (kTypes[i] == kInteger && !isPublic) return false;
  }
  return true;
}
static_assert(AreNumbersPublic());

}  // namespace

const Marks &MarksOfField(const NodeInfo &node, size_t field) {
  return kFieldMarks[node.firstField + field];
}

const Marks &MarksOfOtherBytes(const NodeInfo &node) {
  return kOtherMarks[IndexOf(node)];
}

const Marks &MarksOfContent(const NodeInfo &node) {
  return kContentMarks[IndexOf(node)];
}

const Marks &MarksOfParameter(const NodeInfo &node, size_t parameter) {
  return kParameterMarks[node.parameters[parameter]];
}
