#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kUsage[] =
    "bootOption\n"
    "  -r --raw                      Print w/o annotation\n"
    "  -a --all                      Print f,i,u,w,R boot options\n"
    "  -f --fsck                     FS Check Mode\n"
    "  -i --audit                    Audit Mode\n"
    "  -R --rollback                 Booted after a rollback\n"
    "  -p --pxeboot                  Booted via (g)PXE\n"
    "  -k --kernel                   Kernel used to boot\n"
    "  -m --modules                  List of modules used to boot\n"
    "  -o --options                  List of boot options used to boot\n"
    "  -b --bootOptionFiles          List of boot option files to boot\n"
    "  -c --bootOptionFileContent    Content of a boot option file used to boot\n"
    "  -C --bootOptionFilesContent   Content of all boot option files used to boot\n";

// Byte 9 and up of a tardisk's record say nothing of the boot.
constexpr char kHost[] = R"(
record system_bootOption = auditMode=1 fsCheck=0 rollback=255
record system_bootCmdLine = commandLine="kernel.gz opt1  opt2"
record system_bootMAC = address="00:50:56:00:00:01"
list system_bootOptionFiles = "boot.cfg" "empty" "100%s"
content system_bootOptionFiles_content "boot.cfg" = "abc\ndef\n"
content system_bootOptionFiles_content "empty" =
content system_bootOptionFiles_content "100%s" = "%d"
list system_morelfs_tardisks = "a.v00" "b.v00" "c.v00"
record system_morelfs_tardisks_stats "a.v00" = usedToBoot=1
record system_morelfs_tardisks_stats "b.v00" = used=4096 @9:u8=1
record system_morelfs_tardisks_stats "c.v00" = usedToBoot=128
)";

class BootOptionTest : public HostTest {
 protected:
  void Expect(const std::string &host, std::vector<std::string> arguments, const std::string &out,
              int status = 0) {
    arguments.insert(arguments.begin(), "bootOption");
    const std::string what = testing::PrintToString(arguments);
    const Outcome outcome = Live(host, arguments);
    EXPECT_EQ(outcome.out, out) << what;
    EXPECT_EQ(outcome.err, "") << what;
    EXPECT_EQ(outcome.status, status) << what;
  }

  size_t Requests() const {
    size_t count = 0;
    for (size_t at = 0; (at = Trace().find("KIF_SetData", at)) != std::string::npos; ++at) ++count;
    return count;
  }
};

TEST_F(BootOptionTest, PrintsInItsOwnOrder) {
  Expect(kHost, {"-c", "nobody", "-b", "-m", "-o", "-C", "-k", "-p", "-a", "-c", "boot.cfg"},
         "FS Check : 0\nAudit Mode : 1\nBooted after rollback : 255\nBooted via (g)PXE : 1\n"
         "Kernel : kernel.gz\nBoot Option File Content boot.cfg : abc def \n"
         "Boot Option File Content empty : \nBoot Option File Content 100%s : %d\n"
         "Options : opt1  opt2\nModules : a.v00 c.v00 \n"
         "Boot Option Files : boot.cfg empty 100%s \n"
         "Boot Option File Content boot.cfg : abc def \n");
  Expect(kHost,
         {"--raw", "--fsck", "--audit", "--rollback", "--pxeboot", "--kernel", "--modules",
          "--options", "--bootOptionFiles", "--bootOptionContent", "100%s",
          "--bootOptionFilesContent"},
         "0\n1\n255\n1\nkernel.gz\nabc def   %d opt1  opt2\na.v00 c.v00 \n"
         "boot.cfg empty 100%s \n%d\n");
  Expect(kHost, {"operand"}, "");
}

TEST_F(BootOptionTest, SplitsTheCommandLineAtItsFirstBlank) {
  const auto host = [](const std::string &line) {
    return "record system_bootMAC =\nrecord system_bootCmdLine = commandLine=\"" + line + "\"\n";
  };
  Expect(host("kernel.gz"), {"-o", "-k"}, "Kernel : kernel.gz\nOptions : \n");
  Expect(host("kernel.gz a"), {"-o"}, "Options : a\n");
  Expect(host(" a"), {"-rko"}, "\na\n");
  Expect(host("k\\tx y"), {"-rko"}, "k\tx\ny\n");
  Expect(host(""), {"-pk"}, "Booted via (g)PXE : 0\nKernel : \n");
  const std::string full(4093, 'x');
  Expect(host("k " + full), {"-ro"}, full + "\n");
}

TEST_F(BootOptionTest, ReadsContentInChunks) {
  constexpr size_t kChunk = 3 << 20;
  const std::string first(kChunk - 1, 'a'), second(2 << 20, 'b');
  const std::string host =
      "content system_bootOptionFiles_content \"big\" = \"" + first + "\\n" + second + "\\nend\"\n";
  Expect(host, {"-r", "-c", "big"}, first + " " + second + " end\n");
  EXPECT_EQ(Requests(), 2u);
  const std::string whole =
      "content system_bootOptionFiles_content \"whole\" = \"" + first + "z\"\n";
  Expect(whole, {"-r", "-c", "whole"}, first + "z\n");
  EXPECT_EQ(Requests(), 1u);
}

TEST_F(BootOptionTest, PrintsAChunkUpToAZeroByte) {
  constexpr size_t kChunk = 3 << 20;
  const std::string hidden(kChunk - 4, 'h');
  Expect("content system_bootOptionFiles_content \"f\" = \"abc\" hex=00 \"" + hidden +
             "next\\n\" hex=00 \"no\"\n",
         {"-r", "-c", "f"}, "abcnext \n");
}

TEST_F(BootOptionTest, FailsOnContentThatEndsEarly) {
  const std::string content = "content system_bootOptionFiles_content ";
  Expect(content + "\"f\" = \"abc\" length 10\n", {"-c", "f"}, "Boot Option File Content f : abc",
         1);
  Expect(content + "\"f\" = length 4294967295\n", {"-rc", "f"}, "", 1);
  Expect(content + "\"f\" = \"abc\" status 0xbad0010\n", {"-rc", "f"}, "", 1);
  Expect(content + "\"f\" = status 0xbad000f\n", {"-c", "f"}, "Invalid boot option file name f\n",
         1);
  Expect(kHost, {"-kc", "nobody"}, "Kernel : kernel.gz\nInvalid boot option file name nobody\n", 1);
}

TEST_F(BootOptionTest, ReadsNoContentFromACache) {
  for (const std::vector<std::string> &arguments : std::vector<std::vector<std::string>>{
           {"bootOption", "-c", "boot.cfg"}, {"bootOption", "-C", "-o"}}) {
    const Outcome outcome = Cache(kHost, arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, "Using KIF cache is unsupported\n");
    EXPECT_EQ(outcome.status, 1);
  }
  const Outcome outcome = Cache(kHost, {"bootOption", "-bmr"});
  EXPECT_EQ(outcome.out, "a.v00 c.v00 \nboot.cfg empty 100%s \n");
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(BootOptionTest, KeepsWhatStoodBeforeAFailure) {
  Expect("", {"-a"}, "", 1);
  Expect("", {"-p"}, "", 1);
  Expect("record system_bootCmdLine =\n", {"-kp"}, "", 1);
  Expect("", {"-m"}, "Modules : ", 1);
  Expect("", {"-b"}, "", 1);
  Expect("", {"-C"}, "", 1);
  Expect("list system_bootOptionFiles = \"a\" 7 \"b\"\n", {"-b"}, "Boot Option Files : a ", 1);
  Expect("list system_bootOptionFiles = null\n", {"-C"}, "", 1);
  const std::string archives = "list system_morelfs_tardisks = \"a\" \"b\"\n";
  Expect(archives + "record system_morelfs_tardisks_stats \"a\" = usedToBoot=1\n", {"-mb"},
         "Modules : a ", 1);
}

TEST_F(BootOptionTest, SurvivesFailingOperations) {
  const struct {
    const char *operation;
    int call;
    const char *option;
    const char *out;
  } cases[] = {
      {"KIF_ParamListCreate", 2, "-rm", "a.v00 "},
      {"KIF_ParamListAddString", 3, "-rm", "a.v00 "},
      {"KIF_ParamListCreate", 1, "-rC", ""},
      {"KIF_ParamListAddString", 3, "-rC", "abc def   "},
      {"KIFData_Create", 1, "-rC", ""},
      {"KIFData_Create", 2, "-rC", ""},
      {"KIFData_GetData", 1, "-rC", ""},
  };
  for (const auto &test : cases) {
    const Outcome outcome =
        Live(kHost, {"bootOption", test.option}, Failing(test.operation, test.call));
    EXPECT_EQ(outcome.out, test.out) << test.operation << test.call;
    EXPECT_EQ(outcome.status, 1) << test.operation << test.call;
  }
}

TEST_F(BootOptionTest, PrintsItsUsage) {
  const struct {
    std::vector<std::string> arguments;
    std::string diagnostic;
  } cases[] = {
      {{"bootOption"}, "bootOption: no option specified\n"},
      {{"bootOption", "-a", "-u"}, ""},
      {{"bootOption", "-w"}, ""},
      {{"bootOption", "--help"}, ""},
      {{"bootOption", "-c"}, "bootOption: option requires an argument -- 'c'\n"},
      {{"bootOption", "--bootOptionFileContent", "x"},
       "bootOption: unrecognized option '--bootOptionFileContent'\n"},
  };
  for (const auto &test : cases) {
    const Outcome outcome = Live(kHost, test.arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, test.diagnostic + kUsage);
    EXPECT_EQ(outcome.status, 1);
  }
}

}  // namespace
