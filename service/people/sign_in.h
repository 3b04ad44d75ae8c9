// One try to sign in: counted first, then checked, then taken back from the count
// when the password was right. A hundred tries at the same moment find the
// allowance used up all the same.

#ifndef KELDOAUTH_SERVICE_PEOPLE_SIGN_IN_H
#define KELDOAUTH_SERVICE_PEOPLE_SIGN_IN_H

#include <string>

#include "service/people/directory.h"
#include "service/people/throttle.h"

namespace keldoauth::service {

struct SignInTry {
  std::string user;
  std::string password;
  std::string peer;     // the address it came from
  std::string browser;  // KnownBrowsers::nameOf; empty: not one of this user's
};

enum class SignInEnd {
  kIn,
  kWrong,     // name or password; which one, nobody learns
  kTooOften,  // or too many at once: the password was not looked at
  kCannotSay
};

struct SignInOutcome {
  SignInEnd end;
  std::string user;  // with kIn: as the directory spells it
  int waitSeconds;   // with kTooOften
};

/// Failures go to the system log.
///
/// A try counts for its address, and for its account when the browser is not
/// known, else for the browser. So strangers can use up what strangers have for
/// an account, and nothing more: its owner signs in with a browser that has done
/// so before.
SignInOutcome signIn(const Directory& directory, Throttle& throttle, const SignInTry& attempt);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_SIGN_IN_H
