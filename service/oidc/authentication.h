// What an application may ask for about the sign-in itself (OpenID Connect Core,
// 3.1.2.1): how fresh it is, and a nonce that comes back in the token.

#ifndef KELDOAUTH_SERVICE_OIDC_AUTHENTICATION_H
#define KELDOAUTH_SERVICE_OIDC_AUTHENTICATION_H

#include <optional>

#include "service/http/answer.h"
#include "service/protocol/authorization_request.h"

namespace keldoauth::service {

/// Reads `nonce`, `max_age` and `id_token_hint` into `asked`.
std::optional<RequestFault> readAuthentication(const Parameters& given,
                                               AuthorizationRequest& asked);

/// Whether what is asked for could be signed: nobody is to decide about, or to
/// spend, what then cannot be given. A line on standard error when not.
std::optional<RequestFault> faultOfKeys(const Settings& settings,
                                        const AuthorizationRequest& asked);

/// Whether the application has shown for whom it asks, and that is somebody else
/// than who is signed in. When its token cannot be checked, nobody can say: then
/// only a request without a page counts as one for another.
bool isForAnother(const Settings& settings, const Request& request,
                  const AuthorizationRequest& asked);

/// Whether the user who is signed in has to show the password once more: for
/// prompt=login, because it was shown more than max_age ago, or to become whom the
/// application means. Never where the web server asks, which does it with every
/// request. `isAnothers`: as isForAnother said.
bool mustSignInAgain(const Settings& settings, const Request& request, const Parameters& given,
                     const AuthorizationRequest& asked, bool isAnothers);

/// To the sign-in page and back here. The way back carries a mark of this moment
/// and this request under a key of the service: whoever comes with it and has
/// signed in since is not asked another time.
Answer signInAgain(const Settings& settings, const Request& request,
                   const AuthorizationRequest& asked);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_OIDC_AUTHENTICATION_H
