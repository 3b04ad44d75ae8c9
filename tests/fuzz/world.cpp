#include "tests/fuzz/world.h"

#include "core/schema.h"
#include "stores/oauth_log.h"
#include "tests/support/doubles.h"
#include "tests/support/private_mounts.h"
#include "tests/support/system_log.h"
#include "utils/oauth_names.h"

namespace fuzz {

namespace names = KELDOAUTHSERVER::names;

namespace {

constexpr char kSchema[] =
    "CREATE TABLE oauth_meta(tab_name text NOT NULL, version integer NOT NULL);"
    "INSERT INTO oauth_meta VALUES ('oauth_clientInfo', 2), ('oauth_grantCode', 2),"
    " ('oauth_token', 2);"
    "CREATE TABLE oauth_clientInfo(enable text NOT NULL, client_id text NOT NULL UNIQUE,"
    " client_secret text NOT NULL, redirect_uri text NOT NULL, scope text NOT NULL,"
    " display_name text NOT NULL, id integer PRIMARY KEY);"
    "CREATE TABLE oauth_token(username text NOT NULL, client_id text NOT NULL,"
    " scope text NOT NULL, refresh_token text NOT NULL, access_token text NOT NULL UNIQUE,"
    " expired_time text NOT NULL, flow_type text NOT NULL, state text NOT NULL,"
    " ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);"
    "CREATE TABLE oauth_grantCode(username text NOT NULL, client_id text NOT NULL,"
    " scope text NOT NULL, code text NOT NULL UNIQUE, expired_time text NOT NULL,"
    " state text NOT NULL, ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY);"
    "CREATE TABLE oauth_log(timestamp integer NOT NULL, msg text NOT NULL,"
    " id integer PRIMARY KEY);";

// Identifiers of 64 characters; the second rows expired long ago.
#define ID_A "'aaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaa'"
#define ID_B "'bbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbbb'"
constexpr char kHousehold[] =
    "DELETE FROM oauth_clientInfo; DELETE FROM oauth_grantCode; DELETE FROM oauth_token;"
    "DELETE FROM oauth_log;"
    "INSERT INTO oauth_clientInfo VALUES"
    " ('1', '<'||" ID_A "||'>', '<'||" ID_A
    "||'>', 'a.example/cb', 'read', 'A', 1),"
    " ('0', '<'||" ID_B "||'>', '<'||" ID_B
    "||'>', 'b.example/cb', 'it''s', 'B''s', 2);"
    "INSERT INTO oauth_grantCode VALUES"
    " ('alice', '<'||" ID_A "||'>', 'read', " ID_A
    ", '4000000000', 's', '192.0.2.7', 1),"
    " ('o''hara', '<'||" ID_B "||'>', '%', " ID_B
    ", '5', '', '', 2);"
    "INSERT INTO oauth_token VALUES"
    " ('alice', '<'||" ID_A "||'>', 'read', " ID_B ", " ID_A
    ", '4000000000', 'code', 's', '', 1),"
    " ('bob', 'no cipher', 'it''s', " ID_A ", " ID_B
    ", 'never', 'code', 's', '::1', 2);"
    "INSERT INTO oauth_log VALUES (1600000000, 'first', 1), (1600000001, 'it''s 100%', 2);";

constexpr char kEverything[] =
    "SELECT 'meta', tab_name, version, 0,0,0,0,0,0,0,0 FROM oauth_meta UNION ALL "
    "SELECT 'client', id, enable, client_id, client_secret, redirect_uri, scope, display_name,"
    " 0,0,0 FROM oauth_clientInfo UNION ALL "
    "SELECT 'code', id, username, client_id, scope, code, expired_time, state, ip, 0,0"
    " FROM oauth_grantCode UNION ALL "
    "SELECT 'token', id, username, client_id, scope, refresh_token, access_token, expired_time,"
    " flow_type, state, ip FROM oauth_token UNION ALL "
    "SELECT 'log', id, timestamp, msg, 0,0,0,0,0,0,0 FROM oauth_log UNION ALL "
    "SELECT 'schema', name, type, 0,0,0,0,0,0,0,0 FROM sqlite_master";

std::string textAt(sqlite3_stmt* statement, int column) {
  const auto* text = static_cast<const char*>(sqlite3_column_blob(statement, column));
  const auto size = static_cast<std::size_t>(sqlite3_column_bytes(statement, column));
  return text != nullptr ? std::string(text, size) : std::string();
}

/// The library's file, for as long as the program runs, lies in memory.
const char* databaseInMemory() {
  support::requirePrivateMounts();
  expect(sqlite3_vfs_register(sqlite3_vfs_find("memdb"), 1) == SQLITE_OK, "no memory VFS");
  return names::kDatabaseFile;
}

}  // namespace

// Database ----------------------------------------------------------------------

Database::Database(const char* path) {
  expect(sqlite3_open(path, &db_) == SQLITE_OK, "open", path);
  prepare("PRAGMA data_version", version_);
}

Database::~Database() {
  sqlite3_finalize(everything_);
  sqlite3_finalize(version_);
  sqlite3_close(db_);
}

void Database::prepare(const char* sql, sqlite3_stmt*& statement) {
  const int result = sqlite3_prepare_v2(db_, sql, -1, &statement, nullptr);
  expect(result == SQLITE_OK, sqlite3_errmsg(db_), sql);
}

void Database::runAll(const char* statements) {
  const int result = sqlite3_exec(db_, statements, nullptr, nullptr, nullptr);
  expect(result == SQLITE_OK, sqlite3_errmsg(db_), statements);
}

Database::Effect Database::run(const std::string& sql, const std::vector<std::string>& texts) {
  Effect outcome;
  sqlite3_stmt* statement = nullptr;
  const char* rest = nullptr;
  if (sqlite3_prepare_v2(db_, sql.c_str(), -1, &statement, &rest) != SQLITE_OK) return outcome;

  int parameter = 0;
  for (const std::string& text : texts) {
    sqlite3_bind_text(statement, ++parameter, text.data(), static_cast<int>(text.size()),
                      SQLITE_STATIC);
  }
  int step = SQLITE_ROW;
  while ((step = sqlite3_step(statement)) == SQLITE_ROW) {
    Row row;
    for (int i = 0; i < sqlite3_column_count(statement); ++i) {
      row[sqlite3_column_name(statement, i)] = textAt(statement, i);
    }
    outcome.rows.push_back(row);
  }
  sqlite3_finalize(statement);
  outcome.ok = step == SQLITE_DONE;
  outcome.changes = outcome.ok ? sqlite3_changes(db_) : 0;
  return outcome;
}

/// Differs after a change by this connection and after one by another.
long long Database::changeMark() {
  sqlite3_step(version_);
  const long long version = sqlite3_column_int64(version_, 0);
  sqlite3_reset(version_);
  return version * 1000000007 + sqlite3_total_changes(db_);
}

const std::string& Database::dump() {
  if (everything_ == nullptr) prepare(kEverything, everything_);  // once the tables are there
  const long long mark = changeMark();
  if (mark == dumpedAt_) return dump_;
  dumpedAt_ = mark;
  dump_.clear();
  while (sqlite3_step(everything_) == SQLITE_ROW) {
    for (int i = 0; i < sqlite3_column_count(everything_); ++i) {
      const std::string value = textAt(everything_, i);
      dump_ += std::to_string(sqlite3_column_type(everything_, i)) + ':' +
               std::to_string(value.size()) + ':' + value + ' ';
    }
    dump_ += '\n';
  }
  sqlite3_reset(everything_);
  return dump_;
}

// World -------------------------------------------------------------------------

World& World::instance() {
  static World world;
  return world;
}

World::World() : library_(databaseInMemory()), model_(":memory:") {
  support::Clock::setTo(kNow);
  support::Platform::useReadableCipher();
  const KELDOAUTHSERVER::OAUTHDBLog schemaMaker(names::kLogTable);
  expect(schemaMaker.GetErrCode() == 255, "the library cannot make its tables");
  model_.runAll(kSchema);
  startOver();
  furnished_ = model_.dump();
  expectAgreement("the start");
}

void World::startOver() {
  // They keep what they saw.
  support::SystemLog::clear();
  support::Platform::release();
  support::Platform::useReadableCipher();

  for (Database* database : {&library_, &model_}) {
    if (database->dump() != furnished_) database->runAll(kHousehold);
  }
}

void World::expectAgreement(const char* operation) {
  const std::string& found = library_.dump();
  const std::string& wanted = model_.dump();
  if (found != wanted) expect(false, operation, "found:\n" + found + "wanted:\n" + wanted);
}

// Texts -------------------------------------------------------------------------

std::optional<std::string> encrypted(const std::string& text) {
  const std::string cipher = '<' + upToNul(text) + '>';
  if (cipher.size() >= 1024) return std::nullopt;
  return cipher;
}

std::optional<std::string> decrypted(const std::string& text) {
  if (text.size() < 2 || text.front() != '<' || text.back() != '>') return std::nullopt;
  return text.substr(1, text.size() - 2);
}

std::string upToNul(const std::string& text) {
  return text.c_str();
}

std::string doubled(const std::string& text) {
  std::string result;
  for (const char c : text) result.append(c == '\'' ? 2 : 1, c);
  return result;
}

Json::Value asResult(const std::vector<Row>& rows) {
  Json::Value result(Json::arrayValue);
  for (const Row& row : rows) {
    Json::Value document(Json::objectValue);
    for (const auto& [column, text] : row) document[column] = text;
    for (const char* secret : {names::kClientId, names::kClientSecret}) {
      if (!document.isMember(secret)) continue;
      const auto clear = decrypted(document[secret].asString());
      if (!clear) break;  // the rest of the row stays as it is
      document[secret] = *clear;
    }
    result.append(document);
  }
  return result;
}

// Input -------------------------------------------------------------------------

unsigned Input::choice(unsigned limit) {
  return at_ < end_ ? *at_++ % limit : 0;
}

std::string Input::text() {
  constexpr std::uint8_t kEnd = 0x1e;
  constexpr std::uint8_t kQuote = 0x1d;
  std::string text;
  while (at_ < end_ && *at_ != kEnd) {
    if (*at_ == kQuote && at_ + 1 < end_) ++at_;
    text += static_cast<char>(*at_++);
  }
  if (at_ < end_) ++at_;
  return text;
}

std::string_view Input::rest() const {
  return {reinterpret_cast<const char*>(at_), static_cast<std::size_t>(end_ - at_)};
}

}  // namespace fuzz
