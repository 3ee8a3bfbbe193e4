#include <fcntl.h>
#include <stdio.h>
#include <unistd.h>

#include <string>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kHeader[] =
    "Cartel    |      World name     |        Type         |   fd   |  Description     \n"
    "----------+---------------------+---------------------+--------+------------------\n";

constexpr char kHost[] = R"(
list userworld_cartel = 10 20 30 40 50 60

record world_name 10 = name="init"
list userworld_cartel_fd_fds 10 = 0 3 1234567
record userworld_cartel_fd_fds 10 0 = kind="CHAR" description="/dev/null"
record userworld_cartel_fd_fds 10 3 = status 0xbad000f
record userworld_cartel_fd_fds 10 1234567 = kind="A kind of more than twenty" description="x"
list userworld_cartel_mem_mmaps 10 = 1 2 3 4 5 6
record userworld_cartel_mem_mmaps 10 1 = kind=2 protection=1 length=4096 descriptor=3 description="/lib/c"
record userworld_cartel_mem_mmaps 10 2 = kind=2 protection=3 length=4294967295 descriptor=-1 description="/lib/d"
record userworld_cartel_mem_mmaps 10 3 = kind=2 protection=4 description="none"
record userworld_cartel_mem_mmaps 10 4 = kind=1 protection=1 description="no file"
record userworld_cartel_mem_mmaps 10 5 = status 0xbad0003
record userworld_cartel_mem_mmaps 10 6 = kind=2 protection=2 description=""

record world_name 20 = status 0xbad0003
list userworld_cartel_fd_fds 20 = 0
record userworld_cartel_fd_fds 20 0 = kind="FILE" description="never listed"

record world_name 30 = name="without descriptors"
list userworld_cartel_fd_fds 30 = status 0xbad000f
list userworld_cartel_mem_mmaps 30 = 1
record userworld_cartel_mem_mmaps 30 1 = kind=2 description="never listed"

record world_name 40 = name="without mappings"
list userworld_cartel_fd_fds 40 = 4294967295 4294967296
record userworld_cartel_fd_fds 40 4294967295 = kind="FILE" description="minus one"
record userworld_cartel_fd_fds 40 4294967296 = kind="FILE" description="nought"

record world_name 50 = name="nothing open"
list userworld_cartel_fd_fds 50 =
list userworld_cartel_mem_mmaps 50 =

record world_name 60 = name="a world name of more than twenty"
list userworld_cartel_fd_fds 60 = 1
record userworld_cartel_fd_fds 60 1 = kind="PIPE" description="pipe:[7]"
list userworld_cartel_mem_mmaps 60 =
)";

constexpr char kRows[] =
    "10          init                  CHAR                        0   /dev/null\n"
    "10          init                  A kind of more than twenty   1234567   x\n"
    "10          init                  MMAP                        3   /lib/c (prot:R-/len:4096)\n"
    "10          init                  MMAP                       -1   /lib/d "
    "(prot:RW/len:4294967295)\n"
    "10          init                  MMAP                        0   none (prot:--/len:0)\n"
    "10          init                  MMAP                        0    (prot:-W/len:0)\n"
    "40          without mappings      FILE                       -1   minus one\n"
    "40          without mappings      FILE                        0   nought\n"
    "60          a world name of more than twenty  PIPE                        1   pipe:[7]\n";

class LsofTest : public HostTest {};

TEST_F(LsofTest, ListsDescriptorsAndMappedFiles) {
  for (const Outcome &outcome :
       {Live(kHost, {"lsof"}), Cache(kHost, {"lsof"}), Cache(kHost, {"lsof", "-h", "10"})}) {
    EXPECT_EQ(outcome.out, std::string(kHeader) + kRows);
    EXPECT_EQ(outcome.err, "");
    EXPECT_EQ(outcome.status, 0);
  }
  EXPECT_EQ(Cache("list userworld_cartel =\n", {"lsof"}).out, kHeader);
}

TEST_F(LsofTest, EndsTextsWithTheirFields) {
  const std::string name(128, 'n'), kind(96, 'k'), description(1984, 'd'), mapping(2008, 'm');
  const Outcome outcome = Cache(
      "list userworld_cartel = 1\nrecord world_name 1 = name=\"" + name +
          "\"\nlist userworld_cartel_fd_fds 1 = 1\nrecord userworld_cartel_fd_fds 1 1 = kind=\"" +
          kind + "\" description=\"" + description +
          "\"\nlist userworld_cartel_mem_mmaps 1 = 1\n"
          "record userworld_cartel_mem_mmaps 1 1 = kind=2 description=\"" +
          mapping + "\"\n",
      {"lsof"});
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.out.find("nnd"), std::string::npos);
  EXPECT_NE(outcome.out.find("kk        1   dd"), std::string::npos);
  EXPECT_NE(outcome.out.find("mm (prot:--/len:0)\n"), std::string::npos);
}

TEST_F(LsofTest, SaysWhatFails) {
  const std::string header = kHeader;
  const std::string first =
      "10          init                  CHAR                        0   /dev/null\n";
  const struct {
    const char *operation;
    int call;
    std::string out;
    const char *err;
    int status;  // the low eight bits of what the tool gives
  } cases[] = {
      {"KIF_ParamListCreate", 1, "", "WalkWorldList: Not enough memory\n", 0},
      {"KIF_GetInstanceListAlloc", 1, "", "WalkWorldList: error fetching world list 0xbad0040\n",
       0x40},
      {"KIF_ParamListAddInt", 1, header, "Couldn't add param to list: 0xbad0040", 1},
      {"KIF_ParamListAddInt", 3, header + first + "failed to add fd to KIF parameter list\n", "",
       0x40},
      {"KIF_GetInstanceListAlloc", 2,
       header + std::string(kRows).substr(std::string(kRows).find("40 ")), "", 0},
  };
  for (const auto &row : cases) {
    const Outcome outcome = Cache(kHost, {"lsof"}, Failing(row.operation, row.call, "0xbad0040"));
    EXPECT_EQ(outcome.out, row.out) << row.operation << " " << row.call;
    EXPECT_EQ(outcome.err, row.err) << row.operation << " " << row.call;
    EXPECT_EQ(outcome.status, row.status) << row.operation << " " << row.call;
  }
  const Outcome outcome = Cache(kHost, {"lsof"}, Failing("KIF_ParamListAddInt", 6, "0xbad0014"));
  const std::string ending =
      "3   /lib/c (prot:R-/len:4096)\nfailed to add mmap to KIF parameter list\n";
  ASSERT_GE(outcome.out.size(), ending.size());
  EXPECT_EQ(outcome.out.substr(outcome.out.size() - ending.size()), ending);
  EXPECT_EQ(outcome.status, 0x14);
}

// The test's own descriptors: a file and a deleted one.
TEST_F(LsofTest, AgreesWithThisMachine) {
  if (!IsInstalled("lsof")) GTEST_SKIP();
  const std::string kept = WriteFile("kept file", "x"), deleted = WriteFile("deleted", "x");
  const int files[] = {open(kept.c_str(), O_RDONLY), open(deleted.c_str(), O_RDONLY)};
  ASSERT_EQ(unlink(deleted.c_str()), 0);
  const std::string id = std::to_string(getpid());
  const std::string known = Run({"lsof", "-n", "-P", "-a", "-p", id, "-Ffn"}).out;
  const Outcome outcome = Linux("/", {"lsof"});
  EXPECT_EQ(outcome.status, 0);
  for (const int file : files) {
    const size_t place = known.find("\nf" + std::to_string(file) + "\nn");
    ASSERT_NE(place, std::string::npos) << known;
    const size_t name = known.find("\nn", place) + 2;
    char row[4096];
    snprintf(row, sizeof(row), "%-10s  %-20.15s  %-20s   %6d   %s\n", id.c_str(), "lsof_test",
             "FILE", file, known.substr(name, known.find('\n', name) - name).c_str());
    EXPECT_NE(outcome.out.find(row), std::string::npos) << row << outcome.out;
    close(file);
  }
}

}  // namespace
