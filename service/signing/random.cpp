#include "service/signing/random.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <string>

#include "service/signing/key_fault.h"

namespace keldoauth::service::signing {

Random::Random() {
  std::array<std::uint8_t, CHACHA_KEY_SIZE> seed{};
  if (getentropy(seed.data(), seed.size()) != 0) {
    throw KeyFault(std::string("no random numbers: ") + std::strerror(errno));
  }
  constexpr std::array<std::uint8_t, CHACHA_NONCE_SIZE> kOnlyStream{};
  chacha_set_key(&stream_, seed.data());
  chacha_set_nonce(&stream_, kOnlyStream.data());
  explicit_bzero(seed.data(), seed.size());
}

Random::~Random() {
  explicit_bzero(&stream_, sizeof stream_);
}

void Random::fill(void* context, std::size_t size, std::uint8_t* bytes) {
  std::memset(bytes, 0, size);
  chacha_crypt(&static_cast<Random*>(context)->stream_, size, bytes, bytes);
}

}  // namespace keldoauth::service::signing
