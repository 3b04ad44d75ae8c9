#include "service/people/sign_in.h"

#include <algorithm>

#include "service/people/address.h"
#include "service/people/auth_log.h"
#include "service/people/turnstile.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

/// What PAM takes for a wrong password.
constexpr int kBusySeconds = 2;

/// Some directories take "Alice" for "alice": case makes no new account.
std::string folded(std::string name) {
  std::transform(name.begin(), name.end(), name.begin(), lowerCase);
  return name;
}

/// The counts that a try takes from.
class Counts {
 public:
  Counts(Throttle& throttle, const SignInTry& attempt)
      : throttle_(throttle),
        address_(neighbourhood(attempt.peer)),
        account_(attempt.browser.empty() ? Deed::kSignInOfAccount : Deed::kSignInOfKnownBrowser),
        name_(attempt.browser.empty() ? folded(attempt.user) : attempt.browser) {}

  /// From both or from none. Seconds to wait.
  int take() {
    int wait = throttle_.take(Deed::kSignInFromAddress, address_);
    if (wait != 0) return wait;
    wait = throttle_.take(account_, name_);
    if (wait != 0) throttle_.giveBack(Deed::kSignInFromAddress, address_);
    return wait;
  }

  void giveBack() {
    throttle_.giveBack(Deed::kSignInFromAddress, address_);
    throttle_.giveBack(account_, name_);
  }

 private:
  Throttle& throttle_;
  std::string address_;
  Deed account_;
  std::string name_;
};

/// The name, when there is such a user.
std::string knownName(const Directory& directory, const std::string& user) try {
  return directory.stampOf(user) ? user : std::string();
} catch (const DirectoryTrouble&) {
  return {};
}

}  // namespace

SignInOutcome signIn(const Directory& directory, Throttle& throttle, const SignInTry& attempt) {
  Counts counts(throttle, attempt);
  if (const int wait = counts.take(); wait != 0) {
    logThrottled("sign-in", attempt.peer);
    return {SignInEnd::kTooOften, "", wait};
  }
  const Turnstile turnstile(throttle.path());
  if (!turnstile.isIn()) {
    counts.giveBack();
    return {SignInEnd::kTooOften, "", kBusySeconds};
  }
  const PasswordCheck check = directory.checkPassword(attempt.user, attempt.password);
  if (check.verdict == Verdict::kNo) {
    logFailedSignIn(attempt.peer, knownName(directory, attempt.user), check.why);
    return {SignInEnd::kWrong, "", 0};
  }
  counts.giveBack();
  if (check.verdict == Verdict::kYes) return {SignInEnd::kIn, check.user, 0};
  logCannotCheck(check.why);
  return {SignInEnd::kCannotSay, "", 0};
}

}  // namespace keldoauth::service
