#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kUsage[] =
    "Gather stats about morelfs\nmorelfsdf [filepath]\n"
    "   -h       multiple instead of blocks\n   -p       resource pool view\n";

// "over" uses more than its maximum, "huge" and "vast" do not fit 32 bits of bytes.
constexpr char kHost[] = R"(
list system_morelfs_tardisks = "zb.v00" "gone" "top" "a-name-beyond-its-column"
record system_morelfs_tardisks_stats "zb.v00" = used=5000 usedToBoot=1
record system_morelfs_tardisks_stats "top" = used=4294967295
record system_morelfs_tardisks_stats "a-name-beyond-its-column" =
list system_morelfs_ramdisks = "root" "none" "over" "huge" "vast"
record system_morelfs_ramdisks_stats "root" = minimum=32 maximum=32 used=1000 peakUsed=2000
record system_morelfs_ramdisks_stats "none" = status 0xbad0003
record system_morelfs_ramdisks_stats "over" = maximum=0 used=3 minimum=1 peakUsed=3
record system_morelfs_ramdisks_stats "huge" = minimum=1 maximum=8192 used=1572864 peakUsed=2000000
record system_morelfs_ramdisks_stats "vast" = maximum=1073741824 used=4294967295
)";

constexpr char kErrors[] =
    "KIF_Get error for 'gone' (Not found)\nKIF_Get error for 'none' (Not found)\n";

class MdfTest : public HostTest {
 protected:
  void Expect(const std::vector<std::string> &arguments, const std::string &out) {
    const Outcome outcome = Cache(kHost, arguments);
    EXPECT_EQ(outcome.out, out);
    EXPECT_EQ(outcome.err, kErrors);
    EXPECT_EQ(outcome.status, 0);
  }
};

TEST_F(MdfTest, PrintsBlocks) {
  Expect({"mdf"},
         "Tardisk              1k-blocks      Used\n"
         "zb.v00                       8         4\n"
         "top                    4194304   4194303\n"
         "a-name-beyond-its-column         0         0\n"
         "-----\n"
         "Ramdisk              1k-blocks      Used Available Use% Mounted on\n"
         "root                     32768      4000     28768  12% --\n"
         "over                         0        12   4194292 100% --\n"
         "huge                   8388608   6291456   2097152  75% --\n"
         "vast                1099511627776171798691801082331758596   1% --\n");
}

TEST_F(MdfTest, PrintsMultiples) {
  Expect({"mdf", "-h"},
         "Tardisk                  Space      Used\n"
         "zb.v00                      8K        4K\n"
         "top                      4096M     4095M\n"
         "a-name-beyond-its-column        0B        0B\n"
         "-----\n"
         "Ramdisk                   Size      Used Available Use% Mounted on\n"
         "root                       32M        3M       28M  12% --\n"
         "over                        0B       12K     4095M 100% --\n"
         "huge                     8192M     6144M     2048M  75% --\n"
         "vast                1073741824M 16777215M1056964608M   1% --\n");
}

TEST_F(MdfTest, PrintsThePoolView) {
  Expect(
      {"mdf", "-p"},
      "Tardisk                                       Used                         Space\n"
      "zb.v00                                           4                             8\n"
      "top                                        4194303                       4194304\n"
      "a-name-beyond-its-column                             0                             0\n"
      "-----\n"
      "Ramdisk                    Min       Max      Used  Sure avl Maybe avl Peak used\n"
      "root                     32768     32768      4000     28768     28768      8000\n"
      "over                      1024         0        12      1012   4194292        12\n"
      "huge                      1024   8388608   6291456         0   2097152   8000000\n"
      "vast                         0109951162777617179869180         01082331758596         0\n");
}

TEST_F(MdfTest, IgnoresItsOperand) {
  const Outcome outcome =
      Live("list system_morelfs_tardisks =\nlist system_morelfs_ramdisks =\n", {"mdf", "/tmp"});
  EXPECT_EQ(outcome.out,
            "Argument not supported yet. Ignoring.Tardisk              1k-blocks      Used\n-----\n"
            "Ramdisk              1k-blocks      Used Available Use% Mounted on\n");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(MdfTest, EndsWithoutAList) {
  Outcome outcome = Live("list system_morelfs_tardisks = status 0xbad000f\n", {"mdf"});
  EXPECT_EQ(outcome.out, "Tardisk              1k-blocks      Used\n");
  EXPECT_EQ(outcome.err, "Error fetching tardisk list (No permission)\n");
  EXPECT_EQ(outcome.status, 1);
  outcome = Live("list system_morelfs_tardisks =\n", {"mdf", "-h"});
  EXPECT_EQ(outcome.out,
            "Tardisk                  Space      Used\n-----\n"
            "Ramdisk                   Size      Used Available Use% Mounted on\n");
  EXPECT_EQ(outcome.err, "Error fetching ramdisk list (Not found)\n");
  EXPECT_EQ(outcome.status, 1);
}

TEST_F(MdfTest, GoesOnWithTheNextVolume) {
  const std::string host =
      "list system_morelfs_tardisks = \"a\" \"b\"\nlist system_morelfs_ramdisks =\n"
      "record system_morelfs_tardisks_stats \"a\" =\nrecord system_morelfs_tardisks_stats \"b\" "
      "=\n";
  for (const Surroundings &failing :
       {Failing("KIF_ParamListCreate", 1), Failing("KIF_ParamListAddString", 1, "0xbad0014")}) {
    const Outcome outcome = Live(host, {"mdf", "-h"}, failing);
    EXPECT_EQ(outcome.out,
              "Tardisk                  Space      Used\n"
              "b                           0B        0B\n-----\n"
              "Ramdisk                   Size      Used Available Use% Mounted on\n");
    EXPECT_EQ(outcome.err, "KIF_Get error for 'a' (Out of memory)\n");
    EXPECT_EQ(outcome.status, 0);
  }
}

TEST_F(MdfTest, RefusesBadCommandLines) {
  Outcome outcome = Live(kHost, {"mdf", "/tmp", "/var"});
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, kUsage);
  EXPECT_EQ(outcome.status, 1);
  outcome = Live(kHost, {"mdf", "-x"});
  EXPECT_EQ(outcome.err, std::string("mdf: invalid option -- 'x'\n") + kUsage);
  EXPECT_EQ(outcome.status, 1);
}

}  // namespace
