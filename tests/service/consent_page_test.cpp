#include "service/pages/consent_page.h"

#include "service/protocol/endpoints.h"
#include "tests/service/pages_test.h"

namespace {

using namespace service_test;

class ConsentPageTest : public PagesTest {
 protected:
  Answer decide(Changes fields, const std::string& user = "alice") {
    fields["decision"] = "allow";
    return send(authorize, user, fields);
  }
};

TEST_F(ConsentPageTest, SaysWhatItWouldBeAbleToDoAndWhereTheAnswerGoes) {
  const Answer page = ask(addConfidential(kCallback));
  for (const char* text : {"App</bdi> asks", "See who you are", "https://app.example<", "alice"}) {
    EXPECT_TRUE(has(page, text)) << text;
  }
  EXPECT_FALSE(has(page, "can say that it is"));
}

TEST_F(ConsentPageTest, WarnsWhereAnybodyCouldBeTheApplication) {
  const Answer loopback =
      ask(addPublic({"http://127.0.0.1/x"}), {{"redirect_uri", "http://127.0.0.1:4711/x"}});
  EXPECT_TRUE(has(loopback, "http://127.0.0.1:4711<"));
  EXPECT_TRUE(has(loopback, "Any program there can say that it is"));
  const Answer privateUse = ask(addPublic({"com.example.app:/x"}));
  EXPECT_TRUE(has(privateUse, "com.example.app:<"));
  EXPECT_TRUE(has(privateUse, "Another app can say that it is"));
}

TEST_F(ConsentPageTest, SaysWhoseWordTheNameIs) {
  grants::NewApplication application{grants::ApplicationName("App"),
                                     {grants::RedirectAddress(kCallback)},
                                     grants::Scope("profile")};
  EXPECT_FALSE(has(ask(add(application)), "its name is its own word"));
  application.registersItself = true;
  EXPECT_TRUE(has(ask(add(application)), "its name is its own word"));
}

TEST_F(ConsentPageTest, LeadsToTheSignInOfSomebodyElseAndBack) {
  const grants::Registered application = addConfidential(kCallback);
  EXPECT_TRUE(has(ask(application), "Close all windows of the browser"));
  settings.signIn = SignIn::kSystem;
  EXPECT_TRUE(has(ask(application), "href=\"/oauth/sign-in?next=%2Foauth%2Fauthorize%3F"));
}

TEST_F(ConsentPageTest, ATokenCoversAllThatIsDecidedAbout) {
  const grants::Registered application = addConfidential(kCallback);
  const grants::Registered other = addConfidential(kCallback);
  const Changes fields =
      hiddenFields(ask(application, {{"nonce", "a nonce"}, {"redirect_uri", kCallback}}));
  const Changes changed = {{"client_id", other.identifier.text()},
                           {"scope", "profile profile.more"},
                           {"state", "another"},
                           {"nonce", "another"},
                           {"code_challenge", std::string(43, 'x')},
                           {"redirect_uri", "https://app.example/callback/"},
                           {"form_token", "x"}};
  for (const auto& [name, value] : changed) {
    ASSERT_EQ(fields.count(name), 1U) << name;
    Changes forged = fields;
    forged[name] = value;
    EXPECT_EQ(returned(decide(forged), "code"), "") << name;
    forged[name] = "";
    // Without a scope it is the whole of the application's: the same.
    if (name != "scope") {
      EXPECT_EQ(returned(decide(forged), "code"), "") << name;
    }
  }
  EXPECT_EQ(decide(fields, "bob").status, 403);
  EXPECT_EQ(returned(decide(fields), "code").size(), 64U);
}

}  // namespace
