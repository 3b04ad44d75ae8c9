#include "service/protocol/endpoints.h"

#include "service/oidc/authentication.h"
#include "service/oidc/id_token.h"
#include "service/oidc/login_text.h"
#include "service/pages/consent_page.h"
#include "service/pages/form_token.h"
#include "service/pages/html.h"
#include "service/pages/sign_in.h"
#include "service/protocol/authorization_request.h"
#include "service/protocol/clients.h"
#include "service/protocol/redirect.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

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
  if (refusal.error == grants::Error::kInvalidClient) {
    refuseWithPage(context.settings, 403, std::string(why) + ".");
  }
  refuse(context, request, asked, grants::codeText(refusal.error), why);
}

grants::Application findClient(Context& context, const Parameters& given) {
  if (given.isAnyDoubled({"client_id", "redirect_uri", "request_uri"})) {
    refuseWithPage(context.settings, 400, "The application or its address is named twice.");
  }
  const auto client =
      context.store.open().applications.find(grants::ApplicationId(given.value("client_id")));
  if (!client) {
    refuseWithPage(context.settings, 400,
                   "The application that sent you here is not known to this box.");
  }
  if (!client->isEnabled) {
    refuseWithPage(context.settings, 403,
                   "The administrator of this box has disabled this application.");
  }
  return *client;
}

/// What was pushed counts, and nothing that stands beside the reference.
Parameters openPushed(Context& context, const grants::Application& client,
                      const grants::RequestReference& reference) {
  const auto text = context.store.open().pushed.open(client.identifier, reference);
  const std::optional<Parameters> pushed =
      text ? Parameters::parse(text->text()) : std::optional<Parameters>();
  if (!pushed) {
    refuseWithPage(context.settings, 400,
                   "This request is too old, or it was used before. "
                   "Go back to the application and start again.");
  }
  return *pushed;
}

std::optional<grants::RequestReference> referenceIn(const Parameters& given) {
  const std::string uri = given.value("request_uri");
  if (uri.rfind(kReferenceStart, 0) != 0) return {};
  return grants::RequestReference(uri.substr(kReferenceStart.size()));
}

/// Until client and address are known to belong together, nobody is redirected
/// anywhere. `given` becomes what was pushed.
AuthorizationRequest readClient(Context& context, Parameters& given) {
  const grants::Application client = findClient(context, given);
  const auto reference = referenceIn(given);
  if (reference) given = openPushed(context, client, *reference);
  AuthorizationRequest asked = startOf(client, given);
  asked.pushed = reference;
  const std::string fault = faultOfAddress(asked);
  if (!fault.empty()) refuseWithPage(context.settings, 400, fault);
  return asked;
}

grants::CodeRequest codeRequest(const Request& request, const AuthorizationRequest& asked) {
  grants::CodeRequest code{grants::User(request.user), asked.client.identifier,
                           grants::Scope(asked.scope), grants::RedirectAddress(asked.redirect)};
  code.named =
      asked.redirectWasGiven ? grants::AddressNamed::kInRequest : grants::AddressNamed::kImplied;
  if (!asked.challenge.empty()) code.pkce = grants::Pkce{grants::Challenge(asked.challenge)};
  code.from = peerAddress(request);
  code.pushed = asked.pushed;
  if (asksWhoItIs(asked.scope)) code.text = packed({request.authTime, asked.nonce});
  return code;
}

/// What came back from our own page; any other form is a request (OpenID Connect
/// Core, 3.1.2.1).
bool isDecision(const Request& request, const Parameters& given) {
  return request.method == "POST" && (given.has("form_token") || given.has("decision"));
}

/// The form of another site comes without the cookie that says who the user is
/// (SameSite). As a link it has it.
Answer askWho(const Settings& settings, const Request& request, const Parameters& given) {
  const std::string link = safeNext(settings, settings.link("/oauth/authorize?") + request.body);
  const bool isLinkable = request.method == "POST" && !isDecision(request, given) && !link.empty();
  return isLinkable ? redirectAnswer(request, link) : signInFirst(settings, request);
}

/// The sign-in is as the application wants it.
void requireFresh(const Context& context, const Request& request, const Parameters& given,
                  AuthorizationRequest& asked) {
  if (isDecision(request, given)) return;
  const bool isAnothers = isForAnother(context.settings, request, asked);
  if (!mustSignInAgain(context.settings, request, given, asked, isAnothers)) {
    if (isAnothers) {
      refuse(context, request, asked, "login_required", "Somebody else is signed in");
    }
    // With a session it has been done, and the page has nothing to add.
    if (!request.session.empty()) asked.prompt.login = false;
    return;
  }
  if (asked.prompt.none) {
    refuse(context, request, asked, "login_required", "The user has to sign in again");
  }
  throw Refusal{request.isRead() ? signInAgain(context.settings, request, asked)
                                 : askWho(context.settings, request, given)};
}

/// Faults that the application hears of. `question` is the request, `given` what
/// the browser brought.
void requireGood(const Context& context, const Request& request, const Parameters& given,
                 const Parameters& question, AuthorizationRequest& asked) {
  if (const auto fault = readRest(context.settings, question, asked)) {
    refuse(context, request, asked, fault->error, fault->why);
  }
  if (request.user.empty() && asked.prompt.none) {
    refuse(context, request, asked, "login_required", "Nobody is signed in");
  }
  if (request.user.empty()) throw Refusal{askWho(context.settings, request, given)};
  if (const auto fault = faultOfKeys(context.settings, asked)) {
    refuse(context, request, asked, fault->error, fault->why);
  }
  requireFresh(context, request, given, asked);
  const auto fault = grants::Codes::faultOf(codeRequest(request, asked));
  if (fault) refuse(context, request, asked, *fault);
}

Answer answerWith(const Context& context, const Request& request, const AuthorizationRequest& asked,
                  const grants::IssuedCode& issued) {
  return redirectAnswer(request,
                        addressWith(context.settings, asked, "code=" + issued.code.text()));
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
  if (decision != "allow") {
    refuseWithPage(context.settings, 400, "The form does not say what you decided.");
  }
  const auto issued = context.store.open().codes.issue(codeRequest(request, asked));
  if (!issued) refuse(context, request, asked, issued.refusal());
  return answerWith(context, request, asked, *issued);
}

/// Whoever is on the user's device can listen at such an address, or take such a
/// scheme, and needs no secret (RFC 8252, 8.6): only the user can know who asks.
bool isAnybodys(const AuthorizationRequest& asked) {
  return asked.client.kind == grants::ApplicationKind::kPublic &&
         formOf(asked.redirect) != AddressForm::kWeb;
}

/// A code for what the user agreed to before. The look beforehand needs no lock.
grants::Outcome<grants::IssuedCode> issueUnasked(Context& context, const Request& request,
                                                 const AuthorizationRequest& asked) {
  grants::CodeRequest code = codeRequest(request, asked);
  code.withoutPage = true;
  grants::Grants& store = context.store.open();
  if (request.method != "GET" || asked.prompt.wantsPage() || isAnybodys(asked) ||
      !store.access.hasLogin(code.user, code.application, code.scope)) {
    return grants::Refusal{grants::Error::kAccessDenied, grants::Why::kNotRemembered};
  }
  return store.codes.issue(code);
}

/// What they agreed to before is not asked again.
Answer answerOrAsk(Context& context, const Request& request, const AuthorizationRequest& asked) {
  const auto issued = issueUnasked(context, request, asked);
  if (issued) return answerWith(context, request, asked, *issued);
  const grants::Refusal& refusal = issued.refusal();
  if (refusal.error != grants::Error::kAccessDenied) refuse(context, request, asked, refusal);
  if (!asked.prompt.none) return consentPage(context.settings, request, asked);
  const bool isRoom = refusal.why == grants::Why::kWouldEvict;
  refuse(context, request, asked, isRoom ? "interaction_required" : "consent_required",
         "The user has to be asked");
}

}  // namespace

Answer authorize(Context& context, const Request& request) {
  const bool isPost = request.method == "POST";
  if (!isPost && !request.isRead()) return methodNotAllowed("GET, HEAD, POST");
  if (isPost && !request.isForm()) refuseWithPage(context.settings, 400, "This is not a form.");
  const std::optional<Parameters> given = Parameters::parse(isPost ? request.body : request.query);
  if (!given) refuseWithPage(context.settings, 400, "The request cannot be read.");

  Parameters question = *given;
  AuthorizationRequest asked = readClient(context, question);
  requireGood(context, request, *given, question, asked);
  return isDecision(request, *given) ? decide(context, request, *given, asked)
                                     : answerOrAsk(context, request, asked);
}

}  // namespace keldoauth::service
