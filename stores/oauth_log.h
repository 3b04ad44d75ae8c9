// The audit log: one row per message in names::kLogTable, stamped by the
// database's clock. It trims itself after every write.

#ifndef KELDOAUTH_STORES_OAUTH_LOG_H
#define KELDOAUTH_STORES_OAUTH_LOG_H

#include <string>

#include "core/oauth_db_basic.h"

namespace KELDOAUTHSERVER {

class OAUTHDBLog : public OAUTHDBBasic {
 public:
  /// `tableName` is names::kLogTable.
  explicit OAUTHDBLog(const std::string& tableName);

  /// On the connection of `store`, which must outlive this object: nothing is
  /// opened, created or closed, and a transaction that is begun through one
  /// holds for both. Ready when `store` is, at this moment; the error state is
  /// this object's own.
  OAUTHDBLog(const std::string& tableName, OAUTHDBBasic& store);

  /// Stores `msg`, of any length, with the current time, then deletes what lies
  /// beyond the newest rows that names::kLogMax allows. Non-zero when the row
  /// was stored; 0 with SQLite's code and text otherwise.
  /// A reader sees the single quotes in `msg` doubled.
  /// Note: the rotation goes by time stamp, not by row. Every row that shares
  /// its second with one beyond the limit goes with it, so after a burst within
  /// one second fewer rows may be left than allowed, even none.
  /// Note: a failed rotation changes nothing in the result and is logged only
  /// while diagnostics are on; it runs after a failed insert, too.
  int Add(const std::string& msg);

  /// Makes `*rows` an array of the rows whose message contains `filter` (all
  /// when empty; `%` and `_` are wildcards), each with "id", "msg" and
  /// "timestamp" as texts. `option` (may be empty) is an SQL tail such as
  /// "ORDER BY id DESC LIMIT 10"; its quotes are doubled, nothing else in it is
  /// checked: never outside input. Non-zero also without a row.
  /// Fails as DBGet does.
  int Get(const std::string& filter, const std::string& option, Json::Value* rows);

  /// Deletes every row. Non-zero when there was one; an empty log is 0 without
  /// an error code.
  int Del();
};

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_OAUTH_LOG_H
