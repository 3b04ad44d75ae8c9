#include <ctime>

#include "service/people/slow_down.h"
#include "service/protocol/client_metadata.h"
#include "service/protocol/endpoints.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

void requireInitialToken(const Settings& settings, const Request& request) {
  const std::string& expected = settings.initialAccessToken;
  const std::optional<std::string> token = bearerToken(request.authorization);
  if (!token) {
    throw Refusal{plainAnswer(401).with("WWW-Authenticate", R"(Bearer realm="registration")")};
  }
  if (!expected.empty() && equalSecrets(*token, expected)) return;
  throw Refusal{
      oauthError(401, "invalid_token", "Not the initial access token")
          .with("WWW-Authenticate", R"(Bearer realm="registration", error="invalid_token")")};
}

grants::Registered add(grants::Grants& store, const ClientMetadata& metadata) {
  grants::NewApplication application{metadata.name, metadata.addresses, metadata.scope,
                                     metadata.kind};
  application.logoutAddresses = metadata.logoutAddresses;
  application.wantsEs256 = metadata.wantsEs256;
  application.registersItself = true;
  const auto added = store.applications.add(application, grants::Actor(metadata.name.text()));
  if (!added) throw Refusal{refusalAnswer(added.refusal())};
  return *added;
}

}  // namespace

Answer registerApplication(Context& context, const Request& request) {
  if (request.method != "POST") return methodNotAllowed("POST");
  requireInitialToken(context.settings, request);
  countRegistration(context.settings, request);
  const ClientMetadata metadata =
      readClientMetadata(context.settings, readJson(request), kSecretInHeader);
  const grants::Registered registered = add(context.store.open(), metadata);

  grants::Application application{};
  application.identifier = registered.identifier;
  application.name = metadata.name;
  application.addresses = metadata.addresses;
  application.logoutAddresses = metadata.logoutAddresses;
  application.wantsEs256 = metadata.wantsEs256;
  application.scope = metadata.scope;
  Json::Value answer = clientInformation(context.settings, application, registered.secret);
  answer["token_endpoint_auth_method"] = metadata.method;
  answer["client_id_issued_at"] = static_cast<Json::Int64>(std::time(nullptr));
  return jsonAnswer(201, answer);
}

}  // namespace keldoauth::service
