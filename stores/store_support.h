// What the stores truly share. Where they differ, the difference is behaviour
// and stays in sight in each of them.

#ifndef KELDOAUTH_STORES_STORE_SUPPORT_H
#define KELDOAUTH_STORES_STORE_SUPPORT_H

#include <json/value.h>

#include <algorithm>
#include <string>

#include "core/oauth_db_basic.h"
#include "stores/transaction.h"
#include "utils/decimal.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER {

/// The bounds of an argument, in bytes, both included.
struct Bounds {
  int min;
  int max;
};

namespace bounds {
inline constexpr Bounds kIdentifier{64, 64};  // client identifiers, secrets, codes, tokens
inline constexpr Bounds kUsername{1, 256};
inline constexpr Bounds kRedirectUri{3, 2048};
inline constexpr Bounds kScope{1, 2048};
inline constexpr Bounds kState{1, 2048};
inline constexpr Bounds kDisplayName{1, 64};
inline constexpr Bounds kExpiredTime{1, 128};
inline constexpr Bounds kFlowType{1, 32};
}  // namespace bounds

/// What getRandomStr is asked for.
inline constexpr unsigned int kIdentifierLength = 64;

/// checkStrLen with the bounds in one piece.
bool fits(const std::string& text, const Bounds& bounds);

/// A request with the condition "id is this one".
Json::Value requestById(long long id);

/// A request with the condition "`column` is `value`".
Json::Value requestBy(const char* column, const std::string& value);

/// The id of the first row, cut to 32 bits; 0 without a row.
int firstId(const Json::Value& rows);

/// The current time in Unix seconds, whatever the width of time_t.
long long currentTime();

/// 0 when `ip` is the text of an IPv6 or IPv4 address, else EINVAL. Behind an
/// IPv6 address a `%` and any scope may follow: one that names no interface is
/// taken as a number. Reading stops at the first NUL byte.
int addressError(const std::string& ip);

/// Calls `remove(id)` for each of `rows`, in order, whose expiry lies before
/// `now`. Several removals share one transaction of `store`; where it is
/// refused they run one by one. True unless a removal or the commit failed.
template <typename Remove>
bool purgeExpired(OAUTHDBBasic& store, const Json::Value& rows, long long now, Remove remove) {
  const auto isExpired = [now](const Json::Value& row) {
    return decimalValue(row[names::kExpiredTime]) < now;
  };
  Transaction transaction(store);
  if (std::count_if(rows.begin(), rows.end(), isExpired) > 1) transaction.begin();

  bool done = true;
  for (const Json::Value& row : rows) {
    if (isExpired(row) && !remove(decimalValue(row[names::kId]))) done = false;
  }
  return transaction.commit() && done;
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_STORE_SUPPORT_H
