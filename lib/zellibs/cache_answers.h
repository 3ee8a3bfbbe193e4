// The answers of a cache file that may be rewritten while it is read: what was verified at opening
// need not hold any more. Every value is read once, and the copy is checked and used.
#pragma once

#include <cstring>

#include "cache_file.h"

// A copy of a struct of the mapped file. The compiler may not look at the file again.
template <typename Struct>
Struct CopyOf(const void *place) {
  Struct copy;
  memcpy(&copy, place, sizeof(copy));
  asm volatile("" : : "r"(&copy) : "memory");
  return copy;
}

// Answers of one kind: `count` structs that lie within the file, aligned or not.
template <typename Answer>
struct Answered {
  const uint8_t *first;
  uint32_t count;

  Answer At(uint32_t place) const { return CopyOf<Answer>(first + place * sizeof(Answer)); }
};

struct NodeAnswers {
  Answered<cache::List> lists;
  Answered<cache::Record> records;
  Answered<cache::Stored> contents;
  uint32_t setStatus;
};

uint32_t CountOfNodes(const CacheFile &file);

// The answers of the file's node number `place`; false where they do not lie within the file.
bool AnswersAt(const CacheFile &file, uint32_t place, NodeAnswers *answers);

// Those of the node `path`; false where the file has none.
bool FindAnswers(const CacheFile &file, const char *path, NodeAnswers *answers);
