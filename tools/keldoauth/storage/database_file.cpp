#include "tools/keldoauth/storage/database_file.h"

#include <sqlite3.h>

#include <functional>
#include <string_view>
#include <utility>

#include "core/lock_wait.h"
#include "core/tables.h"
#include "tools/keldoauth/storage/descriptor_vfs.h"
#include "tools/keldoauth/storage/files.h"
#include "tools/keldoauth/storage/trouble.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr int kPatienceSeconds = 30;

/// Everything that a table of the store has.
std::string selectFrom(const schema::Table& table) {
  std::string columns;
  for (const char* column : table.columns) {
    columns += (columns.empty() ? "" : ",") + std::string(column);
  }
  return "SELECT " + columns + " FROM " + table.name;
}

class Statement {
 public:
  /// `error` makes what is thrown when SQLite refuses.
  Statement(sqlite3* db, const std::string& sql, std::function<Failure()> error)
      : error_(std::move(error)) {
    const int result = sqlite3_prepare_v2(db, sql.c_str(), -1, &statement_, nullptr);
    if (result != SQLITE_OK) throw error_();
  }
  ~Statement() { sqlite3_finalize(statement_); }
  Statement(const Statement&) = delete;
  Statement& operator=(const Statement&) = delete;

  /// False after the last row.
  bool step() {
    const int result = sqlite3_step(statement_);
    if (result != SQLITE_ROW && result != SQLITE_DONE) throw error_();
    return result == SQLITE_ROW;
  }

  [[nodiscard]] int columns() const { return sqlite3_column_count(statement_); }

  [[nodiscard]] std::string_view text(int column) const {
    const unsigned char* const bytes = sqlite3_column_text(statement_, column);
    const int size = sqlite3_column_bytes(statement_, column);
    if (bytes == nullptr) return {};
    return {reinterpret_cast<const char*>(bytes), static_cast<std::size_t>(size)};
  }

 private:
  std::function<Failure()> error_;
  sqlite3_stmt* statement_ = nullptr;
};

/// FNV-1a. Nobody gains by two contents with one digest.
class Digest {
 public:
  void add(std::string_view text) {
    for (const char byte : text) mix(static_cast<unsigned char>(byte));
    for (std::size_t size = text.size(), i = 0; i < sizeof size; ++i, size /= 256) {
      mix(static_cast<unsigned char>(size % 256));
    }
  }
  [[nodiscard]] std::uint64_t value() const { return value_; }

 private:
  void mix(unsigned char byte) { value_ = (value_ ^ byte) * 1099511628211U; }
  std::uint64_t value_ = 14695981039346656037U;
};

/// What a copy that somebody brings may be; nothing else about it is our fault.
const char* faultOfCopy(int extendedCode) {
  switch (extendedCode) {
    case SQLITE_NOTADB:
      return " is not a database";
    case SQLITE_CORRUPT:
      return " is malformed";
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
  open(use == Use::kMemory ? ":memory:" : path,
       use == Use::kRead ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE, nullptr);
  if (use == Use::kWrite) execute("PRAGMA synchronous=EXTRA");
}

DatabaseFile::DatabaseFile(const Draft& draft) : path_(draft.path()), use_(Use::kWrite) {
  open(descriptorName(draft.descriptor()), SQLITE_OPEN_READWRITE, descriptorVfs());
  execute("PRAGMA journal_mode=OFF; PRAGMA temp_store=MEMORY");
}

void DatabaseFile::open(const std::string& name, int flags, const char* vfs) {
  sqlite3* raw = nullptr;
  const int result = sqlite3_open_v2(name.c_str(), &raw, flags, vfs);
  db_.reset(raw);  // a failed open may hand out a handle, too
  if (result != SQLITE_OK) throw failure();
  sqlite3_busy_handler(raw, waitForLock<kPatienceSeconds>, nullptr);
}

void DatabaseFile::requireStore() {
  if (text("PRAGMA integrity_check(1)") != "ok") {
    throw Failure(kRefused, path_ + " is malformed");
  }
  for (const schema::Table* table : schema::kTables) {
    sqlite3_stmt* raw = nullptr;
    const int result = sqlite3_prepare_v2(db_.get(), selectFrom(*table).c_str(), -1, &raw, nullptr);
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
  // Like a draft, a copy in memory is not in the journal mode of where it came
  // from: what it is restored to keeps its own.
  if (target.use_ == Use::kMemory) target.execute("PRAGMA temp_store=MEMORY; VACUUM");
}

std::string DatabaseFile::stranger() {
  DatabaseFile model("an empty store", Use::kMemory);
  for (const schema::Table* table : schema::kTables) model.execute(table->statement);
  const std::map<std::string, std::string> own = model.schemaEntries();
  for (const auto& [definition, name] : schemaEntries()) {
    if (own.count(definition) == 0) return name;
  }
  return {};
}

/// The name of each with its type, by everything that defines it.
std::map<std::string, std::string> DatabaseFile::schemaEntries() {
  Statement rows(db_.get(),
                 "SELECT type || ' ' || name, type, name, tbl_name, sql FROM sqlite_master "
                 "WHERE type NOT IN ('table', 'index') OR name NOT LIKE 'sqlite^_%' ESCAPE '^'",
                 [this] { return failure(); });
  std::map<std::string, std::string> entries;
  while (rows.step()) {
    std::string definition;
    for (int i = 1; i < rows.columns(); ++i) definition.append(rows.text(i)).append(1, '\0');
    entries[definition] = rows.text(0);
  }
  return entries;
}

std::uint64_t DatabaseFile::digest() {
  Digest digest;
  for (const schema::Table* table : schema::kTables) {
    digest.add(table->name);
    Statement rows(db_.get(), selectFrom(*table), [this] { return failure(); });
    while (rows.step()) {
      for (int i = 0; i < rows.columns(); ++i) digest.add(rows.text(i));
    }
  }
  return digest.value();
}

void DatabaseFile::execute(const std::string& sql) {
  if (sqlite3_exec(db_.get(), sql.c_str(), nullptr, nullptr, nullptr) != SQLITE_OK) throw failure();
}

/// The first column of the first row.
std::string DatabaseFile::text(const std::string& sql) {
  Statement statement(db_.get(), sql, [this] { return failure(); });
  if (!statement.step()) throw failure();
  return std::string(statement.text(0));
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
