// Verifying, introspecting, revoking, and applications that act for themselves.

#include "grants/tokens.h"

#include "stores/oauth_token.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;

class TokensTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    other_ = add("Other").identifier;
    pair_ = login(frame_);
  }
  Outcome<Bearer> verify(const AccessToken& token) { return grants().tokens.verify(token); }
  std::optional<Introspection> introspect(const ApplicationId& asking, const std::string& text) {
    return grants().tokens.introspect(asking, AnyToken(text));
  }
  Outcome<Revoked> revoke(const std::string& text) {
    return grants().tokens.revoke(frame_, AnyToken(text));
  }
  Outcome<Pair> own(const ApplicationId& application, const std::optional<Scope>& scope = {}) {
    return grants().tokens.issueToItself({application, scope});
  }
  /// A pair that another program stored in the clear.
  Json::Value foreign(const std::string& user = "O'Brien") {
    Json::Value out;
    KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
        .Add(user, frame_.text(), "it's", "password", "state", "", out);
    return out;
  }

  ApplicationId frame_, other_;
  Pair pair_;
};

// Verifying -----------------------------------------------------------------------

TEST_F(TokensTest, ABearerIsWhoeverLoggedIn) {
  const auto bearer = verify(pair_.access);
  ASSERT_TRUE(bearer);
  EXPECT_EQ(bearer->user, kAlice);
  EXPECT_EQ(bearer->scope, kScope);
  EXPECT_EQ(bearer->application, frame_);
  EXPECT_EQ(bearer->applicationName, ApplicationName("Photo Frame"));
  EXPECT_EQ(bearer->issued, kNow);
  EXPECT_EQ(bearer->expires, kNow + 600);
}

TEST_F(TokensTest, ATokenIsGoodUntilItsExpiryIncluded) {
  support::Clock::advance(600);
  EXPECT_TRUE(verify(pair_.access));
  support::Clock::advance(1);
  EXPECT_EQ(whyOf(verify(pair_.access)), Why::kExpired);
  EXPECT_EQ(errorOf(verify(pair_.access)), Error::kInvalidToken);
}

TEST_F(TokensTest, UnknownTokensAreRefused) {
  for (const std::string& text : {std::string(), std::string("x"), support::id64('x'),
                                  std::string(5000, 'x'), pair_.refresh->text()}) {
    EXPECT_EQ(whyOf(verify(AccessToken(text))), Why::kUnknown);
  }
}

TEST_F(TokensTest, WhatIsStoredIsNoToken) {
  for (const char* column : {"access_token", "refresh_token"}) {
    const std::string stored = sqlText("SELECT " + std::string(column) + " FROM oauth_token");
    EXPECT_EQ(whyOf(verify(AccessToken(stored))), Why::kUnknown);
    EXPECT_FALSE(introspect(frame_, stored));
    EXPECT_FALSE(revoke(stored)->wasThere);
  }
  EXPECT_TRUE(isGood(pair_));
}

TEST_F(TokensTest, ADisabledOrRemovedApplicationsTokenIsRefused) {
  grants().applications.disable(frame_, kAdmin);
  EXPECT_EQ(whyOf(verify(pair_.access)), Why::kDisabled);
  sql("DELETE FROM oauth_clientInfo");
  EXPECT_EQ(whyOf(verify(pair_.access)), Why::kNoApplication);
}

TEST_F(TokensTest, AnotherProgramsTokenIsVerified) {
  const auto bearer = verify(AccessToken(foreign()[names::kAccessToken].asString()));
  ASSERT_TRUE(bearer);
  EXPECT_EQ(bearer->user, User("O'Brien"));
  EXPECT_EQ(bearer->scope, Scope("it's"));
  EXPECT_FALSE(bearer->issued);
}

TEST_F(TokensTest, AMarkThatAnotherProgramStoredAsATokenOpensNothing) {
  const std::string mark = "sha256:" + std::string(57, 'a');
  sql("UPDATE oauth_token SET access_token='" + mark + "'");
  EXPECT_EQ(whyOf(verify(AccessToken(mark))), Why::kUnknown);
}

TEST_F(TokensTest, ALookUpThatFailsIsTroubleAndNoAnswer) {
  sql("ALTER TABLE oauth_token RENAME TO gone");
  EXPECT_THROW(static_cast<void>(verify(pair_.access)), Trouble);
  EXPECT_THROW(static_cast<void>(introspect(frame_, pair_.refresh->text())), Trouble);
  EXPECT_THROW(static_cast<void>(revoke(pair_.access.text())), Trouble);
}

// Introspecting -------------------------------------------------------------------

TEST_F(TokensTest, AnyApplicationMayAskAboutAnAccessToken) {
  const auto found = introspect(other_, pair_.access.text());
  ASSERT_TRUE(found);
  EXPECT_EQ(found->kind, Introspection::Kind::kAccess);
  EXPECT_EQ(found->bearer.user, kAlice);
}

TEST_F(TokensTest, OnlyItsHolderMayAskAboutARefreshToken) {
  EXPECT_FALSE(introspect(other_, pair_.refresh->text()));
  const auto found = introspect(frame_, pair_.refresh->text());
  ASSERT_TRUE(found);
  EXPECT_EQ(found->kind, Introspection::Kind::kRefresh);
  EXPECT_EQ(found->bearer.expires, kNow + 600 + 30 * kDay);
}

TEST_F(TokensTest, ReplacedTokensAreInactive) {
  refresh(frame_, pair_);
  EXPECT_FALSE(introspect(frame_, pair_.access.text()));
  EXPECT_FALSE(introspect(frame_, pair_.refresh->text()));
}

TEST_F(TokensTest, AnotherProgramsTokensAreIntrospected) {
  const Json::Value pair = foreign();
  EXPECT_TRUE(introspect(other_, pair[names::kAccessToken].asString()));
  EXPECT_TRUE(introspect(frame_, pair[names::kRefreshToken].asString()));
  EXPECT_FALSE(introspect(other_, pair[names::kRefreshToken].asString()));
}

// Revoking --------------------------------------------------------------------------

TEST_F(TokensTest, EitherTokenEndsTheLogin) {
  EXPECT_TRUE(revoke(pair_.access.text())->wasThere);
  EXPECT_FALSE(isGood(pair_));
  const Pair next = login(frame_);
  EXPECT_TRUE(revoke(next.refresh->text())->wasThere);
  EXPECT_FALSE(isGood(next));
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_token"), "0");
}

TEST_F(TokensTest, WhatIsNotThereIsASuccess) {
  ASSERT_TRUE(revoke(support::id64('x')));
  EXPECT_FALSE(revoke(support::id64('x'))->wasThere);
  EXPECT_FALSE(revoke("")->wasThere);
}

TEST_F(TokensTest, AReplacedTokenStillEndsTheLogin) {
  const Pair second = refresh(frame_, pair_);
  EXPECT_TRUE(revoke(pair_.refresh->text())->wasThere);
  EXPECT_FALSE(isGood(second));

  const Pair third = login(frame_);
  const Pair fourth = refresh(frame_, third);
  EXPECT_TRUE(revoke(third.access.text())->wasThere);
  EXPECT_FALSE(isGood(fourth));
}

TEST_F(TokensTest, AnotherApplicationsTokenIsRefusedAndStays) {
  const Pair others = login(other_);
  EXPECT_EQ(errorOf(revoke(others.access.text())), Error::kInvalidGrant);
  EXPECT_EQ(whyOf(revoke(others.refresh->text())), Why::kOtherApplication);
  EXPECT_TRUE(isGood(others));
}

TEST_F(TokensTest, AnotherProgramsTokenIsRevokedByEither) {
  const Json::Value one = foreign();
  EXPECT_TRUE(revoke(one[names::kAccessToken].asString())->wasThere);
  const Json::Value two = foreign();
  EXPECT_TRUE(revoke(two[names::kRefreshToken].asString())->wasThere);
  EXPECT_FALSE(isGood(AccessToken(two[names::kAccessToken].asString())));
}

TEST_F(TokensTest, RevokingLeavesAnEntry) {
  revoke(pair_.access.text());
  EXPECT_EQ(entries().back(),
            "Access ended[Photo Frame " + frame_.text().substr(0, 8) + "] for [alice] by itself");
}

// Acting for itself -------------------------------------------------------------------

TEST_F(TokensTest, AnApplicationsOwnTokenNamesNoUser) {
  const auto pair = own(frame_);
  ASSERT_TRUE(pair);
  EXPECT_FALSE(pair->refresh);
  EXPECT_FALSE(pair->user);
  EXPECT_EQ(pair->scope, kScope);
  const auto bearer = verify(pair->access);
  ASSERT_TRUE(bearer);
  EXPECT_FALSE(bearer->user);
  EXPECT_EQ(bearer->application, frame_);
}

TEST_F(TokensTest, AnOwnTokenHasTheScopeThatIsAskedFor) {
  EXPECT_EQ(own(frame_, Scope("profile"))->scope, Scope("profile"));
  EXPECT_EQ(errorOf(own(frame_, Scope("more"))), Error::kInvalidScope);
}

TEST_F(TokensTest, APublicApplicationGetsNoTokenOfItsOwn) {
  const auto refused = own(add("App", ApplicationKind::kPublic).identifier);
  EXPECT_EQ(errorOf(refused), Error::kUnauthorizedClient);
}

TEST_F(TokensTest, AnOwnTokenIsRevoked) {
  const Pair pair = *own(frame_);
  EXPECT_TRUE(revoke(pair.access.text())->wasThere);
  EXPECT_FALSE(isGood(pair));
  EXPECT_EQ(entries().back(),
            "Access ended[Photo Frame " + frame_.text().substr(0, 8) + "] by itself");
}

TEST_F(TokensTest, ALoginThatCouldNotBeRefreshedIsNotBegun) {
  LoginRequest asked{User("alice"), frame_, Scope(std::string(1900, 's'))};
  asked.text = CallerText(std::string(400, 't'));
  EXPECT_EQ(whyOf(grants().tokens.issue(asked)), Why::kTooMuch);
}

TEST_F(TokensTest, NoUserCanStandWhereAnApplicationStandsForItself) {
  EXPECT_EQ(whyOf(grants().tokens.issue({User(kNoUser), frame_, kScope})), Why::kReservedUser);
}

}  // namespace
}  // namespace grants_test
