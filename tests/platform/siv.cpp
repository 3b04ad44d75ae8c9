#include "tests/platform/siv.h"

#include <nettle/aes.h>
#include <nettle/cmac.h>
#include <nettle/ctr.h>

#include <algorithm>
#include <cstdint>

namespace siv {
namespace {

constexpr std::size_t kBlock = 16;
constexpr std::size_t kShortKey = 16;

const std::uint8_t* in(const std::string& text) {
  return reinterpret_cast<const std::uint8_t*>(text.data());
}
std::uint8_t* out(std::string& text) {
  return reinterpret_cast<std::uint8_t*>(text.data());
}

std::string cmac(const std::string& key, const std::string& text) {
  std::string mac(kBlock, '\0');
  if (key.size() == kShortKey) {
    cmac_aes128_ctx context{};
    cmac_aes128_set_key(&context, in(key));
    cmac_aes128_update(&context, text.size(), in(text));
    cmac_aes128_digest(&context, mac.size(), out(mac));
  } else {
    cmac_aes256_ctx context{};
    cmac_aes256_set_key(&context, in(key));
    cmac_aes256_update(&context, text.size(), in(text));
    cmac_aes256_digest(&context, mac.size(), out(mac));
  }
  return mac;
}

std::string counterMode(const std::string& key, std::string counter, std::string text) {
  if (key.size() == kShortKey) {
    aes128_ctx context{};
    aes128_set_encrypt_key(&context, in(key));
    ctr_crypt(&context, reinterpret_cast<nettle_cipher_func*>(aes128_encrypt), kBlock, out(counter),
              text.size(), out(text), in(text));
  } else {
    aes256_ctx context{};
    aes256_set_encrypt_key(&context, in(key));
    ctr_crypt(&context, reinterpret_cast<nettle_cipher_func*>(aes256_encrypt), kBlock, out(counter),
              text.size(), out(text), in(text));
  }
  return text;
}

std::string exclusiveOr(std::string left, const std::string& right) {
  for (std::size_t i = 0; i < left.size(); ++i) left[i] = static_cast<char>(left[i] ^ right[i]);
  return left;
}

/// Multiplication by x in the field of 2^128 elements.
std::string doubled(const std::string& block) {
  std::string result(kBlock, '\0');
  unsigned carry = 0;
  for (std::size_t end = kBlock; end > 0; --end) {
    const std::size_t i = end - 1;
    const unsigned shifted = (static_cast<unsigned char>(block[i]) << 1U) | carry;
    result[i] = static_cast<char>(shifted & 0xff);
    carry = shifted >> 8;
  }
  if (carry != 0) result.back() = static_cast<char>(result.back() ^ 0x87);
  return result;
}

/// The last block of what S2V hashes, or all of it.
std::string ending(const std::string& state, const std::string& plain) {
  if (plain.size() >= kBlock) {
    const std::size_t start = plain.size() - kBlock;
    return plain.substr(0, start) + exclusiveOr(state, plain.substr(start));
  }
  std::string padded = plain + '\x80';
  padded.resize(kBlock, '\0');
  return exclusiveOr(doubled(state), padded);
}

}  // namespace

std::string seal(const std::string& key, const std::vector<std::string>& headers,
                 const std::string& plain) {
  const std::string macKey = key.substr(0, key.size() / 2);
  std::string state = cmac(macKey, std::string(kBlock, '\0'));
  for (const std::string& header : headers) {
    state = exclusiveOr(doubled(state), cmac(macKey, header));
  }
  const std::string vector = cmac(macKey, ending(state, plain));

  std::string counter = vector;
  for (const std::size_t at : {8, 12}) counter[at] = static_cast<char>(counter[at] & 0x7f);
  return vector + counterMode(key.substr(key.size() / 2), counter, plain);
}

}  // namespace siv
