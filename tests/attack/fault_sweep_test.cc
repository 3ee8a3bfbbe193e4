// Every call of a library operation and every allocation fails, one after the other, alone and
// with all that follow. Whatever fails, a run ends by itself and leaves nothing behind.
#include <unistd.h>

#include <cstring>

#include "attack/attack.h"
#include "fault/fault.h"

namespace {

const std::string kMoving = "linux";  // this machine: no two runs make the same calls
constexpr uint32_t kSamples = 2;      // of one command's calls, in the short sweep

struct Report {
  uint32_t calls;
  uint32_t failed;
};

class FaultSweep : public AttackTest {
 protected:
  FaultSweep() : host_(Record(whole_)) { WriteFile("folder/below/file", ""); }

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
          EXPECT_GE(report.failed, 1u) << testing::PrintToString(commandLine) << ", call " << call;
        }
        faults_ += static_cast<int>(report.failed);
      }
    }
  }

  const std::string host_;

 private:
  Report RunOnce(const std::string &operation, uint32_t call, bool goesOn,
                 const std::vector<std::string> &commandLine, const std::string &host) {
    const std::string trace = Scratch() + "/trace";
    unlink(trace.c_str());
    unlink((folder_ + "/DSDT.aml").c_str());  // amldump does not write over it
    const std::string counts = WriteFile("report", std::string(sizeof(Report), '\0'));
    Surroundings surroundings = Failing(operation, static_cast<int>(call));
    std::vector<std::string> &variables = surroundings.environment;
    variables.insert(variables.end(), {"FAIL_FROM=" + std::to_string(goesOn),
                                       "FAIL_REPORT=" + counts, "ZELLIBS_TRACE=" + trace});
    // kifcache ends at once where it has no memory.
    if (RunOn(host, commandLine, surroundings).err != "kifcache: out of memory\n") {
      EXPECT_EQ(ReadFile(trace).find("never destroyed"), std::string::npos)
          << testing::PrintToString(commandLine) << ", call " << call << " of " << operation;
    }
    ++runs_;
    Report report = {};
    memcpy(&report, ReadFile(counts).data(), sizeof(report));
    return report;
  }

  int faults_ = 0;
  int runs_ = 0;
};

TEST_F(FaultSweep, OperationsOfTheTools) {
  for (const Command &command : kCommands) Sweep("operations", command.Live(), host_);
}

TEST_F(FaultSweep, AllocationsOfTheTools) {
  for (const Command &command : kCommands) {
    const std::vector<std::string> line = command.onCache ? command.Cached(host_) : command.Live();
    Sweep("allocations", line, command.onCache ? "none" : host_);
  }
}

TEST_F(FaultSweep, Kifcache) {
  const std::string text = WriteFile("text", whole_);
  const std::string file = Scratch() + "/made.kif";
  for (const std::string &line :
       {"record " + file, "redact " + host_ + " " + file, "check " + host_, "dump " + host_,
        "dump --json " + host_, "build " + text + " " + file, std::string("nodes")}) {
    Sweep("operations", Command{line}.After({BIN_DIR "/kifcache"}), host_);
    Sweep("allocations", Command{line}.After({BIN_DIR "/kifcache"}), host_);
  }
}

// The Linux host allocates for itself.
TEST_F(FaultSweep, AllocationsOfTheLinuxHost) {
  for (const Command &command : kCommands) {
    if (command.IsHarmlessHere()) Sweep("allocations", command.Live(), kMoving);
  }
}

}  // namespace
