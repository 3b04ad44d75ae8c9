#include "core/transaction.h"

#include <string>
#include <utility>

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

/// A failed COMMIT may have ended the transaction, too. Not through DBCmd: an
/// object that is no longer ready must not leave the connection locked. The
/// reason why it is taken back stays on the store.
void Transaction::RollBack() {
  if (open_ && store_.InTransaction()) {
    const int code = store_.errCode_;
    std::string message = std::move(store_.errMsg_);
    store_.DBCmdRun("ROLLBACK", nullptr, nullptr);
    store_.errCode_ = code;
    store_.errMsg_ = std::move(message);
  }
  open_ = false;
}

}  // namespace KELDOAUTHSERVER
