// A store on a server: what the server says of itself and of its standbys.

#include <map>
#include <string>

#include "core/oauth_db_basic.h"
#include "tools/keldoauth/health/health.h"
#include "tools/keldoauth/storage/engine_choice.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/decimal.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr char kSubject[] = "server";
constexpr long long kMuchLag = 16LL * 1024 * 1024;

int appendRow(void* arg, int count, char** values, char** columns) {
  Json::Value row(Json::objectValue);
  for (int i = 0; i < count; ++i) row[columns[i]] = values[i] != nullptr ? values[i] : "";
  static_cast<Json::Value*>(arg)->append(row);
  return 0;
}

Json::Value ask(OAUTHDBBasic& store, const char* sql) {
  Json::Value rows(Json::arrayValue);
  if (store.DBCmd(sql, appendRow, &rows) == 0) throw libraryFailure(store);
  return rows;
}

/// What the installation's SQL file sets, and a server may have otherwise.
struct Wanted {
  const char* name;
  const char* values;  // with a blank before and behind each
  const char* otherwise;
};

constexpr Wanted kWanted[] = {
    {"fsync", " on ", "what was acknowledged is lost with the power"},
    {"full_page_writes", " on ", "a power cut may damage the store"},
    {"synchronous_commit", " on remote_apply ", "what was acknowledged may be lost"},
    {"log_statement", " none ddl ", "codes, tokens and identifiers get into the server's log"},
    {"log_min_error_statement", " panic fatal log ", "statements that fail get into the log"},
    {"log_min_messages", " panic fatal ", "values get into the server's log with errors"},
    {"log_min_duration_statement", " -1 ", "slow statements get into the server's log"},
    {"track_activities", " off ", "a backend that crashes leaves its statement in the log"},
};

void checkSettings(const Json::Value& settings, Problems& problems) {
  for (const Wanted& wanted : kWanted) {
    const std::string value = settings[wanted.name].asString();
    if (std::string(wanted.values).find(" " + value + " ") != std::string::npos) continue;
    problems.add(kSubject, std::string(wanted.name) + " is " + value + ": " + wanted.otherwise,
                 "a superuser sets it for the database; keldoauth.sql does");
  }
}

/// The names that are asked for need not be those of standbys that are there.
void checkStandbys(const Json::Value& settings, const Json::Value& standbys, Problems& problems) {
  bool hasSynchronous = false;
  for (const Json::Value& standby : standbys) {
    const std::string sync = standby["sync"].asString();
    hasSynchronous = hasSynchronous || sync == "sync" || sync == "quorum";
    if (decimalValue(standby["lag_bytes"]) < kMuchLag) continue;
    problems.add(kSubject,
                 "the standby " + standby["name"].asString() + " is " +
                     standby["lag_bytes"].asString() + " bytes behind",
                 "it would take so long to become the primary");
  }
  if (settings["synchronous_standby_names"].asString().empty()) {
    problems.add(kSubject, "no standby is waited for: with the primary's disk the last changes go",
                 "name one in synchronous_standby_names, or see docs/several-boxes.md");
  } else if (!hasSynchronous) {
    problems.add(kSubject, "the standby that commits wait for is away: every change waits in vain",
                 "bring it back; until then nobody logs in");
  }
}

Json::Value inspectOpened(Problems& problems) {
  OAUTHDBBasic store;
  requireReady(store);
  Json::Value document(Json::objectValue);
  for (const Json::Value& row : ask(store, "SELECT name, setting FROM server_settings")) {
    document["settings"][row["name"].asString()] = row["setting"];
  }
  document["standbys"] =
      ask(store, "SELECT name, state, sync, lag_bytes FROM server_standbys ORDER BY name");
  const Json::Value where = ask(store, "SELECT address, port, since FROM server_address");
  document["address"] = where[0U]["address"];
  document["port"] = where[0U]["port"];
  document["since"] = where[0U]["since"];
  checkSettings(document["settings"], problems);
  checkStandbys(document["settings"], document["standbys"], problems);
  return document;
}

}  // namespace

Json::Value inspectServer(Problems& problems) try {
  return isOnServer() ? inspectOpened(problems) : Json::Value();
} catch (const Failure& failure) {
  problems.add(kSubject, failure.text(), failure.hint);
  return {};
}

}  // namespace tool
