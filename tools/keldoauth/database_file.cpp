#include "tools/keldoauth/database_file.h"

#include <sqlite3.h>

#include <cstdlib>
#include <memory>

#include "tools/keldoauth/failure.h"
#include "tools/keldoauth/text.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr int kLockWaitMilliseconds = 30000;
constexpr int kLockStepMilliseconds = 5;

constexpr const char* kTables[] = {names::kMetaTable, names::kClientInfoTable,
                                   names::kGrantCodeTable, names::kTokenTable, names::kLogTable};

struct FinalizeStatement {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

/// Copies everything in one step; a writer that is in the way is waited for.
int copyAll(sqlite3_backup* backup) {
  for (int waited = 0;; waited += kLockStepMilliseconds) {
    const int result = sqlite3_backup_step(backup, -1);
    const bool isLocked = result == SQLITE_BUSY || result == SQLITE_LOCKED;
    if (!isLocked || waited >= kLockWaitMilliseconds) return result;
    sqlite3_sleep(kLockStepMilliseconds);
  }
}

}  // namespace

DatabaseFile::DatabaseFile(const std::string& path, Use use) : path_(path) {
  const int flags = use == Use::kRead ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE;
  if (sqlite3_open_v2(path.c_str(), &db_, flags, nullptr) == SQLITE_OK) {
    sqlite3_busy_timeout(db_, kLockWaitMilliseconds);
    return;
  }
  const Failure failure(kUnavailable, printable(path) + ": " + sqlite3_errmsg(db_), {},
                        sqlite3_errcode(db_));
  sqlite3_close(db_);
  throw failure;
}

DatabaseFile::~DatabaseFile() {
  sqlite3_close(db_);
}

void DatabaseFile::requireStore() {
  if (text("PRAGMA integrity_check(1)") != "ok") {
    throw Failure(kRefused, printable(path_) + " is damaged");
  }
  for (const char* table : kTables) {
    const std::string sql = std::string("SELECT count(*) FROM sqlite_master WHERE type='table' ") +
                            "AND name='" + table + "'";
    if (text(sql) != "1") {
      throw Failure(kRefused, printable(path_) + " is no store: it has no table " + table);
    }
  }
}

void DatabaseFile::copyTo(DatabaseFile& target) {
  sqlite3_backup* const backup = sqlite3_backup_init(target.db_, "main", db_, "main");
  if (backup == nullptr) target.fail();
  copyAll(backup);
  if (sqlite3_backup_finish(backup) != SQLITE_OK) target.fail();
}

/// The first column of the first row.
std::string DatabaseFile::text(const std::string& sql) {
  sqlite3_stmt* raw = nullptr;
  if (sqlite3_prepare_v2(db_, sql.c_str(), -1, &raw, nullptr) != SQLITE_OK) fail();
  const Statement statement(raw);
  if (sqlite3_step(raw) != SQLITE_ROW) fail();
  const unsigned char* const column = sqlite3_column_text(raw, 0);
  return column == nullptr ? "" : reinterpret_cast<const char*>(column);
}

void DatabaseFile::fail() {
  throw Failure(kUnavailable, printable(path_) + ": " + sqlite3_errmsg(db_), {},
                sqlite3_errcode(db_));
}

}  // namespace tool
