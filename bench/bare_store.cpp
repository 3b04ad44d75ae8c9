#include "bench/bare_store.h"

#include <array>
#include <cinttypes>
#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include "core/schema.h"
#include "platform/keldcore.h"
#include "utils/oauth_names.h"

namespace bench {
namespace {

namespace names = KELDOAUTHSERVER::names;
namespace schema = KELDOAUTHSERVER::schema;

int ignoreRow(void* /*unused*/, int /*count*/, char** /*values*/, char** /*columns*/) {
  return 0;
}

void require(int result, sqlite3* db, const std::string& sql) {
  if (result == SQLITE_OK) return;
  std::fprintf(stderr, "baseline failed: %s: %s\n", sql.c_str(), sqlite3_errmsg(db));
  std::exit(1);
}

std::string cipherOf(const std::string& text) {
  std::array<char, 1024> cipher{};
  if (KCORECryptSzEncrypt(text.c_str(), cipher.data(), cipher.size()) == 0) {
    std::fputs("the platform's cipher refuses\n", stderr);
    std::exit(1);
  }
  return cipher.data();
}

}  // namespace

std::string tokenText(long long serial) {
  constexpr std::uint64_t kScatter = 0x9E3779B97F4A7C15;  // odd: no two serials meet
  const auto number = static_cast<std::uint64_t>(serial);
  std::array<char, 65> text{};
  std::snprintf(text.data(), text.size(), "%016" PRIx64 "%048" PRIx64, number * kScatter, number);
  return text.data();
}

const std::string& clientIdCipher() {
  static const std::string cipher = cipherOf(tokenText(1));
  return cipher;
}

std::string applicationId() {
  return tokenText(2);
}

const std::string& applicationIdCipher() {
  static const std::string cipher = cipherOf(applicationId());
  return cipher;
}

BareStore::BareStore(Sync sync) : sync_(sync) {
  require(sqlite3_open(names::kDatabaseFile, &db_), db_, "open");
  sqlite3_busy_timeout(db_, 5000);
  startUp();
}

void BareStore::startUp() {
  if (sync_ == Sync::kExtra) run(schema::kSyncFolderToo);
  select("SELECT * FROM sqlite_master WHERE name='oauth_meta' and type='table';");
  for (const schema::Step& step : schema::kSteps) run(step.table.statement);
}

BareStore::~BareStore() {
  sqlite3_close(db_);
}

void BareStore::run(const std::string& sql) {
  require(sqlite3_exec(db_, sql.c_str(), nullptr, nullptr, nullptr), db_, sql);
}

void BareStore::select(const std::string& sql) {
  require(sqlite3_exec(db_, sql.c_str(), ignoreRow, nullptr, nullptr), db_, sql);
}

void BareStore::registerClient(long long serial) {
  BareStore log(sync_);
  select("SELECT COUNT(*) FROM oauth_clientInfo;");
  run("INSERT INTO oauth_clientInfo (client_id, client_secret, display_name, enable, id, "
      "redirect_uri, scope) VALUES('" +
      clientIdCipher() + std::to_string(serial) + "', '" + clientIdCipher() +
      "', 'Photo Frame', '1', NULL, 'photos.example.org/callback', 'profile photos.read');");
  log.writeAuditEntry("Application registed[Photo Frame]", 1000);
}

void BareStore::issueToken(long long serial) {
  select("SELECT COUNT(*) FROM oauth_token;");
  const std::string token = tokenText(serial);
  run("INSERT INTO oauth_token (access_token, client_id, expired_time, flow_type, id, ip, "
      "refresh_token, scope, state, username) VALUES('" +
      token + "', '" + clientIdCipher() +
      "', '4102444800', 'authorization_code', NULL, '192.0.2.7', '" + token +
      "', 'photos.read', 'af0ifjsldkj', 'alice');");
}

void BareStore::writeAuditEntry(const std::string& message, int limit) {
  run("INSERT INTO oauth_log (id, msg, timestamp) VALUES(NULL, '" + message +
      "', strftime('%s','now'));");
  run("DELETE FROM oauth_log WHERE timestamp IN (SELECT timestamp FROM oauth_log ORDER BY "
      "timestamp DESC LIMIT -1 OFFSET " +
      std::to_string(limit) + ")");
}

}  // namespace bench
