// The front end: how a tool is chosen, live and cache runs, and its refusals.
#include <gmock/gmock.h>
#include <unistd.h>

#include <filesystem>

#include "host_fixture.h"

namespace {

using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

// One CPU, up for a day and a bit, loads of 1.5, 0.25 and 0.
constexpr char kHost[] = R"(
record system_ntpclock_upTime = seconds=90061
record sched_globalStats_numPcpus = numPcpus=1
record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory1MinInPct 0 = loadInPct=150
record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory5MinInPct 0 = loadInPct=25
record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory15MinInPct 0 =
)";

constexpr char kUptime[] = "up 1 days, 01:01:01, load average: 1.50, 0.25, 0.00\n";

constexpr char kNames[] =
    "   lspci\n   ps\n   hwclock\n   zelvar\n   irqinfo\n   bootOption\n   amldump\n   pci-info\n"
    "   pidof\n   userspaceof\n   mdu\n   lsof\n   mdf\n   pkill\n   pgrep\n   uptime\n";

std::string Usage(const std::string &word) {
  return "usage: " + word +
         " [options] [function] [arguments]\n       or [function] [arguments]\n\nOptions:\n"
         "   --cache, -c    Perform the operation on a given KIF cache file\n\nFunctions:\n" +
         kNames;
}

class DispatcherTest : public HostTest {
 protected:
  // Runs the executable under another name, a link in the scratch folder.
  Outcome RunAs(const std::string &name, std::vector<std::string> arguments,
                const std::string &host) {
    const std::string link = Scratch() + "/bin/" + name;
    std::filesystem::create_directories(Scratch() + "/bin");
    std::filesystem::create_directory_symlink(LIB_DIR, Scratch() + "/lib");
    std::filesystem::copy_file(BIN_DIR "/zlkkiftools", link);
    arguments.insert(arguments.begin(), link);
    return Run(arguments, {.environment = {"ZELLIBS_HOST=" + host}});
  }
};

TEST_F(DispatcherTest, BothFormsRunTheTool) {
  const std::string file = Record(kHost);
  EXPECT_THAT(RunAs("uptime", {"-x"}, file).out, HasSubstr(kUptime));
  std::filesystem::remove_all(Scratch() + "/lib");
  EXPECT_THAT(RunAs("zlkkiftools2", {"uptime"}, file).out, HasSubstr(kUptime));
  std::filesystem::remove_all(Scratch() + "/lib");
  // A name that lacks the last letter of the program's is no tool's either.
  const Outcome outcome = RunAs("zlkkiftool", {"uptime"}, file);
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.err, Usage(Scratch() + "/bin/zlkkiftool"));
  EXPECT_THAT(Live(kHost, {"some/dir/uptime/"}).out, HasSubstr(kUptime));
}

TEST_F(DispatcherTest, CacheRunOnAndOffTheHost) {
  const std::string file = Record(kHost);
  for (const char *option : {"-c", "--cache"}) {
    for (const char *host : {"none", "linux"}) {
      const Outcome outcome = Run({BIN_DIR "/zlkkiftools", option, file, "uptime"},
                                  {.environment = {std::string("ZELLIBS_HOST=") + host}});
      EXPECT_EQ(outcome.status, 0) << outcome.err;
      EXPECT_THAT(outcome.out, HasSubstr(kUptime));
    }
  }
}

TEST_F(DispatcherTest, UnknownTool) {
  Outcome outcome = Live(kHost, {"bogus"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, Usage("bogus"));
  outcome = Live(kHost, {});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.err, Usage(BIN_DIR "/zlkkiftools"));
  // Too few arguments for a cache run: the option is taken for a tool's name.
  EXPECT_EQ(Live(kHost, {"-c", "FILE"}).err, Usage("-c"));
  EXPECT_EQ(Cache(kHost, {"bin/bogus"}).err, Usage("bin/bogus"));
}

TEST_F(DispatcherTest, OffTheHost) {
  const Surroundings none = {.environment = {"ZELLIBS_HOST=none"}};
  const std::string few =
      std::string("usage: zlkkiftools -c cache function\n  available functions:\n") + kNames;
  for (const std::vector<std::string> &arguments :
       {std::vector<std::string>{}, {"uptime"}, {"-c", "FILE"}}) {
    std::vector<std::string> commandLine = {BIN_DIR "/zlkkiftools"};
    commandLine.insert(commandLine.end(), arguments.begin(), arguments.end());
    const Outcome outcome = Run(commandLine, none);
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, few);
  }
  const Outcome outcome = Run({BIN_DIR "/zlkkiftools", "ps", "-c", "FILE"}, none);
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.err, "error: must be invoked with cache when not on Nevra\n");
}

TEST_F(DispatcherTest, RefusedCacheFile) {
  const Outcome outcome = Run({BIN_DIR "/zlkkiftools", "-c", "missing.kif", "uptime"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.err, "Couldn't use specifed cache file missing.kif: No such cache file\n");
}

// The check comes before the tool is looked up, in live runs too.
TEST_F(DispatcherTest, ForeignInterface) {
  const std::string host = std::string(
                               "host signature 0x1234\nhost kernelBuildDate "
                               "\"Jan  2 2024 03:04:05 and more\"\n") +
                           kHost;
  for (const Outcome &outcome :
       {Cache(host, {"uptime"}), Live(host, {"bogus"}), Live(host, {"uptime"})}) {
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.out, "");
    EXPECT_THAT(outcome.err,
                StartsWith("error: md5 signature mismatch with running zelkernel built on "
                           "Jan  2 2024 03:04:05 (my build date: "));
  }
}

TEST_F(DispatcherTest, FullDiskAndClosedOutput) {
  const std::string file = Record(kHost);
  const std::string run = "ZELLIBS_HOST=" + file + " \"$BIN_DIR\"/uptime ";
  Outcome outcome = Run({"sh", "-c", run + ">/dev/full"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.err, "zlkkiftools: write error: No space left on device\n");
  outcome = Run({"sh", "-c", run + ">&-"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(outcome.err, "zlkkiftools: write error: Bad file descriptor\n");
  // A failure of the tool keeps its own status.
  outcome = Run({"sh", "-c",
                 "ZELLIBS_HOST=" + Record("record system_ntpclock_upTime = seconds=1") +
                     " \"$BIN_DIR\"/uptime >/dev/full"});
  EXPECT_EQ(outcome.status, 3);
}

TEST_F(DispatcherTest, ReaderThatGoesAway) {
  std::string host = "list userworld_cartel =";
  for (int i = 1; i <= 40000; ++i) host += " " + std::to_string(i);
  for (int i = 1; i <= 40000; ++i) {
    host += "\nrecord userworld_cartel_cmdline " + std::to_string(i) + " = cmdline=\"program\"";
  }
  const Outcome outcome =
      Run({"bash", "-c", "\"$BIN_DIR\"/pgrep -l . | head -n 1; echo ${PIPESTATUS[0]}"},
          {.environment = {"ZELLIBS_HOST=" + Record(host + "\n")}});
  EXPECT_EQ(outcome.out, "1 program\n141\n");  // 128 and SIGPIPE
  EXPECT_EQ(outcome.err, "");
}

// What a host's texts hold must not reach a terminal; a pipe gets the bytes.
TEST_F(DispatcherTest, ControlCharactersOnATerminal) {
  if (!IsInstalled("script")) GTEST_SKIP() << "needs script(1)";
  const std::string host =
      "list userworld_cartel = 7\n"
      "record userworld_cartel_cmdline 7 = cmdline=\"a\\x1b[31mb\\xc2\\x9bc\\xc3\\xa9\\x9b\"\n";
  EXPECT_EQ(Live(host, {"pgrep", "-lf", "."}).out,
            "7 a\x1b[31mb\xc2\x9b"
            "c\xc3\xa9\x9b\n");
  const Outcome outcome = Run({"script", "-qec", BIN_DIR "/pgrep -lf .", "/dev/null"},
                              {.environment = {"ZELLIBS_HOST=" + Record(host)}});
  EXPECT_EQ(outcome.out, "7 a?[31mb??c\xc3\xa9?\r\n");
}

}  // namespace
