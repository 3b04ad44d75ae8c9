#include "tools/keldoauth/storage/trouble.h"

#include <utility>

#include "core/oauth_errors.h"
#include "tools/keldoauth/storage/key_files.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

// SQLite's result codes, which the library passes on as they are.
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

/// All full tables have one code.
std::string adviceOnFull(const std::string& message) {
  const char* limit = names::kTokenMax;
  if (message == errors::kClientInfoFull.message) limit = names::kClientInfoMax;
  if (message == errors::kGrantCodeFull.message) limit = names::kGrantCodeMax;
  return std::string("nothing in it is dead: end or remove what nobody needs, or raise ") + limit +
         " in the settings (at most 10000)";
}

std::string adviceFor(int code, const std::string& message) {
  switch (code) {
    case errors::kTokenFull.code:
      return adviceOnFull(message);
    case errors::kCreateTableFailed.code:
      return "the system log names the table and the cause";
    case errors::kEncryptFailed.code:
      return adviceOnCipher();
    case errors::kBusy:
      return "another process holds the database; try again";
    case kReadOnly:
    case kCannotOpen:
      return "'keldoauth status' shows who may write the folder and the database";
    case kCorrupt:
    case kNotADatabase:
      return "the database file is damaged; put back a copy or move the file away";
    case kFull:
      return "the disk is full";
    default:
      return "";
  }
}

}  // namespace

Failure libraryFailure(int code, const std::string& message, const std::string& explanation) {
  const ExitCode exit = exitFor(code);
  const std::string hint =
      exit == kRefused && !explanation.empty() ? explanation : adviceFor(code, message);
  if (code == errors::kNone.code) return {exit, "refused, without an error code", hint};
  return {exit, message, hint, code};
}

Failure failureOf(const grants::Trouble& trouble) {
  return libraryFailure(trouble.code(), trouble.what());
}

Failure libraryFailure(OAUTHDBBasic& store, const std::string& explanation) {
  return libraryFailure(store.GetErrCode(), store.GetErrMsg(), explanation);
}

void requireReady(OAUTHDBBasic& store) {
  if (store.GetErrCode() == errors::kNone.code) return;

  // A start-up step may fail and still leave every table there.
  Failure failure = libraryFailure(store);
  Json::Value count;
  if (store.DBGetRowCount(count) == 0) throw std::move(failure);
  store.SetErrCode(errors::kNone.code);
}

}  // namespace tool
