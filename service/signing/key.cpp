#include "service/signing/key.h"

#include <utility>

#include "service/signing/base64url.h"
#include "service/signing/key_fault.h"
#include "service/signing/key_pair.h"
#include "service/text/encoding.h"

namespace keldoauth::service::signing {

std::string_view nameOf(Algorithm algorithm) {
  return algorithm == Algorithm::kRs256 ? "RS256" : "ES256";
}

std::optional<Algorithm> algorithmNamed(std::string_view name) {
  for (const Algorithm algorithm : kAlgorithms) {
    if (nameOf(algorithm) == name) return algorithm;
  }
  return std::nullopt;
}

std::string textMember(const Json::Value& jwk, const char* name) {
  const Json::Value& member = jwk[name];
  if (!member.isString()) throw KeyFault(std::string(name) + " is no text");
  return member.asString();
}

std::string bytesMember(const Json::Value& jwk, const char* name, std::size_t limit) {
  const std::optional<std::string> bytes = fromBase64Url(textMember(jwk, name));
  if (!bytes) throw KeyFault(std::string(name) + " is no base64url");
  if (bytes->empty() || bytes->size() > limit) {
    throw KeyFault(std::string(name) + " has a bad length");
  }
  return *bytes;
}

/// The members in the order of their names, without a blank: all of them are of
/// letters that JSON writes as they are.
std::string thumbprintOf(const Json::Value& jwk) {
  const bool isRsa = jwk["kty"].asString() == "RSA";
  const auto member = [&](const char* name) {
    return '"' + std::string(name) + "\":\"" + jwk[name].asString() + '"';
  };
  const std::string text = isRsa ? '{' + member("e") + ',' + member("kty") + ',' + member("n") + '}'
                                 : '{' + member("crv") + ',' + member("kty") + ',' + member("x") +
                                       ',' + member("y") + '}';
  const Digest digest = sha256(text);
  return base64Url({reinterpret_cast<const char*>(digest.data()), digest.size()});
}

Key::Key(std::shared_ptr<const KeyPair> pair)
    : pair_(std::move(pair)), identifier_(thumbprintOf(pair_->publicMembers())) {}

Key Key::make(Algorithm algorithm) {
  return Key(algorithm == Algorithm::kRs256 ? makeRsaPair() : makeEcPair());
}

Key Key::read(const Json::Value& jwk) {
  const std::optional<Algorithm> algorithm = algorithmNamed(textMember(jwk, "alg"));
  if (!algorithm) throw KeyFault("alg is neither RS256 nor ES256");
  return Key(*algorithm == Algorithm::kRs256 ? readRsaPair(jwk) : readEcPair(jwk));
}

Algorithm Key::algorithm() const {
  return pair_->algorithm();
}

Json::Value Key::withNames(Json::Value members) const {
  members["kid"] = identifier_;
  members["use"] = "sig";
  members["alg"] = std::string(nameOf(algorithm()));
  return members;
}

Json::Value Key::publicJwk() const {
  return withNames(pair_->publicMembers());
}

Json::Value Key::privateJwk() const {
  Json::Value jwk = publicJwk();
  pair_->addPrivateMembers(jwk);
  return jwk;
}

std::string Key::sign(std::string_view text) const {
  return pair_->sign(sha256(text));
}

bool Key::hasSigned(std::string_view text, std::string_view signature) const {
  return pair_->hasSigned(sha256(text), signature);
}

}  // namespace keldoauth::service::signing
