// /api/whoami: a protected resource. It tells the holder of an access token with
// the scope "profile" who the token stands for (RFC 6750).

#include "examples/cgi/answer.h"
#include "examples/cgi/scopes.h"
#include "examples/cgi/tokens.h"

namespace {

using namespace service;

constexpr char kRealm[] = "Bearer realm=\"box\"";
constexpr char kScope[] = "profile";

Answer refuse(int status, const std::string& error, const std::string& why,
              const std::string& more = "") {
  return oauthError(status, error, why)
      .with("WWW-Authenticate", std::string(kRealm) + ", error=\"" + error +
                                    "\", error_description=\"" + why + "\"" + more);
}

Answer handle(const Request& request) {
  if (!request.isRead()) return methodNotAllowed("GET, HEAD");
  const std::optional<std::string> text = bearerToken(request.authorization);
  // Who shows no token learns only that one is needed.
  if (!text) {
    return plainAnswer(401).with("WWW-Authenticate",
                                 std::string(kRealm) + ", scope=\"" + kScope + "\"");
  }
  if (text->empty()) return refuse(400, "invalid_request", "The token is missing");

  const std::optional<Token> token = verifiedToken(*text);
  if (!token) return refuse(401, "invalid_token", "The token is unknown, expired or revoked");
  if (!isWithin(kScope, token->scope)) {
    return refuse(403, "insufficient_scope", "The token does not cover this",
                  std::string(", scope=\"") + kScope + "\"");
  }
  Json::Value document;
  document["sub"] = token->user;
  document["client_id"] = token->clientId;
  document["scope"] = token->scope;
  return jsonAnswer(200, document);
}

}  // namespace

int main() {
  return serve(handle);
}
