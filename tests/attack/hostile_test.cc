// Recordings that were made to do harm: every tool shows them without an escape on a terminal,
// writes nowhere else, and ends.
#include <fcntl.h>
#include <pty.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <regex>
#include <sstream>

#include "attack/attack.h"
#include "host_fixture.h"

namespace {

const char kEscape[] = "\\x1b]0;owned\\x07\\x1b[31m\\x9b5m\\r\\n\\x7f";

// A text field of `size` bytes that fills it whole.
std::string Filling(size_t size) {
  std::string text;
  while (text.size() < size) text += '~';
  return "\"" + text + "\"";
}

// The whole host, its lines changed where they match.
std::string Changed(const std::string &lines, const std::string &change,
                    const std::string &host = kWholeHost) {
  std::string changed;
  std::istringstream stream(host);
  for (std::string line; std::getline(stream, line);) {
    const bool isMeant = std::regex_search(line, std::regex(lines));
    const size_t bar = change.find('|');
    changed += isMeant ? std::regex_replace(line, std::regex(change.substr(0, bar)),
                                            change.substr(bar + 1))
                       : line;
    changed += '\n';
  }
  return changed;
}

// With `text` at the beginning of every text that a tool shows; three fields are short.
std::string WithTexts(const std::string &text) {
  const std::string host = Changed("^(?!.*(signature|bootMAC|hba0))",
                                   "\"(?=[^\"]*\"(?:[^\"]*\"[^\"]*\")*[^\"]*$)|\"" + text);
  return Changed("signature", "DSDT|\\x1b[1m", Changed("hba0", "hba0|\\x1b]0;\\x07", host));
}

class Hostile : public HostTest {
 protected:
  Hostile() {
    std::filesystem::create_directory(Scratch() + "/folder");
    WriteFile("folder/file", "");
  }

  std::vector<std::string> CommandLine(const Command &command) const {
    std::vector<std::string> commandLine = {BIN_DIR "/zlkkiftools"};
    commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
    return commandLine;
  }

  // Runs every tool on the host; what it does to the machine is looked at here.
  void RunAll(const std::string &hostText) {
    const std::string host = Record(hostText);
    for (const Command &command : kCommands) {
      const Outcome outcome =
          Run(CommandLine(command),
              {.environment = {"ZELLIBS_HOST=" + host, "ASAN_OPTIONS=allocator_may_return_null=1"},
               .directory = Scratch() + "/folder"});
      const std::string what = Describe(command.arguments) + "\n" + outcome.err;
      EXPECT_GE(outcome.status, 0) << what;
      EXPECT_EQ(outcome.err.find("ERROR: "), outcome.err.npos) << what;
      EXPECT_EQ(outcome.err.find("runtime error"), outcome.err.npos) << what;
    }
    // The folder holds files only, and nothing stands beside it but what the test made.
    for (const auto &entry : std::filesystem::directory_iterator(Scratch() + "/folder")) {
      EXPECT_TRUE(entry.is_regular_file()) << entry.path();
    }
    for (const auto &entry : std::filesystem::directory_iterator(Scratch())) {
      const std::string name = entry.path().filename();
      EXPECT_TRUE(name == "folder" || name.starts_with("host")) << name;
    }
  }

  // What a command line shows on a terminal.
  std::string OnTerminal(const std::vector<std::string> &commandLine, const std::string &host) {
    int terminal;
    const pid_t child = forkpty(&terminal, nullptr, nullptr, nullptr);
    if (child == 0) {
      setenv("ZELLIBS_HOST", host.c_str(), 1);
      std::vector<char *> arguments;
      for (const std::string &argument : commandLine) {
        arguments.push_back(const_cast<char *>(argument.c_str()));
      }
      arguments.push_back(nullptr);
      if (chdir((Scratch() + "/folder").c_str()) == 0) execv(arguments[0], arguments.data());
      _exit(127);
    }
    std::string shown;
    char block[4096];
    for (ssize_t got; (got = read(terminal, block, sizeof(block))) > 0;) {
      shown.append(block, static_cast<size_t>(got));
    }
    close(terminal);
    waitpid(child, nullptr, 0);
    return shown;
  }
};

TEST_F(Hostile, EscapesAreNotShownOnATerminal) {
  const std::string host = Record(WithTexts(kEscape));
  for (const Command &command : kCommands) {
    std::string shown = OnTerminal(CommandLine(command), host);
    // The tree of ps is drawn with escapes of its own.
    if (command.arguments[0] == "ps" && shown.starts_with("\x1b)0")) shown.erase(0, 3);
    for (const char bad : {'\x1b', '\x07', '\x7f', '\x9b'}) {
      EXPECT_EQ(shown.find(bad), shown.npos) << Describe(command.arguments) << "\n" << shown;
    }
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
  RunAll(
      "list world = 1\nlist userworld_cartel = 1\nrecord world_name 1 = name=" + Filling(128) +
      "\nrecord world_info 1 = worldID=1 cartelID=1 worldType=4\n"
      "record sched_Vcpus_stats_affinity 1 = cpuText=" +
      Filling(2304) + "\nrecord userworld_cartel_cmdline 1 = cmdline=" + Filling(1024) +
      "\nlist userworld_cartel_fd_fds 1 = 1\nrecord userworld_cartel_fd_fds 1 1 = kind=" +
      Filling(96) + " description=" + Filling(1984) +
      "\nlist userworld_cartel_mem_mmaps 1 = 1\n"
      "record userworld_cartel_mem_mmaps 1 1 = kind=2 description=" +
      Filling(2008) + "\nrecord system_version = product=" + Filling(32) +
      " version=" + Filling(64) + " releaseLevel=" + Filling(64) + " update=" + Filling(132) +
      "\nrecord system_bootCmdLine = commandLine=" + Filling(4096) +
      "\nrecord system_bootMAC = address=" + Filling(24) +
      "\nlist system_modules = 1\nrecord system_modules_general 1 = moduleID=1 name=" +
      Filling(288) +
      "\nlist hardware_pci_seg = 0\nlist hardware_pci_seg_bus 0 = 0\n"
      "list hardware_pci_seg_bus_slot 0 0 = 31\nlist hardware_pci_seg_bus_slot_func 0 0 31 = 2\n"
      "record hardware_pci_seg_bus_slot_func_pciConfigHeader 0 0 31 2 = mFlags=2 moduleID=1 name=" +
      Filling(33) +
      "\nlist system_morelfs_inodes = 1\nrecord system_morelfs_inodes_stats 1 = linkState=-4 "
      "tardisk=" +
      Filling(128) + " ramdisk=" + Filling(128) + " name=" + Filling(256) +
      "\nlist hardware_acpi_tables = 1\nlist hardware_acpi_tables_buffers 1 = 0\n"
      "record hardware_acpi_tables_buffers 1 0 = signature=\"/../\" @4:u8=255 length=1\n");
  EXPECT_FALSE(std::filesystem::exists(Scratch() + "/.aml"));
}

TEST_F(Hostile, CountsAndLengthsAtTheirLimits) {
  std::vector<std::string> numbers = {"2147483648", "4294967295"};
  if (IsLong()) numbers.insert(numbers.end(), {"0", "1", "2147483647"});
  for (const std::string &n : numbers) {
    std::string host = Changed("^record (?!.*(pciConfigHeader|_rtc|bootOption|cpuInfo|Usage))",
                               "(\\w*[A-Za-z])=[0-9]+|$1=" + n);
    host = Changed("^list .*= [0-9 ]+$", "$| " + n, host);
    host = Changed("^content .*abc", "$| length " + n, host);
    host = Changed("pciConfigHeader.*classCode", "=.*|= classCode=65535 infoFlags=255 mFlags=255",
                   host);
    host = Changed("mmaps 5", "kind=\\w+|kind=2", host);
    host = Changed("usedTime", "=\\w+|=18446744073709551615", host);
    host = Changed("cpuInfo", "=2|=1000", host);
    RunAll(Changed("cookieList =", "33|33 -1 9223372036854775807", host));
    std::filesystem::remove_all(Scratch() + "/folder");
    WriteFile("folder/file", "");
  }
}

TEST_F(Hostile, InstancesOfTheWrongType) {
  std::string host;
  for (const char *list :
       {"world", "userworld_cartel", "hardware_pci_seg", "system_modules",
        "hardware_interrupts_cookieList", "hardware_acpi_tables", "system_morelfs_inodes"}) {
    host += std::string("list ") + list + " = \"text\" null \"\"\n";
  }
  for (const char *list :
       {"system_morelfs_tardisks", "system_morelfs_ramdisks", "system_bootOptionFiles"}) {
    host += std::string("list ") + list + " = 1 null -1\n";
  }
  RunAll(host + "record hardware_cpu_cpuInfo = numPcpus=2\n");
}

TEST_F(Hostile, CyclesAndStrangers) {
  std::string host = "list world = 1 2 3 3 4 5\nlist userworld_cartel = 1 1 9\n";
  const int parents[] = {2, 1, 3, 77, 3};
  for (int world = 1; world <= 5; ++world) {
    const std::string id = std::to_string(world);
    host += "record world_name " + id + " = name=\"w\"\nrecord world_info " + id +
            " = worldID=" + id + " cartelID=" + id +
            " userspaceID=1 worldType=4 parentCartelID=" + std::to_string(parents[world - 1]) +
            "\nlist userworld_cartel_child " + id + " = 1 2 3 " + id +
            "\nrecord userworld_cartel_child " + id + " " + id + " = childState=1\n";
    if (world > 1) host += "record userworld_cartel_child " + id + " 1 = childState=1\n";
  }
  RunAll(host);
  // A root whose children hang in a circle beside it.
  RunAll(host + "record world_info 9 = worldID=9 cartelID=9 userspaceID=1 worldType=4\n");
}

// What still opens of a damaged file is safe to read with every tool.
TEST_F(Hostile, FilesCutAndFlipped) {
  const std::string whole = ReadFile(Record(kWholeHost));
  const size_t step = IsLong() ? 1 : 397;
  const std::string path = Scratch() + "/host.kif";
  size_t tool = 0;
  for (size_t place = 0; place < whole.size(); place += step) {
    std::string flipped = whole;
    flipped[place] = static_cast<char>(flipped[place] ^ (1 << place % 8));
    for (const std::string &bytes : {whole.substr(0, place), flipped}) {
      WriteFile("host.kif", bytes);
      const Command &command = kCommands[++tool % kCommands.size()];
      if (!command.onCache) continue;
      std::vector<std::string> commandLine = {BIN_DIR "/zlkkiftools", "-c", path};
      commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
      const Outcome outcome = Run(
          commandLine, {.environment = {"ZELLIBS_HOST=none"}, .directory = Scratch() + "/folder"});
      EXPECT_GE(outcome.status, 0) << Describe(command.arguments) << " at " << place;
      EXPECT_EQ(outcome.err.find("Sanitizer"), outcome.err.npos) << outcome.err;
    }
  }
}

}  // namespace
