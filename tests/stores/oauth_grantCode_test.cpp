// Issuing grant codes: what is stored, what the caller gets, what is refused,
// and in which order.

#include <gmock/gmock.h>
#include <json/value.h>

#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBGrantCode;
using support::Clock;
using support::id64;
using support::Row;
using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;
using ::testing::Not;

namespace {

constexpr char kTable[] = "oauth_grantCode";
constexpr char kBadAddress[] = "oauth_grantCode:61 Bad IP address[Invalid argument]";
constexpr char kHex64[] = "[0-9a-f]{64}";

class GrantCodeTest : public StoreTest {
 protected:
  static Row code() { return onlyRow(kTable); }
};

// What is stored --------------------------------------------------------------

TEST_F(GrantCodeTest, AddStoresEveryColumn) {
  ASSERT_TRUE(succeeded(addCode({{"expired_time", "1700000600"}})));
  EXPECT_EQ(code(), (Row{{"username", "alice"},
                         {"client_id", cipher(id64('n'))},
                         {"scope", "read"},
                         {"code", id64('k')},
                         {"expired_time", "1700000600"},
                         {"state", "xyz"},
                         {"ip", "10.0.0.1"},
                         {"id", "1"}}));
}

TEST_F(GrantCodeTest, AddCountsThenInserts) {
  EXPECT_THAT(addCode().statements,
              ElementsAre("SELECT COUNT(*) FROM oauth_grantCode;",
                          "INSERT INTO oauth_grantCode (client_id, code, expired_time, id, ip, "
                          "scope, state, username) VALUES('<" +
                              id64('n') + ">', '" + id64('k') +
                              "', '9999999999', NULL, '10.0.0.1', 'read', 'xyz', 'alice');"));
}

TEST_F(GrantCodeTest, AddDoublesQuotesInFiveColumns) {
  ASSERT_TRUE(succeeded(addCode({{"username", "O'Neill"},
                                 {"client_id", "'" + std::string(63, 'n')},
                                 {"scope", "'read'"},
                                 {"code", std::string(63, 'k') + "'"},
                                 {"state", "it's"}})));
  const Row row = code();
  EXPECT_EQ(row.at("username"), "O''Neill");
  EXPECT_EQ(row.at("client_id"), cipher("''" + std::string(63, 'n')));
  EXPECT_EQ(row.at("scope"), "''read''");
  EXPECT_EQ(row.at("code"), std::string(63, 'k') + "''");
  EXPECT_EQ(row.at("state"), "it''s");
}

TEST_F(GrantCodeTest, AddStoresExpiryAndAddressAsGiven) {
  ASSERT_TRUE(succeeded(addCode({{"expired_time", "it's"}, {"ip", "fe80::1%it's"}})));
  EXPECT_EQ(code()["expired_time"], "it's");
  EXPECT_EQ(code()["ip"], "fe80::1%it's");
}

TEST_F(GrantCodeTest, AddStoresAnEmptyAddress) {
  ASSERT_TRUE(succeeded(addCode({{"ip", ""}})));
  EXPECT_EQ(code()["ip"], "");
}

TEST_F(GrantCodeTest, OneUserMayHoldManyCodes) {
  ASSERT_TRUE(succeeded(addCode()));
  EXPECT_TRUE(succeeded(addCode({{"code", id64('l')}})));
  EXPECT_THAT(ids(kTable), ElementsAre("1", "2"));
}

TEST_F(GrantCodeTest, AddWritesNoAuditEntry) {
  ASSERT_TRUE(succeeded(addCode()));
  EXPECT_EQ(rowCount("oauth_log"), 0);
}

// What is refused -------------------------------------------------------------

TEST_F(GrantCodeTest, FullTableComesBeforeABadAddressAndBadArguments) {
  writeSettings(R"({"grantcode_max": 1})");
  insertCode();
  Json::Value out;
  const Aftermath outcome = addCode({{"ip", "nonsense"}, {"username", ""}, {"code", ""}}, out);
  EXPECT_TRUE(failed(outcome, -5, "GrantCode Table is full"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_grantCode:56 GrantCode Table is full"));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT COUNT(*) FROM oauth_grantCode;"));
  EXPECT_TRUE(out.isNull());
}

TEST_F(GrantCodeTest, FullTableRefusesTheShortFormToo) {
  writeSettings(R"({"grantcode_max": 1})");
  insertCode();
  Json::Value out;
  const Aftermath outcome = issueCode({}, out);
  EXPECT_TRUE(failed(outcome, -5, "GrantCode Table is full"));
  EXPECT_TRUE(out.isNull());
}

TEST_F(GrantCodeTest, ExpiredCodesCountUntilTheyArePurged) {
  writeSettings(R"({"grantcode_max": 1})");
  insertCode({{"expired_time", "5"}});
  EXPECT_TRUE(failed(addCode(), -5, "GrantCode Table is full"));
  OAUTHDBGrantCode(kTable).Purge();
  EXPECT_TRUE(succeeded(addCode()));
}

TEST_F(GrantCodeTest, LimitIsReadAfreshEachTime) {
  OAUTHDBGrantCode store(kTable);
  Json::Value out;
  const auto add = [&] { return store.Add("alice", id64('n'), "read", "xyz", "", out) != 0; };
  writeSettings(R"({"grantcode_max": 1})");
  EXPECT_TRUE(add());
  EXPECT_FALSE(add());
  writeSettings(R"({"grantcode_max": 2})");
  EXPECT_TRUE(add());
  EXPECT_FALSE(add());
}

TEST_F(GrantCodeTest, BadAddressComesBeforeBadArguments) {
  Json::Value out;
  const Aftermath outcome = addCode({{"ip", "10.0.0.256"}, {"username", ""}}, out);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre(kBadAddress));
  EXPECT_TRUE(out.isNull());
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_F(GrantCodeTest, BadAddressRunsNoInsert) {
  EXPECT_THAT(addCode({{"ip", "nonsense"}}).statements,
              ElementsAre("SELECT COUNT(*) FROM oauth_grantCode;"));
}

TEST_F(GrantCodeTest, BadAddressLeavesTheErrorOfAnEarlierOperation) {
  OAUTHDBGrantCode store(kTable);
  Json::Value out;
  store.Get("short", &out);
  EXPECT_EQ(store.Add("alice", id64('n'), "read", "xyz", "nonsense", out), 0);
  EXPECT_EQ(store.GetErrCode(), -2);
  EXPECT_EQ(store.GetErrMsg(), "Bad parameters");
}

TEST_F(GrantCodeTest, BadArgumentsSetNoCode) {
  Json::Value out;
  const Aftermath outcome = addCode({{"state", ""}}, out);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_grantCode:71 Bad parameters"));
  EXPECT_TRUE(out.isNull());
}

TEST_F(GrantCodeTest, FreshObjectStillSaysThatNothingFailed) {
  OAUTHDBGrantCode store(kTable);
  Json::Value out;
  EXPECT_EQ(store.Add("", id64('n'), "read", "xyz", "", out), 0);
  EXPECT_EQ(store.GetErrCode(), 255);
  EXPECT_EQ(store.GetErrMsg(), "");
}

TEST_F(GrantCodeTest, SecondUseOfACodeFailsInTheDatabase) {
  insertCode();
  const Aftermath outcome = addCode({{"code", id64('g')}});
  EXPECT_TRUE(failed(outcome, 19, "UNIQUE constraint failed: oauth_grantCode.code"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![UNIQUE constraint failed: "
                          "oauth_grantCode.code][19]",
                          "oauth_db_basic Add failed[oauth_grantCode]"));
}

TEST_F(GrantCodeTest, FailedEncryptionStoresNothing) {
  support::Platform::failEncryptFrom(1);
  Json::Value out;
  EXPECT_TRUE(failed(addCode({}, out), -4, "Data Encrypt failed"));
  EXPECT_EQ(rowCount(kTable), 0);
  EXPECT_EQ(out["code"].asString(), id64('k'));
}

// What the caller gets --------------------------------------------------------

TEST_F(GrantCodeTest, CallerGetsTheCodeAsGiven) {
  const std::string withQuote = std::string(63, 'k') + "'";
  Json::Value out;
  ASSERT_TRUE(succeeded(addCode({{"code", withQuote}}, out)));
  EXPECT_THAT(out.getMemberNames(), ElementsAre("code"));
  EXPECT_EQ(out["code"].asString(), withQuote);
}

TEST_F(GrantCodeTest, OtherMembersOfTheCallersDocumentStay) {
  Json::Value out;
  out["state"] = "mine";
  ASSERT_TRUE(succeeded(addCode({}, out)));
  EXPECT_THAT(out.getMemberNames(), ElementsAre("code", "state"));
  EXPECT_EQ(out["state"].asString(), "mine");
}

TEST_F(GrantCodeTest, CallerGetsTheCodeWhenTheInsertFails) {
  insertCode();
  Json::Value out;
  ASSERT_FALSE(addCode({{"code", id64('g')}}, out).ok);
  EXPECT_EQ(out["code"].asString(), id64('g'));
}

// Short form ------------------------------------------------------------------

TEST_F(GrantCodeTest, IssueGeneratesTheCode) {
  Json::Value out;
  ASSERT_TRUE(succeeded(issueCode({}, out)));
  EXPECT_THAT(out.getMemberNames(), ElementsAre("code"));
  EXPECT_THAT(out["code"].asString(), MatchesRegex(kHex64));
  EXPECT_EQ(code()["code"], out["code"].asString());
}

TEST_F(GrantCodeTest, IssueStoresItsArguments) {
  ASSERT_TRUE(succeeded(issueCode({{"username", "bob"}, {"ip", "::1"}})));
  EXPECT_EQ(code()["username"], "bob");
  EXPECT_EQ(code()["client_id"], cipher(id64('n')));
  EXPECT_EQ(code()["scope"], "read");
  EXPECT_EQ(code()["state"], "xyz");
  EXPECT_EQ(code()["ip"], "::1");
}

TEST_F(GrantCodeTest, EachIssuedCodeIsAnother) {
  Json::Value first;
  Json::Value second;
  issueCode({}, first);
  issueCode({}, second);
  EXPECT_NE(first["code"].asString(), second["code"].asString());
  EXPECT_EQ(rowCount(kTable), 2);
}

TEST_F(GrantCodeTest, IssueChecksTheAddress) {
  Json::Value out;
  const Aftermath outcome = issueCode({{"ip", "999.1.1.1"}}, out);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre(kBadAddress));
  EXPECT_TRUE(out.isNull());
}

TEST_F(GrantCodeTest, IssueExpiresAfterTenMinutesByDefault) {
  Clock::setTo(1700000000);
  ASSERT_TRUE(succeeded(issueCode()));
  EXPECT_EQ(code()["expired_time"], "1700000600");
}

TEST_F(GrantCodeTest, IssueExpiresAfterTheConfiguredPeriod) {
  Clock::setTo(1700000000);
  writeSettings(R"({"grantcode_expired": 30, "token_expired": 7})");
  ASSERT_TRUE(succeeded(issueCode()));
  EXPECT_EQ(code()["expired_time"], "1700000030");
}

TEST_F(GrantCodeTest, PeriodIsReadAfreshEachTime) {
  Clock::setTo(1700000000);
  OAUTHDBGrantCode store(kTable);
  Json::Value out;
  for (const char* period : {"1", "86400"}) {
    writeSettings(std::string(R"({"grantcode_expired": )") + period + "}");
    store.Add("alice", id64('n'), "read", "xyz", "", out);
  }
  EXPECT_THAT(
      sql("SELECT expired_time FROM oauth_grantCode ORDER BY id;"),
      ElementsAre(Row{{"expired_time", "1700000001"}}, Row{{"expired_time", "1700086400"}}));
}

TEST_F(GrantCodeTest, ExpiryIsComputedWith64Bits) {
  Clock::setTo(2147483647);
  writeSettings(R"({"grantcode_expired": 2147483647})");
  ASSERT_TRUE(succeeded(issueCode()));
  EXPECT_EQ(code()["expired_time"], "4294967294");
}

}  // namespace
