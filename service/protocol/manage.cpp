#include <initializer_list>
#include <string_view>

#include "service/protocol/client_metadata.h"
#include "service/protocol/endpoints.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

/// One that is not there, or one that an administrator registered, is no other
/// answer than a wrong token (RFC 7592, 2).
[[noreturn]] void refuseToken() {
  throw Refusal{
      oauthError(401, "invalid_token", "Not the registration access token of this application")
          .with("WWW-Authenticate", R"(Bearer realm="registration", error="invalid_token")")};
}

[[noreturn]] void refuseRequest(const std::string& why) {
  throw Refusal{oauthError(400, "invalid_request", why)};
}

/// The application that the path names, as it has shown by its token.
struct Holder {
  grants::Application application;
  std::optional<grants::Secret> secret;
};

Holder authenticateHolder(Context& context, const Request& request) {
  const std::optional<std::string> token = bearerToken(request.authorization);
  if (!token) {
    throw Refusal{plainAnswer(401).with("WWW-Authenticate", R"(Bearer realm="registration")")};
  }
  const grants::ApplicationId identifier(request.path.substr(request.path.rfind('/') + 1));
  const grants::Applications& applications = context.store.open().applications;
  const auto application = applications.find(identifier);
  if (!application || !application->registeredItself) refuseToken();
  const std::optional<grants::Secret> secret = applications.secretOf(identifier);
  if (!equalSecrets(*token, registrationToken(context.settings, identifier, secret))) refuseToken();
  if (!application->isEnabled) {
    throw Refusal{oauthError(403, "access_denied", "The administrator has disabled this client")};
  }
  return {*application, secret};
}

/// What the application is told, and may not tell us (RFC 7592, 2.2).
void requireOwn(const Json::Value& document, const Holder& holder) {
  if (document["client_id"] != holder.application.identifier.text()) {
    refuseRequest("client_id must be there, and be the one of this client");
  }
  for (const char* name : {"registration_access_token", "registration_client_uri",
                           "client_secret_expires_at", "client_id_issued_at"}) {
    if (document.isMember(name)) refuseRequest(std::string(name) + " must not be there");
  }
  const Json::Value& secret = document["client_secret"];
  const bool isIts =
      secret.isString() && holder.secret && equalSecrets(secret.asString(), holder.secret->text());
  if (!secret.isNull() && !isIts) refuseRequest("client_secret is not the one of this client");
}

Answer read(Context& context, const Holder& holder) {
  return jsonAnswer(200, clientInformation(context.settings, holder.application, holder.secret));
}

/// All of it is replaced; what is absent gets its default. Secret and token stay.
Answer replace(Context& context, const Request& request, const Holder& holder) {
  const Json::Value document = readJson(request);
  requireOwn(document, holder);
  const ClientMetadata metadata =
      readClientMetadata(context.settings, document, holder.secret ? kSecretInHeader : kNoSecret);
  if (metadata.kind != holder.application.kind) {
    throw Refusal{oauthError(400, "invalid_client_metadata",
                             "token_endpoint_auth_method: a client does not get or lose a secret")};
  }
  grants::ApplicationChange change;
  change.name = metadata.name;
  change.addresses = metadata.addresses;
  change.logoutAddresses = metadata.logoutAddresses;
  change.wantsEs256 = metadata.wantsEs256;
  change.scope = metadata.scope;
  const auto changed = context.store.open().applications.change(holder.application.identifier,
                                                                change, grants::kItself);
  if (!changed) {
    if (changed.refusal().error == grants::Error::kInvalidClient) refuseToken();
    return refusalAnswer(changed.refusal());
  }
  Json::Value answer = clientInformation(context.settings, *changed, holder.secret);
  answer["token_endpoint_auth_method"] = metadata.method;
  return jsonAnswer(200, answer);
}

Answer remove(Context& context, const Holder& holder) {
  const auto removed =
      context.store.open().applications.remove(holder.application.identifier, grants::kItself);
  if (!removed) refuseToken();
  return Answer{204, {}, ""};
}

}  // namespace

Answer manageRegistration(Context& context, const Request& request) {
  const bool isPut = request.method == "PUT";
  const bool isDelete = request.method == "DELETE";
  if (!isPut && !isDelete && request.method != "GET") return methodNotAllowed("DELETE, GET, PUT");
  const Holder holder = authenticateHolder(context, request);
  if (isDelete) return remove(context, holder);
  return isPut ? replace(context, request, holder) : read(context, holder);
}

}  // namespace keldoauth::service
