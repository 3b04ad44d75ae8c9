// Tokens that tie a form to the person it was shown to. A token is the time of
// its expiry and an HMAC, under a key of this service, of that time, the user,
// and what the form is about. Another site can make the browser send a form
// with the user's own authentication, but it can neither read our pages nor
// compute this; a token of another user, of another request, or of yesterday
// does not fit. Nothing is stored and no cookie is needed.

#ifndef KELDOAUTH_SERVICE_PAGES_FORM_TOKEN_H
#define KELDOAUTH_SERVICE_PAGES_FORM_TOKEN_H

#include <string>

#include "service/settings/settings.h"

namespace keldoauth::service {

/// `subject` is whatever must be the same when the form comes back.
std::string formToken(const Settings& settings, const std::string& user,
                      const std::string& subject);

bool isFormToken(const Settings& settings, const std::string& token, const std::string& user,
                 const std::string& subject);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_FORM_TOKEN_H
