#include "service/protocol/endpoints.h"
#include "tests/service/service_test.h"

namespace {

using namespace service_test;

class TokenTest : public ServiceTest {
 protected:
  Answer ask(const grants::Registered& application, const std::string& form) {
    return call(token, by(application, post("/oauth/token", form)));
  }
};

TEST_F(TokenTest, RefusesOtherMethods) {
  for (const char* method : {"GET", "PUT", "DELETE", ""}) {
    Request request = get("/oauth/token");
    request.method = method;
    EXPECT_EQ(call(token, request).status, 405) << method;
  }
}

TEST_F(TokenTest, RefusesWhatIsNoFormBeforeItOpensTheStore) {
  Request other = post("/oauth/token", "{}");
  other.contentType = "application/json";
  EXPECT_EQ(error(call(token, other)), "400 invalid_request");
  EXPECT_EQ(error(call(token, post("/oauth/token", "a=%"))), "400 invalid_request");
  EXPECT_EQ(error(call(token, post("/oauth/token", "code=1&code=2"))), "400 invalid_request");
  EXPECT_EQ(error(call(token, post("/oauth/token", "grant_type=x"))), "401 invalid_client");
  EXPECT_NE(access(kDatabase, F_OK), 0);
}

TEST_F(TokenTest, AsksStrangersWhoTheyAre) {
  const grants::Registered application = registered();
  Request request = by(application, post("/oauth/token", "grant_type=client_credentials"));
  request.authorization = "Basic eDp5";
  const Answer answer = call(token, request);
  EXPECT_EQ(error(answer), "401 invalid_client");
  EXPECT_EQ(header(answer, "WWW-Authenticate").rfind("Basic ", 0), 0U);
}

TEST_F(TokenTest, NamesWhatIsMissing) {
  const grants::Registered application = registered();
  EXPECT_EQ(error(ask(application, "")), "400 invalid_request");
  EXPECT_EQ(error(ask(application, "grant_type=authorization_code")), "400 invalid_request");
  EXPECT_EQ(error(ask(application, "grant_type=refresh_token")), "400 invalid_request");
  EXPECT_EQ(error(ask(application, "grant_type=password")), "400 unsupported_grant_type");
}

TEST_F(TokenTest, RefusesUnknownCodesAndTokens) {
  const grants::Registered application = registered();
  const std::string verifier(43, 'v');
  EXPECT_EQ(error(ask(application, "grant_type=authorization_code&code=" + support::id64('c') +
                                       "&code_verifier=" + verifier)),
            "400 invalid_grant");
  EXPECT_EQ(error(ask(application, "grant_type=refresh_token&refresh_token=x")),
            "400 invalid_grant");
}

TEST_F(TokenTest, RefusesAScopeBeyondTheRegistration) {
  const grants::Registered application = registered("profile");
  EXPECT_EQ(error(ask(application, "grant_type=client_credentials&scope=files.read")),
            "400 invalid_scope");
  EXPECT_EQ(error(ask(application, "grant_type=client_credentials&scope=%20")),
            "400 invalid_scope");
}

TEST_F(TokenTest, GivesAnApplicationATokenOfItsOwn) {
  const Answer answer = ask(registered("profile"), "grant_type=client_credentials");
  ASSERT_EQ(answer.status, 200);
  const Json::Value document = json(answer);
  EXPECT_EQ(document["token_type"], "Bearer");
  EXPECT_EQ(document["scope"], "profile");
  EXPECT_EQ(document["expires_in"], 600);
  EXPECT_FALSE(document.isMember("refresh_token"));
}

TEST_F(TokenTest, RefreshesALogin) {
  const grants::Registered application = registered();
  const grants::Pair pair = loggedIn(application);
  const Answer answer =
      ask(application, "grant_type=refresh_token&refresh_token=" + pair.refresh->text());
  ASSERT_EQ(answer.status, 200);
  EXPECT_NE(json(answer)["refresh_token"].asString(), pair.refresh->text());
  EXPECT_EQ(call(whoami, withBearer(json(answer)["access_token"].asString(), get("/"))).status,
            200);
}

TEST_F(TokenTest, RemembersWhereTheRequestCameFrom) {
  Request request = by(registered(), post("/oauth/token", "grant_type=client_credentials"));
  request.peer = "192.0.2.7";
  ASSERT_EQ(call(token, request).status, 200);
  EXPECT_EQ(sqlText("SELECT ip FROM oauth_token"), "192.0.2.7");
}

TEST_F(TokenTest, GivesNothingToADisabledApplication) {
  const grants::Registered application = registered();
  ASSERT_TRUE(store.open().applications.disable(application.identifier, grants::Actor("admin")));
  EXPECT_EQ(error(ask(application, "grant_type=client_credentials")), "401 invalid_client");
}

// The holder's side -----------------------------------------------------------------

TEST_F(TokenTest, IsWorthNothingOnceItIsRevoked) {
  const grants::Registered application = registered();
  const grants::Pair pair = loggedIn(application);
  const Request asked = withBearer(pair.access.text(), get("/"));
  EXPECT_EQ(json(call(whoami, asked))["sub"], "alice");
  const Request form = by(application, post("/", "token=" + pair.access.text()));
  EXPECT_EQ(json(call(introspect, form))["active"], true);
  EXPECT_EQ(call(revoke, form).status, 200);
  EXPECT_EQ(json(call(introspect, form))["active"], false);
  EXPECT_EQ(error(call(whoami, asked)), "401 invalid_token");
}

TEST_F(TokenTest, OpensNoResourceBeyondItsScope) {
  const grants::Registered application = registered("files.read");
  const Answer own = ask(application, "grant_type=client_credentials");
  const Answer answer = call(whoami, withBearer(json(own)["access_token"].asString(), get("/")));
  EXPECT_EQ(error(answer), "403 insufficient_scope");
}

}  // namespace
