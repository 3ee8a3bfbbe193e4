// kifcache build and dump: the text form, both ways.
#include <sys/stat.h>
#include <unistd.h>

#include <sstream>

#include "host_fixture.h"

namespace {

const char kKifcache[] = BIN_DIR "/kifcache";

class TextForm : public HostTest {
 protected:
  Outcome Kifcache(std::vector<std::string> arguments, Surroundings surroundings = {}) {
    arguments.insert(arguments.begin(), kKifcache);
    return Run(arguments, std::move(surroundings));
  }
};

// What has no name stands before, between and behind what has one.
const std::string kHost =
    R"host(# Written by hand.

host end 86401
host begin 86400
host omitted "b"
host omitted "a"
host name "al\"pha\x1b[31m"
host system "Linux"
host release "6.1"
host signature 0x1
set hardware_chipset_rtc = status 5
list world = 2 -1 2)host"
    "\t"
    R"host("zwei é ก 한 😀" null "")host"
    "\r\n"
    R"host(list userworld_cartel_child 9 =
record world_name 2 = name="a\"\\\n\t\r\x1f\xff\xc2\x9b\xe0\x9f\xbf\xed\xa0\x80\xf0\x8f\xbf\xbf\xf4\x90\x80\x80\xc1\xbf\xf5\x80\x80\x80\xc3"
record world_name -1 = name="ab" @3:hex=ff00fe @127:text="z"
record world_name "zwei é ก 한 😀" = status 0xbad000f
record world_info 2 = worldID=4294967295 cartelID=0x10 @45:i32=-2 @32:hex=01 @40:hex=01 @49:u16=0x0203 @71:u8=9
record system_morelfs_ramdisks_stats "\x1f" = used=1
record sched_Vcpus_stats_stateTimes 1 = usedTime=18446744073709551615
content system_bootOptionFiles_content "a" = "one\x00two" length 9
content system_bootOptionFiles_content "b" = status 0xbad0003
content system_bootOptionFiles_content "c" = length 5 status 0xbad0010
content system_bootOptionFiles_content "d" = "x" hex=0a79 "z"
list system_modules = status 0xbad0004
)host";

TEST_F(TextForm, IsDumpedInTheFilesOrder) {
  const std::string file = Record(kHost);
  const Outcome dump = Kifcache({"dump", file});
  EXPECT_EQ(dump.out, R"host(host name "al\"pha\x1b[31m"
host system "Linux"
host release "6.1"
host signature 0x0000000000000001
host begin 86400
host end 86401
host omitted "b"
host omitted "a"
set hardware_chipset_rtc = status 0x5
record sched_Vcpus_stats_stateTimes 1 = usedTime=18446744073709551615
content system_bootOptionFiles_content "a" = "one\x00two" length 9
content system_bootOptionFiles_content "b" = status 0xbad0003
content system_bootOptionFiles_content "c" = length 5 status 0xbad0010
content system_bootOptionFiles_content "d" = "x\nyz"
list system_modules = status 0xbad0004
record system_morelfs_ramdisks_stats "\x1f" = used=1
list userworld_cartel_child 9 =
list world = 2 -1 2 "zwei é ก 한 😀" null ""
record world_info 2 = worldID=4294967295 cartelID=16 securityDomain=-2 @32:hex=010000000000000001 @49:hex=0302 @71:hex=09
record world_name -1 = name="ab" @3:hex=ff00fe @127:hex=7a
record world_name 2 = name="a\"\\\n\t\r\x1f\xff\xc2\x9b\xe0\x9f\xbf\xed\xa0\x80\xf0\x8f\xbf\xbf\xf4\x90\x80\x80\xc1\xbf\xf5\x80\x80\x80\xc3"
record world_name "zwei é ก 한 😀" = status 0xbad000f
)host");
  const std::string again = Scratch() + "/again.kif";
  EXPECT_EQ(Kifcache({"build", "-", again}, {.input = dump.out}).status, 0);
  EXPECT_EQ(ReadFile(file), ReadFile(again));
}

TEST_F(TextForm, IsJsonLinesOnRequest) {
  EXPECT_EQ(
      Kifcache({"dump", "--json", Record(kHost)}).out,
      R"host({"kind":"host","name":"al\"pha\u001b[31m","system":"Linux","release":"6.1","architecture":"","recorder":"","rights":"","kernelBuildDate":"","signature":"0x0000000000000001","begin":86400,"end":86401,"omitted":["b","a"]}
{"kind":"set","node":"hardware_chipset_rtc","instance":[],"status":5}
{"kind":"record","node":"sched_Vcpus_stats_stateTimes","instance":[1],"status":0,"fields":{"usedTime":18446744073709551615},"bytes":{}}
{"kind":"content","node":"system_bootOptionFiles_content","instance":["a"],"lengthStatus":0,"readStatus":0,"length":9,"text":"one\u0000two"}
{"kind":"content","node":"system_bootOptionFiles_content","instance":["b"],"lengthStatus":195887107,"readStatus":195887107,"length":0,"text":""}
{"kind":"content","node":"system_bootOptionFiles_content","instance":["c"],"lengthStatus":0,"readStatus":195887120,"length":5,"text":""}
{"kind":"content","node":"system_bootOptionFiles_content","instance":["d"],"lengthStatus":0,"readStatus":0,"length":4,"text":"x\u000ayz"}
{"kind":"list","node":"system_modules","parent":[],"status":195887108}
{"kind":"record","node":"system_morelfs_ramdisks_stats","instance":["\u001f"],"status":0,"fields":{"minimum":0,"maximum":0,"used":1,"peakUsed":0},"bytes":{}}
{"kind":"list","node":"userworld_cartel_child","parent":[9],"status":0,"entries":[]}
{"kind":"list","node":"world","parent":[],"status":0,"entries":[2,-1,2,"zwei é ก 한 😀",null,""]}
{"kind":"record","node":"world_info","instance":[2],"status":0,"fields":{"worldID":4294967295,"groupID":0,"userspaceID":0,"cartelID":16,"parentCartelID":0,"processGroupID":0,"sessionID":0,"worldType":0,"securityDomain":-2},"bytes":{"32":"010000000000000001","49":"0302","71":"09"}}
{"kind":"record","node":"world_name","instance":[-1],"status":0,"fields":{"name":"ab"},"bytes":{"3":"ff00fe","127":"7a"}}
{"kind":"record","node":"world_name","instance":[2],"status":0,"fields":{"name":{"hex":"61225c0a090d1fffc29be09fbfeda080f08fbfbff4908080c1bff5808080c3"}},"bytes":{}}
{"kind":"record","node":"world_name","instance":["zwei é ก 한 😀"],"status":195887119}
)host");
}

TEST_F(TextForm, IsToldInShort) {
  const std::string out = Kifcache({"check", Record(kHost)}).out;
  EXPECT_EQ(out.substr(out.find('\n') + 1), R"host(host       al\"pha\x1b[31m
system     Linux 6.1
recorded   1970-01-02 00:00:00 UTC to 1970-01-02 00:00:01 UTC
interface  0x0000000000000001, not this kifcache's
omitted    b
omitted    a

    lists   records  contents   failing  node
        0         0         0         1  hardware_chipset_rtc
        0         1         0         0  sched_Vcpus_stats_stateTimes
        0         0         4         2  system_bootOptionFiles_content
        1         0         0         1  system_modules
        0         1         0         0  system_morelfs_ramdisks_stats
        1         0         0         0  userworld_cartel_child
        1         0         0         0  world
        0         1         0         0  world_info
        0         3         0         1  world_name
)host");
}

// A line, and what is said of it.
const char kRefused[] = R"host(
list worlds = 1  ->  no node is named "worlds"
list world_name 1 = 1  ->  world_name has no instance lists
set world = status 1  ->  world cannot be written
set hardware_chipset_rtc status 1  ->  "= status S" is missing
record world_name = name="a"  ->  world_name takes 1 parameter here, not 0
list hardware_pci_seg_bus_slot 1 = 2  ->  hardware_pci_seg_bus_slot takes 2 parameters here, not 1
list world  ->  "=" is missing
list world = x1  ->  "x1" is no integer, text or null
list world = -9223372036854775809  ->  "-9223372036854775809" is no integer, text or null
list world = "a  ->  a text has no closing quote
list world = "a"b  ->  a text ends before "b"
list world = "a\q"  ->  a backslash stands before ", \, n, t, r or xHH only
list world = "a\x00"  ->  a parameter cannot hold a NUL
list world = status 0x100000000  ->  status is out of range
list world = status 1 2  ->  unexpected "2"
host colour "red"  ->  unknown fact "colour"
host begin soon  ->  time "soon" is no number
content system_bootOptionFiles_content "a" = length 1 "x"  ->  pieces stand before length and status
content system_bootOptionFiles_content "a" = he=00  ->  "he=00" is no text, hex=DIGITS, length or status
record world_info 1 = name="a"  ->  world_info has no field "name"
record world_info 1 = worldID  ->  "worldID" is not NAME=VALUE
record world_info 1 = worldID="1"  ->  ""1"", the value of worldID, is no number
record world_info 1 = worldID=4294967296  ->  4294967296 does not fit into the 4 bytes of worldID
record world_info 1 = @1:u8=-128 @1:u8=-129  ->  -129 does not fit into the 1 bytes of @1:u8
record world_info 1 = @68:u32=1 @69:u32=1  ->  @69:u32 reaches beyond the 72 bytes of the record
record world_info 1 = @73:hex=  ->  @73:hex reaches beyond the 72 bytes of the record
record world_info 1 = @0:hex=0g  ->  "0g" are no pairs of hexadecimal digits
record world_info 1 = @0:hex=000  ->  "000" are no pairs of hexadecimal digits
record world_info 1 = @-1:u8=0  ->  "@-1:u8" is not @OFFSET:TYPE with a TYPE of u8, u16, u32, u64, i32, text or hex
)host";

TEST_F(TextForm, RefusesWhatItCannotMean) {
  const auto refusal = [this](const std::string &text) {
    const Outcome outcome = Kifcache({"build", "-", Scratch() + "/refused"}, {.input = text});
    EXPECT_EQ(outcome.status, 1) << text;
    EXPECT_NE(access((Scratch() + "/refused").c_str(), F_OK), 0) << text;
    return outcome.err;
  };
  std::istringstream lines(kRefused + 1);
  for (std::string line; std::getline(lines, line);) {
    const size_t arrow = line.find("  ->  ");
    EXPECT_EQ(refusal(line.substr(0, arrow)),
              "(standard input):1: " + line.substr(arrow + 6) + "\n");
  }
  const std::string twice = ":3: the same was given in line 1\n";
  EXPECT_EQ(refusal("list world = 1\nlist userworld_cartel = 1\nlist world ="),
            "(standard input)" + twice);
  EXPECT_EQ(refusal("set hardware_chipset_rtc = status 0\n#\nset hardware_chipset_rtc = status 0"),
            "(standard input)" + twice);
}

TEST_F(TextForm, LeavesTheOldFileWhereItCannotWriteTheNewOne) {
  const std::string file = WriteFile("folder/host.kif", "old");
  const std::string text = WriteFile("host.txt", "list world = 1\n");
  const std::string none = Scratch() + "/none/host";
  const auto messages = [&](const std::string &from, const std::string &to) {
    // A file size limit stands in for a full disk.
    return Run({"/bin/sh", "-c", "ulimit -f 0; exec \"$@\"", "sh", kKifcache, "build", from, to})
        .err;
  };
  EXPECT_EQ(messages(text, file), "kifcache: " + file + ": File too large\n");
  EXPECT_EQ(messages(text, "/dev/null"), "kifcache: /dev/null: not a regular file\n");
  EXPECT_EQ(messages(text, none), "kifcache: " + none + ": No such file or directory\n");
  EXPECT_EQ(messages(none, file), "kifcache: " + none + ": No such file or directory\n");
  EXPECT_EQ(ReadFile(file), "old");
  EXPECT_EQ(Run({"/bin/ls", Scratch() + "/folder"}).out, "host.kif\n");

  EXPECT_EQ(Kifcache({"build", text, file}).status, 0);
  struct stat status;
  ASSERT_EQ(stat(file.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600u);
}

}  // namespace
