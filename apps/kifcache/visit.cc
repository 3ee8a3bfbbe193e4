#include "visit.h"

#include <algorithm>
#include <cstring>

#include "cache_bounds.h"
#include "records/platform.h"

namespace {

// Of moments and lacks: there are a few for each node.
constexpr uint32_t kMostFacts = 10000;
constexpr uint32_t kMostFactText = 1000;

bool TextAt(const CacheFile &file, const cache::Bytes &bytes, std::string *text) {
  if (!HasBytes(file, bytes.place(), bytes.length()) || bytes.length() > kMostFactText)
    return false;
  text->assign(reinterpret_cast<const char *>(file.bytes) + bytes.place(), bytes.length());
  return text->find('\0') == text->npos;
}

// A struct of a vector, which need not be aligned.
template <typename Struct>
Struct At(const flatbuffers::Vector<const Struct *> &all, uint32_t place) {
  Struct copy;
  memcpy(&copy, all.Data() + place * sizeof(Struct), sizeof(Struct));
  return copy;
}

const cache::Bytes &NameOf(const cache::Moments &of) {
  return of.name();
}
const cache::Bytes &NameOf(const cache::Lack &lack) {
  return lack.what();
}

Moments FactOf(const std::string &name, const cache::Moments &of) {
  return {name, of.begin(), of.end(), of.begin_since_boot(), of.end_since_boot()};
}

Lack FactOf(const std::string &what, const cache::Lack &lack) {
  return {what, lack.reason(), lack.status(), lack.count()};
}

template <typename Struct, typename Fact>
bool AddAll(const CacheFile &file, const flatbuffers::Vector<const Struct *> *all,
            std::vector<Fact> *facts) {
  if (all != nullptr && all->size() > kMostFacts) return false;
  for (uint32_t i = 0; all != nullptr && i < all->size(); ++i) {
    const Struct fact = At(*all, i);
    std::string name;
    if (!TextAt(file, NameOf(fact), &name)) return false;
    facts->push_back(FactOf(name, fact));
  }
  return true;
}

Facts FactsOf(const CacheFile &file) {
  const cache::Recording &recording = *file.content->recording();
  Facts facts;
  facts.minorVersion = std::min(file.header->minor_version(), kCacheMinorVersion);
  facts.name = TextOrEmpty(recording.name());
  facts.system = TextOrEmpty(recording.system());
  facts.release = TextOrEmpty(recording.release());
  facts.architecture = TextOrEmpty(recording.architecture());
  facts.recorder = TextOrEmpty(recording.recorder());
  facts.rights = TextOrEmpty(recording.rights());
  facts.kernelBuildDate = TextOrEmpty(recording.kernel_build_date());
  facts.signature = recording.signature();
  facts.catalogue = recording.catalogue();
  facts.redaction = TextOrEmpty(recording.redaction());
  facts.bootID = TextOrEmpty(recording.boot_id());
  facts.recorderCartel = recording.recorder_cartel();
  facts.begin = recording.begin();
  facts.end = recording.end();
  return facts;
}

// The file has each text once, and so they are shorter than it.
bool AddOmitted(const CacheFile &file, Facts *facts) {
  const auto *all = file.content->recording()->omitted();
  uint64_t size = 0;
  for (uint32_t i = 0; all != nullptr && i < all->size(); ++i) {
    size += all->Get(i)->size() + sizeof(flatbuffers::uoffset_t);
    if (size > file.size) return false;
    facts->omitted.emplace_back(all->Get(i)->c_str());
  }
  return true;
}

class Walk {
 public:
  Walk(const CacheFile &file, Visitor *visitor) : file_(file), visitor_(visitor) {}

  bool Node(uint32_t place);

 private:
  bool Describe(uint32_t place, VisitedNode *visited);
  bool Show(const VisitedNode &node, const cache::List &list);
  bool Show(const VisitedNode &node, const cache::Record &record);
  bool Show(const VisitedNode &node, const cache::Stored &stored);
  template <typename Answer>
  bool ShowAll(const VisitedNode &node, const flatbuffers::Vector<const Answer *> *answers);
  bool Decode(uint32_t first, uint32_t count, Values *values);
  bool Decode(uint32_t place, uint32_t length, std::string_view *bytes);
  bool Spend(uint64_t size);

  const CacheFile &file_;
  Visitor *visitor_;
  Description description_ = {};
  Values before_;
  Values selector_;
  Values entries_;
  uint64_t spent_ = 0;
  uint64_t fullSize_ = 0;  // of all records
};

// No reader follows a record that names more processors than there are.
bool IsCredible(const char *path, std::string_view record) {
  const NodeInfo *known = FindNodeByPath(path, strlen(path));
  if (known == nullptr || IndexOf(*known) != kNode_hardware_cpu_cpuInfo) return true;
  CpuInfo cpus = {};
  record.copy(reinterpret_cast<char *>(&cpus), sizeof(cpus));
  return cpus.numPcpus <= kMostCpus;
}

// A file may show the same bytes any number of times; what no writer accepts is damaged.
bool Walk::Spend(uint64_t size) {
  spent_ += size;
  return spent_ <= kMostModelSize && RecordsAreWithinBounds(file_, spent_, 1);
}

bool Walk::Decode(uint32_t first, uint32_t count, Values *values) {
  if (!HasParameters(file_, first, count)) return false;
  if (!Spend(uint64_t{count} * sizeof(cache::Parameter))) return false;
  values->resize(count);
  for (uint32_t i = 0; i < count; ++i) {
    const cache::Parameter &parameter = file_.parameters[first + i];
    Value &value = (*values)[i];
    value = {parameter.kind(), 0, {}};
    if (value.kind == cache::Kind::Text) {
      const char *text = ParameterText(file_, parameter);
      if (text == nullptr || !Spend(parameter.length() + uint64_t{1})) return false;
      value.text = text;
      if (value.text.size() != parameter.length()) return false;
    } else if (value.kind == cache::Kind::Integer) {
      value.integer = parameter.value();
    } else if (value.kind != cache::Kind::Null) {
      return false;
    }
  }
  return true;
}

bool Walk::Decode(uint32_t place, uint32_t length, std::string_view *bytes) {
  if (!HasBytes(file_, place, length) || !Spend(length)) return false;
  *bytes = length > 0
               ? std::string_view(reinterpret_cast<const char *>(file_.bytes) + place, length)
               : std::string_view();
  return true;
}

bool Walk::Show(const VisitedNode &node, const cache::List &list) {
  if (!Decode(list.first(), list.count(), &entries_)) return false;
  const NodeInfo *known = FindNodeByPath(node.path, strlen(node.path));
  if (known != nullptr && !StandOnce(entries_) && EntriesSelect(*known)) return false;
  visitor_->OnList(node, selector_, list.status(), entries_);
  return true;
}

bool Walk::Show(const VisitedNode &node, const cache::Record &record) {
  if (node.description != nullptr && record.length() > node.description->recordSize) return false;
  std::string_view bytes;
  if (!Decode(record.place(), record.length(), &bytes)) return false;
  if (!IsCredible(node.path, bytes)) return false;
  visitor_->OnRecord(node, selector_, record.status(), bytes);
  return true;
}

bool Walk::Show(const VisitedNode &node, const cache::Stored &stored) {
  std::string_view bytes;
  if (!Decode(stored.place(), stored.length(), &bytes)) return false;
  visitor_->OnContent(node, selector_, stored, bytes);
  return true;
}

template <typename Answer>
bool Walk::ShowAll(const VisitedNode &node, const flatbuffers::Vector<const Answer *> *answers) {
  for (uint32_t i = 0; answers != nullptr && i < answers->size(); ++i) {
    const Answer &answer = *answers->Get(i);
    before_.swap(selector_);
    if (!Decode(answer.selector().first(), answer.selector().count(), &selector_)) return false;
    if (i > 0 && !(before_ < selector_)) return false;
    if (!Spend(sizeof(Answer)) || !Show(node, answer)) return false;
  }
  return true;
}

bool Walk::Describe(uint32_t place, VisitedNode *visited) {
  const flatbuffers::String &path = *file_.content->nodes()->Get(place)->path();
  visited->path = path.c_str();
  if (strlen(visited->path) != path.size()) return false;  // it would stand for another's
  if (file_.header->minor_version() == 0) {
    const NodeInfo *known = FindNodeByPath(path.c_str(), path.size());
    if (known != nullptr) ::Describe(*known, &description_);
    visited->description = known != nullptr ? &description_ : nullptr;
    return true;
  }
  if (!ReadDescriptionAt(file_, place, &description_)) return false;
  const cache::Bytes &words = *file_.content->descriptions()->Get(place);
  visited->description = &description_;
  visited->words = {reinterpret_cast<const char *>(file_.bytes) + words.place(), words.length()};
  return true;
}

bool Walk::Node(uint32_t place) {
  const cache::Node &node = *file_.content->nodes()->Get(place);
  VisitedNode visited = {};
  if (!Describe(place, &visited)) return false;
  const uint64_t records = node.records() != nullptr ? node.records()->size() : 0;
  if (visited.description != nullptr) fullSize_ += records * visited.description->recordSize;
  if (!RecordsAreWithinBounds(file_, fullSize_, 1)) return false;
  visitor_->OnNode(visited);
  if (!ShowAll(visited, node.lists()) || !ShowAll(visited, node.records()) ||
      !ShowAll(visited, node.contents())) {
    return false;
  }
  if (node.set_status() != 0) visitor_->OnSet(visited, node.set_status());
  return true;
}

}  // namespace

bool StandOnce(const Values &entries) {
  const auto isRepeated = [](const Value &a, const Value &b) { return !(a < b); };
  if (std::adjacent_find(entries.begin(), entries.end(), isRepeated) == entries.end()) return true;
  Values sorted = entries;
  std::sort(sorted.begin(), sorted.end());
  return std::adjacent_find(sorted.begin(), sorted.end(), isRepeated) == sorted.end();
}

bool VisitAll(const CacheFile &file, Visitor *visitor, std::string *problem) {
  Facts facts = FactsOf(file);
  const cache::Recording &recording = *file.content->recording();
  if (!AddAll(file, recording.moments(), &facts.moments) ||
      !AddAll(file, recording.lacks(), &facts.lacks) || !AddOmitted(file, &facts)) {
    *problem = "the recording";
    return false;
  }
  if (!ListsAreWithinBounds(file)) {
    *problem = "the lists";
    return false;
  }
  visitor->OnHost(facts);
  Walk walk(file, visitor);
  const char *before = nullptr;
  const auto *nodes = file.content->nodes();
  for (uint32_t i = 0; nodes != nullptr && i < nodes->size(); ++i) {
    const char *path = nodes->Get(i)->path()->c_str();
    if ((before != nullptr && strcmp(before, path) >= 0) || !walk.Node(i)) {
      *problem = path;
      return false;
    }
    before = path;
  }
  return true;
}
