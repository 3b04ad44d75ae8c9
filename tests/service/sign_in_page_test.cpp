#include "service/pages/sign_in.h"

#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <map>
#include <string>
#include <utility>

#include "service/pages/admin_pages.h"
#include "service/people/htpasswd_edit.h"
#include "service/people/people.h"
#include "service/protocol/endpoints.h"
#include "service/text/encoding.h"
#include "tests/service/service_test.h"

namespace {

using namespace service_test;
using support::Clock;
using support::SystemLog;

class SignInPageTest : public ServiceTest {
 protected:
  void SetUp() override {
    World::SetUp();
    std::string folder = "/tmp/sign-in.XXXXXX";
    ASSERT_NE(mkdtemp(folder.data()), nullptr);
    folder_ = folder;
    settings.signIn = SignIn::kHtpasswd;
    settings.htpasswdFile = folder_ + "/users";
    settings.countersFile = folder_ + "/counters";
    setHtpasswdUser(settings.htpasswdFile, "alice", "right");
  }
  void TearDown() override {
    std::filesystem::remove_all(folder_);
    World::TearDown();
  }

  /// As the program does it, with the cookies that the browser has by now.
  Answer send(Endpoint endpoint, Request request) {
    request.isSecure = true;
    request.peer = peer_;
    for (const auto& [name, value] : cookies_) {
      request.cookie += (request.cookie.empty() ? "" : "; ") + name + "=" + value;
    }
    recognise(settings, request);
    last_ = request;
    Answer answer = call(endpoint, request);
    keepCookies(answer);
    return answer;
  }
  Answer show(const std::string& next = "") {
    return send(signInPage, get("/oauth/sign-in", next.empty() ? "" : "next=" + next));
  }
  Answer submit(const Answer& form, const std::string& user, const std::string& password) {
    return send(signInPage,
                post("/oauth/sign-in",
                     "user=" + percentEncode(user) + "&password=" + percentEncode(password) +
                         "&next=" + percentEncode(field(form, "next")) +
                         "&form_token=" + percentEncode(field(form, "form_token"))));
  }
  Answer signInAs(const std::string& user, const std::string& password) {
    return submit(show(), user, password);
  }
  /// Whom the next request is from.
  std::string who() {
    send(signInPage, get("/oauth/sign-in"));
    return last_.user;
  }

  static std::string field(const Answer& form, const std::string& name) {
    const std::string start = "name=\"" + name + "\" value=\"";
    const std::size_t begin = form.body.find(start);
    if (begin == std::string::npos) return {};
    const std::size_t from = begin + start.size();
    std::string value = form.body.substr(from, form.body.find('"', from) - from);
    for (std::size_t at = 0; (at = value.find("&amp;", at)) != std::string::npos; ++at) {
      value.replace(at, 5, "&");
    }
    return value;
  }

  std::map<std::string, std::string> cookies_;
  std::string peer_ = "192.0.2.1";
  Request last_;

 private:
  void keepCookies(const Answer& answer) {
    for (const auto& [name, value] : answer.headers) {
      if (name != "Set-Cookie") continue;
      const std::size_t equals = value.find('=');
      const std::string cookie = value.substr(0, equals);
      cookies_[cookie] = value.substr(equals + 1, value.find(';') - equals - 1);
      if (cookies_[cookie].empty()) cookies_.erase(cookie);
    }
  }

  std::string folder_;
};

TEST_F(SignInPageTest, WhoSignsInIsKnownAfterwards) {
  EXPECT_EQ(who(), "");
  const Answer answer = signInAs("alice", "right");
  EXPECT_EQ(answer.status, 303);
  EXPECT_EQ(header(answer, "Location"), "/account");
  EXPECT_EQ(who(), "alice");
  EXPECT_EQ(last_.session.size(), 32U);
  EXPECT_GT(last_.authTime, 1700000000);
}

TEST_F(SignInPageTest, TheSessionIsANewOneAtEverySignIn) {
  cookies_["__Host-keldoauth"] = "planted";
  signInAs("alice", "right");
  const std::string first = cookies_["__Host-keldoauth"];
  EXPECT_NE(first, "planted");
  signInAs("alice", "right");
  EXPECT_NE(cookies_["__Host-keldoauth"], first);
}

TEST_F(SignInPageTest, AWrongPasswordAndAMissingUserLookTheSame) {
  Answer known = signInAs("alice", "wrong");
  const Answer unknown = signInAs("carol", "wrong");
  EXPECT_EQ(known.status, 403);
  EXPECT_EQ(unknown.status, 403);
  EXPECT_NE(known.body.find("Name or password is wrong."), std::string::npos);
  EXPECT_NE(unknown.body.find("Name or password is wrong."), std::string::npos);
  EXPECT_EQ(who(), "");
}

TEST_F(SignInPageTest, ThePasswordIsNeverShownAgain) {
  const Answer answer = signInAs("alice", "wr0ng-pass-word");
  EXPECT_EQ(answer.body.find("wr0ng"), std::string::npos);
}

TEST_F(SignInPageTest, WhatIsTypedGetsIntoThePageEscaped) {
  const Answer answer = signInAs("\"><script>{}{}", "x");
  EXPECT_EQ(answer.body.find("<script"), std::string::npos);
  EXPECT_NE(answer.body.find("&quot;&gt;&lt;script&gt;{}{}"), std::string::npos);
  EXPECT_FALSE(field(answer, "form_token").empty());
}

TEST_F(SignInPageTest, ThePageLeadsBackToWhatWasAskedFor) {
  const Answer first =
      signInFirst(settings, get("/oauth/authorize", "client_id=a%2Fb&state=x+y&scope=z"));
  EXPECT_EQ(first.status, 302);
  const std::string location = header(first, "Location");
  const std::string start = "/oauth/sign-in?next=";
  ASSERT_EQ(location.substr(0, start.size()), start);
  const Answer form = show(location.substr(start.size()));
  EXPECT_EQ(header(submit(form, "alice", "right"), "Location"),
            "/oauth/authorize?client_id=a%2Fb&state=x+y&scope=z");
}

TEST_F(SignInPageTest, AFailureKeepsTheWayBack) {
  const Answer again = submit(show("%2Fadmin%3Fview%3Dlog"), "alice", "wrong");
  EXPECT_EQ(header(submit(again, "alice", "right"), "Location"), "/admin?view=log");
}

TEST_F(SignInPageTest, TheWayBackLeadsNowhereElse) {
  for (const char* next : {"https://evil.example/",
                           "//evil.example/",
                           "/\\evil.example",
                           "/account@evil.example",
                           "/account.evil.example",
                           "/accounts",
                           "/",
                           "",
                           "account",
                           "/style/service.css",
                           "/oauth/token",
                           "/oauth/sign-in",
                           "/oauth/sign-out",
                           "/account?a\\b",
                           "/account?a b",
                           "/account?\r\nSet-Cookie: a",
                           "/account?\xC3\xAB",
                           "/account/../evil",
                           "/account\t",
                           "/account#x",
                           "/account?x#y",
                           "javascript:/account",
                           " /account"}) {
    EXPECT_EQ(safeNext(settings, next), "") << next;
    const Answer form = show(percentEncode(next));
    EXPECT_EQ(header(submit(form, "alice", "right"), "Location"), "/account") << next;
  }
}

TEST_F(SignInPageTest, OurOwnPagesAreAWayBack) {
  for (const char* next : {"/account", "/account/", "/account?a=b&c", "/admin", "/admin?view=log",
                           "/oauth/authorize?x=%00", "/oauth/logout?state=a", "/account//x"}) {
    EXPECT_EQ(safeNext(settings, next), next);
  }
}

TEST_F(SignInPageTest, TheIssuersPathIsPartOfTheWay) {
  settings.basePath = "/auth";
  EXPECT_EQ(safeNext(settings, "/auth/account"), "/auth/account");
  EXPECT_EQ(safeNext(settings, "/account"), "");
  EXPECT_EQ(header(signInAs("alice", "right"), "Location"), "/auth/account");
  EXPECT_EQ(header(signInFirst(settings, get("/auth/admin")), "Location"),
            "/auth/oauth/sign-in?next=%2Fauth%2Fadmin");
}

TEST_F(SignInPageTest, AForgedWayBackDoesNotFitTheForm) {
  const Answer form = show();
  const Answer answer = send(
      signInPage, post("/oauth/sign-in", "user=alice&password=right&next=%2Fadmin&form_token=" +
                                             percentEncode(field(form, "form_token"))));
  EXPECT_EQ(answer.status, 403);
  EXPECT_EQ(who(), "");
}

TEST_F(SignInPageTest, AnotherSiteCannotSignItsVisitorIn) {
  const Answer attackers = show();
  cookies_.clear();
  EXPECT_EQ(submit(attackers, "alice", "right").status, 403);
  EXPECT_EQ(who(), "");
}

TEST_F(SignInPageTest, AnotherBrowsersFormDoesNotFit) {
  const Answer attackers = show();
  cookies_.clear();
  show();
  EXPECT_EQ(submit(attackers, "alice", "right").status, 403);
}

TEST_F(SignInPageTest, TwoPagesAtTheSameTimeBothWork) {
  const Answer one = show();
  show();
  EXPECT_EQ(submit(one, "alice", "right").status, 303);
}

TEST_F(SignInPageTest, AnOldFormIsShownAnew) {
  Clock::setTo(1700000000);
  const Answer form = show();
  Clock::advance(15 * 60 + 1);
  const Answer again = submit(form, "alice", "right");
  EXPECT_EQ(again.status, 403);
  EXPECT_EQ(submit(again, "alice", "right").status, 303);
}

TEST_F(SignInPageTest, WhoTriesTooOftenIsToldWhenToComeBack) {
  Clock::setTo(1700000000);
  for (int i = 0; i < 10; ++i) signInAs("user" + std::to_string(i), "wrong");
  const Answer answer = signInAs("alice", "right");
  EXPECT_EQ(answer.status, 429);
  EXPECT_EQ(header(answer, "Retry-After"), "60");
  EXPECT_NE(answer.body.find("Please wait a minute"), std::string::npos);
  EXPECT_EQ(who(), "");
}

TEST_F(SignInPageTest, ABrowserThatIsKnownIsNotKeptOutByStrangers) {
  Clock::setTo(1700000000);
  signInAs("alice", "right");
  const auto known = cookies_;
  cookies_.clear();
  for (int i = 0; i < 20; ++i) {
    peer_ = "198.51.100." + std::to_string(i);
    signInAs("alice", "wrong");
  }
  peer_ = "192.0.2.1";
  EXPECT_EQ(signInAs("alice", "right").status, 429);
  cookies_ = {{"__Host-keldoauth-browser", known.at("__Host-keldoauth-browser")}};
  EXPECT_EQ(signInAs("alice", "right").status, 303);
}

TEST_F(SignInPageTest, ADirectoryThatCannotSayIsTrouble) {
  std::filesystem::remove(settings.htpasswdFile);
  EXPECT_THROW(signInAs("alice", "right"), DirectoryTrouble);
}

TEST_F(SignInPageTest, TheWordOfTheWebServerDoesNotCountHere) {
  Request request = get("/admin");
  request.user = "admin";
  recognise(settings, request);
  EXPECT_EQ(request.user, "");
}

TEST_F(SignInPageTest, TwoSessionsAtOnceAreNone) {
  signInAs("alice", "right");
  Request request = get("/account");
  request.isSecure = true;
  request.cookie = "__Host-keldoauth=" + cookies_["__Host-keldoauth"] +
                   "; __Host-keldoauth=" + cookies_["__Host-keldoauth"];
  recognise(settings, request);
  EXPECT_EQ(request.user, "");
  EXPECT_NE(call(signInPage, request).body.find("two sign-ins"), std::string::npos);
}

TEST_F(SignInPageTest, SigningOutTakesTheSessionAway) {
  signInAs("alice", "right");
  const Answer asked = send(signOutPage, get("/oauth/sign-out"));
  EXPECT_EQ(asked.status, 200);
  const Answer done =
      send(signOutPage,
           post("/oauth/sign-out", "form_token=" + percentEncode(field(asked, "form_token"))));
  EXPECT_EQ(done.status, 303);
  EXPECT_EQ(header(done, "Location"), "/oauth/sign-out");
  EXPECT_EQ(who(), "");
  EXPECT_NE(send(signOutPage, get("/oauth/sign-out")).body.find("You are signed out"),
            std::string::npos);
}

TEST_F(SignInPageTest, NobodyElseCanSignTheUserOut) {
  signInAs("alice", "right");
  const std::string old = field(send(signOutPage, get("/oauth/sign-out")), "form_token");
  signInAs("alice", "right");
  for (const std::string& token : {std::string(), std::string("x"), old}) {
    const Answer answer =
        send(signOutPage, post("/oauth/sign-out", "form_token=" + percentEncode(token)));
    EXPECT_EQ(answer.status, 403);
    EXPECT_EQ(who(), "alice");
  }
}

TEST_F(SignInPageTest, OtherPagesHaveAButtonToSignOut) {
  EXPECT_EQ(signOutForm(settings, last_), "");
  signInAs("alice", "right");
  who();
  EXPECT_NE(signOutForm(settings, last_).find("action=\"/oauth/sign-out\""), std::string::npos);
}

TEST_F(SignInPageTest, ANewPasswordEndsTheSessionsOfTheOld) {
  signInAs("alice", "right");
  setHtpasswdUser(settings.htpasswdFile, "alice", "new");
  EXPECT_EQ(who(), "");
  signInAs("alice", "new");
  EXPECT_EQ(who(), "alice");
  removeHtpasswdUser(settings.htpasswdFile, "alice");
  EXPECT_EQ(who(), "");
}

TEST_F(SignInPageTest, WhereTheWebServerAsksThereIsNoSuchPage) {
  settings.signIn = SignIn::kWebServer;
  EXPECT_EQ(send(signInPage, get("/oauth/sign-in")).status, 404);
  EXPECT_EQ(send(signOutPage, get("/oauth/sign-out")).status, 404);
  EXPECT_EQ(signInFirst(settings, get("/account")).status, 403);
}

TEST_F(SignInPageTest, WhomTheWebServerNamesHasJustSignedIn) {
  settings.signIn = SignIn::kWebServer;
  Clock::setTo(1700000000);
  Request request = get("/account");
  request.user = "alice";
  recognise(settings, request);
  EXPECT_EQ(request.user, "alice");
  EXPECT_EQ(request.authTime, 1700000000);
  EXPECT_EQ(request.session, "");
}

TEST_F(SignInPageTest, AFormOfWhoIsSignedOutIsNotSentAgain) {
  const Answer answer = signInFirst(settings, post("/admin", "a=b"));
  EXPECT_EQ(answer.status, 403);
  EXPECT_NE(answer.body.find("href=\"/oauth/sign-in\""), std::string::npos);
}

TEST_F(SignInPageTest, OddRequestsAreRefused) {
  EXPECT_EQ(send(signInPage, post("/oauth/sign-in", "user=a&user=b")).status, 400);
  EXPECT_EQ(send(signInPage, post("/oauth/sign-in", "user=%zz")).status, 400);
  Request request = post("/oauth/sign-in", "user=a");
  request.contentType = "text/plain";
  EXPECT_EQ(send(signInPage, request).status, 400);
  request.method = "PUT";
  EXPECT_EQ(send(signInPage, request).status, 405);
  EXPECT_EQ(send(signOutPage, request).status, 405);
}

TEST_F(SignInPageTest, TheAdministratorsPagesAskForAUser) {
  const Answer answer = send(admin, get("/admin", "view=log"));
  EXPECT_EQ(answer.status, 302);
  EXPECT_EQ(header(answer, "Location"), "/oauth/sign-in?next=%2Fadmin%3Fview%3Dlog");
}

/// A request for a code of an application that is there.
std::string authorization(const grants::Registered& application) {
  return "client_id=" + application.identifier.text() +
         "&response_type=code&scope=profile&state=s&code_challenge_method=S256&code_challenge="
         "E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM";
}

TEST_F(SignInPageTest, AnApplicationsRequestWaitsForTheSignIn) {
  const std::string query = authorization(registered());
  const Answer answer = send(authorize, get("/oauth/authorize", query));
  ASSERT_EQ(answer.status, 302);
  const std::string location = header(answer, "Location");
  const Answer form = show(location.substr(location.find('=') + 1));
  const Answer back = submit(form, "alice", "right");
  EXPECT_EQ(header(back, "Location"), "/oauth/authorize?" + query);
  const Answer consent = send(authorize, get("/oauth/authorize", query));
  EXPECT_NE(consent.body.find("<bdi>alice</bdi>"), std::string::npos);
}

/// It comes without cookies: that it is nobody's says nothing.
TEST_F(SignInPageTest, AnApplicationsFormBecomesALink) {
  const std::string query = authorization(registered());
  const Answer answer = send(authorize, post("/oauth/authorize", query));
  EXPECT_EQ(answer.status, 303);
  EXPECT_EQ(header(answer, "Location"), "/oauth/authorize?" + query);
  EXPECT_EQ(send(authorize, post("/oauth/authorize", query + "&x=\r\ny")).status, 403);
}

TEST_F(SignInPageTest, CookiesAreForTlsAloneWhereAnotherProgramEndsIt) {
  const Request request = get("/oauth/sign-in");
  for (const auto& [issuer, name] : {std::pair{"http://127.0.0.1:8480", "keldoauth-form="},
                                     {"https://box.example", "__Host-keldoauth-form="}}) {
    settings.issuer = issuer;
    Request known = request;
    recognise(settings, known);
    EXPECT_EQ(header(call(signInPage, known), "Set-Cookie").rfind(name, 0), 0U) << issuer;
  }
}

}  // namespace
