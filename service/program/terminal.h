// What an administrator types, or a script hands over.

#ifndef KELDOAUTH_SERVICE_PROGRAM_TERMINAL_H
#define KELDOAUTH_SERVICE_PROGRAM_TERMINAL_H

#include <string>

namespace keldoauth::service {

/// A new password: asked for twice on a terminal, which does not show it, else
/// the one line of standard input, without its end. Throws std::runtime_error
/// when the two differ, and when the input is longer than any password or has
/// more lines.
std::string readNewPassword(const std::string& user);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROGRAM_TERMINAL_H
