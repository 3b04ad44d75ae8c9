// Redirect addresses: https everywhere, and on the loopback interface http as
// well, where nothing leaves the machine (RFC 8252, 7.3). They are compared
// exactly, byte by byte, scheme and port included.
//
// Rows that the registry's own Add stored have lost their scheme. Such an entry
// may have been either of the two: it is equal to the https address and, on the
// loopback interface, to the http address as well; never to http elsewhere.

#ifndef KELDOAUTH_SERVICE_PROTOCOL_REDIRECT_H
#define KELDOAUTH_SERVICE_PROTOCOL_REDIRECT_H

#include <cstddef>
#include <string>
#include <vector>

#include "grants/texts.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

/// The longest redirect address that may be registered. The code of a login
/// remembers it, with room to spare.
inline constexpr std::size_t kMaxRedirect = 1400;

using Addresses = std::vector<grants::RedirectAddress>;

/// An absolute https address, or http on the loopback interface, in the
/// characters of RFC 3986, without user, fragment or blank.
bool isRedirectAddress(const std::string& address);

/// Whether `address` is one of the `registered`, with their schemes or without.
bool isRegistered(const std::string& address, const Addresses& registered);

/// The only address of `registered`; empty when there are none or several. One
/// without a scheme gets http on loopback, else https.
std::string onlyAddress(const Addresses& registered);

/// "https://host:port" of a valid address.
std::string originOf(const std::string& address);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROTOCOL_REDIRECT_H
