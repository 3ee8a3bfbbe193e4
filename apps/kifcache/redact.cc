#include "redact.h"

#include <algorithm>
#include <cstring>
#include <unordered_map>

#include "marks.h"
#include "redact_text.h"
#include "status.h"

namespace {

// The parameters of an answer, as marks may ask for them.
using Instance = std::vector<MarkedParameter>;

class Redactor {
 public:
  explicit Redactor(HostModel *model)
      : model_(model),
        isAgain_(model->facts.redaction == kRedactionRules),
        texts_(isAgain_, model->facts.release) {}

  void Run();

 private:
  void DropUnknown();
  bool HasParametersOf(const NodeInfo &node, const cache::Selector &selector, size_t count);
  bool HasEntriesOf(const NodeInfo &node, const cache::List &list);
  void NotePrograms();

  template <typename Routine>
  void ForEachNode(Routine routine);
  void RedactAnswers(const NodeInfo &node, NodeModel *of);
  void RedactParameters(const NodeInfo &node, NodeModel *of);

  void Redact(const NodeInfo &node, cache::Record *record);
  void Redact(const NodeInfo &node, cache::Stored *content);
  void PutField(const NodeInfo &node, size_t place, const MarkedAnswer &answer,
                std::string *redacted);
  void RedactSelector(const NodeInfo &node, const cache::Selector &selector);
  void RedactEntries(const NodeInfo &node, const cache::List &list);

  MarkedParameter ParameterAt(uint32_t place) const;
  Instance InstanceOf(const cache::Selector &selector) const;

  HostModel *model_;
  const bool isAgain_;
  bool replaces_ = false;
  RedactedTexts texts_;
  std::unordered_map<int64_t, std::string> programs_;  // by world
};

MarkedParameter Redactor::ParameterAt(uint32_t place) const {
  const cache::Parameter &parameter = *model_->ParametersAt(place);
  if (parameter.kind() == cache::Kind::Integer) return {parameter.value(), {}};
  if (parameter.kind() != cache::Kind::Text) return {};
  return {0, model_->TextAt(static_cast<uint64_t>(parameter.value()), parameter.length())};
}

Instance Redactor::InstanceOf(const cache::Selector &selector) const {
  Instance instance;
  for (uint32_t i = 0; i < selector.count(); ++i) {
    instance.push_back(ParameterAt(selector.first() + i));
  }
  // Marks may ask for every parameter of the node.
  instance.resize(std::max<size_t>(instance.size(), kMostParameters));
  return instance;
}

bool Redactor::HasParametersOf(const NodeInfo &node, const cache::Selector &selector,
                               size_t count) {
  if (selector.count() != count) return false;
  for (uint32_t i = 0; i < count; ++i) {
    const cache::Kind kind = model_->ParametersAt(selector.first() + i)->kind();
    if ((kind == cache::Kind::Integer) != (ParameterOf(node, i).type == kInteger)) return false;
  }
  return true;
}

bool Redactor::HasEntriesOf(const NodeInfo &node, const cache::List &list) {
  const size_t count = CountOfListParameters(node);
  if (!node.hasLists || !HasParametersOf(node, list.selector(), count)) return false;
  const cache::Parameter *entries = model_->ParametersAt(list.first());
  return std::all_of(entries, entries + list.count(), [&](const cache::Parameter &entry) {
    const bool isInteger = entry.kind() == cache::Kind::Integer;
    return isInteger == (ParameterOf(node, count).type == kInteger);
  });
}

// What the catalogue does not have is private: nodes, and answers that it does not know so.
void Redactor::DropUnknown() {
  const auto isUnknown = [](const std::string &path) {
    return FindNodeByPath(path.data(), path.size()) == nullptr;
  };
  const auto isNoSubject = [&](const std::string &name) {
    const auto isNamed = [&](const NodeInfo &node) { return name == GroupName(node.group); };
    return name != "recording" && isUnknown(name) &&
           std::none_of(std::begin(kNodes), std::end(kNodes), isNamed);
  };
  Facts &facts = model_->facts;
  std::erase_if(facts.lacks, [&](const Lack &lack) { return isNoSubject(lack.what); });
  std::erase_if(facts.moments, [&](const Moments &of) { return isNoSubject(of.name); });
  std::fill(facts.omitted.begin(), facts.omitted.end(), kEllipsis);
  std::erase_if(model_->nodes, [&](const auto &entry) { return isUnknown(entry.first); });
  ForEachNode([this](const NodeInfo &node, NodeModel *of) {
    const auto isOther = [&](const auto &given) {
      return !HasParametersOf(node, given.answer.selector(), node.parameterCount);
    };
    std::erase_if(of->lists, [&](const auto &given) { return !HasEntriesOf(node, given.answer); });
    if (!node.hasRecords) of->records.clear();
    if (!node.hasContents) of->contents.clear();
    std::erase_if(of->records, isOther);
    std::erase_if(of->contents, isOther);
  });
}

void Redactor::NotePrograms() {
  const auto names = model_->nodes.find(kNodes[kNode_world_name].path);
  if (names == model_->nodes.end()) return;
  for (const auto &[record, line] : names->second.records) {
    if (record.status() != 0) continue;
    const std::string_view name = model_->TextAt(record.place(), record.length());
    const int64_t world = model_->ParametersAt(record.selector().first())->value();
    programs_[world] = name.substr(0, name.find('\0'));
  }
}

template <typename Routine>
void Redactor::ForEachNode(Routine routine) {
  for (auto &[path, of] : model_->nodes) routine(*FindNodeByPath(path.data(), path.size()), &of);
}

// Puts a field of the answer where it stands in `*redacted`, which is zeros there.
void Redactor::PutField(const NodeInfo &node, size_t place, const MarkedAnswer &answer,
                        std::string *redacted) {
  const NodeField &field = FieldsOf(node)[place];
  const Privacy privacy = MarksOfField(node, place).privacy.Of(answer);
  if (field.offset >= answer.record.size()) return;
  const std::string_view bytes = answer.record.substr(field.offset, field.size);
  if (field.type == FieldType::kText) {
    const std::string_view text = bytes.substr(0, bytes.find('\0'));
    const bool isCut = text.size() == field.size - 1;
    const auto program = programs_.find(answer.instance[0].integer);
    const std::string put =
        texts_.OfText(text, privacy, program != programs_.end() ? program->second : "", isCut);
    put.copy(redacted->data() + field.offset, put == text ? field.size : field.size - 1);
  } else if (privacy == Privacy::kPublic) {
    bytes.copy(redacted->data() + field.offset, field.size);
  } else if (strcmp(FieldsOf(node)[0].name, "known") == 0 && place - 1 < 64) {
    const size_t bit = FieldsOf(node)[0].offset * 8 + place - 1;
    char &byte = (*redacted)[bit / 8];
    byte = static_cast<char>(byte & ~(1 << bit % 8));
  }
}

void Redactor::Redact(const NodeInfo &node, cache::Record *record) {
  if (record->status() != 0) return model_->ReplaceRecord(record, "");
  const std::string_view bytes = model_->TextAt(record->place(), record->length());
  const Instance instance = InstanceOf(record->selector());
  const MarkedAnswer answer = {instance.data(), bytes};
  const Privacy others = MarksOfOtherBytes(node).privacy.Of(answer);
  if (others == Privacy::kWithheld) {
    *record = {record->selector(), KIF_STATUS_NO_PERMISSION, 0, 0};
    return;
  }
  std::string redacted(others == Privacy::kPublic ? bytes : "");
  redacted.resize(node.recordSize);
  for (size_t i = 0; i < node.fieldCount; ++i) {
    const NodeField &field = FieldsOf(node)[i];
    redacted.replace(field.offset, field.size, field.size, '\0');
    PutField(node, i, answer, &redacted);
  }
  if (replaces_ && WithoutZeros(redacted) != bytes) model_->ReplaceRecord(record, redacted);
}

void Redactor::Redact(const NodeInfo &node, cache::Stored *content) {
  if (!replaces_) return;
  if (content->read_status() != 0) return model_->ReplaceContent(content, content->total(), "");
  const Instance instance = InstanceOf(content->selector());
  const std::string_view bytes = model_->TextAt(content->place(), content->length());
  const Privacy privacy = MarksOfContent(node).privacy.Of({instance.data(), bytes});
  if (privacy != Privacy::kPublic) {
    model_->ReplaceContent(content, sizeof(kEllipsis) - 1, kEllipsis);
  }
}

void Redactor::RedactAnswers(const NodeInfo &node, NodeModel *of) {
  for (auto &[record, line] : of->records) Redact(node, &record);
  for (auto &[content, line] : of->contents) Redact(node, &content);
}

void Redactor::RedactSelector(const NodeInfo &node, const cache::Selector &selector) {
  const Instance instance = InstanceOf(selector);
  std::vector<std::string> texts;
  for (uint32_t i = 0; i < selector.count(); ++i) {
    const Privacy privacy = MarksOfParameter(node, i).privacy.Of({instance.data(), {}});
    texts.push_back(texts_.OfParameter(instance[i].text, privacy));
    if (texts.back() == instance[i].text) texts.back().clear();
  }
  for (uint32_t i = 0; replaces_ && i < selector.count(); ++i) {
    if (!texts[i].empty()) model_->ReplaceText(selector.first() + i, texts[i]);
  }
}

void Redactor::RedactEntries(const NodeInfo &node, const cache::List &list) {
  const size_t last = CountOfListParameters(node);
  if (ParameterOf(node, last).type == kInteger) return;
  for (uint32_t place = list.first(); place < list.first() + list.count(); ++place) {
    Instance instance = InstanceOf(list.selector());
    instance[last] = ParameterAt(place);
    const Privacy privacy = MarksOfParameter(node, last).privacy.Of({instance.data(), {}});
    const std::string text = texts_.OfParameter(instance[last].text, privacy);
    if (replaces_ && text != instance[last].text) model_->ReplaceText(place, text);
  }
}

void Redactor::RedactParameters(const NodeInfo &node, NodeModel *of) {
  for (auto &[list, line] : of->lists) {
    if (list.status() != 0) list = {list.selector(), list.status(), 0, 0};
    RedactEntries(node, list);  // by the parents' own texts
    RedactSelector(node, list.selector());
  }
  for (auto &[record, line] : of->records) RedactSelector(node, record.selector());
  for (auto &[content, line] : of->contents) RedactSelector(node, content.selector());
}

void Redactor::Run() {
  DropUnknown();
  NotePrograms();
  const auto redactAnswers = [this](const NodeInfo &node, NodeModel *of) {
    RedactAnswers(node, of);
  };
  const auto redactParameters = [this](const NodeInfo &node, NodeModel *of) {
    RedactParameters(node, of);
  };
  if (isAgain_) {
    ForEachNode(redactParameters);
    ForEachNode(redactAnswers);
    texts_.EndNoting();
  }
  // Texts in records may be cut: whole ones are named first. Marks ask for parameters as they were.
  ForEachNode(redactParameters);
  replaces_ = true;
  ForEachNode(redactAnswers);
  ForEachNode(redactParameters);
}

}  // namespace

void RedactModel(const std::string &name, HostModel *model) {
  Facts &facts = model->facts;
  const bool keepsName = facts.redaction == kRedactionRules && name.empty();
  Redactor(model).Run();
  if (!keepsName) facts.name = name.empty() ? "redacted" : name;
  facts.redaction = kRedactionRules;
  uint32_t line;
  uint32_t firstLine;
  (void)model->Sort(&line, &firstLine);
}
