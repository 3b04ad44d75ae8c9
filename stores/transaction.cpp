#include "stores/transaction.h"

#include <string>

namespace KELDOAUTHSERVER {

Transaction::~Transaction() {
  rollBack();
}

void Transaction::begin() {
  open_ = runAside("BEGIN IMMEDIATE");
}

bool Transaction::isLost() const {
  return open_ && !store_.InTransaction();
}

bool Transaction::commit() {
  if (!open_) return true;
  if (isLost() || store_.DBCmd("COMMIT", nullptr, nullptr) == 0) {
    rollBack();
    return false;
  }
  open_ = false;
  return true;
}

/// A failed COMMIT may have ended the transaction, too.
void Transaction::rollBack() {
  if (open_ && store_.InTransaction()) runAside("ROLLBACK");
  open_ = false;
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
