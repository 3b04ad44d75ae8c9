// /oauth/revoke: ends a login, whichever of its two tokens is shown (RFC 7009).
// A token that is not there any more is a success.

#include "examples/cgi/answer.h"
#include "examples/cgi/clients.h"

namespace {

using namespace service;

Answer handle(const Request& request) {
  const Parameters form = readForm(request, {"token", "token_type_hint"});
  const Credentials credentials = readCredentials(request, form);
  grants::Grants store;
  const grants::Application client = authenticate(store, credentials);
  if (!form.has("token")) return oauthError(400, "invalid_request", "token is missing");
  const auto revoked =
      store.tokens.revoke(client.identifier, grants::AnyToken(form.value("token")));
  if (!revoked) return refusalAnswer(revoked.refusal());
  // The body means nothing, but there are clients that cannot read an empty one.
  return jsonAnswer(200, Json::Value(Json::objectValue));
}

}  // namespace

int main() {
  return serve(handle);
}
