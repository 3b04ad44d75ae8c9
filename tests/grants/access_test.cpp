// Who has access to what, and ending it.

#include "grants/access.h"

#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using Kind = AccessEntry::Kind;

class AccessTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    other_ = add("Other").identifier;
  }
  Access& access() { return grants().access; }
  std::vector<AccessEntry> all() { return access().list({}); }
  std::vector<AccessEntry> of(const User& user) { return access().list({user}); }
  std::string brief() const { return frame_.text().substr(0, 8); }

  Pair ownToken() { return *grants().tokens.issueToItself({frame_}); }
  AccessToken foreign(const std::string& user, const std::string& flow = "password") {
    Json::Value out;
    KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
        .Add(user, frame_.text(), "profile", flow, "their state", "192.0.2.1", out);
    return AccessToken(out[names::kAccessToken].asString());
  }

  ApplicationId frame_, other_;
};

// Listing -------------------------------------------------------------------------

TEST_F(AccessTest, ALoginTellsWhatTheUserWantsToKnow) {
  CodeRequest asked = request(frame_);
  asked.text = CallerText("device: 'phone'");
  const Code code = grants().codes.issue(asked)->code;
  support::Clock::advance(5);
  Redemption shown = redemption(frame_, code);
  shown.from = PeerAddress("192.0.2.1");
  const Pair pair = *grants().codes.redeem(shown);
  support::Clock::advance(60);
  grants().tokens.refresh({frame_, *pair.refresh, Scope("profile"), PeerAddress("192.0.2.2")});

  const std::vector<AccessEntry> entries = of(kAlice);
  ASSERT_THAT(entries, SizeIs(1));
  const AccessEntry& entry = entries[0];
  EXPECT_EQ(entry.kind, Kind::kLogin);
  EXPECT_EQ(entry.user, kAlice);
  EXPECT_EQ(entry.application, frame_);
  EXPECT_EQ(entry.applicationName, ApplicationName("Photo Frame"));
  EXPECT_EQ(entry.scope, kScope);  // of the login, however narrow the token
  EXPECT_EQ(entry.since, kNow);
  EXPECT_EQ(entry.renewed, kNow + 65);
  EXPECT_EQ(entry.expires, kNow + 65 + 600);
  EXPECT_EQ(entry.ends, kNow + 65 + 600 + 30 * kDay);
  EXPECT_EQ(entry.from, PeerAddress("192.0.2.2"));
  EXPECT_EQ(entry.text, asked.text);
  EXPECT_FALSE(entry.isDead);
  EXPECT_FALSE(entry.isForeign);
}

TEST_F(AccessTest, ALoginEndsWithItsFamilyAtTheLatest) {
  Policy policy;
  policy.family = kDay;
  open(policy);
  login(frame_);
  EXPECT_EQ(all()[0].ends, kNow + kDay);
}

TEST_F(AccessTest, APolicyOfMoreThanAHundredYearsIsOneOfAHundred) {
  constexpr long long kHundredYears = 100 * 365 * kDay;
  for (const long long asked : {kHundredYears, kHundredYears + 1}) {
    Policy policy;
    policy.family = asked;
    policy.idle = 2 * kHundredYears;
    open(policy);
    login(frame_);
    EXPECT_EQ(all().back().ends, kNow + kHundredYears) << asked;
  }
}

TEST_F(AccessTest, CodesComeFirstAndSpentOnesOnlyWhenAskedFor) {
  login(frame_);
  issue(frame_);
  const auto kindsOf = [](const std::vector<AccessEntry>& entries) {
    std::vector<Kind> kinds;
    for (const AccessEntry& entry : entries) kinds.push_back(entry.kind);
    return kinds;
  };
  EXPECT_THAT(kindsOf(all()), ElementsAre(Kind::kCode, Kind::kLogin));
  AccessFilter filter;
  filter.withSpent = true;
  EXPECT_THAT(kindsOf(access().list(filter)), ElementsAre(Kind::kSpent, Kind::kCode, Kind::kLogin));
}

TEST_F(AccessTest, WhatIsDeadIsListedOnlyWhenAskedFor) {
  issue(frame_);
  login(frame_, kBob);
  support::Clock::advance(601 + 30 * kDay);
  EXPECT_THAT(all(), IsEmpty());
  AccessFilter filter;
  filter.withDead = true;
  EXPECT_THAT(access().list(filter), SizeIs(2));
  EXPECT_TRUE(access().list(filter)[0].isDead);
}

TEST_F(AccessTest, AUsersListNeverHasAnApplicationsOwn) {
  ownToken();
  login(frame_);
  EXPECT_THAT(of(kAlice), SizeIs(1));
  EXPECT_THAT(of(User(kNoUser)), IsEmpty());
  EXPECT_THAT(access().list({{}, frame_}), SizeIs(2));
  EXPECT_FALSE(access().list({{}, frame_})[1].user && access().list({{}, frame_})[0].user);
}

TEST_F(AccessTest, AFilterNarrows) {
  login(frame_);
  login(other_);
  login(frame_, kBob);
  EXPECT_THAT(all(), SizeIs(3));
  EXPECT_THAT(of(kAlice), SizeIs(2));
  EXPECT_THAT(access().list({kAlice, other_}), SizeIs(1));
  EXPECT_THAT(of(User("nobody")), IsEmpty());
  EXPECT_THAT(of(User(std::string("alice\0", 6))), IsEmpty());
}

TEST_F(AccessTest, ARemovedApplicationHasNoName) {
  login(frame_);
  sql("DELETE FROM oauth_clientInfo");
  EXPECT_FALSE(all()[0].applicationName);
  EXPECT_EQ(all()[0].application, frame_);
}

TEST_F(AccessTest, OtherProgramsRowsAreListed) {
  foreign("O'Brien");
  const std::vector<AccessEntry> entries = of(User("O'Brien"));
  ASSERT_THAT(entries, SizeIs(1));
  EXPECT_TRUE(entries[0].isForeign);
  EXPECT_EQ(entries[0].text, CallerText("their state"));
  EXPECT_EQ(entries[0].flow, "password");
  EXPECT_EQ(entries[0].since, 0);
  EXPECT_EQ(entries[0].ends, kNow + 600 + 30 * kDay);
}

TEST_F(AccessTest, ACodeTellsWhatItIsFor) {
  CodeRequest asked = request(frame_);
  asked.text = CallerText("device: 'phone'");
  ASSERT_TRUE(grants().codes.issue(asked));
  const std::vector<AccessEntry> entries = of(kAlice);
  ASSERT_THAT(entries, SizeIs(1));
  EXPECT_EQ(entries[0].kind, Kind::kCode);
  EXPECT_EQ(entries[0].application, frame_);
  EXPECT_EQ(entries[0].applicationName, ApplicationName("Photo Frame"));
  EXPECT_EQ(entries[0].scope, kScope);
  EXPECT_EQ(entries[0].text, asked.text);
  EXPECT_EQ(entries[0].since, kNow);
  EXPECT_EQ(entries[0].renewed, kNow);
  EXPECT_FALSE(entries[0].isDead);
  EXPECT_FALSE(entries[0].isForeign);
}

TEST_F(AccessTest, OtherProgramsCodesAreListed) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBGrantCode(names::kGrantCodeTable)
      .Add("O'Brien", frame_.text(), "profile", "their state", "192.0.2.1", out);
  const std::vector<AccessEntry> entries = of(User("O'Brien"));
  ASSERT_THAT(entries, SizeIs(1));
  EXPECT_EQ(entries[0].kind, Kind::kCode);
  EXPECT_TRUE(entries[0].isForeign);
  EXPECT_EQ(entries[0].text, CallerText("their state"));
  EXPECT_EQ(entries[0].since, 0);
}

TEST_F(AccessTest, ACodeOrTokenIsFoundByItsText) {
  const Code code = issue(frame_);
  const Pair pair = login(frame_, kBob);
  EXPECT_EQ(access().find(code)->user, kAlice);
  EXPECT_EQ(access().find(AnyToken(pair.access.text()))->user, kBob);
  EXPECT_EQ(access().find(AnyToken(pair.refresh->text()))->user, kBob);
  EXPECT_FALSE(access().find(Code("x")));
  EXPECT_FALSE(access().find(AnyToken("x")));
}

TEST_F(AccessTest, ARowThatCannotBeDecryptedIsTrouble) {
  const Code code = issue(frame_);
  const Pair pair = login(frame_);
  support::Platform::failDecryptFrom(1);
  EXPECT_THROW(access().find(code), Trouble);
  EXPECT_THROW(access().find(AnyToken(pair.access.text())), Trouble);
  support::Platform::release();
  EXPECT_TRUE(access().find(code));
}

TEST_F(AccessTest, WhatEndsOfARemovedApplicationIsNotedWithoutAName) {
  login(frame_);
  sql("DELETE FROM oauth_clientInfo");
  EXPECT_EQ(access().endUserWith(kAlice, frame_, kAdmin).tokens, 1);
  EXPECT_EQ(entries().back(), "Access ended[removed " + brief() + "] for [alice] by [admin]");
}

// Ending one ------------------------------------------------------------------------

TEST_F(AccessTest, AHandleEndsWhatItNamed) {
  const Pair pair = login(frame_);
  const Pair kept = login(frame_);
  const Ended ended = access().end(all()[0].handle, kAdmin);
  EXPECT_EQ(ended.tokens, 1);
  EXPECT_FALSE(isGood(pair));
  EXPECT_TRUE(isGood(kept));
  EXPECT_EQ(entries().back(), "Access ended[Photo Frame " + brief() + "] for [alice] by [admin]");
}

TEST_F(AccessTest, AHandleEndsALoginThatWasRefreshedMeanwhile) {
  const Pair pair = login(frame_);
  const AccessHandle handle = all()[0].handle;
  const Pair next = refresh(frame_, pair);
  EXPECT_EQ(access().end(handle, kAdmin).tokens, 1);
  EXPECT_FALSE(isGood(next));
}

TEST_F(AccessTest, AHandleEndsNobodyElsesLogin) {
  login(frame_);
  const AccessHandle handle = all()[0].handle;
  access().end(handle, kAdmin);
  const Pair bobs = login(frame_, kBob);
  ASSERT_EQ(all()[0].handle.row, handle.row);
  EXPECT_EQ(access().end(handle, kAdmin).tokens, 0);
  EXPECT_TRUE(isGood(bobs));
}

TEST_F(AccessTest, ACodeIsEndedByItsHandle) {
  const Code code = issue(frame_);
  EXPECT_EQ(access().end(all()[0].handle, kAdmin).codes, 1);
  EXPECT_EQ(whyOf(grants().codes.redeem(redemption(frame_, code))), Why::kUnknown);
}

TEST_F(AccessTest, SeveralHandlesAreOneTransaction) {
  login(frame_);
  login(other_, kBob);
  std::vector<AccessHandle> handles;
  for (const AccessEntry& entry : all()) handles.push_back(entry.handle);
  sql("CREATE TRIGGER refuse BEFORE INSERT ON oauth_log BEGIN SELECT RAISE(ABORT, 'no'); END;");
  EXPECT_THROW(access().end(handles, kAdmin), Trouble);
  EXPECT_THAT(all(), SizeIs(2));
  sql("DROP TRIGGER refuse");
  EXPECT_EQ(access().end(handles, kAdmin).tokens, 2);
  EXPECT_THAT(all(), IsEmpty());
}

TEST_F(AccessTest, ManyHandlesDoNotWashTheLogOut) {
  std::vector<AccessHandle> handles;
  for (int i = 0; i < 40; ++i) login(frame_, User("user" + std::to_string(i)));
  for (const AccessEntry& entry : all()) handles.push_back(entry.handle);
  EXPECT_EQ(access().end(handles, kAdmin).tokens, 40);
  EXPECT_EQ(entries().size(), 2U + 17U);  // registrations, subjects and the rest
  EXPECT_EQ(entries().back(), "Access ended of 24 more by [admin]");
}

// Ending all ------------------------------------------------------------------------

TEST_F(AccessTest, AUsersCodesAndLoginsEndTogether) {
  const Code code = issue(frame_);
  const Pair pair = login(other_);
  const Pair bobs = login(frame_, kBob);
  const Ended ended = access().endUser(kAlice, kAdmin);
  EXPECT_EQ(ended.codes, 1);
  EXPECT_EQ(ended.tokens, 1);
  EXPECT_FALSE(isGood(pair));
  EXPECT_FALSE(grants().codes.redeem(redemption(frame_, code)));
  EXPECT_TRUE(isGood(bobs));
  EXPECT_EQ(entries().back(), "All access ended for [alice] by [admin]");
}

TEST_F(AccessTest, AUsersCodesEndAlone) {
  issue(frame_);
  const Pair pair = login(frame_);
  const Ended ended = access().endUser(kAlice, kAdmin, Rows::kCodes);
  EXPECT_EQ(ended.codes, 1);
  EXPECT_EQ(ended.tokens, 0);
  EXPECT_TRUE(isGood(pair));
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_grantCode WHERE state LIKE 's1%'"), "1");
  EXPECT_EQ(entries().back(), "All codes ended for [alice] by [admin]");
}

TEST_F(AccessTest, AUsersLoginsWithAnApplicationEndAlone) {
  const Code code = issue(frame_);
  const Pair pair = login(frame_);
  EXPECT_EQ(access().endUserWith(kAlice, frame_, kAdmin, Rows::kTokens).tokens, 1);
  EXPECT_FALSE(isGood(pair));
  EXPECT_TRUE(grants().codes.redeem(redemption(frame_, code)));
  EXPECT_EQ(entries().back(), "Tokens ended[Photo Frame " + brief() + "] for [alice] by [admin]");
}

TEST_F(AccessTest, CodesOfAllEndAlone) {
  issue(frame_);
  issue(other_, kBob);
  const Pair pair = login(other_);
  EXPECT_EQ(access().endApplication(frame_, kAdmin, Rows::kCodes).codes, 1);
  EXPECT_EQ(access().endEverything(kAdmin, Rows::kCodes).codes, 1);
  EXPECT_TRUE(isGood(pair));
}

TEST_F(AccessTest, BothSpellingsOfAUserEnd) {
  const User brien("O'Brien");
  const Pair ours = login(frame_, brien);
  const AccessToken doubled = foreign("O'Brien");
  const AccessToken asGiven = foreign("x");
  sql("UPDATE oauth_token SET username='O''Brien' WHERE username='x'");
  ASSERT_THAT(of(brien), SizeIs(3));
  EXPECT_EQ(access().endUser(brien, kAdmin).tokens, 3);
  EXPECT_FALSE(isGood(ours) || isGood(doubled) || isGood(asGiven));
}

TEST_F(AccessTest, AUserWhoseNameIsAnothersSpellingIsAnother) {
  const Pair brien = login(frame_, User("O'Brien"));
  const Pair odd = login(frame_, User("O''Brien"));
  EXPECT_EQ(access().endUser(User("O''Brien"), kAdmin).tokens, 1);
  EXPECT_TRUE(isGood(brien));
  EXPECT_FALSE(isGood(odd));
}

TEST_F(AccessTest, AUserKeepsOtherApplications) {
  const Pair pair = login(frame_);
  const Pair kept = login(other_);
  EXPECT_EQ(access().endUserWith(kAlice, frame_, kAdmin).tokens, 1);
  EXPECT_FALSE(isGood(pair));
  EXPECT_TRUE(isGood(kept));
}

TEST_F(AccessTest, AnApplicationsAccessEndsAndItStays) {
  login(frame_);
  issue(frame_);
  const Pair own = ownToken();
  const Pair kept = login(other_);
  const Ended ended = access().endApplication(frame_, kAdmin);
  EXPECT_EQ(ended.codes, 1);
  EXPECT_EQ(ended.tokens, 2);
  EXPECT_FALSE(isGood(own));
  EXPECT_TRUE(isGood(kept));
  EXPECT_TRUE(grants().applications.find(frame_));
  EXPECT_EQ(entries().back(), "All access ended[Photo Frame " + brief() + "] by [admin]");
}

TEST_F(AccessTest, EverythingEnds) {
  login(frame_);
  login(other_, kBob);
  issue(frame_);
  ownToken();
  foreign("x");
  const Ended ended = access().endEverything(kAdmin);
  EXPECT_EQ(ended.codes, 1);
  EXPECT_EQ(ended.tokens, 4);
  EXPECT_THAT(all(), IsEmpty());
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_grantCode"), "0");
}

TEST_F(AccessTest, AUserWhomTheStoreCannotHoldHasNothingToEnd) {
  login(frame_);
  const User impossible(std::string("alice\0", 6));
  for (const Ended& ended :
       {access().endUser(impossible, kAdmin), access().endUserWith(impossible, frame_, kAdmin)}) {
    EXPECT_EQ(ended.codes, 0);
    EXPECT_EQ(ended.tokens, 0);
  }
  EXPECT_THAT(entries(), SizeIs(2));
}

TEST_F(AccessTest, NothingToEndLeavesNoEntry) {
  EXPECT_EQ(access().endUser(kAlice, kAdmin).tokens, 0);
  EXPECT_EQ(access().endApplication(ApplicationId(support::id64('x')), kAdmin).codes, 0);
  EXPECT_EQ(access().end(AccessHandle{AccessHandle::Table::kTokens, 1, "x"}, kAdmin).tokens, 0);
  EXPECT_THAT(entries(), SizeIs(2));
}

}  // namespace
}  // namespace grants_test
