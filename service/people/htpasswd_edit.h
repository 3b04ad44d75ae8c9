// Changes to a file of people. Each replaces the file as a whole: whoever reads
// it meanwhile, or after a power cut, finds the old one or the new one. Owner,
// group and mode stay, and a symbolic link stays one; lines that the change is
// not about are kept as they are. Changes at the same time wait for each other.
// All throw DirectoryTrouble with a line for the administrator, and then nothing
// was changed.

#ifndef KELDOAUTH_SERVICE_PEOPLE_HTPASSWD_EDIT_H
#define KELDOAUTH_SERVICE_PEOPLE_HTPASSWD_EDIT_H

#include <string>

namespace keldoauth::service {

/// Adds a user with a yescrypt hash of the password (names.h says what both may
/// be), or gives one who is there the new password: false then. Makes a file
/// that is missing, which belongs to whom its folder belongs to, with mode 0640.
bool setHtpasswdUser(const std::string& path, const std::string& user, const std::string& password);

/// Removes every line of this name; false when there is none.
bool removeHtpasswdUser(const std::string& path, const std::string& user);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_HTPASSWD_EDIT_H
