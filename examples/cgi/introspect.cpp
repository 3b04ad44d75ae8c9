// /oauth/introspect: tells an application what a token is good for (RFC 7662).
// Any application may ask about an access token that it was shown, as resource
// servers do; about a refresh token only the one that holds it.

#include "examples/cgi/answer.h"
#include "examples/cgi/clients.h"
#include "examples/cgi/settings.h"
#include "examples/cgi/tokens.h"

namespace {

using namespace service;

Answer inactive() {
  Json::Value document;
  document["active"] = false;
  return jsonAnswer(200, document);
}

Answer active(const Token& token, const std::string& scope, long long expires,
              const std::string& type = "") {
  Json::Value document;
  document["active"] = true;
  document["scope"] = scope;
  document["iss"] = settings().issuer;
  document["sub"] = token.user;
  document["client_id"] = token.clientId;
  document["exp"] = static_cast<Json::Int64>(expires);
  if (!type.empty()) document["token_type"] = type;
  if (token.flow != kFlowClient) document["username"] = token.user;
  if (token.state.issued > 0) document["iat"] = static_cast<Json::Int64>(token.state.issued);
  return jsonAnswer(200, document);
}

Answer handle(const Request& request) {
  const Parameters form = readForm(request, {"token", "token_type_hint"});
  const Client client = authenticate(request, form);
  const std::string text = form.value("token");
  if (text.empty()) return oauthError(400, "invalid_request", "token is missing");

  if (const std::optional<Token> token = verifiedToken(text)) {
    return active(*token, token->scope, token->expires, "Bearer");
  }
  const std::optional<Token> token = findRefreshToken(text);
  if (!token || token->clientId != client.identifier || !token->isRefreshable()) return inactive();
  return active(*token, token->state.grantScope, token->expires + kRefreshSeconds);
}

}  // namespace

int main() {
  return serve(handle);
}
