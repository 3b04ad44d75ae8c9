// What an application asks for when it sends a user here (RFC 6749, 4.1.1), read
// and checked: at the authorization endpoint and, beforehand, where requests are
// pushed.

#ifndef KELDOAUTH_SERVICE_PROTOCOL_AUTHORIZATION_REQUEST_H
#define KELDOAUTH_SERVICE_PROTOCOL_AUTHORIZATION_REQUEST_H

#include <optional>
#include <string>
#include <string_view>

#include "service/protocol/clients.h"
#include "service/settings/settings.h"

namespace keldoauth::service {

/// How the application wants the user to be met (OpenID Connect Core, 3.1.2.1).
/// Values that are not known say nothing.
struct Prompt {
  bool none = false;           // no page at all, or an error
  bool login = false;          // the password once more
  bool consent = false;        // the consent page, even if they agreed before
  bool selectAccount = false;  // a page on which they can become somebody else

  /// A page is to be shown, whatever is known already.
  [[nodiscard]] bool wantsPage() const { return login || consent || selectAccount; }
};

struct AuthorizationRequest {
  grants::Application client;
  std::string redirect;
  bool redirectWasGiven = false;
  std::string scope = {};
  std::string state = {};
  std::string challenge = {};  // empty: none
  Prompt prompt = {};
  std::optional<grants::RequestReference> pushed = {};  // none: it came with the browser
  std::string nonce = {};
  std::optional<long long> maxAge = {};  // seconds
  std::string hint = {};                 // a token that says for whom
};

/// How a reference to a pushed request begins (RFC 9126, 2.2).
inline constexpr std::string_view kReferenceStart = "urn:ietf:params:oauth:request_uri:";

/// What the application hears of a fault: the code of its standard, and why, in
/// the characters of an error_description.
struct RequestFault {
  std::string error;
  std::string why;
};

/// The application's request with the address that it names, or has alone.
AuthorizationRequest startOf(const grants::Application& client, const Parameters& given);

/// Why nobody may be sent to the address of the request, in words for the user;
/// empty when it is one of the application's. It shows the address.
std::string faultOfAddress(const AuthorizationRequest& asked);

/// Reads the rest into `asked`; the state also when there is a fault.
std::optional<RequestFault> readRest(const Settings& settings, const Parameters& given,
                                     AuthorizationRequest& asked);

/// What the `resource` parameters ask for (RFC 8707): every token here is good
/// for this box and nothing else, so a token for anything else is refused.
std::optional<RequestFault> faultOfResource(const Settings& settings, const Parameters& given);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROTOCOL_AUTHORIZATION_REQUEST_H
