// kifcache build and dump: the text form, both ways.
#include <sys/stat.h>
#include <unistd.h>

#include "host_fixture.h"

namespace {

const char kKifcache[] = BIN_DIR "/kifcache";

class TextForm : public HostTest {
 protected:
  Outcome Kifcache(std::vector<std::string> arguments, Surroundings surroundings = {}) {
    arguments.insert(arguments.begin(), kKifcache);
    return Run(arguments, std::move(surroundings));
  }

  // What a host reads like when it has been through a file, without the line of the signature.
  std::string Again(const std::string &text) {
    const Outcome dump = Kifcache({"dump", Record(text)});
    EXPECT_EQ(dump.status, 0) << dump.err;
    const size_t line = dump.out.find("host signature");
    return std::string(dump.out).erase(line, dump.out.find('\n', line) + 1 - line);
  }

  // The message for a text that is refused, without the name of the file.
  std::string Refusal(const std::string &text) {
    const std::string path = WriteFile("refused.txt", text);
    const Outcome outcome = Kifcache({"build", path, Scratch() + "/refused.kif"});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.out, "");
    EXPECT_NE(access((Scratch() + "/refused.kif").c_str(), F_OK), 0);
    EXPECT_EQ(outcome.err.compare(0, path.size(), path), 0) << outcome.err;
    return outcome.err.substr(std::min(path.size(), outcome.err.size()));
  }
};

TEST_F(TextForm, IsDumpedInTheFilesOrder) {
  EXPECT_EQ(Again("# Written by hand.\n"
                  "\n"
                  "list world = 2 -1 2\t\"two\" null \"\"\r\n"
                  "record world_name 2 = name=\"a\\\"\\\\\\n\\t\\r\\x1b\\xff\xc3\xa9\"\n"
                  "record world_name -1 = name=\"minus\"\n"
                  "record world_name \"two\" = status 0xbad000f\n"
                  "record world_info 2 = worldID=4294967295 cartelID=0x10 securityDomain=-2\n"
                  "host end 7\n"
                  "host omitted \"b\"\n"
                  "host omitted \"a\"\n"
                  "host name \"alpha\"\n"
                  "set hardware_chipset_rtc = status 5\n"
                  "list system_modules = status 0xbad0004\n"
                  "list userworld_cartel_child 9 =\n"),
            "host name \"alpha\"\n"
            "host end 7\n"
            "host omitted \"b\"\n"
            "host omitted \"a\"\n"
            "set hardware_chipset_rtc = status 0x5\n"
            "list system_modules = status 0xbad0004\n"
            "list userworld_cartel_child 9 =\n"
            "list world = 2 -1 2 \"two\" null \"\"\n"
            "record world_info 2 = worldID=4294967295 cartelID=16 securityDomain=-2\n"
            "record world_name -1 = name=\"minus\"\n"
            "record world_name 2 = name=\"a\\\"\\\\\\n\\t\\r\\x1b\\xff\xc3\xa9\"\n"
            "record world_name \"two\" = status 0xbad000f\n");
}

TEST_F(TextForm, KeepsBytesWithoutAName) {
  // Before, between and after named fields; behind the end of a text; across a gap.
  EXPECT_EQ(Again("record world_info 1 = @32:hex=01 @45:i32=-1 @49:u16=0x0203 @71:u8=9\n"
                  "record world_name 1 = name=\"ab\" @3:hex=ff00fe @127:text=\"z\"\n"
                  "record system_bootOption = @0:u32=0x04030201\n"
                  "record hardware_acpi_tables_buffers 1 0 = signature=\"DSDT\" length=2 "
                  "@4:hex=ee @9:hex=abcd\n"),
            "record hardware_acpi_tables_buffers 1 0 = signature=\"DSDT\" length=2 @4:hex=ee "
            "@9:hex=abcd\n"
            "record system_bootOption = auditMode=1 fsCheck=2 rollback=3 @3:hex=04\n"
            "record world_info 1 = securityDomain=-1 @32:hex=01 @49:hex=0302 @71:hex=09\n"
            "record world_name 1 = name=\"ab\" @3:hex=ff00fe @127:hex=7a\n");
}

TEST_F(TextForm, KeepsWhatAContentAnswers) {
  const std::string text =
      "content system_bootOptionFiles_content \"a\" = \"one\\x00two\" length 9\n"
      "content system_bootOptionFiles_content \"b\" = status 0xbad0003\n"
      "content system_bootOptionFiles_content \"c\" = length 5 status 0xbad0010\n"
      "content system_bootOptionFiles_content \"d\" =\n"
      "content system_bootOptionFiles_content \"e\" = \"xyz\"\n";
  EXPECT_EQ(Again(text), text);
  EXPECT_EQ(Again("content system_bootOptionFiles_content \"a\" = \"x\" hex=0a79 \"z\"\n"),
            "content system_bootOptionFiles_content \"a\" = \"x\\nyz\"\n");
}

TEST_F(TextForm, MakesTheSameFileAgain) {
  const std::string first = Record(
      "list world = 3 2 1\nlist userworld_cartel = 1\n"
      "record world_name 1 = name=\"same\"\nrecord world_name 2 = name=\"same\"\n"
      "record world_info 2 = worldID=2\nhost begin 5\nhost signature 0x1\n");
  const std::string text = WriteFile("dump.txt", Kifcache({"dump", first}).out);
  const std::string second = Scratch() + "/second.kif";
  EXPECT_EQ(Kifcache({"build", text, second}).status, 0);
  EXPECT_EQ(ReadFile(first), ReadFile(second));
  // From standard input, and with the lines the other way round.
  EXPECT_EQ(
      Kifcache({"build", "-", second}, {.input = "host signature 0x1\nhost begin 5\n"
                                                 "record world_info 2 = worldID=2\n"
                                                 "record world_name 2 = name=\"same\"\n"
                                                 "record world_name 1 = name=\"same\"\n"
                                                 "list userworld_cartel = 1\nlist world = 3 2 1"})
          .status,
      0);
  EXPECT_EQ(ReadFile(first), ReadFile(second));
}

TEST_F(TextForm, RefusesWhatItCannotMean) {
  EXPECT_EQ(Refusal("\n#\nworld = 1\n"),
            ":3: a line begins with host, list, record, content or set, not with \"world\"\n");
  EXPECT_EQ(Refusal("list worlds = 1\n"), ":1: no node is named \"worlds\"\n");
  EXPECT_EQ(Refusal("list world_name 1 = 1\n"), ":1: world_name has no instance lists\n");
  EXPECT_EQ(Refusal("record world = \n"), ":1: world has no records\n");
  EXPECT_EQ(Refusal("content world = \"\"\n"), ":1: world has no content\n");
  EXPECT_EQ(Refusal("set world = status 1\n"), ":1: world cannot be written\n");
  EXPECT_EQ(Refusal("record world_name = name=\"a\"\n"),
            ":1: world_name takes 1 parameter here, not 0\n");
  EXPECT_EQ(Refusal("list hardware_pci_seg_bus_slot 1 = 2\n"),
            ":1: hardware_pci_seg_bus_slot takes 2 parameters here, not 1\n");
  EXPECT_EQ(Refusal("list world\n"), ":1: \"=\" is missing\n");
  EXPECT_EQ(Refusal("list world = x1\n"), ":1: \"x1\" is no integer, text or null\n");
  EXPECT_EQ(Refusal("list world = \"a\n"), ":1: a text has no closing quote\n");
  EXPECT_EQ(Refusal("list world = \"a\"b\n"), ":1: a text ends before \"b\"\n");
  EXPECT_EQ(Refusal("list world = \"a\\q\"\n"),
            ":1: a backslash stands before \", \\, n, t, r or xHH only\n");
  EXPECT_EQ(Refusal("list world = \"a\\x00\"\n"), ":1: a parameter cannot hold a NUL\n");
  EXPECT_EQ(Refusal("list world = status 0x100000000\n"), ":1: status is out of range\n");
  EXPECT_EQ(Refusal("list world = status 1 2\n"), ":1: unexpected \"2\"\n");
  EXPECT_EQ(Refusal("host colour \"red\"\n"), ":1: unknown fact \"colour\"\n");
  EXPECT_EQ(Refusal("content system_bootOptionFiles_content \"a\" = length 1 \"x\"\n"),
            ":1: pieces stand before length and status\n");
  EXPECT_EQ(Refusal("list world = 1\nlist userworld_cartel = 1\nlist world =\n"),
            ":3: the same was given in line 1\n");
}

TEST_F(TextForm, RefusesPartsThatDoNotFit) {
  const auto part = [this](const std::string &text) {
    return Refusal("record world_info 1 = " + text + "\n");
  };
  EXPECT_EQ(part("name=\"a\""), ":1: world_info has no field \"name\"\n");
  EXPECT_EQ(part("worldID"), ":1: \"worldID\" is not NAME=VALUE\n");
  EXPECT_EQ(part("worldID=\"1\""), ":1: \"\"1\"\", the value of worldID, is no number\n");
  EXPECT_EQ(part("worldID=4294967296"),
            ":1: 4294967296 does not fit into the 4 bytes of worldID\n");
  EXPECT_EQ(part("@1:u8=-129"), ":1: -129 does not fit into the 1 bytes of @1:u8\n");
  EXPECT_EQ(part("@69:u32=1"), ":1: @69:u32 reaches beyond the 72 bytes of the record\n");
  EXPECT_EQ(part("@72:hex=00"), ":1: @72:hex reaches beyond the 72 bytes of the record\n");
  EXPECT_EQ(part("@0:hex=0g"), ":1: \"0g\" are no pairs of hexadecimal digits\n");
  EXPECT_EQ(part("@-1:u8=0"),
            ":1: \"@-1:u8\" is not @OFFSET:TYPE with a TYPE of u8, u16, u32, u64, i32, text or "
            "hex\n");
  EXPECT_EQ(Refusal("record system_bootMAC = address=\"" + std::string(25, 'a') + "\"\n"),
            ":1: the text of address is longer than its 24 bytes\n");
}

TEST_F(TextForm, IsJsonLinesOnRequest) {
  const std::string file = Record(
      "host name \"al\\\"pha\"\nhost signature 0x1\nlist world = 1 \"a\" null\n"
      "record world_name 1 = name=\"\\xff\\n\" @5:hex=01\nrecord world_name 2 = status 5\n"
      "record sched_Vcpus_stats_stateTimes 1 = usedTime=18446744073709551615\n"
      "content system_bootOptionFiles_content \"f\" = \"x\" length 4\n");
  const Outcome dump = Kifcache({"dump", "--json", file});
  EXPECT_EQ(dump.status, 0);
  EXPECT_EQ(dump.out,
            "{\"kind\":\"host\",\"name\":\"al\\\"pha\",\"system\":\"\",\"release\":\"\","
            "\"architecture\":\"\",\"recorder\":\"\",\"rights\":\"\",\"kernelBuildDate\":\"\","
            "\"signature\":\"0x0000000000000001\",\"begin\":0,\"end\":0,\"omitted\":[]}\n"
            "{\"kind\":\"record\",\"node\":\"sched_Vcpus_stats_stateTimes\",\"instance\":[1],"
            "\"status\":0,\"fields\":{\"usedTime\":18446744073709551615},\"bytes\":{}}\n"
            "{\"kind\":\"content\",\"node\":\"system_bootOptionFiles_content\","
            "\"instance\":[\"f\"],\"lengthStatus\":0,\"readStatus\":0,\"length\":4,"
            "\"text\":\"x\"}\n"
            "{\"kind\":\"list\",\"node\":\"world\",\"parent\":[],\"status\":0,"
            "\"entries\":[1,\"a\",null]}\n"
            "{\"kind\":\"record\",\"node\":\"world_name\",\"instance\":[1],\"status\":0,"
            "\"fields\":{\"name\":{\"hex\":\"ff0a\"}},\"bytes\":{\"5\":\"01\"}}\n"
            "{\"kind\":\"record\",\"node\":\"world_name\",\"instance\":[2],\"status\":5}\n");
}

TEST_F(TextForm, LeavesTheOldFileWhereItCannotWriteTheNewOne) {
  const std::string file = WriteFile("folder/host.kif", "old");
  const std::string text = WriteFile("host.txt", "list world = 1\n");
  // A file size limit stands in for a full disk.
  const Outcome full =
      Run({"/bin/sh", "-c", "ulimit -f 0; exec \"$@\"", "sh", kKifcache, "build", text, file});
  EXPECT_EQ(full.status, 1);
  EXPECT_EQ(full.err, "kifcache: " + file + ": File too large\n");
  EXPECT_EQ(ReadFile(file), "old");
  EXPECT_EQ(Run({"/bin/ls", Scratch() + "/folder"}).out, "host.kif\n");

  EXPECT_EQ(Kifcache({"build", text, "/dev/null"}).err,
            "kifcache: /dev/null: not a regular file\n");
  EXPECT_EQ(Kifcache({"build", text, Scratch() + "/none/host.kif"}).status, 1);
  EXPECT_EQ(Kifcache({"build", Scratch() + "/none.txt", file}).err,
            "kifcache: " + Scratch() + "/none.txt: No such file or directory\n");

  EXPECT_EQ(Kifcache({"build", text, file}).status, 0);
  struct stat status;
  ASSERT_EQ(stat(file.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600u);
}

TEST_F(TextForm, IsNotLostOnAFullOutput) {
  const std::string file = Record("list world = 1\n");
  for (const std::string command : {"dump", "check"}) {
    const Outcome outcome =
        Run({"/bin/sh", "-c", "exec \"$@\" > /dev/full", "sh", kKifcache, command, file});
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.err, "kifcache: write error: No space left on device\n");
  }
}

}  // namespace
