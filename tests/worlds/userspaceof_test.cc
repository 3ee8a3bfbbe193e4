#include <string>

#include "fault/fault.h"
#include "host_fixture.h"

namespace {

constexpr char kHost[] = R"(
list world = 1 5 6 7 8 9
record world_info 1 = worldID=1 userspaceID=11
record world_info 5 = worldID=12 userspaceID=3
record world_info 6 = status 0xbad0003
record world_info 7 = worldID=12 userspaceID=4294967295
record world_info 8 = worldID=0 userspaceID=9
record world_info 9 = worldID=4294967291 userspaceID=5
)";

class UserspaceofTest : public HostTest {
 protected:
  void Expect(const char *worldID, const std::string &out, int status) {
    const Outcome outcome = Cache(kHost, {"userspaceof", worldID, "1"});
    EXPECT_EQ(outcome.out, out) << worldID;
    EXPECT_EQ(outcome.err, "") << worldID;
    EXPECT_EQ(outcome.status, status) << worldID;
  }
};

TEST_F(UserspaceofTest, PrintsEveryWorldOfTheId) {
  Expect("1", "11 \n", 0);
  Expect(" +12abc", "3 -1 \n", 0);
  Expect("5", "", 1);
  Expect("6", "", 1);
  Expect("4294967291", "5 \n", 0);
  Expect("-5", "5 \n", 0);
  Expect("-4294967295", "11 \n", 0);
}

TEST_F(UserspaceofTest, RefusesWhatIsNoId) {
  for (const char *text : {"0", "", "-h", "-0", "x1", "\xb2"}) Expect(text, "bad world ID\n", 1);
  // Never the ID that remains of one that is too large.
  for (const char *text : {"4294967297", "-4294967297", "18446744073709551617",
                           "-18446744073709551615", "4294967296"}) {
    Expect(text, "", 1);
  }
  const Outcome outcome = Cache(kHost, {"userspaceof"});
  EXPECT_EQ(outcome.err, "find the userspace ID of running programs\nuserspaceof WID\n");
  EXPECT_EQ(outcome.out, "");
  EXPECT_EQ(outcome.status, 1);
}

TEST_F(UserspaceofTest, SaysWhatFails) {
  const struct {
    const char *operation;
    int call;
    const char *out;
    const char *err;
    int status;
  } cases[] = {
      {"KIF_ParamListCreate", 1, "", "CartelList: Not enough memory\n", 1},
      {"KIF_GetInstanceListAlloc", 1, "", "CartelList: error fetching cartel list 0xbad0040\n", 1},
      {"KIF_ParamListAddInt", 3, "3 ", "Couldn't add param to list: 0xbad0040", 1},
      {"KIF_Get", 2, "-1 \n", "", 0},
  };
  for (const auto &row : cases) {
    const Outcome outcome =
        Cache(kHost, {"userspaceof", "12"}, Failing(row.operation, row.call, "0xbad0040"));
    EXPECT_EQ(outcome.out, row.out) << row.operation;
    EXPECT_EQ(outcome.err, row.err) << row.operation;
    EXPECT_EQ(outcome.status, row.status) << row.operation;
  }
  EXPECT_EQ(Cache("list world =\n", {"userspaceof", "1"}).status, 1);
}

}  // namespace
