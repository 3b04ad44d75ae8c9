// Signing out for an application.

#include <filesystem>
#include <regex>

#include "service/text/encoding.h"
#include "tests/service/oidc_test.h"

namespace {

using namespace service_test;
using ::testing::HasSubstr;
using ::testing::StartsWith;

class OidcLogoutTest : public OidcTest {
 protected:
  void SetUp() override {
    OidcTest::SetUp();
    app_ = application();
    hint_ = "id_token_hint=" + login(app_)["id_token"].asString();
  }

  Answer ask(const std::string& query) {
    return call(logout, fromAlice(get("/oauth/logout", query)));
  }
  static bool isSignedOut(const Answer& answer) {
    return header(answer, "Set-Cookie").find("keldoauth") != std::string::npos;
  }
  static std::string formIn(const Answer& page) {
    static const std::regex kHidden("type=\"hidden\" name=\"([^\"]+)\" value=\"([^\"]*)\"");
    std::string form;
    for (auto found = std::sregex_iterator(page.body.begin(), page.body.end(), kHidden);
         found != std::sregex_iterator(); ++found) {
      form +=
          (form.empty() ? "" : "&") + (*found)[1].str() + "=" + percentEncode((*found)[2].str());
    }
    return form;
  }

  const std::string back_ = "&post_logout_redirect_uri=" + percentEncode(kGoodbye);
  grants::Registered app_;
  std::string hint_;
};

TEST_F(OidcLogoutTest, TokenOfTheUserIsEnough) {
  const Answer answer = ask(hint_ + back_ + "&state=a%26b");
  EXPECT_TRUE(isSignedOut(answer));
  EXPECT_EQ(header(answer, "Location"), kGoodbye + "?state=a%26b");
}

TEST_F(OidcLogoutTest, ExpiredTokenIsAsGood) {
  support::Clock::advance(1000000);
  EXPECT_TRUE(isSignedOut(ask(hint_)));
}

TEST_F(OidcLogoutTest, WithoutAnAddressThereIsAPage) {
  const Answer answer = ask(hint_);
  EXPECT_TRUE(isSignedOut(answer));
  EXPECT_EQ(answer.status, 200);
  EXPECT_THAT(answer.body, HasSubstr("You are signed out"));
}

TEST_F(OidcLogoutTest, WithoutATokenTheUserIsAsked) {
  const std::string client = "client_id=" + app_.identifier.text();
  const Answer page = ask(client + back_ + "&state=x");
  EXPECT_FALSE(isSignedOut(page));
  ASSERT_THAT(page.body, HasSubstr("Sign out?"));
  const Answer done = call(logout, fromAlice(post("/oauth/logout", formIn(page))));
  EXPECT_TRUE(isSignedOut(done));
  EXPECT_EQ(header(done, "Location"), kGoodbye + "?state=x");
}

TEST_F(OidcLogoutTest, TokenOfAnotherUserOrBoxMakesThePageAsk) {
  for (const std::string& query : {std::string("id_token_hint=nonsense"), hint_ + "x"}) {
    const Answer answer = ask(query);
    EXPECT_FALSE(isSignedOut(answer)) << query;
    EXPECT_THAT(answer.body, HasSubstr("Sign out?"));
  }
  Request request = fromAlice(get("/oauth/logout", hint_));
  request.user = "bob";
  EXPECT_FALSE(isSignedOut(call(logout, request)));
  settings.issuer = "https://other.example";
  EXPECT_FALSE(isSignedOut(ask(hint_)));
}

TEST_F(OidcLogoutTest, LostKeysMakeThePageAsk) {
  std::filesystem::remove(settings.signingKeysFile);
  EXPECT_THAT(ask(hint_).body, HasSubstr("Sign out?"));
}

TEST_F(OidcLogoutTest, NobodyIsSentToAnAddressThatIsNotRegistered) {
  const std::string client = "client_id=" + app_.identifier.text();
  for (const std::string& query :
       {hint_ + "&post_logout_redirect_uri=https%3A%2F%2Fevil.example%2F", back_.substr(1),
        client + "&post_logout_redirect_uri=" + percentEncode(kCallback), hint_ + back_ + "%2F",
        "client_id=nobody" + back_}) {
    const Answer answer = ask(query);
    EXPECT_EQ(answer.status, 400) << query;
    EXPECT_FALSE(isSignedOut(answer)) << query;
    EXPECT_EQ(header(answer, "Location"), "") << query;
  }
}

TEST_F(OidcLogoutTest, TokenAndIdentifierMustAgree) {
  EXPECT_EQ(ask(hint_ + "&client_id=" + application().identifier.text()).status, 400);
}

TEST_F(OidcLogoutTest, WhoIsNotSignedInGoesStraightBack) {
  const Answer answer = call(logout, get("/oauth/logout", hint_ + back_));
  EXPECT_EQ(header(answer, "Location"), kGoodbye);
}

TEST_F(OidcLogoutTest, FormOfAnotherSiteBecomesALink) {
  const Answer answer = call(logout, post("/oauth/logout", hint_ + back_));
  EXPECT_EQ(answer.status, 303);
  EXPECT_EQ(header(answer, "Location"), "/oauth/logout?" + hint_ + back_);
}

TEST_F(OidcLogoutTest, FormThatIsNotOursSignsNobodyOut) {
  const Answer page = ask("");
  std::string form = formIn(page);
  EXPECT_TRUE(isSignedOut(call(logout, fromAlice(post("/oauth/logout", form)))));
  Request other = fromAlice(post("/oauth/logout", form));
  other.session = std::string(32, 'b');
  EXPECT_FALSE(isSignedOut(call(logout, other)));
  form.back() = form.back() == 'A' ? 'B' : 'A';
  EXPECT_FALSE(isSignedOut(call(logout, fromAlice(post("/oauth/logout", "form_token=x&" + form)))));
}

TEST_F(OidcLogoutTest, DisabledApplicationSendsNobodyAnywhere) {
  ASSERT_TRUE(store.open().applications.disable(app_.identifier, grants::Actor("admin")));
  EXPECT_EQ(ask(hint_ + back_).status, 400);
}

TEST_F(OidcLogoutTest, DoubledParameterIsRefused) {
  EXPECT_EQ(ask(hint_ + "&" + hint_).status, 400);
}

}  // namespace
