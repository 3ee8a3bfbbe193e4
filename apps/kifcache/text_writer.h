// Writing a host in its text form: see docs/text-form.md.
#pragma once

#include <stdio.h>

#include "visit.h"

class TextWriter : public Visitor {
 public:
  explicit TextWriter(FILE *stream) : stream_(stream) {}

  void OnHost(const Facts &facts) override;
  void OnNode(const VisitedNode &node) override;
  void OnList(const VisitedNode &node, const Values &parent, KIF_Status status,
              const Values &entries) override;
  void OnRecord(const VisitedNode &node, const Values &instance, KIF_Status status,
                std::string_view record) override;
  void OnContent(const VisitedNode &node, const Values &instance, const cache::Stored &answer,
                 std::string_view bytes) override;
  void OnSet(const VisitedNode &node, KIF_Status status) override;

 private:
  void Begin(const char *kind, const VisitedNode &node, const Values &selector);
  void Write(const std::string &text) { fwrite(text.data(), 1, text.size(), stream_); }

  FILE *stream_;
};
