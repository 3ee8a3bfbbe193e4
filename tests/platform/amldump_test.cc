#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <set>
#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

// The buffer number `number` of `table`.
std::string Buffer(int table, int number, const std::string &signature, const std::string &data) {
  return "record hardware_acpi_tables_buffers " + std::to_string(table) + " " +
         std::to_string(number) + " = signature=\"" + signature +
         "\" @4:u8=255 length=" + std::to_string(data.size()) + " @9:text=\"" + data + "\"\n";
}

// A host with `count` tables of one buffer, whose signatures come one after the other.
std::string Tables(const std::vector<std::string> &signatures) {
  std::string numbers, rest;
  int table = 0;
  for (const std::string &signature : signatures) {
    numbers += " " + std::to_string(++table);
    rest += "list hardware_acpi_tables_buffers " + std::to_string(table) + " = 0\n" +
            Buffer(table, 0, signature, signature);
  }
  return "list hardware_acpi_tables =" + numbers + "\n" + rest;
}

class AmldumpTest : public HostTest {
 protected:
  AmldumpTest() : directory_(Scratch() + "/tables") { mkdir(directory_.c_str(), 0700); }

  Outcome Dump(const std::string &host, Surroundings surroundings = {}) {
    surroundings.directory = directory_;
    return Live(host, {"amldump", "-x", "ignored"}, surroundings);
  }

  void ExpectRefusal(const std::string &host, const std::string &err) {
    const Outcome outcome = Dump(host);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, err);
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(Files(), std::set<std::string>());
  }

  std::set<std::string> Files() const {
    std::set<std::string> names;
    for (const auto &entry : std::filesystem::directory_iterator(directory_)) {
      names.insert(entry.path().filename());
    }
    return names;
  }

  std::string File(const std::string &name) const { return ReadFile(directory_ + "/" + name); }

  std::string directory_;
};

TEST_F(AmldumpTest, NumbersTheTablesOfOneSignature) {
  const Outcome outcome = Dump(Tables({"SSDT", "DSDT", "SSDT", "SSDT", "AB"}));
  EXPECT_EQ(outcome.out,
            "Writing file SSDT.aml\nWriting file DSDT.aml\nWriting file SSDT-1.aml\n"
            "Writing file SSDT-2.aml\nWriting file AB.aml\n");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(Files(),
            (std::set<std::string>{"AB.aml", "DSDT.aml", "SSDT-1.aml", "SSDT-2.aml", "SSDT.aml"}));
  EXPECT_EQ(File("SSDT-2.aml"), "SSDT");
  struct stat status;
  ASSERT_EQ(stat((directory_ + "/DSDT.aml").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600u);
}

TEST_F(AmldumpTest, JoinsTheBuffersOfATable) {
  const std::string full(131075, 'f');
  // Table 2 has no buffers; the second buffer of table -1 carries another signature.
  const Outcome outcome = Dump(
      "list hardware_acpi_tables = 2 -1 3\nlist hardware_acpi_tables_buffers 2 =\n"
      "list hardware_acpi_tables_buffers -1 = 7 8 9\nlist hardware_acpi_tables_buffers 3 = 0\n" +
      Buffer(-1, 0, "LONG", full) + Buffer(-1, 1, "X/XX", "middle") + Buffer(-1, 2, "LONG", "end") +
      Buffer(3, 0, "NULL", ""));
  EXPECT_EQ(outcome.out, "Writing file LONG.aml\nWriting file NULL.aml\n");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(File("LONG.aml"), full + "middleend");
  EXPECT_EQ(Files(), (std::set<std::string>{"LONG.aml", "NULL.aml"}));
}

TEST_F(AmldumpTest, OverwritesNothing) {
  WriteFile("tables/DSDT.aml", "kept");
  const Outcome outcome = Dump(Tables({"SSDT", "DSDT", "APIC"}));
  EXPECT_EQ(outcome.out, "Writing file SSDT.aml\nWriting file DSDT.aml\n");
  EXPECT_EQ(outcome.err, "amldump: : File exists\n");
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(File("DSDT.aml"), "kept");
  EXPECT_EQ(Files(), (std::set<std::string>{"DSDT.aml", "SSDT.aml"}));
}

TEST_F(AmldumpTest, TakesAnySignatureButNoOtherDirectory) {
  const Outcome outcome = Dump(Tables({"", "..", "A\\x1bB", "C\\x00D"}));
  EXPECT_EQ(outcome.out,
            "Writing file .aml\nWriting file ...aml\nWriting file A\x1b"
            "B.aml\n"
            "Writing file C.aml\n");
  EXPECT_EQ(outcome.status, 0) << outcome.err;
  EXPECT_EQ(Files(), (std::set<std::string>{".aml", "...aml",
                                            "A\x1b"
                                            "B.aml",
                                            "C.aml"}));
}

TEST_F(AmldumpTest, StaysInItsDirectory) {
  for (const std::string signature : {"../x", "/etc", "a/"}) {
    const Outcome outcome = Dump(Tables({signature}));
    EXPECT_EQ(outcome.out, "Writing file " + signature + ".aml\n");
    EXPECT_EQ(outcome.err, "amldump: : No such file or directory\n");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_TRUE(Files().empty());
  }
}

TEST_F(AmldumpTest, RefusesALengthBeyondTheRecord) {
  const std::string table = "list hardware_acpi_tables = 1\n";
  const std::string record = "record hardware_acpi_tables_buffers 1 ";
  ExpectRefusal(table + "list hardware_acpi_tables_buffers 1 = 0\n" + record +
                    "0 = signature=\"DSDT\" length=131076\n",
                "amldump: a buffer of 131076 bytes does not fit its record\n");
  const Outcome outcome = Dump(table + "list hardware_acpi_tables_buffers 1 = 0 1\n" +
                               Buffer(1, 0, "DSDT", "first") + record + "1 = length=4294967295\n");
  EXPECT_EQ(outcome.out, "Writing file DSDT.aml\n");
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(File("DSDT.aml"), "first");
}

TEST_F(AmldumpTest, IsSilentWhenTheHostFails) {
  ExpectRefusal("", "");
  ExpectRefusal("list hardware_acpi_tables = \"text\"\n", "");
  ExpectRefusal("list hardware_acpi_tables = 1\n", "");
  ExpectRefusal("list hardware_acpi_tables = 1\nlist hardware_acpi_tables_buffers 1 = 0\n", "");
  const Outcome none = Dump("list hardware_acpi_tables =\n");
  EXPECT_EQ(none.out + none.err, "");
  EXPECT_EQ(none.status, 0);
}

TEST_F(AmldumpTest, SurvivesFailingOperations) {
  const std::string host = Tables({"SSDT"});
  for (const Surroundings &failing :
       {Failing("KIF_ParamListCreate", 1), Failing("KIF_ParamListAddInt", 1),
        Failing("KIF_ParamListAddInt", 2)}) {
    const Outcome outcome = Dump(host, failing);
    EXPECT_EQ(outcome.out + outcome.err, "");
    EXPECT_EQ(outcome.status, 1);
  }
  const Outcome outcome = Dump(host, Failing("realloc", 1));
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.err, "amldump: : Cannot allocate memory\n");
  EXPECT_EQ(outcome.status, 1);
}

TEST_F(AmldumpTest, SaysThatAFileCannotGrow) {
  Surroundings surroundings;
  surroundings.directory = directory_;
  surroundings.environment = {"ZELLIBS_HOST=" + Record(Tables({"SSDT"}))};
  const Outcome outcome =
      Run({"/bin/sh", "-c", "ulimit -f 0; trap '' XFSZ; exec " BIN_DIR "/zlkkiftools amldump"},
          surroundings);
  EXPECT_EQ(outcome.err, "amldump: : File too large\n");
  EXPECT_EQ(outcome.status, 1);
}

}  // namespace
