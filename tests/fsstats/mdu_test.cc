#include <unistd.h>

#include "host_fixture.h"

namespace {

// A file's record is the one whose number its name ends with; lstat_device.cc sees to that.
constexpr char kHost[] = R"(list system_morelfs_tardisks = "boot"
list system_morelfs_ramdisks = "tmp"
record system_morelfs_inodes_stats 0 = size=10 tardisk="no" ramdisk="tmp"
record system_morelfs_inodes_stats 1 = flags=1 size=100 tardisk="boot" ramdisk="no"
record system_morelfs_inodes_stats 2 = flags=0x81 size=1048576 tardisk="boot"
record system_morelfs_inodes_stats 3 = flags=2 size=30 ramdisk="tmp"
record system_morelfs_inodes_stats 4 = flags=0x40 size=5000 ramdisk="tmp"
record system_morelfs_inodes_stats 5 = ramdisk="tmp"
record system_morelfs_inodes_stats 6 = status 0xbad000f
record system_morelfs_inodes_stats 7 = size=4294967295 ramdisk="tmp"
record system_morelfs_inodes_stats 8 = size=7 ramdisk="another"
record system_morelfs_inodes_stats 9 = size=8 ramdisk="a-name-of-more-than-31-characters-1"
record system_morelfs_inodes_stats 10 = size=9 ramdisk="a-name-of-more-than-31-characters-2"
)";

class MduTest : public HostTest {
 protected:
  // What each command says in the tree that the shell's command `made` makes.
  std::string Session(const std::string &host, const std::string &made,
                      const std::vector<std::string> &commands) {
    EXPECT_EQ(Run({"sh", "-c", "mkdir tree && cd tree && " + made}).status, 0);
    const std::string start = "exec 2>&1; cd tree; ulimit -n 24; LD_PRELOAD=" LSTAT_DEVICE
                              " ASAN_OPTIONS=verify_asan_link_order=0 " BIN_DIR "/zlkkiftools ";
    std::string session;
    for (const std::string &command : commands) {
      const Outcome outcome =
          Run({"sh", "-c", start + command}, {.environment = {"ZELLIBS_HOST=" + Record(host)}});
      session += "$ " + command + "\n" + outcome.out;
      if (outcome.status != 0) session += "[" + std::to_string(outcome.status) + "]\n";
    }
    Run({"rm", "-rf", "tree"});
    return session;
  }
};

TEST_F(MduTest, AddsUpATree) {
  EXPECT_EQ(Session(kHost,
                    "mkdir -p etc1/sub1/mounted etc1/sub1/closed6 && cd etc1/sub1 && "
                    "touch file2 changed3 uncharged4 empty5 mounted/inside3 closed6/file3 && "
                    "ln -s file2 link3",
                    {"mdu -s", "mdu -d 2 etc1/sub1/file2", "mdu -sh etc1", "mdu etc1/sub1/link3",
                     "mdu nowhere", "mdu etc1/sub1/mounted", "mdu etc1/sub1/empty5",
                     "mdu -i etc1/sub1/empty5"}),
            R"($ mdu -s
KIF_Get error for './etc1/sub1/closed6' (No permission)
For '.':
                           ramdisk tmp:           70		(    4 inodes)
                          tardisk boot:      1048776		(    3 inodes)
$ mdu -d 2 etc1/sub1/file2
For 'etc1/sub1/file2':
                          tardisk boot:      1048576
$ mdu -sh etc1
KIF_Get error for 'etc1/sub1/closed6' (No permission)
For 'etc1':
                          tardisk boot:    1M		(    3 inodes)
                           ramdisk tmp:   60B		(    3 inodes)
$ mdu etc1/sub1/link3
For 'etc1/sub1/link3':
                           ramdisk tmp:           30
$ mdu nowhere
$ mdu etc1/sub1/mounted
$ mdu etc1/sub1/empty5
$ mdu -i etc1/sub1/empty5
For 'etc1/sub1/empty5':
                           ramdisk tmp:            0
)");
}

TEST_F(MduTest, GoesAsDeepAsAsked) {
  EXPECT_EQ(Session(kHost, "mkdir -p a3/b3/c3/d3",
                    {"mdu a3/b3/", "mdu -sa a3/b3", "mdu -as a3", "mdu -d 2 a3"}),
            R"($ mdu a3/b3/
For 'a3/b3/c3':
                           ramdisk tmp:           60		(    2 inodes)
For 'a3/b3/':
                           ramdisk tmp:           90		(    3 inodes)
$ mdu -sa a3/b3
For 'a3/b3/c3/d3':
                           ramdisk tmp:           30		(    1 inodes)
For 'a3/b3/c3':
                           ramdisk tmp:           60		(    2 inodes)
For 'a3/b3':
                           ramdisk tmp:           90		(    3 inodes)
$ mdu -as a3
For 'a3':
                           ramdisk tmp:          120		(    4 inodes)
$ mdu -d 2 a3
For 'a3/b3/c3':
                           ramdisk tmp:           60		(    2 inodes)
For 'a3/b3':
                           ramdisk tmp:           90		(    3 inodes)
For 'a3':
                           ramdisk tmp:          120		(    4 inodes)
)");
}

TEST_F(MduTest, WrapsItsSumsAndDropsWhatFitsNoBucket) {
  EXPECT_EQ(
      Session(kHost, "mkdir -p many0 few1/few8 long9 && touch many0/x7 few1/few8/b3 long9/x10",
              {"mdu -s many0", "mdu -s few1", "mdu -s long9", "mdu -h many0/x7"}),
      R"($ mdu -s many0
For 'many0':
                           ramdisk tmp:            9		(    2 inodes)
$ mdu -s few1
Not enough dustats buckets
For 'few1':
                          tardisk boot:          100		(    1 inodes)
                       ramdisk another:            7		(    1 inodes)
$ mdu -s long9
For 'long9':
ramdisk a-name-of-more-than-31-characte:           17		(    2 inodes)
$ mdu -h many0/x7
For 'many0/x7':
                           ramdisk tmp: 4095M
)");
  EXPECT_EQ(Session("record system_morelfs_inodes_stats 0 =\n", ":", {"mdu"}), R"($ mdu
No bucket space for '.'
)");
}

// A tree deeper than paths are long, with fewer descriptors than levels. The last directory's path
// has 4093 characters: none of its entries fits.
TEST_F(MduTest, WalksToTheLongestPath) {
  std::string path = "d";
  for (int i = 1; i < 2047; ++i) path += "/d";
  std::string session =
      Session(kHost, "mkdir -p " + path + " && cd -P " + path + " && mkdir -p d/d", {"mdu -s d"});
  for (const std::string entry : {"'.' (4095)", "'..' (4096)", "'d' (4095)"}) {
    const std::string said = "path too long for '" + path + "' " + entry + "\n";
    ASSERT_NE(session.find(said), session.npos) << entry;
    session.erase(session.find(said), said.size());
  }
  EXPECT_EQ(session, R"($ mdu -s d
For 'd':
                           ramdisk tmp:        20470		( 2047 inodes)
)");
}

TEST_F(MduTest, ListsUnlinkedFiles) {
  constexpr char kUnlinked[] = R"(list system_morelfs_inodes = 1 2 3 -4
record system_morelfs_inodes_stats 1 = linkState=-4 size=1500 flags=0x40 name="gone"
record system_morelfs_inodes_stats 2 = linkState=4 size=7 name="there"
record system_morelfs_inodes_stats -4 = linkState=-4 size=4294967295 name="100%s"
)";
  EXPECT_EQ(Session(kUnlinked, ":", {"mdu -u /ignored", "mdu -hu"}), R"($ mdu -u /ignored
Unlinked files:
                                  gone:         1500
                                 100%s:           -1
Total unlinked files: 2
Size of unlinked files:  4294968795
$ mdu -hu
Unlinked files:
                                  gone:    1K
                                 100%s: 4095M
Total unlinked files: 2
Size of unlinked files:  1K
)");
  EXPECT_EQ(Session("list system_morelfs_inodes = 1 2\nrecord system_morelfs_inodes_stats 1 = "
                    "linkState=-4 size=1 name=\"a\"\n",
                    ":", {"mdu -u"}),
            R"($ mdu -u
Unlinked files:
                                     a:            1
Total unlinked files: 1
Size of unlinked files:  1
[1]
)");
  EXPECT_EQ(Session("list system_morelfs_inodes = 2\n", ":", {"mdu -u"}), R"($ mdu -u
No unlinked files.
[1]
)");
  EXPECT_EQ(Session("list system_morelfs_inodes =\n", ":", {"mdu -u"}), R"($ mdu -u
No unlinked files.
)");
}

}  // namespace
