// Who a request is from, in the way that the owner of the box has settled.

#ifndef KELDOAUTH_SERVICE_PEOPLE_PEOPLE_H
#define KELDOAUTH_SERVICE_PEOPLE_PEOPLE_H

#include <memory>
#include <string_view>

#include "service/http/request.h"
#include "service/people/directory.h"
#include "service/people/sessions.h"
#include "service/people/throttle.h"
#include "service/settings/settings.h"

namespace keldoauth::service {

/// Names of cookies (http/cookies.h).
inline constexpr std::string_view kSessionCookie = "keldoauth";
inline constexpr std::string_view kBrowserCookie = "keldoauth-browser";

/// Null where the web server asks for passwords.
std::unique_ptr<Directory> directoryOf(const Settings& settings);

Sessions sessionsOf(const Settings& settings, const Directory& directory);
Throttle throttleOf(const Settings& settings);

/// Fills in user, authTime and session, or leaves them empty for nobody. Where
/// the web server asks for passwords, it has said who the user is, and has asked
/// with this very request; elsewhere its word does not count. Where the issuer is
/// https, the request counts as secure from here on. Throws DirectoryTrouble.
void recognise(const Settings& settings, Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_PEOPLE_H
