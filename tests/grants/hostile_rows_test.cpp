// Rows of other programs that were made up to look like ours, and values that
// nobody would think of.

#include "grants/rows/digest.h"
#include "grants/rows/state.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;
namespace rows = KELDOAUTHSERVER::grants::rows;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class HostileRowsTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
  }

  /// A login that another program stored in the clear.
  void storeForeign(const std::string& state, const std::string& expires = "1700000600",
                    const std::string& flow = "password") const {
    Json::Value out;
    ASSERT_TRUE(KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
                    .Add("alice", frame_.text(), "profile", kRefresh, kAccess, expires, flow, state,
                         "", out));
  }
  AccessEntry onlyEntry() {
    const auto entries = grants().access.list({{}, {}, true, true});
    EXPECT_THAT(entries, SizeIs(1));
    return entries.at(0);
  }
  Policy strange(long long seconds) {
    Policy policy;
    policy.idle = policy.family = policy.grace = policy.auditPause = seconds;
    return policy;
  }

  const std::string kRefresh = support::id64('b');
  const std::string kAccess = support::id64('a');
  ApplicationId frame_;
};

// `state` of an authorisation request is a stranger's text, and an older service
// stores it as it came.
TEST_F(HostileRowsTest, AStateThatLooksLikeOursIsOnlyAState) {
  const std::string state = pack(rows::TokenState{kNow, kNow, kNow, rows::markOf("family"), "",
                                                  rows::markOf("mine"), "admin root", "forged"});
  storeForeign(state);
  const auto bearer = grants().tokens.verify(AccessToken(kAccess));
  ASSERT_TRUE(bearer);
  EXPECT_EQ(bearer->scope, Scope("profile"));
  EXPECT_EQ(bearer->text, CallerText(""));
  EXPECT_FALSE(bearer->issued);

  const auto refresh = grants().tokens.introspect(frame_, AnyToken(kRefresh));
  ASSERT_TRUE(refresh);
  EXPECT_EQ(refresh->bearer.scope, Scope("profile"));
  EXPECT_EQ(refresh->bearer.text, CallerText(""));

  const AccessEntry entry = onlyEntry();
  EXPECT_TRUE(entry.isForeign);
  EXPECT_EQ(entry.scope, Scope("profile"));
  EXPECT_EQ(entry.text, CallerText(state));
  EXPECT_EQ(entry.since, 0);
  EXPECT_FALSE(grants().tokens.revoke(frame_, AnyToken("mine"))->wasThere);
}

TEST_F(HostileRowsTest, ACodeWhoseStateLooksSpentIsAnotherProgramsCode) {
  const Pair pair = login(frame_);
  const AccessEntry victim = *grants().access.find(AnyToken(pair.access.text()));
  rows::CodeState state{"", false, "", "", kNow, ""};
  state.spent = rows::Spent{0, victim.handle.row, rows::markOf("family")};
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBGrantCode(names::kGrantCodeTable)
      .Add("alice", frame_.text(), "profile", support::id64('c'), "1700000600", pack(state), "",
           out);
  EXPECT_EQ(whyOf(grants().codes.redeem({frame_, Code(support::id64('c'))})), Why::kForeign);
  EXPECT_TRUE(isGood(pair));
  EXPECT_EQ(grants().room.count().spentCodes, 1);  // the victim's own
}

TEST_F(HostileRowsTest, AnExpiryOf128DigitsIsForEver) {
  storeForeign("state", std::string(128, '9'));
  ASSERT_TRUE(grants().tokens.verify(AccessToken(kAccess)));
  EXPECT_TRUE(grants().tokens.introspect(frame_, AnyToken(kRefresh)));
  EXPECT_FALSE(onlyEntry().isDead);
  EXPECT_GT(onlyEntry().ends, kNow);
  EXPECT_EQ(grants().room.purge().tokens, 0);
}

TEST_F(HostileRowsTest, WhatIsNoTimeIsLongPast) {
  for (const char* expires : {"never", "-1", "0x7fffffffffffffff", " ", "-99999999999999999999"}) {
    storeForeign("state", expires);
    EXPECT_EQ(whyOf(grants().tokens.verify(AccessToken(kAccess))), Why::kExpired) << expires;
    EXPECT_FALSE(grants().tokens.introspect(frame_, AnyToken(kRefresh))) << expires;
    EXPECT_TRUE(onlyEntry().isDead) << expires;
    EXPECT_EQ(grants().room.purge().tokens, 1) << expires;
  }
}

TEST_F(HostileRowsTest, AnotherProgramsTextsMayEvenBeDigests) {
  Json::Value out;
  ASSERT_TRUE(KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
                  .Add("alice", frame_.text(), "profile", rows::markOf("r"), kAccess, "1700000600",
                       "password", "state", "", out));
  EXPECT_FALSE(grants().tokens.introspect(frame_, AnyToken(rows::markOf("r"))));
  EXPECT_EQ(whyOf(grants().tokens.refresh({frame_, RefreshToken("r")})), Why::kUnknown);
  EXPECT_TRUE(grants().tokens.verify(AccessToken(kAccess)));
  EXPECT_TRUE(grants().tokens.revoke(frame_, AnyToken(kAccess))->wasThere);
  EXPECT_THAT(grants().access.list({}), IsEmpty());
}

TEST_F(HostileRowsTest, ACodeThatWasRedeemedSinceItWasListedIsNotForgotten) {
  const Code code = issue(frame_);
  const AccessHandle listed = onlyEntry().handle;
  const Pair pair = *grants().codes.redeem(redemption(frame_, code));
  const Ended ended = grants().access.end(listed, kAdmin);
  EXPECT_EQ(ended.codes + ended.tokens, 0);
  support::Clock::advance(kHour);
  EXPECT_EQ(whyOf(grants().codes.redeem(redemption(frame_, code))), Why::kReplayed);
  EXPECT_FALSE(isGood(pair));
}

TEST_F(HostileRowsTest, ANewApplicationOfAnOldIdentifierStartsWithNothing) {
  const Pair pair = login(frame_);
  const Code code = issue(frame_);
  KELDOAUTHSERVER::OAUTHDBClientInfo(names::kClientInfoTable)
      .Del(grants().applications.find(frame_)->row);
  EXPECT_EQ(whyOf(grants().tokens.verify(pair.access)), Why::kNoApplication);
  NewApplication again{ApplicationName("Another"), {kAddress}, kScope};
  again.identifier = frame_;
  ASSERT_TRUE(grants().applications.add(again, kAdmin));
  EXPECT_EQ(whyOf(grants().tokens.verify(pair.access)), Why::kUnknown);
  EXPECT_EQ(whyOf(grants().tokens.refresh({frame_, *pair.refresh})), Why::kUnknown);
  EXPECT_EQ(whyOf(grants().codes.redeem(redemption(frame_, code))), Why::kUnknown);
}

// Policies ----------------------------------------------------------------------------

TEST_F(HostileRowsTest, SecondsBelowNoneAreNone) {
  open(strange(-1));
  EXPECT_TRUE(grants().applications.disable(frame_, kAdmin));
  EXPECT_TRUE(grants().applications.enable(frame_, kAdmin));
  const Pair pair = *grants().tokens.issue({kAlice, frame_, kScope});
  EXPECT_EQ(pair.expires, kNow);  // a login may last no time at all
  EXPECT_TRUE(isGood(pair));
  const Pair next = refresh(frame_, pair);
  EXPECT_EQ(whyOf(grants().tokens.refresh({frame_, *pair.refresh})), Why::kReplayed);
}

TEST_F(HostileRowsTest, SecondsWithoutEndAreLongEnough) {
  open(strange(std::numeric_limits<long long>::max()));
  const Pair pair = refresh(frame_, login(frame_));
  EXPECT_TRUE(isGood(pair));
  EXPECT_EQ(pair.expires, kNow + 600);
  EXPECT_FALSE(grants().access.list({}).at(0).isDead);
  EXPECT_EQ(grants().room.purge().tokens, 0);
  EXPECT_TRUE(grants().tokens.introspect(frame_, AnyToken(pair.refresh->text())));
}

TEST_F(HostileRowsTest, APurgeWithANegativeGraceRemovesNothingThatLives) {
  const Code code = issue(frame_);
  const Pair pair = login(frame_);
  for (const long long grace : {-1000LL * kDay, std::numeric_limits<long long>::min(),
                                std::numeric_limits<long long>::max()}) {
    EXPECT_EQ(grants().room.purgeable(grace).codes, 0);
    const Purged purged = grants().room.purge(grace);
    EXPECT_EQ(purged.codes + purged.tokens, 0);
  }
  EXPECT_TRUE(isGood(pair));
  EXPECT_TRUE(grants().codes.redeem(redemption(frame_, code)));
}

TEST_F(HostileRowsTest, AnAddressesScopeIsAnInterfacesName) {
  for (const std::string& scope : {std::string(16, 'a'), std::string(100000, 'a')}) {
    CodeRequest asked = request(frame_);
    asked.from = PeerAddress("fe80::1%" + scope);
    EXPECT_EQ(whyOf(grants().codes.issue(asked)), Why::kBadPeer);
  }
}

// A trigger that rode along in a copy can let a change of a row come to nothing.
TEST_F(HostileRowsTest, AChangeThatSomethingSwallowsIsTroubleAndHandsOutNothing) {
  const Code code = issue(frame_);
  const Pair pair = login(frame_);
  for (const char* table : {"oauth_grantCode", "oauth_token", "oauth_clientInfo"}) {
    sql(std::string("CREATE TRIGGER swallow_") + table + " BEFORE UPDATE ON " + table +
        " BEGIN SELECT RAISE(IGNORE); END");
  }
  EXPECT_THROW(grants().codes.redeem(redemption(frame_, code)), Trouble);
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_token"), "1");
  EXPECT_THROW(grants().tokens.refresh({frame_, *pair.refresh}), Trouble);
  EXPECT_TRUE(isGood(pair));
  EXPECT_THROW(grants().applications.disable(frame_, Actor("root")), Trouble);
  EXPECT_THROW(grants().applications.renewSecret(frame_, Actor("root")), Trouble);
}

}  // namespace
}  // namespace grants_test
