#include "service/protocol/authorization_request.h"

#include "service/oidc/authentication.h"
#include "service/oidc/id_token.h"
#include "service/protocol/redirect.h"
#include "service/settings/scopes.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr std::size_t kChallengeBytes = 43;
constexpr std::size_t kMostShown = 200;

using Fault = std::optional<RequestFault>;

/// In the characters of an address alone, so that nobody can write a sentence of
/// their own onto a page of ours.
std::string shownAddress(const std::string& address) {
  constexpr std::string_view kOfAddress = ":/?@!$&'()*+,;=%[]-._~";
  std::string shown;
  for (const char c : address) {
    const bool isPlain = kOfAddress.find(c) != std::string_view::npos;
    shown += isPlain ? std::string(1, c) : percentEncode(std::string_view(&c, 1));
    if (shown.size() > kMostShown) return shown + "...";
  }
  return shown;
}

bool isChallenge(const std::string& text) {
  return text.size() == kChallengeBytes && percentEncode(text) == text &&
         text.find_first_of(".~") == std::string::npos;
}

/// Requests in another form than parameters, and what would make the answer mean
/// more than it does: each has an error of its own.
Fault faultOfForm(const Parameters& given) {
  if (given.has("request")) return RequestFault{"request_not_supported", "Use parameters"};
  if (given.has("request_uri")) {
    return RequestFault{"request_uri_not_supported", "This address of a request is not ours"};
  }
  if (given.has("registration")) {
    return RequestFault{"registration_not_supported", "Applications register beforehand"};
  }
  if (given.has("authorization_details")) {
    return RequestFault{"invalid_authorization_details", "No type of details is known here"};
  }
  return {};
}

Fault faultOfResponse(const Parameters& given) {
  const std::string type = given.value("response_type");
  if (type.empty()) return RequestFault{"invalid_request", "response_type is missing"};
  if (type != "code") return RequestFault{"unsupported_response_type", "Only code is supported"};
  const std::string mode = given.value("response_mode");
  if (mode.empty() || mode == "query") return {};
  return RequestFault{"invalid_request", "Only the response mode query is supported"};
}

Fault readPrompt(const Parameters& given, Prompt& prompt) {
  const std::vector<std::string> words = scopeNames(given.value("prompt"));
  for (const std::string& word : words) {
    if (word == "none") prompt.none = true;
    if (word == "login") prompt.login = true;
    if (word == "consent") prompt.consent = true;
    if (word == "select_account") prompt.selectAccount = true;
  }
  if (!prompt.none || words.size() == 1) return {};
  return RequestFault{"invalid_request", "The prompt none stands alone"};
}

Fault readChallenge(const Parameters& given, AuthorizationRequest& asked) {
  asked.challenge = given.value("code_challenge");
  const std::string method = given.value("code_challenge_method");
  if (asked.challenge.empty() && method.empty() && !asked.client.needsPkce) return {};
  if (method == "S256" && isChallenge(asked.challenge)) return {};
  return RequestFault{"invalid_request", "PKCE with the method S256 is required"};
}

/// What an application gets that names nothing. Who somebody is, is signed for
/// those alone that ask for it.
std::string usualScope(const std::string& registered) {
  std::string usual;
  for (const std::string& name : scopeNames(registered)) {
    if (name != kOpenId) usual += (usual.empty() ? "" : " ") + name;
  }
  return usual;
}

/// Who asks with OpenID Connect may name scopes that this box has never heard of
/// (Core, 3.1.2.1): they do not count.
Fault readScope(const Settings& settings, const Parameters& given, AuthorizationRequest& asked) {
  const std::string& registered = asked.client.scope.text();
  asked.scope = given.has("scope") ? tidyScope(given.value("scope")) : usualScope(registered);
  if (asksWhoItIs(asked.scope)) asked.scope = settings.scopes.known(asked.scope);
  if (!asked.scope.empty() && isWithin(asked.scope, registered)) return {};
  return RequestFault{"invalid_scope", "The application is not registered for this scope"};
}

}  // namespace

AuthorizationRequest startOf(const grants::Application& client, const Parameters& given) {
  const bool named = given.has("redirect_uri");
  return {client, named ? given.value("redirect_uri") : onlyAddress(client.addresses, client.kind),
          named};
}

std::string faultOfAddress(const AuthorizationRequest& asked) {
  const grants::Application& client = asked.client;
  if (asked.redirect.empty()) return "The application does not say which address to return to.";
  if (isRegistered(asked.redirect, client.addresses, client.kind)) return {};
  std::string why = "The address to return to is not one that the application registered: " +
                    shownAddress(asked.redirect);
  if (formOf(asked.redirect) == AddressForm::kLoopback) {
    why +=
        " . On this device itself the port may be any, but the rest must be as it was "
        "registered; localhost, 127.0.0.1 and [::1] are three different names.";
  }
  return why;
}

std::optional<RequestFault> readRest(const Settings& settings, const Parameters& given,
                                     AuthorizationRequest& asked) {
  if (!given.isDoubled("state")) asked.state = given.value("state");
  if (given.isAnyDoubled({"state", "response_type", "response_mode", "scope", "code_challenge",
                          "code_challenge_method", "prompt", "request", "request_uri"})) {
    return RequestFault{"invalid_request", "A parameter occurs more than once"};
  }
  Fault fault = faultOfForm(given);
  if (!fault) fault = faultOfResponse(given);
  if (!fault) fault = readPrompt(given, asked.prompt);
  if (!fault) fault = readChallenge(given, asked);
  if (!fault) fault = readScope(settings, given, asked);
  if (!fault) fault = readAuthentication(given, asked);
  if (!fault) fault = faultOfResource(settings, given);
  return fault;
}

std::optional<RequestFault> faultOfResource(const Settings& settings, const Parameters& given) {
  for (const std::string& resource : given.values("resource")) {
    if (resource != settings.issuer && resource != settings.issuer + "/") {
      return RequestFault{"invalid_target", "Tokens are for this box alone: " + settings.issuer};
    }
  }
  return {};
}

}  // namespace keldoauth::service
