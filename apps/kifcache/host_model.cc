#include "host_model.h"

#include <algorithm>
#include <cstring>

#include "description_text.h"

std::string_view WithoutZeros(std::string_view record) {
  // Most of a record is zeros.
  static constexpr char kZeros[64] = {};
  while (record.ends_with({kZeros, sizeof(kZeros)})) record.remove_suffix(sizeof(kZeros));
  return record.substr(0, record.find_last_not_of('\0') + 1);
}

// Once the model is too large nothing more is added to it; its size then says so.
uint32_t HostModel::AddBytes(std::string_view bytes) {
  size_ += bytes.size();
  if (size_ > kMostModelSize) return 0;
  const auto place = static_cast<uint32_t>(bytes_.size());
  bytes_.insert(bytes_.end(), bytes.begin(), bytes.end());
  return place;
}

cache::Selector HostModel::AddParameters(const Values &values) {
  size_ += values.size() * sizeof(cache::Parameter);
  if (size_ > kMostModelSize) return {};
  const auto first = static_cast<uint32_t>(parameters_.size());
  for (const Value &value : values) {
    int64_t number = value.integer;
    if (value.kind == cache::Kind::Text) {
      number = AddBytes({value.text.c_str(), value.text.size() + 1});
    }
    parameters_.emplace_back(number, static_cast<uint32_t>(value.text.size()), value.kind);
  }
  return {first, static_cast<uint32_t>(values.size())};
}

NodeModel *HostModel::NodeOf(std::string_view path) {
  const auto known = nodes.find(path);
  if (known != nodes.end()) return &known->second;
  NodeModel *node = &nodes[std::string(path)];
  const NodeInfo *info = FindNodeByPath(path.data(), path.size());
  if (info != nullptr) node->description = DescriptionText(*info);
  return node;
}

void HostModel::AddList(NodeModel *node, const Values &parent, KIF_Status status,
                        const Values &entries, uint32_t line) {
  size_ += sizeof(cache::List);
  const cache::Selector selector = AddParameters(parent);
  const cache::Selector run = AddParameters(entries);
  if (size_ > kMostModelSize) return;
  node->lists.push_back({{selector, status, run.first(), run.count()}, line});
}

void HostModel::AddRecord(NodeModel *node, const Values &instance, KIF_Status status,
                          std::string_view record, uint32_t line) {
  size_ += sizeof(cache::Record);
  record = WithoutZeros(record);
  const cache::Selector selector = AddParameters(instance);
  const uint32_t place = AddBytes(record);
  if (size_ > kMostModelSize) return;
  node->records.push_back({{selector, status, place, static_cast<uint32_t>(record.size())}, line});
}

void HostModel::AddContent(NodeModel *node, const Values &instance, const ContentAnswer &content,
                           uint32_t line) {
  size_ += sizeof(cache::Stored);
  const cache::Selector selector = AddParameters(instance);
  const uint32_t place = AddBytes(content.bytes);
  if (size_ > kMostModelSize) return;
  node->contents.push_back({{selector, content.lengthStatus, content.readStatus, content.total,
                             place, static_cast<uint32_t>(content.bytes.size())},
                            line});
}

void HostModel::ReplaceRecord(cache::Record *record, std::string_view bytes) {
  bytes = WithoutZeros(bytes);
  const auto length = static_cast<uint32_t>(bytes.size());
  *record = {record->selector(), record->status(), AddBytes(bytes), length};
}

void HostModel::ReplaceContent(cache::Stored *content, uint32_t total, std::string_view bytes) {
  const auto length = static_cast<uint32_t>(bytes.size());
  *content = {content->selector(),    content->length_status(),
              content->read_status(), total,
              AddBytes(bytes),        length};
}

void HostModel::ReplaceText(uint32_t parameter, const std::string &text) {
  parameters_[parameter] = {AddBytes({text.c_str(), text.size() + 1}),
                            static_cast<uint32_t>(text.size()), cache::Kind::Text};
}

int HostModel::Compare(const cache::Parameter &left, const cache::Parameter &right) const {
  if (left.kind() != right.kind()) return left.kind() < right.kind() ? -1 : 1;
  if (left.kind() != cache::Kind::Text) {
    return left.value() < right.value() ? -1 : left.value() > right.value() ? 1 : 0;
  }
  const auto text = [this](const cache::Parameter &parameter) {
    return reinterpret_cast<const char *>(bytes_.data() + parameter.value());
  };
  return strcmp(text(left), text(right));
}

int HostModel::Compare(const cache::Selector &left, const cache::Selector &right) const {
  const uint32_t common = std::min(left.count(), right.count());
  for (uint32_t i = 0; i < common; ++i) {
    const int order = Compare(parameters_[left.first() + i], parameters_[right.first() + i]);
    if (order != 0) return order;
  }
  if (left.count() == right.count()) return 0;
  return left.count() < right.count() ? -1 : 1;
}

template <typename Answer>
bool HostModel::Sort(std::vector<Given<Answer>> *answers, uint32_t *line, uint32_t *firstLine) {
  const auto compare = [this](const Given<Answer> &left, const Given<Answer> &right) {
    return Compare(left.answer.selector(), right.answer.selector());
  };
  std::stable_sort(answers->begin(), answers->end(),
                   [&](const auto &left, const auto &right) { return compare(left, right) < 0; });
  const auto twice = std::adjacent_find(
      answers->begin(), answers->end(),
      [&](const auto &left, const auto &right) { return compare(left, right) == 0; });
  if (twice == answers->end()) return true;
  *firstLine = twice[0].line;
  *line = twice[1].line;
  return false;
}

bool HostModel::Sort(uint32_t *line, uint32_t *firstLine) {
  for (auto &[path, node] : nodes) {
    if (!Sort(&node.lists, line, firstLine)) return false;
    if (!Sort(&node.records, line, firstLine)) return false;
    if (!Sort(&node.contents, line, firstLine)) return false;
  }
  return true;
}
