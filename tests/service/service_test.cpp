#include "tests/service/service_test.h"

#include <json/reader.h>
#include <nettle/base64.h>

#include <sstream>

#include "service/text/encoding.h"

namespace service_test {

ServiceTest::ServiceTest() {
  settings.issuer = "https://box.example";
  settings.scopes = ScopeTable(
      std::vector<KnownScope>{{"files.read", "See your files"}, {"profile", "See who you are"}});
  settings.initialAccessToken = kInitialToken;
  settings.formKey = std::string(64, 'f');
  settings.sessionKey = std::string(64, 's');
  settings.administrators = {"admin"};
}

Answer ServiceTest::call(Endpoint endpoint, const Request& request) try {
  Context context{settings, store};
  return endpoint(context, request);
} catch (const Refusal& refusal) {
  return refusal.answer;
}

grants::Registered ServiceTest::registered(const std::string& scope) {
  const auto added = store.open().applications.add(
      {grants::ApplicationName("App"), {grants::RedirectAddress(kCallback)}, grants::Scope(scope)},
      grants::Actor("admin"));
  EXPECT_TRUE(added);
  return *added;
}

grants::Pair ServiceTest::loggedIn(const grants::Registered& application) {
  grants::CodeRequest request{grants::User("alice"), application.identifier,
                              grants::Scope("profile"), grants::RedirectAddress(kCallback)};
  request.pkce = grants::Pkce{grants::Challenge("E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM")};
  const auto code = store.open().codes.issue(request);
  EXPECT_TRUE(code);
  const auto pair = store.open().codes.redeem(
      {application.identifier, code->code, grants::RedirectAddress(kCallback),
       grants::Verifier("dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk")});
  EXPECT_TRUE(pair);
  return *pair;
}

Request get(const std::string& path, const std::string& query) {
  Request request;
  request.method = "GET";
  request.path = path;
  request.query = query;
  request.peer = "127.0.0.1";
  return request;
}

Request post(const std::string& path, const std::string& form) {
  Request request = get(path, "");
  request.method = "POST";
  request.contentType = "application/x-www-form-urlencoded";
  request.body = form;
  return request;
}

Request by(const grants::Registered& application, Request request) {
  const std::string pair = application.identifier.text() + ":" + application.secret->text();
  std::string text(BASE64_ENCODE_RAW_LENGTH(pair.size()), '\0');
  base64_encode_raw(text.data(), pair.size(), reinterpret_cast<const std::uint8_t*>(pair.data()));
  request.authorization = "Basic " + text;
  return request;
}

Request withBearer(const std::string& token, Request request) {
  request.authorization = "Bearer " + token;
  return request;
}

Json::Value json(const Answer& answer) {
  Json::Value document;
  std::istringstream text(answer.body);
  EXPECT_TRUE(Json::parseFromStream(Json::CharReaderBuilder(), text, &document, nullptr))
      << answer.body;
  return document;
}

std::string error(const Answer& answer) {
  return std::to_string(answer.status) + " " + json(answer)["error"].asString();
}

std::string header(const Answer& answer, const std::string& name) {
  for (const auto& [key, value] : answer.headers) {
    if (key == name) return value;
  }
  return {};
}

}  // namespace service_test
