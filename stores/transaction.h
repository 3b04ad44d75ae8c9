// Several statements of a store as one: all of them or none.

#ifndef KELDOAUTH_STORES_TRANSACTION_H
#define KELDOAUTH_STORES_TRANSACTION_H

#include "core/oauth_db_basic.h"

namespace KELDOAUTHSERVER {

/// A scope that takes back what was not committed when it ends.
class Transaction {
 public:
  explicit Transaction(OAUTHDBBasic& store) : store_(store) {}
  ~Transaction();
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  /// Takes the write lock at once. When that is refused the object carries the
  /// reason and the statements that follow stand each for itself.
  void begin();

  /// True when there is nothing to commit or the commit succeeded. After a
  /// failure everything is taken back, and the object carries the first reason:
  /// that of a statement which made SQLite end the transaction by itself rather
  /// than that of the COMMIT which found none.
  bool commit();

 private:
  void rollBack();

  OAUTHDBBasic& store_;
  bool open_ = false;
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_TRANSACTION_H
