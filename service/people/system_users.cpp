#include "service/people/system_users.h"

#include <pwd.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "service/people/child.h"
#include "service/people/names.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

/// pwauth(8), STATUS CODES.
enum Status {
  kOk = 0,
  kUnknown = 1,
  kInvalid = 2,
  kBlocked = 3,
  kExpired = 4,
  kPasswordExpired = 5,
  kNoLogin = 6,
  kTooManyFailures = 7
};

PasswordCheck no(const char* why) {
  return {Verdict::kNo, "", why};
}

PasswordCheck cannotSay(const char* why) {
  return {Verdict::kCannotSay, "", why};
}

PasswordCheck meaningOf(int status) {
  switch (status) {
    case kOk:
      return {Verdict::kYes, "", ""};
    case kUnknown:
    case kInvalid:
      return no("wrong name or password");
    case kBlocked:
      return no("an account of the system itself");
    case kExpired:
      return no("the account has expired");
    case kPasswordExpired:
      return no("the password has expired");
    case kTooManyFailures:
      return no("too many failures, says PAM");
    case kNoLogin:
      return cannotSay("the system lets nobody in (/etc/nologin)");
    default:
      return cannotSay("pwauth could not ask PAM");
  }
}

/// Root's programs would start without root's rights, and PAM take every
/// password for a wrong one.
bool keepsRightsAway() {
  return geteuid() != 0 && prctl(PR_GET_NO_NEW_PRIVS, 0, 0, 0, 0) == 1;
}

/// The errors that getpwnam(3) has for others than "not found".
bool isTrouble(int error) {
  return error == EAGAIN || error == EINTR || error == EIO || error == EMFILE || error == ENFILE ||
         error == ENOMEM || error == ERANGE;
}

/// Null for nobody.
const passwd* accountOf(const std::string& user) {
  errno = 0;
  const passwd* account = getpwnam(user.c_str());
  if (account == nullptr && isTrouble(errno)) {
    throw DirectoryTrouble("the system cannot look up its users");
  }
  return account;
}

PasswordCheck asTheSystemSpells(const std::string& user) try {
  const passwd* account = accountOf(user);
  if (account == nullptr || !isUserName(account->pw_name)) {
    return cannotSay("PAM lets somebody in whom the system cannot name");
  }
  return {Verdict::kYes, account->pw_name, ""};
} catch (const DirectoryTrouble& trouble) {
  return {Verdict::kCannotSay, "", trouble.what()};
}

}  // namespace

PasswordCheck SystemUsers::checkPassword(const std::string& user,
                                         const std::string& password) const {
  if (!isUserName(user) || !isPassword(password)) return no("no name or no password");
  if (keepsRightsAway()) return cannotSay("no_new_privs is set: PAM cannot be asked");

  const std::optional<int> status = exitStatusOf(pwauth_, user + "\n" + password + "\n", patience_);
  if (!status) return cannotSay("pwauth did not answer");
  PasswordCheck check = meaningOf(*status);
  return check.verdict == Verdict::kYes ? asTheSystemSpells(user) : check;
}

std::optional<std::string> SystemUsers::stampOf(const std::string& user) const {
  if (!isUserName(user)) return std::nullopt;
  const passwd* account = accountOf(user);
  if (account == nullptr || account->pw_name != user) return std::nullopt;
  return std::to_string(account->pw_uid);
}

std::string SystemUsers::problem() const {
  struct stat file {};
  if (stat(pwauth_.c_str(), &file) != 0) {
    return pwauth_ + " is missing (Debian: pwauth), by which PAM is asked";
  }
  if (access(pwauth_.c_str(), X_OK) != 0) return "this user may not run " + pwauth_;
  if (file.st_uid != 0 || (file.st_mode & S_ISUID) == 0) {
    return pwauth_ + " does not run as root (mode 4755 or 4750), and cannot ask PAM";
  }
  if (keepsRightsAway()) return "no_new_privs is set: " + pwauth_ + " cannot become root";
  return {};
}

}  // namespace keldoauth::service
