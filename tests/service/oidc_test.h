// The fixture of OpenID Connect: a box that offers it, with its keys.

#ifndef KELDOAUTH_TESTS_SERVICE_OIDC_TEST_H
#define KELDOAUTH_TESTS_SERVICE_OIDC_TEST_H

#include <map>
#include <string>

#include "service/oidc/endpoints.h"
#include "service/signing/key_set.h"
#include "tests/service/service_test.h"

namespace service_test {

inline const std::string kVerifier = "dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk";
inline const std::string kChallenge = "E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM";
inline const std::string kGoodbye = "https://app.example/goodbye";
inline constexpr long long kNow = 1800000000;

class OidcTest : public ServiceTest {
 protected:
  void SetUp() override;
  void TearDown() override;

  /// An application that may ask for everything, with kGoodbye.
  grants::Registered application(bool wantsEs256 = false);

  /// From alice, who signed in this many seconds ago with a session.
  static Request fromAlice(Request request, long long secondsAgo = 0);

  /// A request at the authorization endpoint for "openid profile" and these.
  static Request authorization(const grants::Registered& application, const std::string& more);

  /// The parameters that the application receives.
  static std::map<std::string, std::string> returned(const Answer& answer);

  /// Allows what the page asks, with alice's session.
  Answer allowed(const Answer& page, long long secondsAgo = 0);

  /// What the token endpoint says when the application redeems the code.
  Json::Value redeemed(const grants::Registered& application, const std::string& code);

  /// From the first request to the tokens.
  Json::Value login(const grants::Registered& application, const std::string& more = "");

  /// What the token says, checked with the published keys.
  Json::Value claims(const Json::Value& tokens);
};

}  // namespace service_test

#endif  // KELDOAUTH_TESTS_SERVICE_OIDC_TEST_H
