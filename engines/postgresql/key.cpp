#include "engines/postgresql/key.h"

#include <array>
#include <cstring>

#include "platform/keldcore.h"

namespace keldoauth::postgresql {

std::string sealOfThisBox() {
  constexpr std::size_t kCipherBytes = 1024;
  std::array<char, kCipherBytes> cipher{};
  if (KCORECryptSzEncrypt("keldoauth", cipher.data(), cipher.size()) == 0) return {};
  return {cipher.data(), strnlen(cipher.data(), cipher.size())};
}

}  // namespace keldoauth::postgresql
