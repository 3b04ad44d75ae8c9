// Who is signed in, by a cookie that says so itself. Nothing is stored: the
// cookie names user and time, and a MAC under a key of this service vouches for
// it. What that means:
//
// - A session ends the settled time after its password was asked for, whatever
//   happens in between; it is never prolonged.
// - Signing out takes the cookie out of this browser. A cookie that somebody
//   has copied before lives on until the session's end.
// - An administrator who renews the session key ends all sessions.
// - With a file of people a new password, or the user's removal, ends the user's
//   sessions. With the system's people removing the account does; a new
//   password does not, for the service cannot see it.

#ifndef KELDOAUTH_SERVICE_PEOPLE_SESSIONS_H
#define KELDOAUTH_SERVICE_PEOPLE_SESSIONS_H

#include <optional>
#include <string>

#include "service/people/directory.h"

namespace keldoauth::service {

struct Session {
  std::string user;
  long long authTime;  // when the password was asked for
  std::string id;      // 32 hexadecimal digits, drawn at every sign-in
};

class Sessions {
 public:
  /// `key` is secret, at least 32 bytes. Both references are kept.
  Sessions(const std::string& key, const Directory& directory, long long lifetimeSeconds)
      : key_(key), directory_(directory), lifetime_(lifetimeSeconds) {}

  /// The value of a cookie for a user whose password has just been right; nothing
  /// for one who is gone. Throws DirectoryTrouble, and what getRandomStr does.
  [[nodiscard]] std::optional<std::string> begin(const std::string& user) const;

  /// Nothing for a value that this service did not make, that is too old, from
  /// the future, or whose user is gone. Throws DirectoryTrouble.
  [[nodiscard]] std::optional<Session> read(const std::string& cookie) const;

 private:
  [[nodiscard]] std::string mac(const std::string& text, const std::string& stamp) const;

  const std::string& key_;
  const Directory& directory_;
  long long lifetime_;
};

/// A browser in which a user has signed in before, kept for half a year: it has
/// an allowance of its own for wrong passwords, so that whoever guesses at the
/// account from elsewhere cannot keep its owner out.
class KnownBrowsers {
 public:
  static constexpr long kSeconds = 180L * 24 * 60 * 60;

  explicit KnownBrowsers(const std::string& key) : key_(key) {}

  [[nodiscard]] std::string remember(const std::string& user) const;

  /// The name to count by, when `cookie` is one of this user's; empty otherwise.
  [[nodiscard]] std::string nameOf(const std::string& cookie, const std::string& user) const;

 private:
  [[nodiscard]] std::string mac(const std::string& text, const std::string& user) const;

  const std::string& key_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_SESSIONS_H
