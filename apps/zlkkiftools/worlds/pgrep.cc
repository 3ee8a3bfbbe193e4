// pgrep: lists the cartels whose command lines match a regular expression.
#include <stdio.h>
#include <unistd.h>

#include "base/own_process.h"
#include "kiftools.h"
#include "output.h"
#include "tools.h"
#include "worlds/cartel_match.h"

namespace {

constexpr int kNothingMatched = 1;
constexpr int kBadCommandLine = 2;
constexpr int kFailed = 3;

struct Options {
  bool wholeLine;
  bool longOutput;
  bool inverted;
};

struct Search {
  Options options;
  bool matched;  // the pattern matched any cartel, printed or not
};

void PrintUsage() {
  puts("Usage: pgrep [-flv] [PATTERN]");
}

int RefuseWithoutPattern() {
  fputs("pgrep: no matching criteria specified\n", Messages());
  return kBadCommandLine;
}

bool IsOwnCartel(int32_t cartelID) {
  return cartelID == OwnProcessInProc() && !HostIsElsewhere();
}

KIF_Status PrintIfSelected(const MatchedCartel &cartel, void *context) {
  auto *search = static_cast<Search *>(context);
  if (cartel.matches != search->options.inverted) {
    int32_t cartelID = 0;
    const KIF_Status status = ReadCartelId(cartel, &cartelID);
    if (status != 0) return status;
    if (!IsOwnCartel(cartelID)) {
      const Shown text(cartel.text);
      printf("%d %s\n", cartelID, search->options.longOutput ? text.text() : "\b");
    }
  }
  search->matched = search->matched || cartel.matches;
  return 0;
}

}  // namespace

int PgrepEntry(int argc, char **argv) {
  if (argc < 2) return RefuseWithoutPattern();
  Search search = {};
  for (int letter; (letter = getopt(argc, argv, "fhlv")) != -1;) {
    switch (letter) {
      case 'f':
        search.options.wholeLine = true;
        break;
      case 'l':
        search.options.longOutput = true;
        break;
      case 'v':
        search.options.inverted = true;
        break;
      case 'h':
        PrintUsage();
        return 0;
      default:
        PrintUsage();
        return kBadCommandLine;
    }
  }
  if (optind >= argc) return RefuseWithoutPattern();

  char error[kPatternErrorSize];
  const PatternHandle pattern = CompilePattern(argv[optind], error);
  if (pattern == nullptr) {
    if (error[0] == '\0') return kFailed;
    fprintf(Messages(), "pgrep: %s\n", error);
    return kBadCommandLine;
  }
  if (MatchCartels(*pattern, search.options.wholeLine, PrintIfSelected, &search) != 0) {
    return kFailed;
  }
  return search.matched != search.options.inverted ? 0 : kNothingMatched;
}
