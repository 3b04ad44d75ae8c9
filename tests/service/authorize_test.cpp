#include "service/protocol/endpoints.h"
#include "service/text/encoding.h"
#include "tests/service/login_test.h"

namespace {

using namespace service_test;

constexpr char kLoopback[] = "http://127.0.0.1/cb";

class AuthorizeTest : public LoginTest {
 protected:
  void SetUp() override {
    LoginTest::SetUp();
    app = addConfidential(kCallback);
  }

  /// The error that the application of SetUp hears.
  std::string errorOf(const Changes& changes, const std::string& user = "alice") {
    const Answer answer = ask(app, changes, user);
    EXPECT_EQ(answer.status, 302) << answer.body;
    EXPECT_EQ(header(answer, "Location").rfind(kCallback + "?", 0), 0U);
    EXPECT_EQ(returned(answer, "state"), "a state");
    return returned(answer, "error");
  }

  grants::Registered app;
};

// Faults --------------------------------------------------------------------------

TEST_F(AuthorizeTest, WhatIsNotSupportedHasTheErrorOfItsStandard) {
  EXPECT_EQ(errorOf({{"request", "e30.e30."}}), "request_not_supported");
  EXPECT_EQ(errorOf({{"request_uri", "https://app.example/r"}}), "request_uri_not_supported");
  EXPECT_EQ(errorOf({{"request_uri", "urn:ietf:params:oauth:request_ur"}}),
            "request_uri_not_supported");
  EXPECT_EQ(errorOf({{"registration", "{}"}}), "registration_not_supported");
  EXPECT_EQ(errorOf({{"authorization_details", "[]"}}), "invalid_authorization_details");
  EXPECT_EQ(errorOf({{"response_type", "id_token"}}), "unsupported_response_type");
  EXPECT_EQ(errorOf({{"response_mode", "form_post"}}), "invalid_request");
}

TEST_F(AuthorizeTest, ATokenIsForThisBoxAndNothingElse) {
  for (const char* resource : {"https://box.example", "https://box.example/"}) {
    EXPECT_EQ(ask(app, {{"resource", resource}}).status, 200) << resource;
  }
  for (const char* resource : {"https://other.example", "https://box.example/files", "x",
                               "https://box.example.evil.example/"}) {
    EXPECT_EQ(errorOf({{"resource", resource}}), "invalid_target") << resource;
  }
}

TEST_F(AuthorizeTest, EachOfSeveralResourcesCounts) {
  Request request = get("/oauth/authorize", encoded(question(app)) +
                                                "&resource=https://box.example"
                                                "&resource=https://other.example");
  request.user = "alice";
  EXPECT_EQ(returned(call(authorize, request), "error"), "invalid_target");
}

TEST_F(AuthorizeTest, WhatOnlyHintsIsLeftAlone) {
  const Answer page = ask(app, {{"display", "popup"},
                                {"ui_locales", "de"},
                                {"acr_values", "1"},
                                {"claims", "{}"},
                                {"login_hint", "bob"},
                                {"prompt", "something_new"}});
  EXPECT_EQ(page.status, 200);
}

TEST_F(AuthorizeTest, ThePageShowsTheAddressThatDidNotMatch) {
  const Answer page = ask(app, {{"redirect_uri", "https://evil.example/<script>x y"}});
  EXPECT_EQ(page.status, 400);
  EXPECT_NE(page.body.find("https://evil.example/%3Cscript%3Ex%20y"), std::string::npos);
  EXPECT_EQ(page.body.find("<script>"), std::string::npos);
  EXPECT_EQ(page.body.find("three different names"), std::string::npos);
}

TEST_F(AuthorizeTest, ThePageShowsNoMoreThanTheStartOfALongAddress) {
  const Answer page =
      ask(app, {{"redirect_uri", "https://evil.example/" + std::string(3000, 'x')}});
  EXPECT_EQ(page.status, 400);
  EXPECT_EQ(page.body.find(std::string(300, 'x')), std::string::npos);
}

TEST_F(AuthorizeTest, ThePageSaysWhyALoopbackAddressDoesNotMatch) {
  const Answer page = ask(addPublic({kLoopback}), {{"redirect_uri", "http://localhost:9/cb"}});
  EXPECT_EQ(page.status, 400);
  EXPECT_NE(page.body.find("http://localhost:9/cb"), std::string::npos);
  EXPECT_NE(page.body.find("three different names"), std::string::npos);
}

// Addresses -----------------------------------------------------------------------

TEST_F(AuthorizeTest, ReturnsToThePortThatWasAskedFor) {
  const auto native = addPublic({kLoopback});
  const Changes changes = {{"redirect_uri", "http://127.0.0.1:51004/cb"}};
  const Answer answer = allow(ask(native, changes));
  EXPECT_EQ(header(answer, "Location").rfind("http://127.0.0.1:51004/cb?code=", 0), 0U);
  EXPECT_EQ(error(redeem(native, answer, {{"redirect_uri", kLoopback}})), "400 invalid_grant");
  EXPECT_EQ(error(redeem(native, answer)), "400 invalid_grant");
  EXPECT_EQ(redeem(native, answer, changes).status, 200);
}

TEST_F(AuthorizeTest, ReturnsToASchemeOfTheApplicationsOwn) {
  const auto native = addPublic({"com.example.app:/cb"});
  const Answer answer = allow(ask(native));
  EXPECT_EQ(header(answer, "Location").rfind("com.example.app:/cb?code=", 0), 0U);
  EXPECT_EQ(redeem(native, answer).status, 200);
}

// PKCE ----------------------------------------------------------------------------

TEST_F(AuthorizeTest, PkceIsAskedOfEverybodyWhoNeedsIt) {
  const Changes none = {{"code_challenge", ""}, {"code_challenge_method", ""}};
  EXPECT_EQ(errorOf(none), "invalid_request");
  EXPECT_EQ(returned(ask(addPublic({kCallback}), none), "error"), "invalid_request");
}

TEST_F(AuthorizeTest, AnApplicationThatNeedsNoPkceMayLeaveItOut) {
  const auto old = addConfidential(kCallback, false);
  const Answer answer = allow(ask(old, {{"code_challenge", ""}, {"code_challenge_method", ""}}));
  EXPECT_EQ(redeem(old, answer, {{"code_verifier", ""}}).status, 200);
}

TEST_F(AuthorizeTest, AVerifierWithoutAChallengeIsRefused) {
  const auto old = addConfidential(kCallback, false);
  const Answer answer = allow(ask(old, {{"code_challenge", ""}, {"code_challenge_method", ""}}));
  EXPECT_EQ(error(redeem(old, answer)), "400 invalid_grant");
}

TEST_F(AuthorizeTest, AChallengeHoldsAlsoForAnApplicationThatNeedsNone) {
  const auto old = addConfidential(kCallback, false);
  EXPECT_EQ(error(redeem(old, allow(ask(old)), {{"code_verifier", ""}})), "400 invalid_grant");
  EXPECT_EQ(redeem(old, allow(ask(old))).status, 200);
}

TEST_F(AuthorizeTest, AWeakChallengeIsRefusedToAll) {
  for (const auto& one : {app, addConfidential(kCallback, false)}) {
    for (const Changes& changes : std::vector<Changes>{{{"code_challenge_method", "plain"}},
                                                       {{"code_challenge_method", ""}},
                                                       {{"code_challenge", ""}},
                                                       {{"code_challenge", "short"}}}) {
      EXPECT_EQ(returned(ask(one, changes), "error"), "invalid_request") << encoded(changes);
    }
  }
}

TEST_F(AuthorizeTest, AVerifierThatFitsMayBeOfAnyLengthAndAlphabet) {
  const std::pair<std::string, std::string> kPairs[] = {
      {"abc", "ungWv48Bz-pBQUDeXa4iI7ADYaOWF3qctBD_YfIAFa0"},
      {"a b/+=\xC3\xA9", "YqBTXqmOMNyfO3j4hAOxFZZeaSLARfHl0cyjDzMO8ro"},
      {std::string(5000, 'v'), "kXpA23FakK8lv6JO7A0m-wkMnYkQSi56vJvCkA9nDd0"}};
  for (const auto& [verifier, challenge] : kPairs) {
    const Answer answer = allow(ask(app, {{"code_challenge", challenge}, {"prompt", "consent"}}));
    EXPECT_EQ(error(redeem(app, answer, {{"code_verifier", verifier + "x"}})), "400 invalid_grant");
    EXPECT_EQ(redeem(app, answer, {{"code_verifier", verifier}}).status, 200)
        << verifier.substr(0, 9);
  }
}

// What was agreed to before ---------------------------------------------------------

TEST_F(AuthorizeTest, IsNotAskedTwice) {
  EXPECT_EQ(ask(app).status, 200);
  logIn(app);
  const Answer again = ask(app);
  EXPECT_EQ(again.status, 302);
  EXPECT_EQ(returned(again, "state"), "a state");
  EXPECT_EQ(redeem(app, again).status, 200);
}

TEST_F(AuthorizeTest, IsAskedOfAnotherUserAndForAnotherApplication) {
  logIn(app);
  EXPECT_EQ(ask(app, {}, "bob").status, 200);
  EXPECT_EQ(ask(addConfidential(kCallback)).status, 200);
}

TEST_F(AuthorizeTest, IsAskedAgainForMore) {
  const auto wide = registered("profile files.read");
  logIn(wide);
  EXPECT_EQ(ask(wide, {{"scope", "profile files.read"}}).status, 200);
  EXPECT_EQ(ask(wide).status, 302);
}

TEST_F(AuthorizeTest, IsAskedAgainWhenTheLoginHasEnded) {
  logIn(app);
  store.open().access.endUser(grants::User("alice"), grants::Actor("alice"));
  EXPECT_EQ(ask(app).status, 200);
}

TEST_F(AuthorizeTest, IsAskedAgainWhenTheApplicationWants) {
  logIn(app);
  for (const char* prompt : {"consent", "login consent", "select_account"}) {
    EXPECT_EQ(ask(app, {{"prompt", prompt}}).status, 200) << prompt;
  }
}

TEST_F(AuthorizeTest, IsAskedEachTimeOnTheDeviceItself) {
  const auto native = addPublic({kLoopback, "com.example.app:/cb", kCallback});
  for (const char* address : {kLoopback, "com.example.app:/cb"}) {
    const Changes changes = {{"redirect_uri", address}};
    logIn(native, changes);
    EXPECT_EQ(ask(native, changes).status, 200) << address;
    EXPECT_EQ(returned(ask(native, {{"redirect_uri", address}, {"prompt", "none"}}), "error"),
              "consent_required");
  }
  EXPECT_EQ(ask(native, {{"redirect_uri", kCallback}}).status, 302);
}

TEST_F(AuthorizeTest, ALookAtTheHeadersIssuesNothing) {
  logIn(app);
  Request request = get("/oauth/authorize", encoded(question(app)));
  request.user = "alice";
  request.method = "HEAD";
  EXPECT_EQ(call(authorize, request).status, 200);
}

TEST_F(AuthorizeTest, ARequestMayComeAsAFormAndIsAsked) {
  logIn(app);
  Request request = post("/oauth/authorize", encoded(question(app)));
  request.user = "alice";
  const Answer page = call(authorize, request);
  EXPECT_EQ(page.status, 200);
  EXPECT_EQ(returned(allow(page), "state"), "a state");
}

TEST_F(AuthorizeTest, WhatIsNotAskedEndsNothing) {
  for (int i = 0; i < 8; ++i) logIn(app, {{"prompt", "consent"}});
  const auto logins = store.open().access.list({grants::User("alice"), app.identifier}).size();
  EXPECT_EQ(logins, 8U);
  EXPECT_EQ(ask(app).status, 200) << "a ninth login would end the first";
  EXPECT_EQ(errorOf({{"prompt", "none"}}), "interaction_required");
  logIn(app);
  EXPECT_EQ(store.open().access.list({grants::User("alice"), app.identifier}).size(), 8U);
}

// No page at all --------------------------------------------------------------------

TEST_F(AuthorizeTest, SaysWhyItCannotDoWithoutAPage) {
  EXPECT_EQ(errorOf({{"prompt", "none"}}, ""), "login_required");
  EXPECT_EQ(errorOf({{"prompt", "none"}}), "consent_required");
  logIn(app);
  EXPECT_EQ(returned(ask(app, {{"prompt", "none"}}), "code").size(), 64U);
}

TEST_F(AuthorizeTest, NoneStandsAlone) {
  for (const char* prompt : {"none consent", "login none", "none something_new"}) {
    EXPECT_EQ(errorOf({{"prompt", prompt}}), "invalid_request") << prompt;
  }
}

TEST_F(AuthorizeTest, NothingIsIssuedOnceTheApplicationIsDisabled) {
  logIn(app);
  store.open().applications.disable(app.identifier, grants::Actor("admin"));
  const Answer answer = ask(app, {{"prompt", "none"}});
  EXPECT_EQ(answer.status, 403);
  EXPECT_EQ(header(answer, "Location"), "");
}

}  // namespace
