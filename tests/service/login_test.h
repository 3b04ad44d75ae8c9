// The fixture of tests in which an application sends a user to be asked: its
// request, what the user does on the page, and what the application gets.

#ifndef KELDOAUTH_TESTS_SERVICE_LOGIN_TEST_H
#define KELDOAUTH_TESTS_SERVICE_LOGIN_TEST_H

#include <map>
#include <string>
#include <vector>

#include "tests/service/service_test.h"

namespace service_test {

/// RFC 7636, Appendix B.
inline const std::string kVerifier = "dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk";
inline const std::string kChallenge = "E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM";

/// A value that is empty leaves the parameter out.
using Changes = std::map<std::string, std::string>;

std::string encoded(const Changes& parameters);

class LoginTest : public ServiceTest {
 protected:
  /// One that an administrator registered.
  grants::Registered add(const grants::NewApplication& application);
  grants::Registered addPublic(const std::vector<std::string>& addresses);
  grants::Registered addConfidential(const std::string& address, bool needsPkce = true);

  /// The parameters of a good request for the scope "profile".
  [[nodiscard]] static Changes question(const grants::Registered& application,
                                        const Changes& changes = {});
  /// The answer to it, of the browser in which this user is signed in.
  Answer ask(const grants::Registered& application, const Changes& changes = {},
             const std::string& user = "alice");
  /// The user allows what the page asks for.
  Answer allow(const Answer& page, const std::string& user = "alice");
  /// The application redeems the code that came back.
  Answer redeem(const grants::Registered& application, const Answer& returned,
                const Changes& changes = {});
  /// All of it: a login that can be refreshed.
  Json::Value logIn(const grants::Registered& application, const Changes& changes = {});
};

/// The name and value of each hidden field of a page.
Changes hiddenFields(const Answer& page);
/// A parameter with which the browser is sent back to the application.
std::string returned(const Answer& answer, const std::string& name);

}  // namespace service_test

#endif  // KELDOAUTH_TESTS_SERVICE_LOGIN_TEST_H
