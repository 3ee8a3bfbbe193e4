// A recording is one machine and this is another: nothing of the one is seen in what is shown of
// the other, and making one never leaves half a file.
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <set>

#include "attack/attack.h"
#include "host_fixture.h"

namespace {

class Isolation : public HostTest {
 protected:
  Outcome OnCache(const std::string &file, const Command &command,
                  const std::vector<std::string> &before = {}) {
    std::vector<std::string> commandLine = before;
    commandLine.insert(commandLine.end(), {BIN_DIR "/zlkkiftools", "-c", file});
    commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
    std::filesystem::create_directory(Scratch() + "/folder");
    std::filesystem::remove(Scratch() + "/folder/DSDT.aml");
    return Run(commandLine,
               {.environment = {"ZELLIBS_HOST=none"}, .directory = Scratch() + "/folder"});
  }

  // The names in the scratch folder that begin as a recording's.
  std::set<std::string> Recordings() const {
    std::set<std::string> names;
    for (const auto &entry : std::filesystem::directory_iterator(Scratch())) {
      const std::string name = entry.path().filename();
      if (name.starts_with("saved")) names.insert(name);
    }
    return names;
  }
};

// The sanitizer opens files of its own, and reads /proc.
#if !defined(__SANITIZE_ADDRESS__)
// The files that a trace of system calls shows as opened.
std::set<std::string> Opened(const std::string &trace) {
  std::set<std::string> files;
  for (size_t at = 0; (at = trace.find("open", at)) != trace.npos; ++at) {
    const size_t quote = trace.find('"', at);
    const size_t line = trace.find('\n', at);
    if (quote == trace.npos || quote > line) continue;
    files.insert(trace.substr(quote + 1, trace.find('"', quote + 1) - quote - 1));
  }
  return files;
}

TEST_F(Isolation, CacheRunsOpenNothingOfThisMachine) {
  const std::string log = Scratch() + "/log";
  if (!IsInstalled("strace") || Run({"strace", "-o", log, "true"}).status != 0) {
    GTEST_SKIP() << "no strace";
  }
  const std::string file = Record(kWholeHost);
  for (const Command &command : kCommands) {
    if (!command.onCache) continue;
    OnCache(file, command, {"strace", "-f", "-e", "trace=open,openat", "-o", log});
    for (const std::string &opened : Opened(ReadFile(log))) {
      if (opened == "/etc/ld.so.cache") continue;
      for (const char *folder : {"/proc", "/sys", "/dev", "/etc"}) {
        EXPECT_FALSE(opened.starts_with(folder)) << Describe(command.arguments) << " " << opened;
      }
    }
  }
}

TEST_F(Isolation, RunsInAnEmptyRootDirectory) {
  const std::string root = Scratch() + "/root";
  const std::vector<std::string> inside =
      geteuid() == 0 ? std::vector<std::string>{"chroot", root}
                     : std::vector<std::string>{"unshare", "-r", "--root=" + root};
  if (geteuid() != 0 && Run({"unshare", "-r", "true"}).status != 0) {
    GTEST_SKIP() << "needs the right to make a user namespace";
  }
  WriteFile("root/host.kif", ReadFile(Record(kWholeHost)));
  const Outcome copied =
      Run({"sh", "-c",
           "cd '" + root +
               "' && mkdir -p bin lib usr/share/hwdata folder && cp \"$BIN_DIR\"/"
               "zlkkiftools bin && cp \"$LIB_DIR\"/libzellibs.so lib && "
               "cp /usr/share/hwdata/pci.ids usr/share/hwdata && "
               "for library in $(ldd bin/zlkkiftools lib/libzellibs.so | grep "
               "-o ' /[^ ]*\\|^\t/[^ ]*');"
               " do cp --parents \"$library\" . ; done 2>/dev/null"});
  for (const Command &command : kCommands) {
    if (!command.onCache || command.arguments[0] == "uptime") continue;
    std::vector<std::string> commandLine = inside;
    commandLine.insert(commandLine.end(), {"/bin/zlkkiftools", "-c", "/host.kif"});
    commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
    const Outcome there = Run(commandLine);
    const Outcome here = OnCache(root + "/host.kif", command);
    EXPECT_EQ(there.out, here.out) << Describe(command.arguments) << copied.err;
    EXPECT_EQ(there.err, here.err) << Describe(command.arguments);
    EXPECT_EQ(there.status, here.status) << Describe(command.arguments);
  }
  // Live it has neither /proc nor /sys.
  for (const Command &command : kCommands) {
    if (!IsHarmlessHere(command)) continue;
    std::vector<std::string> commandLine = inside;
    commandLine.push_back("/bin/zlkkiftools");
    commandLine.insert(commandLine.end(), command.arguments.begin(), command.arguments.end());
    const Outcome live = Run(commandLine, {.environment = {"ZELLIBS_HOST=linux"}});
    EXPECT_GE(live.status, 0) << Describe(command.arguments);
    EXPECT_LT(live.status, 126) << Describe(command.arguments) << live.err;
  }
}
#endif

TEST_F(Isolation, ARecorderThatIsKilledLeavesTheOldFile) {
  const std::string file = Scratch() + "/saved.kif";
  const std::string host = Record(kWholeHost);
  const int kills = IsLong() ? 1000 : 60;
  int whole = 0;
  for (int i = 0; i < kills; ++i) {
    const std::string old = i % 2 == 0 ? "the old file" : "";
    std::filesystem::remove(file);
    if (!old.empty()) WriteFile("saved.kif", old);
    const pid_t child = fork();
    if (child == 0) {
      setenv("ZELLIBS_HOST", host.c_str(), 1);
      execl(BIN_DIR "/kifcache", "kifcache", "record", file.c_str(), nullptr);
      _exit(127);
    }
    usleep(static_cast<useconds_t>(i * 7919 % 12000));
    const int signals[] = {SIGKILL, SIGTERM, SIGINT, SIGHUP};
    const int signal = signals[i / 2 % 4];
    kill(child, signal);
    int status;
    waitpid(child, &status, 0);
    if (Run({BIN_DIR "/kifcache", "check", file}).status == 0) {
      ++whole;
    } else {
      EXPECT_EQ(ReadFile(file), old);
    }
    // Only a signal that cannot be held back leaves the new file beside the old one.
    std::set<std::string> names = Recordings();
    names.erase("saved.kif");
    if (signal != SIGKILL) {
      EXPECT_TRUE(names.empty()) << *names.begin();
    }
    for (const std::string &name : names) std::filesystem::remove(Scratch() + "/" + name);
  }
  printf("%d kills, %d recordings were whole before\n", kills, whole);
}

TEST_F(Isolation, ARecorderOnAFullDiskLeavesTheOldFile) {
  const std::string host = Record(kWholeHost);
  const std::string file = Scratch() + "/saved.kif";
  for (const char *old : {"the old file", ""}) {
    std::filesystem::remove(file);
    if (*old != '\0') WriteFile("saved.kif", old);
    const Outcome limited =
        Run({"sh", "-c", "ulimit -f 1; exec \"$@\"", "sh", BIN_DIR "/kifcache", "record", file},
            {.environment = {"ZELLIBS_HOST=" + host}});
    EXPECT_EQ(limited.status, 1);
    EXPECT_EQ(limited.err, "kifcache: " + file + ": File too large\n");
    EXPECT_EQ(ReadFile(file), old);
    EXPECT_EQ(Recordings().size(), *old != '\0' ? 1u : 0u);
  }
}

}  // namespace
