// Who a user is, in tokens and at the endpoints that say so.

#include <filesystem>

#include "service/oidc/id_token.h"
#include "service/oidc/login_text.h"
#include "service/program/routes.h"
#include "service/protocol/endpoints.h"
#include "service/signing/base64url.h"
#include "service/signing/key_file.h"
#include "service/text/encoding.h"
#include "tests/service/oidc_test.h"

namespace {

using namespace service_test;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::UnorderedElementsAre;

class OidcTokensTest : public OidcTest {
 protected:
  Json::Value refreshed(const grants::Registered& app, const Json::Value& tokens,
                        const std::string& more = "") {
    return json(
        call(token, by(app, post("/oauth/token", "grant_type=refresh_token&refresh_token=" +
                                                     tokens["refresh_token"].asString() + more))));
  }
  Answer userInfoFor(const Json::Value& tokens) {
    return call(userInfo, withBearer(tokens["access_token"].asString(), get("/oauth/userinfo")));
  }
};

TEST_F(OidcTokensTest, LoginSaysWhoTheUserIs) {
  const grants::Registered app = application();
  const Json::Value tokens = login(app, "&nonce=n%2B1");
  const Json::Value said = claims(tokens);
  EXPECT_EQ(said["iss"], settings.issuer);
  EXPECT_EQ(said["sub"], "alice");
  EXPECT_EQ(said["aud"], app.identifier.text());
  EXPECT_EQ(said["nonce"], "n+1");
  EXPECT_EQ(said["iat"].asInt64(), kNow);
  EXPECT_EQ(said["exp"].asInt64(), kNow + 3600);
  EXPECT_EQ(said["auth_time"].asInt64(), kNow);
  EXPECT_EQ(said["at_hash"], signing::halfDigest(tokens["access_token"].asString()));
  EXPECT_EQ(said["preferred_username"], "alice");
  EXPECT_THAT(said.getMemberNames(),
              UnorderedElementsAre("iss", "sub", "aud", "nonce", "iat", "exp", "auth_time",
                                   "at_hash", "preferred_username"));
}

TEST_F(OidcTokensTest, ApplicationChoosesTheSignatureWhenItRegisters) {
  for (const bool wantsEs256 : {false, true}) {
    const std::string token = login(application(wantsEs256))["id_token"].asString();
    const std::string head = signing::fromBase64Url(token.substr(0, token.find('.'))).value();
    EXPECT_THAT(head, HasSubstr(wantsEs256 ? "\"ES256\"" : "\"RS256\""));
  }
}

TEST_F(OidcTokensTest, TimeIsThatOfTheSignInNotOfTheLogin) {
  const grants::Registered app = application();
  const Answer page = call(authorize, fromAlice(authorization(app, ""), 500));
  const Json::Value tokens = redeemed(app, returned(allowed(page, 500))["code"]);
  EXPECT_EQ(claims(tokens)["auth_time"].asInt64(), kNow - 500);
  EXPECT_FALSE(claims(tokens).isMember("nonce"));
}

TEST_F(OidcTokensTest, RefreshSaysItAgainWithoutNonce) {
  const grants::Registered app = application();
  const Json::Value tokens = login(app, "&nonce=once");
  support::Clock::advance(100);
  const Json::Value again = refreshed(app, tokens);
  const Json::Value said = claims(again);
  EXPECT_EQ(said["sub"], "alice");
  EXPECT_EQ(said["iat"].asInt64(), kNow + 100);
  EXPECT_EQ(said["auth_time"].asInt64(), kNow);
  EXPECT_EQ(said["at_hash"], signing::halfDigest(again["access_token"].asString()));
  EXPECT_FALSE(said.isMember("nonce"));
}

TEST_F(OidcTokensTest, RefreshWithoutTheScopeSaysNothing) {
  const grants::Registered app = application();
  const Json::Value again = refreshed(app, login(app), "&scope=profile");
  EXPECT_EQ(again["scope"], "profile");
  EXPECT_FALSE(again.isMember("id_token"));
}

TEST_F(OidcTokensTest, WhoDoesNotAskIsNotTold) {
  for (const char* scope : {"", "&scope=profile"}) {
    const grants::Registered app = application();
    Request request = authorization(app, "");
    request.query.replace(request.query.find("&scope=openid+profile"), 21, scope);
    const Answer page = call(authorize, fromAlice(request));
    const Json::Value tokens = redeemed(app, returned(allowed(page))["code"]);
    EXPECT_TRUE(tokens.isMember("access_token"));
    EXPECT_FALSE(tokens.isMember("id_token")) << scope;
    EXPECT_EQ(userInfoFor(tokens).status, 403);
  }
}

TEST_F(OidcTokensTest, ScopesThatNobodyKnowsDoNotCount) {
  const grants::Registered app = application();
  Request request = authorization(app, "");
  request.query.replace(request.query.find("openid+profile"), 14, "openid+email+offline_access");
  const Json::Value tokens =
      redeemed(app, returned(allowed(call(authorize, fromAlice(request))))["code"]);
  EXPECT_EQ(tokens["scope"], "openid");
  EXPECT_EQ(claims(tokens)["sub"], "alice");
  EXPECT_FALSE(claims(tokens).isMember("preferred_username"));
}

TEST_F(OidcTokensTest, ScopesThatNobodyKnowsDoNotCountForARefreshEither) {
  const grants::Registered app = application();
  const Json::Value again = refreshed(app, login(app), "&scope=openid+profile+offline_access");
  EXPECT_EQ(again["scope"], "openid profile");
  EXPECT_TRUE(again.isMember("id_token"));
}

TEST_F(OidcTokensTest, ScopeThatTheBoxKnowsAndTheLoginDoesNotCannotBeHadByARefresh) {
  const grants::Registered app = application();
  const Json::Value tokens = login(app);
  const Request request =
      post("/oauth/token", "grant_type=refresh_token&scope=openid+files.read&refresh_token=" +
                               tokens["refresh_token"].asString());
  EXPECT_EQ(error(call(token, by(app, request))), "400 invalid_scope");
}

TEST_F(OidcTokensTest, LostKeysAreFoundOutBeforeTheUserIsAsked) {
  const grants::Registered app = application();
  std::filesystem::remove(settings.signingKeysFile);
  const Answer answer = call(authorize, fromAlice(authorization(app, "")));
  EXPECT_EQ(returned(answer)["error"], "server_error");
}

TEST_F(OidcTokensTest, KeysLostLaterCostNoLoginThatIsThere) {
  const grants::Registered app = application();
  const Json::Value tokens = login(app);
  std::filesystem::remove(settings.signingKeysFile);
  const Json::Value again = refreshed(app, tokens);
  EXPECT_TRUE(again.isMember("access_token"));
  EXPECT_FALSE(again.isMember("id_token"));
}

TEST_F(OidcTokensTest, UserInfoIsTheSameSubject) {
  const grants::Registered app = application();
  const Json::Value tokens = login(app);
  const Json::Value said = json(userInfoFor(tokens));
  EXPECT_EQ(said["sub"], claims(tokens)["sub"]);
  EXPECT_EQ(said["preferred_username"], "alice");
}

TEST_F(OidcTokensTest, UserInfoTakesTheTokenInAForm) {
  const grants::Registered app = application();
  const std::string text = login(app)["access_token"].asString();
  EXPECT_EQ(json(call(userInfo, post("/oauth/userinfo", "access_token=" + text)))["sub"], "alice");
  EXPECT_EQ(json(call(userInfo, withBearer(text, post("/oauth/userinfo", ""))))["sub"], "alice");
  const Request twice = withBearer(text, post("/oauth/userinfo", "access_token=" + text));
  EXPECT_EQ(error(call(userInfo, twice)), "400 invalid_request");
  EXPECT_EQ(error(call(userInfo,
                       post("/oauth/userinfo", "access_token=" + text + "&access_token=" + text))),
            "400 invalid_request");
}

TEST_F(OidcTokensTest, UserInfoWithoutAGoodTokenSaysNothing) {
  EXPECT_EQ(call(userInfo, get("/oauth/userinfo")).status, 401);
  EXPECT_EQ(error(call(userInfo, withBearer("wrong", get("/oauth/userinfo")))),
            "401 invalid_token");
  EXPECT_EQ(call(userInfo, get("/oauth/userinfo", "access_token=x")).status, 401);
}

TEST_F(OidcTokensTest, ApplicationThatActsForItselfIsNoUser) {
  const grants::Registered app = application();
  const Json::Value tokens = json(call(
      token, by(app, post("/oauth/token", "grant_type=client_credentials&scope=openid+profile"))));
  EXPECT_FALSE(tokens.isMember("id_token"));
  EXPECT_EQ(error(userInfoFor(tokens)), "403 insufficient_scope");
}

TEST_F(OidcTokensTest, PublishedKeysCheckTheToken) {
  const grants::Registered app = application();
  const std::string token = login(app)["id_token"].asString();
  const Json::Value set = json(call(publicKeys, get("/oauth/jwks")));
  const std::string head = signing::fromBase64Url(token.substr(0, token.find('.'))).value();
  EXPECT_EQ(set["keys"].size(), 2U);
  EXPECT_THAT(head, HasSubstr(set["keys"][0]["kid"].asString()));
  EXPECT_FALSE(set["keys"][0].isMember("d"));
}

TEST_F(OidcTokensTest, DiscoveryNamesEverything) {
  const Json::Value document =
      json(call(openIdConfiguration, get("/.well-known/openid-configuration")));
  EXPECT_EQ(document["issuer"], settings.issuer);
  for (const char* name :
       {"authorization_endpoint", "token_endpoint", "jwks_uri", "userinfo_endpoint",
        "end_session_endpoint", "response_types_supported", "subject_types_supported",
        "id_token_signing_alg_values_supported", "scopes_supported"}) {
    EXPECT_TRUE(document.isMember(name)) << name;
  }
  EXPECT_EQ(document, json(call(metadata, get("/.well-known/oauth-authorization-server"))));
}

TEST_F(OidcTokensTest, WhatDiscoveryNamesIsThere) {
  const Json::Value document =
      json(call(openIdConfiguration, get("/.well-known/openid-configuration")));
  for (const char* name : {"jwks_uri", "userinfo_endpoint", "end_session_endpoint"}) {
    const std::string path = document[name].asString().substr(settings.issuer.size());
    EXPECT_NE(routeOf(path, ""), nullptr) << name;
  }
  EXPECT_NE(routeOf("/auth/.well-known/openid-configuration", "/auth"), nullptr);
  EXPECT_NE(routeOf("/.well-known/openid-configuration/auth", "/auth"), nullptr);
}

TEST_F(OidcTokensTest, WithoutTheScopeOnTheBoxThereIsNothing) {
  settings.scopes = ScopeTable(std::vector<KnownScope>{{"profile", "See who you are"}});
  for (const Endpoint endpoint : {openIdConfiguration, publicKeys, userInfo, logout}) {
    EXPECT_EQ(call(endpoint, get("/")).status, 404);
  }
  EXPECT_FALSE(json(call(metadata, get("/"))).isMember("jwks_uri"));
}

TEST(OpenIdSubjectTest, IsTheNameOrADigestOfIt) {
  EXPECT_EQ(openIdSubject(grants::User("o'neil smith")), "o'neil smith");
  EXPECT_EQ(openIdSubject(grants::User("zo\xc3\xab")),
            "sha256:J1K4hoaEf6XIb0e5TOZSt7PyKpHDdhfUUaTbmvpDFFA");
  EXPECT_EQ(openIdSubject(grants::User(std::string(256, 'a'))).size(), 50U);
}

TEST(LoginTextTest, ComesBackAsItWas) {
  for (const std::string& nonce :
       {std::string(), std::string("a b"), std::string(kMaxNonce, '\xff')}) {
    const auto login = unpacked(packed({kNow, nonce}));
    ASSERT_TRUE(login);
    EXPECT_EQ(login->authTime, kNow);
    EXPECT_EQ(login->nonce, nonce);
  }
}

TEST(LoginTextTest, OfSomebodyElseIsNone) {
  for (const char* text : {"", "openid1", "openid1 ", "openid1 5", "openid1 x y", "openid1 -5 y",
                           "openid1  y", "openid2 5 y", "openid1 1234567890123456789 y"}) {
    EXPECT_FALSE(unpacked(grants::CallerText(text))) << text;
  }
}

}  // namespace
