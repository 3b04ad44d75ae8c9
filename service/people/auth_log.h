// Lines of the system log, facility AUTH, for those who watch over the box; the
// filter in fail2ban/ reads them. The address comes first: nothing that a stranger
// types stands before it, and what a stranger types stands between quotes with
// every character escaped that could end them or the line.

#ifndef KELDOAUTH_SERVICE_PEOPLE_AUTH_LOG_H
#define KELDOAUTH_SERVICE_PEOPLE_AUTH_LOG_H

#include <string>

namespace keldoauth::service {

/// "failed sign-in from 192.0.2.1 of user "alice": wrong password". An empty
/// `user` is one who is not there: that name may be a password, typed into the
/// wrong field.
void logFailedSignIn(const std::string& peer, const std::string& user, const std::string& why);

/// "throttled sign-in from 192.0.2.1"
void logThrottled(const std::string& what, const std::string& peer);

/// "failed secret from 192.0.2.1 at "/oauth/token""
void logFailedSecret(const std::string& peer, const std::string& path);

/// "cannot check passwords: ...": nobody's fault outside.
void logCannotCheck(const std::string& why);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_AUTH_LOG_H
