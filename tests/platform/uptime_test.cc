#include <regex>
#include <string>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kHistory[] = "sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory";

// The loads are in percent of one processor; a load may be a status too.
std::string Host(const std::string &seconds, const std::string &pcpus, const std::string &one,
                 const std::string &five, const std::string &fifteen) {
  const std::string history = std::string("record ") + kHistory;
  return "record system_ntpclock_upTime = " + seconds +
         "\nrecord sched_globalStats_numPcpus = " + pcpus +  //
         "\n" + history + "1MinInPct 0 = " + one +           //
         "\n" + history + "5MinInPct 0 = " + five +          //
         "\n" + history + "15MinInPct 0 = " + fifteen + "\n";
}

class UptimeTest : public HostTest {
 protected:
  // The output behind the time of day, which must look like one.
  static std::string AfterTime(const std::string &out) {
    constexpr size_t kTimeLength = 10;
    EXPECT_TRUE(std::regex_search(out, std::regex("^ [ 0-9][0-9]:[0-5][0-9]:[0-5][0-9] "))) << out;
    return out.size() >= kTimeLength ? out.substr(kTimeLength) : out;
  }

  std::string Up(uint32_t seconds) {
    const std::string text = "seconds=" + std::to_string(seconds);
    const Outcome outcome =
        Cache(Host(text, "numPcpus=1", "loadInPct=0", "loadInPct=5", "loadInPct=150"), {"uptime"});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err, "");
    const std::string line = AfterTime(outcome.out);
    const std::string loads = "load average: 0.00, 0.05, 1.50\n";
    EXPECT_TRUE(line.ends_with(loads)) << line;
    return line.substr(0, line.size() - loads.size());
  }

  std::string Loads(const std::string &pcpus) {
    const Outcome outcome = Live(Host("seconds=1", "numPcpus=" + pcpus, "loadInPct=100",
                                      "loadInPct=4294967295", "loadInPct=1"),
                                 {"uptime", "-x", "ignored"});
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err, "");
    return AfterTime(outcome.out);
  }
};

TEST_F(UptimeTest, SplitsTheSeconds) {
  EXPECT_EQ(Up(59), "up 00:00:59, ");
  EXPECT_EQ(Up(86399), "up 23:59:59, ");
  EXPECT_EQ(Up(86400), "up 1 days, 00:00:00, ");
  EXPECT_EQ(Up(90061), "up 1 days, 01:01:01, ");
  EXPECT_EQ(Up(4294967295), "up 49710 days, 06:28:15, ");
}

TEST_F(UptimeTest, SpreadsTheLoadOverTheProcessors) {
  EXPECT_EQ(Loads("4"), "up 00:00:01, load average: 0.25, 10737418.24, 0.00\n");
  EXPECT_EQ(Loads("0"), "up 00:00:01, load average: 0.00, 0.00, 0.00\n");
  // A hundred times this count is 4 in 32 bits.
  EXPECT_EQ(Loads("42949673"), "up 00:00:01, load average: 25.00, 1073741823.75, 0.25\n");
}

TEST_F(UptimeTest, SaysWhatCouldNotBeRead) {
  const std::string good = "loadInPct=1", bad = "status 0xbad0003";
  const struct {
    std::string host, out, err;
  } cases[] = {
      {Host(bad, "numPcpus=1", good, good, good), "", "Failed to get ntpclock_uptime.\n"},
      {Host("seconds=1", bad, good, good, good), "up 00:00:01, ",
       "Failed to get number of pcups.\n"},
      {Host("seconds=1", "numPcpus=1", bad, bad, good), "up 00:00:01, ",
       "Failed to get 1 minute cpu load history.\n"},
      {Host("seconds=1", "numPcpus=1", good, bad, bad), "up 00:00:01, ",
       "Failed to get 5 minute cpu load history.\n"},
      {Host("seconds=1", "numPcpus=1", good, good, bad), "up 00:00:01, ",
       "Failed to get 15 minute cpu load history.\n"},
  };
  for (const auto &test : cases) {
    const Outcome outcome = Live(test.host, {"uptime"});
    EXPECT_EQ(AfterTime(outcome.out), test.out);
    EXPECT_EQ(outcome.err, test.err);
    EXPECT_EQ(outcome.status, 3);
  }
}

TEST_F(UptimeTest, SurvivesAListThatCannotBeMade) {
  const std::string host = Host("seconds=1", "numPcpus=1", "", "", "");
  Outcome outcome = Live(host, {"uptime"}, Failing("KIF_ParamListCreate", 1));
  EXPECT_EQ(outcome.err, "Failed to allocate inputparam.\n");
  EXPECT_EQ(outcome.status, 1);
  outcome = Live(host, {"uptime"}, Failing("KIF_ParamListAddInt", 1, "0xbad0014"));
  EXPECT_EQ(outcome.err, "Failed to add inputparams.\n");
  EXPECT_EQ(outcome.status, 0x14);
}

}  // namespace
