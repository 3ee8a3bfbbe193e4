// pkill: signals the cartels whose command lines match regular expressions.
#include <errno.h>
#include <limits.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include "base/own_process.h"
#include "kiftools.h"
#include "output.h"
#include "tools.h"
#include "worlds/cartel_match.h"

namespace {

struct SignalName {
  const char *name;
  int number;
};

constexpr SignalName kSignalNames[] = {
    {"HUP", 1},    {"INT", 2},   {"QUIT", 3},  {"ILL", 4},   {"TRAP", 5},    {"ABRT", 6},
    {"IOT", 6},    {"BUS", 7},   {"EMT", 7},   {"FPE", 8},   {"KILL", 9},    {"USR1", 10},
    {"SEGV", 11},  {"USR2", 12}, {"PIPE", 13}, {"ALRM", 14}, {"TERM", 15},   {"STKFLT", 16},
    {"CLD", 17},   {"CHLD", 17}, {"CONT", 18}, {"STOP", 19}, {"TSTP", 20},   {"TTIN", 21},
    {"TTOU", 22},  {"URG", 23},  {"XCPU", 24}, {"XFSZ", 25}, {"VTALRM", 26}, {"PROF", 27},
    {"WINCH", 28}, {"POLL", 29}, {"IO", 29},   {"PWR", 30},  {"INFO", 30},   {"SYS", 31},
};

constexpr int kDefaultSignal = 15;
constexpr int kProbe = 0;  // kill() checks the process and delivers nothing

void PrintUsage() {
  puts("Usage: pkill [-SIGNAL] [PATTERN]");
}

void PrintStatus(KIF_Status status) {
  fprintf(Messages(), "pkill: %s\n", ZLK_ReturnStatusToString(status));
}

// The signal that `text` names, by its name or by a number that ends at the first other character;
// kProbe when it names none. A number too large for a signal stays too large, so that kill()
// refuses it.
int ParseSignal(const char *text) {
  for (const SignalName &row : kSignalNames) {
    if (strcmp(row.name, text) == 0) return row.number;
  }
  if (text[0] < '0' || text[0] > '9') return kProbe;
  const long number = strtol(text, nullptr, 10);
  return number > INT_MAX ? INT_MAX : static_cast<int>(number);
}

// The signal to send. Takes a first argument that names one out of the vector; a first argument
// that only looks like one stays for the options.
int TakeSignal(int *argc, char **argv) {
  if (argv[1][0] != '-') return kDefaultSignal;
  const int signal = ParseSignal(argv[1] + 1);
  if (signal == kProbe) return kProbe;
  for (int i = 1; i < *argc; ++i) argv[i] = argv[i + 1];
  --*argc;
  return signal;
}

// As kill(), for one process only: 0 and below would reach process groups.
int SignalProcess(int32_t processID, int signal) {
  if (processID > 0) return kill(processID, signal);
  errno = EINVAL;
  return -1;
}

KIF_Status SignalIfMatching(const MatchedCartel &cartel, void *context) {
  if (!cartel.matches) return 0;
  int32_t cartelID = 0;
  const KIF_Status status = ReadCartelId(cartel, &cartelID);
  if (status != 0) return status;
  if (cartelID == getpid()) return 0;
  if (SignalProcess(cartelID, *static_cast<const int *>(context)) == 0) return 0;
  if (errno == ESRCH) return 0;  // it ended since the cartels were listed
  const int error = errno;
  fprintf(Messages(), "pkill: failed to kill %s (%d): %s\n", Shown(cartel.text, stderr).text(),
          cartelID, strerror(error));
  return KIF_STATUS_FAILURE;
}

bool SignalCartels(const char *patternText, bool wholeLine, int signal) {
  char error[kPatternErrorSize];
  const PatternHandle pattern = CompilePattern(patternText, error);
  if (pattern == nullptr) {
    if (error[0] != '\0') fprintf(Messages(), "pkill: %s\n", error);
    return false;
  }
  const KIF_Status status = MatchCartels(*pattern, wholeLine, SignalIfMatching, &signal);
  if (status != 0) PrintStatus(status);
  return status == 0;
}

}  // namespace

int PkillEntry(int argc, char **argv) {
  if (HostIsElsewhere()) {
    fputs("Using KIF cache is unsupported\n", Messages());
    return 1;
  }
  // The numbers of a /proc that is mounted for another PID namespace are others' in this one.
  const int32_t own = OwnProcessInProc();
  if (own != getpid() && access("/proc/stat", F_OK) == 0) {
    fputs("pkill: /proc shows another PID namespace, whose processes cannot be signalled\n",
          Messages());
    return 1;
  }
  if (argc < 2) {
    fputs("pkill: No matching criteria specified\n", Messages());
    PrintUsage();
    return 1;
  }
  const int signal = TakeSignal(&argc, argv);
  bool wholeLine = false;
  for (int letter; (letter = getopt(argc, argv, "fh")) != -1;) {
    if (letter == 'f') wholeLine = true;
    if (letter == 'h') {
      PrintUsage();
      return 0;
    }
  }
  for (; optind < argc; ++optind) {
    if (!SignalCartels(argv[optind], wholeLine, signal)) return 1;
  }
  return 0;
}
