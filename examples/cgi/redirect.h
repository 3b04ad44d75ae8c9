// Redirect addresses. The registry keeps them without their scheme, so the
// scheme follows from the host: https everywhere, and on the loopback interface
// http as well, where nothing leaves the machine (RFC 8252, 7.3). Everything
// behind the scheme is compared exactly, byte by byte, the port included.

#ifndef KELDOAUTH_EXAMPLES_CGI_REDIRECT_H
#define KELDOAUTH_EXAMPLES_CGI_REDIRECT_H

#include <string>

namespace service {

/// What the registry holds for an application without a redirect address. No
/// address is ever equal to it.
inline constexpr char kNoRedirect[] = "(none)";

/// An absolute https address, or http on the loopback interface, in the
/// characters of RFC 3986, without user, fragment or blank.
bool isRedirectAddress(const std::string& address);

/// Whether `address` is one of the `registered`, a blank-separated list. An
/// entry that has its scheme (an edit stores it) must be equal with it.
bool isRegistered(const std::string& address, const std::string& registered);

/// The only address of `registered`, with its scheme, http on loopback; empty
/// when there are none or several.
std::string onlyAddress(const std::string& registered);

/// The address as the registry keeps it.
std::string withoutScheme(const std::string& address);

/// "https://host:port" of a valid address.
std::string originOf(const std::string& address);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_REDIRECT_H
