// Issuing token pairs: what is stored, what the caller gets, what is refused,
// and in which order.

#include <gmock/gmock.h>
#include <json/value.h>

#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBToken;
using support::Clock;
using support::id64;
using support::Row;
using ::testing::ElementsAre;
using ::testing::MatchesRegex;

namespace {

constexpr char kTable[] = "oauth_token";
constexpr char kBadAddress[] = "oauth_token:65 Bad IP address[Invalid argument]";
constexpr char kHex64[] = "[0-9a-f]{64}";

class TokenIssueTest : public StoreTest {
 protected:
  static Row token() { return onlyRow(kTable); }
};

// Storing form: what is stored --------------------------------------------------

TEST_F(TokenIssueTest, AddStoresEveryColumn) {
  ASSERT_TRUE(succeeded(addToken({{"expired_time", "1700000600"}})));
  EXPECT_EQ(token(), (Row{{"username", "alice"},
                          {"client_id", cipher(id64('n'))},
                          {"scope", "read"},
                          {"refresh_token", id64('u')},
                          {"access_token", id64('t')},
                          {"expired_time", "1700000600"},
                          {"flow_type", "authorization_code"},
                          {"state", "xyz"},
                          {"ip", "10.0.0.1"},
                          {"id", "1"}}));
}

TEST_F(TokenIssueTest, AddCountsThenInserts) {
  EXPECT_THAT(
      addToken().statements,
      ElementsAre("SELECT COUNT(*) FROM oauth_token;",
                  "INSERT INTO oauth_token (access_token, client_id, expired_time, flow_type, id, "
                  "ip, refresh_token, scope, state, username) VALUES('" +
                      id64('t') + "', '<" + id64('n') +
                      ">', '9999999999', 'authorization_code', NULL, '10.0.0.1', '" + id64('u') +
                      "', 'read', 'xyz', 'alice');"));
}

TEST_F(TokenIssueTest, AddDoublesQuotesInEveryColumn) {
  ASSERT_TRUE(succeeded(addToken({{"username", "O'Neill"},
                                  {"client_id", "'" + std::string(63, 'n')},
                                  {"scope", "'read'"},
                                  {"refresh_token", std::string(63, 'u') + "'"},
                                  {"access_token", std::string(63, 't') + "'"},
                                  {"expired_time", "it's"},
                                  {"flow_type", "f'"},
                                  {"state", "s''"},
                                  {"ip", "fe80::1%it's"}})));
  EXPECT_EQ(token(), (Row{{"username", "O''Neill"},
                          {"client_id", cipher("''" + std::string(63, 'n'))},
                          {"scope", "''read''"},
                          {"refresh_token", std::string(63, 'u') + "''"},
                          {"access_token", std::string(63, 't') + "''"},
                          {"expired_time", "it''s"},
                          {"flow_type", "f''"},
                          {"state", "s''''"},
                          {"ip", "fe80::1%it''s"},
                          {"id", "1"}}));
}

TEST_F(TokenIssueTest, AddStoresAnEmptyAddress) {
  ASSERT_TRUE(succeeded(addToken({{"ip", ""}})));
  EXPECT_EQ(token()["ip"], "");
}

TEST_F(TokenIssueTest, RefreshTokensNeedNotDiffer) {
  insertToken();
  EXPECT_TRUE(succeeded(addToken({{"refresh_token", id64('r')}})));
}

TEST_F(TokenIssueTest, BothTokensMayBeTheSameText) {
  EXPECT_TRUE(succeeded(addToken({{"refresh_token", id64('t')}})));
}

TEST_F(TokenIssueTest, AddWritesNoAuditEntry) {
  ASSERT_TRUE(succeeded(addToken()));
  EXPECT_EQ(rowCount("oauth_log"), 0);
}

// Storing form: what is refused ---------------------------------------------------

TEST_F(TokenIssueTest, FullTableComesBeforeABadAddressAndBadArguments) {
  writeSettings(R"({"token_max": 1})");
  insertToken();
  Json::Value out;
  const Aftermath outcome = addToken({{"ip", "999.1.1.1"}, {"username", ""}, {"state", ""}}, out);
  EXPECT_TRUE(failed(outcome, -5, "Token Table is full"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_token:60 Token Table is full"));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT COUNT(*) FROM oauth_token;"));
  EXPECT_TRUE(out.isNull());
}

TEST_F(TokenIssueTest, FullTableRefusesTheIssuingFormToo) {
  writeSettings(R"({"token_max": 1})");
  insertToken();
  Json::Value out;
  EXPECT_TRUE(failed(issueToken({}, out), -5, "Token Table is full"));
  EXPECT_TRUE(out.isNull());
}

TEST_F(TokenIssueTest, LimitIsReadAfreshEachTime) {
  OAUTHDBToken store(kTable);
  Json::Value out;
  const auto add = [&] { return store.Add("alice", id64('n'), "read", "flow", "x", "", out) != 0; };
  writeSettings(R"({"token_max": 1})");
  EXPECT_TRUE(add());
  EXPECT_FALSE(add());
  writeSettings(R"({"token_max": 2})");
  EXPECT_TRUE(add());
  EXPECT_FALSE(add());
}

TEST_F(TokenIssueTest, FailedCountReadsAsFull) {
  OAUTHDBToken store("no_such_table");
  Json::Value out;
  const Aftermath outcome = runOn(
      store, [&](auto& s) { return s.Add("alice", id64('n'), "read", "flow", "x", "bad", out); });
  EXPECT_TRUE(failed(outcome, -5, "Token Table is full"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![no such table: no_such_table][1]",
                          "oauth_db_basic Get Row Count failed[no_such_table]",
                          "oauth_db_basic Check Row Max failed[no_such_table]",
                          "oauth_token:60 Token Table is full"));
}

TEST_F(TokenIssueTest, BadAddressComesBeforeBadArguments) {
  Json::Value out;
  const Aftermath outcome = addToken({{"ip", "999.1.1.1"}, {"username", ""}}, out);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre(kBadAddress));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT COUNT(*) FROM oauth_token;"));
  EXPECT_TRUE(out.isNull());
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_F(TokenIssueTest, BadArgumentsSetTheCode) {
  Json::Value out;
  const Aftermath outcome = addToken({{"expired_time", std::string(129, '9')}}, out);
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_token:80 Bad parameters"));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT COUNT(*) FROM oauth_token;"));
  EXPECT_TRUE(out.isNull());
}

TEST_F(TokenIssueTest, SecondUseOfAnAccessTokenFailsInTheDatabase) {
  insertToken();
  const Aftermath outcome = addToken({{"access_token", id64('a')}});
  EXPECT_TRUE(failed(outcome, 19, "UNIQUE constraint failed: oauth_token.access_token"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![UNIQUE constraint failed: "
                          "oauth_token.access_token][19]",
                          "oauth_db_basic Add failed[oauth_token]"));
  EXPECT_EQ(rowCount(kTable), 1);
}

TEST_F(TokenIssueTest, FailedEncryptionStoresNothing) {
  support::Platform::failEncryptFrom(1);
  Json::Value out;
  const Aftermath outcome = addToken({}, out);
  EXPECT_TRUE(failed(outcome, -4, "Data Encrypt failed"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Data Encrypt failed"));
  EXPECT_EQ(rowCount(kTable), 0);
  EXPECT_EQ(out["access_token"].asString(), id64('t'));
}

// What the caller gets ------------------------------------------------------------

TEST_F(TokenIssueTest, CallerGetsBothTokensAsGiven) {
  const std::string access = std::string(63, 't') + "'";
  Json::Value out;
  ASSERT_TRUE(succeeded(addToken({{"access_token", access}}, out)));
  EXPECT_THAT(out.getMemberNames(), ElementsAre("access_token", "refresh_token"));
  EXPECT_EQ(out["access_token"].asString(), access);
  EXPECT_EQ(out["refresh_token"].asString(), id64('u'));
}

TEST_F(TokenIssueTest, OtherMembersOfTheCallersDocumentStay) {
  Json::Value out;
  out["err_code"] = -3;
  out["access_token"] = "old";
  ASSERT_TRUE(succeeded(addToken({}, out)));
  EXPECT_EQ(out["err_code"].asInt(), -3);
  EXPECT_EQ(out["access_token"].asString(), id64('t'));
}

TEST_F(TokenIssueTest, CallerGetsBothTokensWhenTheInsertFails) {
  insertToken();
  Json::Value out;
  ASSERT_FALSE(addToken({{"access_token", id64('a')}}, out).ok);
  EXPECT_EQ(out["access_token"].asString(), id64('a'));
  EXPECT_EQ(out["refresh_token"].asString(), id64('u'));
}

// Issuing form ----------------------------------------------------------------------

TEST_F(TokenIssueTest, IssueGeneratesBothTokens) {
  Json::Value out;
  ASSERT_TRUE(succeeded(issueToken({}, out)));
  EXPECT_THAT(out.getMemberNames(), ElementsAre("access_token", "refresh_token"));
  EXPECT_THAT(out["access_token"].asString(), MatchesRegex(kHex64));
  EXPECT_THAT(out["refresh_token"].asString(), MatchesRegex(kHex64));
  EXPECT_NE(out["access_token"].asString(), out["refresh_token"].asString());
  EXPECT_EQ(token()["access_token"], out["access_token"].asString());
  EXPECT_EQ(token()["refresh_token"], out["refresh_token"].asString());
}

TEST_F(TokenIssueTest, IssueStoresItsArguments) {
  ASSERT_TRUE(succeeded(issueToken({{"username", "bob"}, {"flow_type", "implicit"}, {"ip", ""}})));
  const Row row = token();
  EXPECT_EQ(row.at("username"), "bob");
  EXPECT_EQ(row.at("client_id"), cipher(id64('n')));
  EXPECT_EQ(row.at("scope"), "read");
  EXPECT_EQ(row.at("flow_type"), "implicit");
  EXPECT_EQ(row.at("state"), "xyz");
  EXPECT_EQ(row.at("ip"), "");
}

TEST_F(TokenIssueTest, EachIssuedPairIsAnother) {
  Json::Value first;
  Json::Value second;
  issueToken({}, first);
  issueToken({}, second);
  EXPECT_NE(first["access_token"].asString(), second["access_token"].asString());
  EXPECT_NE(first["refresh_token"].asString(), second["refresh_token"].asString());
}

TEST_F(TokenIssueTest, IssueChecksTheAddress) {
  Json::Value out;
  const Aftermath outcome = issueToken({{"ip", "10.0.0.256"}}, out);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre(kBadAddress));
  EXPECT_TRUE(out.isNull());
}

TEST_F(TokenIssueTest, IssueExpiresAfterTenMinutesByDefault) {
  Clock::setTo(1700000000);
  ASSERT_TRUE(succeeded(issueToken()));
  EXPECT_EQ(token()["expired_time"], "1700000600");
}

TEST_F(TokenIssueTest, IssueExpiresAfterTheConfiguredPeriod) {
  Clock::setTo(1700000000);
  writeSettings(R"({"grantcode_expired": 7, "token_expired": 3600})");
  ASSERT_TRUE(succeeded(issueToken()));
  EXPECT_EQ(token()["expired_time"], "1700003600");
}

TEST_F(TokenIssueTest, PeriodIsReadAfreshEachTime) {
  Clock::setTo(1700000000);
  OAUTHDBToken store(kTable);
  Json::Value out;
  for (const char* period : {"1", "86400"}) {
    writeSettings(std::string(R"({"token_expired": )") + period + "}");
    store.Add("alice", id64('n'), "read", "flow", "xyz", "", out);
  }
  EXPECT_THAT(
      sql("SELECT expired_time FROM oauth_token ORDER BY id;"),
      ElementsAre(Row{{"expired_time", "1700000001"}}, Row{{"expired_time", "1700086400"}}));
}

TEST_F(TokenIssueTest, ExpiryIsComputedWith64Bits) {
  Clock::setTo(2147483647);
  writeSettings(R"({"token_expired": 2147483647})");
  ASSERT_TRUE(succeeded(issueToken()));
  EXPECT_EQ(token()["expired_time"], "4294967294");
}

}  // namespace
