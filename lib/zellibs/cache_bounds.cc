#include "cache_bounds.h"

#include <cstring>

#include "cache_answers.h"

namespace {

constexpr uint64_t kMiB = 1 << 20;

// A file of N bytes has at most so many answers, however its nodes share them.
bool CountAnswers(const CacheFile &file, uint64_t *answers) {
  uint64_t bytes = 0;
  NodeAnswers of;
  for (uint32_t i = 0; AnswersAt(file, i, &of); ++i) {
    *answers += uint64_t{of.lists.count} + of.records.count + of.contents.count;
    bytes += of.lists.count * uint64_t{sizeof(cache::List)} +
             of.records.count * uint64_t{sizeof(cache::Record)} +
             of.contents.count * uint64_t{sizeof(cache::Stored)};
  }
  return bytes <= file.size;
}

// Takes the entries of a list off what is left of both bounds.
bool Spend(const CacheFile &file, const cache::List &list, uint64_t *entries, uint64_t *text) {
  if (!HasParameters(file, list.first(), list.count()) || list.count() > *entries) return false;
  *entries -= list.count();
  const cache::Parameter *entry = file.parameters + list.first();
  for (uint32_t i = 0; i < list.count(); ++i) {
    if (entry[i].kind() != cache::Kind::Text) continue;
    const uint64_t length = entry[i].length();
    if (length > *text) return false;
    *text -= length;
  }
  return true;
}

}  // namespace

bool ListsAreWithinBounds(const CacheFile &file) {
  constexpr uint64_t kMoreEntries = 1000;
  uint64_t answers = 0;
  if (!CountAnswers(file, &answers)) return false;
  uint64_t entries = answers + file.parameterCount + kMoreEntries;
  uint64_t text = 16 * kMiB + uint64_t{16} * file.size;
  NodeAnswers of;
  for (uint32_t i = 0; AnswersAt(file, i, &of); ++i) {
    for (uint32_t k = 0; k < of.lists.count; ++k) {
      if (!Spend(file, of.lists.At(k), &entries, &text)) return false;
    }
  }
  return true;
}

bool RecordsAreWithinBounds(const CacheFile &file, uint64_t count, uint32_t size) {
  return count * size <= 64 * kMiB + uint64_t{64} * file.size;
}

bool EntriesSelect(const NodeInfo &node) {
  const size_t length = strlen(node.path);
  for (const NodeInfo &other : kNodes) {
    const bool isBelow = strncmp(other.path, node.path, length) == 0;
    // Where the places in a list select the records, what stands there may be anything.
    const bool byEntry = other.instances != Instances::kOwnListIndex;
    const bool answers = &other != &node || ((other.hasRecords || other.hasContents) && byEntry);
    if (isBelow && answers && other.parameterCount >= node.parameterCount) return true;
  }
  return false;
}
