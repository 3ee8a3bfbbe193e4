#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kHost[] =
    "record hardware_chipset_rtc = hour=4 minute=5 second=59 day=7 month=11 year=2031\n";
constexpr char kUsage[] =
    "hwclock     -d --date <date>         Set date\n"
    "            -t --time <time>         Set time\n\n"
    "Valid date format: MM/DD/YYYY\nValid time format: HH:MM:SS\n";

class HwclockTest : public HostTest {
 protected:
  // What the library was given to write, as its trace has it; empty when nothing was written.
  std::string Written() const {
    const std::string call = "KIF_Set hardware_chipset_rtc() input";
    const size_t at = Trace().find(call);
    if (at == std::string::npos) return "";
    const size_t begin = at + call.size();
    return Trace().substr(begin, Trace().find(" = ", begin) - begin);
  }

  void Expect(const std::string &host, std::vector<std::string> arguments, const std::string &out,
              int status, const std::string &written) {
    arguments.insert(arguments.begin(), "hwclock");
    const std::string what = testing::PrintToString(arguments);
    const Outcome outcome = Live(host, arguments);
    EXPECT_EQ(outcome.out, out) << what;
    EXPECT_EQ(outcome.err, "") << what;
    EXPECT_EQ(outcome.status, status) << what;
    EXPECT_EQ(Written(), written) << what;
  }
};

TEST_F(HwclockTest, ShowsTheClock) {
  Expect(kHost, {}, "04:05:59   11/07/2031   UTC\n", 0, "");
  Expect(kHost, {"ignored"}, "04:05:59   11/07/2031   UTC\n", 0, "");
  Expect("record hardware_chipset_rtc = hour=-1 minute=100 year=7\n", {},
         "-01:100:00   00/00/0007   UTC\n", 0, "");
}

TEST_F(HwclockTest, TakesFromTheClockWhatIsNotGiven) {
  Expect(kHost, {"-t", "7:5:9"}, "Clock updated.\nTime: 07:05:09   Date: 11/07/2031   UTC\n", 0,
         "(11, 7, 2031, 7, 5, 9)");
  Expect(kHost, {"--date=2/30/9 or so"}, "Clock updated.\nTime: 04:05:59   Date: 02/30/09   UTC\n",
         0, "(2, 30, 9, 4, 5, 59)");
  Expect(kHost, {"-t", "-1:-2:-1"}, "Clock updated.\nTime: 04:-02:59   Date: 11/07/2031   UTC\n", 0,
         "(11, 7, 2031, 4, 4294967294, 59)");
}

TEST_F(HwclockTest, DoesNotReadTheClockWhenAllIsGiven) {
  Expect("record hardware_chipset_rtc = status 0xbad0003\n",
         {"-t", "1:1:1", "-d13/1/2000", "--time", " 23:-1:61 "},
         "Clock updated.\nTime: 23:-01:61   Date: 13/01/2000   UTC\n", 0,
         "(13, 1, 2000, 23, 4294967295, 61)");
  EXPECT_EQ(Trace().find("KIF_Get hardware"), std::string::npos);
}

TEST_F(HwclockTest, RefusesWhatIsNoTimeOrDate) {
  Expect(kHost, {"-t", "12:00"}, "Invalid time format: 12:00\n", 1, "");
  Expect(kHost, {"-t", "10:00:00", "-d", "garbage"}, "Invalid date format: garbage\n", 1, "");
  Expect(kHost, {"-d", "1.1.2000", "-t", ""}, "Invalid time format: \n", 1, "");
}

TEST_F(HwclockTest, SaysWhatTheHostRefuses) {
  const std::string unreadable = "record hardware_chipset_rtc = status 0xbad0003\n";
  Expect(unreadable, {}, "KIF_Get error: 0xbad0003\n", 1, "");
  Expect(unreadable, {"-t", "1:2:3"}, "KIF_Get error: 0xbad0003\n", 1, "");
  Expect(kHost + std::string("set hardware_chipset_rtc = status 0xbad000f\n"), {"-t", "1:2:3"},
         "KIF_Set error: 0xbad000f\n", 1, "(11, 7, 2031, 1, 2, 3)");
}

TEST_F(HwclockTest, WritesNothingFromAnIncompleteList) {
  for (const Surroundings &failing :
       {Failing("KIF_ParamListCreate", 1), Failing("KIF_ParamListAddInt", 6, "0xbad0014")}) {
    const Outcome outcome = Live(kHost, {"hwclock", "-t", "1:2:3"}, failing);
    EXPECT_EQ(outcome.out, "KIF_Get error: 0xbad0014\n");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(Written(), "");
  }
}

TEST_F(HwclockTest, PrintsItsUsage) {
  const struct {
    std::vector<std::string> arguments;
    std::string diagnostic;
  } cases[] = {
      {{"hwclock", "--help"}, ""},
      {{"hwclock", "-h"}, "hwclock: invalid option -- 'h'\n"},
      {{"hwclock", "-t", "1:2:3", "-d"}, "hwclock: option requires an argument -- 'd'\n"},
  };
  for (const auto &test : cases) {
    const Outcome outcome = Live(kHost, test.arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, test.diagnostic + kUsage);
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(Written(), "");
  }
}

}  // namespace
