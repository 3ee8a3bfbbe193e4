// Every tool on the recorded machines beside this file: NAME.txt is a machine in the text form,
// NAME.expected what the tools say of it. docs/machines.md tells how both are renewed.
#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "attack/attack.h"

namespace {

constexpr char kFolder[] = SOURCE_DIR "/tests/hosts/";

// Control characters as \xHH, so that the files are shown and compared like any text.
std::string Readable(const std::string &text) {
  std::string readable;
  for (const char c : text) {
    char escape[5] = {c};
    const bool control = static_cast<unsigned char>(c) < ' ' || c == '\x7f';
    if (control && c != '\n' && c != '\t') snprintf(escape, sizeof(escape), "\\x%02x", c);
    readable += escape;
  }
  if (!readable.empty() && readable.back() != '\n') readable += "\\\n";
  return readable;
}

class HostsTest : public HostTest, public testing::WithParamInterface<std::string> {
 protected:
  // What all commands say of the host in a cache file, as the expected text has it.
  std::string Transcript(const std::string &file) {
    std::string transcript;
    for (const Command &entry : kCommands) {
      const std::string &command = entry.line;
      // The names of devices are left to the machines in tests/vm: the database of names changes.
      if (command == "lspci" || command == "lspci -v") continue;
      const std::string directory = Scratch() + "/files";
      std::filesystem::create_directory(directory);
      const Surroundings inside = {.environment = {"ZELLIBS_HOST=none"}, .directory = directory};
      Outcome outcome = Run(entry.Cached(file), inside);
      if (command == "uptime") outcome.out.replace(1, 8, "HH:MM:SS");
      transcript += "$ " + command + "\n" + Readable(outcome.out);
      std::istringstream messages(outcome.err);
      for (std::string line; std::getline(messages, line);) transcript += "! " + line + "\n";
      if (outcome.status != 0) transcript += "[" + std::to_string(outcome.status) + "]\n";
      // Sums and sizes of the files.
      transcript += Run({"sh", "-c", "cksum * 2>/dev/null"}, inside).out + "\n";
      std::filesystem::remove_all(directory);
    }
    return transcript;
  }
};

TEST_P(HostsTest, SaysWhatItSaid) {
  const std::string expectedFile = kFolder + GetParam() + ".expected";
  const std::string transcript = Transcript(Record(ReadFile(kFolder + GetParam() + ".txt")));
  if (getenv("RENEW_HOSTS") != nullptr) {
    std::ofstream(expectedFile, std::ios::binary) << transcript;
    return;
  }
  const std::string actualFile = WriteFile("actual", transcript);
  const Outcome difference = Run({"diff", "-aU1", expectedFile, actualFile});
  EXPECT_EQ(difference.status, 0) << difference.out;
}

// The same file comes out of the text and back.
TEST_P(HostsTest, TextAndFileAreOne) {
  const std::string text = ReadFile(kFolder + GetParam() + ".txt");
  EXPECT_TRUE(Run({BIN_DIR "/kifcache", "dump", Record(text)}).out == text);
}

std::vector<std::string> Hosts() {
  std::vector<std::string> names;
  for (const auto &entry : std::filesystem::directory_iterator(kFolder)) {
    if (entry.path().extension() == ".txt") names.push_back(entry.path().stem());
  }
  std::sort(names.begin(), names.end());
  return names;
}

INSTANTIATE_TEST_SUITE_P(Machines, HostsTest, testing::ValuesIn(Hosts()), [](const auto &host) {
  std::string name = host.param;
  std::replace(name.begin(), name.end(), '-', '_');
  return name;
});

}  // namespace
