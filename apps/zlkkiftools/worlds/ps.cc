// ps: lists the worlds or cartels of the host, flat or as one tree for each userspace.
#include <getopt.h>
#include <stdio.h>

#include "output.h"
#include "tools.h"
#include "worlds/id_argument.h"
#include "worlds/ps_options.h"
#include "worlds/ps_printer.h"
#include "worlds/world_list.h"

namespace {

constexpr char kUsage[] =
    "ps\n"
    "    -C           Display only cartels\n"
    "    -P           Display PCID\n"
    "    -T           Display used time\n"
    "    -c           Display verbose command line\n"
    "    -g           Display session ID and process group\n"
    "    -i           Display summary information\n"
    "    -j           Display GID\n"
    "    -n           Display nChildren (only with --tree)\n"
    "    -N           Display nThreads  (only with --tree)\n"
    "    -s           Display state\n"
    "    -t           Display type\n"
    "    -u           Display only userworlds\n"
    "    -U [N]       Display [only] userspace ID\n"
    "    -v           Display non truncated values\n"
    "    -Z           Display the security domain\n"
    "    -z           Display zombie cartels\n"
    "    -J or --tree Display userworlds in a tree layout\n";
static_assert(sizeof(kUsage) - 1 == 719);

constexpr char kShortOptions[] = "CPTcghijnNstuU::vZzJ";

constexpr option kLongOptions[] = {
    {"help", no_argument, nullptr, 'h'},
    {"tree", no_argument, nullptr, 'J'},
    {nullptr, 0, nullptr, 0},
};

struct OptionLetter {
  int letter;
  PsOptions options;
};

// The letters that show no column.
constexpr OptionLetter kOptionLetters[] = {
    {'C', PS_CARTELS_ONLY}, {'i', PS_SUMMARY}, {'u', PS_USERWORLDS_ONLY},
    {'v', PS_VERBOSE},      {'z', PS_ZOMBIES}, {'J', PS_TREE | PS_USERWORLDS_ONLY | PS_ZOMBIES},
};

// The display options of a letter; 0 for any other.
PsOptions OptionsOf(int letter) {
  for (const OptionLetter &row : kOptionLetters) {
    if (row.letter == letter) return row.options;
  }
  return PsColumnOption(letter);
}

// False where the command line ends the run, with `*status`.
bool ParseOptions(int argc, char **argv, PsOptions *options, int *status) {
  int letter;
  *status = 1;
  while ((letter = getopt_long(argc, argv, kShortOptions, kLongOptions, nullptr)) != -1) {
    const PsOptions added = OptionsOf(letter);
    *options |= added;
    if (letter == 'U' && optarg != nullptr) requestedUserspace = ParseId(optarg);
    if (added != 0) continue;
    if (letter == 'h' || letter == '?') {
      fputs(kUsage, Messages());
      *status = letter == 'h' ? 0 : 1;
    } else {
      fprintf(Messages(), "ps: getopt failed? (%c)\n", letter);
    }
    return false;
  }
  if (optind < argc) {
    fputs("ps: no non-option arguments\n", Messages());
    fputs(kUsage, Messages());
    return false;
  }
  return true;
}

}  // namespace

int PsEntry(int argc, char **argv) {
  PsOptions options = 0;
  int status;
  if (!ParseOptions(argc, argv, &options, &status)) return status;
  if ((options & PS_NCHILDREN) != 0 && (options & PS_TREE) == 0) {
    fputs("nChildren needs --tree\n", Messages());
    return 1;
  }
  if ((options & PS_NTHREADS) != 0 && (options & PS_TREE) == 0) {
    fputs("nThreads needs --tree\n", Messages());
    return 1;
  }
  return WorldList(options) ? 0 : 1;
}
