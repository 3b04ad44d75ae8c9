// The page on which a user allows or refuses what an application asks for.

#ifndef KELDOAUTH_EXAMPLES_CGI_CONSENT_PAGE_H
#define KELDOAUTH_EXAMPLES_CGI_CONSENT_PAGE_H

#include <string>

#include "examples/cgi/answer.h"
#include "examples/cgi/clients.h"

namespace service {

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

Answer consentPage(const std::string& user, const AuthorizationRequest& asked);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_CONSENT_PAGE_H
