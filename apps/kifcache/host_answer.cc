#include "host_answer.h"

#include <stdio.h>
#include <stdlib.h>

#include <algorithm>

#include "status.h"

namespace {

constexpr uint32_t kMostContent = uint32_t{64} << 20;
constexpr uint32_t kChunk = 3 << 20;  // of a content that is asked for at once

// The numbers behind the nodes are the library's; those beyond the tools have no variable.
const KIF_NodeId *const kNodeIds[kNodeCount] = {
#define NODE(path, ...) &KIF_NODE_##path,
#define BEYOND(...) nullptr,
#include "nodes.def"
};

uint32_t NumberOf(NodeIndex node) {
  return kNodeIds[node] != nullptr ? *kNodeIds[node] : node + 1u;
}

[[noreturn]] void OutOfMemory() {
  fputs("kifcache: out of memory\n", stderr);
  exit(1);
}

// The selecting list of `values`.
ParamListHandle ListOf(const Values &values) {
  ParamListHandle list = CreateInstance();
  if (list == nullptr) OutOfMemory();
  for (const Value &value : values) {
    const KIF_Status status =
        value.kind == cache::Kind::Integer
            ? KIF_ParamListAddInt(list.get(), value.integer)
            : KIF_ParamListAddString(
                  list.get(), value.kind == cache::Kind::Text ? value.text.c_str() : nullptr);
    if (status != 0) OutOfMemory();
  }
  return list;
}

void AskForList(const NodeInfo &node, KIF_ParamList *selector, HostAnswer *answer) {
  KIF_ParamList *fetched = nullptr;
  answer->status = KIF_GetInstanceListAlloc(NumberOf(IndexOf(node)), selector, &fetched);
  if (answer->status == 0 && fetched == nullptr) answer->status = KIF_STATUS_FAILURE;
  const ParamListHandle list(answer->status == 0 ? fetched : nullptr);
  const int32_t count = answer->status == 0 ? KIF_ParamListUsedCount(list.get()) : 0;
  for (int32_t i = 0; i < count; ++i) {
    KIF_Param *param = KIF_ParamListGetParam(list.get(), static_cast<uint32_t>(i));
    if (param != nullptr && param->type == KIF_PARAM_INTEGER) {
      answer->entries.push_back(IntegerValue(KIF_ParamGetInt(param)));
    } else if (param != nullptr && param->type == KIF_PARAM_STRING) {
      answer->entries.push_back(TextValue(KIF_ParamGetString(param)));
    } else {
      ++answer->omitted;
    }
  }
}

void AskForRecord(const NodeInfo &node, KIF_ParamList *selector, HostAnswer *answer) {
  answer->record.assign(node.recordSize, '\0');
  answer->status =
      KIF_Get(NumberOf(IndexOf(node)), selector, answer->record.data(), node.recordSize);
  if (answer->status != 0) answer->record.clear();
}

// Reads the content in chunks into `*bytes`. The result is that of the first chunk that fails.
KIF_Status ReadContent(uint32_t node, KIF_ParamList *selector, uint32_t total, std::string *bytes) {
  const uint32_t wanted = std::min(total, kChunk);
  while (bytes->size() < total) {
    const uint32_t request[] = {static_cast<uint32_t>(bytes->size()), wanted};
    const DataHandle input(KIFData_Create(sizeof(request), request, sizeof(request)));
    const DataHandle output(KIFData_Create(wanted + 1, nullptr, 0));
    if (input == nullptr || output == nullptr) OutOfMemory();
    const KIF_Status status = KIF_SetData(node, selector, input.get(), output.get());
    if (status != 0) return status;
    const uint32_t given = std::min(output->length, wanted);
    if (given == 0) break;
    const void *read = KIFData_GetData(output.get());
    if (read == nullptr) OutOfMemory();
    bytes->append(static_cast<const char *>(read), given);
  }
  return 0;
}

void AskForContent(const NodeInfo &node, KIF_ParamList *selector, HostAnswer *answer) {
  const uint32_t id = NumberOf(IndexOf(node));
  ContentAnswer &content = answer->content;
  content.lengthStatus = KIF_GetDataLength(id, selector, &content.total);
  if (content.lengthStatus != 0) {
    content.readStatus = content.lengthStatus;
    content.total = 0;
  } else if (content.total > kMostContent) {
    content.readStatus = KIF_STATUS_TOO_LARGE;
    ++answer->omitted;
  } else {
    content.readStatus = ReadContent(id, selector, content.total, &content.bytes);
    if (content.readStatus != 0) content.bytes.clear();
  }
  answer->status = content.readStatus;
}

}  // namespace

// A library of ours answers this number with its own catalogue's hash.
bool Asker::HasOurCatalogue() {
  uint64_t hash = 0;
  return KIF_Get(kCatalogueNumber, nullptr, &hash, sizeof(hash)) == 0 && hash == CatalogueHash();
}

KIF_ParamList *Asker::Select(const Values &instance) {
  if (selector_ == nullptr || selected_ != instance) {
    selector_ = ListOf(instance);
    selected_ = instance;
  }
  return selector_.get();
}

void Asker::Ask(const Question &question, HostAnswer *answer) {
  const NodeInfo &node = kNodes[question.node];
  answer->entries.clear();
  answer->record.clear();
  answer->content = {};
  answer->omitted = 0;
  if (question.kind == AnswerKind::kList) {
    return AskForList(node, Select(question.instance), answer);
  }
  KIF_ParamList *selector = question.instance.empty() ? nullptr : Select(question.instance);
  if (question.kind == AnswerKind::kRecord) return AskForRecord(node, selector, answer);
  AskForContent(node, selector, answer);
}

// A world that no host has is refused or not found; any other answer says what is wrong with the
// host itself.
KIF_Status StatusOfHost() {
  const ParamListHandle nobody = ListOf({IntegerValue(-1), IntegerValue(-1)});
  const uint32_t size = kNodes[kNode_world_info].recordSize;
  std::string record(size, '\0');
  const KIF_Status status = KIF_Get(KIF_NODE_world_info, nobody.get(), record.data(), size);
  const bool isAnswer = status == KIF_STATUS_NOT_FOUND || status == KIF_STATUS_BAD_PARAMETER;
  return isAnswer || HostType_OSIsZLK() ? KIF_STATUS_OK : status;
}
