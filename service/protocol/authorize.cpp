#include "service/protocol/endpoints.h"

#include "service/http/encoding.h"
#include "service/pages/consent_page.h"
#include "service/pages/form_token.h"
#include "service/pages/html.h"
#include "service/protocol/clients.h"
#include "service/protocol/redirect.h"
#include "service/settings/scopes.h"
#include "utils/oauth_bounds.h"

namespace keldoauth::service {
namespace {

constexpr std::size_t kMaxUser = KELDOAUTHSERVER::bounds::kUsername.max;
constexpr std::size_t kChallengeBytes = 43;

[[noreturn]] void refuseWithPage(const Settings& settings, int status, const std::string& why) {
  throw Refusal{messagePage(settings, status, "This request cannot be answered", why)};
}

/// The application's address with parameters of ours, state and issuer added.
std::string addressWith(const Settings& settings, const AuthorizationRequest& asked,
                        const std::string& parameters) {
  std::string address = asked.redirect;
  address += address.find('?') == std::string::npos ? '?' : '&';
  address += parameters;
  if (!asked.state.empty()) address += "&state=" + percentEncode(asked.state);
  return address + "&iss=" + percentEncode(settings.issuer);
}

[[noreturn]] void refuse(const Context& context, const Request& request,
                         const AuthorizationRequest& asked, const std::string& error,
                         const std::string& why) {
  throw Refusal{redirectAnswer(
      request, addressWith(context.settings, asked,
                           "error=" + error + "&error_description=" + percentEncode(why)))};
}

/// That an application is no good any more is nothing to send its users back for.
[[noreturn]] void refuse(const Context& context, const Request& request,
                         const AuthorizationRequest& asked, const grants::Refusal& refusal) {
  const char* why = grants::explain(refusal.why);
  if (refusal.error == grants::Error::kInvalidClient)
    refuseWithPage(context.settings, 403, std::string(why) + ".");
  refuse(context, request, asked, grants::codeText(refusal.error), why);
}

/// Until client and address are known to belong together, nobody is redirected
/// anywhere.
AuthorizationRequest readClient(Context& context, const Parameters& given) {
  if (given.isAnyDoubled({"client_id", "redirect_uri"})) {
    refuseWithPage(context.settings, 400, "The application or its address is named twice.");
  }
  const auto client =
      context.store.open().applications.find(grants::ApplicationId(given.value("client_id")));
  if (!client)
    refuseWithPage(context.settings, 400,
                   "The application that sent you here is not known to this box.");
  if (!client->isEnabled) {
    refuseWithPage(context.settings, 403,
                   "The administrator of this box has disabled this application.");
  }
  const bool named = given.has("redirect_uri");
  AuthorizationRequest asked{
      *client, named ? given.value("redirect_uri") : onlyAddress(client->addresses), named};
  if (asked.redirect.empty() || !isRegistered(asked.redirect, client->addresses)) {
    refuseWithPage(context.settings, 400,
                   "The address to return to is not one that the application registered.");
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
  code.from = peerAddress(request);
  return code;
}

/// Faults that the application hears of.
void readRest(const Context& context, const Request& request, const Parameters& given,
              AuthorizationRequest& asked) {
  if (!given.isDoubled("state")) asked.state = given.value("state");
  if (given.isAnyDoubled({"state", "response_type", "response_mode", "scope", "code_challenge",
                          "code_challenge_method"})) {
    refuse(context, request, asked, "invalid_request", "A parameter occurs more than once");
  }
  const std::string type = given.value("response_type");
  if (type.empty()) refuse(context, request, asked, "invalid_request", "response_type is missing");
  if (type != "code")
    refuse(context, request, asked, "unsupported_response_type", "Only code is supported");
  const std::string mode = given.value("response_mode");
  if (!mode.empty() && mode != "query") {
    refuse(context, request, asked, "invalid_request", "Only the response mode query is supported");
  }
  asked.challenge = given.value("code_challenge");
  if (given.value("code_challenge_method") != "S256" || !isChallenge(asked.challenge)) {
    refuse(context, request, asked, "invalid_request", "PKCE with the method S256 is required");
  }
  const std::string& registered = asked.client.scope.text();
  asked.scope = tidyScope(given.has("scope") ? given.value("scope") : registered);
  if (asked.scope.empty() || !isWithin(asked.scope, registered)) {
    refuse(context, request, asked, "invalid_scope",
           "The application is not registered for this scope");
  }
  const auto fault = grants::Codes::faultOf(codeRequest(request, asked));
  if (fault) refuse(context, request, asked, *fault);
}

Answer decide(Context& context, const Request& request, const Parameters& given,
              const AuthorizationRequest& asked) {
  if (given.isAnyDoubled({"form_token", "decision"}) ||
      !isFormToken(context.settings, given.value("form_token"), request.user, formSubject(asked))) {
    refuseWithPage(context.settings, 403,
                   "The form is too old, or it does not come from this box. "
                   "Go back to the application and start again.");
  }
  const std::string decision = given.value("decision");
  if (decision == "refuse") {
    refuse(context, request, asked, "access_denied", "The user refused");
  }
  if (decision != "allow")
    refuseWithPage(context.settings, 400, "The form does not say what you decided.");
  const auto issued = context.store.open().codes.issue(codeRequest(request, asked));
  if (!issued) refuse(context, request, asked, issued.refusal());
  return redirectAnswer(request,
                        addressWith(context.settings, asked, "code=" + issued->code.text()));
}

}  // namespace

Answer authorize(Context& context, const Request& request) {
  const bool isDecision = request.method == "POST";
  if (!isDecision && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  if (isDecision && !request.isForm()) refuseWithPage(context.settings, 400, "This is not a form.");
  if (request.user.empty() || request.user.size() > kMaxUser) {
    refuseWithPage(context.settings, 403, "The web server does not say who you are.");
  }
  const std::optional<Parameters> given =
      Parameters::parse(isDecision ? request.body : request.query);
  if (!given) refuseWithPage(context.settings, 400, "The request cannot be read.");

  AuthorizationRequest asked = readClient(context, *given);
  readRest(context, request, *given, asked);
  return isDecision ? decide(context, request, *given, asked)
                    : consentPage(context.settings, request.user, asked);
}

}  // namespace keldoauth::service
