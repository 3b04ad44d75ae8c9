// Redirect addresses. An application on the web has https addresses. One on the
// user's own device listens on its loopback interface, where nothing leaves the
// machine (RFC 8252, 7.3), or has a scheme of its own (7.1), if it is a public
// one. Addresses are compared exactly, byte by byte, but for the port of http on
// the loopback interface: the operating system gives the application another one
// each time. localhost is no loopback literal, and a device may have given the
// name away (8.3), but there are applications that know nothing else: it is what
// it says, and never equal to 127.0.0.1.
//
// Rows that the registry's own Add stored have lost their scheme. Such an entry
// may have been either of the two: it is equal to the https address and, on the
// loopback interface, to the http address as well; never to http elsewhere.

#ifndef KELDOAUTH_SERVICE_PROTOCOL_REDIRECT_H
#define KELDOAUTH_SERVICE_PROTOCOL_REDIRECT_H

#include <cstddef>
#include <string>
#include <vector>

#include "grants/applications.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

/// The longest redirect address that may be registered. The code of a login
/// remembers it, with room to spare.
inline constexpr std::size_t kMaxRedirect = 1400;

using Addresses = std::vector<grants::RedirectAddress>;

enum class AddressForm {
  kNone,        // nothing that anybody may be sent to
  kWeb,         // https://
  kLoopback,    // http:// on 127.0.0.1, [::1] or localhost
  kPrivateUse,  // com.example.app:/
};

/// Only the characters of RFC 3986; no user, fragment, or broken or
/// control characters behind a percent sign.
AddressForm formOf(const std::string& address);

/// Whether an application of this kind may have the address.
bool isRedirectAddress(const std::string& address, grants::ApplicationKind kind);

/// Whether `address` is one of the `registered` of an application of this kind.
bool isRegistered(const std::string& address, const Addresses& registered,
                  grants::ApplicationKind kind);

/// The only address of `registered`; empty when there are none or several. One
/// without a scheme gets http on loopback, else https.
std::string onlyAddress(const Addresses& registered, grants::ApplicationKind kind);

/// "https://host:port" of an address that is one, "com.example.app:" of one with a
/// scheme of its own.
std::string originOf(const std::string& address);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROTOCOL_REDIRECT_H
