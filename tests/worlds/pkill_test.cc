// Every process that these tests signal is a child of the test.
#include <poll.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>
#include <utility>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kUsage[] = "Usage: pkill [-SIGNAL] [PATTERN]\n";
constexpr int kNothing = -1;

int reports;  // a child's end of its pipe

// A process that does nothing but tell which signals reach it.
class Child {
 public:
  Child() {
    int ends[2];
    if (pipe(ends) != 0) abort();
    id_ = fork();
    if (id_ == 0) Report(ends[1]);
    close(ends[1]);
    signals_ = ends[0];
    Next();  // it is ready
  }
  ~Child() {
    End();
    close(signals_);
  }
  Child(const Child &) = delete;
  Child &operator=(const Child &) = delete;

  pid_t id() const { return id_; }
  std::string text() const { return std::to_string(id_); }

  // Number of the next signal that reached the child; kNothing when none comes.
  int Next(int milliseconds = 5000) const {
    pollfd waiting = {signals_, POLLIN, 0};
    unsigned char number;
    if (poll(&waiting, 1, milliseconds) != 1 || read(signals_, &number, 1) != 1) return kNothing;
    return number;
  }

  // Waits until the child has ended or stopped.
  int WaitForChange() {
    int status = 0;
    waitpid(id_, &status, WUNTRACED);
    if (WIFSIGNALED(status)) ended_ = true;
    return status;
  }

  void End() {
    if (ended_) return;
    kill(id_, SIGKILL);
    waitpid(id_, nullptr, 0);
    ended_ = true;
  }

 private:
  [[noreturn]] static void Report(int descriptor) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    reports = descriptor;
    struct sigaction action = {};
    action.sa_handler = [](int number) {
      const auto byte = static_cast<unsigned char>(number);
      if (write(reports, &byte, 1) != 1) _exit(1);
    };
    for (int number = 1; number < NSIG; ++number) sigaction(number, &action, nullptr);
    action.sa_handler(0);
    for (;;) pause();
  }

  pid_t id_;
  int signals_;
  bool ended_ = false;
};

std::string HostOf(const std::vector<std::pair<std::string, std::string>> &cartels) {
  std::string list = "list userworld_cartel =";
  std::string records;
  for (const auto &[id, commandLine] : cartels) {
    list += " " + id;
    records += "record userworld_cartel_cmdline " + id + " = " + commandLine + "\n";
  }
  return list + "\n" + records;
}

class PkillTest : public HostTest {
 protected:
  // Runs pkill on a host where `one_` runs "/bin/one --flag" and `two_` runs "two one".
  Outcome Pkill(std::vector<std::string> arguments, const Surroundings &surroundings = {}) {
    arguments.insert(arguments.begin(), "pkill");
    return Live(HostOf({{one_.text(), "cmdline=\"/bin/one --flag\""},
                        {two_.text(), "cmdline=\"two one\""}}),
                arguments, surroundings);
  }

  void ExpectQuiet(const std::vector<std::string> &arguments) {
    const Outcome outcome = Pkill(arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, "");
    EXPECT_EQ(outcome.status, 0);
  }

  // Checks that `child` got nothing so far.
  static void ExpectUntouched(const Child &child) {
    kill(child.id(), SIGUSR1);
    EXPECT_EQ(child.Next(), SIGUSR1);
  }

  Child one_, two_;
};

TEST_F(PkillTest, SignalsByName) {
  const std::pair<const char *, int> names[] = {
      {"HUP", 1},   {"INT", 2},   {"QUIT", 3},    {"ILL", 4},   {"TRAP", 5},    {"ABRT", 6},
      {"IOT", 6},   {"BUS", 7},   {"EMT", 7},     {"FPE", 8},   {"USR1", 10},   {"SEGV", 11},
      {"USR2", 12}, {"PIPE", 13}, {"ALRM", 14},   {"TERM", 15}, {"STKFLT", 16}, {"CLD", 17},
      {"CHLD", 17}, {"CONT", 18}, {"TSTP", 20},   {"TTIN", 21}, {"TTOU", 22},   {"URG", 23},
      {"XCPU", 24}, {"XFSZ", 25}, {"VTALRM", 26}, {"PROF", 27}, {"WINCH", 28},  {"POLL", 29},
      {"IO", 29},   {"PWR", 30},  {"INFO", 30},   {"SYS", 31}};
  for (const auto &[name, number] : names) {
    ExpectQuiet({std::string("-") + name, "one"});
    EXPECT_EQ(one_.Next(), number) << name;
  }
  ExpectUntouched(two_);
  ExpectQuiet({"-STOP", "one"});
  EXPECT_TRUE(WIFSTOPPED(one_.WaitForChange()));
  ExpectQuiet({"-KILL", "one"});
  EXPECT_EQ(WTERMSIG(one_.WaitForChange()), SIGKILL);
}

TEST_F(PkillTest, SignalsByNumber) {
  ExpectQuiet({"one"});
  EXPECT_EQ(one_.Next(), 15);
  ExpectQuiet({"-1", "^/bin/one$"});
  EXPECT_EQ(one_.Next(), 1);
  ExpectQuiet({"-010x", "one"});
  EXPECT_EQ(one_.Next(), 10);
  ExpectQuiet({"-HUP", "-f", "--", "-flag$", "two"});
  EXPECT_EQ(one_.Next(), 1);
  EXPECT_EQ(two_.Next(), 1);
  ExpectQuiet({"-40", "one", "/one", "none"});  // once for each pattern
  EXPECT_EQ(one_.Next(), 40);
  EXPECT_EQ(one_.Next(), 40);
  ExpectUntouched(one_);
  ExpectUntouched(two_);
}

TEST_F(PkillTest, OnlyProbesWithoutASignal) {
  ExpectQuiet({"-f", "one"});
  ExpectQuiet({"--", "one"});
  ExpectQuiet({"-f"});
  ExpectQuiet({"none"});
  for (const char *argument : {"-0", "-SIGTERM", "-term"}) {
    const Outcome outcome = Pkill({argument, "one"});
    EXPECT_EQ(outcome.err.rfind("pkill: invalid option -- ", 0), 0u) << outcome.err;
    EXPECT_EQ(outcome.status, 0);
  }
  // Only the first argument is a signal.
  EXPECT_EQ(Pkill({"-f", "-9", "one"}).err, "pkill: invalid option -- '9'\n");
  ExpectUntouched(one_);
  ExpectUntouched(two_);
}

TEST_F(PkillTest, ChecksTheCommandLine) {
  const struct {
    std::vector<std::string> arguments;
    const char *out;
    const char *err;
    int status;
  } cases[] = {
      {{}, kUsage, "pkill: No matching criteria specified\n", 1},
      {{"-h"}, kUsage, "", 0},
      {{"-hup", "one"}, kUsage, "", 0},
      {{"one", "-h"}, kUsage, "", 0},
      {{"("}, "", "pkill: Unmatched ( or \\(\n", 1},
  };
  for (const auto &row : cases) {
    const Outcome outcome = Pkill(row.arguments);
    EXPECT_EQ(outcome.out, row.out);
    EXPECT_EQ(outcome.err, row.err);
    EXPECT_EQ(outcome.status, row.status);
  }
  ExpectUntouched(one_);

  // The patterns before a bad one have been handled.
  EXPECT_EQ(Pkill({"-USR2", "one", "[", "two"}).status, 1);
  EXPECT_EQ(one_.Next(), SIGUSR2);
  ExpectUntouched(two_);
}

TEST_F(PkillTest, RefusesACache) {
  const Outcome outcome =
      Cache(HostOf({{one_.text(), "cmdline=\"one\""}}), {"pkill", "-KILL", "one"});
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "Using KIF cache is unsupported\n");
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(Cache("list userworld_cartel =\n", {"pkill"}).out, "");
  ExpectUntouched(one_);
}

TEST_F(PkillTest, EndsWhereASignalIsRefused) {
  for (const char *number :
       {"-99", "-2147483647", "-4294967296", "-4294967305", "-18446744073709551616"}) {
    const Outcome outcome = Pkill({number, "one"});
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, "pkill: failed to kill /bin/one (" + one_.text() +
                               "): Invalid argument\npkill: Failure\n")
        << number;
    EXPECT_EQ(outcome.status, 1) << number;
  }
  EXPECT_EQ(Pkill({"-99", "none"}).status, 0);
  ExpectUntouched(one_);
}

// Probes only: were such an ID passed on, a probe of a process group would succeed.
TEST_F(PkillTest, NeverReachesProcessGroups) {
  for (const char *id : {"0", "-1", "-2", "4294967295", "4294967296"}) {
    const Outcome outcome =
        Live(HostOf({{id, "cmdline=\"group of\""}, {one_.text(), "cmdline=\"group\""}}),
             {"pkill", "-f", "group"});
    const std::string shown = std::string(id).ends_with("5")   ? "-1"
                              : std::string(id).ends_with("6") ? "0"
                                                               : id;
    EXPECT_EQ(outcome.err,
              "pkill: failed to kill group of (" + shown + "): Invalid argument\npkill: Failure\n");
    EXPECT_EQ(outcome.status, 1) << id;
  }
}

TEST_F(PkillTest, IgnoresCartelsThatHaveEnded) {
  // No kernel gives an ID this large.
  const Outcome outcome =
      Live(HostOf({{"2147483646", "cmdline=\"one\""}, {one_.text(), "cmdline=\"one\""}}),
           {"pkill", "one"});
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(one_.Next(), SIGTERM);
  two_.End();
  ExpectQuiet({"-f", "two"});
}

TEST_F(PkillTest, LeavesItselfAlone) {
  const std::string text =
      WriteFile("self.txt", HostOf({{"@", "cmdline=\"one\""}, {one_.text(), "cmdline=\"one\""}}));
  const std::string command =
      "cd " + Scratch() + " && sed s/@/$$/ " + text +
      " >own.txt && \"$BIN_DIR\""
      "/kifcache build own.txt own.cache && "
      "ZELLIBS_HOST=own.cache exec \"$BIN_DIR\"/zlkkiftools pkill -KILL one";
  const Outcome outcome = Run({"/bin/sh", "-c", command});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(WTERMSIG(one_.WaitForChange()), SIGKILL);
}

TEST_F(PkillTest, SaysWhatFails) {
  const struct {
    const char *operation;
    int call;
    const char *err;
    bool first;  // whether the first cartel was signalled
  } cases[] = {
      {"KIF_ParamListCreate", 1, "pkill: Out of memory\n", false},
      {"KIF_GetInstanceListAlloc", 1, "pkill: No permission\n", false},
      {"KIF_Get", 1, "pkill: No permission\n", false},
      {"KIF_Get", 2, "pkill: No permission\n", true},
      {"KIF_ParamListGetInt32", 1, "pkill: No permission\n", false},
      {"KIF_ParamListAddInt", 2, "Couldn't add param to list: 0xbad000fpkill: Failure\n", true},
      {"calloc", 1, "", false},
  };
  for (const auto &row : cases) {
    const Outcome outcome = Pkill({"-USR2", "."}, Failing(row.operation, row.call, "0xbad000f"));
    EXPECT_EQ(outcome.err, row.err) << row.operation << " " << row.call;
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.status, 1) << row.operation << " " << row.call;
    if (row.first) {
      EXPECT_EQ(one_.Next(), SIGUSR2);
    }
    ExpectUntouched(one_);
    ExpectUntouched(two_);
  }
  // A cartel without a command line is passed over, as far as its read says so.
  EXPECT_EQ(Pkill({"-USR2", "."}, Failing("KIF_Get", 1, "0xbad0062")).status, 0);
  ExpectUntouched(one_);
  EXPECT_EQ(two_.Next(), SIGUSR2);
}

}  // namespace
