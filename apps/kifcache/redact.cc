#include "redact.h"

#include <algorithm>
#include <cstring>
#include <string_view>

#include "marks.h"

namespace {

constexpr char kEllipsis[] = "…";

// The first word of `text`, which is taken off it with the blanks before it. A blank between double
// quotes does not end a word.
std::string_view TakeWord(std::string_view *text) {
  const size_t start = text->find_first_not_of(" \t\n");
  text->remove_prefix(start == text->npos ? text->size() : start);
  bool quoted = false;
  size_t end = 0;
  for (; end < text->size(); ++end) {
    const char c = (*text)[end];
    if (c == '"') quoted = !quoted;
    if (!quoted && (c == ' ' || c == '\t' || c == '\n')) break;
  }
  const std::string_view word = text->substr(0, end);
  text->remove_prefix(end);
  return word;
}

std::string RedactBehindFirstWord(std::string_view text) {
  const size_t blank = text.find(' ');
  std::string redacted(text.substr(0, blank));
  if (blank != text.npos) redacted += std::string(" ") + kEllipsis;
  return redacted;
}

std::string RedactBootCommandLine(std::string_view commandLine) {
  // The kernel comes first; its name is no option.
  std::string redacted(TakeWord(&commandLine));
  while (true) {
    const std::string_view word = TakeWord(&commandLine);
    if (word.empty()) return redacted;
    const size_t equals = word.find('=');
    redacted += ' ';
    redacted += word.substr(0, equals == word.npos ? equals : equals + 1);
    if (equals != word.npos) redacted += kEllipsis;
    if (word != "--") continue;
    if (!TakeWord(&commandLine).empty()) redacted += std::string(" ") + kEllipsis;
    return redacted;
  }
}

std::string Redacted(std::string_view text, Privacy privacy) {
  switch (privacy) {
    case Privacy::kCommandLine:
    case Privacy::kSocket:
      return RedactBehindFirstWord(text);
    case Privacy::kBootCommandLine:
      return RedactBootCommandLine(text);
    case Privacy::kPrivate:
    case Privacy::kAddress:
      return text.empty() ? "" : kEllipsis;
    default:
      return std::string(text);
  }
}

void RedactRecord(const NodeInfo &node, std::string *record) {
  const MarkedAnswer answer = {nullptr, *record};
  for (size_t i = 0; i < node.fieldCount; ++i) {
    const NodeField &field = FieldsOf(node)[i];
    if (field.type != FieldType::kText) continue;
    char *bytes = record->data() + field.offset;
    const std::string_view text(bytes, strnlen(bytes, field.size));
    std::string redacted = Redacted(text, MarksOfField(node, i).privacy.Of(answer));
    if (redacted == text) continue;
    redacted.resize(std::min<size_t>(redacted.size(), field.size - 1));
    redacted.resize(field.size, '\0');
    memcpy(bytes, redacted.data(), field.size);
  }
}

void RedactNode(const NodeInfo &node, NodeModel *of, HostModel *model) {
  for (auto &[record, line] : of->records) {
    if (record.status() != 0) continue;
    std::string bytes(model->TextAt(record.place(), record.length()));
    bytes.resize(node.recordSize);
    RedactRecord(node, &bytes);
    model->ReplaceRecord(&record, bytes);
  }
  for (auto &[content, line] : of->contents) {
    const std::string_view bytes = model->TextAt(content.place(), content.length());
    const Privacy privacy = MarksOfOtherBytes(node).privacy.Of({nullptr, bytes});
    if (content.read_status() == 0 && privacy != Privacy::kPublic) {
      model->ReplaceContent(&content, kEllipsis);
    }
  }
}

}  // namespace

void RedactModel(HostModel *model) {
  model->facts.redaction = kRedactionRules;
  for (auto &[path, of] : model->nodes) {
    const NodeInfo *node = FindNodeByPath(path.data(), path.size());
    if (node != nullptr) RedactNode(*node, &of, model);
  }
}
