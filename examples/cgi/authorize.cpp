// /oauth/authorize: asks the user whether an application may act for them, and
// sends the answer to the application (RFC 6749, 4.1; 7636; 9207). The web
// server has authenticated the user.

#include "examples/cgi/answer.h"
#include "examples/cgi/clients.h"
#include "examples/cgi/consent_page.h"
#include "examples/cgi/csrf.h"
#include "examples/cgi/encoding.h"
#include "examples/cgi/html.h"
#include "examples/cgi/redirect.h"
#include "examples/cgi/scopes.h"
#include "examples/cgi/settings.h"
#include "utils/oauth_bounds.h"

namespace {

using namespace service;

constexpr std::size_t kMaxUser = KELDOAUTHSERVER::bounds::kUsername.max;
constexpr std::size_t kChallengeBytes = 43;

[[noreturn]] void refuseWithPage(int status, const std::string& why) {
  throw Refusal{messagePage(status, "This request cannot be answered", why)};
}

/// The application's address with parameters of ours, state and issuer added.
std::string addressWith(const AuthorizationRequest& asked, const std::string& parameters) {
  std::string address = asked.redirect;
  address += address.find('?') == std::string::npos ? '?' : '&';
  address += parameters;
  if (!asked.state.empty()) address += "&state=" + percentEncode(asked.state);
  return address + "&iss=" + percentEncode(settings().issuer);
}

[[noreturn]] void refuse(const Request& request, const AuthorizationRequest& asked,
                         const std::string& error, const std::string& why) {
  throw Refusal{redirectAnswer(
      request, addressWith(asked, "error=" + error + "&error_description=" + percentEncode(why)))};
}

/// That an application is no good any more is nothing to send its users back for.
[[noreturn]] void refuse(const Request& request, const AuthorizationRequest& asked,
                         const grants::Refusal& refusal) {
  const char* why = grants::explain(refusal.why);
  if (refusal.error == grants::Error::kInvalidClient) refuseWithPage(403, std::string(why) + ".");
  refuse(request, asked, grants::codeText(refusal.error), why);
}

/// Until client and address are known to belong together, nobody is redirected
/// anywhere.
AuthorizationRequest readClient(const grants::Grants& store, const Parameters& given) {
  if (given.isAnyDoubled({"client_id", "redirect_uri"})) {
    refuseWithPage(400, "The application or its address is named twice.");
  }
  const auto client = store.applications.find(grants::ApplicationId(given.value("client_id")));
  if (!client) refuseWithPage(400, "The application that sent you here is not known to this box.");
  if (!client->isEnabled) {
    refuseWithPage(403, "The administrator of this box has disabled this application.");
  }
  const bool named = given.has("redirect_uri");
  AuthorizationRequest asked{
      *client, named ? given.value("redirect_uri") : onlyAddress(client->addresses), named};
  if (asked.redirect.empty() || !isRegistered(asked.redirect, client->addresses)) {
    refuseWithPage(400, "The address to return to is not one that the application registered.");
  }
  return asked;
}

bool isChallenge(const std::string& text) {
  return text.size() == kChallengeBytes && percentEncode(text) == text &&
         text.find_first_of(".~") == std::string::npos;
}

grants::CodeRequest codeRequest(const Request& request, const AuthorizationRequest& asked) {
  grants::CodeRequest code{grants::User(request.user), asked.client.identifier,
                           grants::Scope(asked.scope), grants::RedirectAddress(asked.redirect)};
  code.named =
      asked.redirectWasGiven ? grants::AddressNamed::kInRequest : grants::AddressNamed::kImplied;
  code.pkce = grants::Pkce{grants::Challenge(asked.challenge)};
  code.from = peerAddress();
  return code;
}

/// Faults that the application hears of.
void readRest(const Request& request, const Parameters& given, AuthorizationRequest& asked) {
  if (!given.isDoubled("state")) asked.state = given.value("state");
  if (given.isAnyDoubled({"state", "response_type", "response_mode", "scope", "code_challenge",
                          "code_challenge_method"})) {
    refuse(request, asked, "invalid_request", "A parameter occurs more than once");
  }
  const std::string type = given.value("response_type");
  if (type.empty()) refuse(request, asked, "invalid_request", "response_type is missing");
  if (type != "code") refuse(request, asked, "unsupported_response_type", "Only code is supported");
  const std::string mode = given.value("response_mode");
  if (!mode.empty() && mode != "query") {
    refuse(request, asked, "invalid_request", "Only the response mode query is supported");
  }
  asked.challenge = given.value("code_challenge");
  if (given.value("code_challenge_method") != "S256" || !isChallenge(asked.challenge)) {
    refuse(request, asked, "invalid_request", "PKCE with the method S256 is required");
  }
  const std::string& registered = asked.client.scope.text();
  asked.scope = tidyScope(given.has("scope") ? given.value("scope") : registered);
  if (asked.scope.empty() || !isWithin(asked.scope, registered)) {
    refuse(request, asked, "invalid_scope", "The application is not registered for this scope");
  }
  const auto fault = grants::Codes::faultOf(codeRequest(request, asked));
  if (fault) refuse(request, asked, *fault);
}

Answer decide(grants::Grants& store, const Request& request, const Parameters& given,
              const AuthorizationRequest& asked) {
  if (given.isAnyDoubled({"form_token", "decision"}) ||
      !isFormToken(given.value("form_token"), request.user, formSubject(asked))) {
    refuseWithPage(403,
                   "The form is too old, or it does not come from this box. "
                   "Go back to the application and start again.");
  }
  const std::string decision = given.value("decision");
  if (decision == "refuse") {
    refuse(request, asked, "access_denied", "The user refused");
  }
  if (decision != "allow") refuseWithPage(400, "The form does not say what you decided.");
  const auto issued = store.codes.issue(codeRequest(request, asked));
  if (!issued) refuse(request, asked, issued.refusal());
  return redirectAnswer(request, addressWith(asked, "code=" + issued->code.text()));
}

Answer handle(const Request& request) {
  const bool isDecision = request.method == "POST";
  if (!isDecision && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  if (isDecision && !request.isForm()) refuseWithPage(400, "This is not a form.");
  if (request.user.empty() || request.user.size() > kMaxUser) {
    refuseWithPage(403, "The web server does not say who you are.");
  }
  const std::optional<Parameters> given =
      Parameters::parse(isDecision ? request.body : request.query);
  if (!given) refuseWithPage(400, "The request cannot be read.");

  grants::Grants store;
  AuthorizationRequest asked = readClient(store, *given);
  readRest(request, *given, asked);
  return isDecision ? decide(store, request, *given, asked) : consentPage(request.user, asked);
}

}  // namespace

int main() {
  return serve(handle, failurePage);
}
