#include "grants/grants.h"
#include "service/oidc/endpoints.h"
#include "service/oidc/id_token.h"

namespace keldoauth::service {
namespace {

constexpr char kRealm[] = "Bearer realm=\"box\"";

Answer refuse(int status, const std::string& error, const std::string& why,
              const std::string& more = "") {
  return oauthError(status, error, why)
      .with("WWW-Authenticate", std::string(kRealm) + ", error=\"" + error +
                                    "\", error_description=\"" + why + "\"" + more);
}

/// In the header, or in a form (RFC 6750, 2.2); nothing when there is none.
std::optional<std::string> tokenIn(const Request& request) {
  if (request.method != "POST" || !request.isForm()) return bearerToken(request.authorization);
  const std::optional<Parameters> form = Parameters::parse(request.body);
  if (!form || !form->has("access_token")) return bearerToken(request.authorization);
  // Which of two is meant nobody can say.
  const bool isOne = request.authorization.empty() && !form->isDoubled("access_token");
  return isOne ? form->value("access_token") : "";
}

}  // namespace

Answer userInfo(Context& context, const Request& request) {
  if (!offersOpenId(context.settings)) return plainAnswer(404);
  if (!request.isRead() && request.method != "POST") return methodNotAllowed("GET, HEAD, POST");
  const std::optional<std::string> text = tokenIn(request);
  // Who shows no token learns only that one is needed.
  if (!text) {
    return plainAnswer(401).with("WWW-Authenticate",
                                 std::string(kRealm) + ", scope=\"" + kOpenId + "\"");
  }
  if (text->empty()) {
    return refuse(400, "invalid_request", "The token is missing, or there are two");
  }

  const auto bearer = context.store.open().tokens.verify(grants::AccessToken(*text));
  if (!bearer) {
    const grants::Refusal& refusal = bearer.refusal();
    return refuse(401, grants::codeText(refusal.error), grants::explain(refusal.why));
  }
  if (!bearer->user || !asksWhoItIs(bearer->scope.text())) {
    return refuse(403, "insufficient_scope", "The token does not cover this",
                  std::string(", scope=\"") + kOpenId + "\"");
  }
  Json::Value document;
  document["sub"] = openIdSubject(*bearer->user);
  if (sharesName(bearer->scope.text())) document["preferred_username"] = bearer->user->text();
  return jsonAnswer(200, document);
}

}  // namespace keldoauth::service
