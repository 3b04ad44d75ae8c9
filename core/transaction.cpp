#include "core/transaction.h"

#include <string>

#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {

Transaction::Transaction(OAUTHDBBasic& store) : store_(store) {}

Transaction::~Transaction() {
  RollBack();
}

bool Transaction::Begin() {
  if (open_) return false;
  open_ = store_.DBCmd("BEGIN IMMEDIATE", nullptr, nullptr) != 0;
  return open_;
}

bool Transaction::IsOpen() const {
  return open_;
}

bool Transaction::IsLost() const {
  return open_ && !store_.InTransaction();
}

bool Transaction::Commit() {
  if (!open_) return false;
  if (IsLost() || store_.DBCmd("COMMIT", nullptr, nullptr) == 0) {
    RollBack();
    return false;
  }
  open_ = false;
  return true;
}

/// A failed COMMIT may have ended the transaction, too. The reason why it is
/// taken back stays on the store.
void Transaction::RollBack() {
  if (open_ && store_.InTransaction()) {
    const int code = store_.GetErrCode();
    const std::string message = store_.GetErrMsg();
    store_.DBCmd("ROLLBACK", nullptr, nullptr);
    store_.SetErrCode(code);
    store_.SetErrMsg(message);
  }
  open_ = false;
}

}  // namespace KELDOAUTHSERVER
