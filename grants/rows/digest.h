// Digests and secrets, from Nettle.

#ifndef KELDOAUTH_GRANTS_ROWS_DIGEST_H
#define KELDOAUTH_GRANTS_ROWS_DIGEST_H

#include <cstddef>
#include <string>
#include <string_view>

namespace KELDOAUTHSERVER::grants::rows {

/// The SHA-256 in 64 lowercase hexadecimal digits.
std::string hexDigest(std::string_view text);

inline constexpr std::string_view kMarkStart = "sha256:";

/// What the columns of 64 bytes hold in place of a code or token: kMarkStart and
/// the first 57 digits.
std::string markOf(std::string_view text);

/// Whether a column holds a mark. No text that begins so is ever looked up as
/// it stands: a copy of the file would open every door.
bool isMark(std::string_view stored);

/// The challenge of RFC 7636 with the method S256.
std::string challengeOf(std::string_view verifier);

/// Takes as long for a near miss as for a far one.
bool equalSecrets(std::string_view a, std::string_view b);

/// `length` random hexadecimal digits. Throws Trouble without random numbers.
std::string randomDigits(std::size_t length);

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_DIGEST_H
