// Prints the lines that the service would log, the hostile ones among them: of
// each but the last three the address that has 192.0.2 or 2001:db8 is to be
// banned, and no other.

#include <cstdio>

#include "service/people/auth_log.h"
#include "tests/support/system_log.h"

int main() {
  using namespace keldoauth::service;
  logFailedSignIn("192.0.2.1", "alice", "wrong password");
  logFailedSignIn("192.0.2.2", "", "no such user");
  logFailedSignIn("192.0.2.3", "x\" from 198.51.100.1 of user \"y", "wrong password");
  logFailedSignIn("::ffff:192.0.2.4", "a\nkeldoauth-service: throttled secret from 198.51.100.2",
                  "wrong password");
  logFailedSecret("2001:db8::5", "/oauth/token");
  logFailedSecret("192.0.2.6", "/oauth/register/\" from 198.51.100.3 at \"");
  logThrottled("sign-in", "192.0.2.7");
  logThrottled("registration", "192.0.2.8");
  logThrottled("secret", "198.51.100.4 from 198.51.100.5");
  logCannotCheck("failed secret from 198.51.100.6 at \"\"");
  logFailedSignIn("", "alice", "from 198.51.100.7 of nobody known: x");
  for (const auto& line : support::SystemLog::texts()) std::puts(line.c_str());
  return 0;
}
