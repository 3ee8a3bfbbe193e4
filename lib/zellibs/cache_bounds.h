// What a cache file may ask of its readers. Its lists and records may share their bytes, and every
// level of a host may name the same list: without bounds a file of a kilobyte is a host without
// end. Each rule holds for every sound recording, and is a sentence in docs/reliability.md.
#pragma once

#include "cache_file.h"

// More processors than any machine has.
constexpr uint32_t kMostCpus = 65536;

// Whether the entries of all lists together are at most the file's answers, its parameters and
// 1,000, and their texts 16 MiB and 16 times the file. Visits every list and its entries.
bool ListsAreWithinBounds(const CacheFile &file);

// Whether `count` records of `size` bytes take, at this full size, at most 64 MiB and 64 times the
// file.
bool RecordsAreWithinBounds(const CacheFile &file, uint64_t count, uint32_t size);

// Whether the entries of the node's lists select anything: another answer, or one of its own. Such
// an entry stands once in a list.
bool EntriesSelect(const NodeInfo &node);
