// Clocks that jump, and expiries that no calendar knows.

#include <cstdint>
#include <limits>

#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/support/case_name.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

namespace faults {
namespace {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBGrantCode;
using KELDOAUTHSERVER::OAUTHDBLog;
using KELDOAUTHSERVER::OAUTHDBToken;
using support::Clock;
using support::id64;

constexpr long long kNow = 1700000000;
constexpr long long kDay = 86400;

class TimeTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    support::Platform::useReadableCipher();
    Clock::setTo(kNow);
  }

  static std::string issueToken(OAUTHDBToken& tokens) {
    Json::Value out;
    EXPECT_NE(tokens.Add("user", id64('a'), "read", "code", "state", "", out), 0);
    return out["access_token"].asString();
  }

  static void issueCode(OAUTHDBGrantCode& codes) {
    Json::Value out;
    EXPECT_NE(codes.Add("user", id64('a'), "read", "state", "", out), 0);
  }

  static bool isValid(OAUTHDBToken& tokens, const std::string& token) {
    Json::Value result;
    return tokens.Verify(token, result);
  }

  static std::string count(const std::string& table) {
    return sqlText("SELECT count(*) FROM " + table);
  }

  static std::string expiry(const std::string& table) {
    return sqlText("SELECT expired_time FROM " + table);
  }
};

// The clock jumps -------------------------------------------------------------

TEST_F(TimeTest, TokenStaysValidWhenTheClockIsSetBack) {
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = issueToken(tokens);
  Clock::setTo(kNow - 365 * kDay);
  EXPECT_TRUE(isValid(tokens, token));
  EXPECT_TRUE(tokens.Purge());
  EXPECT_EQ(count("oauth_token"), "1");
}

TEST_F(TimeTest, TokenExpiresWhenTheClockIsSetForward) {
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = issueToken(tokens);
  Clock::setTo(kNow + 600);
  EXPECT_TRUE(isValid(tokens, token));
  Clock::setTo(kNow + 601);
  EXPECT_FALSE(isValid(tokens, token));
}

TEST_F(TimeTest, TokenThatExpiredIsValidAgainWhenTheClockIsPutRight) {
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = issueToken(tokens);
  Clock::setTo(kNow + kDay);
  EXPECT_FALSE(isValid(tokens, token));
  Clock::setTo(kNow + 1);
  EXPECT_TRUE(isValid(tokens, token));
}

TEST_F(TimeTest, PurgeUnderAClockThatRunsAheadRemovesForGood) {
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = issueToken(tokens);
  Clock::setTo(kNow + kDay);
  EXPECT_TRUE(tokens.Purge());
  Clock::setTo(kNow + 1);
  EXPECT_FALSE(isValid(tokens, token));
}

TEST_F(TimeTest, RevokedCodeIsNotPurgedBeforeTheClockHasCaughtUp) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  issueCode(codes);
  ASSERT_NE(codes.Revoke(1), 0);
  Clock::setTo(kNow - kDay);
  EXPECT_EQ(codes.Purge(), 1);
  EXPECT_EQ(count("oauth_grantCode"), "1");
  Clock::setTo(kNow + 1);
  EXPECT_EQ(codes.Purge(), 1);
  EXPECT_EQ(count("oauth_grantCode"), "0");
}

// The rotation goes by time stamp: what is stamped earliest goes first.
TEST_F(TimeTest, FullLogTrimsTheEntryOfAClockThatWasSetBack) {
  writeSettings(R"({"log_max": 2})");
  OAUTHDBLog log(names::kLogTable);
  for (const long long seconds : {0, 1}) {
    Clock::setTo(kNow + seconds);
    ASSERT_NE(log.Add("kept"), 0);
  }
  Clock::setTo(kNow - kDay);
  EXPECT_NE(log.Add("from yesterday"), 0);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log WHERE msg = 'kept'"), "2");
  EXPECT_EQ(count("oauth_log"), "2");
}

// Far away --------------------------------------------------------------------

TEST_F(TimeTest, LifetimeMayReachBeyond2038) {
  writeSettings(R"({"token_expired": 2147483647})");
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = issueToken(tokens);
  EXPECT_EQ(expiry("oauth_token"), "3847483647");
  EXPECT_TRUE(isValid(tokens, token));
  EXPECT_TRUE(tokens.Purge());
  EXPECT_EQ(count("oauth_token"), "1");
}

TEST_F(TimeTest, CodeMayBeIssuedInTheLastSecondOf32Bits) {
  Clock::setTo(std::numeric_limits<std::int32_t>::max());
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  issueCode(codes);
  EXPECT_EQ(expiry("oauth_grantCode"), "2147484247");
}

TEST_F(TimeTest, ClockMayRunBeyond2106) {
  constexpr long long kIn2120 = 4733510400;
  Clock::setTo(kIn2120);
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = issueToken(tokens);
  EXPECT_EQ(expiry("oauth_token"), std::to_string(kIn2120 + 600));
  EXPECT_TRUE(isValid(tokens, token));
  Clock::setTo(kIn2120 + 601);
  EXPECT_FALSE(isValid(tokens, token));
  EXPECT_TRUE(tokens.Purge());
  EXPECT_EQ(count("oauth_token"), "0");
}

TEST_F(TimeTest, TokenThatIsIssuedBefore2038ExpiresAfterIt) {
  constexpr long long kLastSecond = std::numeric_limits<std::int32_t>::max();
  Clock::setTo(kLastSecond);
  OAUTHDBToken tokens(names::kTokenTable);
  const std::string token = issueToken(tokens);
  Clock::setTo(kLastSecond + 600);
  EXPECT_TRUE(isValid(tokens, token));
  Clock::setTo(kLastSecond + 601);
  EXPECT_FALSE(isValid(tokens, token));
}

// Texts -----------------------------------------------------------------------

struct Expiry {
  std::string name;
  std::string text;
  bool valid;  // at kNow
};

void PrintTo(const Expiry& expiry, std::ostream* out) {
  *out << expiry.text;
}

const Expiry kExpiries[] = {
    {"ThisSecond", "1700000000", true},
    {"TheSecondBefore", "1699999999", false},
    {"In2038", "2147483648", true},
    {"In2100", "4102444800", true},
    {"In2106", "4294967296", true},
    {"TheLastOf64Bits", "9223372036854775807", true},
    {"Beyond64Bits", "9223372036854775808", true},
    {"Of128Digits", std::string(128, '9'), true},
    {"Of128DigitsBelowZero", "-" + std::string(127, '9'), false},
    {"Of128Zeros", std::string(128, '0'), false},
    {"Zero", "0", false},
    {"Negative", "-1", false},
    {"NegativeThatWouldWrap", "-9223372036854775809", false},
    {"Word", "never", false},
    {"Empty", "", false},
    {"Sign", "+1700000000", true},
    {"BlanksFirst", "  1700000000", true},
    {"LettersAfter", "1700000000 seconds", true},
    {"Fraction", "1700000000.9", true},
    {"Hexadecimal", "0x7fffffff", false},
    {"Exponent", "1e12", false},
    {"Date", "2099-01-01", false},
};

class ExpiryTextTest : public TimeTest, public ::testing::WithParamInterface<Expiry> {
 protected:
  /// A row as another program may have left it.
  static void plant(const std::string& table, const std::string& columns,
                    const std::string& values) {
    sql("INSERT INTO " + table + "(username, client_id, scope, state, expired_time, " + columns +
        ") VALUES('user', '<x>', 'read', 'state', '" + GetParam().text + "', " + values + ")");
  }
};

TEST_P(ExpiryTextTest, OfATokenDecidesVerificationAndPurge) {
  OAUTHDBToken tokens(names::kTokenTable);
  plant("oauth_token", "access_token, refresh_token, flow_type",
        "'" + id64('1') + "', '" + id64('2') + "', 'code'");
  EXPECT_EQ(isValid(tokens, id64('1')), GetParam().valid);
  EXPECT_TRUE(tokens.Purge());
  EXPECT_EQ(count("oauth_token"), GetParam().valid ? "1" : "0");
}

TEST_P(ExpiryTextTest, OfACodeDecidesItsPurge) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  plant("oauth_grantCode", "code", "'" + id64('1') + "'");
  EXPECT_EQ(codes.Purge(), 1);
  EXPECT_EQ(count("oauth_grantCode"), GetParam().valid ? "1" : "0");
}

INSTANTIATE_TEST_SUITE_P(EveryText, ExpiryTextTest, ::testing::ValuesIn(kExpiries),
                         support::CaseName());

}  // namespace
}  // namespace faults
