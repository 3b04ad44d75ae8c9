#include "tests/service/pages_test.h"

#include <regex>

#include "service/pages/html.h"
#include "service/protocol/endpoints.h"

namespace service_test {

Answer PagesTest::show(Endpoint endpoint, const std::string& user, const std::string& query) {
  Request request = get("/page", query);
  request.user = user;
  return call(endpoint, request);
}

Answer PagesTest::send(Endpoint endpoint, const std::string& user, const Changes& fields) {
  Request request = post("/page", encoded(fields));
  request.user = user;
  return call(endpoint, request);
}

Changes PagesTest::formOf(const grants::Registered& application, const std::string& action,
                          const Changes& changes) {
  const std::string query = "view=application&client=" + application.identifier.text();
  for (Changes fields : formsOf(show(admin, "admin", query))) {
    if (fields["action"] != action) continue;
    for (const auto& [name, value] : changes) fields[name] = value;
    return fields;
  }
  ADD_FAILURE() << "no form to " << action;
  return {};
}

Changes PagesTest::newForm(const Changes& changes) {
  Changes fields = formsOf(show(admin, "admin", "view=register")).at(0);
  fields.insert({{"name", "New"}, {"redirect", kCallback}, {"scope.profile", "1"}});
  for (const auto& [name, value] : changes) fields[name] = value;
  return fields;
}

Answer PagesTest::follow(const Answer& answer, const std::string& user) {
  EXPECT_EQ(answer.status, 303) << answer.body;
  const std::string address = header(answer, "Location");
  return show(admin, user, address.substr(address.find('?') + 1));
}

std::string PagesTest::secretOn(const Answer& page) {
  static const std::regex kSecret(R"re(class="secret">([0-9a-f]{64})<)re");
  std::smatch found;
  return std::regex_search(page.body, found, kSecret) ? found.str(1) : std::string();
}

bool PagesTest::works(const Json::Value& login) {
  return call(whoami, withBearer(login["access_token"].asString(), get("/api/whoami"))).status ==
         200;
}

std::vector<Changes> formsOf(const Answer& page) {
  static const std::regex kForm(R"re(<form method="post"[\s\S]*?</form>)re");
  std::vector<Changes> forms;
  for (std::sregex_iterator at(page.body.begin(), page.body.end(), kForm), end; at != end; ++at) {
    Answer part;
    part.body = at->str();
    forms.push_back(hiddenFields(part));
  }
  return forms;
}

bool has(const Answer& page, const std::string& text) {
  return page.body.find(text) != std::string::npos;
}

namespace {

constexpr char kMarkup[] = R"('"><script src=//x>{}</script>&amp;)";

TEST_F(PagesTest, ShowWhatComesFromOutsideAsText) {
  settings.scopes = ScopeTable(std::vector<KnownScope>{{"profile", kMarkup}});
  const grants::Registered application =
      add({grants::ApplicationName(kMarkup),
           {grants::RedirectAddress(kCallback)},
           grants::Scope(std::string("profile ") + "\"><script>")});
  const std::string user = kMarkup;
  settings.administrators.insert(user);
  const Answer consent = ask(application, {{"state", kMarkup}}, user);
  EXPECT_TRUE(has(consent, "&lt;script src=//x&gt;{}"));
  EXPECT_EQ(hiddenFields(consent)["state"], kMarkup);
  allow(consent, user);
  const std::string client = "client=" + application.identifier.text();
  const std::string outside = encoded({{"done", kMarkup},
                                       {"page", kMarkup},
                                       {"with", kMarkup},
                                       {"contains", kMarkup},
                                       {"filter", kMarkup},
                                       {"secret_token", kMarkup}});
  std::vector<Answer> pages = {consent, show(account, user), show(account, user, outside)};
  for (const std::string& query :
       {std::string(), outside, client + "&view=application&" + outside,
        "view=access&user=" + encoded({{"x", user}}).substr(2), std::string("view=access"),
        "view=access&" + outside, "view=access&application=" + application.identifier.text(),
        "view=log&" + outside, std::string("view=log"), std::string("view=storage"),
        std::string("view=register"), std::string("view=application&client=%3Cscript%3E")}) {
    pages.push_back(show(admin, user, query));
  }
  pages.push_back(send(admin, "admin", newForm({{"name", ""}})));
  for (const Answer& page : pages) {
    EXPECT_FALSE(has(page, "<script")) << page.body;
    EXPECT_FALSE(has(page, "'\"><")) << page.body;
    EXPECT_TRUE(has(page, "</html>"));
    EXPECT_NE(header(page, "Content-Security-Policy").find("default-src 'none'"),
              std::string::npos);
  }
}

TEST_F(PagesTest, ShowATypedDraftAsTextAgain) {
  for (const char* field : {"name", "redirect", "logout"}) {
    const Answer page = send(admin, "admin", newForm({{field, kMarkup}, {"scope.profile", ""}}));
    EXPECT_EQ(page.status, 400) << field;
    EXPECT_FALSE(has(page, "<script")) << field;
    EXPECT_TRUE(has(page, "&lt;script src=//x&gt;{}")) << field;
  }
}

TEST_F(PagesTest, LeadBelowTheIssuersPathAlone) {
  settings.issuer = "https://box.example/auth";
  settings.basePath = "/auth";
  const grants::Registered application = addConfidential(kCallback);
  logIn(application);
  static const std::regex kLink(R"re((?:href|action)="([^"]*)")re");
  const std::string client = application.identifier.text();
  for (const Answer& page :
       {show(account, "alice"), show(admin, "admin"), show(admin, "admin", "view=access"),
        show(admin, "admin", "view=access&user=alice"), show(admin, "admin", "view=log&page=2"),
        show(admin, "admin", "view=storage"), show(admin, "admin", "view=register"),
        show(admin, "admin", "view=application&client=" + client), show(admin, "alice"),
        send(admin, "admin", {}), send(account, "alice", {}),
        ask(application, {{"prompt", "consent"}})}) {
    int links = 0;
    for (std::sregex_iterator at(page.body.begin(), page.body.end(), kLink), end; at != end; ++at) {
      const std::string link = (*at)[1];
      ++links;
      EXPECT_TRUE(link.rfind("/auth/", 0) == 0 || link == "#content") << link;
    }
    EXPECT_GE(links, 2);
  }
  EXPECT_EQ(header(send(admin, "admin", formOf(application, "disable")), "Location")
                .rfind("/auth/admin?", 0),
            0U);
  EXPECT_EQ(header(send(account, "alice", formsOf(show(account, "alice")).at(0)), "Location"),
            "/auth/account?done=ended");
}

TEST_F(PagesTest, AnswerNoOtherMethodAndNoOtherForm) {
  for (Endpoint endpoint : {account, admin}) {
    Request request = get("/page");
    request.user = "admin";
    request.method = "PUT";
    EXPECT_EQ(call(endpoint, request).status, 405);
    EXPECT_EQ(header(call(endpoint, request), "Allow"), "GET, HEAD, POST");
    request.method = "POST";
    request.contentType = "text/plain";
    EXPECT_EQ(call(endpoint, request).status, 400);
    request = get("/page", "a=%");
    request.user = "admin";
    EXPECT_EQ(call(endpoint, request).status, 400);
  }
}

TEST_F(PagesTest, AreForWhoeverIsSignedInAlone) {
  for (Endpoint endpoint : {account, admin}) {
    EXPECT_EQ(show(endpoint, "").status, 403) << "by the web server";
    settings.signIn = SignIn::kSystem;
    Request request = get(endpoint == account ? "/account" : "/admin");
    EXPECT_EQ(call(endpoint, request).status, 302);
    request = post(request.path, "");
    EXPECT_EQ(call(endpoint, request).status, 403);
    settings.signIn = SignIn::kWebServer;
  }
  EXPECT_EQ(show(admin, "alice").status, 403);
}

}  // namespace
}  // namespace service_test
