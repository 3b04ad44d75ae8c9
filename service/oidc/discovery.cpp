#include <ctime>

#include "service/oidc/endpoints.h"
#include "service/oidc/id_token.h"
#include "service/protocol/endpoints.h"
#include "service/signing/key_file.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
void addOpenIdMembers(const Settings& settings, Json::Value& document) {
  document["jwks_uri"] = settings.endpoint("/oauth/jwks");
  document["userinfo_endpoint"] = settings.endpoint("/oauth/userinfo");
  document["end_session_endpoint"] = settings.endpoint("/oauth/logout");
  document["subject_types_supported"] = jsonList({"public"});
  document["id_token_signing_alg_values_supported"] = jsonList({"RS256", "ES256"});
  document["claims_supported"] = jsonList(
      {"iss", "sub", "aud", "exp", "iat", "auth_time", "nonce", "at_hash", "preferred_username"});
  document["prompt_values_supported"] = jsonList({"none", "login", "consent", "select_account"});
  document["claims_parameter_supported"] = false;
  document["request_parameter_supported"] = false;
  // Absent, it would be true.
  document["request_uri_parameter_supported"] = false;
}

Answer openIdConfiguration(Context& context, const Request& request) {
  return offersOpenId(context.settings) ? metadata(context, request) : plainAnswer(404);
}

Answer publicKeys(Context& context, const Request& request) {
  if (!offersOpenId(context.settings)) return plainAnswer(404);
  if (!request.isRead()) return methodNotAllowed("GET, HEAD");
  const signing::KeySet keys = signing::KeyFile(context.settings.signingKeysFile).read();
  return jsonAnswer(200, keys.publicSet(std::time(nullptr)));
}

}  // namespace keldoauth::service
