// Signing in and out where the service asks for passwords itself: the page, and
// what other pages need of it.

#ifndef KELDOAUTH_SERVICE_PAGES_SIGN_IN_H
#define KELDOAUTH_SERVICE_PAGES_SIGN_IN_H

#include <string>

#include "service/context.h"

namespace keldoauth::service {

/// GET shows the form, POST signs in and leads on to `next`, a path of ours.
Answer signInPage(Context& context, const Request& request);

/// GET asks, POST signs this browser out.
Answer signOutPage(Context& context, const Request& request);

/// For a page that takes a user, and a request that is nobody's: to the sign-in
/// page and back here. A form cannot be sent again that way, and where the web
/// server asks for passwords there is no such page: then it says so.
Answer signInFirst(const Settings& settings, const Request& request);

/// The path of the sign-in page that leads back to what `request` asked for, to
/// ask somebody who is signed in for the password again.
std::string signInPath(const Settings& settings, const Request& request);

/// A button to sign out, for a page; empty where the service cannot.
std::string signOutForm(const Settings& settings, const Request& request);

/// `next` with its query when it leads to a page of ours that takes a user, below
/// the issuer's path; empty otherwise: the way back must lead nowhere else.
std::string safeNext(const Settings& settings, const std::string& next);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PAGES_SIGN_IN_H
