// Verifying access tokens.

#include <gmock/gmock.h>
#include <json/value.h>

#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBToken;
using support::Clock;
using support::id64;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

namespace {

constexpr char kTable[] = "oauth_token";
constexpr long long kNow = 1700000000;

class VerifyTest : public StoreTest {
 protected:
  void SetUp() override {
    StoreTest::SetUp();
    Clock::setTo(kNow);
  }

  static Aftermath verify(const std::string& token, Json::Value& result) {
    return onTokens([&](auto& store) { return store.Verify(token, result); });
  }
  static Aftermath verify(const std::string& token = id64('a')) {
    Json::Value result;
    return verify(token, result);
  }
  static void insertTokenExpiring(const std::string& expiry) {
    insertToken({{"expired_time", expiry}});
  }
};

// Valid -----------------------------------------------------------------------

TEST_F(VerifyTest, ValidTokenTellsUserScopeAndState) {
  insertToken({{"username", "bob"}, {"scope", "write"}, {"state", "abc"}});
  Json::Value result;
  const Aftermath outcome = verify(id64('a'), result);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.lines, IsEmpty());
  EXPECT_THAT(result.getMemberNames(), ElementsAre("scope", "state", "username"));
  EXPECT_EQ(result["username"].asString(), "bob");
  EXPECT_EQ(result["scope"].asString(), "write");
  EXPECT_EQ(result["state"].asString(), "abc");
}

TEST_F(VerifyTest, ValidTokenChangesNothing) {
  insertToken();
  const std::vector<support::Row> before = everything();
  EXPECT_THAT(verify().statements,
              ElementsAre("SELECT * FROM oauth_token WHERE access_token='" + id64('a') + "' ;"));
  EXPECT_EQ(everything(), before);
}

TEST_F(VerifyTest, OtherMembersOfTheResultStay) {
  insertToken();
  Json::Value result;
  result["err_code"] = -3;
  result["username"] = "old";
  EXPECT_TRUE(succeeded(verify(id64('a'), result)));
  EXPECT_EQ(result["err_code"].asInt(), -3);
  EXPECT_EQ(result["username"].asString(), "alice");
}

TEST_F(VerifyTest, QuotesReadDoubledAsTheyAreStored) {
  ASSERT_TRUE(succeeded(addToken({{"username", "O'Neill"}})));
  Json::Value result;
  EXPECT_TRUE(succeeded(verify(id64('t'), result)));
  EXPECT_EQ(result["username"].asString(), "O''Neill");
}

TEST_F(VerifyTest, RefreshTokenIsNoAccessToken) {
  insertToken();
  EXPECT_TRUE(failedSilently(verify(id64('r'))));
}

TEST_F(VerifyTest, TokenIsValidInTheSecondOfItsExpiryAndNotInTheNext) {
  writeSettings(R"({"token_expired": 60})");
  Json::Value pair;
  ASSERT_TRUE(succeeded(issueToken({}, pair)));
  const std::string token = pair["access_token"].asString();
  Clock::setTo(kNow + 60);
  EXPECT_TRUE(succeeded(verify(token)));
  Clock::setTo(kNow + 61);
  EXPECT_TRUE(failedSilently(verify(token)));
}

TEST_F(VerifyTest, ClockIsReadBeforeTheLookUp) {
  insertTokenExpiring(std::to_string(kNow));
  OAUTHDBToken store(kTable);
  Statements::before([](const std::string& /*sql*/) { Clock::advance(1); });
  Json::Value result;
  EXPECT_TRUE(succeeded(runOn(store, [&](auto& s) { return s.Verify(id64('a'), result); })));
}

TEST_F(VerifyTest, ClockIsReadOnce) {
  insertToken();
  OAUTHDBToken store(kTable);
  const int before = Clock::calls();
  Json::Value result;
  store.Verify(id64('a'), result);
  EXPECT_EQ(Clock::calls() - before, 1);
}

// Expired or unknown ------------------------------------------------------------

TEST_F(VerifyTest, ExpiredTokenIsReportedInTheResultAlone) {
  insertTokenExpiring(std::to_string(kNow - 1));
  Json::Value result;
  const Aftermath outcome = verify(id64('a'), result);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, IsEmpty());
  EXPECT_THAT(result.getMemberNames(), ElementsAre("err_code", "err_msg"));
  EXPECT_TRUE(result["err_code"].isInt());
  EXPECT_EQ(result["err_code"].asInt(), -3);
  EXPECT_EQ(result["err_msg"].asString(), "Access Token Expired");
}

TEST_F(VerifyTest, UnknownTokenReadsAsExpired) {
  Json::Value result;
  const Aftermath outcome = verify(id64('z'), result);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, IsEmpty());
  EXPECT_EQ(result["err_code"].asInt(), -3);
  EXPECT_EQ(result["err_msg"].asString(), "Access Token Expired");
}

TEST_F(VerifyTest, UnknownTokenLeavesAFreshObjectAt255) {
  OAUTHDBToken store(kTable);
  Json::Value result;
  EXPECT_FALSE(store.Verify(id64('z'), result));
  EXPECT_EQ(store.GetErrCode(), 255);
  EXPECT_EQ(store.GetErrMsg(), "");
}

TEST_F(VerifyTest, FailureLeavesOtherMembersOfTheResult) {
  Json::Value result;
  result["username"] = "old";
  verify(id64('z'), result);
  EXPECT_THAT(result.getMemberNames(), ElementsAre("err_code", "err_msg", "username"));
}

TEST_F(VerifyTest, ExpiredTokenStaysInTheTable) {
  insertTokenExpiring("5");
  verify();
  EXPECT_EQ(rowCount(kTable), 1);
}

/// A clock that stands before 1970, or at its start, finds no token expired.
TEST_F(VerifyTest, UnknownTokenIsNotExpiredAtTheStartOfTime) {
  Clock::setTo(0);
  Json::Value result;
  EXPECT_TRUE(succeeded(verify(id64('z'), result)));
  EXPECT_TRUE(result["username"].isNull());
}

// Failed look-up ------------------------------------------------------------------

TEST_F(VerifyTest, TokenOfAnotherLengthIsReportedTwice) {
  Json::Value result;
  const Aftermath outcome = verify("ten bytes!", result);
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_token:212 Bad parameters"));
  EXPECT_TRUE(result["err_code"].isInt());
  EXPECT_EQ(result["err_code"].asInt(), -2);
  EXPECT_EQ(result["err_msg"].asString(), "Bad parameters");
}

TEST_F(VerifyTest, StatementThatFailsIsReportedTwice) {
  OAUTHDBToken store(kTable);
  sql("DROP TABLE oauth_token;");
  Json::Value result;
  const Aftermath outcome = runOn(store, [&](auto& s) { return s.Verify(id64('a'), result); });
  EXPECT_TRUE(failed(outcome, 1, "no such table: oauth_token"));
  EXPECT_EQ(result["err_code"].asInt(), 1);
  EXPECT_EQ(result["err_msg"].asString(), "no such table: oauth_token");
}

TEST_F(VerifyTest, ObjectThatIsNotReadyReportsTheErrorItCarries) {
  OAUTHDBToken store(kTable);
  sql("CREATE TABLE aside(x);");
  writeFile(kDatabase, "no database, but long enough to be taken for a broken one");
  OAUTHDBToken notReady(kTable);
  Json::Value result;
  EXPECT_FALSE(notReady.Verify(id64('a'), result));
  EXPECT_EQ(result["err_code"].asInt(), notReady.GetErrCode());
  EXPECT_EQ(result["err_msg"].asString(), "file is not a database");
  EXPECT_EQ(result["err_code"].asInt(), 26);
}

// Expiry texts --------------------------------------------------------------------

struct ExpiryCase {
  const char* name;
  std::string text;
  bool valid;
};
void PrintTo(const ExpiryCase& c, std::ostream* out) {
  *out << c.name;
}

class ExpiryTextTest : public VerifyTest, public ::testing::WithParamInterface<ExpiryCase> {};

TEST_P(ExpiryTextTest, IsReadByVerify) {
  insertTokenExpiring(GetParam().text);
  const Aftermath outcome = verify();
  EXPECT_EQ(outcome.ok, GetParam().valid);
  EXPECT_EQ(outcome.code, kCodeBefore);
}

TEST_P(ExpiryTextTest, IsReadByPurge) {
  insertTokenExpiring(GetParam().text);
  insertCode({{"expired_time", GetParam().text}});
  EXPECT_TRUE(succeeded(onTokens([](auto& store) { return store.Purge(); })));
  EXPECT_TRUE(succeeded(onCodes([](auto& store) { return store.Purge(); })));
  EXPECT_EQ(rowCount(kTable), GetParam().valid ? 1 : 0);
  EXPECT_EQ(rowCount("oauth_grantCode"), GetParam().valid ? 1 : 0);
}

INSTANTIATE_TEST_SUITE_P(
    Texts, ExpiryTextTest,
    ::testing::Values(
        ExpiryCase{"BeforeNow", "1699999999", false}, ExpiryCase{"Now", "1700000000", true},
        ExpiryCase{"AfterNow", "1700000001", true}, ExpiryCase{"Empty", "", false},
        ExpiryCase{"Word", "never", false}, ExpiryCase{"Negative", "-1", false},
        ExpiryCase{"NegativeFuture", "-1700000001", false},
        ExpiryCase{"LeadingBlanks", " \t\n1700000001", true},
        ExpiryCase{"LeadingZeros", "0000000000001700000001", true},
        ExpiryCase{"PlusSign", "+1700000001", true}, ExpiryCase{"TwoSigns", "+-1700000001", false},
        ExpiryCase{"TrailingText", "1700000001seconds", true},
        ExpiryCase{"Fraction", "1700000000.9", true}, ExpiryCase{"Exponent", "17e8", false},
        ExpiryCase{"Hexadecimal", "0xffffffff", false},
        ExpiryCase{"Beyond31Bits", "2147483648", true},
        ExpiryCase{"Beyond32Bits", "4294967296", true},
        ExpiryCase{"Highest", "9223372036854775807", true},
        ExpiryCase{"Beyond64Bits", "18446744073709551616", true},
        ExpiryCase{"LongestDigits", std::string(128, '9'), true},
        ExpiryCase{"LongestNegative", "-" + std::string(127, '9'), false},
        ExpiryCase{"LongestZeros", std::string(128, '0'), false},
        ExpiryCase{"FullWidthDigits", "\xef\xbc\x99\xef\xbc\x99", false}),
    ::testing::PrintToStringParamName());

// Clocks ----------------------------------------------------------------------------

constexpr long long kLastOf32Bits = 2147483647;
constexpr long long kIn2106 = 4294967296 + 1000;
constexpr long long kEndOf9999 = 253402300799;

class LateClockTest : public VerifyTest, public ::testing::WithParamInterface<long long> {};

TEST_P(LateClockTest, TokenLivesAsLongAsEver) {
  Clock::setTo(GetParam() - 600);
  Json::Value pair;
  ASSERT_TRUE(succeeded(issueToken({}, pair)));
  EXPECT_EQ(onlyRow(kTable)["expired_time"], std::to_string(GetParam()));
  Clock::setTo(GetParam());
  EXPECT_TRUE(succeeded(verify(pair["access_token"].asString())));
}

TEST_P(LateClockTest, TokenThatExpiredASecondAgoIsPurged) {
  insertTokenExpiring(std::to_string(GetParam() - 1));
  Clock::setTo(GetParam());
  EXPECT_TRUE(failedSilently(verify()));
  EXPECT_TRUE(succeeded(onTokens([](auto& store) { return store.Purge(); })));
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_P(LateClockTest, RevokedCodeExpiresNow) {
  insertCode({{"id", "1"}});
  Clock::setTo(GetParam());
  EXPECT_TRUE(succeeded(onCodes([](auto& store) { return store.Revoke(1); })));
  EXPECT_EQ(onlyRow("oauth_grantCode")["expired_time"], std::to_string(GetParam()));
}

INSTANTIATE_TEST_SUITE_P(Clocks, LateClockTest,
                         ::testing::Values(kLastOf32Bits, kIn2106, kEndOf9999));

}  // namespace
