// What the stores truly share. Where they differ, the difference is behaviour
// and stays in sight in each of them.

#ifndef KELDOAUTH_STORES_STORE_SUPPORT_H
#define KELDOAUTH_STORES_STORE_SUPPORT_H

#include <json/value.h>

#include <string>
#include <vector>

#include "core/oauth_db_basic.h"
#include "core/transaction.h"
#include "utils/oauth_bounds.h"

namespace KELDOAUTHSERVER {

/// checkStrLen with the bounds in one piece.
bool fits(const std::string& text, const Bounds& bounds);

/// A request with the condition "id is this one".
Json::Value requestById(long long id);

/// A request with the condition "`column` is `value`".
Json::Value requestBy(const char* column, const std::string& value);

/// The id of the first row, cut to 32 bits; 0 without a row.
int firstId(const Json::Value& rows);

/// 0 when `ip` is the text of an IPv6 or IPv4 address, else EINVAL. Behind an
/// IPv6 address a `%` and any scope may follow: one that names no interface is
/// taken as a number. Reading stops at the first NUL byte.
int addressError(const std::string& ip);

/// The ids of the rows whose expiry lies before `now`, in the order of `rows`.
std::vector<long long> expiredIds(const Json::Value& rows, long long now);

/// Begins the transaction of a purge. False when another process held the lock
/// for the whole wait, with that error on `store`: to try row by row would wait
/// as long for each. Refused for another reason, the removals stand each for
/// itself, and the error of `store` stays as it was.
bool beginPurge(Transaction& transaction, OAUTHDBBasic& store);

/// Calls `remove(id)` for each of `ids` in order. Several removals share one
/// transaction of `store`; where it is refused they run one by one (but see
/// beginPurge). Where a transaction is lost, be it the caller's, nothing is
/// removed. True unless a removal or the commit failed.
template <typename Remove>
bool removeAll(OAUTHDBBasic& store, const std::vector<long long>& ids, Remove remove) {
  Transaction transaction(store);
  if (ids.size() > 1 && !beginPurge(transaction, store)) return false;

  const bool together = store.InTransaction();
  bool done = true;
  for (const long long id : ids) {
    if (!remove(id)) done = false;
    // cppcheck-suppress incorrectLogicOperator ; remove(id) can lose it
    if (together && !store.InTransaction()) return false;
  }
  return (!transaction.IsOpen() || transaction.Commit()) && done;
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_STORE_SUPPORT_H
