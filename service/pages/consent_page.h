// The page on which a user allows or refuses what an application asks for.

#ifndef KELDOAUTH_SERVICE_PAGES_CONSENT_PAGE_H
#define KELDOAUTH_SERVICE_PAGES_CONSENT_PAGE_H

#include <string>

#include "service/context.h"
#include "service/protocol/authorization_request.h"

namespace keldoauth::service {

/// What the form's token is bound to: everything that the user decides about.
std::string formSubject(const AuthorizationRequest& asked);

/// Says in words what the application will be able to do, where the answer goes,
/// and whom else that may reach.
Answer consentPage(const Settings& settings, const Request& request,
                   const AuthorizationRequest& asked);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_CONSENT_PAGE_H
