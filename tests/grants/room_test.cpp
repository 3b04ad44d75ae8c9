// How full the store is, and what is dead.

#include "grants/room.h"

#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;

class RoomTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
  }
  Room& room() { return grants().room; }

  ApplicationId frame_;
};

TEST_F(RoomTest, CountsRowsAndLimits) {
  writeSettings(R"({"client_info_max": 5, "grantcode_max": 60, "token_max": 7, "log_max": 8})");
  login(frame_);
  issue(frame_);
  const RoomCount count = room().count();
  EXPECT_EQ(count.applications.rows, 1);
  EXPECT_EQ(count.applications.most, 5);
  EXPECT_EQ(count.codes.rows, 2);
  EXPECT_EQ(count.codes.most, 60);
  EXPECT_EQ(count.spentCodes, 1);
  EXPECT_EQ(count.tokens.rows, 1);
  EXPECT_EQ(count.tokens.most, 7);
  EXPECT_EQ(count.log.rows, 1);
  EXPECT_EQ(count.log.most, 8);
  for (const auto& table : {count.applications, count.codes, count.tokens, count.log}) {
    EXPECT_EQ(table.dead, 0);
  }
}

TEST_F(RoomTest, ALoginIsDeadWhenNobodyCanRefreshIt) {
  login(frame_);
  support::Clock::advance(600 + 30 * kDay);
  EXPECT_EQ(room().purge().tokens, 0);
  support::Clock::advance(1);
  EXPECT_EQ(room().count().tokens.dead, 1);
  EXPECT_EQ(room().purge().tokens, 1);
}

TEST_F(RoomTest, AnOwnTokenIsDeadWhenItHasExpired) {
  grants().tokens.issueToItself({frame_});
  support::Clock::advance(600);
  EXPECT_EQ(room().purge().tokens, 0);
  support::Clock::advance(1);
  EXPECT_EQ(room().purge().tokens, 1);
}

TEST_F(RoomTest, ACodeIsDeadFromItsExpiryOn) {
  issue(frame_);
  support::Clock::advance(599);
  EXPECT_EQ(room().purge().codes, 0);
  support::Clock::advance(1);
  EXPECT_EQ(room().purge().codes, 1);
}

TEST_F(RoomTest, ASpentCodeIsDeadWhenItsLoginMustEnd) {
  login(frame_);
  support::Clock::setTo(kNow + 365 * kDay - 1);
  EXPECT_EQ(room().purge().codes, 0);
  support::Clock::advance(1);
  EXPECT_EQ(room().purge().codes, 1);
}

TEST_F(RoomTest, WhatDiedAMomentAgoCanBeKept) {
  issue(frame_);
  support::Clock::advance(600 + kHour);
  EXPECT_EQ(room().purgeable(kHour + 1).codes, 0);
  EXPECT_EQ(room().purge(kHour + 1).codes, 0);
  EXPECT_EQ(room().purgeable(kHour).codes, 1);
  EXPECT_EQ(room().purge(kHour).codes, 1);
}

TEST_F(RoomTest, OneTableCanBePurgedAlone) {
  issue(frame_);
  login(frame_);
  support::Clock::advance(600 + 31 * kDay);
  EXPECT_EQ(room().purgeable(0, Rows::kTokens).codes, 0);
  const Purged tokens = room().purge(0, Rows::kTokens);
  EXPECT_EQ(tokens.codes, 0);
  EXPECT_EQ(tokens.tokens, 1);
  EXPECT_EQ(room().purge(0, Rows::kCodes).codes, 1);
}

TEST_F(RoomTest, AnotherProgramsLoginIsKeptAsLong) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
      .Add("alice", frame_.text(), "profile", "password", "state", "", out);
  support::Clock::advance(600 + 30 * kDay);
  EXPECT_EQ(room().purge().tokens, 0);
}

TEST_F(RoomTest, PurgingLeavesNoEntry) {
  issue(frame_);
  support::Clock::advance(kDay);
  room().purge();
  EXPECT_EQ(entries().size(), 1U);
}

}  // namespace
}  // namespace grants_test
