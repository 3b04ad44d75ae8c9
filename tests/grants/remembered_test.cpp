// What a user agreed to before: looking it up, and codes for which nobody is
// asked, which end nothing of anybody's.

#include <utility>

#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;

class RememberedTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    other_ = add("Other").identifier;
  }
  bool hasLogin(const Scope& scope = kScope, const User& user = kAlice) {
    return grants().access.hasLogin(user, frame_, scope);
  }
  CodeRequest withoutPage(const User& user = kAlice) const {
    CodeRequest asked = request(frame_, user);
    asked.withoutPage = true;
    return asked;
  }
  Outcome<IssuedCode> issueWithoutPage(const User& user = kAlice) {
    return grants().codes.issue(withoutPage(user));
  }
  Outcome<Pair> redeem(const Code& code) { return grants().codes.redeem(redemption(frame_, code)); }
  std::vector<Pair> logIn(int times, const User& user = kAlice) {
    std::vector<Pair> pairs;
    for (int i = 0; i < times; ++i) {
      pairs.push_back(login(frame_, user));
      support::Clock::advance(1);
    }
    return pairs;
  }
  void expectGood(const std::vector<Pair>& pairs) {
    for (const Pair& pair : pairs) EXPECT_TRUE(isGood(pair));
  }
  static std::string liveCodes() {
    return sqlText("SELECT COUNT(*) FROM oauth_grantCode WHERE state LIKE 'c1%'");
  }

  ApplicationId frame_, other_;
};

// The look-up ---------------------------------------------------------------------

TEST_F(RememberedTest, ALoginCoversItsScopeAndLess) {
  login(frame_);
  EXPECT_TRUE(hasLogin());
  EXPECT_TRUE(hasLogin(Scope("profile")));
  EXPECT_TRUE(hasLogin(Scope("profile photos.read")));
  EXPECT_FALSE(hasLogin(Scope("profile photos.write")));
  EXPECT_FALSE(hasLogin(Scope("")));
}

TEST_F(RememberedTest, TwoLoginsDoNotCoverWhatNeitherDoes) {
  for (const char* scope : {"profile", "photos.read"}) {
    ASSERT_TRUE(grants().tokens.issue({kAlice, frame_, Scope(scope)}));
  }
  EXPECT_TRUE(hasLogin(Scope("photos.read")));
  EXPECT_FALSE(hasLogin());
}

TEST_F(RememberedTest, WhatALoginWasNarrowedToChangesNothing) {
  const Pair pair = login(frame_);
  ASSERT_TRUE(grants().tokens.refresh({frame_, *pair.refresh, Scope("profile")}));
  EXPECT_TRUE(hasLogin());
}

TEST_F(RememberedTest, OnlyTheUsersOwnWithThisApplicationCounts) {
  login(frame_, kBob);
  login(other_);
  EXPECT_FALSE(hasLogin());
  EXPECT_TRUE(hasLogin(kScope, kBob));
  EXPECT_FALSE(hasLogin(kScope, User(std::string("bob\0", 4))));
  EXPECT_FALSE(grants().access.hasLogin(kAlice, ApplicationId("short"), kScope));
}

TEST_F(RememberedTest, AQuoteInANameIsOne) {
  login(frame_, User("O'Brien"));
  EXPECT_TRUE(hasLogin(kScope, User("O'Brien")));
  EXPECT_FALSE(hasLogin(kScope, User("O''Brien")));
}

TEST_F(RememberedTest, CodesOwnTokensAndOtherProgramsRowsDoNotCount) {
  issue(frame_);
  ASSERT_TRUE(grants().tokens.issueToItself({frame_}));
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
      .Add("alice", frame_.text(), kScope.text(), "authorization_code", "state", "", out);
  EXPECT_FALSE(hasLogin());
  EXPECT_FALSE(hasLogin(kScope, User(kNoUser)));
}

TEST_F(RememberedTest, ALoginIsRememberedWhileItCanBeRefreshed) {
  const Pair pair = login(frame_);
  support::Clock::setTo(pair.expires + 30 * kDay);
  EXPECT_TRUE(hasLogin());
  support::Clock::advance(1);
  EXPECT_FALSE(hasLogin());
}

TEST_F(RememberedTest, ALoginWhoseYearIsOverIsForgotten) {
  Policy policy;
  policy.family = kHour;
  open(policy);
  login(frame_);
  support::Clock::advance(kHour);
  EXPECT_TRUE(hasLogin());
  support::Clock::advance(1);
  EXPECT_FALSE(hasLogin());
}

TEST_F(RememberedTest, WhatTheUserEndedIsForgotten) {
  login(frame_);
  grants().access.endUserWith(kAlice, frame_, Actor("alice"));
  EXPECT_FALSE(hasLogin());
}

// Codes without a page --------------------------------------------------------------

TEST_F(RememberedTest, ACodeWithoutAPageNeedsALogin) {
  const auto refused = issueWithoutPage();
  EXPECT_EQ(errorOf(refused), Error::kAccessDenied);
  EXPECT_EQ(whyOf(refused), Why::kNotRemembered);
  EXPECT_EQ(liveCodes(), "0");
  login(frame_);
  const auto issued = issueWithoutPage();
  ASSERT_TRUE(issued);
  const auto pair = redeem(issued->code);
  ASSERT_TRUE(pair);
  EXPECT_TRUE(isGood(*pair));
}

TEST_F(RememberedTest, ACodeWithoutAPageIsForWhatTheLoginCovers) {
  ASSERT_TRUE(grants().tokens.issue({kAlice, frame_, Scope("profile")}));
  EXPECT_EQ(whyOf(issueWithoutPage()), Why::kNotRemembered);
  CodeRequest less = withoutPage();
  less.scope = Scope("profile");
  EXPECT_TRUE(grants().codes.issue(less));
}

TEST_F(RememberedTest, TheOtherRulesOfCodesHold) {
  login(frame_);
  CodeRequest asked = withoutPage();
  asked.pkce.reset();
  EXPECT_EQ(whyOf(grants().codes.issue(asked)), Why::kNeedsPkce);
  grants().applications.disable(frame_, kAdmin);
  EXPECT_EQ(whyOf(issueWithoutPage()), Why::kDisabled);
}

TEST_F(RememberedTest, NoCodeThatWaitsGoesForOneWithoutAPage) {
  login(frame_);
  std::vector<Code> codes;
  for (int i = 0; i < 3; ++i) codes.push_back(issue(frame_));
  const auto refused = issueWithoutPage();
  EXPECT_EQ(errorOf(refused), Error::kAccessDenied);
  EXPECT_EQ(whyOf(refused), Why::kWouldEvict);
  for (const Code& code : codes) EXPECT_TRUE(redeem(code));
}

TEST_F(RememberedTest, ACodeThatExpiredMakesRoomForOneWithoutAPage) {
  login(frame_);
  for (int i = 0; i < 3; ++i) issue(frame_);
  support::Clock::advance(600);
  EXPECT_TRUE(issueWithoutPage());
}

TEST_F(RememberedTest, ACodeWithoutAPageIsRefusedWhenItsLoginWouldEndAnother) {
  const std::vector<Pair> pairs = logIn(8);
  EXPECT_EQ(whyOf(issueWithoutPage()), Why::kWouldEvict);
  EXPECT_EQ(liveCodes(), "0");
  expectGood(pairs);
}

TEST_F(RememberedTest, CodesThatWaitCountAsTheLoginsThatTheyWillBe) {
  logIn(6);
  const auto seventh = issueWithoutPage();
  const auto eighth = issueWithoutPage();
  ASSERT_TRUE(seventh && eighth);
  EXPECT_EQ(whyOf(issueWithoutPage()), Why::kWouldEvict);
  EXPECT_TRUE(redeem(seventh->code));
  EXPECT_TRUE(redeem(eighth->code));
}

TEST_F(RememberedTest, ACodeWithoutAPageEndsNothingWhenItIsRedeemed) {
  std::vector<Pair> pairs = logIn(7);
  const Code code = issueWithoutPage()->code;
  pairs.push_back(logIn(1)[0]);
  const auto refused = redeem(code);
  EXPECT_EQ(errorOf(refused), Error::kInvalidGrant);
  EXPECT_EQ(whyOf(refused), Why::kWouldEvict);
  expectGood(pairs);
  // It was not spent.
  grants().tokens.revoke(frame_, AnyToken(pairs[0].access.text()));
  EXPECT_TRUE(redeem(code));
}

TEST_F(RememberedTest, AUserWhoIsAskedMakesRoomAsBefore) {
  const std::vector<Pair> pairs = logIn(8);
  EXPECT_TRUE(isGood(login(frame_)));
  EXPECT_FALSE(isGood(pairs[0]));
}

TEST_F(RememberedTest, ABrowserThatIsMadeToAskForEverEndsNothing) {
  const std::vector<Pair> pairs = logIn(3);
  const Pair bob = login(frame_, kBob);
  int granted = 0;
  for (int i = 0; i < 100; ++i) {
    const auto issued = issueWithoutPage();
    if (issued && redeem(issued->code)) ++granted;
    support::Clock::advance(60);
  }
  EXPECT_EQ(granted, 5);  // up to eight logins
  for (const Pair& pair : pairs) EXPECT_TRUE(grants().tokens.refresh({frame_, *pair.refresh}));
  EXPECT_TRUE(grants().tokens.refresh({frame_, *bob.refresh}));
}

TEST_F(RememberedTest, TheSharesOfUserAndApplicationAreKeptWithoutEvicting) {
  writeSettings(R"({"token_max": 16})");
  logIn(1);
  for (int i = 0; i < 3; ++i) login(other_);  // a quarter of 16 are alice's
  EXPECT_EQ(whyOf(issueWithoutPage()), Why::kWouldEvict);
  logIn(1, kBob);
  EXPECT_TRUE(issueWithoutPage(kBob));
  for (const char* user : {"c", "d", "e", "f", "g", "h"}) login(frame_, User(user));
  EXPECT_EQ(whyOf(issueWithoutPage(kBob)), Why::kWouldEvict);  // half are the application's
}

TEST_F(RememberedTest, WhatWasRedeemedGivesWay) {
  writeSettings(R"({"grantcode_max": 16})");
  for (int i = 0; i < 4; ++i) {
    const Pair pair = login(frame_);  // leaves its spent code behind
    if (i > 0) grants().tokens.revoke(frame_, AnyToken(pair.access.text()));
    support::Clock::advance(1);
  }
  EXPECT_TRUE(issueWithoutPage());
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_grantCode"), "4");
}

TEST_F(RememberedTest, AFullTableIsFullWithoutAPage) {
  writeSettings(R"({"grantcode_max": 4})");
  login(frame_);
  const ApplicationId third = add("Third").identifier;
  for (const auto& [application, user] :
       {std::pair(other_, "b"), {other_, "c"}, {third, "d"}, {third, "e"}}) {
    issue(application, User(user));
  }
  EXPECT_THROW(issueWithoutPage(), Trouble);
}

}  // namespace
}  // namespace grants_test
