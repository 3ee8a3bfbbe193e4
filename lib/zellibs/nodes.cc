#include "nodes.h"

#include <array>
#include <cstring>
#include <string_view>
#include <type_traits>

#include "records/cartels.h"
#include "records/morelfs.h"
#include "records/network.h"
#include "records/packages.h"
#include "records/pci.h"
#include "records/platform.h"
#include "records/storage.h"
#include "records/system.h"
#include "records/worlds.h"

const char kInterfaceDate[21] = "Nov 22 2026 00:00:00";

namespace {

enum class Parameter : uint8_t {
#define PARAMETER(name, ...) name,
#include "nodes.def"
};

template <size_t Size, size_t Room>
constexpr void Put(const char (&text)[Size], char (&name)[Room]) {
  static_assert(Size <= Room);
  for (size_t i = 0; i < Size; ++i) name[i] = text[i];
}

// The place, width and type of a field are those of the struct's member.
template <typename Member, size_t Size>
constexpr NodeField FieldAt(const char (&name)[Size], size_t offset) {
  using Element = std::remove_extent_t<Member>;
  NodeField field = {};
  Put(name, field.name);
  field.offset = static_cast<uint32_t>(offset);
  field.size = sizeof(Member);
  field.type = std::is_same_v<Element, char> ? FieldType::kText
               : std::is_array_v<Member>     ? FieldType::kBytes
               : std::is_signed_v<Element>   ? FieldType::kSigned
                                             : FieldType::kUnsigned;
  return field;
}

template <typename... Fields>
constexpr auto FieldList(const Fields &...fields) {
  std::array<NodeField, sizeof...(fields)> list = {};
  [[maybe_unused]] size_t place = 0;
  ((list[place++] = fields), ...);
  return list;
}

template <size_t FieldCount>
struct Row {
  NodeInfo node;
  std::array<NodeField, FieldCount> fields;

  constexpr Row AndLists() const {
    Row row = *this;
    row.node.hasLists = true;
    return row;
  }
  template <size_t Count>
  constexpr Row<Count> AndRecords(uint32_t size, Instances instances,
                                  const std::array<NodeField, Count> &recordFields) const {
    Row<Count> row = {node, recordFields};
    row.node.hasRecords = true;
    row.node.recordSize = size;
    row.node.instances = instances;
    row.node.fieldCount = Count;
    return row;
  }
  constexpr Row AndContents(Instances instances) const {
    Row row = *this;
    row.node.hasContents = true;
    row.node.instances = instances;
    return row;
  }
  constexpr Row AndSettable() const {
    Row row = *this;
    row.node.settable = true;
    return row;
  }
};

template <size_t Size, typename... Parameters>
constexpr Row<0> RowOf(const char (&path)[Size], Group group, bool hasVariable,
                       Parameters... parameters) {
  static_assert(sizeof...(parameters) <= kMostParameters);
  Row<0> row = {};
  Put(path, row.node.path);
  row.node.group = group;
  row.node.hasVariable = hasVariable;
  ((row.node.parameters[row.node.parameterCount++] = static_cast<uint8_t>(parameters)), ...);
  return row;
}

#define AND_EACH(...) __VA_OPT__(, ) __VA_ARGS__
#define ROW(path, group, hasVariable, parameters, ...)                              \
  constexpr auto k_##path = [] {                                                    \
    using enum Parameter;                                                           \
    return RowOf(#path, Group::group, hasVariable AND_EACH parameters) __VA_ARGS__; \
  }();
#define LIST(routine) .AndLists()
#define RECORD(type, routine, found, marks, ...)   \
  .AndRecords(sizeof(type), Instances::found, [] { \
    using Record [[maybe_unused]] = type;          \
    return FieldList(__VA_ARGS__);                 \
  }())
#define FIELD(member, marks) FieldAt<decltype(Record::member)>(#member, offsetof(Record, member))
#define CONTENT(lengthRoutine, readRoutine, found, marks) .AndContents(Instances::found)
#define SET(routine) .AndSettable()
#define NODE(path, group, parameters, ...) ROW(path, group, true, parameters, __VA_ARGS__)
#define BEYOND(path, group, parameters, ...) ROW(path, group, false, parameters, __VA_ARGS__)
#include "nodes.def"

// Where the fields of each row stand among all of them.
enum FieldPlace : uint16_t {
#define NODE(path, ...) \
  kFirst_##path, kBehind_##path = kFirst_##path + k_##path.node.fieldCount - 1,
#include "nodes.def"
  kFieldCount
};

constexpr NodeInfo At(NodeInfo node, uint16_t firstField) {
  node.firstField = firstField;
  return node;
}

constexpr auto kFields = [] {
  std::array<NodeField, kFieldCount> all = {};
  size_t place = 0;
#define NODE(path, ...) \
  for (const NodeField &field : k_##path.fields) all[place++] = field;
#include "nodes.def"
  return all;
}();

constexpr char kGroupNames[][12] = {
#define GROUP(name) #name,
#include "nodes.def"
};

}  // namespace

constexpr NodeInfo kNodes[kNodeCount] = {
#define NODE(path, ...) At(k_##path.node, kFirst_##path),
#include "nodes.def"
};

constexpr ParameterInfo kParameters[] = {
#define PARAMETER(name, type, ...) {#name, type},
#include "nodes.def"
};

namespace {

// FNV-1a over 64 bits.
constexpr uint64_t kHashBasis = 0xcbf29ce484222325u;
constexpr uint64_t Hash(uint64_t hash, uint64_t value) {
  return (hash ^ value) * 0x100000001b3u;
}
constexpr uint64_t Hash(uint64_t hash, const char *text) {
  for (; *text != '\0'; ++text) hash = Hash(hash, static_cast<unsigned char>(*text));
  return Hash(hash, 0x101);
}

// The types of the first `count` parameters, where they select something that the node offers.
constexpr uint64_t HashTypes(uint64_t hash, const NodeInfo &node, bool offered, size_t count) {
  for (size_t i = 0; offered && i < count; ++i) {
    hash = Hash(hash, static_cast<unsigned char>(kParameters[node.parameters[i]].type));
  }
  return Hash(hash, offered ? 0x101 : 0x100);
}

constexpr uint64_t Hash(uint64_t hash, const NodeInfo &node) {
  const size_t count = node.parameterCount;
  hash = Hash(hash, node.path);
  hash = HashTypes(hash, node, node.hasLists, count - (node.hasLists ? 1 : 0));
  hash = HashTypes(hash, node, node.hasRecords, count);
  hash = Hash(hash, node.recordSize);
  hash = HashTypes(hash, node, node.hasContents, count);
  hash = Hash(hash, node.settable ? 1 : 0);
  for (size_t i = 0; i < node.fieldCount; ++i) {
    const NodeField &field = kFields[node.firstField + i];
    hash = Hash(hash, field.name);
    hash = Hash(hash, field.offset);
    hash = Hash(hash, field.size);
    hash = Hash(hash, static_cast<uint64_t>(field.type));
  }
  return hash;
}

constexpr uint64_t kSignature = [] {
  uint64_t hash = kHashBasis;
  for (const NodeInfo &node : kNodes) {
    if (node.hasVariable) hash = Hash(hash, node);
  }
  return hash;
}();
// Whoever changes the interface moves its date.
static_assert(kSignature == kSignatureOfInterfaceDate);

constexpr uint64_t kCatalogueHash = [] {
  uint64_t hash = kHashBasis;
  for (const NodeInfo &node : kNodes) {
    hash = Hash(hash, node);
    hash = Hash(hash, kGroupNames[static_cast<size_t>(node.group)]);
    for (size_t i = 0; i < node.parameterCount; ++i) {
      hash = Hash(hash, kParameters[node.parameters[i]].name);
    }
  }
  return hash;
}();

}  // namespace

const NodeField *FieldsOf(const NodeInfo &node) {
  return kFields.data() + node.firstField;
}

const char *GroupName(Group group) {
  return kGroupNames[static_cast<size_t>(group)];
}

const NodeInfo *FindNode(uint32_t node) {
  return node >= 1 && node <= kNodeCount ? &kNodes[node - 1] : nullptr;
}

const NodeInfo *FindNodeByPath(const char *path, size_t length) {
  for (const NodeInfo &node : kNodes) {
    if (std::string_view(path, length) == node.path) return &node;
  }
  return nullptr;
}

uint64_t InterfaceSignature() {
  return kSignature;
}

uint64_t CatalogueHash() {
  return kCatalogueHash;
}
