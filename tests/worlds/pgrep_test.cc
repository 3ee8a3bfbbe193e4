#include <string>
#include <vector>

#include "fault/fault.h"
#include "host_fixture.h"
#include "worlds/sleeper.h"

namespace {

constexpr char kUsage[] = "Usage: pgrep [-flv] [PATTERN]\n";

constexpr char kHost[] = R"(
list userworld_cartel = 10 20 30 40 50
record userworld_cartel_cmdline 10 = cmdline="/bin/init --boot"
record userworld_cartel_cmdline 20 = cmdline="/usr/bin/foo -c init"
record userworld_cartel_cmdline 30 = status 0xbad0062
record userworld_cartel_cmdline 40 = cmdline="net\td --port 80"
record userworld_cartel_cmdline 50 = status 0xbad0062
)";

class PgrepTest : public HostTest {
 protected:
  void Expect(std::vector<std::string> arguments, const std::string &out, int status) {
    const std::string what = testing::PrintToString(arguments);
    arguments.insert(arguments.begin(), "pgrep");
    const Outcome outcome = Cache(kHost, arguments);
    EXPECT_EQ(outcome.out, out) << what;
    EXPECT_EQ(outcome.err, "") << what;
    EXPECT_EQ(outcome.status, status) << what;
  }
};

TEST_F(PgrepTest, MatchesTheFirstWordOrTheLine) {
  Expect({"init"}, "10 \b\n", 0);
  Expect({"-f", "init"}, "10 \b\n20 \b\n", 0);
  Expect({"-l", "^/(bin|usr)/"}, "10 /bin/init\n20 /usr/bin/foo\n", 0);
  Expect({"-fl", "t.d"}, "40 net\td --port 80\n", 0);
  Expect({"-l", "t.d$"}, "40 net\td\n", 0);  // a tab does not end a word
  Expect({"-f", "INIT"}, "", 1);
  Expect({"--", "-c"}, "", 1);
  Expect({"-f", "--", "-c"}, "20 \b\n", 0);
  Expect({""}, "10 \b\n20 \b\n40 \b\n", 0);
  Expect({"foo", "init", "-l"}, "20 /usr/bin/foo\n", 0);
}

TEST_F(PgrepTest, InvertsTheSelectionAndTheStatus) {
  Expect({"-v", "init"}, "20 \b\n40 \b\n", 1);
  Expect({"-vl", "none"}, "10 /bin/init\n20 /usr/bin/foo\n40 net\td\n", 0);
  Expect({"-v", ""}, "", 1);
}

TEST_F(PgrepTest, NeedsNoCartels) {
  EXPECT_EQ(Cache("list userworld_cartel =\n", {"pgrep", "x"}).status, 1);
  EXPECT_EQ(Cache("list userworld_cartel =\n", {"pgrep", "-v", "x"}).status, 0);
}

TEST_F(PgrepTest, ReadsIdsOfSelectedCartelsOnly) {
  EXPECT_EQ(Cache(kHost, {"pgrep", "foo"}, Failing("KIF_ParamListGetInt32", 1)).status, 3);
  EXPECT_EQ(Cache(kHost, {"pgrep", "foo"}, Failing("KIF_ParamListGetInt32", 2)).status, 0);
  // Of an ID that is too long its low half is shown.
  constexpr char kLong[] = R"(
list userworld_cartel = 4294967295 4294967303
record userworld_cartel_cmdline 4294967295 = cmdline="one"
record userworld_cartel_cmdline 4294967303 = cmdline="two"
)";
  EXPECT_EQ(Cache(kLong, {"pgrep", "."}).out, "-1 \b\n7 \b\n");
}

TEST_F(PgrepTest, ChecksTheCommandLine) {
  const struct {
    std::vector<std::string> arguments;
    std::string out;
    std::string err;
    int status;
  } cases[] = {
      {{"pgrep"}, "", "pgrep: no matching criteria specified\n", 2},
      {{"pgrep", "-l"}, "", "pgrep: no matching criteria specified\n", 2},
      {{"pgrep", "--"}, "", "pgrep: no matching criteria specified\n", 2},
      {{"pgrep", "-h"}, kUsage, "", 0},
      {{"pgrep", "init", "-h"}, kUsage, "", 0},
      {{"pgrep", "-x", "-h"}, kUsage, "pgrep: invalid option -- 'x'\n", 2},
      {{"pgrep", "("}, "", "pgrep: Unmatched ( or \\(\n", 2},
      {{"pgrep", "[b-a]"}, "", "pgrep: Invalid range end\n", 2},
  };
  for (const auto &row : cases) {
    const Outcome outcome = Cache(kHost, row.arguments);
    EXPECT_EQ(outcome.out, row.out) << testing::PrintToString(row.arguments);
    EXPECT_EQ(outcome.err, row.err) << testing::PrintToString(row.arguments);
    EXPECT_EQ(outcome.status, row.status) << testing::PrintToString(row.arguments);
  }
}

TEST_F(PgrepTest, EndsWithStatusThreeWhenItFails) {
  const struct {
    const char *operation;
    int call;
    const char *out;
    const char *err;
  } cases[] = {
      {"KIF_ParamListCreate", 1, "", ""},
      {"KIF_GetInstanceListAlloc", 1, "", ""},
      {"KIF_ParamListAddInt", 2, "10 \b\n", "Couldn't add param to list: 0xbad0062"},
      {"KIF_ParamListGetInt32", 2, "10 \b\n", ""},
      {"calloc", 1, "", ""},
  };
  for (const auto &row : cases) {
    const Outcome outcome =
        Cache(kHost, {"pgrep", "."}, Failing(row.operation, row.call, "0xbad0062"));
    EXPECT_EQ(outcome.out, row.out) << row.operation;
    EXPECT_EQ(outcome.err, row.err) << row.operation;
    EXPECT_EQ(outcome.status, 3) << row.operation;
  }
  // A command line that cannot be read ends the run; one that does not exist does not.
  EXPECT_EQ(Cache(kHost, {"pgrep", "."}, Failing("KIF_Get", 2)).out, "10 \b\n");
  EXPECT_EQ(Cache(kHost, {"pgrep", "."}, Failing("KIF_Get", 2)).status, 3);
  EXPECT_EQ(Cache(kHost, {"pgrep", "init"}, Failing("KIF_Get", 1, "0xbad0062")).status, 1);
}

// The tool's own cartel stands in the list under the ID that the shell has before it becomes the
// tool.
TEST_F(PgrepTest, LeavesItselfOutOnALiveHost) {
  const std::string text = WriteFile("self.txt", R"(list userworld_cartel = 7 @
record userworld_cartel_cmdline 7 = cmdline="other"
record userworld_cartel_cmdline @ = cmdline="pgrep only here"
)");
  const std::string start = "cd " + Scratch() + " && sed s/@/$$/ " + text +
                            " >own.txt && \"$BIN_DIR\"/kifcache build own.txt own.cache && ";
  const std::string live =
      start + "ZELLIBS_HOST=own.cache exec \"$BIN_DIR\"/zlkkiftools pgrep -f \"$@\"";
  Outcome outcome = Run({"/bin/sh", "-c", live, "sh", "only here"});
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.status, 0);  // it matched all the same
  outcome = Run({"/bin/sh", "-c", live, "sh", "-v", "none"});
  EXPECT_EQ(outcome.out, "7 \b\n");
  EXPECT_EQ(outcome.status, 0);

  const std::string cache =
      start + "echo $$; exec \"$BIN_DIR\"/zlkkiftools -c own.cache pgrep -f 'only here'";
  outcome = Run({"/bin/sh", "-c", cache});
  const std::string id = outcome.out.substr(0, outcome.out.find('\n'));
  EXPECT_EQ(outcome.out, id + "\n" + id + " \b\n");
}

TEST_F(PgrepTest, AgreesWithThisMachine) {
  if (!IsInstalled("pgrep")) GTEST_SKIP();
  const Sleeper sleeper(Scratch());
  const std::string pattern = "/" + sleeper.name() + " [0-9]+$";
  const Outcome outcome = Linux("/", {"pgrep", "-f", pattern});
  EXPECT_EQ(outcome.out, sleeper.id() + " \b\n");
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(Run({"pgrep", "-f", pattern}).out, sleeper.id() + "\n");
}

}  // namespace
