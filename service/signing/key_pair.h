// What Key stands on: the arithmetic of each algorithm.

#ifndef KELDOAUTH_SERVICE_SIGNING_KEY_PAIR_H
#define KELDOAUTH_SERVICE_SIGNING_KEY_PAIR_H

#include <json/value.h>

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

#include "service/signing/key.h"
#include "service/signing/sha256.h"

namespace keldoauth::service::signing {

class KeyPair {
 public:
  KeyPair() = default;
  virtual ~KeyPair() = default;
  KeyPair(const KeyPair&) = delete;
  KeyPair& operator=(const KeyPair&) = delete;

  [[nodiscard]] virtual Algorithm algorithm() const = 0;
  /// The members that the thumbprint takes.
  [[nodiscard]] virtual Json::Value publicMembers() const = 0;
  virtual void addPrivateMembers(Json::Value& jwk) const = 0;
  [[nodiscard]] virtual std::string sign(const Digest& digest) const = 0;
  [[nodiscard]] virtual bool hasSigned(const Digest& digest, std::string_view signature) const = 0;
};

std::shared_ptr<const KeyPair> makeRsaPair();
std::shared_ptr<const KeyPair> readRsaPair(const Json::Value& jwk);
std::shared_ptr<const KeyPair> makeEcPair();
std::shared_ptr<const KeyPair> readEcPair(const Json::Value& jwk);

/// The text of a member. Throws KeyFault when it is none.
std::string textMember(const Json::Value& jwk, const char* name);
/// The bytes of a member in base64url, at most `limit` of them.
std::string bytesMember(const Json::Value& jwk, const char* name, std::size_t limit);

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_KEY_PAIR_H
