#include "tools/keldoauth/console/failure.h"

#include <json/value.h>

#include "core/oauth_db_basic.h"
#include "core/oauth_errors.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/key_files.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

// SQLite's result codes, which the library passes on as they are.
constexpr int kBusy = 5;
constexpr int kReadOnly = 8;
constexpr int kCorrupt = 11;
constexpr int kFull = 13;
constexpr int kCannotOpen = 14;
constexpr int kConstraint = 19;
constexpr int kNotADatabase = 26;

ExitCode exitFor(int code) {
  const bool refused = code == errors::kNone.code || code == errors::kBadParameters.code ||
                       code == errors::kTokenFull.code || code == kConstraint;
  return refused ? kRefused : kUnavailable;
}

std::string adviceFor(int code) {
  switch (code) {
    case errors::kCreateTableFailed.code:
      return "the system log names the table and the cause";
    case errors::kEncryptFailed.code:
      return adviceOnCipher();
    case kBusy:
      return "another process holds the database; try again";
    case kReadOnly:
    case kCannotOpen:
      return "'keldoauth status' shows who may write the folder and the database";
    case kCorrupt:
    case kNotADatabase:
      return "the database file is damaged; put back a copy or move the file away";
    case kFull:
      return "the disk is full";
    case kConstraint:
      return "another row has this identifier already";
    default:
      return "";
  }
}

}  // namespace

Failure::Failure(ExitCode exitCode, const std::string& message, const std::string& advice,
                 std::optional<int> libraryCode)
    : std::runtime_error(printable(message)),
      exit(exitCode),
      code(libraryCode),
      hint(printable(advice)) {}

std::string Failure::text() const {
  return what() + (code ? " (" + std::to_string(*code) + ")" : "");
}

std::string Failure::hintAnd(const std::string& more) const {
  return hint + (hint.empty() ? "" : "; ") + more;
}

Failure libraryFailure(int code, const std::string& message, const std::string& explanation) {
  const ExitCode exit = exitFor(code);
  const std::string hint = exit == kRefused && !explanation.empty() ? explanation : adviceFor(code);
  if (code == errors::kNone.code) return {exit, "refused, without an error code", hint};
  return {exit, message, hint, code};
}

Failure libraryFailure(OAUTHDBBasic& store, const std::string& explanation) {
  const int code = store.GetErrCode();
  const std::string message = store.GetErrMsg();
  Json::Value count;
  // A store says "full" also when it could not count its rows.
  if (code == errors::kTokenFull.code && store.DBGetRowCount(count) == 0) {
    return libraryFailure(store.GetErrCode(), store.GetErrMsg());
  }
  return libraryFailure(code, message, explanation);
}

Failure notFound(const std::string& what) {
  return {kNotFound, "no such " + what};
}

}  // namespace tool
