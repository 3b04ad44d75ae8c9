#include "engines/postgresql/result_codes.h"

#include <algorithm>
#include <cstddef>
#include <string_view>

#include "engines/postgresql/key.h"

namespace keldoauth::postgresql {
namespace {

struct State {
  std::string_view start;  // of an SQLSTATE: all of it, or its class
  int code;
};

/// The first that fits. A server that has to be asked again later (it shuts
/// down, it gave up a statement) is trouble with the medium to whoever asked.
constexpr State kStates[] = {{"55P03", kBusy},     {"40", kBusy},          {"53100", kFull},
                             {"53200", kNoMemory}, {"54", kTooBig},        {"25006", kReadOnly},
                             {"42501", kReadOnly}, {"23", kConstraint},    {"22P02", kMismatch},
                             {"22003", kMismatch}, {"58", kIoError},       {"57", kIoError},
                             {"53", kIoError},     {"08", kIoError},       {"XX001", kCorrupt},
                             {"XX002", kCorrupt},  {kWrongKeyState, kAuth}};

std::string field(const PGresult* result, int name) {
  const char* const text = PQresultErrorField(result, name);
  return text != nullptr ? text : "";
}

int codeOf(std::string_view state) {
  for (const State& known : kStates) {
    if (state.substr(0, known.start.size()) == known.start) return known.code;
  }
  return kError;
}

/// What the server's message quotes, a name without its own quotes.
std::string quotedIn(const std::string& message) {
  const std::size_t start = message.find_first_not_of('"', message.find('"'));
  const std::size_t end = message.find_last_not_of('"', message.rfind('"'));
  const bool isQuoted = start != std::string::npos && end != std::string::npos && start <= end;
  return isQuoted ? message.substr(start, end - start + 1) : "";
}

/// "Key (access_token)=(...) already exists.": the column; the value stays here.
std::string keyColumn(const PGresult* result) {
  const std::string detail = field(result, PG_DIAG_MESSAGE_DETAIL);
  const std::size_t start = detail.find('(');
  const std::size_t end = detail.find(')');
  if (start == std::string::npos || end == std::string::npos) {
    return field(result, PG_DIAG_CONSTRAINT_NAME);
  }
  std::string column = detail.substr(start + 1, end - start - 1);
  column.erase(std::remove(column.begin(), column.end(), '"'), column.end());
  return column;
}

std::string constraintText(const PGresult* result, const std::string& state,
                           const std::string& table) {
  if (state == "23505") return "UNIQUE constraint failed: " + table + "." + keyColumn(result);
  if (state == "23502") {
    return "NOT NULL constraint failed: " + table + "." + field(result, PG_DIAG_COLUMN_NAME);
  }
  return field(result, PG_DIAG_MESSAGE_PRIMARY);
}

std::string errorText(const PGresult* result, const std::string& state, const std::string& table) {
  std::string message = field(result, PG_DIAG_MESSAGE_PRIMARY);
  if (state == "42P01") return "no such table: " + table;
  if (state == "42P07") return "table " + table + " already exists";
  if (state == "42601") return "near \"" + quotedIn(message) + "\": syntax error";
  if (state == "42703") return "no such column: " + quotedIn(message);
  return message;
}

}  // namespace

Verdict verdictOn(const PGresult* result, const std::string& table) {
  const std::string state = field(result, PG_DIAG_SQLSTATE);
  // libpq itself has no states: it had no memory for the answer.
  if (state.empty()) return {kNoMemory, standingText(kNoMemory)};
  const int code = codeOf(state);
  switch (code) {
    case kConstraint:
      return {code, constraintText(result, state, table)};
    case kError:
      return {code, errorText(result, state, table)};
    case kAuth:
      return {code, kKeyIsAnother};
    case kIoError:
      return {code,
              std::string(standingText(code)) + ": " + field(result, PG_DIAG_MESSAGE_PRIMARY)};
    default:
      return {code, standingText(code)};
  }
}

const char* standingText(int code) {
  switch (code) {
    case kOk:
      return "not an error";
    case kError:
      return "SQL logic error";
    case kAbort:
      return "query aborted";
    case kBusy:
      return "database is locked";
    case kNoMemory:
      return "out of memory";
    case kReadOnly:
      return "attempt to write a readonly database";
    case kIoError:
      return "disk I/O error";
    case kCorrupt:
      return "database disk image is malformed";
    case kFull:
      return "database or disk is full";
    case kCannotOpen:
      return "unable to open database file";
    case kTooBig:
      return "string or blob too big";
    case kConstraint:
      return "constraint failed";
    case kMismatch:
      return "datatype mismatch";
    case kMisuse:
      return "bad parameter or other API misuse";
    case kAuth:
      return "authorization denied";
    default:
      return "unknown error";
  }
}

std::string trimmed(const char* text) {
  std::string line = text != nullptr ? text : "";
  while (!line.empty() && line.back() == '\n') line.pop_back();
  std::replace(line.begin(), line.end(), '\n', ' ');
  return line;
}

}  // namespace keldoauth::postgresql
