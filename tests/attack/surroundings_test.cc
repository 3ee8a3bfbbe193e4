// Every tool where little is to be had: a full disk or nothing at all behind its streams, few
// descriptors, another user's processes, an empty host, processes that come and go.
#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include "attack/attack.h"
#include "host_fixture.h"

namespace {

class SurroundingsTest : public HostTest {
 protected:
  // Runs a command line through a shell that prepares the process: `script` ends with exec "$@".
  Outcome Prepared(const std::string &script, const std::vector<std::string> &arguments,
                   const std::string &host, const std::vector<std::string> &before = {}) {
    std::vector<std::string> commandLine = before;
    commandLine.insert(commandLine.end(), {"sh", "-c", script, "sh", programs_ + "/zlkkiftools"});
    commandLine.insert(commandLine.end(), arguments.begin(), arguments.end());
    const Outcome outcome = Run(commandLine, {.environment = {"ZELLIBS_HOST=" + host}});
    const std::string what = Describe(arguments) + " after " + script + "\n" + outcome.err;
    EXPECT_GE(outcome.status, 0) << what;
    EXPECT_LT(outcome.status, 126) << what;
    EXPECT_EQ(outcome.err.find("Sanitizer"), outcome.err.npos) << what;
    EXPECT_EQ(outcome.err.find("runtime error"), outcome.err.npos) << what;
    return outcome;
  }

  void OnThisMachine(const std::string &script, const std::vector<std::string> &before = {}) {
    for (const Command &command : kCommands) {
      if (IsHarmlessHere(command)) Prepared(script, command.arguments, "linux", before);
    }
  }

  std::string programs_ = BIN_DIR;

  // Whether a command that prepares the surroundings may do so here.
  bool Can(std::vector<std::string> command) {
    command.push_back("true");
    return Run(command).status == 0;
  }
};

TEST_F(SurroundingsTest, StandardOutputFullOrClosed) {
  const std::string host = Record(kWholeHost);
  for (const Command &command : kCommands) {
    const bool prints = !Prepared("exec \"$@\"", command.arguments, host).out.empty();
    const Outcome full = Prepared("exec \"$@\" >/dev/full", command.arguments, host);
    const Outcome closed = Prepared("exec \"$@\" >&-", command.arguments, host);
    if (!prints) continue;
    EXPECT_NE(full.status, 0) << Describe(command.arguments);
    EXPECT_NE(full.err.find("write error: No space left on device\n"), full.err.npos)
        << Describe(command.arguments);
    EXPECT_NE(closed.status, 0) << Describe(command.arguments);
    EXPECT_NE(closed.err.find("write error: "), closed.err.npos) << Describe(command.arguments);
  }
}

TEST_F(SurroundingsTest, FewDescriptors) {
  const std::string host = Record(kWholeHost);
  for (const Command &command : kCommands) {
    const Outcome plenty = Prepared("rm -f *.aml; exec \"$@\"", command.arguments, host);
    const Outcome few = Prepared("rm -f *.aml; ulimit -n 8; exec \"$@\"", command.arguments, host);
    if (command.arguments[0] == "uptime") continue;
    EXPECT_EQ(few.out, plenty.out) << Describe(command.arguments);
    EXPECT_EQ(few.status, plenty.status) << Describe(command.arguments);
  }
  for (const char *limit : {"8", "5", "4", "3"}) {
    OnThisMachine(std::string("ulimit -n ") + limit + "; exec \"$@\" 2>&1");
  }
}

TEST_F(SurroundingsTest, NoStandardStreams) {
  const std::string host = Record(kWholeHost);
  for (const Command &command : kCommands) {
    Prepared("exec \"$@\" <&- >&- 2>&-", command.arguments, host);
  }
}

TEST_F(SurroundingsTest, EmptyHost) {
  const std::string host = Record("");
  const std::string tree = Scratch() + "/empty";
  std::filesystem::create_directory(tree);
  for (const Command &command : kCommands) {
    Prepared("exec \"$@\"", command.arguments, host);
    Prepared("exec \"$@\"", command.arguments, "linux:" + tree);
    Prepared("exec \"$@\"", command.arguments, "linux:/nowhere");
  }
}

TEST_F(SurroundingsTest, UnprivilegedUser) {
  const std::vector<std::string> nobody = {"setpriv", "--reuid=65534", "--regid=65534",
                                           "--clear-groups", "--no-new-privs"};
  if (geteuid() == 0 && !Can(nobody)) GTEST_SKIP() << "no other user here";
  programs_ = ProgramsForAnyone();
  OnThisMachine("exec \"$@\"", geteuid() == 0 ? nobody : std::vector<std::string>());
}

// Processes that begin, have threads' worth of children and end, as fast as they can, for as long
// as it lives.
class ForkStorm {
 public:
  ForkStorm() : leader_(fork()) {
    if (leader_ != 0) return;
    setpgid(0, 0);
    signal(SIGCHLD, SIG_DFL);
    for (;;) {
      const pid_t child = fork();
      if (child == 0) {
        if (fork() == 0) usleep(300);
        _exit(0);
      }
      usleep(100);
      while (waitpid(-1, nullptr, WNOHANG) > 0) {
      }
    }
  }
  ~ForkStorm() {
    kill(-leader_, SIGKILL);
    kill(leader_, SIGKILL);
    waitpid(leader_, nullptr, 0);
  }

 private:
  pid_t leader_;
};

TEST_F(SurroundingsTest, ProcessesThatComeAndGo) {
  const ForkStorm storm;
  for (int round = 0; round < (IsLong() ? 40 : 1); ++round) {
    for (const Command &command : kCommands) {
      const std::string &tool = command.arguments[0];
      const bool looksAtProcesses =
          tool == "ps" || tool == "pidof" || tool == "pgrep" || tool == "lsof" || tool == "mdf";
      if (looksAtProcesses) Prepared("exec \"$@\"", command.arguments, "linux");
    }
  }
}

}  // namespace
