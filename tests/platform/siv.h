// AES-SIV as RFC 5297 writes it down, built from CMAC and counter mode: what
// the cipher's ciphertexts are compared with.

#ifndef KELDOAUTH_TESTS_PLATFORM_SIV_H
#define KELDOAUTH_TESTS_PLATFORM_SIV_H

#include <string>
#include <vector>

namespace siv {

/// `key` is two AES keys of equal length, 16 or 32 bytes each. `headers` are
/// the associated data; a nonce is the last of them. Returns the 16 bytes of
/// the synthetic initialisation vector and the ciphertext.
std::string seal(const std::string& key, const std::vector<std::string>& headers,
                 const std::string& plain);

}  // namespace siv

#endif  // KELDOAUTH_TESTS_PLATFORM_SIV_H
