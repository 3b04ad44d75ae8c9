// Hashes of passwords as crypt(5) of libxcrypt has them.

#ifndef KELDOAUTH_SERVICE_PEOPLE_PASSWORD_HASH_H
#define KELDOAUTH_SERVICE_PEOPLE_PASSWORD_HASH_H

#include <optional>
#include <string>
#include <string_view>

namespace keldoauth::service {

/// Why a hash is not taken, as a clause for the administrator; empty for one that
/// is. Taken are yescrypt ($y$, $gy$), scrypt ($7$), bcrypt ($2a$, $2b$, $2y$),
/// and SHA-2 ($5$, $6$).
///
/// Note: bcrypt looks at the first 72 bytes of a password alone.
std::string problemWithHash(std::string_view hash);

/// The hash of `password` in the manner of `setting`, which is another hash or
/// its start; nothing when `setting` is not one or memory runs out.
std::optional<std::string> hashLike(const std::string& password, const std::string& setting);

/// A new yescrypt hash with a salt of its own, of the cost that libxcrypt holds
/// right; nothing when it cannot be made.
std::optional<std::string> newHash(const std::string& password);

/// The manner of newHash with a fixed salt: what nobody's password costs.
inline constexpr char kNobodysHash[] =
    "$y$j9T$keldoauthnobodynobody.$n2rBMpvxckINMaTL8WHCoLeTFkZKufLepG9i4ehR.7C";

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_PASSWORD_HASH_H
