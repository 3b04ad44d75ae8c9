// Whether the database is whole, and holds nothing that acts by itself.

#include <algorithm>
#include <string>

#include "core/oauth_db_basic.h"
#include "tools/keldoauth/health/health.h"
#include "tools/keldoauth/storage/trouble.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr char kSubject[] = "database";

/// The first column of the answer.
Json::Value ask(OAUTHDBBasic& store, const char* sql) {
  Json::Value answers(Json::arrayValue);
  if (store.DBCmd(sql, OAUTHDBBasic::TabCountCallback, &answers) == 0) throw libraryFailure(store);
  return answers;
}

void checkWhole(OAUTHDBBasic& store, Problems& problems) {
  std::string verdict = ask(store, "PRAGMA integrity_check(1)")[0U].asString();
  if (verdict == "ok") return;
  std::replace(verdict.begin(), verdict.end(), '\n', ' ');
  problems.add(kSubject, "is malformed: " + verdict,
               "stop the service, keep the file, and restore a copy");
}

/// Any of them could read along, or change what the library stores.
void checkForStrangers(OAUTHDBBasic& store, Problems& problems) {
  for (const Json::Value& stranger : ask(store,
                                         "SELECT type || ' ' || name FROM sqlite_master "
                                         "WHERE type IN ('trigger', 'view') ORDER BY type, name")) {
    problems.add(kSubject, "has a " + stranger.asString(),
                 "the library makes none; find out whose it is, and drop it");
  }
}

}  // namespace

void inspectSoundness(Problems& problems) try {
  OAUTHDBBasic store;
  requireReady(store);
  checkForStrangers(store, problems);
  checkWhole(store, problems);
} catch (const Failure& failure) {
  problems.add(kSubject, "cannot be checked: " + failure.text(), failure.hint);
}

}  // namespace tool
