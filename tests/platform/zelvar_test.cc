#include <string>
#include <vector>

#include "host_fixture.h"

namespace {

constexpr char kUsage[] =
    "zelvar      -v, --version         Get version information for zelkernel\n"
    "            -l, --level           Get release level information\n"
    "            -h, --help            Print this menu\n";

std::string Host(const std::string &level, const std::string &update, int build = 42) {
  return "record system_version = product=\"Zel 100%s\" version=\"6.5\" releaseLevel=\"" + level +
         "\" update=\"" + update + "\" buildNumber=" + std::to_string(build) + "\n";
}

class ZelvarTest : public HostTest {
 protected:
  std::string Print(const std::string &host, const std::string &option) {
    const Outcome outcome = Cache(host, {"zelvar", option});
    EXPECT_EQ(outcome.err, "");
    EXPECT_EQ(outcome.status, 0);
    return outcome.out;
  }
};

TEST_F(ZelvarTest, PrintsTheVersion) {
  EXPECT_EQ(Print(Host("Release", "0"), "-v"), "Zel 100%s 6.5 build-00042\n");
  EXPECT_EQ(Print(Host("Release", "0", 1234567), "--version"), "Zel 100%s 6.5 build-1234567\n");
  EXPECT_EQ(Print(Host("Release", "0", -7), "-v"), "Zel 100%s 6.5 build--00007\n");
}

TEST_F(ZelvarTest, NamesTheLevel) {
  EXPECT_EQ(Print(Host("Release", "0"), "-l"), "Zel 100%s 6.5 GA\n");
  EXPECT_EQ(Print(Host("Release2", "0"), "-l"), "Zel 100%s 6.5 Release2\n");
  EXPECT_EQ(Print(Host("Releas", "0 whatever follows"), "--level"), "Zel 100%s 6.5 Releas\n");
  EXPECT_EQ(Print(Host("Beta", "2b"), "-l"), "Zel 100%s 6.5 Update 2b\n");
  EXPECT_EQ(Print(Host("Release", ""), "-l"), "Zel 100%s 6.5 Update \n");
  EXPECT_EQ(Print(Host("Release", "1"), "-lv"),
            "Zel 100%s 6.5 build-00042\nZel 100%s 6.5 Update 1\n");
}

TEST_F(ZelvarTest, StaysInsideItsFields) {
  const std::string product(32, 'p'), version(64, 'v'), level(64, 'l');
  const std::string host = "record system_version = product=\"" + product + "\" version=\"" +
                           version + "\" releaseLevel=\"" + level + "\" update=\"0" +
                           std::string(131, 'u') + "\" buildNumber=-1\n";
  const std::string out = Print(host, "-vl");
  EXPECT_EQ(out.find("pv"), std::string::npos);
  EXPECT_EQ(out.find("vl"), std::string::npos);
  EXPECT_EQ(out.find("l0"), std::string::npos);
  EXPECT_NE(out.find("build--00001\n"), std::string::npos);
}

TEST_F(ZelvarTest, RefusesBadCommandLines) {
  const struct {
    std::vector<std::string> arguments;
    std::string diagnostic;
  } cases[] = {
      {{"zelvar"}, "zelvar: no option specified\n"},
      {{"zelvar", "foo"}, "zelvar: Invalid arguments\n"},
      {{"zelvar", "-v", "-h"}, ""},
      {{"zelvar", "-v", "-x"}, "zelvar: invalid option -- 'x'\n"},
  };
  for (const auto &test : cases) {
    const Outcome outcome = Cache(Host("Release", "0"), test.arguments);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err, test.diagnostic + kUsage);
    EXPECT_EQ(outcome.status, 1);
  }
}

TEST_F(ZelvarTest, IsSilentWithoutARecord) {
  const Outcome outcome = Live("record system_version = status 0xbad0003\n", {"zelvar", "-v"});
  EXPECT_EQ(outcome.out + outcome.err, "");
  EXPECT_EQ(outcome.status, 1);
}

}  // namespace
