#include "service/text/encoding.h"

#include <nettle/base64.h>
#include <nettle/hmac.h>
#include <nettle/memops.h>
#include <nettle/sha2.h>

#include <array>
#include <cstdint>
#include <cstdlib>

namespace keldoauth::service {
namespace {

const std::uint8_t* bytesOf(std::string_view text) {
  return reinterpret_cast<const std::uint8_t*>(text.data());
}

bool isContinuation(char c) {
  return (static_cast<unsigned char>(c) & 0xC0U) == 0x80U;
}

bool isUnreserved(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

}  // namespace

std::string base64Url(std::string_view bytes) {
  base64_encode_ctx encoder;
  base64url_encode_init(&encoder);
  std::string text(BASE64_ENCODE_LENGTH(bytes.size()) + BASE64_ENCODE_FINAL_LENGTH, '\0');
  std::size_t size = base64_encode_update(&encoder, text.data(), bytes.size(), bytesOf(bytes));
  size += base64_encode_final(&encoder, text.data() + size);
  text.resize(size);
  while (!text.empty() && text.back() == '=') text.pop_back();
  return text;
}

std::optional<std::string> base64Decode(std::string_view text) {
  base64_decode_ctx decoder;
  base64_decode_init(&decoder);
  std::string bytes(BASE64_DECODE_LENGTH(text.size()), '\0');
  std::size_t size = bytes.size();
  if (base64_decode_update(&decoder, &size, reinterpret_cast<std::uint8_t*>(bytes.data()),
                           text.size(), text.data()) == 0 ||
      base64_decode_final(&decoder) == 0) {
    return std::nullopt;
  }
  bytes.resize(size);
  return bytes;
}

std::string hmacSha256(std::string_view key, std::string_view text) {
  hmac_sha256_ctx context;
  hmac_sha256_set_key(&context, key.size(), bytesOf(key));
  hmac_sha256_update(&context, text.size(), bytesOf(text));
  std::array<std::uint8_t, SHA256_DIGEST_SIZE> digest{};
  hmac_sha256_digest(&context, digest.size(), digest.data());
  return {digest.begin(), digest.end()};
}

std::string percentEncode(std::string_view text) {
  constexpr char kDigits[] = "0123456789ABCDEF";
  std::string encoded;
  for (const char c : text) {
    if (isUnreserved(c)) {
      encoded += c;
      continue;
    }
    const auto byte = static_cast<unsigned char>(c);
    encoded += '%';
    encoded += kDigits[byte >> 4U];
    encoded += kDigits[byte & 15U];
  }
  return encoded;
}

std::size_t characterLength(std::string_view text) {
  const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  const unsigned char first = byte(0);
  if (first < 0x80) return 1;
  const std::size_t length = first < 0xC2 ? 0 : first < 0xE0 ? 2 : first < 0xF0 ? 3 : 4;
  if (first > 0xF4 || length == 0 || text.size() < length) return 0;
  for (std::size_t i = 1; i < length; ++i) {
    if (!isContinuation(text[i])) return 0;
  }
  const bool overlong = (first == 0xE0 && byte(1) < 0xA0) || (first == 0xF0 && byte(1) < 0x90);
  const bool outside = (first == 0xED && byte(1) > 0x9F) || (first == 0xF4 && byte(1) > 0x8F);
  return overlong || outside ? 0 : length;
}

bool isUtf8(std::string_view text) {
  while (!text.empty()) {
    const std::size_t length = characterLength(text);
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

bool isControl(char c) {
  return static_cast<unsigned char>(c) < ' ' || c == '\x7f';
}

char lowerCase(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

bool equalSecrets(std::string_view a, std::string_view b) {
  return a.size() == b.size() && memeql_sec(a.data(), b.data(), a.size()) != 0;
}

long long number(const std::string& text) {
  return std::strtoll(text.c_str(), nullptr, 10);
}

std::vector<std::string> split(std::string_view text, char separator) {
  std::vector<std::string> parts;
  std::size_t start = 0;
  for (;;) {
    const std::size_t end = text.find(separator, start);
    parts.emplace_back(text.substr(start, end - start));
    if (end == std::string_view::npos) return parts;
    start = end + 1;
  }
}

}  // namespace keldoauth::service
