// Every call of a library operation and every allocation fails, one after the other, alone and
// with all that follow. Whatever fails, a run ends by itself and leaves nothing behind.
#include <fcntl.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>

#include "attack/attack.h"
#include "fault/fault.h"
#include "host_fixture.h"

namespace {

const std::string kMoving = "linux";  // this machine: no two runs make the same calls
constexpr uint32_t kSamples = 2;      // of one command's calls, in the short sweep

struct Report {
  uint32_t calls;
  uint32_t failed;
};

class FaultSweep : public HostTest {
 protected:
  FaultSweep() : report_(Scratch() + "/report"), folder_(Scratch() + "/folder") {
    MayLeak();  // checked here, where a usage text may keep its lists
    for (const char *folder : {"/folder", "/folder/below"}) {
      std::filesystem::create_directory(Scratch() + folder);
    }
    WriteFile("folder/below/file", "");
  }

  ~FaultSweep() override {
    printf("%d faults in %d runs\n", faults_, runs_);
    RecordProperty("faults", faults_);
  }

  // Makes the calls of `operation` ("operations", "allocations") that `commandLine` makes fail.
  void Sweep(const std::string &operation, const std::vector<std::string> &commandLine,
             const std::string &host) {
    for (const bool goesOn : {false, true}) {
      const uint32_t calls = RunOnce(operation, 0, goesOn, commandLine, host).calls;
      const uint32_t step = IsLong() || calls <= kSamples ? 1 : calls / kSamples;
      // The short sweep begins at another call each time, so that it sees others.
      const uint32_t first = step == 1 ? 1 : 1 + static_cast<uint32_t>(runs_) % step;
      for (uint32_t call = first; call <= calls; call += step) {
        const Report report = RunOnce(operation, call, goesOn, commandLine, host);
        if (host != kMoving) {
          EXPECT_GE(report.failed, 1u) << Describe(commandLine) << ", call " << call;
        }
        faults_ += static_cast<int>(report.failed);
      }
    }
  }

 private:
  Report RunOnce(const std::string &operation, uint32_t call, bool goesOn,
                 const std::vector<std::string> &commandLine, const std::string &host) {
    const std::string trace = Scratch() + "/trace";
    unlink(trace.c_str());
    unlink((folder_ + "/DSDT.aml").c_str());  // amldump does not write over it
    WriteFile("report", std::string(sizeof(Report), '\0'));
    Surroundings surroundings = Failing(operation, static_cast<int>(call));
    surroundings.directory = folder_;
    for (const std::string &variable :
         {"FAIL_FROM=" + std::to_string(goesOn), "FAIL_REPORT=" + report_, "ZELLIBS_TRACE=" + trace,
          "ZELLIBS_HOST=" + host}) {
      surroundings.environment.push_back(variable);
    }
    Check(Run(commandLine, surroundings), ReadFile(trace),
          Describe(commandLine) + " with " + operation + " " + std::to_string(call) +
              (goesOn ? " and on" : ""));
    ++runs_;
    Report report = {};
    const std::string bytes = ReadFile(report_);
    memcpy(&report, bytes.data(), std::min(bytes.size(), sizeof(report)));
    return report;
  }

  void Check(const Outcome &outcome, const std::string &trace, const std::string &what) {
    const std::string said = what + "\n" + outcome.out + outcome.err;
    EXPECT_GE(outcome.status, 0) << said;
    // The C library itself drops a few bytes of an expression that it has no memory for.
    if (outcome.err.find("Memory exhausted") == outcome.err.npos) {
      EXPECT_EQ(outcome.err.find("Sanitizer"), outcome.err.npos) << said;
    }
    EXPECT_EQ(outcome.err.find("runtime error"), outcome.err.npos) << said;
    EXPECT_EQ(trace.find("never destroyed"), trace.npos) << said;
  }

  std::string report_;
  std::string folder_;
  int faults_ = 0;
  int runs_ = 0;
};

TEST_F(FaultSweep, OperationsOfTheTools) {
  const std::string host = Record(kWholeHost);
  for (const Command &command : kCommands) {
    std::vector<std::string> commandLine = {BIN_DIR "/zlkkiftools"};
    commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
    Sweep("operations", commandLine, host);
  }
}

TEST_F(FaultSweep, AllocationsOfTheTools) {
  const std::string host = Record(kWholeHost);
  for (const Command &command : kCommands) {
    std::vector<std::string> commandLine = {BIN_DIR "/zlkkiftools"};
    if (command.onCache) {
      commandLine.push_back("-c");
      commandLine.push_back(host);
    }
    commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
    Sweep("allocations", commandLine, command.onCache ? "none" : host);
  }
}

TEST_F(FaultSweep, Kifcache) {
  const std::string host = Record(kWholeHost);
  const std::string text = WriteFile("text", kWholeHost);
  const std::string file = Scratch() + "/made.kif";
  const std::vector<std::vector<std::string>> commands = {
      {"record", file},         {"record", "--redact", file}, {"check", host}, {"dump", host},
      {"dump", "--json", host}, {"build", text, file},        {"nodes"},
  };
  for (const std::vector<std::string> &command : commands) {
    std::vector<std::string> commandLine = {BIN_DIR "/kifcache"};
    commandLine.insert(commandLine.end(), command.begin(), command.end());
    Sweep("operations", commandLine, host);
    Sweep("allocations", commandLine, host);
  }
}

// The Linux host allocates for itself.
TEST_F(FaultSweep, AllocationsOfTheLinuxHost) {
  for (const Command &command : kCommands) {
    std::vector<std::string> commandLine = {BIN_DIR "/zlkkiftools"};
    commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
    const std::string &tool = command.arguments[0];
    const bool isHarmless = tool != "pkill" && command.arguments.size() < 4 && tool != "mdu";
    if (isHarmless) Sweep("allocations", commandLine, kMoving);
  }
}

}  // namespace
