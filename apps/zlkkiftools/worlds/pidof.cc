// pidof: prints the IDs of the cartels that run given programs.
#include <limits.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "kif/kif.h"
#include "output.h"
#include "records/worlds.h"
#include "tools.h"
#include "worlds/command_line.h"

namespace {

constexpr int kMostOmits = 256;

struct Options {
  bool singleShot;
  bool scripts;
  int32_t omits[kMostOmits];
  int32_t omitCount;
};

const char *LastComponent(const char *path) {
  const char *slash = strrchr(path, '/');
  return slash != nullptr ? slash + 1 : path;
}

bool IsCommandName(const char *word, const char *name) {
  return strcmp(word, name) == 0 || strcmp(word, LastComponent(name)) == 0 ||
         strcmp(LastComponent(word), name) == 0;
}

bool IsShell(const char *word) {
  return strcmp(word, "/bin/sh") == 0 || strcmp(word, "/bin/ash") == 0 ||
         strcmp(word, "/bin/bash") == 0;
}

// Whether a command line runs the program `name`; cuts the line into its words.
bool RunsProgram(char *commandLine, const char *name, const Options &options) {
  char *arguments = CutAtBlank(commandLine);
  if (IsCommandName(commandLine, name)) return true;
  if (!options.scripts || arguments == nullptr || !IsShell(commandLine)) return false;
  CutAtBlank(arguments);
  return IsCommandName(arguments, name);
}

bool IsOmitted(uint32_t cartelID, const Options &options) {
  for (int32_t i = 0; i < options.omitCount; ++i) {
    if (static_cast<uint32_t>(options.omits[i]) == cartelID) return true;
  }
  return false;
}

// Prints the current cartel of `walk` if it runs `name`; tells whether it did.
bool PrintIfRunning(uint32_t cartelID, InstanceWalk *walk, KIF_ParamList *selector,
                    const char *name, const Options &options) {
  if (cartelID == 0 || walk->Replace(int64_t{cartelID}) != 0) return false;
  CartelCommandLine commandLine = {};
  if (ReadRecord(KIF_NODE_userworld_cartel_cmdline, selector, &commandLine) != 0) return false;
  if (!RunsProgram(FieldText(commandLine.cmdline), name, options)) return false;
  if (IsOmitted(cartelID, options)) return false;
  printf("%d ", static_cast<int32_t>(cartelID));
  return true;
}

// Prints the cartels that run `name`. Gives their number; 0 when the walk failed.
int CartelList(const char *name, const Options &options) {
  const ParamListHandle selector = CreateInstance();
  if (selector == nullptr) {
    fputs("CartelList: Not enough memory\n", Messages());
    return 0;
  }
  ParamListHandle cartels;
  const KIF_Status status = GetInstanceList(KIF_NODE_userworld_cartel, nullptr, &cartels);
  if (status != 0) {
    fprintf(Messages(), "CartelList: error fetching cartel list 0x%x\n", status);
    return 0;
  }
  int found = 0;
  InstanceWalk walk(cartels.get(), selector.get());
  while (walk.Next()) {
    WorldInfo info = {};
    if (ReadRecord(KIF_NODE_world_info, selector.get(), &info) != 0) continue;
    if (!PrintIfRunning(info.cartelID, &walk, selector.get(), name, options)) continue;
    ++found;
    if (options.singleShot) break;
  }
  return walk.failed() ? 0 : found;
}

bool IsRelativePath(const char *name) {
  return name[0] != '/' && strchr(name, '/') != nullptr;
}

// An ID as strtol takes it where a long has 32 bits; %PPID is whoever started the tool.
int32_t ParseOmit(const char *text) {
  if (strcmp(text, "%PPID") == 0) return getppid();
  const long value = strtol(text, nullptr, 10);
  return static_cast<int32_t>(value < INT32_MIN   ? INT32_MIN
                              : value > INT32_MAX ? INT32_MAX
                                                  : value);
}

int PrintUsage() {
  fputs(
      "find the process ID of running programs\n"
      "pidof program program ...\n"
      "      -s   Single shot, only return one pid\n"
      "      -x   Scripts too, would also return ids of shells\n"
      "      -o   Pid to omit\n",
      Messages());
  return 1;
}

// 0, or the exit status of a bad command line.
int ParseOptions(int argc, char **argv, Options *options) {
  for (int letter; (letter = getopt(argc, argv, "sxo:")) != -1;) {
    switch (letter) {
      case 's':
        options->singleShot = true;
        break;
      case 'x':
        options->scripts = true;
        break;
      case 'o':
        if (options->omitCount == kMostOmits) {
          fputs("Too many omits\n", Messages());
          return 1;
        }
        options->omits[options->omitCount++] = ParseOmit(optarg);
        break;
      default:
        return PrintUsage();
    }
  }
  return 0;
}

}  // namespace

int PidofEntry(int argc, char **argv) {
  if (argc < 2) return PrintUsage();
  Options options = {};
  if (const int status = ParseOptions(argc, argv, &options); status != 0) return status;
  int found = 0;
  for (; optind < argc; ++optind) {
    if (IsRelativePath(argv[optind])) continue;
    found += CartelList(argv[optind], options);
    if (found > 0 && options.singleShot) break;
  }
  if (found == 0) return 1;
  putchar('\n');
  return 0;
}
