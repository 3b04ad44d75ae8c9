// How a command ends when it does not succeed: one exception, one exit status
// per kind of failure, the library's code and message where it gave one.

#ifndef KELDOAUTH_TOOLS_FAILURE_H
#define KELDOAUTH_TOOLS_FAILURE_H

#include <optional>
#include <stdexcept>
#include <string>

namespace tool {

/// Scripts branch on these; the manual page lists them.
enum ExitCode : int {
  kOk = 0,
  kUsage = 1,         // the command line or an input file makes no sense
  kRefused = 2,       // the values are not accepted, or the table is full
  kNotFound = 3,      // no such client, code or token
  kUnavailable = 4,   // the database or the cipher does not work
  kInvalid = 5,       // a token or code is not good
  kUnhealthy = 6,     // `status`, `restore` or `backup` found something wrong
  kNotConfirmed = 7,  // a destructive command was not confirmed
  kNotWritten = 8,    // the answer could not be written to standard output
};

/// Message and hint may name what a user typed, or a file: both are kept in
/// their printable form.
class Failure : public std::runtime_error {
 public:
  Failure(ExitCode exitCode, const std::string& message, const std::string& advice = {},
          std::optional<int> libraryCode = {});

  /// The message with the library's code: "Bad parameters (-2)".
  [[nodiscard]] std::string text() const;

  /// The hint, and then `more`.
  [[nodiscard]] std::string hintAnd(const std::string& more) const;

  ExitCode exit;
  std::optional<int> code;  // the library's, when it set one
  std::string hint;         // what to do about it; may be empty
};

/// "No such <what>".
Failure notFound(const std::string& what);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_FAILURE_H
