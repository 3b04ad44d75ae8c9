// keldoauth token.

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;
using testing::SizeIs;

constexpr char kTable[] = "oauth_token";

class TokenCommand : public CliTest {
 protected:
  void SetUp() override {
    CliTest::SetUp();
    client_ = addClient();
  }

  static Json::Value shown(const std::string& id) { return json({"token", "show", id})["token"]; }

  static support::Row row(int id) {
    return sql("SELECT * FROM oauth_token WHERE id=" + std::to_string(id)).at(0);
  }

  static Outcome verify(const std::string& token) { return run({"token", "verify"}, token); }

  static Arguments issueArguments() {
    return {"token",   "issue",  "--client", "1",      "--username",  "alice",
            "--scope", "photos", "--state",  "state1", "--flow-type", "implicit"};
  }

  Json::Value client_;
};

// issue ---------------------------------------------------------------------------

TEST_F(TokenCommand, IssueShowsBothTokensInFull) {
  const Json::Value token = issueToken({"--ip", "2001:db8::1"});
  EXPECT_THAT(token["access_token"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_THAT(token["refresh_token"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_NE(token["access_token"], token["refresh_token"]);
  EXPECT_EQ(token["id"], Json::Value(1));
  EXPECT_EQ(token["username"], "alice");
  EXPECT_EQ(token["client_id"], client_["client_id"]);
  EXPECT_EQ(token["scope"], "photos");
  EXPECT_EQ(token["flow_type"], "implicit");
  EXPECT_EQ(token["state"], "state1");
  EXPECT_EQ(token["ip"], "2001:db8::1");
}

TEST_F(TokenCommand, IssueTellsPeopleBothTokens) {
  const std::vector<std::string> said = lines(run(issueArguments()).out);
  ASSERT_THAT(said, SizeIs(4));
  EXPECT_EQ(said[0], "Issued token 1 of alice.");
  EXPECT_THAT(said[1], MatchesRegex("access token   [0-9a-f]{64}"));
  EXPECT_THAT(said[2], MatchesRegex("refresh token  [0-9a-f]{64}"));
  EXPECT_THAT(said[3], MatchesRegex("expires        20..-..-..T..:..:..Z, in (10m|9m 5.s)"));
}

TEST_F(TokenCommand, IssueLivesAsTheSettingsSayOrAsTold) {
  writeSettings(R"({"token_expired": 4000})");
  const long long before = ::time(nullptr);
  const long long fromSettings = issueToken()["expired_time"].asInt64();
  EXPECT_GE(fromSettings, before + 4000);
  EXPECT_LE(fromSettings, before + 4010);
  EXPECT_GE(issueToken({"--expires-in", "90000"})["expired_time"].asInt64(), before + 90000);
}

TEST_F(TokenCommand, IssueToAnUnknownClient) {
  Arguments arguments = issueArguments();
  arguments[3] = "2";
  EXPECT_THAT(run(arguments), ExitsWith(kNotFound));
}

TEST_F(TokenCommand, IssueNamesTheValueThatIsRefused) {
  struct Case {
    std::size_t position;
    std::string value;
    std::string hint;
  };
  const std::vector<Case> cases{
      {5, "", "--username: 1 to 256 bytes, not 0"},
      {7, "", "--scope: 1 to 2048 bytes, not 0"},
      {9, std::string(2049, 's'), "--state: 1 to 2048 bytes, not 2049"},
      {11, std::string(33, 'f'), "--flow-type: 1 to 32 bytes, not 33"},
  };
  for (const Case& refused : cases) {
    Arguments arguments = issueArguments();
    arguments[refused.position] = refused.value;
    const Outcome outcome = run(arguments);
    EXPECT_THAT(outcome, ExitsWith(kRefused));
    EXPECT_EQ(outcome.err,
              "keldoauth: token issue: Bad parameters (-2)\nhint: " + refused.hint + "\n");
  }
}

TEST_F(TokenCommand, IssueNamesABadAddress) {
  Arguments arguments = issueArguments();
  arguments.insert(arguments.end(), {"--ip", "nowhere"});
  const Outcome refused = run(arguments);
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_EQ(refused.err,
            "keldoauth: token issue: refused, without an error code\n"
            "hint: --ip: neither an IPv4 nor an IPv6 address\n");
}

TEST_F(TokenCommand, IssueToAFullTable) {
  writeSettings(R"({"token_max": 1})");
  issueToken();
  const Outcome full = run(issueArguments());
  EXPECT_THAT(full, ExitsWith(kRefused));
  EXPECT_THAT(full.err, HasSubstr("token issue: Token Table is full (-5)\n"));
}

// list and show -------------------------------------------------------------------

TEST_F(TokenCommand, ListOfNone) {
  EXPECT_EQ(run({"token", "list"}).out, "No tokens.\n");
}

TEST_F(TokenCommand, ListIsATable) {
  issueToken();
  const std::vector<std::string> shown = lines(run({"token", "list"}).out);
  ASSERT_THAT(shown, SizeIs(2));
  EXPECT_THAT(shown[0],
              MatchesRegex("ID +USERNAME +CLIENT ID +SCOPE +ACCESS +REFRESH +EXPIRES +LEFT"));
  EXPECT_THAT(shown[1], MatchesRegex("1 +alice .* [0-9a-f]{6}…  [0-9a-f]{6}…  20.*Z  .*"));
}

TEST_F(TokenCommand, ListMasksBothTokens) {
  const Json::Value token = issueToken();
  const Json::Value listed = json({"token", "list"})["tokens"][0];
  EXPECT_EQ(listed["access_token"], token["access_token"].asString().substr(0, 6) + kMask);
  EXPECT_EQ(listed["refresh_token"], token["refresh_token"].asString().substr(0, 6) + kMask);
  EXPECT_EQ(json({"token", "list", "--reveal"})["tokens"][0], token);
}

TEST_F(TokenCommand, ListOfExpiredOnesOfAUser) {
  for (int id = 1; id <= 3; ++id) issueToken();
  expireIn(kTable, 1, -1);
  expireIn(kTable, 2, -1);
  sql("UPDATE oauth_token SET username='bob' WHERE id>1");
  const Json::Value listed = json({"token", "list", "--expired", "--username", "bob"})["tokens"];
  ASSERT_EQ(listed.size(), 1U);
  EXPECT_EQ(listed[0]["id"], Json::Value(2));
}

TEST_F(TokenCommand, ShowByRowIdAndByEitherToken) {
  const Json::Value token = issueToken();
  const Json::Value byId = shown("1");
  EXPECT_EQ(json({"token", "show", "--token-file", "-"}, token["access_token"].asString())["token"],
            byId);
  EXPECT_EQ(json({"token", "show", "--refresh-token-file", "-"},
                 token["refresh_token"].asString())["token"],
            byId);
}

TEST_F(TokenCommand, ShowDoesNotTakeOneTokenForTheOther) {
  const Json::Value token = issueToken();
  EXPECT_THAT(run({"token", "show", "--token-file", "-"}, token["refresh_token"].asString()),
              ExitsWith(kNotFound));
}

TEST_F(TokenCommand, ShowNeedsExactlyOneName) {
  EXPECT_THAT(run({"token", "show"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"token", "show", "1", "--token-file", "-"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"token", "show", "--refresh-token-file", "-", "--token-file", "-"}),
              ExitsWith(kUsage));
}

TEST_F(TokenCommand, ShowOfAnUnknownToken) {
  EXPECT_THAT(run({"token", "show", "5"}), ExitsWith(kNotFound));
  EXPECT_THAT(run({"token", "show", "--token-file", "-"}, "short"), ExitsWith(kRefused));
}

// verify --------------------------------------------------------------------------

TEST_F(TokenCommand, VerifyTellsTheHolder) {
  const std::string token = issueToken()["access_token"].asString();
  const Json::Value answer = json({"token", "verify"}, token + "\n");
  EXPECT_EQ(answer["valid"], Json::Value(true));
  EXPECT_EQ(answer["token"]["username"], "alice");
  EXPECT_EQ(answer["token"]["scope"], "photos");
  EXPECT_EQ(answer["token"]["state"], "state1");
  EXPECT_EQ(verify(token).out, "Valid.\nusername  alice\nscope     photos\nstate     state1\n");
}

TEST_F(TokenCommand, VerifyFromAFile) {
  writeFile("/tmp/token", issueToken()["access_token"].asString() + "\n");
  EXPECT_THAT(run({"token", "verify", "--token-file", "/tmp/token"}), ExitsWith(kOk));
}

TEST_F(TokenCommand, VerifyOfAnExpiredOrUnknownToken) {
  const std::string expired = issueToken()["access_token"].asString();
  expireIn(kTable, 1, -1);
  for (const std::string& token : {expired, support::id64('a')}) {
    const Outcome outcome = verify(token);
    EXPECT_THAT(outcome, ExitsWith(kInvalid));
    EXPECT_EQ(outcome.err, "keldoauth: token verify: Access Token Expired (-3)\n");
    EXPECT_EQ(outcome.out, "");
  }
}

TEST_F(TokenCommand, VerifyDoesNotTakeARefreshToken) {
  EXPECT_THAT(verify(issueToken()["refresh_token"].asString()), ExitsWith(kInvalid));
}

TEST_F(TokenCommand, VerifyOfAnotherLengthIsNoVerdict) {
  for (const std::string& token : {std::string(), std::string("abc"), std::string(65, 'a')}) {
    const Outcome outcome = verify(token);
    EXPECT_THAT(outcome, ExitsWith(kRefused));
    EXPECT_THAT(outcome.err, HasSubstr("Bad parameters (-2)\nhint: the token: 64 bytes, not " +
                                       std::to_string(token.size())));
  }
}

TEST_F(TokenCommand, VerifyThatFailsIsNoVerdict) {
  const std::string token = issueToken()["access_token"].asString();
  sql("DROP TABLE oauth_token; CREATE VIEW oauth_token AS SELECT * FROM missing");
  EXPECT_THAT(verify(token), ExitsWith(kUnavailable));
}

// edit ----------------------------------------------------------------------------

TEST_F(TokenCommand, EditChangesWhatIsGiven) {
  issueToken();
  support::Row expected = row(1);
  expected["flow_type"] = "password";
  expected["username"] = "it's bob";
  json({"token", "edit", "1", "--flow-type", "password", "--username", "it's bob"});
  EXPECT_EQ(row(1), expected);
}

TEST_F(TokenCommand, EditOfTheExpiryKeepsQuotesAsTheyAre) {
  issueToken();
  sql("UPDATE oauth_token SET scope='a''b', state='a''''b'");
  support::Row expected = row(1);
  const Json::Value edited = json({"token", "edit", "1", "--expires-in", "3000"})["token"];
  expected["expired_time"] = edited["expired_time"].asString();
  EXPECT_EQ(row(1), expected);
}

TEST_F(TokenCommand, EditThatIsRefusedChangesNothing) {
  issueToken();
  const support::Row before = row(1);
  EXPECT_THAT(run({"token", "edit", "1", "--flow-type", "", "--expires-in", "5"}),
              ExitsWith(kRefused));
  EXPECT_EQ(row(1), before);
}

TEST_F(TokenCommand, EditWithoutAChangeAndOfAnUnknownToken) {
  EXPECT_THAT(run({"token", "edit", "1"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"token", "edit", "1", "--state", "x"}), ExitsWith(kNotFound));
}

// refresh -------------------------------------------------------------------------

TEST_F(TokenCommand, RefreshReplacesThePair) {
  const Json::Value before = issueToken({"--ip", "192.0.2.1"});
  const Json::Value after = json({"token", "refresh"}, before["refresh_token"].asString())["token"];
  EXPECT_NE(after["access_token"], before["access_token"]);
  EXPECT_NE(after["refresh_token"], before["refresh_token"]);
  for (const char* kept : {"username", "client_id", "scope", "state", "flow_type", "ip"}) {
    EXPECT_EQ(after[kept], before[kept]) << kept;
  }
  EXPECT_THAT(verify(after["access_token"].asString()), ExitsWith(kOk));
  EXPECT_THAT(verify(before["access_token"].asString()), ExitsWith(kInvalid));
  EXPECT_EQ(rowCount(kTable), "1");
}

TEST_F(TokenCommand, RefreshOnce) {
  const std::string token = issueToken()["refresh_token"].asString();
  EXPECT_THAT(run({"token", "refresh"}, token), ExitsWith(kOk));
  const Outcome again = run({"token", "refresh"}, token);
  EXPECT_THAT(again, ExitsWith(kInvalid));
  EXPECT_EQ(again.err, "keldoauth: token refresh: refresh token is unknown or was used before\n");
}

TEST_F(TokenCommand, RefreshOnceOfEightAtTheSameMoment) {
  const std::string token = issueToken()["refresh_token"].asString();
  const Outcome all = runEightTimes({"token", "refresh"}, token);
  EXPECT_THAT(lines(all.out), SizeIs(4));
  EXPECT_THAT(lines(all.err), SizeIs(7));
  EXPECT_THAT(lines(all.err), testing::Each(HasSubstr("used before")));
  EXPECT_EQ(rowCount(kTable), "1");
}

TEST_F(TokenCommand, RefreshOfAnExpiredAccessToken) {
  const std::string token = issueToken()["refresh_token"].asString();
  expireIn(kTable, 1, -100);
  EXPECT_EQ(json({"token", "refresh"}, token)["token"]["expired"], Json::Value(false));
}

TEST_F(TokenCommand, RefreshDoesNotTakeAnAccessToken) {
  EXPECT_THAT(run({"token", "refresh"}, issueToken()["access_token"].asString()),
              ExitsWith(kInvalid));
  EXPECT_EQ(rowCount(kTable), "1");
}

TEST_F(TokenCommand, RefreshKeepsQuotes) {
  Arguments arguments = issueArguments();
  arguments[5] = "O'Neil";
  const Json::Value before = json(arguments)["token"];
  const Json::Value after = json({"token", "refresh"}, before["refresh_token"].asString())["token"];
  EXPECT_EQ(after["username"], before["username"]);
}

TEST_F(TokenCommand, RefreshWorksInAFullTable) {
  writeSettings(R"({"token_max": 1})");
  const std::string token = issueToken()["refresh_token"].asString();
  EXPECT_THAT(run({"token", "refresh"}, token), ExitsWith(kOk));
}

TEST_F(TokenCommand, RefreshThatFailsKeepsTheOldPair) {
  const Json::Value before = issueToken();
  sql("UPDATE oauth_token SET ip='nowhere'");
  const Outcome refused = run({"token", "refresh"}, before["refresh_token"].asString());
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_THAT(verify(before["access_token"].asString()), ExitsWith(kOk));
}

// revoke and purge ----------------------------------------------------------------

TEST_F(TokenCommand, RevokeTakesThePairAway) {
  const Json::Value token = issueToken();
  EXPECT_EQ(run({"token", "revoke", "1", "--yes"}).out,
            "Revoked token 1 of alice; its row is gone.\n");
  EXPECT_THAT(verify(token["access_token"].asString()), ExitsWith(kInvalid));
  EXPECT_THAT(run({"token", "refresh"}, token["refresh_token"].asString()), ExitsWith(kInvalid));
}

TEST_F(TokenCommand, RevokeByEitherToken) {
  for (const char* kind : {"access_token", "refresh_token"}) {
    const std::string token = issueToken()[kind].asString();
    const std::string option =
        kind == std::string("access_token") ? "--token-file" : "--refresh-token-file";
    EXPECT_THAT(run({"token", "revoke", "--yes", option, "-"}, token), ExitsWith(kOk));
  }
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(TokenCommand, RevokeOfAnUnknownToken) {
  EXPECT_THAT(run({"token", "revoke", "8", "--yes"}), ExitsWith(kNotFound));
  EXPECT_THAT(run({"token", "revoke", "--yes", "--token-file", "-"}, support::id64('a')),
              ExitsWith(kNotFound));
}

TEST_F(TokenCommand, RevokeDoesNotReveal) {
  const std::string token = issueToken()["access_token"].asString();
  const Json::Value revoked = json({"token", "revoke", "1", "--yes"})["token"];
  EXPECT_THAT(revoked["access_token"].asString(), Not(HasSubstr(token)));
}

TEST_F(TokenCommand, PurgeRemovesWhatExpired) {
  for (int id = 1; id <= 3; ++id) issueToken();
  expireIn(kTable, 1, -5);
  expireIn(kTable, 3, -5);
  EXPECT_EQ(json({"token", "purge", "--yes"})["purged"].size(), 2U);
  EXPECT_EQ(sqlText("SELECT id FROM oauth_token"), "2");
}

TEST_F(TokenCommand, PurgeWithGraceLeavesRefreshTokensAlive) {
  const std::string token = issueToken()["refresh_token"].asString();
  expireIn(kTable, 1, -3600);
  EXPECT_EQ(run({"token", "purge", "--yes", "--grace", "604800"}).out, "Nothing to purge.\n");
  EXPECT_THAT(run({"token", "refresh"}, token), ExitsWith(kOk));
}

TEST_F(TokenCommand, PurgeDryRunWithGrace) {
  for (int id = 1; id <= 2; ++id) issueToken();
  expireIn(kTable, 1, -50);
  expireIn(kTable, 2, -500);
  const Json::Value answer = json({"token", "purge", "--dry-run", "--grace", "100"});
  ASSERT_EQ(answer["purged"].size(), 1U);
  EXPECT_EQ(answer["purged"][0]["id"], Json::Value(2));
  EXPECT_EQ(answer["dry_run"], Json::Value(true));
  EXPECT_EQ(rowCount(kTable), "2");
}

TEST_F(TokenCommand, PurgeThatFailsRemovesNothing) {
  for (int id = 1; id <= 2; ++id) issueToken();
  sql("UPDATE oauth_token SET expired_time='5'");
  sql("CREATE TRIGGER refuse BEFORE DELETE ON oauth_token WHEN old.id=2 "
      "BEGIN SELECT raise(ABORT, 'not this one'); END");
  const Outcome failed = run({"token", "purge", "--yes"});
  EXPECT_NE(failed.exit, kOk);
  EXPECT_THAT(failed.err, HasSubstr("token purge: not this one (19)"));
  EXPECT_EQ(rowCount(kTable), "2");
}

}  // namespace
}  // namespace cli
