// What the tests under tests/attack share: a host with something of everything, a command line for
// everything that a tool does, and what must hold of every run.
#pragma once

#include <cstdlib>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "host_fixture.h"

struct Command {
  std::string line;
  bool onCache = true;  // whether a cache run does it too

  std::string Tool() const { return line.substr(0, line.find(' ')); }

  // The words of the command after those of `before`.
  std::vector<std::string> After(std::vector<std::string> before) const {
    std::istringstream words(line);
    for (std::string word; words >> word;) before.push_back(word);
    return before;
  }
  std::vector<std::string> Live() const { return After({BIN_DIR "/zlkkiftools"}); }
  std::vector<std::string> Cached(const std::string &file) const {
    return After({BIN_DIR "/zlkkiftools", "-c", file});
  }

  // Whether it changes nothing on this machine.
  bool IsHarmlessHere() const {
    return Tool() != "pkill" && Tool() != "mdu" && !line.starts_with("hwclock -");
  }
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

inline const std::vector<Command> kCommands = [] {
  std::vector<Command> commands;
  std::istringstream lines(kCommandLines);
  for (std::string line; std::getline(lines, line, ';');) {
    const bool isLive = line.starts_with("live ");
    commands.push_back({line.substr(isLive ? 5 : 0), !isLive});
  }
  return commands;
}();

// The long way through, asked for by ./test --all; the short one takes samples.
inline bool IsLong() {
  return getenv("ATTACK_LONG") != nullptr;
}

class AttackTest : public HostTest {
 protected:
  // Works in a folder of its own, with a file in it.
  AttackTest() : whole_(ReadFile(SOURCE_DIR "/fuzz/inputs/text/whole")) {
    WriteFile("folder/file", "");
  }

  // Runs a command line in the folder on a host; it must end by itself, and no sanitizer objects.
  Outcome RunOn(const std::string &host, const std::vector<std::string> &commandLine,
                Surroundings surroundings = {}) {
    surroundings.environment.push_back("ZELLIBS_HOST=" + host);
    surroundings.directory = folder_;
    const Outcome outcome = Run(commandLine, surroundings);
    std::string what = "in " + host + ":";
    for (const std::string &word : commandLine) what += " " + word;
    for (const std::string &variable : surroundings.environment) what += "\n" + variable;
    what += "\n" + outcome.out + outcome.err;
    EXPECT_GE(outcome.status, 0) << what;
    // The C library itself drops a few bytes of an expression that it has no memory for.
    if (outcome.err.find("Memory exhausted") == outcome.err.npos) {
      EXPECT_EQ(outcome.err.find("ERROR: "), outcome.err.npos) << what;
    }
    EXPECT_EQ(outcome.err.find("runtime error"), outcome.err.npos) << what;
    return outcome;
  }

  const std::string whole_;  // a host's text
  const std::string folder_ = Scratch() + "/folder";
};
