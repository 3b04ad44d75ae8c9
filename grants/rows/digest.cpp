#include "grants/rows/digest.h"

#include <nettle/base16.h>
#include <nettle/base64.h>
#include <nettle/memops.h>
#include <nettle/sha2.h>

#include <array>
#include <cstdint>
#include <system_error>

#include "grants/trouble.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr int kNoRandom = 7;  // what the stores say of a failing random source

using Digest = std::array<std::uint8_t, SHA256_DIGEST_SIZE>;

Digest digestOf(std::string_view text) {
  sha256_ctx context;
  sha256_init(&context);
  sha256_update(&context, text.size(), reinterpret_cast<const std::uint8_t*>(text.data()));
  Digest digest{};
  sha256_digest(&context, digest.size(), digest.data());
  return digest;
}

}  // namespace

std::string hexDigest(std::string_view text) {
  const Digest digest = digestOf(text);
  std::string hex(BASE16_ENCODE_LENGTH(digest.size()), '\0');
  base16_encode_update(hex.data(), digest.size(), digest.data());
  return hex;
}

std::string markOf(std::string_view text) {
  return std::string(kMarkStart) + hexDigest(text).substr(0, kIdentifierLength - kMarkStart.size());
}

bool isMark(std::string_view stored) {
  return stored.substr(0, kMarkStart.size()) == kMarkStart;
}

std::string challengeOf(std::string_view verifier) {
  const Digest digest = digestOf(verifier);
  std::string text(BASE64_ENCODE_RAW_LENGTH(digest.size()), '\0');
  base64_encode_raw(text.data(), digest.size(), digest.data());
  for (char& c : text) {
    if (c == '+') c = '-';
    if (c == '/') c = '_';
  }
  text.erase(text.find('='));
  return text;
}

bool equalSecrets(std::string_view a, std::string_view b) {
  return a.size() == b.size() && memeql_sec(a.data(), b.data(), a.size()) != 0;
}

std::string randomDigits(std::size_t length) try {
  return getRandomStr(static_cast<unsigned int>(length)).substr(0, length);
} catch (const std::system_error& thrown) {
  throw Trouble(kNoRandom, thrown.what());
}

}  // namespace KELDOAUTHSERVER::grants::rows
