#include "service/signing/jws.h"

#include "service/signing/base64url.h"
#include "service/signing/strict_json.h"
#include "service/text/encoding.h"

namespace keldoauth::service::signing {
namespace {

std::string header(const Key& key) {
  Json::Value members(Json::objectValue);
  members["alg"] = std::string(nameOf(key.algorithm()));
  members["kid"] = key.identifier();
  members["typ"] = "JWT";
  return compactText(members);
}

/// Of the three parts of a compact token.
std::optional<Json::Value> objectIn(std::string_view part) {
  const std::optional<std::string> text = fromBase64Url(part);
  return text ? readObject(*text) : std::nullopt;
}

bool isText(const Json::Value& value, std::string_view text) {
  return value.isString() && value.asString() == text;
}

/// The key that the header names. Its algorithm is the key's own: a header may
/// repeat it, and never choose it.
const Key* keyOf(const Json::Value& header, const KeySet& keys) {
  if (!header["kid"].isString() || header.isMember("crit")) return nullptr;
  const Key* const key = keys.find(header["kid"].asString());
  return key != nullptr && isText(header["alg"], nameOf(key->algorithm())) ? key : nullptr;
}

}  // namespace

std::string signedToken(const Json::Value& claims, const Key& key) {
  const std::string text = base64Url(header(key)) + '.' + base64Url(compactText(claims));
  return text + '.' + base64Url(key.sign(text));
}

std::optional<Json::Value> claimsOf(std::string_view token, const KeySet& keys) {
  if (token.size() > kMaxToken) return std::nullopt;
  const std::size_t first = token.find('.');
  const std::size_t last = token.rfind('.');
  if (first == std::string_view::npos || first == last) return std::nullopt;

  const std::optional<Json::Value> header = objectIn(token.substr(0, first));
  const Key* const key = header ? keyOf(*header, keys) : nullptr;
  if (key == nullptr) return std::nullopt;
  const std::optional<std::string> signature = fromBase64Url(token.substr(last + 1));
  if (!signature || !key->hasSigned(token.substr(0, last), *signature)) return std::nullopt;
  return objectIn(token.substr(first + 1, last - first - 1));
}

}  // namespace keldoauth::service::signing
