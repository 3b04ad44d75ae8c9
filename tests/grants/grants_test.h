// The fixture of the floor's tests: a store, a clock that stands, an application
// that is registered, and the words of a login.

#ifndef KELDOAUTH_TESTS_GRANTS_GRANTS_TEST_H
#define KELDOAUTH_TESTS_GRANTS_GRANTS_TEST_H

#include <optional>
#include <string>
#include <vector>

#include "grants/grants.h"
#include "tests/support/world.h"

namespace grants_test {

using namespace KELDOAUTHSERVER::grants;

constexpr long long kNow = 1700000000;
constexpr long long kHour = 3600;
constexpr long long kDay = 24 * kHour;

inline const User kAlice("alice");
inline const User kBob("bob");
inline const Actor kAdmin("admin");
inline const RedirectAddress kAddress("https://photos.example.org/callback");
inline const Scope kScope("photos.read profile");

/// RFC 7636, Appendix B.
inline const Verifier kVerifier("dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk");
inline const Challenge kChallenge("E9Melhoa2OwvFrEMTJguCHaoeK1t8URWbuGJSstw-cM");

class GrantsTest : public support::World {
 protected:
  void SetUp() override;

  Grants& grants() { return *grants_; }
  void close() { grants_.reset(); }
  /// Another connection, with another policy.
  void open(const Policy& policy);

  // Each fails the test when it is refused.

  Registered add(const std::string& name = "Photo Frame",
                 ApplicationKind kind = ApplicationKind::kConfidential);
  CodeRequest request(const ApplicationId& application, const User& user = kAlice) const;
  Code issue(const ApplicationId& application, const User& user = kAlice);
  Redemption redemption(const ApplicationId& application, const Code& code) const;
  Pair login(const ApplicationId& application, const User& user = kAlice);
  Pair refresh(const ApplicationId& application, const Pair& pair);

  bool isGood(const AccessToken& token) { return static_cast<bool>(grants().tokens.verify(token)); }
  bool isGood(const Pair& pair) { return isGood(pair.access); }

  /// The audit log, oldest first.
  std::vector<std::string> entries();

 private:
  std::optional<Grants> grants_;
};

/// "invalid_grant: ..." of a refusal, "granted" otherwise.
template <typename Value>
std::string wordOf(const Outcome<Value>& outcome) {
  if (outcome) return "granted";
  return codeText(outcome.refusal().error) + (": " + std::string(explain(outcome.refusal().why)));
}

/// Why it was refused; fails the test when it was not.
template <typename Value>
Why whyOf(const Outcome<Value>& outcome) {
  EXPECT_FALSE(outcome) << "was granted";
  return outcome ? Why::kHasNul : outcome.refusal().why;
}

template <typename Value>
Error errorOf(const Outcome<Value>& outcome) {
  EXPECT_FALSE(outcome) << "was granted";
  return outcome ? Error::kInvalidRequest : outcome.refusal().error;
}

}  // namespace grants_test

#endif  // KELDOAUTH_TESTS_GRANTS_GRANTS_TEST_H
