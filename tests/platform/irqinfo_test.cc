#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kHost[] = R"(
record hardware_cpu_cpuInfo = numPcpus=2
list hardware_interrupts_cookieList = 33 0 -1
record hardware_interrupts_cookieList_UsageStatus 33 = usage=2
record hardware_interrupts_cookieList_UsageStatus 0 = @4:u32=1
record hardware_interrupts_cookieList_UsageStatus -1 = usage=1
record hardware_interrupts_cookieList_PCPU 33 0 = count=1200
record hardware_interrupts_cookieList_PCPU 33 1 =
record hardware_interrupts_cookieList_PCPU 0 0 = status 0xbad0003
record hardware_interrupts_cookieList_PCPU 0 1 = count=12345678901
record hardware_interrupts_cookieList_PCPU -1 0 = count=18446744073709551615
record hardware_interrupts_cookieList_PCPU -1 1 = count=7
list hardware_interrupts_cookieList_ZLKDevices 33 = "nic0" "hba1"
list hardware_interrupts_cookieList_ZLKDevices 0 = "unseen"
list hardware_interrupts_cookieList_ZLKDevices -1 = null "100%s"
)";

class IrqinfoTest : public HostTest {
 protected:
  // The device text of an interrupt whose devices are `devices`, in a table without processors.
  std::string Devices(const std::string &devices) {
    const Outcome outcome = Cache(
        "record hardware_cpu_cpuInfo =\nlist hardware_interrupts_cookieList = 65536\n"
        "record hardware_interrupts_cookieList_UsageStatus 65536 = usage=1\n"
        "list hardware_interrupts_cookieList_ZLKDevices 65536 = " +
            devices + "\n",
        {"irqinfo"});
    EXPECT_EQ(outcome.err, "");
    EXPECT_EQ(outcome.status, 0);
    const std::string before = "Cookie \n0x10000:";
    EXPECT_TRUE(outcome.out.starts_with(before) && outcome.out.ends_with('\n')) << outcome.out;
    return outcome.out.substr(before.size(), outcome.out.size() - before.size() - 1);
  }

  void ExpectFailure(const std::string &host, const std::string &out, const std::string &err) {
    const Outcome outcome = Live(host, {"irqinfo"});
    EXPECT_EQ(outcome.out, out);
    EXPECT_EQ(outcome.err, err);
    EXPECT_EQ(outcome.status, 1);
  }
};

TEST_F(IrqinfoTest, PrintsARowForEachCookie) {
  const Outcome outcome = Live(kHost, {"irqinfo"});
  EXPECT_EQ(outcome.out,
            "Cookie    PCPU  0    PCPU  1 \n"
            "0x0021:      1200          0 ZLK nic0, ZLK hba1\n"
            "0x0000:           12345678901 <ZLK device>\n"
            "0xffffffffffffffff:18446744073709551615          7 ZLK device, ZLK 100%s\n");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(IrqinfoTest, CutsTheDevicesAt63Characters) {
  EXPECT_EQ(Devices(""), "");
  EXPECT_EQ(Devices("\"\""), "ZLK ");
  const std::string name(59, 'n');
  EXPECT_EQ(Devices("\"" + name + "\""), "ZLK " + name);
  EXPECT_EQ(Devices("\"" + name + "\" \"b\""), "ZLK " + name);
  EXPECT_EQ(Devices("\"" + name + "x\" \"b\""), "ZLK " + name);
  EXPECT_EQ(Devices("\"" + name.substr(2) + "\" \"b\""), "ZLK " + name.substr(2) + ", ");
  EXPECT_EQ(Devices("\"" + name.substr(9) + "\" \"bcd\""), "ZLK " + name.substr(9) + ", ZLK bcd");
}

TEST_F(IrqinfoTest, EndsAtTheFirstFailure) {
  const std::string cpus = "record hardware_cpu_cpuInfo = numPcpus=1\n";
  const std::string header = "Cookie    PCPU  0 \n";
  const std::string two = cpus + "list hardware_interrupts_cookieList = 6000000000 2\n";
  ExpectFailure("", "", "InterruptInfo: error fetching number of CPUs - 0xbad0003\n");
  ExpectFailure(cpus, "", "InterruptInfo: error fetching interrupt list - 0xbad0003\n");
  ExpectFailure(two, header, "InterruptInfo: error fetching interrupt info - 0x165a0bc00\n");
  ExpectFailure(two + "record hardware_interrupts_cookieList_UsageStatus 6000000000 =\n",
                header + "0x165a0bc00:           ",
                "InterruptInfo: error fetching interrupt device list - 0xbad0003\n");
}

TEST_F(IrqinfoTest, SurvivesFailingOperations) {
  const std::string header = "Cookie    PCPU  0    PCPU  1 \n";
  const struct {
    const char *operation;
    int call;
    std::string out, err;
  } cases[] = {
      {"KIF_ParamListCreate", 1, "", "InterruptInfo: Not enough memory\n"},
      {"KIF_ParamListAddInt", 1, header,
       "Couldn't add param to list: 0xbad0001"
       "InterruptInfo: error requesting interrupt info - 0x0\n"},
      {"KIF_ParamListAddInt", 3, header + "0x0021:      1200 ",
       "Couldn't add param to list: 0xbad0001"},
  };
  for (const auto &test : cases) {
    const Outcome outcome = Live(kHost, {"irqinfo"}, Failing(test.operation, test.call));
    EXPECT_EQ(outcome.out, test.out);
    EXPECT_EQ(outcome.err, test.err);
    EXPECT_EQ(outcome.status, 1);
  }
}

TEST_F(IrqinfoTest, TakesNoArguments) {
  const Outcome outcome = Live(kHost, {"irqinfo", "-h"});
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "irqinfo:      List interrupt information\n");
  EXPECT_EQ(outcome.status, 1);
}

}  // namespace
