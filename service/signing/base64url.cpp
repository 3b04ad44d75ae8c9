#include "service/signing/base64url.h"

#include <nettle/base64.h>

#include "service/signing/sha256.h"

namespace keldoauth::service::signing {

std::string toBase64Url(std::string_view bytes) {
  base64_encode_ctx encoder;
  base64url_encode_init(&encoder);
  std::string text(BASE64_ENCODE_LENGTH(bytes.size()) + BASE64_ENCODE_FINAL_LENGTH, '\0');
  std::size_t size = base64_encode_update(&encoder, text.data(), bytes.size(), bytesOf(bytes));
  size += base64_encode_final(&encoder, text.data() + size);
  text.resize(size);
  while (!text.empty() && text.back() == '=') text.pop_back();
  return text;
}

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
  if (toBase64Url(bytes) != text) return std::nullopt;
  return bytes;
}

std::string halfDigest(std::string_view text) {
  const Digest digest = sha256(text);
  return toBase64Url({reinterpret_cast<const char*>(digest.data()), digest.size() / 2});
}

}  // namespace keldoauth::service::signing
