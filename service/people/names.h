// What may stand in the two fields of a sign-in at all.

#ifndef KELDOAUTH_SERVICE_PEOPLE_NAMES_H
#define KELDOAUTH_SERVICE_PEOPLE_NAMES_H

#include <cstddef>
#include <string_view>

namespace keldoauth::service {

/// What crypt(3) and PAM take; the one counts 512 bytes with the NUL at the end,
/// the other cuts at 512.
inline constexpr std::size_t kMaxPasswordBytes = 511;

/// UTF-8 of 1 to 256 bytes, the lengths that the stores accept, without control
/// characters.
bool isUserName(std::string_view name);

/// 1 to kMaxPasswordBytes bytes without NUL and line ends, which no program on
/// the way would take for part of it. The empty password is nobody's: an account
/// of the system that has none is not open to the network for that.
bool isPassword(std::string_view password);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_NAMES_H
