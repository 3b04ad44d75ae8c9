// The endpoints of OpenID Connect. Where the owner has no scope `openid` on the
// box, they are not there (404).

#ifndef KELDOAUTH_SERVICE_OIDC_ENDPOINTS_H
#define KELDOAUTH_SERVICE_OIDC_ENDPOINTS_H

#include <json/value.h>

#include "service/context.h"

namespace keldoauth::service {

/// What this server can do (OpenID Connect Discovery).
Answer openIdConfiguration(Context& context, const Request& request);

/// Adds what that document has beside the one of RFC 8414.
void addOpenIdMembers(const Settings& settings, Json::Value& document);

/// The public keys (RFC 7517).
Answer publicKeys(Context& context, const Request& request);

/// Tells the holder of an access token with the scope `openid` who the user is
/// (OpenID Connect Core, 5.3).
Answer userInfo(Context& context, const Request& request);

/// Signs a browser out for an application, and sends it back there (OpenID Connect
/// RP-Initiated Logout). The user is asked unless the application shows a token
/// of ours for the very user who is signed in.
Answer logout(Context& context, const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_OIDC_ENDPOINTS_H
