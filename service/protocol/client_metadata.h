// What an application says of itself when it registers (RFC 7591, 2), and what it
// is told of itself.

#ifndef KELDOAUTH_SERVICE_PROTOCOL_CLIENT_METADATA_H
#define KELDOAUTH_SERVICE_PROTOCOL_CLIENT_METADATA_H

#include <json/value.h>

#include <optional>
#include <string>
#include <vector>

#include "service/protocol/clients.h"
#include "service/protocol/redirect.h"
#include "service/settings/settings.h"

namespace keldoauth::service {

struct ClientMetadata {
  grants::ApplicationName name;
  Addresses addresses;  // none: it only acts for itself
  std::vector<grants::LogoutAddress> logoutAddresses;
  grants::Scope scope;
  grants::ApplicationKind kind;
  std::string method;  // at the token endpoint
  bool wantsEs256 = false;
};

/// The JSON object that the request brings. Throws Refusal.
Json::Value readJson(const Request& request);

/// What is absent gets its default; `method` is that of the authentication.
/// Throws Refusal with the error of RFC 7591, 3.2.2.
ClientMetadata readClientMetadata(const Settings& settings, const Json::Value& document,
                                  const std::string& method);

inline constexpr char kSecretInHeader[] = "client_secret_basic";
inline constexpr char kSecretInBody[] = "client_secret_post";
inline constexpr char kNoSecret[] = "none";

/// All that a registered application is told: what it is registered with and,
/// beside its secret, the token that opens the administration of itself. The
/// secret, as the one of `secret`, is absent for a public application.
Json::Value clientInformation(const Settings& settings, const grants::Application& application,
                              const std::optional<grants::Secret>& secret);

/// Opens the administration of an application for itself (RFC 7592): a MAC over
/// its identifier and its secret, so that it ends with either, and nothing is
/// stored. An identifier is not drawn twice, so that of a public application is
/// enough.
std::string registrationToken(const Settings& settings, const grants::ApplicationId& identifier,
                              const std::optional<grants::Secret>& secret);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROTOCOL_CLIENT_METADATA_H
