// kifcache record: the file has what the host had.
#include <unistd.h>

#include "host_fixture.h"

namespace {

const char kKifcache[] = BIN_DIR "/kifcache";

class Recording : public HostTest {
 protected:
  // Records the host of a text, served live, and gives what the new file holds, without the facts.
  std::string Recorded(const std::string &text, std::vector<std::string> options = {}) {
    const std::string host = Record(text);
    const std::string file = Scratch() + "/recorded.kif";
    options.insert(options.begin(), {kKifcache, "record"});
    options.push_back(file);
    const Outcome outcome =
        Run(options, {.environment = {"ZELLIBS_HOST=" + host, "SOURCE_DATE_EPOCH=100"}});
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(outcome.err, "");
    return Answers(file);
  }

  std::string Answers(const std::string &file) {
    const std::string dump = Run({kKifcache, "dump", file}).out;
    std::string answers;
    for (size_t start = 0; start < dump.size();) {
      const size_t end = dump.find('\n', start) + 1;
      const std::string line = dump.substr(start, end - start);
      if (line.compare(0, 5, "host ") != 0 || line.find("omitted") != line.npos) answers += line;
      start = end;
    }
    return answers;
  }
};

// Every way in which the table of nodes finds instances.
const char kHost[] =
    "list hardware_acpi_tables = 7 7\n"
    "list hardware_acpi_tables_buffers 7 = 100 100\n"
    "record hardware_acpi_tables_buffers 7 0 = signature=\"DSDT\" length=1 @9:hex=01\n"
    "record hardware_acpi_tables_buffers 7 1 = signature=\"DSDT\" length=1 @9:hex=02\n"
    "record hardware_cpu_cpuInfo = numPcpus=2\n"
    "list hardware_interrupts_cookieList = 33\n"
    "record hardware_interrupts_cookieList_PCPU 33 0 = count=5\n"
    "record hardware_interrupts_cookieList_PCPU 33 1 = status 0xbad0001\n"
    "record hardware_interrupts_cookieList_UsageStatus 33 = usage=1\n"
    "list hardware_interrupts_cookieList_ZLKDevices 33 = \"nic0\" null \"\"\n"
    "list hardware_pci_seg = 0\n"
    "list hardware_pci_seg_bus 0 = 1 3\n"
    "list hardware_pci_seg_bus_slot 0 1 = status 0xbad000f\n"
    "list hardware_pci_seg_bus_slot 0 3 = 31\n"
    "list hardware_pci_seg_bus_slot_func 0 3 31 = 7\n"
    "record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 3 31 7 = vendorID=32902\n"
    "record sched_Vcpus_stats_stateTimes 1 = usedTime=12\n"
    "record sched_globalStats_numPcpus = status 0xbad0004\n"
    "record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory1MinInPct 0 = "
    "loadInPct=7\n"
    "record system_bootCmdLine = commandLine=\"/boot/vmlinuz root=/dev/sda1 quiet -- a=b secret\"\n"
    "record system_bootMAC = address=\"01-secret\"\n"
    "list system_bootOptionFiles = \"gone\" \"grub\" \"sealed\"\n"
    "content system_bootOptionFiles_content \"grub\" = \"linux root=x\\n\"\n"
    "content system_bootOptionFiles_content \"sealed\" = length 9 status 0xbad000f\n"
    "list system_morelfs_tardisks = \"a.tgz\" null\n"
    "record system_morelfs_tardisks_stats \"a.tgz\" = used=1\n"
    "list userworld_cartel = 1 4\n"
    "list userworld_cartel_child 1 = 4 -9\n"
    "record userworld_cartel_child 1 -9 = childState=1\n"
    "record userworld_cartel_cmdline 1 = cmdline=\"/bin/init --key secret\"\n"
    "record userworld_cartel_cmdline 3 = cmdline=\"/bin/unlisted\"\n"
    "record userworld_cartel_cmdline 4 = status 0xbad0062\n"
    "list userworld_cartel_fd_fds 1 = 3 4\n"
    "record userworld_cartel_fd_fds 1 3 = kind=\"SOCKET\" description=\"TCP secret:22 (LISTEN)\"\n"
    "record userworld_cartel_fd_fds 1 4 = kind=\"FILE\" description=\"/a file\"\n"
    "list world = 1 2 5 5\n"
    "record world_info 1 = worldID=1 cartelID=1\n"
    "record world_info 2 = worldID=2 cartelID=3\n"
    "record world_info 4 = worldID=4 cartelID=4\n"
    "record world_name 1 = name=\"init\" @10:hex=ff\n"
    "record world_name 5 = status 0xbad0003\n";

TEST_F(Recording, HasEveryAnswerOfTheHost) {
  std::string expected = kHost;
  // What a file has not is not found, too.
  const std::string notFound = "record world_name 5 = status 0xbad0003\n";
  expected.erase(expected.find(notFound), notFound.size());
  EXPECT_EQ(Recorded(kHost), Answers(Record(expected)));
}

TEST_F(Recording, OfTheSameHostIsTheSameFile) {
  Recorded(kHost);
  const std::string first = ReadFile(Scratch() + "/recorded.kif");
  Recorded(kHost);
  EXPECT_EQ(ReadFile(Scratch() + "/recorded.kif"), first);
}

TEST_F(Recording, KeepsPrivateThingsOutOnRequest) {
  const std::string redacted = Recorded(kHost, {"--redact"});
  EXPECT_EQ(redacted.find("secret"), redacted.npos);
  EXPECT_NE(redacted.find("commandLine=\"/boot/vmlinuz root=… quiet -- …\"\n"), redacted.npos);
  EXPECT_NE(redacted.find("cmdline=\"/bin/init …\"\n"), redacted.npos);
  EXPECT_NE(redacted.find("cmdline=\"/bin/unlisted\"\n"), redacted.npos);
  EXPECT_NE(redacted.find("description=\"TCP …\"\n"), redacted.npos);
  EXPECT_NE(redacted.find("description=\"/a file\"\n"), redacted.npos);
  EXPECT_NE(redacted.find("address=\"…\"\n"), redacted.npos);
  EXPECT_NE(redacted.find("system_bootOptionFiles_content \"grub\" = \"…\"\n"), redacted.npos);
  EXPECT_NE(redacted.find("userworld_cartel_cmdline 4 = status 0xbad0062\n"), redacted.npos);
}

TEST_F(Recording, EndsOnAHostWithoutEnd) {
  const std::string recorded = Recorded(
      "record hardware_cpu_cpuInfo = numPcpus=4294967295\n"
      "list hardware_interrupts_cookieList = 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16\n"
      "list system_bootOptionFiles = \"huge\"\n"
      "content system_bootOptionFiles_content \"huge\" = length 4294967295\n");
  EXPECT_NE(recorded.find("host omitted \"hardware_interrupts_cookieList_PCPU: "), recorded.npos);
  EXPECT_NE(recorded.find("host omitted \"system_bootOptionFiles_content: 1 answer\"\n"),
            recorded.npos);
  EXPECT_NE(recorded.find("\"huge\" = length 4294967295 status 0xbad0011\n"), recorded.npos);
}

TEST_F(Recording, OfNoHostIsRefused) {
  const std::string file = Scratch() + "/none.kif";
  const Outcome none = Run({kKifcache, "record", file}, {.environment = {"ZELLIBS_HOST=none"}});
  EXPECT_EQ(none.status, 1);
  EXPECT_EQ(none.err, "kifcache: there is no host to record\n");
  const std::string other = Record("host signature 0x1\n");
  EXPECT_EQ(Run({kKifcache, "record", file}, {.environment = {"ZELLIBS_HOST=" + other}}).err,
            "kifcache: the host cannot be recorded: Failure\n");
  EXPECT_NE(access(file.c_str(), F_OK), 0);
}

TEST_F(Recording, OfThisMachineIsWhole) {
  const std::string file = Scratch() + "/machine.kif";
  EXPECT_EQ(Run({kKifcache, "record", file}).status, 0);
  EXPECT_EQ(Run({kKifcache, "check", file}).status, 0);
  const std::string text = WriteFile("machine.txt", Run({kKifcache, "dump", file}).out);
  EXPECT_EQ(Run({kKifcache, "build", text, file + "2"}).status, 0);
  EXPECT_EQ(ReadFile(file), ReadFile(file + "2"));
  EXPECT_EQ(Run({BIN_DIR "/zlkkiftools", "-c", file, "uptime"}).status, 0);
}

}  // namespace
