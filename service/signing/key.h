// One key that signs.

#ifndef KELDOAUTH_SERVICE_SIGNING_KEY_H
#define KELDOAUTH_SERVICE_SIGNING_KEY_H

#include <json/value.h>

#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace keldoauth::service::signing {

/// RS256 is RSA of 2,048 bits with PKCS #1 1.5, ES256 is ECDSA over P-256; both
/// with SHA-256.
enum class Algorithm { kRs256, kEs256 };
inline constexpr Algorithm kAlgorithms[] = {Algorithm::kRs256, Algorithm::kEs256};

/// The name in the `alg` of JOSE.
std::string_view nameOf(Algorithm algorithm);
std::optional<Algorithm> algorithmNamed(std::string_view name);

class KeyPair;

/// A private key and its public one; they fit each other. Copies share them.
class Key {
 public:
  /// A fresh one. Throws KeyFault without random numbers.
  static Key make(Algorithm algorithm);

  /// From the members of a private JWK (RFC 7517): `alg` and `kty` with, for
  /// RSA, n, e, d, p, q, dp, dq, qi; for P-256, crv, x, y, d. Throws KeyFault that
  /// names the member when one is missing, no text, not in its one spelling, or
  /// does not fit the others. Whether p and q are primes is not looked at.
  static Key read(const Json::Value& jwk);

  [[nodiscard]] Algorithm algorithm() const;

  /// The thumbprint of RFC 7638, which is its `kid`.
  [[nodiscard]] const std::string& identifier() const { return identifier_; }

  /// With kid, use and alg; the second one has the secrets, too.
  [[nodiscard]] Json::Value publicJwk() const;
  [[nodiscard]] Json::Value privateJwk() const;

  /// The signature's bytes as RFC 7518 3.3 and 3.4 have them. Throws KeyFault
  /// without random numbers.
  [[nodiscard]] std::string sign(std::string_view text) const;
  [[nodiscard]] bool hasSigned(std::string_view text, std::string_view signature) const;

 private:
  explicit Key(std::shared_ptr<const KeyPair> pair);
  [[nodiscard]] Json::Value withNames(Json::Value members) const;

  std::shared_ptr<const KeyPair> pair_;
  std::string identifier_;
};

/// Of a public JWK with at least the members that RFC 7638 3.2 takes.
std::string thumbprintOf(const Json::Value& jwk);

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_KEY_H
