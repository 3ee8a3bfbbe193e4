// Reading a cache file: see docs/cache-format.md. The file comes from another machine and is
// not trusted: opening verifies its structure, and every place and length in it is checked when it
// is used.
#pragma once

#include <cstddef>
#include <cstdint>

#include "cache_generated.h"
#include "description.h"
#include "file_bytes.h"
#include "nodes.h"
#include "zellibs.h"

constexpr uint16_t kCacheMajorVersion = 1;
constexpr uint16_t kCacheMinorVersion = 1;

// An open cache file; all zero: none. Everything points into the mapped file.
struct CacheFile {
  const uint8_t *map;
  size_t size;
  const cache::File *header;
  const uint8_t *contentStart;
  const cache::Content *content;
  const cache::Parameter *parameters;
  uint32_t parameterCount;
  const uint8_t *bytes;
  uint32_t byteCount;
};

// Opens the cache file at `path`, or on standard input under that one's name (file_bytes.h). The
// status tells apart: no such file, no permission, not a cache file (nor any other kind of file),
// compressed, damaged, and of another major version. `*file` is written only when it is
// KIF_STATUS_OK; CloseCacheFile releases it.
KIF_Status OpenCacheFile(const char *path, CacheFile *file);

// As above, of bytes that are there already; they are the file's when the status is KIF_STATUS_OK.
KIF_Status OpenCacheBytes(const FileBytes &bytes, CacheFile *file);
void CloseCacheFile(CacheFile *file);

// Whether a run of parameters or bytes lies within the file.
bool HasParameters(const CacheFile &file, uint32_t first, uint32_t count);
bool HasBytes(const CacheFile &file, uint32_t place, uint32_t length);

// The zero-ended text of a parameter of kind Text; null where it does not lie within the file.
const char *ParameterText(const CacheFile &file, const cache::Parameter &parameter);

// The description of the file's node number `place`; false where it has none. Version 1.0 has none.
bool ReadDescriptionAt(const CacheFile &file, uint32_t place, Description *description);

// Told of a conflict in a node's description; see Fits (description.h).
using CatalogueConflictTeller = void (*)(const char *path, const char *what, void *context);

// Whether the file's answers can be read as those of the nodes that this catalogue knows; visits
// the descriptions. `tell` may be null.
bool FitsCatalogue(const CacheFile &file, CatalogueConflictTeller tell, void *context);

// The same in one look, where recorder and reader have the same catalogue.
bool HasSameCatalogue(const CacheFile &file);

// Version 1.0 says by the signature alone what its records look like, and there is one with it.
constexpr uint64_t kSignatureOfVersion1_0 = 0x7dc27bb44c95f944;

// A text of the file that may be missing.
inline const char *TextOrEmpty(const flatbuffers::String *text) {
  return text != nullptr ? text->c_str() : "";
}
