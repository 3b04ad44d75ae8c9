#include "stores/transaction.h"

#include <string>
#include <utility>

namespace KELDOAUTHSERVER {

Transaction::~Transaction() {
  if (open_) rollBack();
}

void Transaction::begin() {
  open_ = store_.DBCmd("BEGIN IMMEDIATE;", nullptr, nullptr) != 0;
}

bool Transaction::commit() {
  if (!open_ || store_.DBCmd("COMMIT;", nullptr, nullptr) != 0) {
    open_ = false;
    return true;
  }
  rollBack();
  return false;
}

/// SQLite may have rolled back already; that this one then finds nothing to do
/// must not hide the reason.
void Transaction::rollBack() {
  open_ = false;
  const int code = store_.GetErrCode();
  const std::string message = store_.GetErrMsg();
  store_.DBCmd("ROLLBACK;", nullptr, nullptr);
  store_.SetErrCode(code);
  store_.SetErrMsg(message);
}

}  // namespace KELDOAUTHSERVER
