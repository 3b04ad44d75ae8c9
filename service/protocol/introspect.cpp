#include "service/protocol/endpoints.h"

#include "service/protocol/clients.h"

namespace keldoauth::service {
namespace {

Answer inactive() {
  Json::Value document;
  document["active"] = false;
  return jsonAnswer(200, document);
}

Answer active(const Settings& settings, const grants::Introspection& found) {
  const grants::Bearer& bearer = found.bearer;
  Json::Value document;
  document["active"] = true;
  document["scope"] = bearer.scope.text();
  document["iss"] = settings.issuer;
  document["sub"] = subjectOf(bearer);
  document["client_id"] = bearer.application.text();
  document["exp"] = static_cast<Json::Int64>(bearer.expires);
  if (found.kind == grants::Introspection::Kind::kAccess) document["token_type"] = "Bearer";
  if (bearer.user) document["username"] = bearer.user->text();
  if (bearer.issued) document["iat"] = static_cast<Json::Int64>(*bearer.issued);
  return jsonAnswer(200, document);
}

}  // namespace

Answer introspect(Context& context, const Request& request) {
  const Parameters form = readForm(request, {"token", "token_type_hint"});
  const Credentials credentials = readCredentials(request, form);
  requireSecret(credentials);
  const grants::Grants& store = context.store.open();
  const grants::Application client = authenticate(store, credentials);
  if (!form.has("token")) return oauthError(400, "invalid_request", "token is missing");
  const auto found =
      store.tokens.introspect(client.identifier, grants::AnyToken(form.value("token")));
  return found ? active(context.settings, *found) : inactive();
}

}  // namespace keldoauth::service
