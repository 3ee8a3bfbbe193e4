// A recording is one machine and this is another: nothing of the one is seen in what is shown of
// the other, and making one never leaves half a file.
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <set>

#include "attack/attack.h"

namespace {

class Isolation : public AttackTest {
 protected:
  // The names in the scratch folder that begin as a recording's.
  std::set<std::string> Recordings() const {
    std::set<std::string> names;
    for (const auto &entry : std::filesystem::directory_iterator(Scratch())) {
      const std::string name = entry.path().filename();
      if (name.starts_with("saved")) names.insert(name);
    }
    return names;
  }

  const std::string host_ = Record(whole_);
};

// The sanitizer opens files of its own, and reads /proc.
#if !defined(__SANITIZE_ADDRESS__)
TEST_F(Isolation, CacheRunsOpenNothingOfThisMachine) {
  const std::string log = Scratch() + "/log";
  if (Run({"strace", "-o", log, "true"}).status != 0) GTEST_SKIP() << "no strace";
  for (const Command &command : kCommands) {
    if (!command.onCache) continue;
    std::filesystem::remove(folder_ + "/DSDT.aml");
    RunOn("none", command.After({"strace", "-f", "-e", "trace=open,openat", "-o", log,
                                 BIN_DIR "/zlkkiftools", "-c", host_}));
    const std::string opened = Run({"grep", "-E", "\"/(proc|sys|dev|etc)", log}).out;
    EXPECT_THAT(opened, testing::MatchesRegex("([^\n]*\"/etc/ld.so.cache\"[^\n]*\n)*"))
        << command.line;
    EXPECT_NE(ReadFile(log).find(host_), std::string::npos) << command.line;
  }
}

TEST_F(Isolation, RunsInAnEmptyRootDirectory) {
  const std::string root = Scratch() + "/root";
  std::vector<std::string> inside = {"chroot", root};
  if (geteuid() != 0) {
    inside = {"unshare", "-r", "--root=" + root};
    if (Run({"unshare", "-r", "true"}).status != 0) {
      GTEST_SKIP() << "needs the right to make a user namespace";
    }
  }
  inside.push_back("/bin/zlkkiftools");
  const std::string file = WriteFile("root/host.kif", ReadFile(host_));
  const Outcome copied = Run({"sh", "-c", R"(
    cd root && mkdir -p bin lib usr/share/hwdata && cp "$BIN_DIR"/zlkkiftools bin &&
    cp "$LIB_DIR"/libzellibs.so lib && cp /usr/share/hwdata/pci.ids usr/share/hwdata &&
    ldd bin/zlkkiftools lib/libzellibs.so | grep -o '[[:space:]]/[^ ]*' |
    while read -r library; do cp --parents "$library" .; done 2>/dev/null)"});
  std::vector<std::string> onCache = inside;
  onCache.insert(onCache.end(), {"-c", "/host.kif"});
  for (const Command &command : kCommands) {
    if (command.onCache && command.Tool() != "uptime") {
      std::filesystem::remove(folder_ + "/DSDT.aml");
      const Outcome there = Run(command.After(onCache));
      const Outcome here = RunOn("none", command.Cached(file));
      EXPECT_EQ(there.out, here.out) << command.line << copied.err;
      EXPECT_EQ(there.err, here.err) << command.line;
      EXPECT_EQ(there.status, here.status) << command.line;
    }
    // Live it has neither /proc nor /sys.
    if (command.IsHarmlessHere()) {
      EXPECT_LT(RunOn("linux", command.After(inside)).status, 126) << command.line;
    }
  }
}
#endif

TEST_F(Isolation, ARecorderThatIsKilledLeavesTheOldFile) {
  const std::string file = Scratch() + "/saved.kif";
  const int kills = IsLong() ? 1000 : 60;
  int whole = 0;
  for (int i = 0; i < kills; ++i) {
    const std::string old = i % 2 == 0 ? "the old file" : "";
    std::filesystem::remove(file);
    if (!old.empty()) WriteFile("saved.kif", old);
    const pid_t child = fork();
    if (child == 0) {
      setenv("ZELLIBS_HOST", host_.c_str(), 1);
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

}  // namespace
