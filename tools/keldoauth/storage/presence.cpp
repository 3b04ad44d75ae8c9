#include "tools/keldoauth/storage/presence.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <string>

#include "core/tables.h"
#include "tools/keldoauth/console/failure.h"
#include "tools/keldoauth/storage/engine_choice.h"
#include "tools/keldoauth/storage/key_files.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

struct CloseConnection {
  void operator()(sqlite3* db) const { sqlite3_close(db); }
};

int noteRow(void* isFound, int /*count*/, char** /*values*/, char** /*columns*/) {
  *static_cast<bool*>(isFound) = true;
  return 0;
}

/// True only when SQLite could read the file and found none: a lock, damage or
/// a journal to roll back is for the library to deal with.
bool lacksTables() {
  sqlite3* raw = nullptr;
  const int opened = sqlite3_open_v2(names::kDatabaseFile, &raw, SQLITE_OPEN_READONLY, nullptr);
  const std::unique_ptr<sqlite3, CloseConnection> db(raw);
  if (opened != SQLITE_OK) return false;

  std::string sql = "SELECT 1 FROM sqlite_master WHERE type='table' AND name IN (''";
  for (const schema::Table* table : schema::kTables) {
    sql.append(",'").append(table->name).append("'");
  }
  sql += ")";
  bool isFound = false;
  return sqlite3_exec(raw, sql.c_str(), noteRow, &isFound, nullptr) == SQLITE_OK && !isFound;
}

}  // namespace

Presence databasePresence() {
  if (isOnServer()) return Presence::kThere;
  struct stat status {};
  if (stat(names::kDatabaseFile, &status) == 0) {
    return lacksTables() ? Presence::kNoTables : Presence::kThere;
  }
  const std::string folder = std::filesystem::path(names::kDatabaseFile).parent_path();
  const bool isMissing = errno == ENOENT && stat(folder.c_str(), &status) == 0;
  return isMissing ? Presence::kNoFile : Presence::kThere;
}

void requireDatabase() {
  const Presence presence = databasePresence();
  if (presence == Presence::kThere) return;
  const std::string file = names::kDatabaseFile;
  const std::string reason =
      presence == Presence::kNoFile ? " does not exist" : " has none of the store's tables";
  throw Failure(kUnavailable, "there is no database yet: " + file + reason,
                "the service's first use makes it, or 'keldoauth client add', run by the "
                "service's user");
}

void makeNoKey() {
  if (absenceOfKey().empty()) return;
  useKey(keyFiles().current + "/");  // below a file that is not there nothing can be made
}

}  // namespace tool
