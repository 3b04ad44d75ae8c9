// The page on which a user allows or refuses what an application asks for.

#ifndef KELDOAUTH_SERVICE_PAGES_CONSENT_PAGE_H
#define KELDOAUTH_SERVICE_PAGES_CONSENT_PAGE_H

#include <string>

#include "service/context.h"
#include "service/protocol/clients.h"

namespace keldoauth::service {

struct AuthorizationRequest {
  grants::Application client;
  std::string redirect;
  bool redirectWasGiven = false;
  std::string scope = {};
  std::string state = {};
  std::string challenge = {};
};

/// What the form's token is bound to: everything that the user decides about.
std::string formSubject(const AuthorizationRequest& asked);

Answer consentPage(const Settings& settings, const std::string& user,
                   const AuthorizationRequest& asked);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_CONSENT_PAGE_H
