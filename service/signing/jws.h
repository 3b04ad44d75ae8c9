// Signed tokens (JWS, RFC 7515) in their compact form.

#ifndef KELDOAUTH_SERVICE_SIGNING_JWS_H
#define KELDOAUTH_SERVICE_SIGNING_JWS_H

#include <json/value.h>

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

#include "service/signing/key_set.h"

namespace keldoauth::service::signing {

inline constexpr std::size_t kMaxToken = 8192;  // bytes that are looked at

/// Of the object `claims`, with `alg`, `kid` and `typ` JWT in the header. Throws
/// KeyFault without random numbers.
std::string signedToken(const Json::Value& claims, const Key& key);

/// What a token says that one of these keys signed, in whatever state the key
/// is. Nothing for any other text. That the token has expired, is for somebody
/// else or is of another issuer is for the caller to find out.
std::optional<Json::Value> claimsOf(std::string_view token, const KeySet& keys);

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_JWS_H
