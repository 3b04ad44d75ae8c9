// What the server says, in SQLite's codes and words.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_RESULT_CODES_H
#define KELDOAUTH_ENGINES_POSTGRESQL_RESULT_CODES_H

#include <libpq-fe.h>

#include <string>

namespace keldoauth::postgresql {

/// SQLite's result codes, as far as they occur.
enum Code : int {
  kOk = 0,
  kError = 1,
  kAbort = 4,
  kBusy = 5,
  kNoMemory = 7,
  kReadOnly = 8,
  kIoError = 10,
  kCorrupt = 11,
  kFull = 13,
  kCannotOpen = 14,
  kTooBig = 18,
  kConstraint = 19,
  kMismatch = 20,
  kMisuse = 21,
  kAuth = 23,
};

struct Verdict {
  int code = kOk;
  std::string text = {};
};

/// The class of an error that the schema on the server raises by itself: the key
/// of this box is not the store's.
inline constexpr char kWrongKeyState[] = "KO001";

/// Of a result that says that a statement failed; `table` as the statement
/// spells it.
Verdict verdictOn(const PGresult* result, const std::string& table);

/// SQLite's standing text for a code.
const char* standingText(int code);

/// One line, without what the server or libpq ends it with.
std::string trimmed(const char* text);

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_RESULT_CODES_H
