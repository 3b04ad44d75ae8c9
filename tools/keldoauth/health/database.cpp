// The database as the library sees it: does it open, how full are its tables.

#include <string>

#include "core/oauth_db_basic.h"
#include "core/oauth_errors.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/health/health.h"
#include "tools/keldoauth/storage/presence.h"
#include "tools/keldoauth/storage/purge.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr long long kNearlyFullPercent = 90;

struct Table {
  const char* name;
  const char* limitKey;
  const char* whenFull;  // empty: trims itself, so that being full is normal
};

constexpr Table kTables[] = {
    {names::kClientInfoTable, names::kClientInfoMax, Clients::kWhenFull},
    {names::kGrantCodeTable, names::kGrantCodeMax, Codes::kWhenFull},
    {names::kTokenTable, names::kTokenMax, Tokens::kWhenFull},
    {names::kLogTable, names::kLogMax, ""},
};

void checkFilling(const Table& table, long long rows, long long limit, Problems& problems) {
  const std::string hint = table.whenFull;
  if (hint.empty() || rows * 100 < limit * kNearlyFullPercent) return;
  const std::string amount =
      " (" + std::to_string(rows) + " of " + std::to_string(limit) + " rows)";
  problems.add(table.name, (rows >= limit ? "full" : "nearly full") + amount, hint);
}

Json::Value inspectTable(OAUTHDBBasic& store, const Table& table, Problems& problems) {
  Json::Value document;
  document["name"] = table.name;
  document["limit"] = getTableRowMax(table.limitKey);
  document["limit_key"] = table.limitKey;
  document["rows"] = Json::Value();
  document["expired"] = Json::Value();

  Json::Value count;
  store.SetTabName(table.name);
  if (store.DBGetRowCount(count) == 0) {
    problems.add(table.name, "cannot be read: " + libraryFailure(store).text());
    return document;
  }
  const long long rows = numberIn(count[0U]);
  document["rows"] = Json::Int64(rows);
  checkFilling(table, rows, getTableRowMax(table.limitKey), problems);
  return document;
}

/// Counting may do without the pages that hold the rows.
template <typename Store>
void countExpired(Json::Value& table, Problems& problems) try {
  if (table["rows"].isNull()) return;
  Store store;
  table["expired"] = Json::Int64(purgeable(store, 0).size());
} catch (const Failure& failure) {
  problems.add(table["name"].asString(), "cannot be read: " + failure.text());
}

void inspectTables(Json::Value& tables, Problems& problems) {
  Log store;  // any store: each table is named in turn
  for (const Table& table : kTables) tables.append(inspectTable(store, table, problems));
  countExpired<Codes>(tables[1], problems);
  countExpired<Tokens>(tables[2], problems);
}

void inspectOpened(Json::Value& document, Problems& problems) try {
  inspectTables(document["tables"], problems);
  document["ready"] = true;
  inspectSoundness(problems);
  inspectCipher(document["tables"], problems);
} catch (const Failure& failure) {
  document["code"] = failure.code ? Json::Value(*failure.code) : Json::Value();
  document["message"] = failure.what();
  problems.add("database", "not ready: " + failure.text(), "the system log says more");
}

/// A file of no bytes is what the service's first use begins with.
void checkForeign(const Json::Value& file, Problems& problems) {
  if (file["size"] == 0) return;
  problems.add("database",
               "has none of the store's tables: it is another program's, or was emptied",
               "the first use would add them; put back a copy, or move the file away");
}

}  // namespace

Json::Value inspectDatabase(const Json::Value& files, Problems& problems) {
  const Presence presence = databasePresence();
  Json::Value document;
  document["ready"] = false;
  document["code"] = Json::Value();
  document["message"] = "";
  document["tables"] = Json::arrayValue;
  if (!files["folder"]["exists"].asBool() && files["folder"]["error"].isNull()) {
    document["message"] = "does not exist";
  } else if (presence == Presence::kNoFile) {
    document["message"] = "does not exist yet; the first use creates it";
  } else if (presence == Presence::kNoTables) {
    document["message"] = "is empty; the first use creates its tables";
    checkForeign(files["database"], problems);
  } else {
    inspectOpened(document, problems);
  }
  return document;
}

}  // namespace tool
