// AES-SIV (RFC 5297) as the platform's deterministic cipher. The nonce is the
// version label of the format, so that a ciphertext of another version does not
// authenticate. Text form: base64url without padding.

#include "platform/keldcore.h"

#include <nettle/base64.h>
#include <nettle/siv-cmac.h>

#include <array>
#include <cstdint>
#include <cstring>

#include "platform/standin/key_file.h"

namespace {

constexpr std::array<std::uint8_t, 10> kVersionLabel{'k', 'e', 'l', 'd', 'c',
                                                     'o', 'r', 'e', '-', '1'};

/// No text in our use comes near it; it bounds the buffers on the stack. As a
/// multiple of three it is the same bound for bytes and for their encoding.
constexpr std::size_t kMaxSealed = 4095;
constexpr std::size_t kMaxEncoded = BASE64_ENCODE_RAW_LENGTH(kMaxSealed) + 1;

using Sealed = std::array<std::uint8_t, kMaxSealed>;
using Encoded = std::array<char, kMaxEncoded>;

/// The key last used in this thread, ready for use: one process handles one
/// request, but a listing decrypts thousands of values.
struct Schedule {
  keldcore::FileStamp stamp;
  siv_cmac_aes256_ctx context{};
};

const siv_cmac_aes256_ctx* scheduledKey(keldcore::WhenAbsent whenAbsent) {
  thread_local Schedule schedule;
  const char* path = keldcore::keyFilePath();
  if (keldcore::isUnchanged(path, schedule.stamp)) return &schedule.context;

  schedule = {};
  keldcore::Key key;
  if (!keldcore::loadKey(path, whenAbsent, key, schedule.stamp)) return nullptr;
  siv_cmac_aes256_set_key(&schedule.context, key.bytes.data());
  return &schedule.context;
}

/// The length of the encoded text, without padding; NUL-terminated.
std::size_t encode(const std::uint8_t* bytes, std::size_t size, Encoded& text) {
  base64_encode_ctx encoder;
  base64url_encode_init(&encoder);
  std::size_t length = base64_encode_update(&encoder, text.data(), size, bytes);
  length += base64_encode_final(&encoder, text.data() + length);
  while (length > 0 && text[length - 1] == '=') --length;
  text[length] = '\0';
  return length;
}

/// False unless `text` is exactly what encode makes of the bytes: every value
/// has one ciphertext only.
bool decode(const char* text, Sealed& bytes, std::size_t& size) {
  const std::size_t length = std::strlen(text);
  if (length >= kMaxEncoded) return false;

  base64_decode_ctx decoder;
  base64url_decode_init(&decoder);
  size = bytes.size();
  if (base64_decode_update(&decoder, &size, bytes.data(), length, text) == 0) return false;

  Encoded again;
  return encode(bytes.data(), size, again) == length && std::strcmp(again.data(), text) == 0;
}

}  // namespace

int KCORECryptSzEncrypt(const char* clear, char* out, size_t outSize) {
  if (clear == nullptr || out == nullptr) return 0;
  const std::size_t size = std::strlen(clear) + SIV_DIGEST_SIZE;
  if (size > kMaxSealed) return 0;

  const siv_cmac_aes256_ctx* key = scheduledKey(keldcore::WhenAbsent::kMake);
  if (key == nullptr) return 0;
  Sealed sealed;
  siv_cmac_aes256_encrypt_message(key, kVersionLabel.size(), kVersionLabel.data(), 0, nullptr, size,
                                  sealed.data(), reinterpret_cast<const std::uint8_t*>(clear));
  Encoded text;
  const std::size_t length = encode(sealed.data(), size, text);
  if (length >= outSize) return 0;
  std::memcpy(out, text.data(), length + 1);
  return 1;
}

int KCORECryptSzDecrypt(const char* cipher, char* out, size_t outSize) {
  if (cipher == nullptr || out == nullptr) return 0;
  Sealed sealed;
  std::size_t size = 0;
  if (!decode(cipher, sealed, size) || size < SIV_DIGEST_SIZE) return 0;
  const std::size_t length = size - SIV_DIGEST_SIZE;
  if (length >= outSize) return 0;

  const siv_cmac_aes256_ctx* key = scheduledKey(keldcore::WhenAbsent::kFail);
  if (key == nullptr) return 0;
  Sealed clear;
  const bool authentic =
      siv_cmac_aes256_decrypt_message(key, kVersionLabel.size(), kVersionLabel.data(), 0, nullptr,
                                      length, clear.data(), sealed.data()) != 0 &&
      std::memchr(clear.data(), '\0', length) == nullptr;
  if (authentic) {
    std::memcpy(out, clear.data(), length);
    out[length] = '\0';
  }
  explicit_bzero(clear.data(), length);
  return authentic ? 1 : 0;
}
