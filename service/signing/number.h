// Whole numbers of any size, as keys have them.

#ifndef KELDOAUTH_SERVICE_SIGNING_NUMBER_H
#define KELDOAUTH_SERVICE_SIGNING_NUMBER_H

#include <gmp.h>

#include <cstddef>
#include <string>
#include <string_view>

namespace keldoauth::service::signing {

class Number {
 public:
  Number() { mpz_init(value_); }
  ~Number() { mpz_clear(value_); }
  Number(const Number&) = delete;
  Number& operator=(const Number&) = delete;

  [[nodiscard]] mpz_ptr get() { return value_; }
  [[nodiscard]] mpz_srcptr get() const { return value_; }

 private:
  mpz_t value_;
};

/// The bytes, the highest first, with zeros in front up to `size`.
std::string bytesOfNumber(mpz_srcptr number, std::size_t size);

/// As RFC 7518 2 writes numbers: in as few bytes as they need.
std::string textOfNumber(mpz_srcptr number);

void setToBytes(mpz_ptr number, std::string_view bytes);

std::size_t bitsOf(mpz_srcptr number);

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_NUMBER_H
