#include "tests/service/oidc_test.h"

#include <filesystem>
#include <fstream>
#include <regex>

#include "service/protocol/endpoints.h"
#include "service/signing/jws.h"
#include "service/signing/key_file.h"
#include "service/text/encoding.h"

namespace service_test {
namespace {

constexpr char kKeysPath[] = "/tmp/oidc.keys.json";

/// Made once for all cases: keys take their time.
const signing::KeySet& anyKeys() {
  static const signing::KeySet keys = signing::KeySet::make(kNow);
  return keys;
}

std::string unescaped(std::string text) {
  for (const auto& [entity, character] :
       {std::pair{"&amp;", "&"}, {"&quot;", "\""}, {"&lt;", "<"}}) {
    text = std::regex_replace(text, std::regex(entity), character);
  }
  return text;
}

}  // namespace

void OidcTest::SetUp() {
  World::SetUp();
  support::Clock::setTo(kNow);
  settings.scopes = ScopeTable(std::vector<KnownScope>{{"files.read", "See your files"},
                                                       {"openid", "Know that it is you"},
                                                       {"profile", "See who you are"}});
  settings.signIn = SignIn::kHtpasswd;
  settings.signingKeysFile = kKeysPath;
  std::filesystem::remove(kKeysPath);
  signing::KeyFile(kKeysPath).create(anyKeys(), {});
}

void OidcTest::TearDown() {
  support::Clock::release();
  World::TearDown();
}

grants::Registered OidcTest::application(bool wantsEs256) {
  grants::NewApplication application{grants::ApplicationName("App"),
                                     {grants::RedirectAddress(kCallback)},
                                     grants::Scope("openid profile files.read")};
  application.wantsEs256 = wantsEs256;
  application.logoutAddresses = {grants::LogoutAddress(kGoodbye)};
  const auto added = store.open().applications.add(application, grants::Actor("admin"));
  EXPECT_TRUE(added);
  return *added;
}

Request OidcTest::fromAlice(Request request, long long secondsAgo) {
  request.user = "alice";
  request.session = std::string(32, 'a');
  request.authTime = kNow - secondsAgo;
  return request;
}

Request OidcTest::authorization(const grants::Registered& application, const std::string& more) {
  return get("/oauth/authorize",
             "response_type=code&scope=openid+profile&state=st&code_challenge_method=S256"
             "&code_challenge=" +
                 kChallenge + "&client_id=" + application.identifier.text() +
                 "&redirect_uri=" + percentEncode(kCallback) + more);
}

std::map<std::string, std::string> OidcTest::returned(const Answer& answer) {
  const std::string address = header(answer, "Location");
  EXPECT_EQ(address.substr(0, address.find('?')), kCallback) << answer.status << answer.body;
  std::map<std::string, std::string> found;
  for (const std::string& pair : split(address.substr(address.find('?') + 1), '&')) {
    found[pair.substr(0, pair.find('='))] =
        formDecode(pair.substr(pair.find('=') + 1)).value_or("");
  }
  return found;
}

Answer OidcTest::allowed(const Answer& page, long long secondsAgo) {
  static const std::regex kHidden("type=\"hidden\" name=\"([^\"]+)\" value=\"([^\"]*)\"");
  std::string form = "decision=allow";
  for (auto found = std::sregex_iterator(page.body.begin(), page.body.end(), kHidden);
       found != std::sregex_iterator(); ++found) {
    form += "&" + (*found)[1].str() + "=" + percentEncode(unescaped((*found)[2].str()));
  }
  return call(authorize, fromAlice(post("/oauth/authorize", form), secondsAgo));
}

Json::Value OidcTest::redeemed(const grants::Registered& application, const std::string& code) {
  return json(call(token, by(application, post("/oauth/token",
                                               "grant_type=authorization_code&code=" + code +
                                                   "&code_verifier=" + kVerifier +
                                                   "&redirect_uri=" + percentEncode(kCallback)))));
}

Json::Value OidcTest::login(const grants::Registered& application, const std::string& more) {
  const Answer page = call(authorize, fromAlice(authorization(application, more)));
  EXPECT_EQ(page.status, 200) << page.body;
  return redeemed(application, returned(allowed(page))["code"]);
}

Json::Value OidcTest::claims(const Json::Value& tokens) {
  const signing::KeySet keys = signing::KeyFile(settings.signingKeysFile).read();
  const auto found = signing::claimsOf(tokens["id_token"].asString(), keys);
  EXPECT_TRUE(found) << tokens.toStyledString();
  return found.value_or(Json::Value());
}

}  // namespace service_test
