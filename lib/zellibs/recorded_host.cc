// The recorded host: the answers of a cache file.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "base/array.h"
#include "cache_answers.h"
#include "cache_bounds.h"
#include "cache_file.h"
#include "host.h"
#include "param_list.h"
#include "records/platform.h"
#include "status.h"

namespace {

CacheFile recording;

// Whether the lists of the file are within bounds; known since the first of them was asked for.
enum class Bounds : uint8_t { kUnknown, kKept, kBroken };
Bounds bounds;

// The answers of a node, looked up in the file when the node is first asked for.
struct Answers {
  bool lookedUp;
  NodeAnswers all;
  // A tool that walks a list reads the records in their order: where the last look-up ended, the
  // next one is tried first.
  uint32_t recordHint;
  uint32_t listHint;
  bool tooManyRecords;
};
Answers answersByNode[kNodeCount];

Answers *AnswersOf(const NodeInfo &node) {
  Answers *answers = &answersByNode[IndexOf(node)];
  if (!answers->lookedUp) {
    (void)FindAnswers(recording, node.path, &answers->all);
    answers->lookedUp = true;
    answers->tooManyRecords =
        !RecordsAreWithinBounds(recording, answers->all.records.count, node.recordSize);
  }
  return answers;
}

// How a recorded parameter and a given one compare; false where the recorded one is broken.
bool Compare(const cache::Parameter &recorded, const Param &given, int *order) {
  const bool isText = given.type == KIF_PARAM_STRING;
  const auto kind = !isText                 ? cache::Kind::Integer
                    : given.text != nullptr ? cache::Kind::Text
                                            : cache::Kind::Null;
  if (recorded.kind() != kind) {
    *order = recorded.kind() < kind ? -1 : 1;
  } else if (kind == cache::Kind::Integer) {
    *order = recorded.value() < given.integer ? -1 : recorded.value() > given.integer ? 1 : 0;
  } else if (kind == cache::Kind::Text) {
    const char *text = ParameterText(recording, recorded);
    if (text == nullptr) return false;
    // The zero byte behind it may have gone since.
    const size_t length = recorded.length();
    const size_t givenLength = strlen(given.text);
    *order = memcmp(text, given.text, length < givenLength ? length : givenLength);
    if (*order == 0 && length != givenLength) *order = length < givenLength ? -1 : 1;
  } else {
    *order = 0;
  }
  return true;
}

bool Compare(const cache::Selector &selector, const KIF_ParamList *given, int *order) {
  if (!HasParameters(recording, selector.first(), selector.count())) return false;
  const cache::Parameter *recorded = recording.parameters + selector.first();
  const uint32_t count = CountOf(given);
  *order = 0;
  for (uint32_t i = 0; *order == 0 && i < selector.count() && i < count; ++i) {
    if (!Compare(CopyOf<cache::Parameter>(recorded + i), given->params[i], order)) return false;
  }
  if (*order == 0 && selector.count() != count) *order = selector.count() < count ? -1 : 1;
  return true;
}

// Finds the answer for `given` in `answers` (null: there are none). `*hint` is the place to try
// first, and then the place after the answer.
template <typename Answer>
KIF_Status Find(const Answered<Answer> &answers, const KIF_ParamList *given, uint32_t *hint,
                Answer *found) {
  uint32_t low = 0;
  uint32_t high = answers.count;
  uint32_t middle = *hint < high ? *hint : high / 2;
  while (low < high) {
    const Answer answer = answers.At(middle);
    int order;
    if (!Compare(answer.selector(), given, &order)) return KIF_STATUS_DAMAGED_CACHE_FILE;
    if (order == 0) {
      *hint = middle + 1;
      *found = answer;
      return KIF_STATUS_OK;
    }
    if (order < 0) {
      low = middle + 1;
    } else {
      high = middle;
    }
    middle = low + (high - low) / 2;
  }
  *hint = low;
  return KIF_STATUS_NOT_FOUND;
}

// The table of interrupts has a cell for each of them and each processor.
bool FitsInterrupts(uint32_t cpus) {
  constexpr uint64_t kMostEmptyCells = 1000000;
  const auto &lists = AnswersOf(kNodes[kNode_hardware_interrupts_cookieList])->all.lists;
  const auto &cells = AnswersOf(kNodes[kNode_hardware_interrupts_cookieList_PCPU])->all.records;
  uint64_t interrupts = 0;
  for (uint32_t i = 0; i < lists.count; ++i) interrupts += lists.At(i).count();
  return interrupts * cpus <= kMostEmptyCells + 16 * uint64_t{cells.count};
}

// Whether a record that says how many processors there are can be followed.
bool IsCredible(const NodeInfo &node, const void *record) {
  if (IndexOf(node) == kNode_hardware_cpu_cpuInfo) {
    const uint32_t cpus = static_cast<const CpuInfo *>(record)->numPcpus;
    return cpus <= kMostCpus && FitsInterrupts(cpus);
  }
  return true;
}

KIF_Status GetRecord(const NodeInfo &node, const KIF_ParamList *instance, void *record) {
  Answers *answers = AnswersOf(node);
  if (answers->tooManyRecords) return KIF_STATUS_DAMAGED_CACHE_FILE;
  cache::Record answer;
  const KIF_Status status = Find(answers->all.records, instance, &answers->recordHint, &answer);
  if (status != KIF_STATUS_OK) return status;
  if (answer.status() != KIF_STATUS_OK) return answer.status();
  // Beyond the tools a record may have grown since.
  uint32_t length = answer.length();
  if (length > node.recordSize && !node.hasVariable) length = node.recordSize;
  if (length > node.recordSize || !HasBytes(recording, answer.place(), answer.length())) {
    return KIF_STATUS_DAMAGED_CACHE_FILE;
  }
  if (length > 0) memcpy(record, recording.bytes + answer.place(), length);
  return IsCredible(node, record) ? KIF_STATUS_OK : KIF_STATUS_DAMAGED_CACHE_FILE;
}

// The zero byte behind it may have gone since.
KIF_Status AddCopy(KIF_ParamList *list, const char *text, size_t length) {
  char *copy = strndup(text, length);
  if (copy == nullptr) return KIF_STATUS_NO_MEMORY;
  const KIF_Status status = KIF_ParamListAddString(list, copy);
  free(copy);
  return status;
}

KIF_Status Append(const cache::Parameter &entry, KIF_ParamList *list) {
  switch (entry.kind()) {
    case cache::Kind::Integer:
      return KIF_ParamListAddInt(list, entry.value());
    case cache::Kind::Null:
      return KIF_ParamListAddString(list, nullptr);
    case cache::Kind::Text: {
      const char *text = ParameterText(recording, entry);
      if (text == nullptr) return KIF_STATUS_DAMAGED_CACHE_FILE;
      return AddCopy(list, text, entry.length());
    }
  }
  return KIF_STATUS_DAMAGED_CACHE_FILE;
}

int Compare(const Param &a, const Param &b) {
  if (a.type != b.type) return a.type < b.type ? -1 : 1;
  if (a.type != KIF_PARAM_STRING) return a.integer < b.integer ? -1 : a.integer > b.integer ? 1 : 0;
  if (a.text == nullptr || b.text == nullptr) return (a.text != nullptr) - (b.text != nullptr);
  return strcmp(a.text, b.text);
}

// Lists are ascending, mostly.
KIF_Status CheckEntriesStandOnce(const NodeInfo &node, const KIF_ParamList &list) {
  uint32_t ascending = 1;
  while (ascending < list.count &&
         Compare(list.params[ascending - 1], list.params[ascending]) < 0) {
    ++ascending;
  }
  if (ascending >= list.count || !EntriesSelect(node)) return KIF_STATUS_OK;
  Array<const Param *> sorted;
  if (!sorted.Reserve(list.count)) return KIF_STATUS_NO_MEMORY;
  for (uint32_t i = 0; i < list.count; ++i) sorted.Append(&list.params[i]);
  std::sort(sorted.begin(), sorted.end(),
            [](const Param *a, const Param *b) { return Compare(*a, *b) < 0; });
  for (uint32_t i = 1; i < list.count; ++i) {
    if (Compare(*sorted[i - 1], *sorted[i]) == 0) return KIF_STATUS_DAMAGED_CACHE_FILE;
  }
  return KIF_STATUS_OK;
}

KIF_Status GetInstances(const NodeInfo &node, const KIF_ParamList *parent, KIF_ParamList *list) {
  Answers *answers = AnswersOf(node);
  cache::List answer;
  KIF_Status status = Find(answers->all.lists, parent, &answers->listHint, &answer);
  if (status != KIF_STATUS_OK) return status;
  if (answer.status() != KIF_STATUS_OK) return answer.status();
  if (bounds == Bounds::kUnknown) {
    bounds = ListsAreWithinBounds(recording) ? Bounds::kKept : Bounds::kBroken;
  }
  if (bounds == Bounds::kBroken || !HasParameters(recording, answer.first(), answer.count())) {
    return KIF_STATUS_DAMAGED_CACHE_FILE;
  }
  if (!ReserveParams(list, answer.count())) return KIF_STATUS_NO_MEMORY;
  for (uint32_t i = 0; status == KIF_STATUS_OK && i < answer.count(); ++i) {
    status = Append(CopyOf<cache::Parameter>(recording.parameters + answer.first() + i), list);
  }
  return status == KIF_STATUS_OK ? CheckEntriesStandOnce(node, *list) : status;
}

KIF_Status FindContent(const NodeInfo &node, const KIF_ParamList *instance, cache::Stored *answer) {
  uint32_t hint = 0;
  const KIF_Status status = Find(AnswersOf(node)->all.contents, instance, &hint, answer);
  if (status == KIF_STATUS_OK && !HasBytes(recording, answer->place(), answer->length())) {
    return KIF_STATUS_DAMAGED_CACHE_FILE;
  }
  return status;
}

KIF_Status GetContentLength(const NodeInfo &node, const KIF_ParamList *instance, uint32_t *length) {
  cache::Stored answer;
  const KIF_Status status = FindContent(node, instance, &answer);
  if (status != KIF_STATUS_OK) return status;
  if (answer.length_status() != KIF_STATUS_OK) return answer.length_status();
  *length = answer.total();
  return KIF_STATUS_OK;
}

KIF_Status GetContent(const NodeInfo &node, const KIF_ParamList *instance, uint32_t offset,
                      uint32_t wanted, void *bytes, uint32_t *given) {
  cache::Stored answer;
  const KIF_Status status = FindContent(node, instance, &answer);
  if (status != KIF_STATUS_OK) return status;
  if (answer.read_status() != KIF_STATUS_OK) return answer.read_status();
  const uint32_t rest = offset < answer.length() ? answer.length() - offset : 0;
  *given = wanted < rest ? wanted : rest;
  if (*given > 0) memcpy(bytes, recording.bytes + answer.place() + offset, *given);
  return KIF_STATUS_OK;
}

// A write is answered as recorded and forgotten.
KIF_Status Set(const NodeInfo &node, const KIF_ParamList *instance, const KIF_ParamList *input) {
  (void)instance;
  (void)input;
  return AnswersOf(node)->all.setStatus;
}

KIF_Status CheckSignature(char *date, bool *matches) {
  const cache::Recording *facts = recording.content->recording();
  strncpy(date, TextOrEmpty(facts->kernel_build_date()), sizeof(kInterfaceDate) - 1);
  date[sizeof(kInterfaceDate) - 1] = '\0';
  *matches = HasSameCatalogue(recording) || FitsCatalogue(recording, nullptr, nullptr);
  return KIF_STATUS_OK;
}

constexpr Host kRecordedHost = {GetRecord,  GetInstances, GetContentLength,
                                GetContent, Set,          CheckSignature};

}  // namespace

KIF_Status OpenRecordedHost(const char *path, const Host **host) {
  CacheFile opened;
  const KIF_Status status = OpenCacheFile(path, &opened);
  if (status != KIF_STATUS_OK) return status;
  CloseCacheFile(&recording);
  recording = opened;
  memset(answersByNode, 0, sizeof(answersByNode));
  bounds = Bounds::kUnknown;
  *host = &kRecordedHost;
  return KIF_STATUS_OK;
}
