// A registered application as the endpoints see it, and who says to be one.

#ifndef KELDOAUTH_EXAMPLES_CGI_CLIENTS_H
#define KELDOAUTH_EXAMPLES_CGI_CLIENTS_H

#include <json/value.h>

#include <optional>
#include <string>

#include "examples/cgi/http.h"

namespace service {

struct Client {
  long long id;
  bool enabled;
  std::string identifier;
  std::string secret;
  std::string redirects;  // see redirect.h
  std::string scope;
  std::string name;
};

/// Text of a row as it was given: the stores keep single quotes doubled.
std::string undoubled(const Json::Value& text);

/// Why an application cannot have this name, which people will decide by; empty
/// when it can.
std::string faultOfName(const std::string& name);

Client clientOf(const Json::Value& row);

/// Throws Unavailable when the store cannot say.
std::optional<Client> findClient(const std::string& identifier);

/// The client that a POST to the token, introspection or revocation endpoint
/// comes from (RFC 6749, 2.3.1): Basic, or identifier and secret in the body,
/// never both. Throws Refusal with `invalid_client`, for a disabled one as well.
Client authenticate(const Request& request, const Parameters& form);

/// The form of such a POST. Throws Refusal for another method, another content
/// type, bad encoding, or one of `names` twice.
Parameters readForm(const Request& request, std::initializer_list<std::string_view> names);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_CLIENTS_H
