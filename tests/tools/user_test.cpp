// keldoauth user.

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::HasSubstr;
using testing::MatchesRegex;
using testing::SizeIs;

class UserCommand : public CliTest {
 protected:
  void SetUp() override {
    CliTest::SetUp();
    addClient();
    addClient("Player");
  }

  static Json::Value login(const std::string& user, const std::string& client = "Photo Frame") {
    return json(
        {"token", "issue", "--client", client, "--username", user, "--scope", "photos"})["token"];
  }
};

TEST_F(UserCommand, ListOfNone) {
  EXPECT_EQ(run({"user", "list"}).out, "No users.\n");
}

TEST_F(UserCommand, ListCountsWhatEachHas) {
  login("alice");
  login("alice", "Player");
  issueCode();
  login("O'Brien");
  run({"token", "issue", "--client", "1", "--flow-type", "client_credentials"});
  const Json::Value users = json({"user", "list"})["users"];
  ASSERT_EQ(users.size(), 2U);
  EXPECT_EQ(users[0]["username"], "O'Brien");
  EXPECT_EQ(users[1]["username"], "alice");
  EXPECT_EQ(users[1]["clients"], Json::Value(2));
  EXPECT_EQ(users[1]["tokens"], Json::Value(2));
  EXPECT_EQ(users[1]["codes"], Json::Value(1));
  EXPECT_GT(users[1]["renewed"].asInt64(), 0);
  const std::vector<std::string> shown = lines(run({"user", "list"}).out);
  ASSERT_THAT(shown, SizeIs(3));
  EXPECT_THAT(shown[0], MatchesRegex("USERNAME +CLIENTS +LOGINS +CODES +LAST RENEWED"));
  EXPECT_THAT(shown[2], MatchesRegex("alice +2 +2 +1 +20..-..-..T..:..:..Z"));
}

TEST_F(UserCommand, ShowTellsCodesAndLogins) {
  login("alice", "Player");
  issueCode();
  login("bob");
  const Json::Value user = json({"user", "show", "alice"})["user"];
  EXPECT_EQ(user["username"], "alice");
  ASSERT_EQ(user["tokens"].size(), 1U);
  EXPECT_EQ(user["tokens"][0]["client_name"], "Player");
  ASSERT_EQ(user["codes"].size(), 1U);
  EXPECT_THAT(lines(run({"user", "show", "alice"}).out)[0],
              MatchesRegex("KIND +ID +CLIENT +SCOPE +SINCE +ENDS IN +FROM"));
  EXPECT_EQ(json({"user", "show", "alice", "--client", "Photo Frame"})["user"]["tokens"].size(),
            0U);
}

TEST_F(UserCommand, ShowOfAUserWithoutAnything) {
  EXPECT_EQ(run({"user", "show", "no\nbody"}).out, "no\\nbody has nothing.\n");
}

TEST_F(UserCommand, RevokeEndsAllAndCodesToo) {
  const std::string access = login("alice")["access_token"].asString();
  const std::string code = issueCode()["code"].asString();
  const std::string bobs = login("bob")["access_token"].asString();
  EXPECT_EQ(run({"user", "revoke", "alice", "--yes"}).out,
            "Revoked 1 code and 1 login of alice.\n");
  EXPECT_THAT(run({"token", "verify"}, access), ExitsWith(kInvalid));
  EXPECT_THAT(run({"code", "redeem"}, code), ExitsWith(kInvalid));
  EXPECT_THAT(run({"token", "verify"}, bobs), ExitsWith(kOk));
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log ORDER BY id DESC LIMIT 1"),
            "All access ended for [alice] by [carol]");
  EXPECT_EQ(run({"user", "revoke", "alice"}).out, "alice has nothing that could be ended.\n");
}

TEST_F(UserCommand, RevokeEndsBothSpellingsOfAName) {
  login("O'Brien");
  storeForeignToken("O'Brien");
  storeForeignCode("x");
  sql("UPDATE oauth_grantCode SET username='O''Brien'");
  const Json::Value ended = json({"user", "revoke", "O'Brien", "--yes"});
  EXPECT_EQ(ended["codes"], Json::Value(1));
  EXPECT_EQ(ended["tokens"], Json::Value(2));
}

TEST_F(UserCommand, RevokeWithOneClientLeavesTheOthers) {
  login("alice");
  const std::string kept = login("alice", "Player")["access_token"].asString();
  EXPECT_EQ(json({"user", "revoke", "alice", "--client", "Photo Frame", "-y"})["tokens"],
            Json::Value(1));
  EXPECT_THAT(run({"token", "verify"}, kept), ExitsWith(kOk));
}

TEST_F(UserCommand, NamesGoInAsTheyAre) {
  for (const std::string name : {"%", "_", "x' OR '1'='1", "''", "--yes", "(application)"}) {
    login("alice");
    const Outcome outcome = run({"user", "revoke", "--yes", "--", name});
    EXPECT_THAT(outcome, ExitsWith(kOk)) << name;
    EXPECT_THAT(outcome.out, HasSubstr("has nothing that could be ended"));
  }
}

}  // namespace
}  // namespace cli
