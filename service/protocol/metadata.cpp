#include "service/protocol/endpoints.h"

#include "service/oidc/endpoints.h"
#include "service/oidc/id_token.h"
#include "service/settings/scopes.h"

namespace keldoauth::service {
Answer metadata(Context& context, const Request& request) {
  if (!request.isRead()) return methodNotAllowed("GET, HEAD");
  const Settings& own = context.settings;
  Json::Value document;
  document["issuer"] = own.issuer;
  document["authorization_endpoint"] = own.endpoint("/oauth/authorize");
  document["token_endpoint"] = own.endpoint("/oauth/token");
  document["registration_endpoint"] = own.endpoint("/oauth/register");
  document["introspection_endpoint"] = own.endpoint("/oauth/introspect");
  document["pushed_authorization_request_endpoint"] = own.endpoint("/oauth/par");
  document["require_pushed_authorization_requests"] = false;
  document["revocation_endpoint"] = own.endpoint("/oauth/revoke");
  document["response_types_supported"] = jsonList({"code"});
  document["response_modes_supported"] = jsonList({"query"});
  document["grant_types_supported"] =
      jsonList({"authorization_code", "refresh_token", "client_credentials"});
  document["code_challenge_methods_supported"] = jsonList({"S256"});
  for (const char* endpoint : {"token", "introspection", "revocation"}) {
    document[std::string(endpoint) + "_endpoint_auth_methods_supported"] =
        jsonList({"client_secret_basic", "client_secret_post"});
  }
  // A public application says who it is, where its tokens or codes say the rest.
  for (const char* endpoint : {"token", "revocation"}) {
    document[std::string(endpoint) + "_endpoint_auth_methods_supported"].append("none");
  }
  document["authorization_response_iss_parameter_supported"] = true;
  for (const KnownScope& scope : own.scopes) document["scopes_supported"].append(scope.name);
  if (offersOpenId(own)) addOpenIdMembers(own, document);
  return jsonAnswer(200, document);
}

}  // namespace keldoauth::service
