// What an application asks for about the sign-in itself.

#include "service/protocol/endpoints.h"
#include "service/text/encoding.h"
#include "tests/service/oidc_test.h"

namespace {

using namespace service_test;
using ::testing::HasSubstr;
using ::testing::StartsWith;

class OidcSignInTest : public OidcTest {
 protected:
  void SetUp() override {
    OidcTest::SetUp();
    app_ = application();
  }

  Answer ask(const std::string& more, long long secondsAgo = 0) {
    return call(authorize, fromAlice(authorization(app_, more), secondsAgo));
  }
  /// Where the sign-in page leads on to.
  static Request next(const Answer& answer) {
    const std::string address = header(answer, "Location");
    EXPECT_THAT(address, StartsWith("/oauth/sign-in?next="));
    const std::string path = formDecode(address.substr(address.find('=') + 1)).value_or("");
    return get(path.substr(0, path.find('?')), path.substr(path.find('?') + 1));
  }

  grants::Registered app_;
};

TEST_F(OidcSignInTest, PromptLoginAsksForThePasswordOnce) {
  const Answer first = ask("&prompt=login");
  EXPECT_EQ(first.status, 302);
  support::Clock::advance(30);
  const Answer second = call(authorize, fromAlice(next(first), -30));
  EXPECT_EQ(second.status, 200);
  EXPECT_TRUE(returned(allowed(second, -30)).count("code"));
}

TEST_F(OidcSignInTest, ComingBackWithoutHavingSignedInIsNotEnough) {
  const Answer first = ask("&prompt=login", 1);
  const Answer second = call(authorize, fromAlice(next(first), 1));
  EXPECT_EQ(next(second).query.size(), next(first).query.size()) << "one mark, not two";
}

TEST_F(OidcSignInTest, MarkOfSomebodyElseIsNone) {
  const std::string mark = "&signed_in_since=" + std::to_string(kNow - 5) + ".AAAA";
  EXPECT_EQ(ask("&prompt=login" + mark).status, 302);
}

TEST_F(OidcSignInTest, MarkOfAnotherRequestIsNone) {
  const std::string query = next(ask("&prompt=login")).query;
  const std::string mark = query.substr(query.rfind('&'));
  ASSERT_THAT(mark, StartsWith("&signed_in_since="));
  support::Clock::advance(30);
  EXPECT_EQ(ask("&prompt=login" + mark, -30).status, 200);
  EXPECT_EQ(ask("&prompt=login&nonce=another" + mark, -30).status, 302);
}

TEST_F(OidcSignInTest, MarkIsGoodForAQuarterOfAnHour) {
  const Request back = next(ask("&prompt=login"));
  support::Clock::advance(900);
  EXPECT_EQ(call(authorize, fromAlice(back, -900)).status, 200);
  support::Clock::advance(1);
  EXPECT_EQ(call(authorize, fromAlice(back, -901)).status, 302);
}

TEST_F(OidcSignInTest, PasswordThatIsTooOldIsAskedForAgain) {
  EXPECT_EQ(ask("&max_age=100", 100).status, 200);
  EXPECT_THAT(header(ask("&max_age=100", 101), "Location"), StartsWith("/oauth/sign-in"));
}

TEST_F(OidcSignInTest, MaxAgeOfNothingIsSatisfiedByAFreshSignIn) {
  const Answer first = ask("&max_age=0", 10);
  support::Clock::advance(10);
  EXPECT_EQ(call(authorize, fromAlice(next(first), -10)).status, 200);
}

TEST_F(OidcSignInTest, WithoutAPageTheApplicationHears) {
  EXPECT_EQ(returned(ask("&prompt=none&max_age=100", 101))["error"], "login_required");
  EXPECT_EQ(returned(ask("&prompt=none"))["error"], "consent_required");
}

TEST_F(OidcSignInTest, RememberedConsentAsksNothingMoreAfterTheFreshSignIn) {
  login(app_);
  support::Clock::advance(30);
  const Answer answer = call(authorize, fromAlice(next(ask("&prompt=login", -30)), -30));
  EXPECT_TRUE(returned(answer).count("code"));
}

TEST_F(OidcSignInTest, RememberedLoginCarriesTheNewNonce) {
  login(app_, "&nonce=first");
  const Answer answer = ask("&nonce=second&prompt=none", 50);
  const Json::Value said = claims(redeemed(app_, returned(answer)["code"]));
  EXPECT_EQ(said["nonce"], "second");
  EXPECT_EQ(said["auth_time"].asInt64(), kNow - 50);
}

TEST_F(OidcSignInTest, WebServerAsksWithEveryRequest) {
  settings.signIn = SignIn::kWebServer;
  Request request = fromAlice(authorization(app_, "&prompt=login&max_age=0"));
  request.session.clear();
  EXPECT_EQ(call(authorize, request).status, 200);
}

TEST_F(OidcSignInTest, NobodyElseIsAnsweredForThanWhomTheApplicationShows) {
  const std::string hint = "&id_token_hint=" + login(app_)["id_token"].asString();
  EXPECT_TRUE(returned(ask(hint + "&prompt=none")).count("code"));
  Request bob = fromAlice(authorization(app_, hint + "&prompt=none"));
  bob.user = "bob";
  EXPECT_EQ(returned(call(authorize, bob))["error"], "login_required");
  bob = fromAlice(authorization(app_, hint));
  bob.user = "bob";
  Request back = fromAlice(next(call(authorize, bob)), -30);
  support::Clock::advance(30);
  EXPECT_TRUE(returned(call(authorize, back)).count("code")) << "alice it was to be";
  back.user = "bob";
  EXPECT_EQ(returned(call(authorize, back))["error"], "login_required");
}

TEST_F(OidcSignInTest, NorWhereTheWebServerAsks) {
  const std::string hint = "&id_token_hint=" + login(app_)["id_token"].asString();
  settings.signIn = SignIn::kWebServer;
  Request bob = fromAlice(authorization(app_, hint));
  bob.user = "bob";
  bob.session.clear();
  EXPECT_EQ(returned(call(authorize, bob))["error"], "login_required");
}

TEST_F(OidcSignInTest, TokenThatIsNotOursSaysNothingButWithoutAPage) {
  login(app_);
  EXPECT_TRUE(returned(ask("&id_token_hint=a.b.c")).count("code"));
  EXPECT_EQ(returned(ask("&id_token_hint=a.b.c&prompt=none"))["error"], "login_required");
}

TEST_F(OidcSignInTest, BadValuesAreRefused) {
  const std::string long_ = std::string(257, 'n');
  for (const std::string& more :
       {std::string("&max_age=-1"), std::string("&max_age=x"), std::string("&max_age=12345678901"),
        std::string("&max_age=1&max_age=1"), std::string("&id_token_hint=a&id_token_hint=a"),
        std::string("&nonce=a&nonce=a"), std::string("&nonce=%FF"), "&nonce=" + long_}) {
    EXPECT_EQ(returned(ask(more))["error"], "invalid_request") << more;
  }
}

TEST_F(OidcSignInTest, ChangedNonceMakesTheFormAnotherOne) {
  Answer page = ask("&nonce=mine");
  ASSERT_THAT(page.body, HasSubstr("name=\"nonce\" value=\"mine\""));
  page.body.replace(page.body.find("value=\"mine\""), 12, "value=\"yours\"");
  EXPECT_EQ(allowed(page).status, 403);
}

}  // namespace
