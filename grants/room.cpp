#include "grants/room.h"

#include <algorithm>
#include <initializer_list>
#include <string>

#include "grants/rows/room_rules.h"
#include "grants/rows/store.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER::grants {
namespace {

/// A table of one row: how many rows there are, and how many of them meet each
/// condition.
std::string countOf(const char* table, std::initializer_list<std::string> conditions = {}) {
  std::string select = "(SELECT COUNT(*)";
  for (const std::string& condition : conditions) select += "," + rows::countIf(condition);
  return select + " FROM " + table + ") AS of_" + table;
}

/// All of them at one moment.
std::vector<long long> countsOf(Store& store, std::initializer_list<std::string> tables) {
  std::string select;
  for (const std::string& table : tables) {
    select += (select.empty() ? "SELECT * FROM " : ",") + table;
  }
  return store.numbers(select);
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
  const std::string liveAnd = "(NOT " + deadCode + " AND ";
  const auto counts = countsOf(
      store_, {countOf(names::kClientInfoTable),
               countOf(names::kGrantCodeTable, {deadCode, liveAnd + rows::isSpentCode() + ")",
                                                liveAnd + rows::isPushedRequest() + ")"}),
               countOf(names::kTokenTable, {rows::isDeadToken(store_.policy, now)}),
               countOf(names::kLogTable)});
  return {{counts[0], getTableRowMax(names::kClientInfoMax), 0},
          {counts[1], getTableRowMax(names::kGrantCodeMax), counts[2]},
          counts[3],
          counts[4],
          {counts[5], getTableRowMax(names::kTokenMax), counts[6]},
          {counts[7], getTableRowMax(names::kLogMax), 0}};
}

Purged Room::purgeable(long long grace, Rows rows) const {
  const Conditions dead = deadFor(grace, rows, store_.policy);
  const auto counts = countsOf(store_, {countOf(names::kGrantCodeTable, {dead.codes}),
                                        countOf(names::kTokenTable, {dead.tokens})});
  return {counts[1], counts[3]};
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
