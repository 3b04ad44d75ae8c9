#include "core/privilege.h"

#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>

#include "core/log_lines.h"
#include "utils/error_text.h"
#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {
namespace {

constexpr int kFailurePriority = LOG_AUTH | LOG_ERR;
constexpr int kSuccessPriority = LOG_AUTH | LOG_INFO;

constexpr id_t kUnchanged = static_cast<id_t>(-1);
constexpr id_t kRoot = 0;

using SetIds = int (*)(id_t, id_t, id_t);

/// Becoming root is worth a line; giving it up again is not.
bool switchEffective(const char* source, const char* name, SetIds set, id_t id) {
  if (set(kUnchanged, id, kUnchanged) != 0) {
    std::array<char, 1024> text{};
    const char* reason = errorText(strerror_r(errno, text.data(), text.size()), text.data());
    syslog(kFailurePriority, "%s:%d ERROR: set%s(%d, %d, %d) [%s]", source, line::kSetIdsFailed,
           name, -1, static_cast<int>(id), -1, reason);
    return false;
  }
  if (id == kRoot) {
    syslog(kSuccessPriority, "%s:%d WARNING: set%s(%d, %d, %d)", source, line::kSetIdsDone, name,
           -1, static_cast<int>(id), -1);
  }
  return true;
}

bool switchGroup(const char* source, gid_t gid) {
  return switchEffective(source, "resgid", setresgid, gid);
}

bool switchUser(const char* source, uid_t uid) {
  return switchEffective(source, "resuid", setresuid, uid);
}

}  // namespace

RaisedPrivilege::RaisedPrivilege(const char* source)
    : source_(source), savedUid_(geteuid()), savedGid_(getegid()) {
  if (raise()) {
    errno = 0;
    return;
  }
  errno = 1;
  syslog(kFailurePriority, "%s:%d ERROR: ENTERCriticalSection", source_, line::kEnterFailed);
}

RaisedPrivilege::~RaisedPrivilege() {
  if (restore()) {
    errno = 0;
    return;
  }
  errno = 1;
  syslog(kFailurePriority, "%s:%d ERROR: LEAVECriticalSection", source_, line::kLeaveFailed);
}

/// Group first; when that is refused, the user stays as it is.
bool RaisedPrivilege::raise() const {
  if (savedGid_ != kRoot && !switchGroup(source_, kRoot)) return false;
  return savedUid_ == kRoot || switchUser(source_, kRoot);
}

bool RaisedPrivilege::restore() const {
  const bool userDiffers = geteuid() != savedUid_;
  const bool groupDiffers = getegid() != savedGid_;

  if (userDiffers && !switchUser(source_, kRoot)) return false;
  if (groupDiffers && !switchGroup(source_, savedGid_)) return false;
  return !userDiffers || switchUser(source_, savedUid_);
}

}  // namespace KELDOAUTHSERVER
