#include "stores/transaction.h"

#include <string>

namespace KELDOAUTHSERVER {
namespace {

/// SQLite's code for a COMMIT that finds no transaction.
constexpr int kNothingToCommit = 1;

}  // namespace

Transaction::~Transaction() {
  if (open_) runAside("ROLLBACK");
}

void Transaction::begin() {
  open_ = runAside("BEGIN IMMEDIATE");
}

bool Transaction::commit() {
  if (!open_) return true;
  open_ = false;

  const int code = store_.GetErrCode();
  const std::string message = store_.GetErrMsg();
  if (store_.DBCmd("COMMIT", nullptr, nullptr) != 0) return true;

  if (store_.GetErrCode() == kNothingToCommit) {
    store_.SetErrCode(code);
    store_.SetErrMsg(message);
  } else {
    runAside("ROLLBACK");
  }
  return false;
}

bool Transaction::runAside(const char* sql) {
  const int code = store_.GetErrCode();
  const std::string message = store_.GetErrMsg();
  const bool done = store_.DBCmd(sql, nullptr, nullptr) != 0;
  store_.SetErrCode(code);
  store_.SetErrMsg(message);
  return done;
}

}  // namespace KELDOAUTHSERVER
