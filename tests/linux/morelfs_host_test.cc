// The volumes in memory of a Linux machine: from trees of files, and against this machine's own.
#include <fcntl.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <linux/magic.h>
#include <sstream>

#include "host_fixture.h"

namespace {

class MorelfsHostTest : public HostTest {
 protected:
  Outcome OnTree(const std::string &mounts, const std::vector<std::string> &arguments) {
    WriteFile("root/proc/self/mountinfo", mounts);
    return Linux(Scratch() + "/root", arguments);
  }

  // The volumes that mdf asks for, as the statuses of a tree tell them.
  static std::string Names(const std::string &messages) {
    std::istringstream lines(messages);
    std::string names;
    for (std::string line; std::getline(lines, line);) {
      const size_t start = line.find('\'') + 1;
      names += line.substr(start, line.rfind('\'') - start) + "\n";
    }
    return names;
  }
};

// How much they hold only the machine itself can tell.
TEST_F(MorelfsHostTest, VolumesByMountPoint) {
  const Outcome outcome = OnTree(
      "1 0 8:1 / / rw shared:1 master:2 - ext4 /dev/sda1 rw\n"
      "2 1 0:21 / /tmp\\040\\134x rw - tmpfs tmpfs rw,size=4k\n"
      "3 1 0:22 / /run rw,nosuid shared:5 - tmpfs tmpfs rw\n"
      "4 3 0:23 / /run/keys rw - ramfs ramfs rw\n"
      "5 1 0:24 / /dev rw - devtmpfs udev rw\n"
      "6 1 0:25 / /tab\\011 rw - tmpfs tmpfs rw\n"
      "nonsense\n"
      "7 1 0:26 / /cut rw - \n",
      {"mdf"});
  EXPECT_EQ(Names(outcome.err), "/run\n/run/keys\n/tab?\n/tmp \\x\n");
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(OnTree("", {"mdf"}).err, "");
}

// What is mounted over, directly, on the way or with all that lies on it, cannot be reached; parts
// of a file system that is seen whole are none of their own.
TEST_F(MorelfsHostTest, HiddenMountsAreLeftOut) {
  const Outcome outcome = OnTree(
      "1 1 0:2 / / rw - rootfs rootfs rw\n"
      "20 1 8:1 / / rw - ext4 /dev/sda1 rw\n"
      "21 20 0:21 / /shm rw - tmpfs lower rw\n"
      "22 21 0:22 / /shm rw - tmpfs upper rw\n"
      "23 21 0:23 / /shm/below rw - tmpfs hidden rw\n"
      "24 20 0:24 / /mnt/old rw - tmpfs hidden rw\n"
      "25 20 8:2 / /mnt rw - ext4 /dev/sdb rw\n"
      "26 25 0:25 / /mnt/new rw - tmpfs tmpfs rw\n"
      "27 20 0:25 /file /etc/file rw - tmpfs tmpfs rw\n"
      "28 20 0:26 /only /part rw - tmpfs tmpfs rw\n",
      {"mdf"});
  EXPECT_EQ(Names(outcome.err), "/mnt/new\n/part\n/shm\n");
}

TEST_F(MorelfsHostTest, ArchivesUsedToBoot) {
  for (const char *device : {"7:0", "7:1", "7:2", "7:3"}) {
    WriteFile(std::string("root/sys/dev/block/") + device + "/size", "11\n");
  }
  const std::string archives =
      "2 1 7:0 / /run/live/a ro - squashfs /dev/loop0 ro\n"
      "3 1 7:1 / /run/live/b ro - erofs /dev/loop1 ro\n"
      "4 1 7:2 / /run/live/aa ro - iso9660 /dev/loop2 ro\n"
      "5 1 7:3 / /snap ro - cramfs /dev/loop3 ro\n";
  const auto modules = [&](const std::string &root) {
    return OnTree(root + archives, {"bootOption", "-rm"}).out;
  };
  EXPECT_EQ(
      modules("1 0 0:20 / / rw - overlay overlay rw,upperdir=/snap,lowerdir=/run/live/aa/:/x\n"),
      "/run/live/aa \n");
  EXPECT_EQ(modules("1 0 0:20 / / rw - overlay o rw,lowerdir+=/run/live/a,lowerdir+=/run/live/b\n"),
            "/run/live/a /run/live/b \n");
  EXPECT_EQ(modules("1 0 7:0 / / ro - squashfs /dev/root ro\n"), "/ \n");
  EXPECT_EQ(modules("1 0 0:20 / /mnt rw - overlay overlay rw,lowerdir=/snap\n"), "\n");
  const std::string table = OnTree("1 0 7:0 / / ro - squashfs /dev/root ro\n", {"mdf"}).out;
  EXPECT_NE(table.find("\n/                            8         5\n"), std::string::npos) << table;
}

// df counts blocks of 1 KiB, a volume's size is in MiB.
TEST_F(MorelfsHostTest, AgreesWithDf) {
  if (!IsInstalled("df")) GTEST_SKIP() << "no df";
  std::istringstream rows(Run({"df", "-k", "-t", "tmpfs", "--output=size,used,target"}).out);
  std::string row;
  std::getline(rows, row);
  std::string ours = Linux("/", {"mdf"}).out;
  ours.erase(0, ours.find("-----"));
  long size;
  long used;
  while (rows >> size >> used && std::getline(rows >> std::ws, row)) {
    if (row.find(' ') != row.npos) continue;
    const size_t at = ours.find("\n" + row + " ");
    ASSERT_NE(at, std::string::npos) << row;
    std::istringstream figures(ours.substr(at + 1 + row.size()));
    long ourSize = 0;
    long ourUsed = 0;
    figures >> ourSize >> ourUsed;
    EXPECT_EQ(ourSize, (size + 1023) / 1024 * 1024) << row;
    EXPECT_LE(labs(ourUsed - used), 64) << row;  // others write meanwhile
  }
}

TEST_F(MorelfsHostTest, DeletedFilesHeldOpen) {
  struct statfs space;
  if (statfs("/dev/shm", &space) != 0 || space.f_type != TMPFS_MAGIC) GTEST_SKIP() << "no tmpfs";
  char path[] = "/dev/shm/morelfs_host_test.XXXXXX";
  const int file = mkstemp(path);
  ASSERT_GE(file, 0);
  ASSERT_EQ(ftruncate(file, 70001), 0);
  const std::string line = std::string(path) + ":        70001\n";
  EXPECT_EQ(Linux("/", {"mdu", "-u"}).out.find(line), std::string::npos);
  unlink(path);
  const Outcome outcome = Linux("/", {"mdu", "-u"});
  close(file);
  EXPECT_NE(outcome.out.find(line), std::string::npos) << outcome.out;
  EXPECT_EQ(outcome.status, 0);
}

// The walk meets links, a name with a newline and folders deeper than paths allow.
TEST_F(MorelfsHostTest, RecordsEveryFileOfAVolume) {
  struct statfs space;
  if (statfs("/dev/shm", &space) != 0 || space.f_type != TMPFS_MAGIC) GTEST_SKIP() << "no tmpfs";
  char top[] = "/dev/shm/morelfs_host_test.XXXXXX";
  ASSERT_NE(mkdtemp(top), nullptr);
  const std::string made = "cd " + std::string(top) +
                           " && printf 12345 >f && ln f g && ln -s f l && printf 1 >'n\nx' && "
                           "mkdir -p d/d/d && d=$(printf '%0200d' 0) && i=0 && "
                           "while [ $i -lt 25 ]; do mkdir $d && cd -P $d; i=$((i+1)); done";
  EXPECT_EQ(Run({"sh", "-c", made}).status, 0);
  const std::string cache = Scratch() + "/cache";
  const Outcome recorded = Run({BIN_DIR "/kifcache", "record", cache});
  const std::string text = Run({BIN_DIR "/kifcache", "dump", cache}).out;
  Run({"rm", "-rf", top});
  if (recorded.status != 0) GTEST_SKIP() << recorded.err;
  const auto name = [&](const char *rest) { return "name=\"" + std::string(top) + rest + "\""; };
  const bool once = (text.find(name("/f")) == text.npos) != (text.find(name("/g")) == text.npos);
  EXPECT_TRUE(once);
  for (const char *rest : {"", "/l", "/n?x", "/d/d/d"}) {
    EXPECT_NE(text.find(name(rest)), std::string::npos) << rest;
  }
}

}  // namespace
