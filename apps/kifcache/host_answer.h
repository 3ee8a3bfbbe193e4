// One question to the present host and its answer, through the platform library's own operations.
#pragma once

#include <string>

#include "host_model.h"
#include "kif/kif.h"

enum class AnswerKind : uint8_t { kList, kRecord, kContent };

// What is asked for: the instances below one, or the record or content of one. No answer depends
// on what else was asked.
struct Question {
  NodeIndex node;
  AnswerKind kind;
  const Values &instance;
};

struct HostAnswer {
  KIF_Status status = 0;  // of a content: of reading it
  Values entries;         // of a list; none where it failed
  std::string record;     // whole; empty where it failed
  ContentAnswer content;
  uint64_t omitted = 0;  // what of it cannot be kept
};

class Asker {
 public:
  // Whether the host knows the node at all. Those beyond the tools have no variable: they are asked
  // for by the numbers of this catalogue, of a library that has the same.
  bool Knows(const NodeInfo &node) const { return node.hasVariable || hasOurCatalogue_; }

  // `*answer` may hold an earlier one.
  void Ask(const Question &question, HostAnswer *answer);

 private:
  KIF_ParamList *Select(const Values &instance);

  const bool hasOurCatalogue_ = HasOurCatalogue();
  static bool HasOurCatalogue();
  // The nodes of one instance are mostly asked for in a row.
  Values selected_;
  ParamListHandle selector_;
};

// Whether the host can be asked at all: 0, or what is wrong with it, such as a file that is none.
KIF_Status StatusOfHost();
