// Several statements as one: all of them or none, whoever kills the process or
// cuts the power. It holds for every store on the connection.
//
//   OAUTHDBGrantCode codes(names::kGrantCodeTable);
//   OAUTHDBToken tokens(names::kTokenTable, codes);  // on the same connection
//   Transaction transaction(codes);
//   if (!transaction.Begin()) ...  // codes.GetErrCode() says why
//   ... codes.DBDel(...), tokens.Add(...) ...
//   if (!transaction.Commit()) ...  // nothing has happened
//
// Without Commit, everything is taken back at the end of the scope. Nothing
// throws.

#ifndef KELDOAUTH_CORE_TRANSACTION_H
#define KELDOAUTH_CORE_TRANSACTION_H

#include "core/oauth_db_basic.h"

namespace KELDOAUTHSERVER {

class Transaction {
 public:
  /// Begins nothing. `store` must outlive the scope; its error state carries
  /// the reasons of failures, whichever store on the connection is at work.
  explicit Transaction(OAUTHDBBasic& store);
  ~Transaction();
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  /// Takes the write lock at once, after waiting for it as a statement does.
  /// True when all that follows is one. False when nothing was begun, and the
  /// statements that follow would each stand for itself: SQLite's code and text
  /// are on the store, 5 "database is locked" when another process held the
  /// lock for the whole wait, 1 when the connection is in a transaction
  /// already; no code when the store is not ready. While this transaction is
  /// open it is false, too, and changes nothing.
  bool Begin();

  /// True between a successful Begin and the next Commit, whatever comes of it.
  bool IsOpen() const;

  /// True while it is open, but SQLite has ended it by itself and taken
  /// everything back, as it does after an I/O error, on a full medium and
  /// without memory. The store whose statement failed carries the reason.
  /// Statements that run now stand each for itself: stop.
  bool IsLost() const;

  /// True when everything is done and on disk. False when nothing was begun, or
  /// everything was taken back: the store carries the reason (after a lost
  /// transaction, the store whose statement failed). What comes after it is no
  /// longer part of the transaction, either way.
  bool Commit();

 private:
  void RollBack();

  OAUTHDBBasic& store_;
  bool open_ = false;
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_TRANSACTION_H
