// What the stores truly share. Where they differ, the difference is behaviour
// and stays in sight in each of them.

#ifndef KELDOAUTH_STORES_STORE_SUPPORT_H
#define KELDOAUTH_STORES_STORE_SUPPORT_H

#include <json/value.h>

#include <string>
#include <vector>

#include "core/oauth_db_basic.h"
#include "stores/transaction.h"

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

/// The ids of the rows whose expiry lies before `now`, in the order of `rows`.
std::vector<long long> expiredIds(const Json::Value& rows, long long now);

/// Calls `remove(id)` for each of `ids` in order. Several removals share one
/// transaction of `store`; where it is refused they run one by one, and where
/// it is lost nothing is removed. True unless a removal or the commit failed.
template <typename Remove>
bool removeAll(OAUTHDBBasic& store, const std::vector<long long>& ids, Remove remove) {
  Transaction transaction(store);
  if (ids.size() > 1) transaction.begin();

  bool done = true;
  for (const long long id : ids) {
    if (transaction.isLost()) break;
    if (!remove(id)) done = false;
  }
  return transaction.commit() && done;
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_STORES_STORE_SUPPORT_H
