#include "service/signing/number.h"

#include <nettle/bignum.h>

#include <cstdint>

#include "service/signing/sha256.h"
#include "service/text/encoding.h"

namespace keldoauth::service::signing {

std::string bytesOfNumber(mpz_srcptr number, std::size_t size) {
  std::string bytes(size, '\0');
  nettle_mpz_get_str_256(size, reinterpret_cast<std::uint8_t*>(bytes.data()), number);
  return bytes;
}

std::string textOfNumber(mpz_srcptr number) {
  return base64Url(bytesOfNumber(number, (bitsOf(number) + 7) / 8));
}

void setToBytes(mpz_ptr number, std::string_view bytes) {
  nettle_mpz_set_str_256_u(number, bytes.size(), bytesOf(bytes));
}

std::size_t bitsOf(mpz_srcptr number) {
  return mpz_sizeinbase(number, 2);
}

}  // namespace keldoauth::service::signing
