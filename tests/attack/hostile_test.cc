// Recordings that were made to do harm: every tool shows them without an escape on a terminal,
// writes nowhere else, and ends.
#include <filesystem>
#include <regex>

#include "attack/attack.h"

namespace {

const char kEscape[] = "\\x1b]0;owned\\x07\\x1b[31m\\x9b5m\\r\\n\\x7f";

// Every text field that a tool shows, its size after "~": filled whole.
const char kFilledFields[] = R"(list world = 1
list userworld_cartel = 1
record world_name 1 = name=~128
record world_info 1 = worldID=1 cartelID=1 worldType=4
record sched_Vcpus_stats_affinity 1 = cpuText=~2304
record userworld_cartel_cmdline 1 = cmdline=~1024
list userworld_cartel_fd_fds 1 = 1
record userworld_cartel_fd_fds 1 1 = kind=~96 description=~1984
list userworld_cartel_mem_mmaps 1 = 1
record userworld_cartel_mem_mmaps 1 1 = kind=2 description=~2008
record system_version = product=~32 version=~64 releaseLevel=~64 update=~132
record system_bootCmdLine = commandLine=~4096
record system_bootMAC = address=~24
list system_modules = 1
record system_modules_general 1 = moduleID=1 name=~288
list hardware_pci_seg = 0
list hardware_pci_seg_bus 0 = 0
list hardware_pci_seg_bus_slot 0 0 = 31
list hardware_pci_seg_bus_slot_func 0 0 31 = 2
record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 31 2 = mFlags=2 moduleID=1 name=~33
list system_morelfs_inodes = 1
record system_morelfs_inodes_stats 1 = linkState=-4 tardisk=~128 ramdisk=~128 name=~256
list hardware_acpi_tables = 1
list hardware_acpi_tables_buffers 1 = 0
record hardware_acpi_tables_buffers 1 0 = signature="/../" @4:u8=255 length=1
)";

// A host's text, its lines changed where they match.
std::string Changed(const std::string &lines, const std::string &change, const std::string &host) {
  std::string changed;
  std::istringstream stream(host);
  const size_t bar = change.find('|');
  const std::regex meant(lines), from(change.substr(0, bar));
  for (std::string line; std::getline(stream, line);) {
    const bool isMeant = std::regex_search(line, meant);
    changed += isMeant ? std::regex_replace(line, from, change.substr(bar + 1)) : line;
    changed += '\n';
  }
  return changed;
}

class Hostile : public AttackTest {
 protected:
  // The whole host with `text` at the beginning of every text that a tool shows; three fields are
  // short.
  std::string WithTexts(const std::string &text) const {
    const std::string host =
        Changed("^(?!.*(signature|bootMAC|hba0))",
                "\"(?=[^\"]*\"(?:[^\"]*\"[^\"]*\")*[^\"]*$)|\"" + text, whole_);
    return Changed("signature", "DSDT|\\x1b[1m", Changed("hba0", "hba0|\\x1b]0;\\x07", host));
  }

  // Runs every tool on the host; what it does to the machine is looked at here.
  void RunAll(const std::string &hostText) {
    const std::string host = Record(hostText);
    for (const Command &command : kCommands) {
      RunOn(host, command.Live(), {.environment = {"ASAN_OPTIONS=allocator_may_return_null=1"}});
    }
    // The folder holds files only, and nothing stands beside it but what the test made.
    for (const auto &entry : std::filesystem::directory_iterator(folder_)) {
      EXPECT_TRUE(entry.is_regular_file()) << entry.path();
    }
    for (const auto &entry : std::filesystem::directory_iterator(Scratch())) {
      const std::string name = entry.path().filename();
      EXPECT_TRUE(name == "folder" || name.starts_with("host")) << name;
    }
  }
};

TEST_F(Hostile, EscapesAreNotShownOnATerminal) {
  const std::string host = Record(WithTexts(kEscape));
  for (const Command &command : kCommands) {
    const std::string line = "\"$BIN_DIR\"/zlkkiftools " + command.line;
    const Outcome outcome = RunOn(host, {"script", "-qec", line, "/dev/null"});
    EXPECT_LT(outcome.status, 126) << outcome.out;
    std::string shown = outcome.out;
    // The tree of ps is drawn with escapes of its own.
    if (command.Tool() == "ps" && shown.starts_with("\x1b)0")) shown.erase(0, 3);
    EXPECT_EQ(shown.find_first_of("\x1b\x07\x7f\x9b"), shown.npos) << command.line << shown;
  }
}

TEST_F(Hostile, Texts) {
  RunAll(WithTexts(kEscape));
  RunAll(WithTexts("%s%n%n%1000000d"));
  if (!IsLong()) return;
  RunAll(WithTexts("../../../../etc/x"));
  RunAll(WithTexts(""));
}

TEST_F(Hostile, TextsWithoutAnEnd) {
  std::string host = kFilledFields;
  for (size_t at; (at = host.find('~')) != host.npos;) {
    const size_t digits = host.find_first_not_of("0123456789", at + 1) - at - 1;
    const std::string filling(std::stoul(host.substr(at + 1, digits)), 'z');
    host.replace(at, digits + 1, '"' + filling + '"');
  }
  RunAll(host);
  EXPECT_FALSE(std::filesystem::exists(Scratch() + "/.aml"));
}

TEST_F(Hostile, CountsAndLengthsAtTheirLimits) {
  std::vector<std::string> numbers = {"2147483648", "4294967295"};
  if (IsLong()) numbers.insert(numbers.end(), {"0", "1", "2147483647"});
  for (const std::string &n : numbers) {
    std::string host = whole_;
    for (const auto &[lines, change] : std::vector<std::pair<std::string, std::string>>{
             {"^record (?!.*(pciConfigHeader|_rtc|bootOption|cpuInfo|Usage))",
              "(\\w*[A-Za-z])=[0-9]+|$1=" + n},
             {"^list .*= [0-9 ]+$", "$| " + n},
             {"^content .*abc", "$| length " + n},
             {"pciConfigHeader.*classCode", "=.*|= classCode=65535 infoFlags=255 mFlags=255"},
             {"mmaps 5", "kind=\\w+|kind=2"},
             {"usedTime", "=\\w+|=18446744073709551615"},
             {"cpuInfo", "=2|=1000"},
             {"cookieList =", "33|33 -1 9223372036854775807"}}) {
      host = Changed(lines, change, host);
    }
    RunAll(host);
    std::filesystem::remove_all(folder_);
    WriteFile("folder/file", "");
  }
}

TEST_F(Hostile, InstancesOfTheWrongType) {
  std::string host = "record hardware_cpu_cpuInfo = numPcpus=2\n";
  for (const std::string list :
       {"world", "userworld_cartel", "hardware_pci_seg", "system_modules",
        "hardware_interrupts_cookieList", "hardware_acpi_tables", "system_morelfs_inodes"}) {
    host += "list " + list + " = \"text\" null \"\"\n";
  }
  for (const std::string list :
       {"system_morelfs_tardisks", "system_morelfs_ramdisks", "system_bootOptionFiles"}) {
    host += "list " + list + " = 1 null -1\n";
  }
  RunAll(host);
}

TEST_F(Hostile, CyclesAndStrangers) {
  std::string host = "list world = 1 2 3 4 5\nlist userworld_cartel = 1 9\n";
  const int parents[] = {2, 1, 3, 77, 3};
  for (int world = 1; world <= 5; ++world) {
    const std::string id = std::to_string(world);
    host += "record world_name " + id + " = name=\"w\"\nrecord world_info " + id +
            " = worldID=" + id + " cartelID=" + id +
            " userspaceID=1 worldType=4 parentCartelID=" + std::to_string(parents[world - 1]) +
            "\nlist userworld_cartel_child " + id + " = " + (world > 1 ? "1 " : "") + id +
            "\nrecord userworld_cartel_child " + id + " " + id + " = childState=1\n";
    if (world > 1) host += "record userworld_cartel_child " + id + " 1 = childState=1\n";
  }
  RunAll(host);
  // A root whose children hang in a circle beside it.
  RunAll(host + "record world_info 9 = worldID=9 cartelID=9 userspaceID=1 worldType=4\n");
}

// What still opens of a damaged file is safe to read with every tool.
TEST_F(Hostile, FilesCutAndFlipped) {
  const std::string whole = ReadFile(Record(whole_));
  const size_t step = IsLong() ? 1 : 397;
  size_t tool = 0;
  for (size_t place = 0; place < whole.size(); place += step) {
    std::string flipped = whole;
    flipped[place] = static_cast<char>(flipped[place] ^ (1 << place % 8));
    for (const std::string &bytes : {whole.substr(0, place), flipped}) {
      const std::string file = WriteFile("host.kif", bytes);
      const Command &command = kCommands[++tool % kCommands.size()];
      if (command.onCache) RunOn("none", command.Cached(file));
    }
  }
}

}  // namespace
