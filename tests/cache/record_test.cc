// kifcache record: the file has what the host had.
#include <sys/utsname.h>
#include <unistd.h>

#include "host_fixture.h"

namespace {

const char kKifcache[] = BIN_DIR "/kifcache";

class Recording : public HostTest {
 protected:
  Recording() : file_(Scratch() + "/recorded.kif") {}

  // Records a host that is served from a cache file, and gives what the new file holds.
  std::string Recorded(const std::string &host, std::vector<std::string> options = {}) {
    options.insert(options.begin(), {kKifcache, "record"});
    options.push_back(file_);
    const Outcome outcome =
        Run(options, {.environment = {"ZELLIBS_HOST=" + host, "SOURCE_DATE_EPOCH=100"}});
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(outcome.err, "");
    return Dump(file_);
  }

  std::string Dump(const std::string &file) { return Run({kKifcache, "dump", file}).out; }

  // What a dump has behind the facts.
  static std::string Answers(const std::string &dump) {
    return dump.substr(dump.find("\nlist ") + 1);
  }

  std::string file_;
};

// Every way in which the table of nodes finds instances.
const char kHost[] = R"host(list hardware_acpi_tables = 7 7
list hardware_acpi_tables_buffers 7 = 100 100
record hardware_acpi_tables_buffers 7 0 = signature="DSDT" length=1 @9:hex=01
record hardware_acpi_tables_buffers 7 1 = signature="DSDT" length=1 @9:hex=02
record hardware_cpu_cpuInfo = numPcpus=2
list hardware_interrupts_cookieList = 33
record hardware_interrupts_cookieList_PCPU 33 0 = count=5
record hardware_interrupts_cookieList_PCPU 33 1 = status 0xbad0001
record hardware_interrupts_cookieList_UsageStatus 33 = usage=1
list hardware_interrupts_cookieList_ZLKDevices 33 = "nic0" null ""
list hardware_pci_seg = 0
list hardware_pci_seg_bus 0 = 1 3
list hardware_pci_seg_bus_slot 0 1 = status 0xbad000f
list hardware_pci_seg_bus_slot 0 3 = 31
list hardware_pci_seg_bus_slot_func 0 3 31 = 7
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 3 31 7 = vendorID=32902
record sched_Vcpus_stats_stateTimes 1 = usedTime=12
record sched_globalStats_numPcpus = status 0xbad0004
record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory1MinInPct 0 = loadInPct=7
record system_bootCmdLine = commandLine="/boot/vmlinuz root=/dev/sda1 quiet a=\"b secret\" -- a=b secret"
record system_bootMAC = address="01-secret"
list system_bootOptionFiles = "gone" "grub" "sealed"
content system_bootOptionFiles_content "grub" = "linux root=x\n"
content system_bootOptionFiles_content "sealed" = length 9 status 0xbad000f
list system_morelfs_tardisks = "a.tgz" null
record system_morelfs_tardisks_stats "a.tgz" = used=1
list userworld_cartel = 1 4
list userworld_cartel_child 1 = 4 -9
record userworld_cartel_child 1 -9 = childState=1
record userworld_cartel_cmdline 1 = cmdline="/bin/init --key secret"
record userworld_cartel_cmdline 3 = cmdline="/bin/unlisted"
record userworld_cartel_cmdline 4 = status 0xbad0062
list userworld_cartel_fd_fds 1 = 3 4
record userworld_cartel_fd_fds 1 3 = kind="SOCKET" description="TCP secret:22 (LISTEN)"
record userworld_cartel_fd_fds 1 4 = kind="FILE" description="/a file"
list world = 1 2 5 5
record world_info 1 = worldID=1 cartelID=1
record world_info 2 = worldID=2 cartelID=3
record world_info 4 = worldID=4 cartelID=4
record world_name 1 = name="init" @10:hex=ff
)host";

TEST_F(Recording, HasEveryAnswerOfTheHost) {
  // What a file has not is not found, too.
  EXPECT_EQ(
      Answers(Recorded(Record(kHost + std::string("record world_name 5 = status 0xbad0003\n")))),
      Answers(Dump(Record(kHost))));
  const std::string first = ReadFile(file_);
  Recorded(Record(kHost));
  EXPECT_EQ(ReadFile(file_), first);
}

TEST_F(Recording, KeepsPrivateThingsOutOnRequest) {
  const std::string redacted = Recorded(Record(kHost), {"--redact"});
  EXPECT_EQ(redacted.find("secret"), redacted.npos) << redacted;
  for (const char *kept :
       {"commandLine=\"/boot/vmlinuz root=… quiet a=… -- …\"\n", "cmdline=\"/bin/init …\"\n",
        "cmdline=\"/bin/unlisted\"\n", "description=\"TCP …\"\n", "description=\"/a file\"\n",
        "address=\"…\"\n", "system_bootOptionFiles_content \"grub\" = \"…\"\n",
        "userworld_cartel_cmdline 4 = status 0xbad0062\n"}) {
    EXPECT_NE(redacted.find(kept), redacted.npos) << kept << redacted;
  }
}

TEST_F(Recording, EndsOnAHostWithoutEnd) {
  const std::string recorded = Recorded(
      Record("record hardware_cpu_cpuInfo = numPcpus=4294967295\n"
             "list hardware_interrupts_cookieList = 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16\n"
             "list system_bootOptionFiles = \"huge\"\n"
             "content system_bootOptionFiles_content \"huge\" = length 4294967295\n"));
  for (const char *said :
       {"host lack \"hardware_interrupts_cookieList_PCPU\" limits status 0x0 count 68717379568\n",
        "host lack \"system_bootOptionFiles_content\" limits status 0x0 count 1\n",
        "\"huge\" = length 4294967295 status 0xbad0011\n"}) {
    EXPECT_NE(recorded.find(said), recorded.npos) << said << recorded;
  }
}

// Where the kernel of the host is not this machine's, the machine is not either.
TEST_F(Recording, TellsOfTheMachineIfItIsThisOne) {
  struct utsname names;
  ASSERT_EQ(uname(&names), 0);
  const auto facts = [this](const std::string &text) {
    const std::string dump =
        Recorded(Record("host kernelBuildDate \"a day\"\n" + text + "list world =\n"));
    return dump.substr(0, dump.find("host recorder"));
  };
  const std::string version = "record system_version = product=\"Other\" version=\"";
  const std::string here = "host name \"" + std::string(names.nodename) + "\"\nhost system \"" +
                           names.sysname + "\"\nhost release \"" + names.release +
                           "\"\nhost architecture \"" + names.machine + "\"\n";
  EXPECT_EQ(facts(version + "0.1\"\n"), "host system \"Other\"\nhost release \"0.1\"\n");
  EXPECT_EQ(facts(version + names.release + "\"\n"), here);
  EXPECT_EQ(facts(""), here);
  const std::string dump = Dump(file_);
  const std::string rights = geteuid() == 0 ? "root" : "user " + std::to_string(geteuid());
  EXPECT_NE(dump.find("host rights \"" + rights + "\"\nhost kernelBuildDate \"a day\"\n"),
            dump.npos);
  EXPECT_NE(dump.find("host begin 100\nhost end 100\n"), dump.npos) << dump;
}

TEST_F(Recording, OfNoHostIsRefused) {
  const auto message = [this](const std::string &host) {
    return Run({kKifcache, "record", file_}, {.environment = {"ZELLIBS_HOST=" + host}}).err;
  };
  EXPECT_EQ(message("none"), "kifcache: there is no host to record\n");
  EXPECT_EQ(message(Record("host minorVersion 0\nhost signature 0x1\n")),
            "kifcache: the host cannot be recorded: Failure\n");
  EXPECT_NE(access(file_.c_str(), F_OK), 0);
}

}  // namespace
