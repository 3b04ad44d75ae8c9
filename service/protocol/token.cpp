#include "service/protocol/endpoints.h"

#include "service/oidc/id_token.h"
#include "service/protocol/authorization_request.h"
#include "service/protocol/clients.h"
#include "service/settings/scopes.h"
#include "service/signing/key_fault.h"

namespace keldoauth::service {
namespace {

/// Who asks for a token, and where from.
struct Asking {
  const Settings& settings;
  const grants::Application& client;
  grants::PeerAddress from;
};

[[noreturn]] void refuse(const std::string& error, const std::string& why) {
  throw Refusal{oauthError(400, error, why)};
}

std::string required(const Parameters& form, const char* name) {
  if (!form.has(name)) refuse("invalid_request", std::string(name) + " is missing");
  return form.value(name);
}

/// Applications of OpenID Connect repeat what they asked for in the first place:
/// names that this box has never heard of count here as little as there.
std::optional<grants::Scope> askedScope(const Asking& asking, const Parameters& form) {
  if (!form.has("scope")) return {};
  std::string scope = tidyScope(form.value("scope"));
  if (asksWhoItIs(scope)) scope = asking.settings.scopes.known(scope);
  if (scope.empty()) refuse("invalid_scope", "scope names nothing");
  return grants::Scope(scope);
}

grants::Outcome<grants::Pair> redeemCode(grants::Grants& store, const Asking& asking,
                                         const Parameters& form) {
  const grants::Code code(required(form, "code"));
  std::optional<grants::Verifier> verifier;
  if (asking.client.needsPkce || form.has("code_verifier")) {
    verifier = grants::Verifier(required(form, "code_verifier"));
  }
  const grants::RedirectAddress redirect(form.value("redirect_uri"));
  return store.codes.redeem({asking.client.identifier, code, redirect, verifier, asking.from});
}

grants::Outcome<grants::Pair> refresh(grants::Grants& store, const Asking& asking,
                                      const Parameters& form) {
  const grants::RefreshToken token(required(form, "refresh_token"));
  return store.tokens.refresh(
      {asking.client.identifier, token, askedScope(asking, form), asking.from});
}

grants::Outcome<grants::Pair> actForItself(grants::Grants& store, const Asking& asking,
                                           const Parameters& form) {
  return store.tokens.issueToItself(
      {asking.client.identifier, askedScope(asking, form), asking.from});
}

/// A refresh is done by now and need not say who the user is: a login must not be
/// lost for want of a key.
std::string idTokenOrNone(const Settings& settings, const grants::Application& client,
                          const grants::Pair& pair, bool isRefresh) try {
  return idTokenFor(settings, client, pair, isRefresh ? Occasion::kRefresh : Occasion::kLogin);
} catch (const signing::KeyFault&) {
  if (isRefresh) return {};
  throw;
}

Answer success(const grants::Pair& pair, const std::string& idToken) {
  Json::Value document;
  document["access_token"] = pair.access.text();
  document["token_type"] = "Bearer";
  document["expires_in"] = static_cast<Json::Int64>(pair.expires - pair.issued);
  document["scope"] = pair.scope.text();
  if (pair.refresh) document["refresh_token"] = pair.refresh->text();
  if (!idToken.empty()) document["id_token"] = idToken;
  return jsonAnswer(200, document).with("Pragma", "no-cache");
}

using Grant = grants::Outcome<grants::Pair> (*)(grants::Grants& store, const Asking& asking,
                                                const Parameters& form);

Grant grantOf(const Parameters& form) {
  const std::string type = required(form, "grant_type");
  if (type == "authorization_code") return redeemCode;
  if (type == "refresh_token") return refresh;
  if (type == "client_credentials") return actForItself;
  refuse("unsupported_grant_type", "This grant type is not supported");
}

}  // namespace

Answer token(Context& context, const Request& request) {
  const Parameters form = readForm(
      request, {"grant_type", "code", "redirect_uri", "code_verifier", "refresh_token", "scope"});
  const Credentials credentials = readCredentials(request, form);
  grants::Grants& store = context.store.open();
  const grants::Application client = authenticate(store, credentials);
  if (const auto fault = faultOfResource(context.settings, form)) refuse(fault->error, fault->why);
  const auto pair = grantOf(form)(store, {context.settings, client, peerAddress(request)}, form);
  if (!pair) return refusalAnswer(pair.refusal());
  const bool isRefresh = form.value("grant_type") == "refresh_token";
  return success(*pair, idTokenOrNone(context.settings, client, *pair, isRefresh));
}

}  // namespace keldoauth::service
