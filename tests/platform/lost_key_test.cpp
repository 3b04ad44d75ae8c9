// What happens without the key, beside a store of every kind: no second key
// comes beside values that a first one encrypted.

#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include "tests/platform/platform_test.h"
#include "tests/support/case_name.h"

namespace {

using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kStore[] = "/var/packages/Corvane/target/etc/oauth.db";
constexpr char kMissing[] = "is missing, and the store has values that it encrypted";
constexpr char kUnseen[] =
    "is missing, and whether the store has values that it encrypted cannot be seen";

/// A connection like the library's.
class Store {
 public:
  explicit Store(const std::string& sql = {}) {
    EXPECT_EQ(sqlite3_open(kStore, &db_), SQLITE_OK);
    run(sql);
  }
  ~Store() { sqlite3_close(db_); }
  Store(const Store&) = delete;
  Store& operator=(const Store&) = delete;

  void run(const std::string& sql) const {
    EXPECT_EQ(sqlite3_exec(db_, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(db_);
  }

 private:
  sqlite3* db_ = nullptr;
};

const std::string kTables =
    "CREATE TABLE oauth_meta(tab_name text, version integer);"
    "CREATE TABLE oauth_clientInfo(client_id text UNIQUE, id integer PRIMARY KEY);"
    "CREATE TABLE oauth_token(client_id text, access_token text UNIQUE, id integer PRIMARY KEY);"
    "CREATE TABLE oauth_grantCode(client_id text, code text UNIQUE, id integer PRIMARY KEY);"
    "CREATE TABLE oauth_log(timestamp integer, msg text, id integer PRIMARY KEY);"
    "INSERT INTO oauth_meta VALUES('oauth_token', 2);";

/// Enough for a tree of more than one page.
std::string manyRows(const std::string& table) {
  return "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i+1 FROM n WHERE i<500) INSERT INTO " +
         table + " SELECT i || hex(randomblob(40)), i, i FROM n;";
}

struct Content {
  const char* name;
  std::string sql;
  const char* refusal;  // null where a key is made
};

void PrintTo(const Content& content, std::ostream* out) {
  *out << content.name;
}

class LostKeyTest : public CipherTest {
 protected:
  static void expectRefused(const char* reason) {
    EXPECT_EQ(encrypt("text"), std::nullopt);
    expectOneLine(kKeyFile, reason);
    EXPECT_FALSE(std::filesystem::exists(kKeyFile));
  }
  static void expectMade() {
    EXPECT_NE(encrypt("text"), std::nullopt);
    EXPECT_THAT(SystemLog::lines(), IsEmpty());
    EXPECT_EQ(readFile(kKeyFile).size(), 64U);
  }
};

class StoreWithoutAKeyTest : public LostKeyTest, public ::testing::WithParamInterface<Content> {
 protected:
  static void expectOutcome() {
    if (GetParam().refusal != nullptr) {
      expectRefused(GetParam().refusal);
    } else {
      expectMade();
    }
  }
};

TEST_P(StoreWithoutAKeyTest, ThatIsOpen) {
  const Store store(GetParam().sql);
  expectOutcome();
}

TEST_P(StoreWithoutAKeyTest, ThatIsClosed) {
  { const Store store(GetParam().sql); }
  expectOutcome();
}

const Content kContents[] = {
    {"NoBytes", "", nullptr},
    {"NoTables", "PRAGMA user_version=1;", nullptr},
    {"NoRows", kTables, nullptr},
    {"LogOnly", kTables + "INSERT INTO oauth_log(timestamp, msg) VALUES(1, 'x');", nullptr},
    {"RowsThatAreGone",
     kTables + manyRows("oauth_token") + "DELETE FROM oauth_token WHERE id > 2;" +
         "DELETE FROM oauth_token WHERE id = 2; DELETE FROM oauth_token WHERE id = 1;",
     nullptr},
    {"TableThatIsAllGone", kTables + manyRows("oauth_token") + "DELETE FROM oauth_token;", nullptr},
    {"OneClient", kTables + "INSERT INTO oauth_clientInfo VALUES('cipher', 1);", kMissing},
    {"OneCode", kTables + "INSERT INTO oauth_grantCode VALUES('cipher', 'code', 1);", kMissing},
    {"OneToken", kTables + "INSERT INTO oauth_token VALUES('cipher', 'token', 1);", kMissing},
    {"ManyTokens", kTables + manyRows("oauth_token"), kMissing},
    {"SmallerPages", "PRAGMA page_size=1024;" + kTables + manyRows("oauth_grantCode"), kMissing},
    {"SmallerPagesAndNoRows", "PRAGMA page_size=1024;" + kTables, nullptr},
    {"LargerPages", "PRAGMA page_size=16384;" + kTables + manyRows("oauth_token"), kMissing},
    {"LargerPagesAndNoRows", "PRAGMA page_size=16384;" + kTables, nullptr},
    {"PagesTooSmall", "PRAGMA page_size=512;" + kTables, kUnseen},
    {"PagesTooLarge", "PRAGMA page_size=32768;" + kTables, kUnseen},
    {"PagesOfTheLargestSize", "PRAGMA page_size=65536;" + kTables, kUnseen},
    {"SchemaOfManyPages",
     kTables + "CREATE TABLE zz1(x text DEFAULT '" + std::string(3000, 'x') + "');" +
         "CREATE TABLE zz2(x text DEFAULT '" + std::string(3000, 'x') + "');" +
         "DROP TABLE oauth_token; CREATE TABLE oauth_token(client_id text);" +
         "INSERT INTO oauth_token VALUES('cipher');",
     kMissing},
};
INSTANTIATE_TEST_SUITE_P(Store, StoreWithoutAKeyTest, ::testing::ValuesIn(kContents),
                         support::CaseName());

TEST_F(LostKeyTest, NothingIsMadeForDecryption) {
  EXPECT_EQ(decrypt("BuUUoEG87WCe74gPRP1q0g"), std::nullopt);
  expectOneLine(kKeyFile, "is missing");
  EXPECT_THAT(filesIn(kStateDir), IsEmpty());
}

TEST_F(LostKeyTest, KeyThatIsBackCountsAtOnce) {
  const Text cipher = encrypt("text");
  const Store store(kTables + "INSERT INTO oauth_clientInfo VALUES('cipher', 1);");
  std::filesystem::rename(kKeyFile, std::string(kKeyFile) + ".away");
  expectRefused(kMissing);
  std::filesystem::rename(std::string(kKeyFile) + ".away", kKeyFile);
  EXPECT_EQ(encrypt("text"), cipher);
}

TEST_F(LostKeyTest, KeyElsewhereIsMissedAlike) {
  const Store store(kTables + "INSERT INTO oauth_clientInfo VALUES('cipher', 1);");
  useKeyFile("/tmp/other.key");
  EXPECT_EQ(encrypt("text"), std::nullopt);
  expectOneLine("/tmp/other.key", kMissing);
  EXPECT_FALSE(std::filesystem::exists("/tmp/other.key"));
}

TEST_F(LostKeyTest, FileThatIsNoDatabaseIsNoReasonToMakeOne) {
  writeFile(kStore, std::string(8192, 'x'));
  expectRefused(kUnseen);
}

TEST_F(LostKeyTest, FileThatIsCutOffIsNoReasonToMakeOne) {
  { const Store store(kTables); }
  for (const std::uintmax_t size : {1U, 99U, 100U, 4095U, 4096U, 8192U}) {
    std::filesystem::resize_file(kStore, size);
    expectRefused(kUnseen);
    std::filesystem::remove(kStore);
    const Store store(kTables);
  }
}

TEST_F(LostKeyTest, FileWithAnyByteAlteredEndsTheLook) {
  { const Store store(kTables + "INSERT INTO oauth_clientInfo VALUES('cipher', 1);"); }
  const std::string whole = readFile(kStore);
  for (std::size_t at = 0; at < 4096; ++at) {
    for (const char byte : {'\0', '\1', '\5', '\x7f', '\xff'}) {
      std::string file = whole;
      file[at] = byte;
      writeFile(kStore, file);
      encrypt("text");
      std::filesystem::remove(kKeyFile);
    }
  }
}

TEST_F(LostKeyTest, SchemaThatLeadsToItselfEndsTheLook) {
  { const Store store(kTables); }
  std::string file = readFile(kStore);
  file.replace(100, 12, std::string("\5\0\0\0\0\0\0\0\0\0\0\1", 12));
  writeFile(kStore, file);
  expectRefused(kUnseen);
}

TEST_F(LostKeyTest, FolderInItsPlaceIsNoReasonToMakeOne) {
  std::filesystem::create_directory(kStore);
  expectRefused(kUnseen);
}

TEST_F(LostKeyTest, ValuesInTheWriteAheadLogAreNotPassedOver) {
  const Store store("PRAGMA journal_mode=WAL;" + kTables);
  expectRefused(kUnseen);
}

TEST_F(LostKeyTest, StoreInWalModeWithAllInItsFileIsRead) {
  const Store store("PRAGMA journal_mode=WAL;" + kTables + "PRAGMA wal_checkpoint(TRUNCATE);");
  expectMade();
}

TEST_F(LostKeyTest, ClosedStoreThatNeedsItsJournalIsNoReasonToMakeOne) {
  { const Store store(kTables); }
  writeFile(std::string(kStore) + "-journal", "something");
  expectRefused(kUnseen);
}

// Closing any descriptor of a file ends all locks that the process has on it.
TEST_F(LostKeyTest, LookLeavesTheLocksOfAnOpenStoreAlone) {
  const Store store(kTables + "INSERT INTO oauth_clientInfo VALUES('cipher', 1);");
  store.run("BEGIN IMMEDIATE");
  for (int i = 0; i < 3; ++i) expectRefused(kMissing);
  const pid_t other = ::fork();
  if (other == 0) {
    sqlite3* db = nullptr;
    sqlite3_open(kStore, &db);
    ::_exit(sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr));
  }
  int status = 0;
  ::waitpid(other, &status, 0);
  EXPECT_EQ(WEXITSTATUS(status), SQLITE_BUSY);
}

TEST_F(LostKeyTest, LookAtAClosedStoreKeepsOneDescriptorAndNoMore) {
  { const Store store(kTables + "INSERT INTO oauth_clientInfo VALUES('cipher', 1);"); }
  expectRefused(kMissing);
  const std::size_t open = filesIn("/proc/self/fd").size();
  for (int i = 0; i < 3; ++i) expectRefused(kMissing);
  EXPECT_EQ(filesIn("/proc/self/fd").size(), open);
}

}  // namespace
