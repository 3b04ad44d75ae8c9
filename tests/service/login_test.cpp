#include "tests/service/login_test.h"

#include <regex>

#include "service/protocol/endpoints.h"
#include "service/text/encoding.h"

namespace service_test {
namespace {

std::string unescaped(std::string text) {
  const std::pair<const char*, const char*> kEntities[] = {
      {"&lt;", "<"}, {"&gt;", ">"}, {"&quot;", "\""}, {"&#39;", "'"}, {"&amp;", "&"}};
  for (const auto& [entity, character] : kEntities) {
    text = std::regex_replace(text, std::regex(entity), character);
  }
  return text;
}

}  // namespace

std::string encoded(const Changes& parameters) {
  std::string text;
  for (const auto& [name, value] : parameters) {
    if (value.empty()) continue;
    text += (text.empty() ? "" : "&") + name + "=" + percentEncode(value);
  }
  return text;
}

grants::Registered LoginTest::add(const grants::NewApplication& application) {
  const auto added = store.open().applications.add(application, grants::Actor("admin"));
  EXPECT_TRUE(added);
  return *added;
}

grants::Registered LoginTest::addPublic(const std::vector<std::string>& addresses) {
  grants::NewApplication application{grants::ApplicationName("App"), {}, grants::Scope("profile")};
  for (const std::string& address : addresses) application.addresses.emplace_back(address);
  application.kind = grants::ApplicationKind::kPublic;
  return add(application);
}

grants::Registered LoginTest::addConfidential(const std::string& address, bool needsPkce) {
  grants::NewApplication application{
      grants::ApplicationName("App"), {grants::RedirectAddress(address)}, grants::Scope("profile")};
  application.needsPkce = needsPkce;
  return add(application);
}

Changes LoginTest::question(const grants::Registered& application, const Changes& changes) {
  Changes asked = {{"response_type", "code"},      {"client_id", application.identifier.text()},
                   {"scope", "profile"},           {"state", "a state"},
                   {"code_challenge", kChallenge}, {"code_challenge_method", "S256"}};
  for (const auto& [name, value] : changes) asked[name] = value;
  return asked;
}

Answer LoginTest::ask(const grants::Registered& application, const Changes& changes,
                      const std::string& user) {
  Request request = get("/oauth/authorize", encoded(question(application, changes)));
  request.user = user;
  return call(authorize, request);
}

Answer LoginTest::allow(const Answer& page, const std::string& user) {
  EXPECT_EQ(page.status, 200);
  Changes fields = hiddenFields(page);
  fields["decision"] = "allow";
  Request request = post("/oauth/authorize", encoded(fields));
  request.user = user;
  return call(authorize, request);
}

Answer LoginTest::redeem(const grants::Registered& application, const Answer& answer,
                         const Changes& changes) {
  Changes form = {{"grant_type", "authorization_code"},
                  {"code", returned(answer, "code")},
                  {"code_verifier", kVerifier},
                  {"client_id", application.identifier.text()},
                  {"client_secret", application.secret ? application.secret->text() : ""}};
  for (const auto& [name, value] : changes) form[name] = value;
  return call(token, post("/oauth/token", encoded(form)));
}

Json::Value LoginTest::logIn(const grants::Registered& application, const Changes& changes) {
  const Answer answer =
      redeem(application, allow(ask(application, changes)),
             {{"redirect_uri",
               changes.count("redirect_uri") != 0 ? changes.at("redirect_uri") : std::string()}});
  EXPECT_EQ(answer.status, 200) << answer.body;
  return json(answer);
}

Changes hiddenFields(const Answer& page) {
  static const std::regex kField(R"re(type="hidden" name="([^"]*)" value="([^"]*)")re");
  Changes fields;
  for (std::sregex_iterator at(page.body.begin(), page.body.end(), kField), end; at != end; ++at) {
    fields[(*at)[1]] = unescaped((*at)[2]);
  }
  return fields;
}

std::string returned(const Answer& answer, const std::string& name) {
  const std::string address = header(answer, "Location");
  const auto parameters = Parameters::parse(address.substr(address.find('?') + 1));
  return parameters ? parameters->value(name) : std::string();
}

}  // namespace service_test
