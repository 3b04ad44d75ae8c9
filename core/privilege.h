// Root's effective ids for the time in which the database file is opened or
// closed.

#ifndef KELDOAUTH_CORE_PRIVILEGE_H
#define KELDOAUTH_CORE_PRIVILEGE_H

#include <sys/types.h>

namespace KELDOAUTHSERVER {

/// Raises the effective gid and uid to 0 for the life of the scope. It survives
/// - root already: no switch, no line;
/// - one of the two ids not 0: only that one is switched;
/// - no right to switch: the lines say so and the scope goes on with the ids it
///   has (a failed group switch means no user switch);
/// - ids that changed inside the scope: the saved ones are put back.
/// errno is 0 after a complete switch, 1 after a failed one, at either end.
/// Process-wide: one thread at a time. Every line names `source` as its origin
/// and is written whatever the diagnostic switches say.
class RaisedPrivilege {
 public:
  explicit RaisedPrivilege(const char* source);
  ~RaisedPrivilege();
  RaisedPrivilege(const RaisedPrivilege&) = delete;
  RaisedPrivilege& operator=(const RaisedPrivilege&) = delete;

 private:
  [[nodiscard]] bool raise() const;
  [[nodiscard]] bool restore() const;

  const char* source_;
  uid_t savedUid_;
  gid_t savedGid_;
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_PRIVILEGE_H
