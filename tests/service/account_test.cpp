#include "service/pages/account.h"

#include "service/pages/form_token.h"
#include "tests/service/pages_test.h"

namespace {

using namespace service_test;
using support::Clock;

class AccountTest : public PagesTest {
 protected:
  std::vector<Changes> forms(const std::string& user = "alice") {
    return formsOf(show(account, user));
  }
  std::string done(const std::string& user, const Changes& fields) {
    const Answer answer = send(account, user, fields);
    return answer.status == 303 ? returned(answer, "done") : std::to_string(answer.status);
  }
};

TEST_F(AccountTest, SaysWhatAnApplicationCanDoInWords) {
  logIn(addConfidential(kCallback));
  const Answer page = show(account, "alice");
  for (const char* text :
       {"<bdi>App</bdi>", "See who you are", "Since", "Last used", "Can renew until", "In use"}) {
    EXPECT_TRUE(has(page, text)) << text;
  }
  EXPECT_FALSE(has(page, "xpired"));
  EXPECT_FALSE(has(show(account, "bob"), "<bdi>App</bdi>"));
}

TEST_F(AccountTest, ALoginThatCanBeRenewedIsIdleAndNotOver) {
  logIn(addConfidential(kCallback));
  Clock::setTo(std::time(nullptr) + 24 * 60 * 60);
  const Answer page = show(account, "alice");
  EXPECT_TRUE(has(page, "Idle, can renew"));
  EXPECT_TRUE(has(page, "Can renew until"));
}

TEST_F(AccountTest, AllAccessOfAnApplicationIsTakenBackOnce) {
  const grants::Registered application = addConfidential(kCallback);
  const Json::Value first = logIn(application, {{"prompt", "consent"}});
  const Json::Value second = logIn(application, {{"prompt", "consent"}});
  const Changes form = forms().at(2);
  EXPECT_EQ(form.at("what"), "application." + application.identifier.text());
  EXPECT_EQ(done("alice", form), "ended");
  EXPECT_EQ(done("alice", form), "gone");
  EXPECT_FALSE(works(first));
  EXPECT_FALSE(works(second));
}

TEST_F(AccountTest, OneSignInIsEndedAndTheOtherStays) {
  const grants::Registered application = addConfidential(kCallback);
  const Json::Value first = logIn(application, {{"prompt", "consent"}});
  const Json::Value second = logIn(application, {{"prompt", "consent"}});
  EXPECT_EQ(done("alice", forms().at(0)), "ended");
  EXPECT_NE(works(first), works(second));
}

TEST_F(AccountTest, AFormOfAnotherUserIsNone) {
  const Json::Value login = logIn(addConfidential(kCallback));
  for (const Changes& form : forms()) EXPECT_EQ(done("bob", form), "403");
  EXPECT_TRUE(works(login));
}

/// A handle that somebody found out is no use, were its form's token right, too.
TEST_F(AccountTest, AHandleOfAnotherUserEndsNothing) {
  const grants::Registered application = addConfidential(kCallback);
  const Json::Value first = logIn(application, {{"prompt", "consent"}});
  const Json::Value second = logIn(application, {{"prompt", "consent"}});
  for (const Changes& form : forms()) {
    const std::string& what = form.at("what");
    EXPECT_EQ(done("bob",
                   {{"what", what}, {"form_token", formToken(settings, "bob", "account." + what)}}),
              "gone");
  }
  EXPECT_TRUE(works(first));
  EXPECT_TRUE(works(second));
}

TEST_F(AccountTest, ATokenCoversWhatIsTakenBack) {
  const Json::Value login = logIn(addConfidential(kCallback));
  Changes form = forms().at(0);
  for (const char* what : {"all", "", "application.", "login.token.1.x"}) {
    form["what"] = what;
    EXPECT_EQ(done("alice", form), "403") << what;
  }
  EXPECT_TRUE(works(login));
}

TEST_F(AccountTest, AForgedOrOldTokenIsNone) {
  const Json::Value login = logIn(addConfidential(kCallback));
  const Changes form = forms().at(0);
  const std::string token = form.at("form_token");
  for (const std::string& forged :
       {std::string(), std::string("x"), token + "x", "9" + token, token.substr(1),
        formToken(settings, "alice", "admin"), formToken(settings, "alice", "consent")}) {
    Changes changed = form;
    changed["form_token"] = forged;
    EXPECT_EQ(done("alice", changed), "403") << forged;
  }
  EXPECT_TRUE(works(login));
  Clock::setTo(std::time(nullptr) + 15 * 60 + 1);
  EXPECT_EQ(done("alice", form), "403");
}

TEST_F(AccountTest, ADoubledFieldIsRefused) {
  logIn(addConfidential(kCallback));
  Request request = post("/account", encoded(forms().at(0)) + "&what=all");
  request.user = "alice";
  EXPECT_EQ(call(account, request).status, 403);
}

/// As another program may have stored them, which no bound holds for.
TEST_F(AccountTest, OfVeryManySignInsTheNewestAreShown) {
  logIn(addConfidential(kCallback));
  sql("WITH RECURSIVE more(n) AS (SELECT 1 UNION ALL SELECT n + 1 FROM more WHERE n < 99) "
      "INSERT INTO oauth_token(username, client_id, scope, refresh_token, access_token, "
      "expired_time, flow_type, state, ip) SELECT username, client_id, scope, 'r' || n, "
      "'a' || n, expired_time, flow_type, state, ip FROM oauth_token, more");
  const Answer page = show(account, "alice");
  EXPECT_TRUE(has(page, "100 sign-ins"));
  EXPECT_TRUE(has(page, "These are the newest of them"));
  EXPECT_EQ(formsOf(page).size(), 20U + 2U);
  EXPECT_EQ(done("alice", formsOf(page).at(20)), "ended");
  EXPECT_TRUE(has(show(account, "alice"), "No application has access"));
}

TEST_F(AccountTest, EverythingIsTakenBackAtOnce) {
  const Json::Value login = logIn(addConfidential(kCallback));
  EXPECT_EQ(done("alice", forms().back()), "ended");
  EXPECT_FALSE(works(login));
  EXPECT_TRUE(has(show(account, "alice"), "No application has access in your name"));
}

}  // namespace
