// Random numbers for making keys and for signing.

#ifndef KELDOAUTH_SERVICE_SIGNING_RANDOM_H
#define KELDOAUTH_SERVICE_SIGNING_RANDOM_H

#include <nettle/chacha.h>

#include <cstddef>
#include <cstdint>

namespace keldoauth::service::signing {

/// A stream out of 256 random bits of the kernel's. Nettle takes random numbers
/// in the middle of a computation that nothing can end half-way: here everything
/// that can fail has happened before it starts. One is made for each operation,
/// so that no two processes ever share a stream.
class Random {
 public:
  /// Throws KeyFault without random numbers.
  Random();
  ~Random();
  Random(const Random&) = delete;
  Random& operator=(const Random&) = delete;

  /// What Nettle calls, with the object as `context`.
  static void fill(void* context, std::size_t size, std::uint8_t* bytes);

 private:
  chacha_ctx stream_{};
};

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_RANDOM_H
