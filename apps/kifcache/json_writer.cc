#include "json_writer.h"

#include <cinttypes>

#include "base/utf8.h"
#include "encoding.h"
#include "record_parts.h"

namespace {

// JSON has no bytes: a text that is no UTF-8 is an object with its bytes in hexadecimal.
std::string Text(std::string_view text) {
  return IsUtf8(text.data(), text.size()) ? JsonString(text)
                                          : "{\"hex\":\"" + HexDigits(text) + "\"}";
}

std::string Array(const Values &values) {
  std::string array = "[";
  for (const Value &value : values) {
    if (array.size() > 1) array += ',';
    array += value.kind == cache::Kind::Integer ? std::to_string(value.integer)
             : value.kind == cache::Kind::Text  ? Text(value.text)
                                                : "null";
  }
  return array + "]";
}

// The object that holds the named parts, or the others.
std::string Object(const std::vector<RecordPart> &parts, bool named) {
  std::string object = "{";
  for (const RecordPart &part : parts) {
    if ((part.field != nullptr) != named) continue;
    if (object.size() > 1) object += ',';
    if (named) {
      const FieldType type = part.field->type;
      object += JsonString(part.field->name) + ":" +
                (type == FieldType::kText    ? Text(part.bytes)
                 : type == FieldType::kBytes ? JsonString(HexDigits(part.bytes))
                                             : Decimal(part));
    } else {
      object += "\"" + std::to_string(part.offset) + "\":\"" + HexDigits(part.bytes) + "\"";
    }
  }
  return object + "}";
}

}  // namespace

void JsonWriter::OnHost(const Facts &facts) {
  fputs("{\"kind\":\"host\"", stream_);
  for (const TextFact &fact : kTextFacts) {
    Write(std::string(",\"") + fact.name + "\":" + Text(facts.*fact.text));
  }
  fprintf(stream_, ",\"signature\":\"0x%016" PRIx64 "\",\"begin\":%" PRId64 ",\"end\":%" PRId64,
          facts.signature, facts.begin, facts.end);
  fputs(",\"omitted\":[", stream_);
  for (const std::string &text : facts.omitted) {
    Write((&text != &facts.omitted.front() ? "," : "") + Text(text));
  }
  fprintf(stream_, "],\"minorVersion\":%u,\"recorderCartel\":%" PRId64 ",\"moments\":[",
          facts.minorVersion, facts.recorderCartel);
  for (const Moments &of : facts.moments) {
    Write((&of != &facts.moments.front() ? ",{\"name\":" : "{\"name\":") + Text(of.name));
    fprintf(stream_,
            ",\"begin\":%" PRId64 ",\"end\":%" PRId64 ",\"beginSinceBoot\":%" PRId64
            ",\"endSinceBoot\":%" PRId64 "}",
            of.begin, of.end, of.beginSinceBoot, of.endSinceBoot);
  }
  fputs("],\"lacks\":[", stream_);
  for (const Lack &lack : facts.lacks) {
    Write((&lack != &facts.lacks.front() ? ",{\"what\":" : "{\"what\":") + Text(lack.what) +
          ",\"reason\":" + JsonString(ReasonText(lack.reason)));
    fprintf(stream_, ",\"status\":%u,\"count\":%" PRIu64 "}", lack.status, lack.count);
  }
  fputs("]}\n", stream_);
}

void JsonWriter::Begin(const char *kind, const VisitedNode &node, const char *selectorName,
                       const Values &selector) {
  Write(std::string("{\"kind\":\"") + kind + "\",\"node\":" + Text(node.path) + ",\"" +
        selectorName + "\":" + Array(selector));
}

void JsonWriter::OnList(const VisitedNode &node, const Values &parent, KIF_Status status,
                        const Values &entries) {
  Begin("list", node, "parent", parent);
  fprintf(stream_, ",\"status\":%u", status);
  if (status == 0) Write(",\"entries\":" + Array(entries));
  fputs("}\n", stream_);
}

void JsonWriter::OnRecord(const VisitedNode &node, const Values &instance, KIF_Status status,
                          std::string_view record) {
  Begin("record", node, "instance", instance);
  fprintf(stream_, ",\"status\":%u", status);
  if (status == 0) {
    const auto parts = PartsOf(node.description, record);
    Write(",\"fields\":" + Object(parts, true) + ",\"bytes\":" + Object(parts, false));
  }
  fputs("}\n", stream_);
}

void JsonWriter::OnContent(const VisitedNode &node, const Values &instance,
                           const cache::Stored &answer, std::string_view bytes) {
  Begin("content", node, "instance", instance);
  fprintf(stream_,
          ",\"lengthStatus\":%u,\"readStatus\":%u,\"length\":%u,\"text\":", answer.length_status(),
          answer.read_status(), answer.total());
  Write(Text(bytes) + "}\n");
}

void JsonWriter::OnSet(const VisitedNode &node, KIF_Status status) {
  Begin("set", node, "instance", {});
  fprintf(stream_, ",\"status\":%u}\n", status);
}
