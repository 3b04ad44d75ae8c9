// Tokens that tie a form to the person it was shown to. A token is the time of
// its expiry and an HMAC, under a key of this service, of that time, the user,
// and what the form is about. Another site can make the browser send a form
// with the user's own authentication, but it can neither read our pages nor
// compute this; a token of another user, of another request, or of yesterday
// does not fit. Nothing is stored and no cookie is needed.

#ifndef KELDOAUTH_EXAMPLES_CGI_CSRF_H
#define KELDOAUTH_EXAMPLES_CGI_CSRF_H

#include <string>

namespace service {

/// `subject` is whatever must be the same when the form comes back.
std::string formToken(const std::string& user, const std::string& subject);

bool isFormToken(const std::string& token, const std::string& user, const std::string& subject);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_CSRF_H
