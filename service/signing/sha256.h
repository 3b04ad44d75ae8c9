#ifndef KELDOAUTH_SERVICE_SIGNING_SHA256_H
#define KELDOAUTH_SERVICE_SIGNING_SHA256_H

#include <nettle/sha2.h>

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

namespace keldoauth::service::signing {

using Digest = std::array<std::uint8_t, SHA256_DIGEST_SIZE>;

inline const std::uint8_t* bytesOf(std::string_view text) {
  return reinterpret_cast<const std::uint8_t*>(text.data());
}

inline Digest sha256(std::string_view text) {
  sha256_ctx context;
  sha256_init(&context);
  sha256_update(&context, text.size(), bytesOf(text));
  Digest digest{};
  sha256_digest(&context, digest.size(), digest.data());
  return digest;
}

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_SHA256_H
