#include "service/protocol/endpoints.h"
#include "service/text/encoding.h"
#include "tests/service/login_test.h"
#include "tests/support/doubles.h"

namespace {

using namespace service_test;

constexpr char kStart[] = "urn:ietf:params:oauth:request_uri:";
constexpr long long kNow = 1700000000;

class PushedTest : public LoginTest {
 protected:
  void SetUp() override {
    LoginTest::SetUp();
    support::Clock::setTo(kNow);
    app = addConfidential(kCallback);
  }
  void TearDown() override {
    support::Clock::release();
    LoginTest::TearDown();
  }

  Answer push(const Changes& changes = {}) {
    return call(pushRequest, by(app, post("/oauth/par", encoded(question(app, changes)))));
  }
  std::string pushed(const Changes& changes = {}) {
    const Answer answer = push(changes);
    EXPECT_EQ(answer.status, 201) << answer.body;
    return json(answer)["request_uri"].asString();
  }
  Answer open(const std::string& uri, const Changes& more = {}) {
    Changes parameters = {{"client_id", app.identifier.text()}, {"request_uri", uri}};
    parameters.insert(more.begin(), more.end());
    Request request = get("/oauth/authorize", encoded(parameters));
    request.user = "alice";
    return call(authorize, request);
  }

  grants::Registered app;
};

TEST_F(PushedTest, GivesAReferenceThatIsGoodForAMinute) {
  const Json::Value answer = json(push());
  EXPECT_EQ(answer["expires_in"], 60);
  EXPECT_EQ(answer["request_uri"].asString().rfind(kStart, 0), 0U);
  EXPECT_EQ(answer["request_uri"].asString().size(), sizeof kStart - 1 + 64);
}

TEST_F(PushedTest, LeadsToTheSamePageAndCode) {
  const Answer answer = allow(open(pushed({{"state", "pushed"}})));
  EXPECT_EQ(returned(answer, "state"), "pushed");
  EXPECT_EQ(redeem(app, answer).status, 200);
}

TEST_F(PushedTest, ThePageCarriesTheReferenceAlone) {
  const Changes fields = hiddenFields(open(pushed()));
  EXPECT_EQ(fields.count("state"), 0U);
  EXPECT_EQ(fields.count("code_challenge"), 0U);
  EXPECT_EQ(fields.count("request_uri"), 1U);
}

TEST_F(PushedTest, WhatStandsBesideTheReferenceIsIgnored) {
  const Answer page = open(pushed(), {{"scope", "files.write"},
                                      {"state", "another"},
                                      {"redirect_uri", "https://evil.example/"},
                                      {"prompt", "none"}});
  EXPECT_EQ(returned(allow(page), "state"), "a state");
}

TEST_F(PushedTest, GivesOneCode) {
  const std::string uri = pushed();
  const Answer page = open(uri);
  EXPECT_EQ(returned(allow(page), "code").size(), 64U);
  EXPECT_EQ(open(uri).status, 400);
  Changes fields = hiddenFields(page);
  fields["decision"] = "allow";
  Request again = post("/oauth/authorize", encoded(fields));
  again.user = "alice";
  EXPECT_EQ(call(authorize, again).status, 400);
}

TEST_F(PushedTest, MayBeReloadedWhileItIsRead) {
  const std::string uri = pushed();
  EXPECT_EQ(open(uri).status, 200);
  support::Clock::advance(300);
  EXPECT_EQ(returned(allow(open(uri)), "code").size(), 64U);
}

TEST_F(PushedTest, IsGoneAfterAMinute) {
  const std::string uri = pushed();
  support::Clock::advance(60);
  const Answer answer = open(uri);
  EXPECT_EQ(answer.status, 400);
  EXPECT_EQ(header(answer, "Location"), "");
}

TEST_F(PushedTest, IsNoGoodToAnotherApplication) {
  const std::string uri = pushed();
  const auto other = addConfidential("https://evil.example/");
  Request request = get("/oauth/authorize",
                        encoded({{"client_id", other.identifier.text()}, {"request_uri", uri}}));
  request.user = "alice";
  EXPECT_EQ(call(authorize, request).status, 400);
  EXPECT_EQ(open(uri).status, 200);
}

TEST_F(PushedTest, NobodyRedirectsForAReferenceThatIsNone) {
  for (const char* rest : {"", "x", "' OR 1=1 --"}) {
    const Answer answer = open(kStart + std::string(rest));
    EXPECT_GE(answer.status, 400) << rest;
    EXPECT_EQ(header(answer, "Location"), "") << rest;
  }
  EXPECT_EQ(open(kStart + std::string(64, 'a')).status, 400);
}

TEST_F(PushedTest, FaultsAreToldAtOnce) {
  EXPECT_EQ(error(push({{"request_uri", "https://app.example/r"}})), "400 invalid_request");
  EXPECT_EQ(error(push({{"request", "e30"}})), "400 request_not_supported");
  EXPECT_EQ(error(push({{"redirect_uri", "https://evil.example/"}})), "400 invalid_request");
  EXPECT_EQ(error(push({{"scope", "files.write"}})), "400 invalid_scope");
  EXPECT_EQ(error(push({{"resource", "https://other.example"}})), "400 invalid_target");
  EXPECT_EQ(error(push({{"code_challenge", ""}})), "400 invalid_request");
  EXPECT_EQ(error(push({{"response_type", "token"}})), "400 unsupported_response_type");
  EXPECT_EQ(error(push({{"state", std::string(2000, 's')}})), "413 invalid_request");
}

TEST_F(PushedTest, NeedsTheApplicationItself) {
  const std::string form = encoded(question(app));
  EXPECT_EQ(error(call(pushRequest, post("/oauth/par", form))), "401 invalid_client");
  EXPECT_EQ(call(pushRequest, get("/oauth/par", form)).status, 405);
  const auto native = addPublic({"com.example.app:/cb"});
  EXPECT_EQ(call(pushRequest, post("/oauth/par", encoded(question(native)))).status, 201);
}

TEST_F(PushedTest, TheSecretIsNotStored) {
  Changes form = question(app);
  form["client_secret"] = app.secret->text();
  ASSERT_EQ(call(pushRequest, post("/oauth/par", encoded(form))).status, 201);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_grantCode WHERE state LIKE '%" +
                    app.secret->text() + "%'"),
            "0");
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_grantCode WHERE state LIKE '%S256%'"), "1");
}

TEST_F(PushedTest, WhatTheUserAgreedToBeforeIsNotAsked) {
  logIn(app);
  const std::string uri = pushed();
  EXPECT_EQ(returned(open(uri), "code").size(), 64U);
  EXPECT_EQ(open(uri).status, 400);
}

TEST_F(PushedTest, TheFormOfAnotherRequestDoesNotFit) {
  Changes fields = hiddenFields(open(pushed({{"state", "one"}})));
  fields["request_uri"] = pushed({{"state", "two"}});
  fields["decision"] = "allow";
  Request request = post("/oauth/authorize", encoded(fields));
  request.user = "alice";
  EXPECT_EQ(call(authorize, request).status, 403);
}

}  // namespace
