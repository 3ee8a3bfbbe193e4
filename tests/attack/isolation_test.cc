// A recording is one machine and this is another: nothing of the one is seen in what is shown of
// the other, and making one never leaves half a file.
#include <unistd.h>

#include <filesystem>

#include "attack/attack.h"

namespace {

class Isolation : public AttackTest {
 protected:
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
    if (Run({"unshare", "-r", "true"}).status != 0) GTEST_SKIP() << "no user namespace";
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
  const char *const signals[] = {"KILL", "TERM", "INT", "HUP"};
  int whole = 0;
  for (int i = 0; i < (IsLong() ? 1000 : 60); ++i) {
    const std::string old = i % 2 == 0 ? "the old file" : "";
    const std::string file = WriteFile("saved/kif", old);
    if (old.empty()) std::filesystem::remove(file);
    const std::string signal = signals[i / 2 % 4];
    Run({"timeout", "-s", signal, std::to_string((1 + i * 7919 % 12000) * 1e-6),
         BIN_DIR "/kifcache", "record", file},
        {.environment = {"ZELLIBS_HOST=" + host_}});
    if (Run({BIN_DIR "/kifcache", "check", file}).status == 0) {
      ++whole;
    } else {
      EXPECT_EQ(ReadFile(file), old);
    }
    // Only a signal that cannot be held back leaves the new file beside the old one.
    const std::string others = Run({"sh", "-c", "ls -A saved | grep -vx kif; rm -r saved"}).out;
    EXPECT_TRUE(signal == "KILL" || others.empty()) << others;
  }
  printf("%d recordings were whole before\n", whole);
}

}  // namespace
