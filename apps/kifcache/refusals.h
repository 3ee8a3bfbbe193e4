// What a host refused to its recorder, in words.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "visit.h"

class Refusals {
 public:
  enum Kind { kList, kRecord, kContent };

  // Counts an answer of a node. That there is nothing is no refusal.
  void Count(const VisitedNode &node, Kind kind, KIF_Status status);

  // How many answers were refused, by group.
  const std::map<std::string, uint64_t> &groups() const { return groups_; }

  // One for each node and status: "files: 281 of 686 descriptors could not be read: not permitted".
  std::vector<std::string> Sentences() const;

  // Whether a recorder with other rights would have got more.
  bool HasForbidden() const;

 private:
  struct Answers {
    std::string group;
    std::string what;   // such as "cmdline of", or empty
    std::string whole;  // what there are several of
    uint64_t count = 0;
    std::map<KIF_Status, uint64_t> refused;
  };

  Answers *Find(const VisitedNode &node, Kind kind);

  std::map<std::pair<std::string, Kind>, Answers> answers_;
  // Where the last answer was counted: the next one is mostly of the same kind.
  const char *lastPath_ = nullptr;
  Kind lastKind_ = kList;
  Answers *last_ = nullptr;
  std::map<std::string, uint64_t> groups_;
};
