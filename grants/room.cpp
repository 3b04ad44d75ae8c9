#include "grants/room.h"

#include <algorithm>
#include <string>

#include "grants/rows/room_rules.h"
#include "grants/rows/store.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER::grants {
namespace {

/// Rows, and how many of them meet each condition.
std::vector<long long> countIn(Store& store, const char* table, const std::string& first,
                               const std::string& second = "0") {
  return store.numbers("SELECT COUNT(*),IFNULL(SUM(" + first + "),0),IFNULL(SUM(" + second +
                       "),0) FROM " + table);
}

struct Conditions {
  std::string codes;
  std::string tokens;
};

Conditions deadFor(long long grace, Rows rows, const Policy& policy) {
  const long long now = currentTime();
  grace = std::max(grace, 0LL);
  Conditions dead{"0", "0"};
  if (rows != Rows::kTokens) dead.codes = rows::isDeadCode(now, grace);
  if (rows != Rows::kCodes) dead.tokens = rows::isDeadToken(policy, now, grace);
  return dead;
}

}  // namespace

RoomCount Room::count() const {
  const long long now = currentTime();
  const std::string deadCode = rows::isDeadCode(now);
  const auto applications = countIn(store_, names::kClientInfoTable, "0");
  const auto codes = countIn(store_, names::kGrantCodeTable, deadCode,
                             "(NOT " + deadCode + " AND " + rows::isSpentCode() + ")");
  const auto tokens = countIn(store_, names::kTokenTable, rows::isDeadToken(store_.policy, now));
  const auto log = countIn(store_, names::kLogTable, "0");
  return {{applications[0], getTableRowMax(names::kClientInfoMax), 0},
          {codes[0], getTableRowMax(names::kGrantCodeMax), codes[1]},
          codes[2],
          {tokens[0], getTableRowMax(names::kTokenMax), tokens[1]},
          {log[0], getTableRowMax(names::kLogMax), 0}};
}

Purged Room::purgeable(long long grace, Rows rows) const {
  const Conditions dead = deadFor(grace, rows, store_.policy);
  return {countIn(store_, names::kGrantCodeTable, dead.codes)[1],
          countIn(store_, names::kTokenTable, dead.tokens)[1]};
}

Purged Room::purge(long long grace, Rows rows) {
  Whole whole(store_);
  const Conditions dead = deadFor(grace, rows, store_.policy);
  const Purged purged{store_.countErased(names::kGrantCodeTable, dead.codes),
                      store_.countErased(names::kTokenTable, dead.tokens)};
  whole.commit();
  return purged;
}

}  // namespace KELDOAUTHSERVER::grants
