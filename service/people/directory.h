// Who may sign in: the people of the system, or those of a file of their own.

#ifndef KELDOAUTH_SERVICE_PEOPLE_DIRECTORY_H
#define KELDOAUTH_SERVICE_PEOPLE_DIRECTORY_H

#include <optional>
#include <stdexcept>
#include <string>

namespace keldoauth::service {

enum class Verdict { kYes, kNo, kCannotSay };

struct PasswordCheck {
  Verdict verdict;
  std::string user;  // with kYes: the name as the directory spells it
  std::string why;   // otherwise: a fixed text for the log, never for the page
};

/// Whether somebody is there cannot be found out just now.
class DirectoryTrouble : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

class Directory {
 public:
  Directory() = default;
  virtual ~Directory() = default;
  Directory(const Directory&) = delete;
  Directory& operator=(const Directory&) = delete;

  /// Takes any two texts. Takes as long for a user who is not there as for one
  /// whose password is wrong. It can take seconds.
  [[nodiscard]] virtual PasswordCheck checkPassword(const std::string& user,
                                                    const std::string& password) const = 0;

  /// A text that stays the same for as long as what a session of this user
  /// rests on does; nothing for a user who is not there (any more). Throws
  /// DirectoryTrouble.
  [[nodiscard]] virtual std::optional<std::string> stampOf(const std::string& user) const = 0;

  /// Why nobody could sign in, one line for the administrator; empty when people
  /// can.
  [[nodiscard]] virtual std::string problem() const = 0;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_DIRECTORY_H
