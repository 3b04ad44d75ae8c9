// The endpoints that applications and their users come to; program/routes.cpp has
// their paths.

#ifndef KELDOAUTH_SERVICE_PROTOCOL_ENDPOINTS_H
#define KELDOAUTH_SERVICE_PROTOCOL_ENDPOINTS_H

#include "service/context.h"

namespace keldoauth::service {

/// What this server can do (RFC 8414).
Answer metadata(Context& context, const Request& request);

/// Registers an application, for whoever has the initial access token (RFC 7591).
Answer registerApplication(Context& context, const Request& request);

/// Lets an application that registered itself see, replace and remove what it is
/// registered with (RFC 7592). The end of the path names it.
Answer manageRegistration(Context& context, const Request& request);

/// Asks the user whether an application may act for them, unless they have agreed
/// to it before, and sends the answer to the application (RFC 6749, 4.1; 7636;
/// 9207).
Answer authorize(Context& context, const Request& request);

/// Keeps an authorization request for a minute, so that the user's browser has
/// only a reference to bring (RFC 9126).
Answer pushRequest(Context& context, const Request& request);

/// Turns a code, a refresh token or a client's own credentials into an access
/// token (RFC 6749, 4.1.3, 4.4.2 and 6).
Answer token(Context& context, const Request& request);

/// Tells an application what a token is good for (RFC 7662). Any application may
/// ask about an access token that it was shown, as resource servers do; about a
/// refresh token only the one that holds it.
Answer introspect(Context& context, const Request& request);

/// Ends a login, whichever of its two tokens is shown (RFC 7009). A token that is
/// not there any more is a success.
Answer revoke(Context& context, const Request& request);

/// A protected resource (RFC 6750): tells the holder of an access token with the
/// scope "profile" who the token stands for.
Answer whoami(Context& context, const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROTOCOL_ENDPOINTS_H
