// lspci and pci-info on this machine, against pciutils.
#include <unistd.h>

#include <algorithm>
#include <sstream>

#include "host_fixture.h"

namespace {

std::vector<std::string> Lines(const std::string &text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(line);
  return lines;
}

// The address and the quoted fields of a line of pciutils' machine-readable form.
std::vector<std::string> Fields(const std::string &line) {
  std::vector<std::string> fields = {line.substr(0, line.find(' '))};
  for (size_t at = line.find(" \""); at != line.npos;) {
    const size_t end = line.find('"', at + 2);
    fields.push_back(line.substr(at + 2, end - at - 2));
    at = line.find(" \"", end);
  }
  return fields;
}

class PciLiveTest : public HostTest {
 protected:
  void SetUp() override {
    if (access("/usr/bin/lspci", X_OK) != 0) GTEST_SKIP() << "no pciutils";
    if (Run({"/usr/bin/lspci"}).out.empty()) GTEST_SKIP() << "no PCI bus";
  }

  std::vector<std::string> Ours(const std::vector<std::string> &arguments) {
    const Outcome outcome = Linux("/", arguments);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    return Lines(outcome.out);
  }

  // What pciutils says; addresses with their domain.
  std::vector<std::string> Theirs(std::vector<std::string> options) {
    options.insert(options.begin(), {"/usr/bin/lspci", "-D"});
    std::vector<std::string> lines = Lines(Run(options).out);
    std::erase(lines, "");
    return lines;
  }
};

// pciutils names the subclass, which is what -v adds. Where the file has no name it makes one up
// from the number, and where it has none of a subclass it takes that of the class.
TEST_F(PciLiveTest, Names) {
  const std::vector<std::string> theirs = Theirs({"-mm"});
  std::vector<std::string> lines = Ours({"lspci", "-v"});
  std::erase_if(lines, [](const std::string &line) { return line.empty() || line[0] == '\t'; });
  ASSERT_EQ(lines.size(), theirs.size());
  for (size_t i = 0; i < lines.size(); ++i) {
    const std::vector<std::string> fields = Fields(theirs[i]);
    ASSERT_GE(fields.size(), 4u) << theirs[i];
    const bool knownClass = fields[1].find('[') == std::string::npos;
    EXPECT_TRUE(lines[i].starts_with(fields[0] + " " + (knownClass ? fields[1] + " " : " :")))
        << lines[i] << "\n"
        << theirs[i];
    const bool knownDevice = !fields[3].starts_with("Device ");
    const std::string names = knownDevice ? ": " + fields[2] + " " : ":   ";
    EXPECT_NE(lines[i].find(names), std::string::npos) << lines[i] << "\n" << theirs[i];
  }
}

TEST_F(PciLiveTest, Numbers) {
  std::vector<std::string> expected;
  for (const std::string &line : Theirs({"-n"})) {
    const std::string address = line.substr(0, line.find(' '));
    const std::string numbers = line.substr(address.size() + 1);
    expected.push_back(address + " Class " + numbers.substr(0, 4) + ": " + numbers.substr(6, 9) +
                       " ");
  }
  std::vector<std::string> lines = Ours({"lspci", "-n"});
  for (std::string &line : lines) line = line.substr(0, line.find('['));
  EXPECT_EQ(lines, expected);
}

// The module that a driver belongs to has the driver's name, with other hyphens, or is one of those
// that pciutils lists.
TEST_F(PciLiveTest, Modules) {
  struct Owner {
    std::string address;
    std::string driver;
    std::string modules;
  };
  std::vector<Owner> owners;
  for (const std::string &line : Theirs({"-k"})) {
    const std::string text = line.substr(line.find(": ") + 2);
    if (line[0] != '\t') owners.push_back({line.substr(0, line.find(' ')), "", ""});
    if (line.starts_with("\tKernel driver in use: ")) owners.back().driver = text;
    if (line.starts_with("\tKernel modules: ")) owners.back().modules = text;
  }
  std::vector<std::string> lines = Ours({"lspci", "-p"});
  lines.erase(lines.begin(), lines.begin() + 2);
  std::erase_if(lines, [](const std::string &line) { return line[0] == ' '; });
  ASSERT_EQ(lines.size(), owners.size());
  for (size_t i = 0; i < lines.size(); ++i) {
    const Owner &owner = owners[i];
    const size_t at = owner.address.size() + std::string(" 8086:7190 15ad:1976 ").size() +
                      std::string("ISA/irq/Vect P M ").size();
    ASSERT_TRUE(lines[i].starts_with(owner.address)) << lines[i];
    std::string module = lines[i].substr(at, lines[i].find(' ', at) - at);
    if (owner.modules.find(module) != std::string::npos && !owner.driver.empty()) continue;
    std::replace(module.begin(), module.end(), '_', '-');
    std::string driver = owner.driver;
    std::replace(driver.begin(), driver.end(), '_', '-');
    EXPECT_EQ(module, driver.substr(0, 31)) << lines[i];
  }
}

// The bytes of a dump, line by line below the addresses. Our extended dump ends with the first
// function that has no extended space; pciutils goes on with a short one.
TEST_F(PciLiveTest, Dumps) {
  if (geteuid() != 0) GTEST_SKIP() << "not root";
  const auto addressesAndBytes = [](const std::vector<std::string> &lines) {
    std::string text;
    for (const std::string &line : lines) {
      const bool bytes = line.find(": ") < 4;
      text += (bytes ? line : line.substr(0, line.find(' '))) + "\n";
    }
    return text;
  };
  EXPECT_EQ(addressesAndBytes(Ours({"lspci", "-nd"})), addressesAndBytes(Theirs({"-n", "-xxx"})));
  const std::string ours = addressesAndBytes(Lines(Linux("/", {"lspci", "-ne"}).out));
  const std::string theirs = addressesAndBytes(Theirs({"-n", "-xxxx"}));
  EXPECT_EQ(ours, theirs.substr(0, ours.size()));
}

TEST_F(PciLiveTest, PciInfo) {
  if (geteuid() != 0) GTEST_SKIP() << "not root";
  for (const std::string &line : Theirs({"-n"})) {
    const std::string address = line.substr(0, line.find(' '));
    unsigned segment, bus, slot, function;
    ASSERT_EQ(sscanf(address.c_str(), "%x:%x:%x.%x", &segment, &bus, &slot, &function), 4);
    const std::string config = ReadFile("/sys/bus/pci/devices/" + address + "/config");
    std::vector<std::string> commandLine = {"pci-info",
                                            "-n" + std::to_string(segment),
                                            "-b" + std::to_string(bus),
                                            "-s" + std::to_string(slot),
                                            "-f" + std::to_string(function),
                                            "-c"};
    EXPECT_EQ(Linux("/", commandLine).out, config.substr(0, 256)) << address;
    commandLine.back() = "-e";
    const Outcome outcome = Linux("/", commandLine);
    EXPECT_EQ(outcome.out, config.size() == 4096 ? config : "") << address;
    EXPECT_EQ(outcome.err.empty(), config.size() == 4096) << outcome.err;
  }
}

}  // namespace
