// A host in memory on its way into a cache file: what the reader of the text form and the recorder
// fill, and the cache writer writes.
#pragma once

#include <compare>
#include <cstdint>
#include <functional>
#include <iterator>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "cache_file.h"
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

// When a group of nodes was recorded, or the whole; see cache.fbs.
struct Moments {
  std::string name;
  int64_t begin = 0;
  int64_t end = 0;
  int64_t beginSinceBoot = 0;
  int64_t endSinceBoot = 0;
};

// Answers that are not there, or are a refusal; see cache.fbs.
struct Lack {
  std::string what;
  cache::Reason reason = cache::Reason::Unasked;
  KIF_Status status = 0;
  uint64_t count = 0;
};

// What is told about a recording.
struct Facts {
  uint16_t minorVersion = kCacheMinorVersion;  // of the file's format
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
  uint64_t catalogue = CatalogueHash();
  std::string redaction;
  std::string bootID;
  int64_t recorderCartel = 0;
  std::vector<Moments> moments;
  std::vector<Lack> lacks;
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
    {"redaction", &Facts::redaction},
    {"bootID", &Facts::bootID},
};

// The words for why answers are missing, by cache::Reason.
constexpr const char *kReasons[] = {"unasked", "rights", "limits", "time", "asleep", "absent"};

// The word, or the number of a reason that came later.
inline std::string ReasonText(cache::Reason reason) {
  const auto number = static_cast<uint32_t>(reason);
  return number < std::size(kReasons) ? kReasons[number] : std::to_string(number);
}

// A record without the zeros at its end.
std::string_view WithoutZeros(std::string_view record);

// An answer of a node: its places are those of the model's own parameters and bytes. `line` is
// where the text form gave it.
template <typename Answer>
struct Given {
  Answer answer;
  uint32_t line;
};

struct NodeModel {
  std::string description;  // see description.h
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
  std::map<std::string, NodeModel, std::less<>> nodes;  // by path

  // The node with a path, made at the first call: with the catalogue's own description, if it is
  // there.
  NodeModel *NodeOf(std::string_view path);

  void AddList(NodeModel *node, const Values &parent, KIF_Status status, const Values &entries,
               uint32_t line = 0);
  // The zeros at the record's end are not kept.
  void AddRecord(NodeModel *node, const Values &instance, KIF_Status status,
                 std::string_view record, uint32_t line = 0);
  void AddContent(NodeModel *node, const Values &instance, const ContentAnswer &content,
                  uint32_t line = 0);

  // Puts other bytes in the place of those of an answer that the model has, or another text in the
  // place of that of a parameter. The zeros at a record's end are not kept.
  void ReplaceRecord(cache::Record *record, std::string_view bytes);
  void ReplaceContent(cache::Stored *content, uint32_t total, std::string_view bytes);
  void ReplaceText(uint32_t parameter, const std::string &text);

  // Puts the answers of every node in the order of their selectors. False where one selector has
  // two answers of a kind; `*line` and `*firstLine` are then those of the two.
  bool Sort(uint32_t *line, uint32_t *firstLine);

  // About what the model takes in a file, in bytes.
  uint64_t size() const { return size_; }

  const cache::Parameter *ParametersAt(uint32_t first) const { return parameters_.data() + first; }
  const uint8_t *BytesAt(uint64_t place) const { return bytes_.data() + place; }
  std::string_view TextAt(uint64_t place, uint32_t length) const {
    return {reinterpret_cast<const char *>(BytesAt(place)), length};
  }

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
