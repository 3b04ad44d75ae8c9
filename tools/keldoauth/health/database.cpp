// The database as the library sees it: does it open, does the cipher work, how
// full are its tables.

#include <string>

#include "core/oauth_db_basic.h"
#include "core/oauth_errors.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/health/health.h"
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

template <typename Store>
Json::Value expiredRows() try {
  Store store;
  return Json::Int64(purgeable(store, 0).size());
} catch (const Failure&) {
  return {};
}

/// Reading decrypts; what cannot be decrypted comes back as it is in the file.
void checkClients(Problems& problems) try {
  constexpr std::size_t kIdentifierBytes = 64;
  Clients clients;
  Json::ArrayIndex unreadable = 0;
  for (const Json::Value& row : allRows(clients)) {
    if (withoutDoubledQuotes(row[names::kClientId].asString()).size() != kIdentifierBytes) {
      ++unreadable;
    }
  }
  if (unreadable == 0) return;
  problems.add(names::kClientInfoTable, counted(unreadable, "identifier") + " cannot be decrypted",
               "the platform's key is not the one that encrypted them; put it back");
} catch (const Failure& failure) {
  problems.add(names::kClientInfoTable, failure.text());
}

void checkCipher(Problems& problems) {
  Json::Value probe;
  probe[names::kClientId] = "probe";
  if (OAUTHDBBasic::ParamEncrypt(probe) != 0) return;
  problems.add("cipher", "cannot encrypt (" + std::to_string(errors::kEncryptFailed.code) + ")",
               "the platform's cipher or its key cannot be used; the system log says more");
}

void inspectTables(Json::Value& tables, Problems& problems) {
  Log store;  // any store: each table is named in turn
  for (const Table& table : kTables) tables.append(inspectTable(store, table, problems));
  tables[1]["expired"] = expiredRows<Codes>();
  tables[2]["expired"] = expiredRows<Tokens>();
}

void inspectOpened(Json::Value& document, Problems& problems) try {
  inspectTables(document["tables"], problems);
  document["ready"] = true;
  checkCipher(problems);
  checkClients(problems);
} catch (const Failure& failure) {
  document["code"] = failure.code ? Json::Value(*failure.code) : Json::Value();
  document["message"] = failure.what();
  problems.add("database", "not ready: " + failure.text(), "the system log says more");
}

}  // namespace

Json::Value inspectDatabase(const Json::Value& files, Problems& problems) {
  const Json::Value& file = files["database"];
  const bool isAbsent = !file["exists"].asBool() && file["error"].isNull();
  Json::Value document;
  document["ready"] = false;
  document["code"] = Json::Value();
  document["message"] = "";
  document["tables"] = Json::arrayValue;
  if (!isAbsent) {
    inspectOpened(document, problems);
  } else if (files["folder"]["exists"].asBool()) {
    document["message"] = "does not exist yet; the first use creates it";
  } else {
    document["message"] = "does not exist";
  }
  return document;
}

}  // namespace tool
