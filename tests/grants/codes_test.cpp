// Codes: issuing and redeeming them.

#include "grants/codes.h"

#include "grants/rows/digest.h"
#include "stores/oauth_grantCode.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class CodesTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
  }
  Outcome<IssuedCode> tryToIssue(const CodeRequest& request) {
    return grants().codes.issue(request);
  }
  Outcome<Pair> redeem(const Redemption& redemption) { return grants().codes.redeem(redemption); }
  Outcome<Pair> redeem(const Code& code) { return redeem(redemption(frame_, code)); }
  static std::string unspentCodes() {
    return sqlText("SELECT COUNT(*) FROM oauth_grantCode WHERE state LIKE 'c1%'");
  }

  ApplicationId frame_;
};

// Issuing -------------------------------------------------------------------------

TEST_F(CodesTest, ACodeIsGoodForTheSettingsTime) {
  writeSettings(R"({"grantcode_expired": 60})");
  const auto issued = tryToIssue(request(frame_));
  ASSERT_TRUE(issued);
  EXPECT_EQ(issued->expires, kNow + 60);
  EXPECT_EQ(issued->code.text().size(), 64U);
}

TEST_F(CodesTest, ACodeIsGoodForTheTimeThatIsAskedFor) {
  CodeRequest asked = request(frame_);
  asked.lifetime = 5;
  EXPECT_EQ(tryToIssue(asked)->expires, kNow + 5);
}

TEST_F(CodesTest, OnlyTheDigestOfACodeIsStored) {
  const Code code = issue(frame_);
  EXPECT_EQ(sqlText("SELECT code FROM oauth_grantCode"),
            KELDOAUTHSERVER::grants::rows::markOf(code.text()));
}

TEST_F(CodesTest, RequestsOutOfBoundsAreRefused) {
  const auto whyWith = [this](auto change) {
    CodeRequest asked = request(frame_);
    change(asked);
    const auto refused = tryToIssue(asked);
    EXPECT_EQ(errorOf(refused), Error::kInvalidRequest);
    return whyOf(refused);
  };
  EXPECT_EQ(whyWith([](auto& r) { r.user = User(""); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& r) { r.user = User(std::string(257, 'u')); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& r) { r.user = User(kNoUser); }), Why::kReservedUser);
  EXPECT_EQ(whyWith([](auto& r) { r.scope = Scope(""); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& r) { r.text = CallerText(std::string(513, 't')); }),
            Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& r) { r.pkce->challenge = Challenge(""); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& r) { r.from = PeerAddress("nowhere"); }), Why::kBadPeer);
  EXPECT_EQ(whyWith([](auto& r) { r.lifetime = 0; }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& r) { r.redirect = RedirectAddress("a:" + std::string(1900, 'x')); }),
            Why::kTooMuch);
}

TEST_F(CodesTest, WhatIsTooMuchIsKnownBeforeTheUserIsAsked) {
  CodeRequest asked = request(frame_);
  EXPECT_FALSE(Codes::faultOf(asked));
  asked.scope = Scope(std::string(1900, 's'));
  ASSERT_TRUE(Codes::faultOf(asked));
  EXPECT_EQ(Codes::faultOf(asked)->why, Why::kTooMuch);
}

TEST_F(CodesTest, TheApplicationMustBeThereAndEnabled) {
  EXPECT_EQ(whyOf(tryToIssue(request(ApplicationId(support::id64('x'))))), Why::kNoApplication);
  grants().applications.disable(frame_, kAdmin);
  EXPECT_EQ(errorOf(tryToIssue(request(frame_))), Error::kInvalidClient);
}

TEST_F(CodesTest, TheScopeIsWithinTheApplications) {
  CodeRequest asked = request(frame_);
  asked.scope = Scope("profile more");
  EXPECT_EQ(errorOf(tryToIssue(asked)), Error::kInvalidScope);
}

TEST_F(CodesTest, AChallengeIsNeededUnlessItIsWaived) {
  CodeRequest asked = request(frame_);
  asked.pkce.reset();
  EXPECT_EQ(whyOf(tryToIssue(asked)), Why::kNeedsPkce);
  asked.waivesPkce = true;
  EXPECT_TRUE(tryToIssue(asked));
}

TEST_F(CodesTest, AChallengeIsNotNeededWhereTheOwnerSaidSo) {
  ApplicationChange change;
  change.needsPkce = false;
  grants().applications.change(frame_, change, kAdmin);
  CodeRequest asked = request(frame_);
  asked.pkce.reset();
  const auto issued = tryToIssue(asked);
  ASSERT_TRUE(issued);
  EXPECT_TRUE(redeem({frame_, issued->code, kAddress}));
}

TEST_F(CodesTest, IssuingAndRedeemingLeaveNoEntry) {
  login(frame_);
  EXPECT_THAT(entries(), SizeIs(1));  // the registration's
}

// Redeeming -----------------------------------------------------------------------

TEST_F(CodesTest, ACodeGivesWhatWasAgreedTo) {
  writeSettings(R"({"token_expired": 60})");
  CodeRequest asked = request(frame_, User("O'Brien"));
  asked.text = CallerText("nonce='1'");
  const auto pair = redeem(tryToIssue(asked)->code);
  ASSERT_TRUE(pair);
  EXPECT_EQ(pair->user, User("O'Brien"));
  EXPECT_EQ(pair->scope, kScope);
  EXPECT_EQ(pair->text, asked.text);
  EXPECT_EQ(pair->issued, kNow);
  EXPECT_EQ(pair->expires, kNow + 60);
  EXPECT_TRUE(isGood(*pair));
}

TEST_F(CodesTest, ACodeIsRedeemedOnce) {
  const Code code = issue(frame_);
  EXPECT_TRUE(redeem(code));
  EXPECT_EQ(errorOf(redeem(code)), Error::kInvalidGrant);
}

TEST_F(CodesTest, AnUnknownCodeIsRefused) {
  EXPECT_EQ(whyOf(redeem(Code(support::id64('c')))), Why::kUnknown);
  EXPECT_EQ(whyOf(redeem(Code(""))), Why::kUnknown);
}

TEST_F(CodesTest, ACodeIsGoodBeforeItsExpiry) {
  CodeRequest asked = request(frame_);
  asked.lifetime = 5;
  const Code late = tryToIssue(asked)->code;
  const Code intime = tryToIssue(asked)->code;
  support::Clock::advance(4);
  EXPECT_TRUE(redeem(intime));
  support::Clock::advance(1);
  EXPECT_EQ(whyOf(redeem(late)), Why::kExpired);
}

TEST_F(CodesTest, ACodeIsForItsApplication) {
  const ApplicationId other = add("Other").identifier;
  const Code code = issue(frame_);
  EXPECT_EQ(whyOf(redeem(redemption(other, code))), Why::kOtherApplication);
  EXPECT_TRUE(redeem(code));
}

TEST_F(CodesTest, AWrongAddressOrVerifierSpendsNothing) {
  const Code code = issue(frame_);
  Redemption shown = redemption(frame_, code);
  shown.redirect = RedirectAddress("https://evil.example/");
  EXPECT_EQ(whyOf(redeem(shown)), Why::kWrongAddress);
  shown.redirect.reset();
  EXPECT_EQ(whyOf(redeem(shown)), Why::kWrongAddress);
  shown = redemption(frame_, code);
  shown.verifier = Verifier("wrong");
  EXPECT_EQ(whyOf(redeem(shown)), Why::kWrongVerifier);
  shown.verifier.reset();
  EXPECT_EQ(whyOf(redeem(shown)), Why::kWrongVerifier);
  EXPECT_EQ(unspentCodes(), "1");
  EXPECT_TRUE(redeem(code));
}

TEST_F(CodesTest, AnAddressThatWasImpliedNeedNotBeNamedButMayBe) {
  CodeRequest asked = request(frame_);
  asked.named = AddressNamed::kImplied;
  Redemption shown = redemption(frame_, tryToIssue(asked)->code);
  shown.redirect = RedirectAddress("https://evil.example/");
  EXPECT_EQ(whyOf(redeem(shown)), Why::kWrongAddress);
  shown.redirect.reset();
  EXPECT_TRUE(redeem(shown));
  EXPECT_TRUE(redeem(tryToIssue(asked)->code));
}

TEST_F(CodesTest, AVerifierWithoutAChallengeIsRefused) {
  CodeRequest asked = request(frame_);
  asked.pkce.reset();
  asked.waivesPkce = true;
  EXPECT_EQ(whyOf(redeem(tryToIssue(asked)->code)), Why::kWrongVerifier);
}

TEST_F(CodesTest, APlainChallengeIsItsVerifier) {
  CodeRequest asked = request(frame_);
  asked.pkce = Pkce{Challenge(kVerifier.text()), Pkce::Method::kPlain};
  EXPECT_TRUE(redeem(tryToIssue(asked)->code));
}

TEST_F(CodesTest, ADisabledApplicationRedeemsNothing) {
  const Code code = issue(frame_);
  grants().applications.disable(frame_, kAdmin);
  EXPECT_EQ(errorOf(redeem(code)), Error::kInvalidClient);
  grants().applications.enable(frame_, kAdmin);
  EXPECT_TRUE(redeem(code));
}

TEST_F(CodesTest, AnotherProgramsCodeIsNotRedeemed) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBGrantCode(names::kGrantCodeTable)
      .Add("alice", frame_.text(), "profile", "state", "", out);
  EXPECT_EQ(whyOf(redeem(Code(out[names::kCode].asString()))), Why::kForeign);
}

TEST_F(CodesTest, WhatIsStoredIsNoCode) {
  issue(frame_);
  EXPECT_EQ(whyOf(redeem(Code(sqlText("SELECT code FROM oauth_grantCode")))), Why::kUnknown);
}

TEST_F(CodesTest, AFullTableLeavesTheCodeGood) {
  writeSettings(R"({"token_max": 1})");
  Policy policy;
  policy.userPart = policy.applicationPart = 1;
  open(policy);
  const Code code = issue(frame_);
  login(add("Other").identifier, kBob);
  EXPECT_THROW(static_cast<void>(redeem(code)), Trouble);
  writeSettings("{}");
  EXPECT_TRUE(redeem(code));
}

// Codes that come again -------------------------------------------------------------

class SpentCodeTest : public CodesTest {
 protected:
  void SetUp() override {
    CodesTest::SetUp();
    code_ = issue(frame_);
    pair_ = *redeem(code_);
  }
  Code code_;
  Pair pair_;
};

TEST_F(SpentCodeTest, AtOnceIsAClientThatTriedTwice) {
  support::Clock::advance(9);
  EXPECT_EQ(whyOf(redeem(code_)), Why::kUsedBefore);
  EXPECT_TRUE(isGood(pair_));
}

TEST_F(SpentCodeTest, LaterEndsTheLogin) {
  support::Clock::advance(10);
  EXPECT_EQ(whyOf(redeem(code_)), Why::kReplayed);
  EXPECT_FALSE(isGood(pair_));
  EXPECT_FALSE(grants().tokens.refresh({frame_, *pair_.refresh}));
}

TEST_F(SpentCodeTest, RefreshingDoesNotMoveTheTime) {
  support::Clock::advance(9);
  const Pair next = refresh(frame_, pair_);
  support::Clock::advance(1);
  EXPECT_EQ(whyOf(redeem(code_)), Why::kReplayed);
  EXPECT_FALSE(isGood(next));
}

TEST_F(SpentCodeTest, AClockThatWasSetBackGivesNoGrace) {
  support::Clock::setTo(kNow - 1);
  EXPECT_EQ(whyOf(redeem(code_)), Why::kReplayed);
  EXPECT_FALSE(isGood(pair_));
}

TEST_F(SpentCodeTest, MonthsLaterStillEndsTheLogin) {
  Pair pair = pair_;
  for (int month = 0; month < 6; ++month) {
    support::Clock::advance(28 * kDay);
    grants().room.purge();
    pair = refresh(frame_, pair);
  }
  EXPECT_EQ(whyOf(redeem(code_)), Why::kReplayed);
  EXPECT_FALSE(isGood(pair));
}

TEST_F(SpentCodeTest, WithoutTheRightAddressAndVerifierEndsNothing) {
  support::Clock::advance(kHour / 100);
  Redemption shown = redemption(frame_, code_);
  shown.verifier = Verifier("wrong");
  EXPECT_EQ(whyOf(redeem(shown)), Why::kWrongVerifier);
  shown = redemption(frame_, code_);
  shown.redirect = RedirectAddress("https://evil.example/");
  EXPECT_EQ(whyOf(redeem(shown)), Why::kWrongAddress);
  EXPECT_EQ(whyOf(redeem(redemption(add("Other").identifier, code_))), Why::kOtherApplication);
  EXPECT_TRUE(isGood(pair_));
}

TEST_F(SpentCodeTest, AnotherLoginInTheSameRowIsLeftAlone) {
  grants().tokens.revoke(frame_, AnyToken(pair_.refresh->text()));
  const Pair next = login(frame_);
  support::Clock::advance(kHour / 100);
  EXPECT_EQ(whyOf(redeem(code_)), Why::kReplayed);
  EXPECT_TRUE(isGood(next));
}

TEST_F(SpentCodeTest, TheEndLeavesAnEntry) {
  support::Clock::advance(60);
  redeem(code_);
  EXPECT_EQ(entries().back(), "Access ended[Photo Frame " + frame_.text().substr(0, 8) +
                                  "] for [alice] after a replay");
}

}  // namespace
}  // namespace grants_test
