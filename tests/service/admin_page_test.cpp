#include "service/pages/form_token.h"
#include "tests/service/pages_test.h"

namespace {

using namespace service_test;
using support::Clock;

using AdminPageTest = PagesTest;

std::string clientIn(const Answer& answer) {
  return returned(answer, "client");
}

// New ones ------------------------------------------------------------------------

TEST_F(AdminPageTest, ANewApplicationsSecretIsShownToItsAdministratorForAQuarterOfAnHour) {
  settings.administrators.insert("other");
  const Answer made = send(admin, "admin", newForm());
  const std::string secret = secretOn(follow(made));
  EXPECT_EQ(secret.size(), 64U);
  EXPECT_EQ(secretOn(follow(made)), secret) << "loaded again";
  EXPECT_EQ(secretOn(follow(made, "other")), "");
  const std::string plain = "view=application&client=" + clientIn(made);
  EXPECT_EQ(secretOn(show(admin, "admin", plain)), "");
  Clock::setTo(std::time(nullptr) + 15 * 60 + 1);
  EXPECT_EQ(secretOn(follow(made)), "");
}

TEST_F(AdminPageTest, TheCardHasWhatAnApplicationWantsPasted) {
  const Answer page = follow(send(admin, "admin", newForm()));
  for (const std::string& text : {settings.issuer, kCallback, std::string("profile"),
                                  settings.issuer + "/.well-known/oauth-authorization-server",
                                  settings.issuer + "/oauth/token"}) {
    EXPECT_TRUE(has(page, "<code>" + text + "</code>")) << text;
  }
}

TEST_F(AdminPageTest, TheCardOfOneThatAsksWhoSomebodyIsHasWhatOpenIdConnectNeeds) {
  const grants::Registered application = add({grants::ApplicationName("App"),
                                              {grants::RedirectAddress(kCallback)},
                                              grants::Scope("openid profile")});
  const std::string query = "view=application&client=" + application.identifier.text();
  EXPECT_TRUE(has(show(admin, "admin", query), "/.well-known/openid-configuration<"));
}

TEST_F(AdminPageTest, AFormThatIsSentTwiceRegistersOnce) {
  const Changes form = newForm();
  const Answer first = send(admin, "admin", form);
  const Answer second = send(admin, "admin", form);
  EXPECT_EQ(clientIn(first), clientIn(second));
  EXPECT_EQ(secretOn(follow(first)), secretOn(follow(second)));
  EXPECT_EQ(returned(second, "done"), "registered");
  EXPECT_EQ(store.open().applications.all().size(), 1U);
}

TEST_F(AdminPageTest, ASentFormWithAnotherNameSaysThatItWasSentBefore) {
  Changes form = newForm();
  send(admin, "admin", form);
  form["name"] = "Another";
  const Answer again = send(admin, "admin", form);
  EXPECT_EQ(returned(again, "done"), "again");
  EXPECT_TRUE(has(follow(again), "had been sent before"));
  EXPECT_EQ(store.open().applications.all().size(), 1U);
}

TEST_F(AdminPageTest, TwoFormsRegisterTwo) {
  EXPECT_NE(clientIn(send(admin, "admin", newForm())), clientIn(send(admin, "admin", newForm())));
}

TEST_F(AdminPageTest, AFaultyFormIsTheSameFormAgain) {
  const Changes form = newForm({{"name", " "}});
  const Answer page = send(admin, "admin", form);
  EXPECT_EQ(page.status, 400);
  EXPECT_EQ(formsOf(page).at(0)["once"], form.at("once"));
}

TEST_F(AdminPageTest, APublicOneNeedsAnAddressAndNoSecret) {
  EXPECT_EQ(send(admin, "admin", newForm({{"kind", "public"}, {"redirect", ""}})).status, 400);
  const Answer made = send(admin, "admin",
                           newForm({{"kind", "public"},
                                    {"redirect", "com.example.app:/x\r\nhttp://127.0.0.1/y"},
                                    {"without_pkce", "1"}}));
  const auto found = store.open().applications.find(grants::ApplicationId(clientIn(made)));
  ASSERT_TRUE(found);
  EXPECT_EQ(found->kind, grants::ApplicationKind::kPublic);
  EXPECT_EQ(found->addresses.size(), 2U);
  EXPECT_TRUE(found->needsPkce);
  EXPECT_TRUE(has(follow(made), "None: it is a public application"));
}

TEST_F(AdminPageTest, ASchemeOfItsOwnIsForPublicOnes) {
  EXPECT_EQ(send(admin, "admin", newForm({{"redirect", "com.example.app:/x"}})).status, 400);
}

TEST_F(AdminPageTest, ANameDoesNotHideOrTurnAround) {
  for (const char* name : {"\u202Eexe.txt", "a\u2066b", "\u200B", "a\u2028b", "\uFEFF"}) {
    EXPECT_EQ(send(admin, "admin", newForm({{"name", name}})).status, 400) << name;
  }
  for (const char* name :
       {"\u05D0\u05DC\u05D1\u05D5\u05DD", "\u0645\u06CC\u200C\u062E", "\u65E5"}) {
    EXPECT_EQ(send(admin, "admin", newForm({{"name", name}})).status, 303) << name;
  }
}

TEST_F(AdminPageTest, OneThatActsForItselfNeedsNoAddress) {
  const Answer made = send(admin, "admin", newForm({{"redirect", ""}}));
  EXPECT_EQ(made.status, 303);
  EXPECT_TRUE(has(show(admin, "admin"), "Acts for itself alone"));
}

// Those that are there ------------------------------------------------------------

TEST_F(AdminPageTest, ASecretIsRenewedOnceByTwoClicks) {
  const grants::Registered application = addConfidential(kCallback);
  const Changes form = formOf(application, "renew");
  const std::string first = secretOn(follow(send(admin, "admin", form)));
  EXPECT_EQ(secretOn(follow(send(admin, "admin", form))), first);
  EXPECT_NE(first, application.secret->text());
  EXPECT_EQ(store.open().applications.secretOf(application.identifier)->text(), first);
}

TEST_F(AdminPageTest, AnAddressThatAnApplicationHasItKeeps) {
  const std::string old = "http://printer.example/old";
  const grants::Registered application = addConfidential(old);
  const Changes form = formOf(application, "change",
                              {{"name", "Renamed"}, {"scope.profile", "1"}, {"redirect", old}});
  EXPECT_EQ(returned(send(admin, "admin", form), "done"), "changed");
  Changes more = form;
  more["redirect"] = old + " https://printer.example/new";
  EXPECT_EQ(returned(send(admin, "admin", more), "done"), "changed");
  more["redirect"] = old + " http://printer.example/new";
  EXPECT_EQ(send(admin, "admin", more).status, 400);
  const auto found = store.open().applications.find(application.identifier);
  EXPECT_EQ(found->name.text(), "Renamed");
  ASSERT_EQ(found->addresses.size(), 2U);
  EXPECT_EQ(found->addresses[0].text(), old);
}

TEST_F(AdminPageTest, AScopeThatTheBoxDoesNotKnowAnyMoreIsKept) {
  const grants::Registered application = add({grants::ApplicationName("App"),
                                              {grants::RedirectAddress(kCallback)},
                                              grants::Scope("profile gone.scope")});
  Changes form = formOf(application, "change",
                        {{"name", "App"}, {"redirect", kCallback}, {"scope.gone.scope", "1"}});
  send(admin, "admin", form);
  EXPECT_EQ(store.open().applications.find(application.identifier)->scope.text(), "gone.scope");
  form["scope.gone.scope"] = "";
  form["scope.never.known"] = "1";
  EXPECT_EQ(send(admin, "admin", form).status, 400);
}

TEST_F(AdminPageTest, PkceIsSwitchedOffForOne) {
  const grants::Registered application = addConfidential(kCallback);
  const Changes form = formOf(application, "change",
                              {{"name", "App"},
                               {"redirect", kCallback},
                               {"scope.profile", "1"},
                               {"without_pkce", "1"},
                               {"logout", "https://app.example/bye"}});
  send(admin, "admin", form);
  const auto found = store.open().applications.find(application.identifier);
  EXPECT_FALSE(found->needsPkce);
  ASSERT_EQ(found->logoutAddresses.size(), 1U);
  EXPECT_TRUE(has(show(admin, "admin"), "Without PKCE"));
}

TEST_F(AdminPageTest, WhatIsGoneIsSaidToBeGone) {
  const grants::Registered application = addConfidential(kCallback);
  std::vector<Changes> forms;
  for (const char* action : {"change", "renew", "disable", "remove"}) {
    forms.push_back(formOf(application, action));
  }
  store.open().applications.remove(application.identifier, grants::Actor("other"));
  for (const Changes& form : forms) {
    EXPECT_EQ(returned(send(admin, "admin", form), "done"), "gone") << form.at("action");
  }
  const std::string query = "view=application&client=" + application.identifier.text();
  EXPECT_EQ(show(admin, "admin", query).status, 404);
}

TEST_F(AdminPageTest, OnesOfTheSameNameAreToldApart) {
  const grants::Registered first = addConfidential(kCallback);
  const grants::Registered second = addPublic({"https://app.example/other"});
  const Answer page = show(admin, "admin");
  for (const grants::Registered& one : {first, second}) {
    EXPECT_TRUE(has(page, "<code>" + one.identifier.text().substr(0, 8) + "…</code>"));
  }
  for (const char* text : {"Confidential", "Public", "https://app.example/other"}) {
    EXPECT_TRUE(has(page, text)) << text;
  }
}

TEST_F(AdminPageTest, AForgedFormChangesNothing) {
  const grants::Registered application = addConfidential(kCallback);
  settings.administrators.insert("other");
  for (const char* action : {"change", "renew", "disable", "remove"}) {
    Changes form = formOf(application, action);
    EXPECT_EQ(send(admin, "other", form).status, 403) << action;
    for (const std::string& forged : {std::string(), formToken(settings, "admin", "account.all"),
                                      form.at("form_token") + "x"}) {
      form["form_token"] = forged;
      EXPECT_EQ(send(admin, "admin", form).status, 403) << action;
    }
  }
  const auto found = store.open().applications.find(application.identifier);
  EXPECT_TRUE(found->isEnabled);
  EXPECT_EQ(store.open().applications.secretOf(application.identifier), application.secret);
}

// Access --------------------------------------------------------------------------

TEST_F(AdminPageTest, ALoginThatCanBeRenewedIsNotSaidToBeOver) {
  logIn(addConfidential(kCallback));
  Clock::setTo(std::time(nullptr) + 24 * 60 * 60);
  for (const char* query : {"view=access", "view=access&user=alice"}) {
    const Answer page = show(admin, "admin", query);
    EXPECT_TRUE(has(page, "Can renew until")) << query;
    EXPECT_TRUE(has(page, "Idle, can renew")) << query;
    EXPECT_FALSE(has(page, "xpired")) << query;
  }
}

TEST_F(AdminPageTest, AccessIsFoundByAPartOfTheUsersName) {
  logIn(addConfidential(kCallback));
  EXPECT_TRUE(has(show(admin, "admin", "view=access&contains=LIC"), "<bdi>alice</bdi>"));
  EXPECT_TRUE(has(show(admin, "admin", "view=access&contains=bob"), "No access fits"));
}

}  // namespace
