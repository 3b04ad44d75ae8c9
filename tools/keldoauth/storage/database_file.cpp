#include "tools/keldoauth/storage/database_file.h"

#include <sqlite3.h>

#include <cstdlib>
#include <ctime>
#include <memory>

#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr long long kLockWaitSeconds = 30;
constexpr long kLockStepNanoseconds = 2000000;

/// What makes a table the store's.
struct Table {
  const char* name;
  const char* columns;
};

constexpr Table kTables[] = {
    {names::kMetaTable, "tab_name, version"},
    {names::kClientInfoTable,
     "id, enable, client_id, client_secret, redirect_uri, scope, display_name"},
    {names::kGrantCodeTable, "id, username, client_id, scope, code, expired_time, state, ip"},
    {names::kTokenTable,
     "id, username, client_id, scope, refresh_token, access_token, expired_time, flow_type, "
     "state, ip"},
    {names::kLogTable, "id, timestamp, msg"},
};

struct FinalizeStatement {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

/// SQLite's busy handler. Short even steps: the growing ones of SQLite's own
/// would never get a turn between busy writers.
int waitForLock(void* /*unused*/, int waits) {
  static time_t waitingSince = 0;
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  if (waits == 0) waitingSince = now.tv_sec;
  if (now.tv_sec - waitingSince >= kLockWaitSeconds) return 0;

  const timespec step{0, kLockStepNanoseconds};
  nanosleep(&step, nullptr);
  return 1;
}

/// What a copy that somebody brings may be; nothing else about it is our fault.
const char* faultOfCopy(int extendedCode) {
  switch (extendedCode) {
    case SQLITE_NOTADB:
      return " is no database";
    case SQLITE_CORRUPT:
      return " is damaged";
    case SQLITE_READONLY_ROLLBACK:
      return " is not complete without the journal beside it";
    default:
      return nullptr;
  }
}

}  // namespace

void DatabaseFile::CloseConnection::operator()(sqlite3* db) const {
  sqlite3_close(db);
}

DatabaseFile::DatabaseFile(const std::string& path, Use use) : path_(path), use_(use) {
  const int flags = use == Use::kRead ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE;
  sqlite3* raw = nullptr;
  const int result = sqlite3_open_v2(path.c_str(), &raw, flags, nullptr);
  db_.reset(raw);  // a failed open may hand out a handle, too
  if (result != SQLITE_OK) throw failure();
  sqlite3_busy_handler(raw, waitForLock, nullptr);
}

void DatabaseFile::holdStill() {
  if (sqlite3_exec(db_.get(), "BEGIN", nullptr, nullptr, nullptr) != SQLITE_OK) throw failure();
}

void DatabaseFile::requireStore() {
  if (text("PRAGMA integrity_check(1)") != "ok") {
    throw Failure(kRefused, path_ + " is damaged");
  }
  for (const Table& table : kTables) {
    const std::string sql = std::string("SELECT ") + table.columns + " FROM " + table.name;
    sqlite3_stmt* raw = nullptr;
    const int result = sqlite3_prepare_v2(db_.get(), sql.c_str(), -1, &raw, nullptr);
    sqlite3_finalize(raw);
    if (result == SQLITE_OK) continue;
    if (result != SQLITE_ERROR) throw failure();
    throw Failure(kRefused, path_ + " is no store: " + sqlite3_errmsg(db_.get()));
  }
}

void DatabaseFile::copyTo(DatabaseFile& target) {
  sqlite3_backup* const backup = sqlite3_backup_init(target.db_.get(), "main", db_.get(), "main");
  if (backup == nullptr) throw target.failure();
  const int copied = sqlite3_backup_step(backup, -1);
  const int finished = sqlite3_backup_finish(backup);
  // By its contract the latter passes over a lock that did not go away.
  if (finished != SQLITE_OK) throw target.failure();
  if (copied != SQLITE_DONE) throw target.failure(copied);
}

void DatabaseFile::leaveWal() {
  text("PRAGMA journal_mode=DELETE");
}

/// The first column of the first row.
std::string DatabaseFile::text(const std::string& sql) {
  sqlite3_stmt* raw = nullptr;
  if (sqlite3_prepare_v2(db_.get(), sql.c_str(), -1, &raw, nullptr) != SQLITE_OK) throw failure();
  const Statement statement(raw);
  if (sqlite3_step(raw) != SQLITE_ROW) throw failure();
  const unsigned char* const column = sqlite3_column_text(raw, 0);
  return column == nullptr ? "" : reinterpret_cast<const char*>(column);
}

Failure DatabaseFile::failure() const {
  const char* const fault =
      use_ == Use::kRead ? faultOfCopy(sqlite3_extended_errcode(db_.get())) : nullptr;
  if (fault == nullptr) return failure(sqlite3_errcode(db_.get()));
  return {kRefused, path_ + fault, "'keldoauth backup' makes copies that are whole"};
}

Failure DatabaseFile::failure(int code) const {
  const char* const reason =
      code == sqlite3_errcode(db_.get()) ? sqlite3_errmsg(db_.get()) : sqlite3_errstr(code);
  return libraryFailure(code, path_ + ": " + reason);
}

}  // namespace tool
