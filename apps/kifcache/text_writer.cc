#include "text_writer.h"

#include <cinttypes>
#include <cstring>

#include "description_text.h"
#include "encoding.h"
#include "record_parts.h"

namespace {

constexpr size_t kPieceSize = 4096;  // a longer content is written in pieces

std::string Written(const Value &value) {
  switch (value.kind) {
    case cache::Kind::Integer:
      return std::to_string(value.integer);
    case cache::Kind::Text:
      return Quoted(value.text);
    case cache::Kind::Null:
      break;
  }
  return "null";
}

std::string Written(const RecordPart &part) {
  if (part.field == nullptr) {
    return "@" + std::to_string(part.offset) + ":hex=" + HexDigits(part.bytes);
  }
  const std::string value = part.field->type == FieldType::kText    ? Quoted(part.bytes)
                            : part.field->type == FieldType::kBytes ? HexDigits(part.bytes)
                                                                    : Decimal(part);
  return std::string(part.field->name) + "=" + value;
}

}  // namespace

void TextWriter::OnHost(const Facts &facts) {
  for (const TextFact &fact : kTextFacts) {
    const std::string &text = facts.*fact.text;
    if (!text.empty()) Write(std::string("host ") + fact.name + " " + Quoted(text) + "\n");
  }
  fprintf(stream_, "host signature 0x%016" PRIx64 "\n", facts.signature);
  if (facts.begin != 0) fprintf(stream_, "host begin %" PRId64 "\n", facts.begin);
  if (facts.end != 0) fprintf(stream_, "host end %" PRId64 "\n", facts.end);
  for (const std::string &text : facts.omitted) Write("host omitted " + Quoted(text) + "\n");
  if (facts.minorVersion < kCacheMinorVersion) {
    fprintf(stream_, "host minorVersion %u\n", facts.minorVersion);
    return;
  }
  if (facts.catalogue != CatalogueHash()) {
    fprintf(stream_, "host catalogue 0x%016" PRIx64 "\n", facts.catalogue);
  }
  if (facts.recorderCartel != 0) {
    fprintf(stream_, "host recorderCartel %" PRId64 "\n", facts.recorderCartel);
  }
  for (const Moments &of : facts.moments) {
    Write("host moments " + Quoted(of.name));
    for (const int64_t moment : {of.begin, of.end, of.beginSinceBoot, of.endSinceBoot}) {
      fprintf(stream_, " %" PRId64, moment);
    }
    fputc('\n', stream_);
  }
  for (const Lack &lack : facts.lacks) {
    Write("host lack " + Quoted(lack.what) + " " + ReasonText(lack.reason));
    fprintf(stream_, " status 0x%x count %" PRIu64 "\n", lack.status, lack.count);
  }
}

// A node that this kifcache knows, and knows so, needs no words.
void TextWriter::OnNode(const VisitedNode &node) {
  const std::string words(node.words);
  if (words.empty() || IsOurs(FindNodeByPath(node.path, strlen(node.path)), words)) return;
  Write(std::string("node ") + node.path + " = " + words + "\n");
}

void TextWriter::Begin(const char *kind, const VisitedNode &node, const Values &selector) {
  fprintf(stream_, "%s %s", kind, node.path);
  for (const Value &value : selector) Write(" " + Written(value));
  fputs(" =", stream_);
}

void TextWriter::OnList(const VisitedNode &node, const Values &parent, KIF_Status status,
                        const Values &entries) {
  Begin("list", node, parent);
  if (status != 0) fprintf(stream_, " status 0x%x", status);
  for (const Value &entry : entries) Write(" " + Written(entry));
  fputc('\n', stream_);
}

void TextWriter::OnRecord(const VisitedNode &node, const Values &instance, KIF_Status status,
                          std::string_view record) {
  Begin("record", node, instance);
  if (status != 0) fprintf(stream_, " status 0x%x", status);
  for (const RecordPart &part : PartsOf(node.description, record)) {
    if (part.bytes.find_first_not_of('\0') != part.bytes.npos) Write(" " + Written(part));
  }
  fputc('\n', stream_);
}

void TextWriter::OnContent(const VisitedNode &node, const Values &instance,
                           const cache::Stored &answer, std::string_view bytes) {
  Begin("content", node, instance);
  for (; !bytes.empty(); bytes.remove_prefix(std::min(bytes.size(), kPieceSize))) {
    Write(" " + Quoted(bytes.substr(0, kPieceSize)));
  }
  const bool isReadable = answer.length_status() == 0;
  if (isReadable && (answer.total() != answer.length() || answer.read_status() != 0)) {
    fprintf(stream_, " length %u", answer.total());
  }
  if (answer.read_status() != 0) fprintf(stream_, " status 0x%x", answer.read_status());
  fputc('\n', stream_);
}

void TextWriter::OnSet(const VisitedNode &node, KIF_Status status) {
  fprintf(stream_, "set %s = status 0x%x\n", node.path, status);
}
