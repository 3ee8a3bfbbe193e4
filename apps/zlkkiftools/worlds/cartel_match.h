// The cartels whose command lines match a regular expression: what pgrep and pkill share.
#pragma once

#include <regex.h>
#include <stdint.h>
#include <stdlib.h>

#include <memory>

#include "kif/kif.h"

// A compiled POSIX extended regular expression: case-sensitive, matching anywhere in a text.
struct Pattern {
  regex_t expression;
  bool compiled;
};

struct PatternDeleter {
  void operator()(Pattern *pattern) const {
    if (pattern->compiled) regfree(&pattern->expression);
    free(pattern);
  }
};
using PatternHandle = std::unique_ptr<Pattern, PatternDeleter>;

constexpr size_t kPatternErrorSize = 256;

// Compiles `text`. On failure gives null, and `error` says why; it is empty without memory for the
// pattern itself.
PatternHandle CompilePattern(const char *text, char (&error)[kPatternErrorSize]);

// One cartel of the walk. It is valid during the visit only.
struct MatchedCartel {
  const char *text;        // what the pattern was run over
  bool matches;            // whether it matched
  KIF_ParamList *cartels;  // the list of cartels, and the cartel's place in it
  uint32_t index;
};

// The cartel's ID, which is its process ID. Read on demand: most cartels never need it.
inline KIF_Status ReadCartelId(const MatchedCartel &cartel, int32_t *cartelID) {
  return KIF_ParamListGetInt32(cartel.cartels, cartel.index, cartelID);
}

// Called with the context of the walk; a status other than 0 ends the walk.
using CartelVisitor = KIF_Status (*)(const MatchedCartel &cartel, void *context);

// Runs `pattern` over the first word of every cartel's command line, or over the whole line, and
// visits each cartel that has a command line, in list order. Gives 0 after a complete walk,
// KIF_STATUS_NO_MEMORY or KIF_STATUS_FAILURE when the program's own list could not be made or
// filled, or the status of the operation or visit that failed.
KIF_Status MatchCartels(const Pattern &pattern, bool wholeLine, CartelVisitor visit, void *context);
