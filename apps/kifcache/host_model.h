// A host in memory on its way into a cache file: what the reader of the text form and the recorder
// fill, and the cache writer writes.
#pragma once

#include <compare>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "cache_generated.h"
#include "nodes.h"
#include "zellibs.h"

// A parameter: an integer, a text, or a text without a value.
struct Value {
  cache::Kind kind = cache::Kind::Integer;
  int64_t integer = 0;
  std::string text;

  auto operator<=>(const Value &) const = default;  // the order of a cache file
};
using Values = std::vector<Value>;

inline Value IntegerValue(int64_t integer) {
  return {cache::Kind::Integer, integer, {}};
}
inline Value TextValue(const char *text) {
  if (text == nullptr) return {cache::Kind::Null, 0, {}};
  return {cache::Kind::Text, 0, text};
}

// What is told about a recording.
struct Facts {
  std::string name;
  std::string system;
  std::string release;
  std::string architecture;
  std::string recorder;
  std::string rights;
  std::string kernelBuildDate;
  uint64_t signature = InterfaceSignature();
  int64_t begin = 0;  // seconds since 1970
  int64_t end = 0;
  std::vector<std::string> omitted;
};

// The facts that are texts, under the names that the text form and JSON give them.
struct TextFact {
  const char *name;
  std::string Facts::*text;
};
constexpr TextFact kTextFacts[] = {
    {"name", &Facts::name},
    {"system", &Facts::system},
    {"release", &Facts::release},
    {"architecture", &Facts::architecture},
    {"recorder", &Facts::recorder},
    {"rights", &Facts::rights},
    {"kernelBuildDate", &Facts::kernelBuildDate},
};

// An answer of a node: its places are those of the model's own parameters and bytes. `line` is
// where the text form gave it.
template <typename Answer>
struct Given {
  Answer answer;
  uint32_t line;
};

struct NodeModel {
  std::vector<Given<cache::List>> lists;
  std::vector<Given<cache::Record>> records;
  std::vector<Given<cache::Stored>> contents;
  KIF_Status setStatus = 0;
  uint32_t setLine = 0;
};

// A content: what answers its length and its reads.
struct ContentAnswer {
  KIF_Status lengthStatus = 0;
  KIF_Status readStatus = 0;
  uint32_t total = 0;
  std::string bytes;
};

class HostModel {
 public:
  Facts facts;
  NodeModel nodes[kNodeCount];

  void AddList(NodeIndex node, const Values &parent, KIF_Status status, const Values &entries,
               uint32_t line = 0);
  // The zeros at the record's end are not kept.
  void AddRecord(NodeIndex node, const Values &instance, KIF_Status status, std::string_view record,
                 uint32_t line = 0);
  void AddContent(NodeIndex node, const Values &instance, const ContentAnswer &content,
                  uint32_t line = 0);

  // Puts the answers of every node in the order of their selectors. False where one selector has
  // two answers of a kind; `*line` and `*firstLine` are then those of the two.
  bool Sort(uint32_t *line, uint32_t *firstLine);

  // About what the model takes in a file, in bytes.
  uint64_t size() const { return size_; }

  const cache::Parameter *ParametersAt(uint32_t first) const { return parameters_.data() + first; }
  const uint8_t *BytesAt(uint64_t place) const { return bytes_.data() + place; }

 private:
  cache::Selector AddParameters(const Values &values);
  uint32_t AddBytes(std::string_view bytes);
  int Compare(const cache::Parameter &left, const cache::Parameter &right) const;
  int Compare(const cache::Selector &left, const cache::Selector &right) const;
  template <typename Answer>
  bool Sort(std::vector<Given<Answer>> *answers, uint32_t *line, uint32_t *firstLine);

  std::vector<cache::Parameter> parameters_;
  std::vector<uint8_t> bytes_;
  uint64_t size_ = 0;
};

// More than this does not fit into a cache file.
constexpr uint64_t kMostModelSize = uint64_t{2000} << 20;
