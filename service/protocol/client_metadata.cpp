#include "service/protocol/client_metadata.h"

#include <json/reader.h>

#include <initializer_list>
#include <sstream>

#include "service/settings/scopes.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr char kRs256[] = "RS256";
constexpr char kEs256[] = "ES256";
constexpr char kDefaultScope[] = "openid profile";

[[noreturn]] void refuse(const std::string& why) {
  throw Refusal{oauthError(400, "invalid_client_metadata", why)};
}

[[noreturn]] void refuseRedirect(const std::string& why) {
  throw Refusal{oauthError(400, "invalid_redirect_uri", why)};
}

/// The text under `name`; `otherwise` when absent.
std::string text(const Json::Value& document, const char* name, const std::string& otherwise) {
  const Json::Value& value = document[name];
  if (value.isNull()) return otherwise;
  if (!value.isString()) refuse(std::string(name) + " must be a string");
  std::string found = value.asString();
  if (found.find('\0') != std::string::npos) refuse(std::string(name) + " has a NUL character");
  return found;
}

/// Every text of the array under `name` must be one that we know.
void requireKnown(const Json::Value& document, const char* name,
                  std::initializer_list<const char*> known) {
  const Json::Value& values = document[name];
  if (values.isNull()) return;
  if (!values.isArray()) refuse(std::string(name) + " must be an array");
  for (const Json::Value& value : values) {
    bool found = false;
    for (const char* word : known) found = found || value == word;
    if (!found) refuse(std::string(name) + " has a value that is not supported");
  }
}

/// Whether the array `grant_types` has this one.
bool isAmong(const Json::Value& types, const char* name) {
  for (const Json::Value& type : types) {
    if (type == name) return true;
  }
  return false;
}

bool usesRedirects(const Json::Value& document) {
  const Json::Value& types = document["grant_types"];
  return types.isNull() || isAmong(types, "authorization_code");
}

/// The addresses under `name`.
template <typename Address>
std::vector<Address> readAddresses(const Json::Value& document, const char* name,
                                   grants::ApplicationKind kind) {
  const Json::Value& addresses = document[name];
  if (!addresses.isNull() && !addresses.isArray()) {
    refuseRedirect(std::string(name) + " must be an array");
  }
  std::vector<Address> read;
  for (const Json::Value& address : addresses) {
    if (!address.isString() || !isRedirectAddress(address.asString(), kind)) {
      refuseRedirect(
          "Only https, http on the loopback interface or, without a secret, a scheme with a dot "
          "and one slash behind it; no user and no fragment");
    }
    if (address.asString().size() > kMaxRedirect) refuseRedirect("An address is too long");
    read.emplace_back(address.asString());
  }
  return read;
}

Addresses readRedirects(const Json::Value& document, grants::ApplicationKind kind) {
  Addresses read = readAddresses<grants::RedirectAddress>(document, "redirect_uris", kind);
  if (!usesRedirects(document)) return {};
  if (read.empty()) refuseRedirect("redirect_uris is missing");
  return read;
}

grants::Scope readScope(const ScopeTable& scopes, const Json::Value& document) {
  const std::string asked = text(document, "scope", "");
  const std::string scope = scopes.known(asked.empty() ? kDefaultScope : asked);
  if (scope.empty()) refuse("scope names nothing that this server knows");
  return grants::Scope(scope);
}

grants::ApplicationName readName(const Json::Value& document) {
  const std::string name = text(document, "client_name", "Unnamed application");
  // JSON's reader lets any bytes through, and its writer lets them out again.
  const std::string fault = faultOfName(name);
  if (!fault.empty()) refuse("client_name: " + fault);
  return grants::ApplicationName(name);
}

std::string readMethod(const Json::Value& document, const std::string& otherwise) {
  std::string method = text(document, "token_endpoint_auth_method", otherwise);
  if (method != kSecretInHeader && method != kSecretInBody && method != kNoSecret) {
    refuse("token_endpoint_auth_method is not supported");
  }
  return method;
}

bool wantsEs256(const Json::Value& document) {
  const std::string algorithm = text(document, "id_token_signed_response_alg", kRs256);
  if (algorithm != kRs256 && algorithm != kEs256) {
    refuse("id_token_signed_response_alg is not supported");
  }
  return algorithm == kEs256;
}

/// Without a secret anybody could be it.
void requireUse(const Json::Value& document, grants::ApplicationKind kind) {
  if (kind != grants::ApplicationKind::kPublic) return;
  if (isAmong(document["grant_types"], "client_credentials")) {
    refuse("client_credentials needs a secret");
  }
  if (!usesRedirects(document)) refuse("Without a secret there is authorization_code alone");
}

}  // namespace

Json::Value readJson(const Request& request) {
  if (request.contentType != "application/json") refuse("The content type must be JSON's");
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  builder["stackLimit"] = 20;
  Json::Value document;
  std::istringstream body(request.body);
  try {
    if (Json::parseFromStream(builder, body, &document, nullptr) && document.isObject()) {
      return document;
    }
  } catch (const Json::Exception&) {
    // Nested too deeply: as unreadable as the rest.
  }
  refuse("The body is not a JSON object");
}

ClientMetadata readClientMetadata(const Settings& settings, const Json::Value& document,
                                  const std::string& method) {
  requireKnown(document, "grant_types",
               {"authorization_code", "refresh_token", "client_credentials"});
  requireKnown(document, "response_types", {"code"});
  ClientMetadata read;
  read.method = readMethod(document, method);
  read.kind = read.method == kNoSecret ? grants::ApplicationKind::kPublic
                                       : grants::ApplicationKind::kConfidential;
  requireUse(document, read.kind);
  read.name = readName(document);
  read.scope = readScope(settings.scopes, document);
  read.addresses = readRedirects(document, read.kind);
  read.wantsEs256 = wantsEs256(document);
  read.logoutAddresses =
      readAddresses<grants::LogoutAddress>(document, "post_logout_redirect_uris", read.kind);
  return read;
}

std::string registrationToken(const Settings& settings, const grants::ApplicationId& identifier,
                              const std::optional<grants::Secret>& secret) {
  const std::string kind = secret ? "confidential:" + secret->text() : "public";
  return base64Url(hmacSha256(settings.formKey, "registration:" + identifier.text() + ":" + kind));
}

Json::Value clientInformation(const Settings& settings, const grants::Application& application,
                              const std::optional<grants::Secret>& secret) {
  Json::Value document;
  document["client_id"] = application.identifier.text();
  document["client_name"] = application.name.text();
  document["scope"] = application.scope.text();
  document["token_endpoint_auth_method"] = secret ? kSecretInHeader : kNoSecret;
  if (secret) {
    document["client_secret"] = secret->text();
    document["client_secret_expires_at"] = 0;
  }
  if (!application.addresses.empty()) {
    for (const grants::RedirectAddress& address : application.addresses) {
      document["redirect_uris"].append(address.text());
    }
    for (const grants::LogoutAddress& address : application.logoutAddresses) {
      document["post_logout_redirect_uris"].append(address.text());
    }
    document["id_token_signed_response_alg"] = application.wantsEs256 ? kEs256 : kRs256;
    document["response_types"].append("code");
    document["grant_types"].append("authorization_code");
    document["grant_types"].append("refresh_token");
  }
  // The registry has no column for it: it is open to all that have a secret.
  if (secret) document["grant_types"].append("client_credentials");
  document["registration_client_uri"] =
      settings.endpoint("/oauth/register/" + application.identifier.text());
  document["registration_access_token"] =
      registrationToken(settings, application.identifier, secret);
  return document;
}

}  // namespace keldoauth::service
