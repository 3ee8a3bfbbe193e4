#include <unistd.h>

#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"
#include "worlds/sleeper.h"

namespace {

constexpr char kUsage[] =
    "find the process ID of running programs\npidof program program ...\n"
    "      -s   Single shot, only return one pid\n"
    "      -x   Scripts too, would also return ids of shells\n"
    "      -o   Pid to omit\n";

// The cartel 90 is the thread of another one, and 60 belongs to the kernel.
constexpr char kHost[] = R"(
list userworld_cartel = 10 20 30 40 50 60 70 80 90 100 110
record world_info 10 = cartelID=10
record world_info 20 = cartelID=20
record world_info 30 = cartelID=30
record world_info 40 = cartelID=40
record world_info 50 = cartelID=50
record world_info 60 = worldID=60
record world_info 70 = cartelID=70
record world_info 80 = status 0xbad0003
record world_info 90 = cartelID=91
record world_info 100 = cartelID=4294967286
record world_info 110 = cartelID=110
record userworld_cartel_cmdline 0 = cmdline="foo"
record userworld_cartel_cmdline 10 = cmdline="/bin/init --boot"
record userworld_cartel_cmdline 20 = cmdline="/usr/bin/foo -c foo"
record userworld_cartel_cmdline 30 = cmdline="foo bar"
record userworld_cartel_cmdline 40 = cmdline="/bin/sh /opt/run.sh --now"
record userworld_cartel_cmdline 50 = cmdline="/usr/bin/sh /opt/run.sh"
record userworld_cartel_cmdline 60 = cmdline="foo"
record userworld_cartel_cmdline 70 = status 0xbad0062
record userworld_cartel_cmdline 80 = cmdline="foo"
record userworld_cartel_cmdline 90 = cmdline="decoy"
record userworld_cartel_cmdline 91 = cmdline="/sbin/net\td"
record userworld_cartel_cmdline 4294967286 = cmdline="/bin/bash"
record userworld_cartel_cmdline 110 = cmdline="/bin/ash  run.sh"
)";

class PidofTest : public HostTest {
 protected:
  void Expect(std::vector<std::string> arguments, const std::string &out) {
    const std::string what = testing::PrintToString(arguments);
    arguments.insert(arguments.begin(), "pidof");
    const Outcome outcome = Cache(kHost, arguments);
    EXPECT_EQ(outcome.out, out) << what;
    EXPECT_EQ(outcome.err, "") << what;
    EXPECT_EQ(outcome.status, out.empty() ? 1 : 0) << what;
  }
};

TEST_F(PidofTest, ComparesWholeNamesAndLastComponents) {
  Expect({"foo"}, "20 30 \n");
  Expect({"/usr/bin/foo"}, "20 30 \n");
  Expect({"/bin/foo"}, "30 \n");
  Expect({"init"}, "10 \n");
  Expect({"Init"}, "");
  Expect({"ini"}, "");
  Expect({"--", "--boot"}, "");
  Expect({"net\td"}, "91 \n");  // a tab is part of a word
  Expect({"decoy"}, "");
  Expect({"bash"}, "-10 \n");
}

TEST_F(PidofTest, SkipsRelativePaths) {
  Expect({"bin/foo"}, "");
  Expect({"bin/init", "foo"}, "20 30 \n");
  Expect({"./foo"}, "");
}

TEST_F(PidofTest, FindsScriptsOfTheShellsOnly) {
  Expect({"run.sh"}, "");
  Expect({"-x", "run.sh"}, "40 \n");
  Expect({"run.sh", "-x"}, "40 \n");
  Expect({"-x", "/opt/run.sh"}, "40 \n");
  Expect({"-x", "/opt/other/run.sh"}, "");
  Expect({"-x", "--", "--now"}, "");
  Expect({"-x", ""}, "110 \n");  // two blanks: the second word is empty
  Expect({"-x", "sh"}, "40 50 \n");
}

TEST_F(PidofTest, OmitsCartels) {
  Expect({"-o", "20", "foo"}, "30 \n");
  Expect({"-o20", "-o", " +30x", "foo"}, "");
  Expect({"-o", "-10", "bash"}, "");
  Expect({"-o", "4294967316", "foo"}, "20 30 \n");
  Expect({"-o", "%ppid", "foo"}, "20 30 \n");
}

TEST_F(PidofTest, OmitsItsParent) {
  const std::string id = std::to_string(getpid());
  const std::string host =
      "list userworld_cartel = 7 " + id + "\nrecord world_info 7 = cartelID=7\n" +
      "record userworld_cartel_cmdline 7 = cmdline=\"foo\"\n" + "record world_info " + id +
      " = cartelID=" + id + "\n" + "record userworld_cartel_cmdline " + id + " = cmdline=\"foo\"\n";
  EXPECT_EQ(Live(host, {"pidof", "foo"}).out, "7 " + id + " \n");
  EXPECT_EQ(Live(host, {"pidof", "-o", "%PPID", "foo"}).out, "7 \n");
}

TEST_F(PidofTest, TakesNamesInTurn) {
  Expect({"init", "foo", "init"}, "10 20 30 10 \n");
  Expect({"-s", "none", "foo", "init"}, "20 \n");
  Expect({"-s", "none"}, "");
  Expect({"-s"}, "");
  Expect({"--", "foo"}, "20 30 \n");
}

TEST_F(PidofTest, RefusesBadCommandLines) {
  Outcome outcome = Cache(kHost, {"pidof"});
  EXPECT_EQ(outcome.err, kUsage);
  EXPECT_EQ(outcome.status, 1);
  outcome = Cache(kHost, {"pidof", "-q", "foo"});
  EXPECT_EQ(outcome.err, std::string("pidof: invalid option -- 'q'\n") + kUsage);
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.status, 1);
  outcome = Cache(kHost, {"pidof", "foo", "-o"});
  EXPECT_EQ(outcome.err, std::string("pidof: option requires an argument -- 'o'\n") + kUsage);
  EXPECT_EQ(outcome.status, 1);

  std::vector<std::string> omits = {"pidof", "foo"};
  omits.insert(omits.end(), 256, "-o30");
  EXPECT_EQ(Cache(kHost, omits).out, "20 \n");
  omits.push_back("-o30");
  outcome = Cache(kHost, omits);
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "Too many omits\n");
  EXPECT_EQ(outcome.status, 1);
}

TEST_F(PidofTest, SaysWhatFails) {
  constexpr char kTwo[] = R"(
list userworld_cartel = 10 20
record world_info 10 = cartelID=10
record world_info 20 = cartelID=20
record userworld_cartel_cmdline 10 = cmdline="foo"
record userworld_cartel_cmdline 20 = cmdline="foo"
)";
  const struct {
    const char *operation;
    int call;
    const char *out;
    const char *err;
    int status;
  } cases[] = {
      {"KIF_ParamListCreate", 1, "10 20 \n", "CartelList: Not enough memory\n", 0},
      {"KIF_GetInstanceListAlloc", 2, "10 20 \n",
       "CartelList: error fetching cartel list 0xbad0040\n", 0},
      {"KIF_Get", 1, "20 10 20 \n", "", 0},              // the information of 10
      {"KIF_Get", 4, "10 10 20 \n", "", 0},              // the command line of 20
      {"KIF_ParamListAddInt", 2, "20 10 20 \n", "", 0},  // 10 for its command line
      {"KIF_ParamListAddInt", 3, "10 10 20 \n", "Couldn't add param to list: 0xbad0040", 0},
      {"KIF_ParamListAddInt", 7, "10 20 10 \n", "Couldn't add param to list: 0xbad0040", 0},
      {"KIF_ParamListGetParam", 1, "10 20 \n", "Couldn't add param to list: 0xbad0001", 0},
  };
  for (const auto &row : cases) {
    const Outcome outcome =
        Cache(kTwo, {"pidof", "foo", "foo"}, Failing(row.operation, row.call, "0xbad0040"));
    EXPECT_EQ(outcome.out, row.out) << row.operation << " " << row.call;
    EXPECT_EQ(outcome.err, row.err) << row.operation << " " << row.call;
    EXPECT_EQ(outcome.status, row.status) << row.operation << " " << row.call;
  }
  // What a name printed before its walk failed stays, but does not count.
  const Outcome outcome = Cache(kTwo, {"pidof", "foo"}, Failing("KIF_ParamListAddInt", 3));
  EXPECT_EQ(outcome.out, "10 ");
  EXPECT_EQ(outcome.status, 1);
}

TEST_F(PidofTest, AgreesWithThisMachine) {
  if (!IsInstalled("pidof")) GTEST_SKIP();
  const Sleeper sleeper(Scratch());
  for (const std::string &name : {sleeper.program(), sleeper.name()}) {
    EXPECT_EQ(Linux("/", {"pidof", name}).out, sleeper.id() + " \n");
    EXPECT_EQ(Run({"pidof", name}).out, sleeper.id() + "\n");
  }
  EXPECT_EQ(Linux("/", {"pidof", "-o", sleeper.id(), sleeper.name()}).status, 1);
}

}  // namespace
