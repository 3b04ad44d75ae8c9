// Applications at the endpoints: who says to be one, and what is refused to them.

#ifndef KELDOAUTH_SERVICE_PROTOCOL_CLIENTS_H
#define KELDOAUTH_SERVICE_PROTOCOL_CLIENTS_H

#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>

#include "grants/grants.h"
#include "service/http/answer.h"
#include "service/http/request.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

/// Why an application cannot have this name, which people will decide by; empty
/// when it can.
std::string faultOfName(const std::string& name);

/// The form of a POST to the token, introspection or revocation endpoint. Throws
/// Refusal for another method, another content type, bad encoding, or one of
/// `names` twice.
Parameters readForm(const Request& request, std::initializer_list<std::string_view> names);

struct Credentials {
  grants::ApplicationId identifier;
  std::optional<grants::Secret> secret;  // none: a public application's
};

/// Which application such a POST says to come from (RFC 6749, 2.3.1): Basic, or
/// identifier and secret in the body, never both. An empty secret is none.
/// Throws Refusal.
Credentials readCredentials(const Request& request, const Parameters& form);

/// Throws Refusal with `invalid_client` when there is no secret: where it is not
/// enough to say who one is.
void requireSecret(const Credentials& credentials);

/// The application whose credentials these are: a public one has its identifier
/// alone. Throws Refusal with `invalid_client`, for a disabled one as well.
grants::Application authenticate(const grants::Grants& store, const Credentials& credentials);

/// What an application is told of a refusal: 401 with a challenge when it is not
/// the one that it says to be, else 400.
Answer refusalAnswer(const grants::Refusal& refusal);

/// Whom a token stands for: the user, or an application that acts for itself.
std::string subjectOf(const grants::Bearer& bearer);

/// Where the request comes from.
grants::PeerAddress peerAddress(const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROTOCOL_CLIENTS_H
