// The people of the system, by PAM: pwauth, a small program of root's, asks it,
// so that this service needs no rights of its own. Which rules hold is settled
// in /etc/pam.d/pwauth.
//
// Note: PAM lets some seconds pass after a wrong password, and so does a check.

#ifndef KELDOAUTH_SERVICE_PEOPLE_SYSTEM_USERS_H
#define KELDOAUTH_SERVICE_PEOPLE_SYSTEM_USERS_H

#include <chrono>
#include <string>

#include "service/people/directory.h"

namespace keldoauth::service {

class SystemUsers : public Directory {
 public:
  explicit SystemUsers(std::string pwauth = "/usr/sbin/pwauth",
                       std::chrono::milliseconds patience = std::chrono::seconds(20))
      : pwauth_(std::move(pwauth)), patience_(patience) {}

  /// The user comes back as getpwnam spells the name.
  [[nodiscard]] PasswordCheck checkPassword(const std::string& user,
                                            const std::string& password) const override;

  /// The number of the account: whoever is removed and added anew under the same
  /// name is somebody else. A changed password or a locked account changes
  /// nothing here, for only root could see it.
  [[nodiscard]] std::optional<std::string> stampOf(const std::string& user) const override;

  [[nodiscard]] std::string problem() const override;

 private:
  std::string pwauth_;
  std::chrono::milliseconds patience_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_SYSTEM_USERS_H
