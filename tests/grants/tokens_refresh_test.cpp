// Refreshing a login, and refresh tokens that come again.

#include "grants/rows/digest.h"
#include "grants/rows/refresh_text.h"
#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;
namespace rows = KELDOAUTHSERVER::grants::rows;

class RefreshTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    pair_ = login(frame_);
  }
  Outcome<Pair> show(const RefreshToken& token) { return grants().tokens.refresh({frame_, token}); }
  Outcome<Pair> show(const Pair& pair) { return show(*pair.refresh); }

  ApplicationId frame_;
  Pair pair_;
};

TEST_F(RefreshTest, AnotherPairTakesThePlaceOfTheOld) {
  support::Clock::advance(60);
  const auto next = show(pair_);
  ASSERT_TRUE(next);
  EXPECT_NE(next->access, pair_.access);
  EXPECT_NE(*next->refresh, *pair_.refresh);
  EXPECT_EQ(next->user, kAlice);
  EXPECT_EQ(next->scope, kScope);
  EXPECT_EQ(next->issued, kNow + 60);
  EXPECT_EQ(next->expires, kNow + 60 + 600);
  EXPECT_FALSE(isGood(pair_));
  EXPECT_TRUE(isGood(*next));
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_token"), "1");
}

TEST_F(RefreshTest, ItsRowIsFoundByKey) {
  EXPECT_EQ(std::to_string(rows::read(pair_.refresh->text())->row),
            sqlText("SELECT id FROM oauth_token"));
}

TEST_F(RefreshTest, NeedsNoRoom) {
  writeSettings(R"({"token_max": 1})");
  EXPECT_TRUE(show(pair_));
}

TEST_F(RefreshTest, TheScopeCanBeNarrowedAndWidenedAgain) {
  const auto narrow = grants().tokens.refresh({frame_, *pair_.refresh, Scope("profile")});
  ASSERT_TRUE(narrow);
  EXPECT_EQ(narrow->scope, Scope("profile"));
  EXPECT_EQ(grants().tokens.verify(narrow->access)->scope, Scope("profile"));
  const auto other = grants().tokens.refresh({frame_, *narrow->refresh, Scope("photos.read")});
  ASSERT_TRUE(other);
  EXPECT_EQ(show(*other)->scope, kScope);
}

TEST_F(RefreshTest, AWiderScopeIsRefusedAndTheTokenStaysGood) {
  EXPECT_EQ(errorOf(grants().tokens.refresh({frame_, *pair_.refresh, Scope("profile more")})),
            Error::kInvalidScope);
  EXPECT_EQ(errorOf(grants().tokens.refresh({frame_, *pair_.refresh, Scope("")})),
            Error::kInvalidRequest);
  EXPECT_TRUE(show(pair_));
}

TEST_F(RefreshTest, ALoginThatNobodyUsesEnds) {
  support::Clock::advance(600 + 30 * kDay);
  const Pair next = *show(pair_);
  support::Clock::advance(600 + 30 * kDay + 1);
  EXPECT_EQ(whyOf(show(next)), Why::kExpired);
}

TEST_F(RefreshTest, ALoginEndsAYearAfterItsCode) {
  Pair pair = pair_;
  for (int month = 0; month < 13; ++month) {
    support::Clock::advance(28 * kDay);
    pair = refresh(frame_, pair);
  }
  support::Clock::setTo(kNow + 365 * kDay);
  pair = refresh(frame_, pair);
  EXPECT_EQ(pair.expires, kNow + 365 * kDay);
  support::Clock::advance(1);
  EXPECT_EQ(whyOf(show(pair)), Why::kExpired);
  EXPECT_FALSE(isGood(pair));
}

TEST_F(RefreshTest, AnAddressIsKeptUntilAnotherComes) {
  ASSERT_TRUE(grants().tokens.refresh({frame_, *pair_.refresh, {}, PeerAddress("192.0.2.7")}));
  EXPECT_EQ(sqlText("SELECT ip FROM oauth_token"), "192.0.2.7");
}

TEST_F(RefreshTest, AnotherApplicationsTokenIsRefusedAndStays) {
  const ApplicationId other = add("Other").identifier;
  support::Clock::advance(kHour);
  EXPECT_EQ(whyOf(grants().tokens.refresh({other, *pair_.refresh})), Why::kOtherApplication);
  EXPECT_TRUE(show(pair_));
}

TEST_F(RefreshTest, ADisabledOrRemovedApplicationRefreshesNothing) {
  grants().applications.disable(frame_, kAdmin);
  EXPECT_EQ(whyOf(show(pair_)), Why::kDisabled);
  grants().applications.remove(frame_, kAdmin);
  EXPECT_EQ(whyOf(show(pair_)), Why::kNoApplication);
}

TEST_F(RefreshTest, WhatIsStoredIsNoRefreshToken) {
  EXPECT_EQ(whyOf(show(RefreshToken(sqlText("SELECT refresh_token FROM oauth_token")))),
            Why::kUnknown);
}

TEST_F(RefreshTest, AnotherProgramsTokenIsNotRefreshed) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
      .Add("alice", frame_.text(), "profile", "authorization_code", "state", "", out);
  EXPECT_EQ(whyOf(show(RefreshToken(out[names::kRefreshToken].asString()))), Why::kForeign);
}

TEST_F(RefreshTest, ALoginWithoutACodeIsRefreshedAlike) {
  const auto pair = grants().tokens.issue({kBob, frame_, kScope, CallerText("t"), {}, 5});
  ASSERT_TRUE(pair);
  EXPECT_EQ(pair->expires, kNow + 5);
  const auto next = show(*pair);
  ASSERT_TRUE(next);
  EXPECT_EQ(next->user, kBob);
  EXPECT_EQ(next->text, CallerText("t"));
}

// Tokens that come again --------------------------------------------------------------

TEST_F(RefreshTest, TheTokenBeforeAtOnceIsAClientThatTriedTwice) {
  const Pair next = *show(pair_);
  support::Clock::advance(9);
  EXPECT_EQ(whyOf(show(pair_)), Why::kUsedBefore);
  EXPECT_TRUE(isGood(next));
  EXPECT_TRUE(show(next));
}

TEST_F(RefreshTest, TheTokenBeforeLaterEndsTheLogin) {
  const Pair next = *show(pair_);
  support::Clock::advance(10);
  EXPECT_EQ(whyOf(show(pair_)), Why::kReplayed);
  EXPECT_FALSE(isGood(next));
  EXPECT_EQ(whyOf(show(next)), Why::kUnknown);
}

TEST_F(RefreshTest, AThiefWhoRefreshesAllTheTimeIsFoundOut) {
  Pair stolen = *show(pair_);
  for (int i = 0; i < 3; ++i) {
    support::Clock::advance(7);
    stolen = *show(stolen);
  }
  EXPECT_EQ(whyOf(show(pair_)), Why::kReplayed);
  EXPECT_FALSE(isGood(stolen));
}

TEST_F(RefreshTest, ATokenBeforeTheLastEndsTheLoginAtOnce) {
  const Pair last = *show(*show(pair_));
  EXPECT_EQ(whyOf(show(pair_)), Why::kReplayed);
  EXPECT_FALSE(isGood(last));
}

TEST_F(RefreshTest, AClockThatWasSetBackGivesNoGrace) {
  const Pair next = *show(pair_);
  support::Clock::setTo(kNow - 1);
  EXPECT_EQ(whyOf(show(pair_)), Why::kReplayed);
  EXPECT_FALSE(isGood(next));
}

TEST_F(RefreshTest, AnInventedSecretOfTheFamilyEndsTheLogin) {
  const RefreshToken invented(rows::write(rows::nextOf(*rows::read(pair_.refresh->text()))));
  EXPECT_EQ(whyOf(show(invented)), Why::kReplayed);
  EXPECT_FALSE(isGood(pair_));
}

TEST_F(RefreshTest, AnInventedFamilyEndsNothing) {
  const long long row = rows::read(pair_.refresh->text())->row;
  EXPECT_EQ(whyOf(show(RefreshToken(rows::write(rows::firstOf(row))))), Why::kUnknown);
  EXPECT_TRUE(isGood(pair_));
}

TEST_F(RefreshTest, AMangledTokenEndsNothing) {
  std::string mangled = rows::write(rows::nextOf(*rows::read(pair_.refresh->text())));
  mangled.back() = mangled.back() == '0' ? '1' : '0';
  EXPECT_EQ(whyOf(show(RefreshToken(mangled))), Why::kUnknown);
  EXPECT_TRUE(isGood(pair_));
}

TEST_F(RefreshTest, AnotherApplicationCannotEndTheLogin) {
  const Pair next = *show(pair_);
  support::Clock::advance(kHour / 100);
  const ApplicationId other = add("Other").identifier;
  EXPECT_EQ(whyOf(grants().tokens.refresh({other, *pair_.refresh})), Why::kOtherApplication);
  EXPECT_TRUE(isGood(next));
}

TEST_F(RefreshTest, AnEndedLoginsRowNumberHarmsNobody) {
  grants().tokens.revoke(frame_, AnyToken(pair_.access.text()));
  const Pair next = login(frame_, kBob);
  ASSERT_EQ(rows::read(next.refresh->text())->row, rows::read(pair_.refresh->text())->row);
  EXPECT_EQ(whyOf(show(pair_)), Why::kUnknown);
  EXPECT_TRUE(isGood(next));
}

TEST_F(RefreshTest, TheEndLeavesAnEntry) {
  show(*show(pair_));
  show(pair_);
  EXPECT_EQ(entries().back(), "Access ended[Photo Frame " + frame_.text().substr(0, 8) +
                                  "] for [alice] after a replay");
}

}  // namespace
}  // namespace grants_test
