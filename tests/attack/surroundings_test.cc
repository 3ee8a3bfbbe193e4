// Every tool where little is to be had: a full disk or nothing at all behind its streams, few
// descriptors, another user's processes, an empty host, processes that come and go.
#include <unistd.h>

#include <filesystem>
#include <set>

#include "attack/attack.h"

namespace {

using std::string_literals::operator""s;

class SurroundingsTest : public AttackTest {
 protected:
  // Runs a command through a shell that prepares the process: `script` goes before exec.
  Outcome Prepared(const std::string &script, const Command &command, const std::string &host,
                   std::vector<std::string> before = {}) {
    before.insert(before.end(),
                  {"sh", "-c", script + "exec \"$@\"", "sh", programs_ + "/zlkkiftools"});
    const Outcome outcome = RunOn(host, command.After(before));
    EXPECT_LT(outcome.status, 126) << command.line << " after " << script << outcome.err;
    return outcome;
  }

  void OnThisMachine(const std::string &script, const std::vector<std::string> &before = {}) {
    for (const Command &command : kCommands) {
      if (command.IsHarmlessHere()) Prepared(script, command, "linux", before);
    }
  }

  const std::string host_ = Record(whole_);
  std::string programs_ = BIN_DIR;
};

TEST_F(SurroundingsTest, StandardOutputFullOrClosed) {
  for (const Command &command : kCommands) {
    const bool prints = !Prepared("", command, host_).out.empty();
    for (const std::string to : {"/dev/full", "&-"}) {
      const Outcome outcome = Prepared("exec >" + to + "; ", command, host_);
      if (!prints) continue;
      EXPECT_NE(outcome.status, 0) << command.line << " >" << to;
      const std::string why = to == "&-" ? "" : "No space left on device\n";
      EXPECT_NE(outcome.err.find("write error: " + why), outcome.err.npos) << command.line;
    }
  }
}

TEST_F(SurroundingsTest, FewDescriptors) {
  for (const Command &command : kCommands) {
    const Outcome plenty = Prepared("rm -f *.aml; ", command, host_);
    const Outcome few = Prepared("rm -f *.aml; ulimit -n 8; ", command, host_);
    if (command.Tool() == "uptime") continue;
    EXPECT_EQ(few.out, plenty.out) << command.line;
    EXPECT_EQ(few.status, plenty.status) << command.line;
  }
  // The loader itself needs one, a sanitizer more; what a test was started with is closed.
#ifdef __SANITIZE_ADDRESS__
  const std::vector<std::string> limits = {"8"};
#else
  const std::vector<std::string> limits = {"8", "5", "4"};
#endif
  for (const std::string &limit : limits) {
    OnThisMachine("exec 3>&- 4>&- 5>&- 6>&- 7>&-; ulimit -n " + limit + "; ");
  }
}

TEST_F(SurroundingsTest, EmptyHostOrNoStandardStreams) {
  const std::string none = Record("");
  std::filesystem::create_directory(Scratch() + "/empty");
  for (const Command &command : kCommands) {
    for (const std::string &host : {none, "linux:" + Scratch() + "/empty", "linux:/nowhere"s}) {
      Prepared("", command, host);
    }
    Prepared("exec <&- >&- 2>&-; ", command, host_);
  }
}

TEST_F(SurroundingsTest, UnprivilegedUser) {
  std::vector<std::string> nobody;
  if (geteuid() == 0) {
    nobody = {"setpriv", "--reuid=65534", "--regid=65534", "--clear-groups", "--no-new-privs"};
    if (Run(Command{"true"}.After(nobody)).status != 0) GTEST_SKIP() << "no other user here";
  }
  programs_ = ProgramsForAnyone();
  OnThisMachine("", nobody);
}

TEST_F(SurroundingsTest, ProcessesThatComeAndGo) {
  // Until the tool has ended, processes begin, have children and end, as fast as they can.
  const std::string storm =
      "while :; do (: & : & exec sleep 0.0003) & (: & :); done >/dev/null 2>&1 & storm=$!; "
      "\"$@\"; status=$?; kill $storm; exit $status; ";
  const std::set<std::string> lookers = {"ps", "pidof", "pgrep", "lsof", "mdf"};
  for (int round = 0; round < (IsLong() ? 40 : 1); ++round) {
    for (const Command &command : kCommands) {
      if (lookers.contains(command.Tool())) Prepared(storm, command, "linux");
    }
  }
}

}  // namespace
