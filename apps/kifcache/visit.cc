#include "visit.h"

#include <cstring>

namespace {

Facts FactsOf(const cache::Recording &recording) {
  Facts facts;
  facts.name = TextOrEmpty(recording.name());
  facts.system = TextOrEmpty(recording.system());
  facts.release = TextOrEmpty(recording.release());
  facts.architecture = TextOrEmpty(recording.architecture());
  facts.recorder = TextOrEmpty(recording.recorder());
  facts.rights = TextOrEmpty(recording.rights());
  facts.kernelBuildDate = TextOrEmpty(recording.kernel_build_date());
  facts.signature = recording.signature();
  facts.begin = recording.begin();
  facts.end = recording.end();
  if (recording.omitted() != nullptr) {
    for (const auto *text : *recording.omitted()) facts.omitted.emplace_back(text->c_str());
  }
  return facts;
}

class Walk {
 public:
  Walk(const CacheFile &file, Visitor *visitor) : file_(file), visitor_(visitor) {}

  bool Node(const cache::Node &node);

 private:
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
  Values before_;
  Values selector_;
  Values entries_;
  uint64_t spent_ = 0;
};

// A file may show the same bytes any number of times; what no writer accepts is damaged.
bool Walk::Spend(uint64_t size) {
  spent_ += size;
  return spent_ <= kMostModelSize;
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
  visitor_->OnList(node, selector_, list.status(), entries_);
  return true;
}

bool Walk::Show(const VisitedNode &node, const cache::Record &record) {
  if (node.info != nullptr && record.length() > node.info->offers.recordSize) return false;
  std::string_view bytes;
  if (!Decode(record.place(), record.length(), &bytes)) return false;
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

bool Walk::Node(const cache::Node &node) {
  const VisitedNode visited = {node.path()->c_str(),
                               FindNodeByPath(node.path()->c_str(), node.path()->size())};
  if (!ShowAll(visited, node.lists()) || !ShowAll(visited, node.records()) ||
      !ShowAll(visited, node.contents())) {
    return false;
  }
  if (node.set_status() != 0) visitor_->OnSet(visited, node.set_status());
  return true;
}

}  // namespace

bool VisitAll(const CacheFile &file, Visitor *visitor, std::string *problem) {
  visitor->OnHost(FactsOf(*file.content->recording()));
  Walk walk(file, visitor);
  const char *before = nullptr;
  const auto *nodes = file.content->nodes();
  for (uint32_t i = 0; nodes != nullptr && i < nodes->size(); ++i) {
    const char *path = nodes->Get(i)->path()->c_str();
    if ((before != nullptr && strcmp(before, path) >= 0) || !walk.Node(*nodes->Get(i))) {
      *problem = path;
      return false;
    }
    before = path;
  }
  return true;
}
