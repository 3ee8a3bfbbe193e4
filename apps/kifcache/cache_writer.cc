#include "cache_writer.h"

#include <stdio.h>
#include <zlib.h>

#include <algorithm>
#include <cstring>
#include <unordered_set>

#include "cache_file.h"
#include "messages.h"
#include "output.h"
#include "visit.h"

namespace {

struct Run {
  uint32_t first;
  uint32_t count;
};

// A vector in which every run of items that is asked for is kept once.
template <typename Item>
class Pool {
 public:
  // Place of a run that equals `items`.
  uint32_t Intern(const Item *items, size_t count) {
    if (count == 0) return 0;
    const Run added = Append(items, count);
    const auto [known, isNew] = runs_.insert(added);
    if (!isNew) items_.resize(added.first);
    return known->first;
  }

  // Place of the run, of which every item can be found as a run of its own.
  uint32_t InternWithItems(const Item *items, size_t count) {
    const size_t before = items_.size();
    const uint32_t first = Intern(items, count);
    if (items_.size() == before) return first;  // known, and so are its items
    for (uint32_t i = 0; i < count; ++i) runs_.insert({first + i, 1});
    return first;
  }

  const std::vector<Item> &items() const { return items_; }

 private:
  Run Append(const Item *items, size_t count) {
    const Run run = {static_cast<uint32_t>(items_.size()), static_cast<uint32_t>(count)};
    items_.insert(items_.end(), items, items + count);
    return run;
  }

  struct Hash {
    const std::vector<Item> *items;
    size_t operator()(const Run &run) const {
      return std::hash<std::string_view>()(
          {reinterpret_cast<const char *>(items->data() + run.first), run.count * sizeof(Item)});
    }
  };
  struct Equal {
    const std::vector<Item> *items;
    bool operator()(const Run &left, const Run &right) const {
      return left.count == right.count &&
             memcmp(items->data() + left.first, items->data() + right.first,
                    left.count * sizeof(Item)) == 0;
    }
  };

  std::vector<Item> items_;
  std::unordered_set<Run, Hash, Equal> runs_{16, Hash{&items_}, Equal{&items_}};
};

// Copies a model into a content in which everything stands once, in an order that depends on
// nothing but the model.
class ContentBuilder {
 public:
  explicit ContentBuilder(const HostModel &model) : model_(model) {}

  flatbuffers::DetachedBuffer Build();

 private:
  flatbuffers::Offset<cache::Node> AddNode(const std::string &path, const NodeModel &node);
  flatbuffers::Offset<cache::Recording> AddRecording();
  std::vector<cache::Parameter> Convert(uint32_t first, uint32_t count);
  cache::Selector Convert(const cache::Selector &selector);
  uint32_t Place(uint32_t place, uint32_t length) {
    return bytes_.Intern(model_.BytesAt(place), length);
  }
  cache::Bytes Place(const std::string &text) {
    const auto *bytes = reinterpret_cast<const uint8_t *>(text.data());
    return {bytes_.Intern(bytes, text.size()), static_cast<uint32_t>(text.size())};
  }

  const HostModel &model_;
  flatbuffers::FlatBufferBuilder builder_;
  Pool<cache::Parameter> parameters_;
  Pool<uint8_t> bytes_;
};

// The parameters of a run of the model, as they stand in the file.
std::vector<cache::Parameter> ContentBuilder::Convert(uint32_t first, uint32_t count) {
  std::vector<cache::Parameter> converted(count);
  for (uint32_t i = 0; i < count; ++i) {
    const cache::Parameter &parameter = model_.ParametersAt(first)[i];
    converted[i] = parameter;
    if (parameter.kind() == cache::Kind::Text) {
      const auto place = static_cast<uint32_t>(parameter.value());
      converted[i] = {Place(place, parameter.length() + 1), parameter.length(), parameter.kind()};
    }
  }
  return converted;
}

cache::Selector ContentBuilder::Convert(const cache::Selector &selector) {
  const auto converted = Convert(selector.first(), selector.count());
  return {parameters_.Intern(converted.data(), converted.size()), selector.count()};
}

flatbuffers::Offset<cache::Node> ContentBuilder::AddNode(const std::string &path,
                                                         const NodeModel &node) {
  std::vector<cache::List> lists;
  for (const auto &[list, line] : node.lists) {
    const auto entries = Convert(list.first(), list.count());
    const uint32_t first = parameters_.InternWithItems(entries.data(), entries.size());
    lists.emplace_back(Convert(list.selector()), list.status(), first, list.count());
  }
  std::vector<cache::Record> records;
  for (const auto &[record, line] : node.records) {
    records.emplace_back(Convert(record.selector()), record.status(),
                         Place(record.place(), record.length()), record.length());
  }
  std::vector<cache::Stored> contents;
  for (const auto &[stored, line] : node.contents) {
    contents.emplace_back(Convert(stored.selector()), stored.length_status(), stored.read_status(),
                          stored.total(), Place(stored.place(), stored.length()), stored.length());
  }
  const auto pathAt = builder_.CreateString(path);
  const auto listsAt = lists.empty() ? 0 : builder_.CreateVectorOfStructs(lists);
  const auto recordsAt = records.empty() ? 0 : builder_.CreateVectorOfStructs(records);
  const auto contentsAt = contents.empty() ? 0 : builder_.CreateVectorOfStructs(contents);
  return cache::CreateNode(builder_, pathAt, listsAt, recordsAt, contentsAt, node.setStatus);
}

flatbuffers::Offset<cache::Recording> ContentBuilder::AddRecording() {
  const Facts &facts = model_.facts;
  const auto text = [this](const std::string &fact) {
    return fact.empty() ? flatbuffers::Offset<flatbuffers::String>() : builder_.CreateString(fact);
  };
  const auto omitted = builder_.CreateVectorOfStrings(facts.omitted);
  if (facts.minorVersion == 0) {
    return cache::CreateRecording(
        builder_, text(facts.name), text(facts.system), text(facts.release),
        text(facts.architecture), text(facts.recorder), text(facts.rights),
        text(facts.kernelBuildDate), facts.signature, facts.begin, facts.end, omitted);
  }
  std::vector<cache::Moments> moments;
  for (const Moments &of : facts.moments) {
    moments.emplace_back(Place(of.name), of.begin, of.end, of.beginSinceBoot, of.endSinceBoot);
  }
  std::vector<cache::Lack> lacks;
  for (const Lack &lack : facts.lacks) {
    lacks.emplace_back(Place(lack.what), lack.reason, lack.status, lack.count);
  }
  const auto momentsAt = moments.empty() ? 0 : builder_.CreateVectorOfStructs(moments);
  const auto lacksAt = lacks.empty() ? 0 : builder_.CreateVectorOfStructs(lacks);
  return cache::CreateRecording(builder_, text(facts.name), text(facts.system), text(facts.release),
                                text(facts.architecture), text(facts.recorder), text(facts.rights),
                                text(facts.kernelBuildDate), facts.signature, facts.begin,
                                facts.end, omitted, facts.catalogue, text(facts.redaction),
                                text(facts.bootID), facts.recorderCartel, momentsAt, lacksAt);
}

flatbuffers::DetachedBuffer ContentBuilder::Build() {
  std::vector<flatbuffers::Offset<cache::Node>> nodes;
  std::vector<cache::Bytes> descriptions;
  for (const auto &[path, node] : model_.nodes) {
    if (node.lists.empty() && node.records.empty() && node.contents.empty() &&
        node.setStatus == 0) {
      continue;
    }
    nodes.push_back(AddNode(path, node));
    if (model_.facts.minorVersion > 0) descriptions.push_back(Place(node.description));
  }
  const auto nodesAt = builder_.CreateVector(nodes);
  const auto recording = AddRecording();
  const auto parameters = builder_.CreateVectorOfStructs(parameters_.items());
  const auto bytes = builder_.CreateVector(bytes_.items());
  const auto descriptionsAt =
      descriptions.empty() ? 0 : builder_.CreateVectorOfStructs(descriptions);
  builder_.Finish(
      cache::CreateContent(builder_, recording, nodesAt, parameters, bytes, descriptionsAt));
  return builder_.Release();
}

class NullVisitor : public Visitor {
  void OnHost(const Facts &) override {}
  void OnList(const VisitedNode &, const Values &, KIF_Status, const Values &) override {}
  void OnRecord(const VisitedNode &, const Values &, KIF_Status, std::string_view) override {}
  void OnContent(const VisitedNode &, const Values &, const cache::Stored &,
                 std::string_view) override {}
  void OnSet(const VisitedNode &, KIF_Status) override {}
};

// What is written is what every reader takes.
bool IsAccepted(const FileBytes &bytes, std::string *problem) {
  CacheFile file;
  NullVisitor visitor;
  *problem = "the whole";
  return OpenCacheBytes(bytes, &file) == 0 && VisitAll(file, &visitor, problem);
}

}  // namespace

bool WriteCacheFile(const HostModel &model, const char *path) {
  if (model.size() > kMostModelSize) {
    return Complain(path, "the host is too large for a cache file");
  }
  const flatbuffers::DetachedBuffer content = ContentBuilder(model).Build();
  flatbuffers::FlatBufferBuilder builder(content.size() + 64);
  builder.ForceVectorAlignment(content.size(), 1, alignof(cache::Parameter));
  const auto contentAt = builder.CreateVector(content.data(), content.size());
  const auto checksum = static_cast<uint32_t>(crc32_z(0, content.data(), content.size()));
  cache::FinishFileBuffer(
      builder, cache::CreateFile(builder, kCacheMajorVersion, model.facts.minorVersion, checksum,
                                 contentAt));
  std::string problem;
  if (!IsAccepted({builder.GetBufferPointer(), builder.GetSize()}, &problem)) {
    return Complain(path, "no reader would accept this host: too many or too long: " + problem);
  }
  return WriteRecording(path, builder.GetBufferPointer(), builder.GetSize());
}
