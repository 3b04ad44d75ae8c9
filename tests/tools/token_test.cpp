// keldoauth token.

#include <map>

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;
using testing::SizeIs;

constexpr char kTable[] = "oauth_token";

/// A login is dead so long after its access token expired.
constexpr long long kIdle = 30LL * 24 * 60 * 60;

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
    return {"token", "issue",   "--client", "1",       "--username",
            "alice", "--scope", "photos",   "--state", "state1"};
  }

  Json::Value client_;
};

// issue ---------------------------------------------------------------------------

TEST_F(TokenCommand, IssueShowsBothTokensInFull) {
  const Json::Value token = issueToken({"--ip", "2001:db8::1"});
  EXPECT_THAT(token["access_token"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_THAT(token["refresh_token"].asString(), MatchesRegex("[0-9a-f]{100,128}"));
  EXPECT_NE(token["access_token"], token["refresh_token"]);
  EXPECT_EQ(token["id"], Json::Value(1));
  EXPECT_EQ(token["username"], "alice");
  EXPECT_EQ(token["client_id"], client_["client_id"]);
  EXPECT_EQ(token["scope"], "photos");
  EXPECT_EQ(token["flow_type"], "authorization_code");
  EXPECT_EQ(token["state"], "state1");
  EXPECT_EQ(token["ip"], "2001:db8::1");
}

TEST_F(TokenCommand, IssueTellsPeopleBothTokens) {
  const std::vector<std::string> said = lines(run(issueArguments()).out);
  ASSERT_THAT(said, SizeIs(4));
  EXPECT_EQ(said[0], "Issued token 1 of alice.");
  EXPECT_THAT(said[1], MatchesRegex("access token   [0-9a-f]{64}"));
  EXPECT_THAT(said[2], MatchesRegex("refresh token  [0-9a-f]{100,128}"));
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
      {9, std::string(513, 's'), "--state: at most 512 bytes, not 513"},
  };
  for (const Case& refused : cases) {
    Arguments arguments = issueArguments();
    arguments[refused.position] = refused.value;
    const Outcome outcome = run(arguments);
    EXPECT_THAT(outcome, ExitsWith(kRefused));
    EXPECT_EQ(outcome.err, "keldoauth: token issue: a value is too short or too long (-2)\nhint: " +
                               refused.hint + "\n");
  }
}

TEST_F(TokenCommand, IssueNamesABadAddress) {
  Arguments arguments = issueArguments();
  arguments.insert(arguments.end(), {"--ip", "nowhere"});
  const Outcome refused = run(arguments);
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_EQ(refused.err, "keldoauth: token issue: the IP address is none (-2)\n");
}

TEST_F(TokenCommand, IssueToAFullTable) {
  writeSettings(R"({"token_max": 1})");
  addClient("Player");
  issueToken();
  Arguments arguments = issueArguments();
  arguments[3] = "Player";
  arguments[5] = "bob";
  const Outcome full = run(arguments);
  EXPECT_THAT(full, ExitsWith(kRefused));
  EXPECT_THAT(full.err, HasSubstr("token issue: Token Table is full (-5)\n"));
  EXPECT_THAT(full.err, HasSubstr("token_max"));
}

TEST_F(TokenCommand, IssueOfAKindThatThereIsNot) {
  Arguments arguments = issueArguments();
  arguments.insert(arguments.end(), {"--flow-type", "implicit"});
  const Outcome refused = run(arguments);
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_EQ(refused.err,
            "keldoauth: token issue: --flow-type: there is no way to issue a token of that kind\n"
            "hint: authorization_code or client_credentials\n");
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(TokenCommand, IssueToTheClientItself) {
  const Arguments own{"token", "issue", "--client", "1", "--flow-type", "client_credentials"};
  const Json::Value token = json(own)["token"];
  EXPECT_EQ(token["username"], Json::Value());
  EXPECT_EQ(token["refresh_token"], Json::Value());
  EXPECT_EQ(token["kind"], "own");
  EXPECT_EQ(token["scope"], "profile photos");
  EXPECT_THAT(run(own).out, HasSubstr("Issued token 2 of Photo Frame itself.\n"));
  EXPECT_THAT(verify(token["access_token"].asString()).out,
              HasSubstr("username  (client itself)\n"));
  Arguments withUser = own;
  withUser.insert(withUser.end(), {"--username", "alice"});
  EXPECT_THAT(run(withUser), ExitsWith(kUsage));
}

TEST_F(TokenCommand, IssueOfALoginNeedsUserAndScope) {
  EXPECT_THAT(run({"token", "issue", "--client", "1", "--scope", "photos"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"token", "issue", "--client", "1", "--username", "x"}), ExitsWith(kUsage));
}

TEST_F(TokenCommand, IssueKeepsNoUsableToken) {
  const Json::Value token = issueToken();
  const std::string file = readFile(kDatabase);
  EXPECT_THAT(file, Not(HasSubstr(token["access_token"].asString())));
  EXPECT_THAT(file, Not(HasSubstr(token["refresh_token"].asString())));
}

// list and show -------------------------------------------------------------------

TEST_F(TokenCommand, ListOfNone) {
  EXPECT_EQ(run({"token", "list"}).out, "No tokens.\n");
}

TEST_F(TokenCommand, ListIsATable) {
  issueToken();
  const std::vector<std::string> shown = lines(run({"token", "list"}).out);
  ASSERT_THAT(shown, SizeIs(2));
  EXPECT_THAT(shown[0], MatchesRegex("ID +USERNAME +CLIENT +SCOPE +EXPIRES +LEFT +ENDS IN"));
  EXPECT_THAT(shown[1], MatchesRegex("1 +alice +Photo Frame +photos +20.*Z +(10m|9m 5.s) +"
                                     "(30d|29d 23h)"));
}

TEST_F(TokenCommand, ListHasNoTokensBecauseNobodyKeepsThem) {
  Json::Value token = issueToken();
  token["access_token"] = Json::Value();
  token["refresh_token"] = Json::Value();
  EXPECT_EQ(json({"token", "list"})["tokens"][0], token);
}

TEST_F(TokenCommand, ListOfAClientByItsName) {
  addClient("Player");
  issueToken();
  EXPECT_EQ(json({"token", "list", "--client", "Photo Frame"})["tokens"].size(), 1U);
  EXPECT_EQ(json({"token", "list", "--client", "Player"})["tokens"].size(), 0U);
  EXPECT_THAT(run({"token", "list", "--client", "Nobody"}), ExitsWith(kNotFound));
}

TEST_F(TokenCommand, ListTellsSinceWhenAndUntilWhen) {
  const long long before = ::time(nullptr);
  issueToken();
  const Json::Value token = shown("1");
  EXPECT_GE(token["since"].asInt64(), before);
  EXPECT_EQ(token["renewed"], token["since"]);
  EXPECT_EQ(token["ends"].asInt64(), token["expired_time"].asInt64() + 30LL * 24 * 60 * 60);
  EXPECT_EQ(token["dead"], Json::Value(false));
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

TEST_F(TokenCommand, ShowTakesEitherTokenFromEitherFile) {
  const Json::Value token = issueToken();
  EXPECT_THAT(run({"token", "show", "--token-file", "-"}, token["refresh_token"].asString()),
              ExitsWith(kOk));
}

TEST_F(TokenCommand, ShowNeedsExactlyOneName) {
  EXPECT_THAT(run({"token", "show"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"token", "show", "1", "--token-file", "-"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"token", "show", "--refresh-token-file", "-", "--token-file", "-"}),
              ExitsWith(kUsage));
}

TEST_F(TokenCommand, ShowOfAnUnknownToken) {
  EXPECT_THAT(run({"token", "show", "5"}), ExitsWith(kNotFound));
  EXPECT_THAT(run({"token", "show", "--token-file", "-"}, "short"), ExitsWith(kNotFound));
  EXPECT_THAT(run({"token", "show", "--token-file", "-"}, ""), ExitsWith(kRefused));
}

// verify --------------------------------------------------------------------------

TEST_F(TokenCommand, VerifyTellsTheHolder) {
  const std::string token = issueToken()["access_token"].asString();
  const Json::Value answer = json({"token", "verify"}, token + "\n");
  EXPECT_EQ(answer["valid"], Json::Value(true));
  EXPECT_EQ(answer["token"]["username"], "alice");
  EXPECT_EQ(answer["token"]["scope"], "photos");
  EXPECT_EQ(answer["token"]["state"], "state1");
  EXPECT_EQ(answer["token"]["client_id"], client_["client_id"]);
  EXPECT_EQ(answer["token"]["client_name"], "Photo Frame");
  EXPECT_THAT(verify(token).out,
              testing::StartsWith("Valid.\nusername  alice\nclient    Photo Frame\n"
                                  "scope     photos\nstate     state1\nexpires   20"));
}

TEST_F(TokenCommand, VerifyFromAFile) {
  writeFile("/tmp/token", issueToken()["access_token"].asString() + "\n");
  EXPECT_THAT(run({"token", "verify", "--token-file", "/tmp/token"}), ExitsWith(kOk));
}

TEST_F(TokenCommand, VerifyOfAnExpiredOrUnknownToken) {
  const std::string expired = issueToken()["access_token"].asString();
  expireIn(kTable, 1, -1);
  for (const auto& [token, why] : std::map<std::string, std::string>{
           {expired, "it has expired"}, {support::id64('a'), "it is unknown or has been ended"}}) {
    const Outcome outcome = verify(token);
    EXPECT_THAT(outcome, ExitsWith(kInvalid));
    EXPECT_EQ(outcome.err,
              "keldoauth: token verify: the access token is not good: " + why + " (-3)\n");
    EXPECT_EQ(outcome.out, "");
  }
}

TEST_F(TokenCommand, VerifyAndRefreshRefuseDisabledAndRemovedClients) {
  const Json::Value token = issueToken();
  const auto expectRefused = [&] {
    EXPECT_THAT(verify(token["access_token"].asString()), ExitsWith(kInvalid));
    EXPECT_THAT(run({"token", "refresh"}, token["refresh_token"].asString()), ExitsWith(kInvalid));
  };
  run({"client", "disable", "1"});
  expectRefused();
  EXPECT_THAT(verify(token["access_token"].asString()).err,
              HasSubstr("the application is disabled (-3)"));
  run({"client", "enable", "1"});
  EXPECT_THAT(verify(token["access_token"].asString()), ExitsWith(kOk));
  sql("DELETE FROM oauth_clientInfo");
  expectRefused();
}

TEST_F(TokenCommand, VerifyTakesAnotherProgramsTokenToo) {
  const std::string token = storeForeignToken("O'Brien")["access_token"].asString();
  EXPECT_EQ(json({"token", "verify"}, token)["token"]["username"], "O'Brien");
}

TEST_F(TokenCommand, WhatStandsInTheFileIsNoToken) {
  issueToken();
  EXPECT_THAT(verify(sqlText("SELECT access_token FROM oauth_token")), ExitsWith(kInvalid));
  EXPECT_THAT(run({"token", "refresh"}, sqlText("SELECT refresh_token FROM oauth_token")),
              ExitsWith(kInvalid));
}

TEST_F(TokenCommand, VerifyDoesNotTakeARefreshToken) {
  EXPECT_THAT(verify(issueToken()["refresh_token"].asString()), ExitsWith(kInvalid));
}

TEST_F(TokenCommand, VerifyOfNothingIsNoVerdict) {
  for (const char* token : {"", "\n"}) {
    const Outcome outcome = verify(token);
    EXPECT_THAT(outcome, ExitsWith(kRefused));
    EXPECT_EQ(outcome.err, "keldoauth: token verify: Access token: the text is empty\n");
  }
  EXPECT_THAT(verify("abc"), ExitsWith(kInvalid));
}

TEST_F(TokenCommand, VerifyThatFailsIsNoVerdict) {
  const std::string token = issueToken()["access_token"].asString();
  sql("DROP TABLE oauth_token; CREATE VIEW oauth_token AS SELECT * FROM missing");
  EXPECT_THAT(verify(token), ExitsWith(kUnavailable));
}

// edit ----------------------------------------------------------------------------

TEST_F(TokenCommand, EditChangesWhatIsGiven) {
  storeForeignToken();
  support::Row expected = row(1);
  expected["flow_type"] = "password";
  expected["username"] = "it's bob";
  json({"token", "edit", "1", "--flow-type", "password", "--username", "it's bob"});
  EXPECT_EQ(row(1), expected);
}

TEST_F(TokenCommand, EditOfTheServicesOwnTokenIsRefused) {
  issueToken();
  const support::Row before = row(1);
  const Outcome refused = run({"token", "edit", "1", "--username", "bob"});
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_THAT(refused.err, HasSubstr("token 1 was issued by this service"));
  EXPECT_EQ(row(1), before);
}

TEST_F(TokenCommand, EditOfTheExpiryKeepsQuotesAsTheyAre) {
  storeForeignToken();
  sql("UPDATE oauth_token SET scope='a''b', state='a''''b'");
  support::Row expected = row(1);
  const Json::Value edited = json({"token", "edit", "1", "--expires-in", "3000"})["token"];
  expected["expired_time"] = edited["expired_time"].asString();
  EXPECT_EQ(row(1), expected);
}

TEST_F(TokenCommand, EditThatIsRefusedChangesNothing) {
  storeForeignToken();
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
  EXPECT_EQ(again.err,
            "keldoauth: token refresh: the refresh token is not good: it was used before\n");
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
  Json::Value token = json(arguments)["token"];
  for (int i = 0; i < 10; ++i) {
    token = json({"token", "refresh"}, token["refresh_token"].asString())["token"];
    EXPECT_EQ(token["username"], "O'Neil");
  }
}

TEST_F(TokenCommand, RefreshWorksInAFullTable) {
  writeSettings(R"({"token_max": 1})");
  const std::string token = issueToken()["refresh_token"].asString();
  EXPECT_THAT(run({"token", "refresh"}, token), ExitsWith(kOk));
}

TEST_F(TokenCommand, RefreshThatFailsKeepsTheOldPair) {
  const Json::Value before = issueToken();
  sql("CREATE TRIGGER refuse BEFORE UPDATE ON oauth_token "
      "BEGIN SELECT raise(ABORT, 'not now'); END");
  EXPECT_THAT(run({"token", "refresh"}, before["refresh_token"].asString()), ExitsWith(kRefused));
  sql("DROP TRIGGER refuse");
  EXPECT_THAT(verify(before["access_token"].asString()), ExitsWith(kOk));
  EXPECT_THAT(run({"token", "refresh"}, before["refresh_token"].asString()), ExitsWith(kOk));
}

TEST_F(TokenCommand, RefreshRefusesAnotherProgramsToken) {
  const Outcome outcome =
      run({"token", "refresh"}, storeForeignToken()["refresh_token"].asString());
  EXPECT_THAT(outcome, ExitsWith(kInvalid));
  EXPECT_THAT(outcome.err, HasSubstr("it was issued by another program"));
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

TEST_F(TokenCommand, RevokeOfAUserWithAClient) {
  addClient("Player");
  const Json::Value kept = issueToken();
  issueCode();
  for (const char* user : {"alice", "bob"}) {
    json({"token", "issue", "--client", "Player", "--username", user, "--scope", "photos"});
  }
  EXPECT_EQ(run({"token", "revoke", "--username", "alice", "--client", "Player", "--yes"}).out,
            "Revoked 1 token.\n");
  EXPECT_EQ(json({"token", "list"})["tokens"].size(), 2U);
  EXPECT_EQ(json({"token", "revoke", "--client", "Player", "-y"})["ended"], Json::Value(1));
  EXPECT_THAT(verify(kept["access_token"].asString()), ExitsWith(kOk));
  EXPECT_EQ(rowCount("oauth_grantCode"), "1");
}

TEST_F(TokenCommand, RevokeOfAllLeavesCodes) {
  issueToken();
  storeForeignToken("bob");
  issueCode();
  EXPECT_EQ(json({"token", "revoke", "--all", "-y"})["ended"], Json::Value(2));
  EXPECT_EQ(rowCount(kTable), "0");
  EXPECT_EQ(rowCount("oauth_grantCode"), "1");
}

TEST_F(TokenCommand, RevokeOfSeveralIsOneEntryASubject) {
  for (int i = 0; i < 3; ++i) issueToken();
  EXPECT_EQ(run({"token", "revoke", "1", "2", "3", "-y"}).out, "Revoked 3 tokens.\n");
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log WHERE msg LIKE 'Access ended%'"), "1");
}

TEST_F(TokenCommand, RevokeEndsALoginThatWasRefreshedMeanwhile) {
  const std::string token = issueToken()["refresh_token"].asString();
  const auto refresh = [&] { run({"token", "refresh"}, token); };
  EXPECT_THAT(runOnTerminal({"token", "revoke", "1"}, {{"[y/N] ", "y\n", refresh}}),
              ExitsWith(kOk));
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(TokenCommand, RevokeOfAnUnknownToken) {
  EXPECT_THAT(run({"token", "revoke", "8", "--yes"}), ExitsWith(kNotFound));
  EXPECT_THAT(run({"token", "revoke", "--yes", "--token-file", "-"}, support::id64('a')),
              ExitsWith(kNotFound));
}

TEST_F(TokenCommand, RevokeDoesNotReveal) {
  const std::string token = issueToken()["access_token"].asString();
  EXPECT_THAT(run({"token", "revoke", "1", "--yes", "--json"}).out, Not(HasSubstr(token)));
}

TEST_F(TokenCommand, PurgeRemovesWhatCannotBeRefreshedAnyMore) {
  for (int id = 1; id <= 3; ++id) issueToken();
  expireIn(kTable, 1, -kIdle - 5);
  expireIn(kTable, 2, -kIdle + 60);
  expireIn(kTable, 3, -kIdle - 5);
  const Json::Value answer = json({"token", "purge", "--yes"});
  EXPECT_EQ(answer["purged"].size(), 2U);
  EXPECT_EQ(answer["count"], Json::Value(2));
  EXPECT_EQ(sqlText("SELECT id FROM oauth_token"), "2");
}

TEST_F(TokenCommand, PurgeOfBothTablesAtOnce) {
  issueToken();
  issueCode();
  expireIn(kTable, 1, -kIdle - 5);
  expireIn("oauth_grantCode", 1, -5);
  EXPECT_EQ(run({"purge", "--dry-run"}).out, "1 code and 1 token would be purged.\n");
  EXPECT_EQ(run({"purge", "--yes", "--grace", "3600"}).out, "Nothing to purge.\n");
  EXPECT_THAT(run({"purge"}), ExitsWith(kNotConfirmed));
  const Json::Value answer = json({"purge", "--yes"});
  EXPECT_EQ(answer["codes"], Json::Value(1));
  EXPECT_EQ(answer["tokens"], Json::Value(1));
  EXPECT_EQ(rowCount(kTable), "0");
  EXPECT_EQ(rowCount("oauth_grantCode"), "0");
  EXPECT_EQ(run({"purge"}).out, "Nothing to purge.\n");
}

TEST_F(TokenCommand, PurgeLeavesRefreshTokensAlive) {
  const std::string token = issueToken()["refresh_token"].asString();
  expireIn(kTable, 1, -3600);
  EXPECT_EQ(run({"token", "purge", "--yes"}).out, "Nothing to purge.\n");
  EXPECT_THAT(run({"token", "refresh"}, token), ExitsWith(kOk));
}

TEST_F(TokenCommand, PurgeDryRunWithGrace) {
  for (int id = 1; id <= 2; ++id) issueToken();
  expireIn(kTable, 1, -kIdle - 50);
  expireIn(kTable, 2, -kIdle - 500);
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
