// A walk over everything that a cache file holds.
#pragma once

#include <string>
#include <string_view>

#include "cache_file.h"
#include "host_model.h"

// A node of the file. `description` is the file's own; a file of version 1.0 has none, and it is
// the catalogue's, or null where that does not have the node.
struct VisitedNode {
  const char *path;
  const Description *description;
  std::string_view words;  // the file's own description in words
};

// Whether no two of a list's entries are the same.
bool StandOnce(const Values &entries);

class Visitor {
 public:
  virtual ~Visitor() = default;
  virtual void OnHost(const Facts &facts) = 0;
  virtual void OnNode(const VisitedNode &) {}  // before its answers
  virtual void OnList(const VisitedNode &node, const Values &parent, KIF_Status status,
                      const Values &entries) = 0;
  // `record` is without the zeros at its end.
  virtual void OnRecord(const VisitedNode &node, const Values &instance, KIF_Status status,
                        std::string_view record) = 0;
  virtual void OnContent(const VisitedNode &node, const Values &instance,
                         const cache::Stored &answer, std::string_view bytes) = 0;
  virtual void OnSet(const VisitedNode &node, KIF_Status status) = 0;
};

// Shows the visitor the facts, then the nodes in the order of their paths, and of each its lists,
// records, contents and the status of a write, in the file's order. False where the file is
// damaged: `*problem` tells where, and the visitor has seen what comes before.
bool VisitAll(const CacheFile &file, Visitor *visitor, std::string *problem);
