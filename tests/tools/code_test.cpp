// keldoauth code.

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;
using testing::SizeIs;

constexpr char kTable[] = "oauth_grantCode";

class CodeCommand : public CliTest {
 protected:
  void SetUp() override {
    CliTest::SetUp();
    client_ = addClient();
  }

  static Json::Value shown(const std::string& id) { return json({"code", "show", id})["code"]; }

  /// The row as the database has it.
  static support::Row row(int id) {
    return sql("SELECT * FROM oauth_grantCode WHERE id=" + std::to_string(id)).at(0);
  }

  static Arguments issueArguments() {
    return {"code",  "issue",   "--client", "1",       "--username",
            "alice", "--scope", "photos",   "--state", "state1"};
  }

  Json::Value client_;
};

// issue ---------------------------------------------------------------------------

TEST_F(CodeCommand, IssueShowsTheCodeInFull) {
  const Json::Value code = issueCode({"--ip", "192.0.2.1"});
  EXPECT_THAT(code["code"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_EQ(code["id"], Json::Value(1));
  EXPECT_EQ(code["username"], "alice");
  EXPECT_EQ(code["client_id"], client_["client_id"]);
  EXPECT_EQ(code["scope"], "photos");
  EXPECT_EQ(code["state"], "state1");
  EXPECT_EQ(code["ip"], "192.0.2.1");
  EXPECT_EQ(code["expired"], Json::Value(false));
}

TEST_F(CodeCommand, IssueTellsPeopleTheCode) {
  const std::vector<std::string> said = lines(run(issueArguments()).out);
  ASSERT_THAT(said, SizeIs(3));
  EXPECT_EQ(said[0], "Issued code 1 of alice.");
  EXPECT_THAT(said[1], MatchesRegex("code     [0-9a-f]{64}"));
  EXPECT_THAT(said[2], MatchesRegex("expires  20..-..-..T..:..:..Z, in (10m|9m 5.s)"));
}

TEST_F(CodeCommand, IssueLivesAsTheSettingsSay) {
  writeSettings(R"({"grantcode_expired": 4000})");
  const long long before = ::time(nullptr);
  const long long expiry = issueCode()["expired_time"].asInt64();
  EXPECT_GE(expiry, before + 4000);
  EXPECT_LE(expiry, before + 4010);
}

TEST_F(CodeCommand, IssueLivesAsLongAsTold) {
  const long long before = ::time(nullptr);
  const long long expiry = issueCode({"--expires-in", "50000"})["expired_time"].asInt64();
  EXPECT_GE(expiry, before + 50000);
  EXPECT_LE(expiry, before + 50010);
}

TEST_F(CodeCommand, IssueToAnIdentifier) {
  Arguments arguments = issueArguments();
  arguments[3] = client_["client_id"].asString();
  EXPECT_EQ(json(arguments)["code"]["client_id"], client_["client_id"]);
}

TEST_F(CodeCommand, IssueToAnUnknownClient) {
  for (const std::string& client : {std::string("2"), support::id64('a')}) {
    Arguments arguments = issueArguments();
    arguments[3] = client;
    EXPECT_THAT(run(arguments), ExitsWith(kNotFound));
  }
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(CodeCommand, IssueToADisabledClientIsRefused) {
  run({"client", "disable", "1"});
  const Outcome issued = run(issueArguments());
  EXPECT_THAT(issued, ExitsWith(kRefused));
  EXPECT_EQ(issued.err, "keldoauth: code issue: the application is disabled\n");
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(CodeCommand, IssueByTheNameOfTheClient) {
  Arguments arguments = issueArguments();
  arguments[3] = "Photo Frame";
  EXPECT_EQ(json(arguments)["code"]["client_name"], "Photo Frame");
}

TEST_F(CodeCommand, IssueNeedsAScopeOfTheClients) {
  Arguments arguments = issueArguments();
  arguments[7] = "photos everything";
  EXPECT_THAT(run(arguments), ExitsWith(kRefused));
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(CodeCommand, IssueKeepsNoUsableCode) {
  const std::string code = issueCode()["code"].asString();
  EXPECT_THAT(readFile(kDatabase), Not(HasSubstr(code)));
}

TEST_F(CodeCommand, IssueNamesTheValueThatIsRefused) {
  struct Case {
    std::size_t position;
    std::string value;
    std::string hint;
  };
  const std::vector<Case> cases{
      {5, "", "--username: 1 to 256 bytes, not 0"},
      {5, std::string(257, 'u'), "--username: 1 to 256 bytes, not 257"},
      {7, std::string(2049, 's'), "--scope: 1 to 2048 bytes, not 2049"},
      {9, std::string(513, 's'), "--state: at most 512 bytes, not 513"},
  };
  for (const Case& refused : cases) {
    Arguments arguments = issueArguments();
    arguments[refused.position] = refused.value;
    const Outcome outcome = run(arguments);
    EXPECT_THAT(outcome, ExitsWith(kRefused));
    EXPECT_EQ(outcome.err, "keldoauth: code issue: a value is too short or too long (-2)\nhint: " +
                               refused.hint + "\n");
  }
}

TEST_F(CodeCommand, IssueNamesABadAddress) {
  Arguments arguments = issueArguments();
  arguments.insert(arguments.end(), {"--ip", "999.1.1.1"});
  const Outcome refused = run(arguments);
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_EQ(refused.err, "keldoauth: code issue: the IP address is none (-2)\n");
}

TEST_F(CodeCommand, IssueToAFullTable) {
  writeSettings(R"({"grantcode_max": 1})");
  addClient("Player");
  issueCode();
  Arguments arguments = issueArguments();
  arguments[3] = "Player";
  arguments[5] = "bob";
  const Outcome full = run(arguments);
  EXPECT_THAT(full, ExitsWith(kRefused));
  EXPECT_EQ(full.err,
            "keldoauth: code issue: GrantCode Table is full (-5)\n"
            "hint: nothing in it is dead: end or remove what nobody needs, or raise grantcode_max "
            "in the settings (at most 10000)\n");
}

TEST_F(CodeCommand, IssueBeyondAUsersShareTakesTheUsersOldest) {
  for (int i = 0; i < 4; ++i) issueCode();
  EXPECT_EQ(rowCount(kTable), "3");
  EXPECT_THAT(run({"code", "show", "1"}), ExitsWith(kNotFound));
}

// list and show -------------------------------------------------------------------

TEST_F(CodeCommand, ListOfNone) {
  EXPECT_EQ(run({"code", "list"}).out, "No codes.\n");
}

TEST_F(CodeCommand, ListIsATable) {
  issueCode();
  const std::vector<std::string> shown = lines(run({"code", "list"}).out);
  ASSERT_THAT(shown, SizeIs(2));
  EXPECT_THAT(shown[0], MatchesRegex("ID +USERNAME +CLIENT +SCOPE +EXPIRES +LEFT"));
  EXPECT_THAT(shown[1], MatchesRegex("1 +alice +Photo Frame +photos +20..-..-..T..:..:..Z +"
                                     "(10m|9m 5.s)"));
}

TEST_F(CodeCommand, ListHasNoCodesBecauseNobodyKeepsThem) {
  issueCode();
  EXPECT_EQ(json({"code", "list"})["codes"][0]["code"], Json::Value());
}

TEST_F(CodeCommand, ListMarksExpiredCodes) {
  issueCode();
  expireIn(kTable, 1, -1);
  EXPECT_THAT(lines(run({"code", "list"}).out)[1], MatchesRegex(".*  expired"));
  EXPECT_EQ(json({"code", "list"})["codes"][0]["expired"], Json::Value(true));
}

TEST_F(CodeCommand, ListOfOneUser) {
  issueCode();
  storeForeignCode("O'Neil");
  storeForeignCode("x");
  sql("UPDATE oauth_grantCode SET username='O''Neil' WHERE id=3");
  const Json::Value listed = json({"code", "list", "--username", "O'Neil"})["codes"];
  ASSERT_EQ(listed.size(), 2U);
  EXPECT_EQ(listed[0]["username"], "O'Neil");
  EXPECT_EQ(listed[1]["username"], "O'Neil");
  EXPECT_EQ(listed[1]["foreign"], Json::Value(true));
}

TEST_F(CodeCommand, ListOfOneClient) {
  addClient("Player");
  issueCode();
  Arguments arguments = issueArguments();
  arguments[3] = "2";
  ASSERT_THAT(run(arguments), ExitsWith(kOk));
  const Json::Value listed = json({"code", "list", "--client", "2"})["codes"];
  ASSERT_EQ(listed.size(), 1U);
  EXPECT_EQ(listed[0]["id"], Json::Value(2));
}

TEST_F(CodeCommand, ListOfARemovedClient) {
  issueCode();
  sql("DELETE FROM oauth_clientInfo");
  const std::string identifier = client_["client_id"].asString();
  const Json::Value codes = json({"code", "list", "--client", identifier})["codes"];
  ASSERT_EQ(codes.size(), 1U);
  EXPECT_EQ(codes[0]["client_name"], Json::Value());
  EXPECT_THAT(run({"code", "list"}).out, HasSubstr("removed " + identifier.substr(0, 6) + "…"));
}

TEST_F(CodeCommand, ListOfExpiredOnes) {
  issueCode();
  issueCode();
  expireIn(kTable, 1, -1);
  const Json::Value listed = json({"code", "list", "--expired"})["codes"];
  ASSERT_EQ(listed.size(), 1U);
  EXPECT_EQ(listed[0]["id"], Json::Value(1));
}

TEST_F(CodeCommand, ShowByRowIdAndByCode) {
  const std::string code = issueCode()["code"].asString();
  EXPECT_EQ(json({"code", "show", "--code-file", "-"}, code + "\n")["code"], shown("1"));
  EXPECT_EQ(shown("1")["code"], Json::Value());
}

TEST_F(CodeCommand, ShowNeedsExactlyOneName) {
  EXPECT_THAT(run({"code", "show"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"code", "show", "1", "--code-file", "-"}), ExitsWith(kUsage));
}

TEST_F(CodeCommand, ShowOfAnUnknownCode) {
  const Outcome byId = run({"code", "show", "9"});
  EXPECT_THAT(byId, ExitsWith(kNotFound));
  EXPECT_EQ(byId.err, "keldoauth: code show: no such code 9\n");
  EXPECT_THAT(run({"code", "show", "--code-file", "-"}, support::id64('a')), ExitsWith(kNotFound));
}

TEST_F(CodeCommand, ShowOfATextThatIsNoCode) {
  EXPECT_THAT(run({"code", "show", "--code-file", "-"}, "abc"), ExitsWith(kNotFound));
  const Outcome outcome = run({"code", "show", "--code-file", "-"}, "\n");
  EXPECT_THAT(outcome, ExitsWith(kRefused));
  EXPECT_EQ(outcome.err, "keldoauth: code show: Code: the text is empty\n");
}

TEST_F(CodeCommand, WhatStandsInTheFileIsNoCode) {
  issueCode();
  const std::string stored = sqlText("SELECT code FROM oauth_grantCode");
  EXPECT_THAT(run({"code", "show", "--code-file", "-"}, stored), ExitsWith(kNotFound));
  EXPECT_THAT(run({"code", "redeem"}, stored), ExitsWith(kInvalid));
}

TEST_F(CodeCommand, ShowOfAnExpiryThatIsNoNumber) {
  issueCode();
  sql("UPDATE oauth_grantCode SET expired_time='never'");
  EXPECT_EQ(shown("1")["expired_time"], Json::Value(0));
  EXPECT_EQ(shown("1")["expires_at"], "1970-01-01T00:00:00Z");
  EXPECT_EQ(shown("1")["expired"], Json::Value(true));
}

TEST_F(CodeCommand, ShowOfAnExpiryBeyondTheCalendar) {
  issueCode();
  sql("UPDATE oauth_grantCode SET expired_time='253402300800'");
  EXPECT_EQ(shown("1")["expires_at"], Json::Value());
  EXPECT_THAT(run({"code", "show", "1"}).out, HasSubstr("expires    253402300800, in "));
}

TEST_F(CodeCommand, TimesBeyond2038) {
  issueCode();
  sql("UPDATE oauth_grantCode SET expired_time='253402300799'");
  EXPECT_EQ(shown("1")["expires_at"], "9999-12-31T23:59:59Z");
  sql("UPDATE oauth_grantCode SET expired_time='4107542400'");
  EXPECT_EQ(shown("1")["expires_at"], "2100-03-01T00:00:00Z");
  sql("UPDATE oauth_grantCode SET expired_time='951782400'");
  EXPECT_EQ(shown("1")["expires_at"], "2000-02-29T00:00:00Z");
}

// edit ----------------------------------------------------------------------------

TEST_F(CodeCommand, EditChangesWhatIsGiven) {
  storeForeignCode();
  support::Row expected = row(1);
  expected["scope"] = "all";
  EXPECT_EQ(json({"code", "edit", "1", "--scope", "all"})["code"]["scope"], "all");
  EXPECT_EQ(row(1), expected);
}

TEST_F(CodeCommand, EditOfTheServicesOwnCodeIsRefused) {
  issueCode();
  const support::Row before = row(1);
  const Outcome refused = run({"code", "edit", "1", "--scope", "all"});
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_EQ(refused.err,
            "keldoauth: code edit: code 1 was issued by this service, and says what was agreed to\n"
            "hint: end it ('keldoauth code revoke 1'), and issue another\n");
  EXPECT_EQ(row(1), before);
}

TEST_F(CodeCommand, EditOfTheExpiryKeepsQuotesAsTheyAre) {
  storeForeignCode();
  for (const std::string name : {"O''Neil", "O''''Neil"}) {
    sql("UPDATE oauth_grantCode SET username='" + name + "'");
    support::Row expected = row(1);
    const Json::Value edited = json({"code", "edit", "1", "--expires-in", "3000"})["code"];
    expected["expired_time"] = edited["expired_time"].asString();
    EXPECT_EQ(row(1), expected);
    EXPECT_GE(edited["expired_time"].asInt64(), ::time(nullptr) + 2990);
  }
}

TEST_F(CodeCommand, EditToAnotherClient) {
  storeForeignCode();
  const Json::Value other = addClient("Player");
  EXPECT_EQ(json({"code", "edit", "1", "--client", "2"})["code"]["client_id"], other["client_id"]);
  EXPECT_THAT(run({"code", "edit", "1", "--client", "3"}), ExitsWith(kNotFound));
}

TEST_F(CodeCommand, EditThatIsRefusedChangesNothing) {
  storeForeignCode();
  const support::Row before = row(1);
  const Outcome refused = run({"code", "edit", "1", "--state", "", "--expires-in", "5"});
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_THAT(refused.err, HasSubstr("--state: 1 to 2048 bytes, not 0"));
  EXPECT_EQ(row(1), before);
}

TEST_F(CodeCommand, EditWithoutAChangeAndOfAnUnknownCode) {
  EXPECT_THAT(run({"code", "edit", "1"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"code", "edit", "1", "--state", "x"}), ExitsWith(kNotFound));
}

// redeem --------------------------------------------------------------------------

TEST_F(CodeCommand, RedeemOnce) {
  const std::string code = issueCode()["code"].asString();
  const Json::Value answer = json({"code", "redeem"}, code);
  EXPECT_EQ(answer["code"]["username"], "alice");
  EXPECT_EQ(answer["code"]["client_id"], client_["client_id"]);
  EXPECT_EQ(answer["token"]["username"], "alice");
  EXPECT_EQ(answer["token"]["state"], "state1");
  EXPECT_THAT(run({"token", "verify"}, answer["token"]["access_token"].asString()), ExitsWith(kOk));
  EXPECT_EQ(json({"code", "list"})["codes"].size(), 0U);
  EXPECT_EQ(json({"code", "list", "--redeemed"})["codes"][0]["kind"], "redeemed");

  const Outcome again = run({"code", "redeem"}, code);
  EXPECT_THAT(again, ExitsWith(kInvalid));
  EXPECT_EQ(again.err, "keldoauth: code redeem: the code is not good: it was used before\n");
}

TEST_F(CodeCommand, RedeemNeedsTheAddressThatTheCodeWasAskedWith) {
  const std::string code =
      issueCode({"--redirect-uri", "https://frame.example.org/back"})["code"].asString();
  EXPECT_THAT(run({"code", "redeem"}, code), ExitsWith(kInvalid));
  EXPECT_THAT(run({"code", "redeem", "--redirect-uri", "https://frame.example.org/"}, code),
              ExitsWith(kInvalid));
  EXPECT_THAT(run({"code", "redeem", "--redirect-uri", "https://frame.example.org/back"}, code),
              ExitsWith(kOk));
}

TEST_F(CodeCommand, RedeemRefusesACodeOfADisabledOrRemovedClient) {
  const std::string code = issueCode()["code"].asString();
  run({"client", "disable", "1"});
  const Outcome disabled = run({"code", "redeem"}, code);
  EXPECT_THAT(disabled, ExitsWith(kInvalid));
  EXPECT_EQ(disabled.err,
            "keldoauth: code redeem: the code is not good: the application is disabled\n");
  sql("DELETE FROM oauth_clientInfo");
  EXPECT_THAT(run({"code", "redeem"}, code), ExitsWith(kInvalid));
}

TEST_F(CodeCommand, RedeemRefusesAnotherProgramsCode) {
  const std::string code = storeForeignCode();
  const Outcome outcome = run({"code", "redeem"}, code);
  EXPECT_THAT(outcome, ExitsWith(kInvalid));
  EXPECT_THAT(outcome.err, HasSubstr("it was issued by another program"));
  EXPECT_EQ(rowCount(kTable), "1");
}

TEST_F(CodeCommand, RedeemOnceOfEightAtTheSameMoment) {
  const std::string code = issueCode()["code"].asString();
  const Outcome all = runEightTimes({"code", "redeem"}, code);
  EXPECT_THAT(lines(all.out), testing::Contains("Redeemed code 1 of alice.").Times(1));
  EXPECT_THAT(lines(all.err), SizeIs(7));
  EXPECT_THAT(lines(all.err), testing::Each(HasSubstr("used before")));
}

TEST_F(CodeCommand, RedeemFromAFile) {
  writeFile("/tmp/code", issueCode()["code"].asString() + "\n");
  EXPECT_THAT(run({"code", "redeem", "--code-file", "/tmp/code"}).out,
              HasSubstr("Redeemed code 1 of alice.\n"));
}

TEST_F(CodeCommand, RedeemDoesNotRevealTheCode) {
  const std::string code = issueCode()["code"].asString();
  EXPECT_THAT(run({"code", "redeem"}, code).out, Not(HasSubstr(code)));
}

TEST_F(CodeCommand, RedeemRefusesAnExpiredCodeAndKeepsIt) {
  const std::string code = issueCode()["code"].asString();
  expireIn(kTable, 1, -1);
  const Outcome expired = run({"code", "redeem"}, code);
  EXPECT_THAT(expired, ExitsWith(kInvalid));
  EXPECT_EQ(expired.err, "keldoauth: code redeem: the code is not good: it has expired\n");
  EXPECT_EQ(rowCount(kTable), "1");
}

TEST_F(CodeCommand, RedeemRefusesACodeThatWasJustRevoked) {
  const std::string code = issueCode()["code"].asString();
  ASSERT_THAT(run({"code", "revoke", "1", "--yes"}), ExitsWith(kOk));
  EXPECT_THAT(run({"code", "redeem"}, code), ExitsWith(kInvalid));
}

TEST_F(CodeCommand, RedeemTellsABadLookupFromABadCode) {
  EXPECT_THAT(run({"code", "redeem"}, "abc"), ExitsWith(kInvalid));
  EXPECT_THAT(run({"code", "redeem"}, ""), ExitsWith(kRefused));
  sql("DROP TABLE oauth_grantCode; CREATE VIEW oauth_grantCode AS SELECT * FROM missing");
  EXPECT_THAT(run({"code", "redeem"}, "abc"), ExitsWith(kUnavailable));
}

// revoke and remove ---------------------------------------------------------------

TEST_F(CodeCommand, RevokeEndsIt) {
  issueCode();
  const Json::Value answer = json({"code", "revoke", "1", "--yes"});
  EXPECT_EQ(answer["code"]["id"], Json::Value(1));
  EXPECT_EQ(answer["ended"], Json::Value(1));
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(CodeCommand, RevokeSeveral) {
  for (int i = 0; i < 3; ++i) issueCode();
  const Json::Value answer = json({"code", "revoke", "1", "3", "1", "--yes"});
  EXPECT_EQ(answer["ended"], Json::Value(2));
  EXPECT_EQ(answer["codes"].size(), 2U);
  EXPECT_EQ(sqlText("SELECT id FROM oauth_grantCode"), "2");
}

TEST_F(CodeCommand, RevokeOfAUserLeavesOthersAndTokens) {
  issueCode();
  storeForeignCode("bob");
  issueToken();
  EXPECT_EQ(run({"code", "revoke", "--username", "alice", "--yes"}).out, "Revoked 1 code.\n");
  EXPECT_EQ(sqlText("SELECT username FROM oauth_grantCode"), "bob");
  EXPECT_EQ(rowCount("oauth_token"), "1");
}

TEST_F(CodeCommand, RevokeOfAllLeavesTokens) {
  issueCode();
  storeForeignCode("bob");
  issueToken();
  EXPECT_EQ(json({"code", "revoke", "--all", "-y"})["ended"], Json::Value(2));
  EXPECT_EQ(rowCount(kTable), "0");
  EXPECT_EQ(rowCount("oauth_token"), "1");
  EXPECT_EQ(run({"code", "revoke", "--all"}).out, "There is nothing to revoke.\n");
}

TEST_F(CodeCommand, RevokeNeedsOneWayOfNaming) {
  for (const Arguments& command :
       {Arguments{"code", "revoke"}, Arguments{"code", "revoke", "1", "--all"},
        Arguments{"code", "revoke", "--all", "--username", "x"},
        Arguments{"code", "revoke", "1", "--code-file", "-"}}) {
    EXPECT_THAT(run(command, "x"), ExitsWith(kUsage));
  }
}

TEST_F(CodeCommand, RevokeByCode) {
  const std::string code = issueCode()["code"].asString();
  EXPECT_THAT(run({"code", "revoke", "--code-file", "-", "-y"}, code).out,
              HasSubstr("Revoked code 1 of alice"));
}

TEST_F(CodeCommand, RemoveTakesDeadAndRedeemedRowsToo) {
  ASSERT_THAT(run({"code", "redeem"}, issueCode()["code"].asString()), ExitsWith(kOk));
  issueCode();
  expireIn(kTable, 2, -5);
  EXPECT_EQ(json({"code", "remove", "1", "--yes"})["code"]["kind"], "redeemed");
  EXPECT_EQ(run({"code", "remove", "2", "--yes"}).out,
            "Removed code 2 of alice; its row is gone.\n");
  EXPECT_EQ(rowCount(kTable), "0");
}

TEST_F(CodeCommand, RevokeAndRemoveOfAnUnknownCode) {
  issueCode();
  EXPECT_THAT(run({"code", "revoke", "4", "--yes"}), ExitsWith(kNotFound));
  EXPECT_THAT(run({"code", "revoke", "1", "4", "--yes"}), ExitsWith(kNotFound));
  EXPECT_EQ(rowCount(kTable), "1");
  EXPECT_THAT(run({"code", "remove", "4", "--yes"}), ExitsWith(kNotFound));
}

// purge ---------------------------------------------------------------------------

TEST_F(CodeCommand, PurgeRemovesWhatExpired) {
  issueCode();
  issueCode();
  expireIn(kTable, 1, -1);
  const Json::Value answer = json({"code", "purge", "--yes"});
  ASSERT_EQ(answer["purged"].size(), 1U);
  EXPECT_EQ(answer["purged"][0]["id"], Json::Value(1));
  EXPECT_EQ(answer["count"], Json::Value(1));
  EXPECT_EQ(answer["dry_run"], Json::Value(false));
  EXPECT_EQ(sqlText("SELECT id FROM oauth_grantCode"), "2");
}

TEST_F(CodeCommand, PurgeOfNothing) {
  issueCode();
  const Outcome nothing = run({"code", "purge"});
  EXPECT_THAT(nothing, ExitsWith(kOk));
  EXPECT_EQ(nothing.out, "Nothing to purge.\n");
}

TEST_F(CodeCommand, PurgeDryRunListsAndKeeps) {
  issueCode();
  issueCode();
  expireIn(kTable, 1, -10);
  const Outcome listed = run({"code", "purge", "--dry-run"});
  EXPECT_THAT(listed, ExitsWith(kOk));
  EXPECT_THAT(listed.out, HasSubstr("\n1 expired code would be purged.\n"));
  EXPECT_EQ(rowCount(kTable), "2");
}

TEST_F(CodeCommand, PurgeWithGraceKeepsWhatExpiredLately) {
  for (int id = 1; id <= 3; ++id) issueCode();
  expireIn(kTable, 1, -100);
  expireIn(kTable, 2, -1000);
  const Json::Value answer = json({"code", "purge", "--yes", "--grace", "500"});
  ASSERT_EQ(answer["purged"].size(), 1U);
  EXPECT_EQ(answer["purged"][0]["id"], Json::Value(2));
  EXPECT_EQ(answer["grace"], Json::Value(500));
  EXPECT_EQ(rowCount(kTable), "2");
}

TEST_F(CodeCommand, PurgeCountsForPeople) {
  for (int id = 1; id <= 2; ++id) issueCode();
  sql("UPDATE oauth_grantCode SET expired_time='5'");
  EXPECT_THAT(run({"code", "purge", "--yes"}).out, HasSubstr("\n2 expired codes purged.\n"));
}

}  // namespace
}  // namespace cli
