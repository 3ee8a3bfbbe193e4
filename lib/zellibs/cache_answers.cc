#include "cache_answers.h"

namespace {

// The fields in the order of the schema.
enum ContentField : uint32_t { kRecording, kNodes };
enum NodeField : uint32_t { kPath, kLists, kRecords, kContents, kSetStatus };

// Places count from the first byte of the mapped file.
template <typename Number>
bool Read(const CacheFile &file, uint64_t place, Number *number) {
  if (place > file.size || sizeof(Number) > file.size - place) return false;
  memcpy(number, file.map + place, sizeof(Number));
  asm volatile("" : : "r"(number) : "memory");
  return true;
}

// The place of a table's field; false where it is not there.
bool FindField(const CacheFile &file, uint64_t table, uint32_t field, uint64_t *place) {
  int32_t back;
  uint16_t size;
  uint16_t offset;
  if (!Read(file, table, &back)) return false;
  const uint64_t fields = table - static_cast<uint64_t>(int64_t{back});
  const uint32_t entry = 4 + 2 * field;
  if (!Read(file, fields, &size) || entry + 2 > size) return false;
  if (!Read(file, fields + entry, &offset) || offset == 0) return false;
  *place = table + offset;
  return true;
}

// The place that the offset at `place` tells.
bool Follow(const CacheFile &file, uint64_t place, uint64_t *target) {
  uint32_t offset;
  if (!Read(file, place, &offset)) return false;
  *target = place + offset;
  return true;
}

bool FindVector(const CacheFile &file, uint64_t table, uint32_t field, size_t itemSize,
                uint64_t *first, uint32_t *count) {
  uint64_t place;
  if (!FindField(file, table, field, &place) || !Follow(file, place, &place)) return false;
  if (!Read(file, place, count)) return false;
  *first = place + sizeof(*count);
  return uint64_t{*count} * itemSize <= file.size - *first;
}

bool FindNodes(const CacheFile &file, uint64_t *first, uint32_t *count) {
  const auto content = static_cast<uint64_t>(file.contentStart - file.map);
  uint64_t table;
  return Follow(file, content, &table) &&
         FindVector(file, table, kNodes, sizeof(uint32_t), first, count);
}

template <typename Answer>
void Find(const CacheFile &file, uint64_t node, uint32_t field, Answered<Answer> *answers) {
  uint64_t first;
  uint32_t count;
  *answers = {};
  if (!FindVector(file, node, field, sizeof(Answer), &first, &count)) return;
  *answers = {file.map + first, count};
}

// How the path of a node compares with `path`.
bool ComparePath(const CacheFile &file, uint64_t node, const char *path, int *order) {
  uint64_t first;
  uint32_t length;
  if (!FindVector(file, node, kPath, 1, &first, &length)) return false;
  const size_t wanted = strlen(path);
  const size_t shorter = length < wanted ? length : wanted;
  *order = memcmp(file.map + first, path, shorter);
  if (*order == 0 && length != wanted) *order = length < wanted ? -1 : 1;
  return true;
}

void ReadAnswers(const CacheFile &file, uint64_t node, NodeAnswers *answers) {
  Find(file, node, kLists, &answers->lists);
  Find(file, node, kRecords, &answers->records);
  Find(file, node, kContents, &answers->contents);
  uint64_t place;
  answers->setStatus = 0;
  if (FindField(file, node, kSetStatus, &place)) (void)Read(file, place, &answers->setStatus);
}

}  // namespace

uint32_t CountOfNodes(const CacheFile &file) {
  uint64_t first;
  uint32_t count;
  return FindNodes(file, &first, &count) ? count : 0;
}

bool AnswersAt(const CacheFile &file, uint32_t place, NodeAnswers *answers) {
  uint64_t first;
  uint32_t count;
  uint64_t node;
  if (!FindNodes(file, &first, &count) || place >= count) return false;
  if (!Follow(file, first + uint64_t{place} * sizeof(uint32_t), &node)) return false;
  ReadAnswers(file, node, answers);
  return true;
}

bool FindAnswers(const CacheFile &file, const char *path, NodeAnswers *answers) {
  uint64_t first;
  uint32_t high;
  if (!FindNodes(file, &first, &high)) return false;
  for (uint32_t low = 0; low < high;) {
    const uint32_t middle = low + (high - low) / 2;
    uint64_t node;
    int order;
    if (!Follow(file, first + uint64_t{middle} * sizeof(uint32_t), &node)) return false;
    if (!ComparePath(file, node, path, &order)) return false;
    if (order == 0) {
      ReadAnswers(file, node, answers);
      return true;
    }
    if (order < 0) {
      low = middle + 1;
    } else {
      high = middle;
    }
  }
  return false;
}
