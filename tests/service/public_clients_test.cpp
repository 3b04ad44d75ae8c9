#include "service/protocol/endpoints.h"
#include "tests/service/login_test.h"

namespace {

using namespace service_test;

class PublicClientsTest : public LoginTest {
 protected:
  void SetUp() override {
    LoginTest::SetUp();
    app = addPublic({kCallback});
  }
  Answer ask(Endpoint endpoint, Changes form) {
    form["client_id"] = app.identifier.text();
    return call(endpoint, post("/", encoded(form)));
  }

  grants::Registered app;
};

TEST_F(PublicClientsTest, SayWhoTheyAreAndNoMore) {
  const Json::Value pair = logIn(app);
  const Answer next = ask(token, {{"grant_type", "refresh_token"},
                                  {"refresh_token", pair["refresh_token"].asString()}});
  ASSERT_EQ(next.status, 200) << next.body;
  EXPECT_EQ(ask(revoke, {{"token", json(next)["access_token"].asString()}}).status, 200);
  EXPECT_EQ(call(whoami, withBearer(json(next)["access_token"].asString(), get("/"))).status, 401);
}

TEST_F(PublicClientsTest, AnEmptySecretInTheHeaderIsNone) {
  Request request = post("/", "grant_type=refresh_token&refresh_token=x");
  EXPECT_EQ(error(call(token, by({app.identifier, grants::Secret("")}, request))),
            "400 invalid_grant");
}

TEST_F(PublicClientsTest, ASecretThatTheyCannotHaveIsRefused) {
  EXPECT_EQ(error(ask(token, {{"grant_type", "refresh_token"},
                              {"refresh_token", "x"},
                              {"client_secret", "public:"}})),
            "401 invalid_client");
}

TEST_F(PublicClientsTest, AConfidentialOneIsNotKnownByItsNameAlone) {
  const auto other = addConfidential(kCallback);
  for (const Endpoint endpoint : {token, revoke, introspect, pushRequest}) {
    const Request request =
        post("/", "grant_type=refresh_token&refresh_token=x&token=x&client_id=" +
                      other.identifier.text());
    EXPECT_EQ(error(call(endpoint, request)), "401 invalid_client");
  }
}

TEST_F(PublicClientsTest, NothingIsIssuedToThemselves) {
  EXPECT_EQ(error(ask(token, {{"grant_type", "client_credentials"}})), "400 unauthorized_client");
}

TEST_F(PublicClientsTest, TokensAreNotDescribedToThem) {
  const Json::Value pair = logIn(app);
  EXPECT_EQ(error(ask(introspect, {{"token", pair["access_token"].asString()}})),
            "401 invalid_client");
}

TEST_F(PublicClientsTest, AVerifierIsAlwaysTheirs) {
  const Answer answer = allow(LoginTest::ask(app));
  EXPECT_EQ(error(redeem(app, answer, {{"code_verifier", ""}})), "400 invalid_request");
  EXPECT_EQ(error(redeem(app, answer, {{"code_verifier", "wrong"}})), "400 invalid_grant");
  EXPECT_EQ(redeem(app, answer).status, 200);
}

TEST_F(PublicClientsTest, OneThatIsDisabledGetsNothing) {
  const Json::Value pair = logIn(app);
  store.open().applications.disable(app.identifier, grants::Actor("admin"));
  EXPECT_EQ(error(ask(token, {{"grant_type", "refresh_token"},
                              {"refresh_token", pair["refresh_token"].asString()}})),
            "401 invalid_client");
}

TEST_F(PublicClientsTest, AnothersRefreshTokenIsNoGoodToThem) {
  const auto other = addPublic({kCallback});
  const Json::Value pair = logIn(other);
  const std::string text = pair["refresh_token"].asString();
  EXPECT_EQ(error(ask(token, {{"grant_type", "refresh_token"}, {"refresh_token", text}})),
            "400 invalid_grant");
  app = other;
  EXPECT_EQ(ask(token, {{"grant_type", "refresh_token"}, {"refresh_token", text}}).status, 200);
}

TEST_F(PublicClientsTest, MetadataSaysWhereTheyAreKnown) {
  const Json::Value document = json(call(metadata, get("/")));
  const auto hasNone = [&](const char* endpoint) {
    for (const Json::Value& method :
         document[std::string(endpoint) + "_endpoint_auth_methods_supported"]) {
      if (method == "none") return true;
    }
    return false;
  };
  EXPECT_TRUE(hasNone("token"));
  EXPECT_TRUE(hasNone("revocation"));
  EXPECT_FALSE(hasNone("introspection"));
}

TEST_F(PublicClientsTest, AResourceOfAnotherBoxIsRefusedAtTheTokenEndpointToo) {
  const Json::Value pair = logIn(app);
  Changes form = {{"grant_type", "refresh_token"},
                  {"refresh_token", pair["refresh_token"].asString()},
                  {"resource", "https://other.example"}};
  EXPECT_EQ(error(ask(token, form)), "400 invalid_target");
  form["resource"] = settings.issuer;
  EXPECT_EQ(ask(token, form).status, 200);
}

}  // namespace
