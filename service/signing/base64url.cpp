#include "service/signing/base64url.h"

#include <nettle/base64.h>

#include "service/signing/sha256.h"
#include "service/text/encoding.h"

namespace keldoauth::service::signing {

std::optional<std::string> fromBase64Url(std::string_view text) {
  base64_decode_ctx decoder;
  base64url_decode_init(&decoder);
  std::string bytes(BASE64_DECODE_LENGTH(text.size()), '\0');
  std::size_t size = bytes.size();
  const int isAlphabet = base64_decode_update(
      &decoder, &size, reinterpret_cast<std::uint8_t*>(bytes.data()), text.size(), text.data());
  if (isAlphabet == 0) return std::nullopt;
  bytes.resize(size);
  // Nettle reads over blanks and what is left at the end.
  if (base64Url(bytes) != text) return std::nullopt;
  return bytes;
}

std::string halfDigest(std::string_view text) {
  const Digest digest = sha256(text);
  return base64Url({reinterpret_cast<const char*>(digest.data()), digest.size() / 2});
}

}  // namespace keldoauth::service::signing
