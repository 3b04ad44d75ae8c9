// What a purge of codes or tokens removes. `Store` is Codes or Tokens.

#ifndef KELDOAUTH_TOOLS_PURGE_H
#define KELDOAUTH_TOOLS_PURGE_H

#include <json/value.h>

#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/storage/rows.h"
#include "tools/keldoauth/storage/stores.h"

namespace tool {

/// The rows that a purge removes. Without grace these are the ones that the
/// store's own purge takes: those that expired before this second.
template <typename Store>
Json::Value purgeable(Store& store, long long grace) {
  const long long now = currentTime();
  Json::Value rows(Json::arrayValue);
  for (const Json::Value& row : allRows(store)) {
    const long long expiry = expiryOf(row);
    if (expiry < now && expiry <= now - grace) rows.append(row);
  }
  return rows;
}

/// Reads and removes in one transaction: a row that another process removed
/// between the two could have left its id to a new one.
template <typename Store>
Json::Value purge(Store& store, long long grace) {
  Transaction transaction(store);
  Json::Value rows = purgeable(store, grace);
  for (const Json::Value& row : rows) removeSeen(store, row);
  transaction.commit();
  return rows;
}

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_PURGE_H
