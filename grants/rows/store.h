// The stores on one connection, and what every operation does with them: read
// rows, change them, and hold several steps together. The one place above the
// stores that writes request documents and runs statements. Everything that
// could not be done is thrown as Trouble, so that "no row" means no row.

#ifndef KELDOAUTH_GRANTS_ROWS_STORE_H
#define KELDOAUTH_GRANTS_ROWS_STORE_H

#include <json/value.h>

#include <optional>
#include <string>
#include <vector>

#include "core/transaction.h"
#include "grants/policy.h"
#include "grants/trouble.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"

namespace KELDOAUTHSERVER::grants {

class Store {
 public:
  /// Throws Trouble when the store is not ready.
  explicit Store(const Policy& given);

  const Policy policy;             // its seconds within their bounds
  OAUTHDBClientInfo applications;  // whose connection it is
  OAUTHDBGrantCode codes;
  OAUTHDBToken tokens;
  OAUTHDBLog log;

  // Reading -------------------------------------------------------------------

  /// The rows that meet `condition`, a member a column.
  static Json::Value rowsBy(OAUTHDBBasic& table, const Json::Value& condition);

  /// The rows that meet a condition of SQL, all without one; `tail` is ORDER BY
  /// and the like.
  static Json::Value rowsWhere(OAUTHDBBasic& table, const std::string& condition,
                               const std::string& tail = "");

  /// What a SELECT of one's own gives, with its columns' names.
  Json::Value rowsOf(const std::string& select);

  /// The columns of the one row that `select` gives, as numbers.
  std::vector<long long> numbers(const std::string& select);

  // Changing ------------------------------------------------------------------

  static void insert(OAUTHDBBasic& table, Json::Value row);
  /// Whether there was such a row.
  static bool change(OAUTHDBBasic& table, const Json::Value& condition,
                     const Json::Value& modified);
  /// Of a row that this transaction has read, as it was read: an operation that
  /// missed it would hand out what the file does not know. Throws Trouble then.
  static void changeSeen(OAUTHDBBasic& table, const Json::Value& condition,
                         const Json::Value& modified);
  [[noreturn]] static void failMissed();
  static bool erase(OAUTHDBBasic& table, const Json::Value& condition);
  /// Removes the rows that meet a condition of SQL.
  void eraseWhere(const char* table, const std::string& condition);
  /// The same, or all of them; how many there were.
  long long countErased(const char* table, const std::string& condition = "1");

  /// An application's identifier as the columns "client_id" hold it.
  static std::string sealed(const std::string& identifier);

 private:
  void requireReady();
};

/// Several steps as one: all of them when `commit` returns, none otherwise.
/// Takes the write lock at once. Throws Trouble. The clock is to be read after
/// that: what an operation compares it with was written under the lock.
class Whole {
 public:
  explicit Whole(Store& store);
  void commit();

 private:
  bool begin();

  Store& store_;
  std::optional<Transaction> transaction_;
};

/// As late as can be where the sum is later than that.
long long later(long long time, long long seconds);

/// Whether something that was used at `time` comes again as from a client that
/// tries twice.
bool isWithinGrace(long long time, long long now, const Policy& policy);

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_ROWS_STORE_H
