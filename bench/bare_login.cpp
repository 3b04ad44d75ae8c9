#include "bench/bare_login.h"

#include <cstddef>
#include <cstdio>
#include <cstdlib>

#include "core/schema.h"
#include "utils/oauth_names.h"

namespace bench {
namespace {

namespace names = KELDOAUTHSERVER::names;

constexpr std::array<const char*, 9> kTexts{
    "BEGIN IMMEDIATE",
    "COMMIT",
    "SELECT * FROM oauth_clientInfo WHERE client_id=?1",
    "INSERT INTO oauth_grantCode VALUES('alice',?2,'photos.read',?1,'4102444800',?3,"
    "'192.0.2.7',NULL)",
    "SELECT * FROM oauth_grantCode WHERE code=?1",
    "UPDATE oauth_grantCode SET state=?2,expired_time='4102444800' WHERE code=?1",
    "INSERT INTO oauth_token VALUES('alice',?2,'photos.read',?1,?1,'4102444800',"
    "'authorization_code',?3,'192.0.2.7',NULL)",
    "SELECT * FROM oauth_token WHERE id=?1",
    "UPDATE oauth_token SET refresh_token=?2,access_token=?2,expired_time='4102444800',"
    "state=?3 WHERE id=?1"};

/// As long as what the library remembers with a code, and with a login.
const std::string kCodeState(180, 's');
const std::string kTokenState(300, 's');

[[noreturn]] void fail(sqlite3* db) {
  std::fprintf(stderr, "baseline failed: %s\n", sqlite3_errmsg(db));
  std::exit(1);
}

}  // namespace

BareLogin::BareLogin(Sync sync) {
  if (sqlite3_open(names::kDatabaseFile, &db_) != SQLITE_OK) fail(db_);
  sqlite3_busy_timeout(db_, 5000);
  if (sync == Sync::kExtra && sqlite3_exec(db_, KELDOAUTHSERVER::schema::kSyncFolderToo, nullptr,
                                           nullptr, nullptr) != SQLITE_OK) {
    fail(db_);
  }
  static_assert(kTexts.size() == kStatements);
}

BareLogin::~BareLogin() {
  for (sqlite3_stmt* statement : prepared_) sqlite3_finalize(statement);
  sqlite3_close(db_);
}

void BareLogin::issueCode(long long serial) {
  run(kBegin);
  bind(kFindApplication, 1, applicationIdCipher());
  run(kFindApplication);
  bind(kInsertCode, 1, tokenText(serial));
  bind(kInsertCode, 2, applicationIdCipher());
  bind(kInsertCode, 3, kCodeState);
  run(kInsertCode);
  run(kCommit);
}

void BareLogin::redeem(long long serial) {
  run(kBegin);
  bind(kFindApplication, 1, applicationIdCipher());
  run(kFindApplication);
  bind(kFindCode, 1, tokenText(serial));
  if (!run(kFindCode)) fail(db_);
  bind(kInsertToken, 1, tokenText(serial));
  bind(kInsertToken, 2, applicationIdCipher());
  bind(kInsertToken, 3, kTokenState);
  run(kInsertToken);
  bind(kSpendCode, 1, tokenText(serial));
  bind(kSpendCode, 2, kCodeState);
  run(kSpendCode);
  run(kCommit);
}

void BareLogin::refresh(long long row, long long serial) {
  run(kBegin);
  bind(kFindApplication, 1, applicationIdCipher());
  run(kFindApplication);
  bind(kFindToken, 1, row);
  if (!run(kFindToken)) fail(db_);
  bind(kReplaceToken, 1, row);
  bind(kReplaceToken, 2, tokenText(serial));
  bind(kReplaceToken, 3, kTokenState);
  run(kReplaceToken);
  run(kCommit);
}

/// Prepared when it is wanted for the first time: a process that serves one
/// request pays for no other.
sqlite3_stmt* BareLogin::at(Statement statement) {
  sqlite3_stmt*& prepared = prepared_[statement];
  if (prepared == nullptr &&
      sqlite3_prepare_v2(db_, kTexts[statement], -1, &prepared, nullptr) != SQLITE_OK) {
    fail(db_);
  }
  return prepared;
}

void BareLogin::bind(Statement statement, int place, const std::string& text) {
  sqlite3_bind_text(at(statement), place, text.data(), static_cast<int>(text.size()),
                    SQLITE_TRANSIENT);
}

void BareLogin::bind(Statement statement, int place, long long number) {
  sqlite3_bind_int64(at(statement), place, number);
}

bool BareLogin::run(Statement statement) {
  const int result = sqlite3_step(at(statement));
  if (result != SQLITE_ROW && result != SQLITE_DONE) fail(db_);
  sqlite3_reset(at(statement));
  return result == SQLITE_ROW;
}

}  // namespace bench
