#include "nodes.h"

#include <cstring>
#include <string_view>

const char kInterfaceDate[21] = "Nov 22 2026 00:00:00";

namespace {

constexpr NodeOffers Lists(const ParameterTypes &parents) {
  return {.list = parents};
}

constexpr NodeOffers Records(const ParameterTypes &parameters, uint32_t size,
                             Instances found = Instances::kNone) {
  return NodeOffers{}.AndRecords(parameters, size, found);
}

constexpr NodeOffers Contents(const ParameterTypes &parameters, Instances found) {
  return {.content = parameters, .instances = found};
}

constexpr NodeField U8(uint32_t offset, const char *name) {
  return {name, offset, 1, FieldType::kUnsigned};
}
constexpr NodeField U16(uint32_t offset, const char *name) {
  return {name, offset, 2, FieldType::kUnsigned};
}
constexpr NodeField U32(uint32_t offset, const char *name) {
  return {name, offset, 4, FieldType::kUnsigned};
}
constexpr NodeField U64(uint32_t offset, const char *name) {
  return {name, offset, 8, FieldType::kUnsigned};
}
constexpr NodeField I32(uint32_t offset, const char *name) {
  return {name, offset, 4, FieldType::kSigned};
}
constexpr NodeField Text(uint32_t offset, uint32_t size, const char *name) {
  return {name, offset, size, FieldType::kText};
}
constexpr NodeField kEndOfFields = {nullptr, 0, 0, FieldType::kUnsigned};

#define NODE(path, offers, ...) \
  constexpr NodeField k_##path[] = {__VA_ARGS__ __VA_OPT__(, ) kEndOfFields};
#include "nodes.def"
#undef NODE

// FNV-1a over 64 bits.
constexpr uint64_t kHashBasis = 0xcbf29ce484222325u;
constexpr uint64_t Hash(uint64_t hash, uint64_t value) {
  return (hash ^ value) * 0x100000001b3u;
}
constexpr uint64_t Hash(uint64_t hash, const char *text) {
  for (; text != nullptr && *text != '\0'; ++text) {
    hash = Hash(hash, static_cast<unsigned char>(*text));
  }
  return Hash(hash, text == nullptr ? 0x100 : 0x101);
}

constexpr uint64_t Hash(uint64_t hash, const ParameterTypes &parameters) {
  return Hash(hash, parameters.offered ? parameters.types : nullptr);
}

constexpr uint64_t Hash(uint64_t hash, const NodeInfo &node, const NodeField *field) {
  hash = Hash(hash, node.path);
  hash = Hash(hash, node.offers.list);
  hash = Hash(hash, node.offers.record);
  hash = Hash(hash, node.offers.recordSize);
  hash = Hash(hash, node.offers.content);
  hash = Hash(hash, node.offers.settable ? 1 : 0);
  for (; field->name != nullptr; ++field) {
    hash = Hash(hash, field->name);
    hash = Hash(hash, field->offset);
    hash = Hash(hash, field->size);
    hash = Hash(hash, static_cast<uint64_t>(field->type));
  }
  return hash;
}

}  // namespace

constexpr NodeInfo kNodes[kNodeCount] = {
#define NODE(path, offers, ...) {#path, offers},
#include "nodes.def"
#undef NODE
};

namespace {

constexpr const NodeField *kFields[kNodeCount] = {
#define NODE(path, ...) k_##path,
#include "nodes.def"
#undef NODE
};

constexpr uint64_t HashTable() {
  uint64_t hash = kHashBasis;
  for (size_t i = 0; i < kNodeCount; ++i) hash = Hash(hash, kNodes[i], kFields[i]);
  return hash;
}

constexpr uint64_t kSignature = HashTable();

}  // namespace

const NodeField *FieldsOf(const NodeInfo &node) {
  return kFields[IndexOf(node)];
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
