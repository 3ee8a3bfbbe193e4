#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kUsage[] =
    "Gather stats about morelfs\nmorelfsdu [filepath]\n"
    "   -h       multiple instead of bytes\n"
    "   -d depth reports for each element up to that depth (default 1)\n"
    "   -a       equivalent to unlimited depth\n   -s       equivalent to zero depth\n"
    "   -u       display stats for unlinked files\n";

constexpr char kVolumes[] =
    "list system_morelfs_tardisks = \"boot\"\nlist system_morelfs_ramdisks = \"tmp\"\n";

// A line for a bucket. `size` is as printed; `inodes` is 0 for a file.
std::string Bucket(const std::string &volume, const std::string &size, int inodes = 0) {
  std::string line = std::string(volume.size() < 38 ? 38 - volume.size() : 0, ' ') + volume + ": ";
  line += std::string(size.size() < 12 ? 12 - size.size() : 0, ' ') + size;
  if (inodes > 0) {
    const std::string count = std::to_string(inodes);
    line += "\t\t(" + std::string(5 - count.size(), ' ') + count + " inodes)";
  }
  return line + "\n";
}

class MduTest : public HostTest {
 protected:
  MduTest() : tree_(Scratch() + "/tree") { mkdir(tree_.c_str(), 0700); }

  // Adds the inode record of a file of the tree to the host.
  void Describe(const std::string &path, const std::string &fields) {
    struct stat status = {};
    EXPECT_EQ(lstat((tree_ + "/" + path).c_str(), &status), 0) << path;
    host_ += "record system_morelfs_inodes_stats " + std::to_string(status.st_ino) + " = " +
             fields + "\n";
  }
  void AddFile(const std::string &path, const std::string &fields) {
    WriteFile("tree/" + path, "");
    Describe(path, fields);
  }
  void AddDirectory(const std::string &path, const std::string &fields) {
    std::filesystem::create_directories(tree_ + "/" + path);
    Describe(path, fields);
  }

  Outcome Walk(const std::vector<std::string> &arguments, const std::string &volumes = kVolumes,
               Surroundings surroundings = {}) {
    surroundings.directory = tree_;
    if (surroundings.environment.empty()) {
      surroundings.environment = {"ASAN_OPTIONS=verify_asan_link_order=0"};
      surroundings.environment.push_back("LD_PRELOAD=" LSTAT_DEVICE);
    } else {
      surroundings.environment.push_back("LD_PRELOAD=" LSTAT_DEVICE ":" FAULT_INJECT);
    }
    std::vector<std::string> all = {"mdu"};
    all.insert(all.end(), arguments.begin(), arguments.end());
    return Live(volumes + host_, all, surroundings);
  }

  // The blocks of an output in an order of their own: a directory's entries come in any.
  static std::string Sorted(const std::string &out) {
    std::vector<std::string> blocks;
    for (size_t at = 0; at < out.size();) {
      const size_t end = out.find("\nFor '", at);
      blocks.push_back(out.substr(at, end == std::string::npos ? end : end + 1 - at));
      at = end == std::string::npos ? out.size() : end + 1;
    }
    std::sort(blocks.begin(), blocks.end());
    std::string sorted;
    for (const std::string &block : blocks) sorted += block;
    return sorted;
  }

  void Expect(const std::vector<std::string> &arguments, const std::string &out) {
    const std::string what = testing::PrintToString(arguments);
    const Outcome outcome = Walk(arguments);
    EXPECT_EQ(Sorted(outcome.out), Sorted(out)) << what;
    EXPECT_EQ(outcome.err, "") << what;
    EXPECT_EQ(outcome.status, 0) << what;
    // What is reported last is what was asked for.
    EXPECT_EQ(outcome.out.rfind("For '"), outcome.out.size() - out.size() + out.rfind("For '"));
  }

  // Two volumes: etc is on the archive, but one of its files was changed and went to memory.
  void MakeTree() {
    const std::string boot = " tardisk=\"boot\" ramdisk=\"no\"";
    const std::string tmp = " tardisk=\"no\" ramdisk=\"tmp\"";
    Describe("", "flags=0 size=10" + tmp);
    AddDirectory("etc", "flags=1 size=100" + boot);
    AddFile("etc/kept", "flags=0x81 size=1500" + boot);
    AddFile("etc/changed", "flags=2 size=30" + tmp);
    AddDirectory("etc/sub", "flags=1 size=7" + boot);
    AddFile("etc/sub/deep", "flags=1 size=1048576" + boot);
    AddFile("uncharged", "flags=0x40 size=5000" + tmp);
    AddFile("empty", "flags=0x40 size=0" + tmp);
    AddDirectory("mounted", "flags=0 size=9999" + tmp);
    AddFile("mounted/inside", "flags=0 size=9999" + tmp);
    EXPECT_EQ(symlink("etc", (tree_ + "/link").c_str()), 0);
    Describe("link", "flags=0 size=3" + tmp);
  }

  std::string tree_;
  std::string host_;
};

TEST_F(MduTest, AddsUpATree) {
  MakeTree();
  const std::string etc =
      "For './etc':\n" + Bucket("tardisk boot", "1050183", 4) + Bucket("ramdisk tmp", "30", 1);
  const std::string uncharged = "For './uncharged':\n" + Bucket("ramdisk tmp", "0");
  const std::string link = "For './link':\n" + Bucket("ramdisk tmp", "3");
  const std::string whole =
      "For '.':\n" + Bucket("ramdisk tmp", "43", 4) + Bucket("tardisk boot", "1050183", 4);
  const std::string below = "For './etc/kept':\n" + Bucket("tardisk boot", "1500") +
                            "For './etc/changed':\n" + Bucket("ramdisk tmp", "30") +
                            "For './etc/sub':\n" + Bucket("tardisk boot", "1048583", 2);
  const std::string deep = "For './etc/sub/deep':\n" + Bucket("tardisk boot", "1048576");
  Expect({}, etc + uncharged + link + whole);
  Expect({"-a", "-s", "."}, whole);
  Expect({"-s", "-d", "2"}, below + etc + uncharged + link + whole);
  Expect({"-d", "junk"}, whole);
  Expect({"-d", "-1"}, deep + below + etc + uncharged + link + whole);
  Expect({"-a"}, deep + below + etc + uncharged + link + whole);
  Expect({"-i"}, etc + uncharged + link + "For './empty':\n" + Bucket("ramdisk tmp", "0") +
                     "For '.':\n" + Bucket("ramdisk tmp", "43", 5) +
                     Bucket("tardisk boot", "1050183", 4));
}

TEST_F(MduTest, TakesPathsAsTyped) {
  MakeTree();
  Expect({"link"}, "For 'link':\n" + Bucket("ramdisk tmp", "3"));
  Expect({"etc/sub/"}, "For 'etc/sub/deep':\n" + Bucket("tardisk boot", "1048576") +
                           "For 'etc/sub/':\n" + Bucket("tardisk boot", "1048583", 2));
  Expect({"-sh", "etc"},
         "For 'etc':\n                          tardisk boot:    1M\t\t(    4 inodes)"
         "\n                           ramdisk tmp:   30B\t\t(    1 inodes)\n");
  Expect({"-h", "etc/kept"}, "For 'etc/kept':\n                          tardisk boot:    1K\n");
  for (const char *path : {"mounted", "nowhere", "empty", ""}) {
    const Outcome outcome = Walk({path});
    EXPECT_EQ(outcome.out + outcome.err, "") << path;
    EXPECT_EQ(outcome.status, 0) << path;
  }
  // Without the preloaded library no file of the test is on the device.
  EXPECT_EQ(Live(kVolumes + host_, {"mdu", tree_}).out, "");
}

TEST_F(MduTest, DropsWhatFitsNoBucket) {
  Describe("", "flags=0 size=1 ramdisk=\"a\"");
  AddFile("x", "flags=1 size=2 tardisk=\"a\"");
  Outcome outcome = Walk({"-s"}, "list system_morelfs_ramdisks = \"a\"\n");
  EXPECT_EQ(outcome.out, "For '.':\n" + Bucket("ramdisk a", "1", 1));
  EXPECT_EQ(outcome.err, "Not enough dustats buckets\n");
  EXPECT_EQ(outcome.status, 0);
  outcome = Walk({"-s"}, "");
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "No bucket space for '.'\n");
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(MduTest, ComparesTheFirst31CharactersOfAName) {
  const std::string name(31, 'n');
  Describe("", "flags=0 size=1 ramdisk=\"" + name + "\"");
  AddFile("x", "flags=0 size=2 ramdisk=\"" + name + std::string(97, 'x') + "\"");
  Expect({"-s"}, "For '.':\n" + Bucket("ramdisk " + name, "3", 2));
}

TEST_F(MduTest, WrapsItsSums) {
  Describe("", "flags=0 size=0 ramdisk=\"tmp\"");
  AddFile("x", "flags=0 size=4294967295 ramdisk=\"tmp\"");
  Expect({}, "For './x':\n" + Bucket("ramdisk tmp", "-1") + "For '.':\n" +
                 Bucket("ramdisk tmp", "-1", 2));
  AddFile("y", "flags=0 size=1073741825 ramdisk=\"tmp\"");
  Expect({"-s"}, "For '.':\n" + Bucket("ramdisk tmp", "1073741824", 3));
  EXPECT_EQ(Walk({"-sh"}).out,
            "For '.':\n                           ramdisk tmp: 1024M\t\t(    3 inodes)\n");
}

TEST_F(MduTest, GoesOnPastWhatCannotBeRead) {
  MakeTree();
  AddFile("lost", "status 0xbad0003");
  AddDirectory("closed", "status 0xbad000f");
  AddFile("closed/file", "flags=0 size=5 ramdisk=\"tmp\"");
  const Outcome outcome = Walk({"-s"});
  EXPECT_EQ(outcome.out,
            "For '.':\n" + Bucket("ramdisk tmp", "43", 4) + Bucket("tardisk boot", "1050183", 4));
  const std::string lost = "KIF_Get error for './lost' (Not found)\n";
  const std::string closed = "KIF_Get error for './closed' (No permission)\n";
  EXPECT_TRUE(outcome.err == lost + closed || outcome.err == closed + lost) << outcome.err;
  EXPECT_EQ(outcome.status, 0);
}

// A tree down to the longest path, made from inside of it.
class DeepTree {
 public:
  DeepTree(const std::string &top, int levels) {
    int directory = open(top.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    for (int i = 0; i < levels && directory >= 0; ++i) {
      mkdirat(directory, "d", 0700);
      const int below = openat(directory, "d", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
      close(directory);
      directory = below;
      struct stat status = {};
      EXPECT_EQ(fstat(directory, &status), 0);
      records += "record system_morelfs_inodes_stats " + std::to_string(status.st_ino) +
                 " = flags=0 size=2 ramdisk=\"tmp\"\n";
    }
    close(directory);
  }

  std::string records;
};

TEST_F(MduTest, WalksToTheLongestPath) {
  constexpr int kLevels = 2047, kBeyond = 3;
  const DeepTree deep(tree_, kLevels + kBeyond);
  Surroundings surroundings;
  surroundings.directory = tree_;
  surroundings.environment = {"ZELLIBS_HOST=" + Record(kVolumes + deep.records)};
  const Outcome outcome =
      Run({"/bin/sh", "-c",
           "ulimit -n 24; LD_PRELOAD=" LSTAT_DEVICE
           " ASAN_OPTIONS=verify_asan_link_order=0 exec " BIN_DIR "/zlkkiftools mdu -s d"},
          surroundings);
  Run({"rm", "-rf", tree_});
  EXPECT_EQ(outcome.out, "For 'd':\n" + Bucket("ramdisk tmp", "4094", kLevels));
  EXPECT_EQ(outcome.status, 0);
  // The last directory's path has 4093 characters: none of its entries fits.
  std::string last = "d";
  for (int i = 1; i < kLevels; ++i) last += "/d";
  const std::string before = "path too long for '" + last + "' ";
  for (const char *entry : {"'.' (4095)\n", "'..' (4096)\n", "'d' (4095)\n"}) {
    EXPECT_NE(outcome.err.find(before + entry), std::string::npos) << entry;
  }
  EXPECT_EQ(std::count(outcome.err.begin(), outcome.err.end(), '\n'), 3);
}

TEST_F(MduTest, EndsAtAPathThatTakesNoSlash) {
  Describe("", "flags=0 size=2 ramdisk=\"tmp\"");
  std::string path;
  while (path.size() < 4094) path += "./";
  Outcome outcome = Walk({path + "."});
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "path too long for '" + path + ".' (4096)\n");
  EXPECT_EQ(outcome.status, 0);
  path += "/";
  outcome = Walk({path});
  EXPECT_EQ(outcome.out, "For '" + path + "':\n" + Bucket("ramdisk tmp", "2", 1));
  for (const char *entry : {"'.' (4096)\n", "'..' (4097)\n"}) {
    EXPECT_NE(outcome.err.find("path too long for '" + path + "' " + entry), std::string::npos);
  }
  outcome = Walk({path + "/"});
  EXPECT_EQ(outcome.out + outcome.err, "");
}

TEST_F(MduTest, ListsUnlinkedFiles) {
  host_ =
      "list system_morelfs_inodes = 1 2 3 -4\n"
      "record system_morelfs_inodes_stats 1 = linkState=-4 size=1500 flags=0x40 name=\"gone\"\n"
      "record system_morelfs_inodes_stats 2 = linkState=4 size=7 name=\"there\"\n"
      "record system_morelfs_inodes_stats -4 = linkState=-4 size=4294967295 name=\"100%s\"\n";
  Outcome outcome = Walk({"-u", "/ignored"});
  EXPECT_EQ(outcome.out, "Unlinked files:\n" + Bucket("gone", "1500") + Bucket("100%s", "-1") +
                             "Total unlinked files: 2\nSize of unlinked files:  4294968795\n");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);
  outcome = Walk({"-hu"});
  EXPECT_EQ(outcome.out,
            "Unlinked files:\n                                  gone:    1K\n"
            "                                 100%s: 4095M\n"
            "Total unlinked files: 2\nSize of unlinked files:  1K\n");
}

TEST_F(MduTest, SaysHowTheUnlinkedReportEnded) {
  const std::string good =
      "record system_morelfs_inodes_stats 1 = linkState=-4 size=1 name=\"a\"\n";
  const std::string block = "Unlinked files:\n" + Bucket("a", "1") +
                            "Total unlinked files: 1\nSize of unlinked files:  1\n";
  const struct {
    std::string host, out;
    int status;
  } cases[] = {
      {"", "", 1},
      {"list system_morelfs_inodes =\n", "No unlinked files.\n", 0},
      {"list system_morelfs_inodes = 2\nrecord system_morelfs_inodes_stats 2 =\n",
       "No unlinked files.\n", 0},
      {"list system_morelfs_inodes = 2\n", "No unlinked files.\n", 1},
      {"list system_morelfs_inodes = 2 1\n" + good, block, 0},
      {"list system_morelfs_inodes = 1 2\n" + good, block, 1},
      {"list system_morelfs_inodes = 1 \"text\" 1\n" + good, block, 1},
  };
  for (const auto &test : cases) {
    const Outcome outcome = Live(test.host, {"mdu", "-u"});
    EXPECT_EQ(outcome.out, test.out) << test.host;
    EXPECT_EQ(outcome.err, "") << test.host;
    EXPECT_EQ(outcome.status, test.status) << test.host;
  }
}

TEST_F(MduTest, RunsOutOfMemory) {
  Describe("", "flags=0 size=1 ramdisk=\"tmp\"");
  AddFile("x", "flags=0 size=2 ramdisk=\"tmp\"");
  Outcome outcome = Walk({}, kVolumes, Failing("KIF_ParamListCreate", 2));
  EXPECT_EQ(outcome.out, "For '.':\n" + Bucket("ramdisk tmp", "1", 1));
  EXPECT_EQ(outcome.err, "KIF_Get error for './x' (Out of memory)\n");
  outcome = Walk({}, kVolumes, Failing("calloc", 1));
  EXPECT_EQ(outcome.out + outcome.err, "");
  EXPECT_EQ(outcome.status, 244);
  outcome = Walk({}, kVolumes, Failing("calloc", 2));
  EXPECT_EQ(outcome.out, "For '.':\n" + Bucket("ramdisk tmp", "1", 1));
  EXPECT_EQ(outcome.err, "unable to allocate memory for stats");
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(MduTest, RefusesBadRuns) {
  Outcome outcome = Cache(kVolumes, {"mdu", "-x"});
  EXPECT_EQ(outcome.err, "Using KIF cache is unsupported\n");
  EXPECT_EQ(outcome.status, 1);
  const struct {
    std::vector<std::string> arguments;
    std::string diagnostic;
  } cases[] = {
      {{"mdu", "-u", "a", "b"}, ""},
      {{"mdu", "-x"}, "mdu: invalid option -- 'x'\n"},
      {{"mdu", "-d"}, "mdu: option requires an argument -- 'd'\n"},
  };
  for (const auto &test : cases) {
    outcome = Live(kVolumes, test.arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, test.diagnostic + kUsage);
    EXPECT_EQ(outcome.status, 1);
  }
}

}  // namespace
