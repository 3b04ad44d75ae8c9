#include "service/protocol/endpoints.h"

#include "service/protocol/clients.h"
#include "service/settings/scopes.h"

namespace keldoauth::service {
namespace {

constexpr char kRealm[] = "Bearer realm=\"box\"";
constexpr char kScope[] = "profile";

Answer refuse(int status, const std::string& error, const std::string& why,
              const std::string& more = "") {
  return oauthError(status, error, why)
      .with("WWW-Authenticate", std::string(kRealm) + ", error=\"" + error +
                                    "\", error_description=\"" + why + "\"" + more);
}

}  // namespace

Answer whoami(Context& context, const Request& request) {
  if (!request.isRead()) return methodNotAllowed("GET, HEAD");
  const std::optional<std::string> text = bearerToken(request.authorization);
  // Who shows no token learns only that one is needed.
  if (!text) {
    return plainAnswer(401).with("WWW-Authenticate",
                                 std::string(kRealm) + ", scope=\"" + kScope + "\"");
  }
  if (text->empty()) return refuse(400, "invalid_request", "The token is missing");

  const grants::Grants& store = context.store.open();
  const auto bearer = store.tokens.verify(grants::AccessToken(*text));
  if (!bearer) {
    const grants::Refusal& refusal = bearer.refusal();
    return refuse(401, grants::codeText(refusal.error), grants::explain(refusal.why));
  }
  if (!isWithin(kScope, bearer->scope.text())) {
    return refuse(403, "insufficient_scope", "The token does not cover this",
                  std::string(", scope=\"") + kScope + "\"");
  }
  Json::Value document;
  document["sub"] = subjectOf(*bearer);
  document["client_id"] = bearer->application.text();
  document["scope"] = bearer->scope.text();
  return jsonAnswer(200, document);
}

}  // namespace keldoauth::service
