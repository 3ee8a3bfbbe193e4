// ps: transcripts on hosts written by hand.
#include <gmock/gmock.h>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

using testing::EndsWith;
using testing::HasSubstr;
using testing::StartsWith;

std::string World(int id, const std::string &name, const std::string &info) {
  const std::string instance = std::to_string(id);
  return "record world_name " + instance + " = name=\"" + name + "\"\nrecord world_info " +
         instance + " = worldID=" + instance + " " + info + "\n";
}

// State 1 of a table of ours is SLEEP, 0 is RUN.
std::string Scheduler(int id, int run, int wait, const std::string &cpus, uint64_t usedTime) {
  const std::string instance = std::to_string(id);
  return "record sched_Vcpus_stats_summaryStats " + instance +
         " = runState=" + std::to_string(run) + " waitState=" + std::to_string(wait) +
         "\nrecord sched_Vcpus_stats_affinity " + instance + " = cpuText=\"" + cpus +
         "\"\nrecord sched_Vcpus_stats_stateTimes " + instance +
         " = usedTime=" + std::to_string(usedTime) + "\n";
}

std::string CommandLine(int id, const std::string &text) {
  return "record userworld_cartel_cmdline " + std::to_string(id) + " = cmdline=\"" + text + "\"\n";
}

std::string Children(int id, const std::string &entries) {
  return "list userworld_cartel_child " + std::to_string(id) + " = " + entries + "\n";
}

// Two userspaces: in the first an init with a daemon of two worlds and a shell, the daemon with a
// zombie and the shell without scheduler data; in the second one a lonely root. A kernel world, and
// two that vanish while they are read.
std::string Host() {
  return "list world = 100 1 10 11 12 13 99 2000\n" +
         World(100, "idle0", "groupID=7 worldType=3 securityDomain=-1") +
         Scheduler(100, 0, 0, "0", 123456789012) +
         World(1, "init",
               "groupID=1 userspaceID=1 cartelID=1 processGroupID=1 sessionID=1 worldType=4") +
         Scheduler(1, 1, 1, "0-1", 1050000) + CommandLine(1, "/sbin/init --all") +
         World(10, "daemon",
               "groupID=10 userspaceID=1 cartelID=10 parentCartelID=1 processGroupID=10 "
               "sessionID=1 worldType=4 securityDomain=12") +
         Scheduler(10, 1, 1, "0-1", 7) + CommandLine(10, "daemon -d") + Children(10, "55 56") +
         "record userworld_cartel_child 10 55 = childState=1\n"
         "record userworld_cartel_child 10 56 = childState=2\n" +
         World(11, "daemon-worker",
               "groupID=10 userspaceID=1 cartelID=10 parentCartelID=10 processGroupID=10 "
               "sessionID=1 worldType=0x24") +
         Scheduler(11, 99, 77, "0", 0) +
         World(12, "sh",
               "groupID=12 userspaceID=1 cartelID=12 parentCartelID=1 processGroupID=12 "
               "sessionID=12 worldType=0x84") +
         "record userworld_cartel_cmdline 12 = status 0xbad0062\n" +
         World(13, "gone", "userspaceID=1 cartelID=13 parentCartelID=1 worldType=4") +
         "record sched_Vcpus_stats_summaryStats 13 =\nrecord sched_Vcpus_stats_affinity 13 =\n"
         "record world_name 99 = name=\"half-gone\"\n" +
         World(2000, "root2", "groupID=2000 userspaceID=2 cartelID=2000 worldType=0") +
         Scheduler(2000, 2, 0, "0-63,128-191", 99999999999) + CommandLine(2000, "r2");
}

class PsTest : public HostTest {};

TEST_F(PsTest, Flat) {
  Outcome outcome = Live(Host(), {"ps"});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.out,
            "WID   CID   WorldName    \n"
            "100   0     idle0        \n"
            "1     1   init         \n"
            "10    10  daemon       \n"
            "11    10  daemon-worker\n"
            "12    12  sh           \n"
            "2000  2000  root2        \n"
            "\n");
  outcome = Cache(Host(), {"ps", "-cgPjtsTZzU"});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(
      outcome.out,
      "WID   CID   WorldName      GID  PGID  SID  PCID  Type    State   Wait    CPU   Time        "
      "  SecurityDomain  UserSpace  Command\n"
      "100   0     idle0          7   0   0   0     SI      RUN     NONE    0     123456.789012"
      "  -1              0        \n"
      "1     1   init           1   1  1  0     U       SLEEP   INTR    0-1       1.050000"
      "  0               1          /sbin/init --all\n"
      "10    10  daemon         10  10  1  1     U       SLEEP   INTR    0-1       0.000007"
      "  12              1          daemon -d\n"
      "55    55  <zombie>       10  1  10                    \n"
      "11    10  daemon-worker  10  10  1  10    UX      ?       ?       0         0.000000"
      "  0               1          daemon -d\n"
      "12    12  sh             12  12  12  1     UInvalid                       "
      "  0               1          <unavailable>\n"
      "2000  2000  root2          2000  0  0  0     Invalid        DISK    NONE    0-63,128-191  "
      "99999.999999  0               2          r2\n"
      "\n");
}

TEST_F(PsTest, Tree) {
  const Outcome outcome = Live(Host(), {"ps", "-J", "-n", "-N", "-i"});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.out,
            "\033)0\n"
            "  WID   CID   WorldName      nChildren  nThreads\n"
            "1\n"
            "\016m\017\016q\0171     1   init           2          1       \n"
            "  \016t\017\016q\01710    10  daemon         2          2       \n"
            "  \016x\017 \016t\017\016q\01755    55  <zombie>     \n"
            "  \016x\017 \016m\017\016q\01711    10  daemon-worker  0          1       \n"
            "  \016m\017\016q\01712    12  sh             0          1       \n"
            "\n"
            "  WID   CID   WorldName      nChildren  nThreads\n"
            "2\n"
            "\016m\017\016q\0172000  2000  root2          0          1       \n"
            "\n"
            "Total worlds:         8\n"
            "Total printed worlds: 5\n"
            "Deepest child:        3\n"
            "Zombie worlds:        1\n"
            "Total userspaces:     2\n");
}

TEST_F(PsTest, Userspaces) {
  EXPECT_EQ(Live(Host(), {"ps", "-U2"}).out,
            "WID   CID   WorldName      UserSpace\n2000  2000  root2          2        \n\n");
  // The widths are those of all worlds; the tree of one userspace alone.
  EXPECT_EQ(Live(Host(), {"ps", "--tree", "-U2"}).out,
            "\033)0\n  WID   CID   WorldName      UserSpace\n2\n"
            "\016m\017\016q\0172000  2000  root2          2        \n\n");
  for (const char *number : {"-U3", "-U128", "-U129", "-U4294967297", "-U-1"}) {
    const Outcome outcome = Live(Host(), {"ps", number, "-i"});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.out, "");
    EXPECT_THAT(outcome.err, EndsWith(") is not running.\nAvailable userspaces:\n   1   2 \n"));
  }
  // Text selects nothing, and a later -U without a number changes nothing.
  EXPECT_EQ(Live(Host(), {"ps", "-Uz"}).out, Live(Host(), {"ps", "-U"}).out);
  EXPECT_EQ(Live(Host(), {"ps", "-U2", "-U"}).out, Live(Host(), {"ps", "-U2"}).out);
}

TEST_F(PsTest, TableOfUserspaces) {
  std::string host = "list world =";
  std::string worlds;
  for (int i = 1; i <= 24; ++i) {
    const int userspace = i < 24 ? i : 128;
    host += " " + std::to_string(i);
    worlds += World(i, "r",
                    "cartelID=" + std::to_string(i) + " userspaceID=" + std::to_string(userspace));
  }
  // A later root of userspace 5 takes the place of the first one.
  host += " 50\n" + worlds + World(50, "later", "cartelID=50 userspaceID=5");
  Outcome outcome = Live(host, {"ps", "-U100"});
  EXPECT_EQ(outcome.err,
            "Warning: maximum number of userspaces reached...\n"
            "Requested userspace (100) is not running.\nAvailable userspaces:\n"
            "   1   2   3   4   5   6   7   8   9  10  11 \n"
            " 12  13  14  15  16  17  18  19  20  21 \n"
            " 22  23 \n");
  outcome = Live(host, {"ps", "-J", "-U5"});
  EXPECT_EQ(outcome.err, "Warning: maximum number of userspaces reached...\n");
  EXPECT_THAT(outcome.out, HasSubstr("50  50  later"));
  EXPECT_THAT(Live(host, {"ps", "-i"}).out, EndsWith("Total userspaces:     23\n"));
}

TEST_F(PsTest, OnlyUserworldsAndCartels) {
  EXPECT_EQ(Live(Host(), {"ps", "-u", "-i"}).out,
            "WID   CID   WorldName    \n"
            "1     1   init         \n"
            "10    10  daemon       \n"
            "11    10  daemon-worker\n"
            "12    12  sh           \n"
            "2000  2000  root2        \n"
            "\n"
            "Total worlds:         8\n"
            "Total printed worlds: 5\n"
            "Total userspaces:     2\n");
  EXPECT_EQ(Live(Host() + "list userworld_cartel = 10 12\n", {"ps", "-C"}).out,
            "WID  CID  WorldName\n10  10  daemon\n12  12  sh    \n\n");
  EXPECT_EQ(Live("list world =\n", {"ps", "-J", "-i"}).out,
            "\033)0\nTotal worlds:         0\nTotal printed worlds: 0\nDeepest child:        1\n"
            "Zombie worlds:        0\nTotal userspaces:     0\n");
}

TEST_F(PsTest, Kinds) {
  const std::string host = "list world = 1 2 3\n" + World(1, "all", "worldType=0x17f") +
                           World(2, "named", "worldType=0x85") +
                           World(3, "none", "worldType=0xfffffe00");
  EXPECT_EQ(Live(host, {"ps", "-t"}).out,
            "WID  CID  WorldName  Type  \n"
            "1  0  all    SIUVHXTA\n"
            "2  0  named  SUInvalid    \n"
            "3  0  none   Invalid      \n\n");
  EXPECT_EQ(Live(host, {"ps", "-tv"}).out,
            "WID  CID  WorldName  Type  \n"
            "1  0  all    System,Idle,User,VMM,Helper,Clone,Test,Assistant  \n"
            "2  0  named  System,User,Invalid  \n"
            "3  0  none   Invalid  \n\n");
}

TEST_F(PsTest, RefusedCommandLines) {
  const std::string usage = Live(Host(), {"ps", "-h"}).err;
  EXPECT_EQ(usage.size(), 719u);
  EXPECT_THAT(usage, StartsWith("ps\n    -C           Display only cartels\n"));
  EXPECT_EQ(Live(Host(), {"ps", "--help", "-x"}).status, 0);
  struct Refusal {
    std::vector<std::string> arguments;
    std::string message;
  };
  const Refusal refusals[] = {
      {{"ps", "-x"}, "ps: invalid option -- 'x'\n" + usage},
      {{"ps", "-z5"}, "ps: invalid option -- '5'\n" + usage},
      {{"ps", "-n", "1"}, "ps: no non-option arguments\n" + usage},
      {{"ps", "-U", "5"}, "ps: no non-option arguments\n" + usage},
      {{"ps", "-N", "-n"}, "nChildren needs --tree\n"},
      {{"ps", "-N"}, "nThreads needs --tree\n"},
  };
  for (const Refusal &refusal : refusals) {
    const Outcome outcome = Live(Host(), refusal.arguments);
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, refusal.message);
  }
}

TEST_F(PsTest, FailuresOfTheHost) {
  Outcome outcome = Live("list world = status 0xbad0003\n", {"ps"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "WorldList: error fetching world list 0xbad0003\n");
  // A child that cannot be read ends the run, under a thread too; a list of children that cannot
  // be fetched does not.
  outcome = Live(Host() + "list userworld_cartel_child 12 = 77\n", {"ps", "-z"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "failed to get child info for child 77, status Not found\n");
  outcome = Live(Host() + "list userworld_cartel_child 12 = \"x\"\n", {"ps", "-J"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.err, "failed to get child ID\n");
}

// Every call of the library that ps makes fails once; it must end by itself, print nothing half
// read, and leave nothing behind.
TEST_F(PsTest, EveryCallFailing) {
  struct Failure {
    const char *operation;
    int call;
    const char *message;
  };
  const Failure failures[] = {
      {"KIF_ParamListCreate", 1, "WorldList: Not enough memory\n"},
      {"KIF_ParamListCreate", 2, "failed to alloc paramlist for children\n"},
      {"KIF_ParamListCreate", 4, "failed to create children list\n"},
      {"KIF_ParamListAddInt", 1, "Couldn't add param to list: 0xbad0014"},
      {"KIF_ParamListGetInt32", 1, "failed to get child ID\n"},
  };
  for (const Failure &failure : failures) {
    const Outcome outcome =
        Live(Host(), {"ps", "-J"}, Failing(failure.operation, failure.call, "0xbad0014"));
    EXPECT_EQ(outcome.status, 1) << failure.operation;
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, failure.message);
  }
}

// Parents of parents in a circle, a world under itself, and records under a zombie.
TEST_F(PsTest, BrokenTrees) {
  const std::string host = "list world = 1 2 3 4 5\n" +
                           World(1, "root", "userspaceID=1 cartelID=1") +
                           World(2, "a", "userspaceID=1 cartelID=2 parentCartelID=3") +
                           World(3, "b", "userspaceID=1 cartelID=3 parentCartelID=2") +
                           World(4, "self", "userspaceID=1 cartelID=4 parentCartelID=4") +
                           World(5, "orphan", "userspaceID=1 cartelID=5 parentCartelID=9") +
                           Children(1, "9") + "record userworld_cartel_child 1 9 = childState=1\n";
  EXPECT_EQ(Live(host, {"ps", "-J"}).out,
            "\033)0\n  WID  CID  WorldName\n1\n\016m\017\016q\0171  1  root  \n"
            "  \016m\017\016q\0179  9  <zombie>\n    \016m\017\016q\0175  5  orphan\n\n");
}

TEST_F(PsTest, DeepTree) {
  std::string host = "list world =";
  std::string worlds;
  constexpr int kDepth = 10000;
  for (int i = 1; i <= kDepth; ++i) {
    host += " " + std::to_string(i);
    worlds += World(
        i, "w",
        "userspaceID=1 cartelID=" + std::to_string(i) + " parentCartelID=" + std::to_string(i - 1));
  }
  const Outcome outcome = Live(host + "\n" + worlds, {"ps", "-J", "-i"});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_THAT(outcome.out, HasSubstr("Deepest child:        10000\n"));
}

// Texts without an end stop where their record does.
TEST_F(PsTest, UnterminatedTexts) {
  const std::string name(128, 'n');
  const std::string cpus(2304, 'c');
  const std::string commandLine(1024, 'l');
  const Outcome outcome = Live("list world = 1\n" + World(1, name, "cartelID=1") +
                                   Scheduler(1, 0, 0, cpus, 1) + CommandLine(1, commandLine),
                               {"ps", "-cs"});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_THAT(outcome.out, HasSubstr("  1  " + name.substr(1) + "  RUN     NONE    " +
                                     cpus.substr(1) + "  " + commandLine.substr(1) + "\n"));
}

}  // namespace
