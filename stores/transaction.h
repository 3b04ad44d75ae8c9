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

  /// Takes the write lock at once. When that is refused, the statements that
  /// follow stand each for itself, and the object's error stays as it was.
  void begin();

  /// True when SQLite has ended the transaction by itself and taken everything
  /// back. The object carries the reason; what runs now stands for itself.
  bool isLost() const;

  /// True when there is nothing to commit or the commit succeeded. After a
  /// failure everything is taken back and the object carries the reason.
  bool commit();

 private:
  void rollBack();
  /// Runs `sql` without a trace on the object's error.
  bool runAside(const char* sql);

  OAUTHDBBasic& store_;
  bool open_ = false;
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_TRANSACTION_H
