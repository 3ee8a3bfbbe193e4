// What the tests under tests/attack share: a host with something of everything, and a command line
// for everything that a tool does.
#pragma once

#include <cstdlib>
#include <string>
#include <vector>

// No process has the IDs of this host: they are above what the kernel gives.
inline constexpr char kWholeHost[] = R"(
list world = 5000001 5000002 5000003 7 5000009
record world_name 5000001 = name="init"
record world_info 5000001 = worldID=5000001 groupID=1 userspaceID=1 cartelID=5000001 worldType=4
record world_name 5000002 = name="daemon"
record world_info 5000002 = worldID=5000002 groupID=2 userspaceID=1 cartelID=5000002 parentCartelID=5000001 worldType=4
record world_name 5000003 = name="thread"
record world_info 5000003 = worldID=5000003 userspaceID=1 cartelID=5000002 parentCartelID=5000002 worldType=36
record world_name 7 = name="idle0"
record world_info 7 = worldID=7 worldType=3
record sched_Vcpus_stats_summaryStats 5000001 = runState=1 waitState=1
record sched_Vcpus_stats_affinity 5000001 = cpuText="0-1"
record sched_Vcpus_stats_stateTimes 5000001 = usedTime=1050000
list userworld_cartel = 5000001 5000002
record userworld_cartel_cmdline 5000001 = cmdline="/sbin/init --all"
record userworld_cartel_cmdline 5000002 = cmdline="daemon -d"
list userworld_cartel_child 5000001 = 5000002 5000008
record userworld_cartel_child 5000001 5000002 =
record userworld_cartel_child 5000001 5000008 = childState=1
list userworld_cartel_fd_fds 5000001 = 0 1
record userworld_cartel_fd_fds 5000001 0 = kind="FILE" description="/etc/a"
record userworld_cartel_fd_fds 5000001 1 = kind="PIPE" description="pipe:[1]"
list userworld_cartel_mem_mmaps 5000001 = 4096
record userworld_cartel_mem_mmaps 5000001 4096 = length=4096 kind=2 protection=3 description="/lib/x"
record system_ntpclock_upTime = seconds=90061
record sched_globalStats_numPcpus = numPcpus=2
record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory1MinInPct 0 = loadInPct=150
record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory5MinInPct 0 = loadInPct=50
record sched_groups_stats_cpuStatsDir_cpuLoadHistory_cpuLoadHistory15MinInPct 0 = loadInPct=5
list hardware_pci_seg = 0
list hardware_pci_seg_bus 0 = 0
list hardware_pci_seg_bus_slot 0 0 = 31
list hardware_pci_seg_bus_slot_func 0 0 31 = 0 2
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 31 0 = vendorID=32902 deviceID=10520 classCode=1537
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 31 2 = vendorID=32902 deviceID=10530 classCode=262 irq=16 infoFlags=1 mFlags=2 moduleID=1 name="hba0"
record hardware_pci_seg_bus_slot_func_pciConfigSpace 0 0 31 2 = @0:u32=690127990
record hardware_pci_seg_bus_slot_func_pciExtConfigSpace 0 0 31 2 = @256:u32=1
record hardware_pci_seg_bus_slot_func_pciConfigSpace 0 0 31 0 = @0:u32=690127990
record hardware_pci_seg_bus_slot_func_pciExtConfigSpace 0 0 31 0 = @256:u32=1
list system_modules = 1
record system_modules_general 1 = name="ahci" moduleID=1
record hardware_chipset_rtc = hour=4 minute=5 second=59 day=7 month=11 year=2031
record system_version = product="Nevra" version="7.0" releaseLevel="GA" update="1" buildNumber=123
record system_bootOption = auditMode=1
record system_bootCmdLine = commandLine="kernel.gz opt1 opt2"
record system_bootMAC = address="00:50:56:00:00:01"
list system_bootOptionFiles = "boot.cfg" "empty"
content system_bootOptionFiles_content "boot.cfg" = "abc\n"
content system_bootOptionFiles_content "empty" =
record hardware_cpu_cpuInfo = numPcpus=2
list hardware_interrupts_cookieList = 33
record hardware_interrupts_cookieList_UsageStatus 33 = usage=2
record hardware_interrupts_cookieList_PCPU 33 0 = count=1200
record hardware_interrupts_cookieList_PCPU 33 1 = count=1
list hardware_interrupts_cookieList_ZLKDevices 33 = "nic0" "hba1"
list hardware_acpi_tables = 1
list hardware_acpi_tables_buffers 1 = 0 0
record hardware_acpi_tables_buffers 1 0 = signature="DSDT" @4:u8=0 length=3 @9:text="abc"
record hardware_acpi_tables_buffers 1 1 = signature="DSDT" @4:u8=255 length=3 @9:text="def"
list system_morelfs_tardisks = "boot"
record system_morelfs_tardisks_stats "boot" = used=5000 usedToBoot=1
list system_morelfs_ramdisks = "tmp"
record system_morelfs_ramdisks_stats "tmp" = minimum=32 maximum=32 used=1000 peakUsed=2000
list system_morelfs_inodes = 11 12
record system_morelfs_inodes_stats 11 = flags=1 linkState=-4 size=4096 tardisk="boot" name="gone"
record system_morelfs_inodes_stats 12 = flags=1 size=4096 ramdisk="tmp" name="here"
)";

struct Command {
  std::vector<std::string> arguments;
  bool onCache = true;  // whether a cache run does it too
};

// Every tool with what makes it go another way; after "live", where a recording does not serve it.
inline constexpr char kCommandLines[] =
    "lspci;lspci -v;lspci -n;lspci -p;lspci -e;lspci -nd;ps;ps -ugjstTPZv;ps -Ciz;ps -Jcv;ps -JnN;"
    "ps -U1;ps -U9;ps -cU;hwclock;hwclock -t 01:02:03 -d 04/05/2026;zelvar;zelvar -v;zelvar -l;"
    "irqinfo;bootOption -a;bootOption -pkmob;bootOption -r -k;live bootOption -c boot.cfg;"
    "live bootOption -C;amldump;pci-info -n 0 -b 0 -s 31 -f 2 -i;pci-info -n 0 -b 0 -s 31 -f 2 -h;"
    "pci-info -n 0 -b 0 -s 31 -f 2 -c;pci-info -n 0 -b 0 -s 31 -f 2 -e;"
    "pci-info -n 0 -b 0 -s 31 -f 2 -S;pidof init daemon sleep;"
    "pidof -s -x -o 5000001 daemon;userspaceof 5000001;live mdu;live mdu -ah;live mdu -u;lsof;mdf;"
    "mdf -h;mdf -p;live pkill init daemon;live pkill -9 -f all;pgrep .;pgrep -flv daemon;uptime;";

inline std::vector<Command> Commands() {
  std::vector<Command> commands(1);
  std::string word;
  for (const char c : std::string(kCommandLines)) {
    Command &last = commands.back();
    if (c != ' ' && c != ';') {
      word += c;
    } else if (word == "live") {
      last.onCache = false;
      word.clear();
    } else {
      last.arguments.push_back(std::move(word));
      word.clear();
    }
    if (c == ';') commands.emplace_back();
  }
  commands.pop_back();
  return commands;
}

inline const std::vector<Command> kCommands = Commands();

// Whether it changes nothing on this machine.
inline bool IsHarmlessHere(const Command &command) {
  const std::string &tool = command.arguments[0];
  return tool != "pkill" && tool != "mdu" && !(tool == "hwclock" && command.arguments.size() > 1);
}

// The long way through, asked for by ./test --all; the short one takes samples.
inline bool IsLong() {
  return getenv("ATTACK_LONG") != nullptr;
}

inline std::string Describe(const std::vector<std::string> &arguments) {
  std::string text;
  for (const std::string &argument : arguments) text += (text.empty() ? "" : " ") + argument;
  return text;
}
