#include "service/protocol/endpoints.h"

#include <json/reader.h>

#include <ctime>
#include <sstream>

#include "service/http/encoding.h"
#include "service/protocol/clients.h"
#include "service/protocol/redirect.h"
#include "service/settings/scopes.h"

namespace keldoauth::service {
namespace {

constexpr char kDefaultScope[] = "profile";
constexpr char kDefaultMethod[] = "client_secret_basic";

[[noreturn]] void refuse(const std::string& why) {
  throw Refusal{oauthError(400, "invalid_client_metadata", why)};
}

[[noreturn]] void refuseRedirect(const std::string& why) {
  throw Refusal{oauthError(400, "invalid_redirect_uri", why)};
}

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

Json::Value readMetadata(const Request& request) {
  if (request.contentType != "application/json") refuse("The content type must be JSON's");
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  builder["stackLimit"] = 20;
  Json::Value metadata;
  std::istringstream body(request.body);
  try {
    if (Json::parseFromStream(builder, body, &metadata, nullptr) && metadata.isObject()) {
      return metadata;
    }
  } catch (const Json::Exception&) {
    // Nested too deeply: as unreadable as the rest.
  }
  refuse("The body is not a JSON object");
}

/// The text under `name`; `otherwise` when absent.
std::string text(const Json::Value& metadata, const char* name, const std::string& otherwise) {
  const Json::Value& value = metadata[name];
  if (value.isNull()) return otherwise;
  if (!value.isString()) refuse(std::string(name) + " must be a string");
  std::string found = value.asString();
  if (found.find('\0') != std::string::npos) refuse(std::string(name) + " has a NUL character");
  return found;
}

/// Every text of the array under `name` must be one that we know.
void requireKnown(const Json::Value& metadata, const char* name,
                  std::initializer_list<const char*> known) {
  const Json::Value& values = metadata[name];
  if (values.isNull()) return;
  if (!values.isArray()) refuse(std::string(name) + " must be an array");
  for (const Json::Value& value : values) {
    bool found = false;
    for (const char* word : known) found = found || value == word;
    if (!found) refuse(std::string(name) + " has a value that is not supported");
  }
}

bool usesRedirects(const Json::Value& metadata) {
  const Json::Value& grants = metadata["grant_types"];
  if (grants.isNull()) return true;
  for (const Json::Value& grant : grants) {
    if (grant == "authorization_code") return true;
  }
  return false;
}

/// None for an application that only acts for itself.
Addresses readRedirects(const Json::Value& metadata) {
  const Json::Value& addresses = metadata["redirect_uris"];
  if (!addresses.isNull() && !addresses.isArray()) refuseRedirect("redirect_uris must be an array");
  Addresses read;
  for (const Json::Value& address : addresses) {
    if (!address.isString() || !isRedirectAddress(address.asString())) {
      refuseRedirect("Only https, or http on the loopback interface, without a fragment");
    }
    if (address.asString().size() > kMaxRedirect) refuseRedirect("An address is too long");
    read.emplace_back(address.asString());
  }
  if (!usesRedirects(metadata)) return {};
  if (read.empty()) refuseRedirect("redirect_uris is missing");
  return read;
}

std::string readScope(const ScopeTable& scopes, const Json::Value& metadata) {
  const std::string asked = text(metadata, "scope", "");
  std::string scope = scopes.known(asked.empty() ? kDefaultScope : asked);
  if (scope.empty()) refuse("scope names nothing that this server knows");
  return scope;
}

std::string readName(const Json::Value& metadata) {
  std::string name = text(metadata, "client_name", "Unnamed application");
  // JSON's reader lets any bytes through, and its writer lets them out again.
  const std::string fault = faultOfName(name);
  if (!fault.empty()) refuse("client_name: " + fault);
  return name;
}

std::string readMethod(const Json::Value& metadata) {
  std::string method = text(metadata, "token_endpoint_auth_method", kDefaultMethod);
  if (method != kDefaultMethod && method != "client_secret_post") {
    refuse("token_endpoint_auth_method is not supported: every client has a secret here");
  }
  return method;
}

grants::Registered add(grants::Grants& store, const grants::NewApplication& application) {
  const auto added = store.applications.add(application, grants::Actor(application.name.text()));
  if (!added) throw Refusal{refusalAnswer(added.refusal())};
  return *added;
}

}  // namespace

Answer registerApplication(Context& context, const Request& request) {
  if (request.method != "POST") return methodNotAllowed("POST");
  requireInitialToken(context.settings, request);
  const Json::Value metadata = readMetadata(request);
  requireKnown(metadata, "grant_types",
               {"authorization_code", "refresh_token", "client_credentials"});
  requireKnown(metadata, "response_types", {"code"});

  Json::Value answer;
  answer["token_endpoint_auth_method"] = readMethod(metadata);
  answer["client_name"] = readName(metadata);
  answer["scope"] = readScope(context.settings.scopes, metadata);
  grants::NewApplication application{grants::ApplicationName(answer["client_name"].asString()),
                                     readRedirects(metadata),
                                     grants::Scope(answer["scope"].asString())};
  application.registersItself = true;
  const grants::Registered registered = add(context.store.open(), application);

  answer["client_id"] = registered.identifier.text();
  answer["client_secret"] = registered.secret->text();
  answer["client_secret_expires_at"] = 0;
  answer["client_id_issued_at"] = static_cast<Json::Int64>(std::time(nullptr));
  if (!application.addresses.empty()) {
    answer["redirect_uris"] = metadata["redirect_uris"];
    answer["response_types"].append("code");
    answer["grant_types"].append("authorization_code");
    answer["grant_types"].append("refresh_token");
  }
  // The registry has no column for it, so this one is open to all.
  answer["grant_types"].append("client_credentials");
  return jsonAnswer(201, answer);
}

}  // namespace keldoauth::service
