#include "text_reader.h"

#include <algorithm>
#include <cstring>
#include <iterator>

#include "cache_bounds.h"
#include "description_text.h"
#include "progress.h"
#include "text_lexer.h"
#include "visit.h"

namespace {

constexpr uint32_t kMostContent = uint32_t{64} << 20;  // of a content that is written out

enum class PartType { kUnsigned, kSigned, kText, kHex };

// Where a part of a record goes.
struct Part {
  uint32_t offset;
  uint32_t size;  // in bytes; of hex and of a text given by offset: as many as there are
  PartType type;
};

struct TypeName {
  const char *name;
  uint32_t size;
  PartType type;
};
constexpr TypeName kTypeNames[] = {
    {"u8", 1, PartType::kUnsigned},  {"u16", 2, PartType::kUnsigned},
    {"u32", 4, PartType::kUnsigned}, {"u64", 8, PartType::kUnsigned},
    {"i32", 4, PartType::kSigned},   {"text", 0, PartType::kText},
    {"hex", 0, PartType::kHex},
};

class Reader : TextLexer {
 public:
  Reader(std::string_view text, const char *name, HostModel *model)
      : TextLexer(text, name), model_(model) {}

  bool Read();

 private:
  // A node that the text names: its answers, and what they look like.
  struct Node {
    std::string path;
    NodeModel *model;
    Description description;
  };

  // Each reads what is left of the line, or the part of it that its name says. False: an error,
  // which has been said.
  bool ReadLine();
  bool ReadHost();
  bool ReadFact(std::string_view key);
  bool ReadList();
  bool ReadRecord();
  bool ReadContent();
  bool ReadContentWord(ContentAnswer *content, bool *hasLength, bool *hasStatus);
  bool ReadSet();
  bool ReadNodeLine();
  bool ReadMoments();
  bool ReadLack();
  bool ReadNode(bool Description::*offer, const char *what, const Node **node);
  bool ReadSelector(const Node &node, size_t wanted, Values *values);
  bool ReadValue(Value *value);
  bool ReadPart(const Node &node, std::string *record);
  bool FindPart(const Node &node, std::string_view name, Part *part);
  bool FindPartByOffset(std::string_view name, Part *part);
  bool ReadPartText(const Part &part, std::string_view name, std::string *bytes);
  bool ReadPartNumber(const Part &part, std::string_view name, std::string *bytes);
  bool ReadEndOfLine();

  HostModel *model_;
  std::map<std::string, Node, std::less<>> nodes_;
  Values values_;
  Values entries_;
  std::string bytes_;
};

bool Reader::Read() {
  // The lines that describe nodes come first, wherever they stand.
  while (NextLine()) {
    if (TakeWord("node") && !ReadNodeLine()) return false;
  }
  Rewind();
  Progress progress("lines");
  while (NextLine()) {
    progress.Step("read");
    if (TakeWord("node")) continue;
    if (!ReadLine() || !ReadEndOfLine()) return false;
  }
  uint32_t firstLine = 0;
  if (!model_->Sort(&lineNumber_, &firstLine)) {
    return Fail("the same was given in line %u", firstLine);
  }
  return true;
}

bool Reader::ReadLine() {
  const std::string_view kind = NextWord(false);
  if (kind == "host") return ReadHost();
  if (kind == "list") return ReadList();
  if (kind == "record") return ReadRecord();
  if (kind == "content") return ReadContent();
  if (kind == "set") return ReadSet();
  return Fail("a line begins with host, node, list, record, content or set, not with \"%.*s\"",
              PRINTED(kind));
}

bool Reader::ReadEndOfLine() {
  return AtEnd() || Fail("unexpected \"%.*s\"", PRINTED(line_));
}

bool Reader::ReadHost() {
  return ReadFact(NextWord(false));
}

bool Reader::ReadFact(std::string_view key) {
  Facts &facts = model_->facts;
  for (const TextFact &fact : kTextFacts) {
    if (key == fact.name) return ReadPlainText(&(facts.*fact.text), fact.name);
  }
  if (key == "omitted") return ReadPlainText(&facts.omitted.emplace_back(), "omitted");
  Number number;
  if (key == "signature") {
    if (!ReadNumber("signature", &number)) return false;
    facts.signature = number.bits;
    return true;
  }
  if (key == "begin" || key == "end") {
    if (!ReadNumber("time", &number)) return false;
    (key == "begin" ? facts.begin : facts.end) = static_cast<int64_t>(number.bits);
    return true;
  }
  if (key == "catalogue") {
    if (!ReadNumber("catalogue", &number)) return false;
    facts.catalogue = number.bits;
    return true;
  }
  if (key == "recorderCartel") {
    if (!ReadNumber("cartel", &number)) return false;
    facts.recorderCartel = static_cast<int64_t>(number.bits);
    return true;
  }
  if (key == "minorVersion") {
    if (!ReadNumber("version", &number)) return false;
    facts.minorVersion = number.bits == 0 ? 0 : kCacheMinorVersion;
    return true;
  }
  if (key == "moments") return ReadMoments();
  if (key == "lack") return ReadLack();
  return Fail("unknown fact \"%.*s\"", PRINTED(key));
}

bool Reader::ReadMoments() {
  Moments &of = model_->facts.moments.emplace_back();
  if (!ReadPlainText(&of.name, "group")) return false;
  for (int64_t *moment : {&of.begin, &of.end, &of.beginSinceBoot, &of.endSinceBoot}) {
    Number number;
    if (!ReadNumber("time", &number)) return false;
    *moment = static_cast<int64_t>(number.bits);
  }
  return true;
}

bool Reader::ReadLack() {
  Lack &lack = model_->facts.lacks.emplace_back();
  if (!ReadPlainText(&lack.what, "node or group")) return false;
  const std::string_view reason = NextWord(false);
  const auto *const known = std::find(std::begin(kReasons), std::end(kReasons), reason);
  Number number;
  if (known != std::end(kReasons)) {
    number.bits = static_cast<uint64_t>(known - kReasons);
  } else if (!ParseNumber(reason, &number) || number.negative || !Fits(number, 4)) {
    return Fail("\"%.*s\" is no reason", PRINTED(reason));
  }
  lack.reason = static_cast<cache::Reason>(number.bits);
  if (!TakeWord("status") || !ReadUnsigned32("status", &lack.status) || !TakeWord("count")) {
    return Fail("a lack has a reason, a status and a count");
  }
  if (!ReadNumber("count", &number)) return false;
  lack.count = number.bits;
  return true;
}

// Reads how the file describes a node, in which it is right against the catalogue.
bool Reader::ReadNodeLine() {
  const std::string path(NextWord(false));
  if (path.empty() || !TakeWord("=")) return Fail("\"=\" is missing");
  if (AtEnd()) return Fail("a description is missing");
  while (line_.ends_with(' ')) line_.remove_suffix(1);
  Node &node = nodes_[path];
  if (node.model != nullptr) return Fail("%s is described twice", path.c_str());
  if (!ReadDescription(line_.data(), line_.size(), &node.description)) {
    return Fail("\"%.*s\" is no description of a node", PRINTED(line_));
  }
  node.path = path;
  node.model = model_->NodeOf(path);
  const NodeInfo *info = FindNodeByPath(path.data(), path.size());
  const std::string words(line_);
  // A hash is that of one catalogue: whoever has another one must look.
  if (!IsOurs(info, words)) model_->facts.catalogue = 0;
  node.model->description = words;
  return true;
}

// Reads a node that has `what`; `offer` is the member of its description that says so.
bool Reader::ReadNode(bool Description::*offer, const char *what, const Node **node) {
  const std::string_view path = NextWord(false);
  auto found = nodes_.find(path);
  if (found == nodes_.end()) {
    const NodeInfo *info = FindNodeByPath(path.data(), path.size());
    if (info == nullptr) return Fail("no node is named \"%.*s\"", PRINTED(path));
    found = nodes_.try_emplace(std::string(path)).first;
    found->second.path = path;
    found->second.model = model_->NodeOf(path);
    Describe(*info, &found->second.description);
  }
  *node = &found->second;
  if (offer != nullptr && !(found->second.description.*offer)) {
    return Fail("%s has no %s", found->second.path.c_str(), what);
  }
  return true;
}

bool Reader::ReadSelector(const Node &node, size_t wanted, Values *values) {
  values->clear();
  while (!TakeWord("=")) {
    if (AtEnd()) return Fail("\"=\" is missing");
    if (!ReadValue(&values->emplace_back())) return false;
  }
  if (values->size() == wanted) return true;
  return Fail("%s takes %zu parameter%s here, not %zu", node.path.c_str(), wanted,
              wanted == 1 ? "" : "s", values->size());
}

bool Reader::ReadValue(Value *value) {
  if (AtText()) {
    value->kind = cache::Kind::Text;
    return ReadPlainText(&value->text, "parameter");
  }
  const std::string_view word = NextWord(false);
  Number number;
  if (word == "null") {
    value->kind = cache::Kind::Null;
  } else if (ParseNumber(word, &number)) {
    value->integer = static_cast<int64_t>(number.bits);
  } else {
    return Fail("\"%.*s\" is no integer, text or null", PRINTED(word));
  }
  return true;
}

bool Reader::ReadList() {
  const Node *node;
  if (!ReadNode(&Description::hasLists, "instance lists", &node)) return false;
  if (!ReadSelector(*node, node->description.ListParameterCount(), &values_)) return false;
  KIF_Status status = 0;
  entries_.clear();
  if (TakeWord("status")) {
    if (!ReadUnsigned32("status", &status)) return false;
  } else {
    while (!AtEnd()) {
      if (!ReadValue(&entries_.emplace_back())) return false;
    }
  }
  const NodeInfo *known = FindNodeByPath(node->path.c_str(), node->path.size());
  if (known != nullptr && EntriesSelect(*known) && !StandOnce(entries_)) {
    return Fail("an entry of the list stands there twice");
  }
  model_->AddList(node->model, values_, status, entries_, lineNumber_);
  return true;
}

bool Reader::ReadRecord() {
  const Node *node;
  if (!ReadNode(&Description::hasRecords, "records", &node)) return false;
  if (!ReadSelector(*node, node->description.parameterCount, &values_)) return false;
  KIF_Status status = 0;
  bytes_.clear();
  if (TakeWord("status")) {
    if (!ReadUnsigned32("status", &status)) return false;
  } else {
    bytes_.assign(node->description.recordSize, '\0');
    while (!AtEnd()) {
      if (!ReadPart(*node, &bytes_)) return false;
    }
  }
  model_->AddRecord(node->model, values_, status, bytes_, lineNumber_);
  return true;
}

bool Reader::FindPartByOffset(std::string_view name, Part *part) {
  const size_t colon = name.find(':');
  Number offset;
  if (colon != name.npos && ParseNumber(name.substr(0, colon), &offset) && Fits(offset, 4) &&
      !offset.negative) {
    for (const TypeName &type : kTypeNames) {
      if (name.substr(colon + 1) != type.name) continue;
      *part = {static_cast<uint32_t>(offset.bits), type.size, type.type};
      return true;
    }
  }
  return Fail("\"@%.*s\" is not @OFFSET:TYPE with a TYPE of u8, u16, u32, u64, i32, text or hex",
              PRINTED(name));
}

bool Reader::FindPart(const Node &node, std::string_view name, Part *part) {
  if (name.starts_with('@')) return FindPartByOffset(name.substr(1), part);
  const NodeField *fields = node.description.fields;
  for (const NodeField *field = fields; field < fields + node.description.fieldCount; ++field) {
    if (name != field->name) continue;
    const PartType type = field->type == FieldType::kText     ? PartType::kText
                          : field->type == FieldType::kBytes  ? PartType::kHex
                          : field->type == FieldType::kSigned ? PartType::kSigned
                                                              : PartType::kUnsigned;
    *part = {field->offset, field->size, type};
    return true;
  }
  return Fail("%s has no field \"%.*s\"", node.path.c_str(), PRINTED(name));
}

bool Reader::ReadPartText(const Part &part, std::string_view name, std::string *bytes) {
  if (!ReadText(bytes)) return false;
  if (part.size == 0) return true;
  if (bytes->size() > part.size) {
    return Fail("the text of %.*s is longer than its %u bytes", PRINTED(name), part.size);
  }
  bytes->resize(part.size, '\0');
  return true;
}

bool Reader::ReadPartNumber(const Part &part, std::string_view name, std::string *bytes) {
  const std::string_view word = NextWord(false);
  Number number;
  if (!ParseNumber(word, &number)) {
    return Fail("\"%.*s\", the value of %.*s, is no number", PRINTED(word), PRINTED(name));
  }
  if (!Fits(number, part.size)) {
    return Fail("%.*s does not fit into the %u bytes of %.*s", PRINTED(word), part.size,
                PRINTED(name));
  }
  bytes->clear();
  for (uint32_t i = 0; i < part.size; ++i) {
    bytes->push_back(static_cast<char>(number.bits >> (8 * i)));
  }
  return true;
}

bool Reader::ReadPart(const Node &node, std::string *record) {
  std::string_view name = NextWord(true);
  if (!name.ends_with('=')) return Fail("\"%.*s\" is not NAME=VALUE", PRINTED(name));
  name.remove_suffix(1);
  Part part = {};
  std::string bytes;
  if (!FindPart(node, name, &part)) return false;
  if (part.type == PartType::kText) {
    if (!ReadPartText(part, name, &bytes)) return false;
  } else if (part.type == PartType::kHex) {
    const std::string_view digits = NextWord(false);
    if (!ParseHex(digits, &bytes)) {
      return Fail("\"%.*s\" are no pairs of hexadecimal digits", PRINTED(digits));
    }
  } else if (!ReadPartNumber(part, name, &bytes)) {
    return false;
  }
  if (part.offset > record->size() || bytes.size() > record->size() - part.offset) {
    return Fail("%.*s reaches beyond the %zu bytes of the record", PRINTED(name), record->size());
  }
  record->replace(part.offset, bytes.size(), bytes);
  return true;
}

bool Reader::ReadContentWord(ContentAnswer *content, bool *hasLength, bool *hasStatus) {
  if (TakeWord("length")) {
    *hasLength = true;
    return ReadUnsigned32("length", &content->total);
  }
  if (TakeWord("status")) {
    *hasStatus = true;
    return ReadUnsigned32("status", &content->readStatus);
  }
  if (*hasLength || *hasStatus) return Fail("pieces stand before length and status");
  std::string piece;
  if (AtText()) {
    if (!ReadText(&piece)) return false;
  } else {
    std::string_view word = NextWord(false);
    if (!word.starts_with("hex=") || !ParseHex(word.substr(4), &piece)) {
      return Fail("\"%.*s\" is no text, hex=DIGITS, length or status", PRINTED(word));
    }
  }
  content->bytes += piece;
  return content->bytes.size() <= kMostContent || Fail("a content is at most 64 MiB long");
}

bool Reader::ReadContent() {
  const Node *node;
  if (!ReadNode(&Description::hasContents, "content", &node)) return false;
  if (!ReadSelector(*node, node->description.parameterCount, &values_)) return false;
  ContentAnswer content;
  bool hasLength = false;
  bool hasStatus = false;
  while (!AtEnd()) {
    if (!ReadContentWord(&content, &hasLength, &hasStatus)) return false;
  }
  if (!hasLength) content.total = static_cast<uint32_t>(content.bytes.size());
  if (hasStatus && !hasLength && content.bytes.empty()) content.lengthStatus = content.readStatus;
  model_->AddContent(node->model, values_, content, lineNumber_);
  return true;
}

bool Reader::ReadSet() {
  const Node *node;
  if (!ReadNode(nullptr, "", &node)) return false;
  if (!node->description.settable) return Fail("%s cannot be written", node->path.c_str());
  NodeModel &model = *node->model;
  if (model.setLine != 0) return Fail("the same was given in line %u", model.setLine);
  model.setLine = lineNumber_;
  if (!TakeWord("=") || !TakeWord("status")) return Fail("\"= status S\" is missing");
  return ReadUnsigned32("status", &model.setStatus);
}

}  // namespace

bool ReadText(std::string_view text, const char *name, HostModel *model) {
  return Reader(text, name, model).Read();
}
