// /oauth/revoke: ends a pair of tokens, whichever of the two is shown (RFC 7009).
// A token that is not there any more is a success.

#include "examples/cgi/answer.h"
#include "examples/cgi/clients.h"
#include "examples/cgi/tokens.h"

namespace {

using namespace service;

Answer handle(const Request& request) {
  const Parameters form = readForm(request, {"token", "token_type_hint"});
  const Client client = authenticate(request, form);
  const std::string text = form.value("token");
  if (text.empty()) return oauthError(400, "invalid_request", "token is missing");

  std::optional<Token> token = findAccessToken(text);
  if (!token) token = findRefreshToken(text);
  if (token && token->clientId != client.identifier) {
    return oauthError(400, "invalid_grant", "The token was issued to another client");
  }
  if (token) removeToken(*token);
  // The body means nothing, but there are clients that cannot read an empty one.
  return jsonAnswer(200, Json::Value(Json::objectValue));
}

}  // namespace

int main() {
  return serve(handle);
}
