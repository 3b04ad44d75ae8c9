// Contract of libkeldcore, the platform's core library, as far as we rely on
// it. The appliance brings the real one; platform/standin/ serves other hosts.

#ifndef KELDOAUTH_PLATFORM_KELDCORE_H
#define KELDOAUTH_PLATFORM_KELDCORE_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

/// Writes the encrypted text of the NUL-terminated `clear`, printable and
/// NUL-terminated, into the caller's `out` of `outSize` bytes (we pass 1024).
/// Deterministic: the same text gives the same ciphertext in every process, so
/// that an encrypted column can be compared for equality.
/// Returns non-zero on success, 0 on failure, a text that does not fit with its
/// terminator included; `out` is not to be read then.
int KCORECryptSzEncrypt(const char* clear, char* out, size_t outSize);

/// The inverse, with the same conventions: what KCORECryptSzEncrypt wrote
/// gives back the clear text. 0 for anything it did not write.
int KCORECryptSzDecrypt(const char* cipher, char* out, size_t outSize);

#ifdef __cplusplus
}
#endif

#endif  // KELDOAUTH_PLATFORM_KELDCORE_H
