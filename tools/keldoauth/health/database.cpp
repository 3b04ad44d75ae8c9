// The database as the library sees it: does it open, how full are its tables.

#include <string>

#include "grants/grants.h"
#include "tools/keldoauth/health/health.h"
#include "tools/keldoauth/storage/engine_choice.h"
#include "tools/keldoauth/storage/presence.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr long long kNearlyFullPercent = 90;

constexpr char kWhenFull[] =
    "what is dead goes by itself; end or remove what nobody needs, or raise the limit in the "
    "settings (at most 10000)";

struct Table {
  const char* name;
  const char* limitKey;
  bool canDie;     // has rows that a purge removes
  bool canBeFull;  // else it trims itself, and being full is normal
  grants::TableRoom grants::RoomCount::*room;
};

constexpr Table kTables[] = {
    {names::kClientInfoTable, names::kClientInfoMax, false, true, &grants::RoomCount::applications},
    {names::kGrantCodeTable, names::kGrantCodeMax, true, true, &grants::RoomCount::codes},
    {names::kTokenTable, names::kTokenMax, true, true, &grants::RoomCount::tokens},
    {names::kLogTable, names::kLogMax, false, false, &grants::RoomCount::log},
};

/// Dead rows give way by themselves.
void checkFilling(const Table& table, const grants::TableRoom& room, Problems& problems) {
  const long long rows = room.rows - room.dead;
  if (!table.canBeFull || rows * 100 < room.most * kNearlyFullPercent) return;
  const std::string amount =
      " (" + std::to_string(rows) + " of " + std::to_string(room.most) + " rows)";
  problems.add(table.name, (rows >= room.most ? "full" : "nearly full") + amount, kWhenFull);
}

Json::Value describe(const Table& table) {
  Json::Value document;
  document["name"] = table.name;
  document["limit"] = getTableRowMax(table.limitKey);
  document["limit_key"] = table.limitKey;
  document["rows"] = Json::Value();
  document["expired"] = Json::Value();
  return document;
}

/// All of them are counted at one moment.
void inspectTables(const grants::Grants& grants, Json::Value& tables, Problems& problems) {
  for (const Table& table : kTables) tables.append(describe(table));
  const grants::RoomCount count = grants.room.count();
  for (Json::ArrayIndex i = 0; i < tables.size(); ++i) {
    const Table& table = kTables[i];
    const grants::TableRoom& room = count.*table.room;
    tables[i]["rows"] = Json::Int64(room.rows);
    if (table.canDie) tables[i]["expired"] = Json::Int64(room.dead);
    checkFilling(table, room, problems);
  }
  tables[1]["redeemed"] = Json::Int64(count.spentCodes);
}

void countTables(const grants::Grants& grants, Json::Value& tables, Problems& problems) try {
  inspectTables(grants, tables, problems);
} catch (const grants::Trouble& trouble) {
  problems.add("tables", "cannot be read: " + failureOf(trouble).text());
}

void inspectOpened(Json::Value& document, Problems& problems) try {
  const grants::Grants grants;
  countTables(grants, document["tables"], problems);
  document["ready"] = true;
  if (!isOnServer()) inspectSoundness(problems);
  inspectCipher(grants, document["tables"], problems);
} catch (const grants::Trouble& trouble) {
  const Failure failure = failureOf(trouble);
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
