#include "service/protocol/endpoints.h"

#include "service/protocol/clients.h"

namespace keldoauth::service {

Answer revoke(Context& context, const Request& request) {
  const Parameters form = readForm(request, {"token", "token_type_hint"});
  const Credentials credentials = readCredentials(request, form);
  grants::Grants& store = context.store.open();
  const grants::Application client = authenticate(store, credentials);
  if (!form.has("token")) return oauthError(400, "invalid_request", "token is missing");
  const auto revoked =
      store.tokens.revoke(client.identifier, grants::AnyToken(form.value("token")));
  if (!revoked) return refusalAnswer(revoked.refusal());
  // The body means nothing, but there are clients that cannot read an empty one.
  return jsonAnswer(200, Json::Value(Json::objectValue));
}

}  // namespace keldoauth::service
