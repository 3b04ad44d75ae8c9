// Files that are cut short, overwritten or something else altogether: clear
// codes, no crash, and nothing lost that could be read before.

#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <optional>
#include <random>
#include <set>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/faults/faulty_vfs.h"
#include "tests/faults/scene.h"
#include "tests/support/long_form.h"
#include "utils/oauth_names.h"

namespace faults {
namespace {

namespace fs = std::filesystem;
namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBBasic;
using KELDOAUTHSERVER::OAUTHDBClientInfo;
using KELDOAUTHSERVER::OAUTHDBGrantCode;
using KELDOAUTHSERVER::OAUTHDBLog;
using KELDOAUTHSERVER::OAUTHDBToken;
using support::id64;
using support::LogLine;
using support::SystemLog;
using ::testing::Contains;
using ::testing::Each;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Truly;

constexpr std::size_t kSector = 512;

using Rows = std::multiset<std::string>;

int collect(void* rows, int count, char** values, char** columns) {
  std::string row;
  for (int i = 0; i < count; ++i) {
    row += std::string(columns[i]) + "=" + (values[i] != nullptr ? values[i] : "NULL") + '|';
  }
  static_cast<Rows*>(rows)->insert(row);
  return 0;
}

class BrokenFileTest : public Scene {
 protected:
  void SetUp() override {
    Scene::SetUp();
    support::Platform::useReadableCipher();
    furnish(Household::kComplete);
    whole_ = readFile(kDatabase);
  }

  static void replaceFile(const std::string& bytes) {
    writeFile(kDatabase, bytes);
    chmod(kDatabase, S_IRUSR | S_IWUSR);
    fs::remove(kJournal);
  }

  /// Every row that can be had from the file, up to the first error in each
  /// table. It reads a copy.
  static Rows readableRows() {
    fs::copy_file(kDatabase, "/tmp/copy.db", fs::copy_options::overwrite_existing);
    sqlite3* db = nullptr;
    Rows rows;
    sqlite3_open_v2("/tmp/copy.db", &db, SQLITE_OPEN_READWRITE, FaultyVfs::kPlain);
    for (const std::string table :
         {"oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log", "notes"}) {
      const std::string select = "SELECT '" + table + "' AS t, * FROM " + table;
      sqlite3_exec(db, select.c_str(), collect, &rows, nullptr);
    }
    sqlite3_close(db);
    return rows;
  }

  static void openEveryStore() {
    const OAUTHDBClientInfo clients(names::kClientInfoTable);
    const OAUTHDBGrantCode codes(names::kGrantCodeTable);
    const OAUTHDBToken tokens(names::kTokenTable);
    const OAUTHDBLog log(names::kLogTable);
  }

  static void expectOpeningKeepsEveryReadableRow() {
    const Rows before = readableRows();
    openEveryStore();
    const Rows after = readableRows();
    EXPECT_TRUE(std::includes(after.begin(), after.end(), before.begin(), before.end()));
    expectPrivate();
  }

  /// Lets everything happen to the file, one operation after the other.
  static void workOnIt() {
    for (const Operation& operation : everyOperation()) {
      SCOPED_TRACE(operation.name);
      SystemLog::clear();
      const auto store = operation.open();
      const bool success =
          operation.isConstruction() ? isReady(*store) : operation.run(*store).success;
      if (!success) expectSaysWhy(*store);
    }
    expectPrivate();
  }

  /// An object that could not do something says so. One that found no row has
  /// nothing to say.
  static void expectSaysWhy(OAUTHDBBasic& store) {
    const int code = store.GetErrCode();
    if (code == 255) {
      EXPECT_THAT(SystemLog::lines(), Each(Truly(isWithoutCode)));
    } else {
      EXPECT_THAT(kClearCodes, Contains(code));
      EXPECT_THAT(store.GetErrMsg(), Not(IsEmpty()));
      EXPECT_THAT(SystemLog::lines(), Not(IsEmpty()));
    }
  }

  /// The lines of a row that was not there, and of ciphertext that is none.
  static bool isWithoutCode(const LogLine& line) {
    const std::string what = line.message();
    const auto starts = [&what](const char* text) { return what.rfind(text, 0) == 0; };
    return starts("Edit failed[") || starts("Delete failed[") || starts("Data Decrypt failed") ||
           starts("Decrypt data failed");
  }

  std::string whole_;

 private:
  static constexpr int kClearCodes[] = {
      -1,
      -5,
      SQLITE_ERROR,
      SQLITE_READONLY,  // the file says that only a later SQLite may write it
      SQLITE_CORRUPT,
      SQLITE_IOERR,
      SQLITE_NOTADB,
      SQLITE_CANTOPEN,
      SQLITE_CONSTRAINT,
  };
};

// Damage ----------------------------------------------------------------------

TEST_F(BrokenFileTest, ThatIsCutShortAnywhereIsHarmless) {
  for (std::size_t size = 0; size < whole_.size(); size += kSector) {
    SCOPED_TRACE("cut at " + std::to_string(size));
    replaceFile(whole_.substr(0, size));
    expectOpeningKeepsEveryReadableRow();
    workOnIt();
  }
}

TEST_F(BrokenFileTest, WithBytesOverwrittenIsHarmless) {
  const unsigned seeds = support::isLongForm() ? 5000 : 60;
  for (unsigned seed = 1; seed <= seeds; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    std::mt19937 random(seed);
    std::string bytes = whole_;
    for (auto left = 1 + random() % 64; left > 0; --left) {
      bytes[random() % bytes.size()] = static_cast<char>(random());
    }
    replaceFile(bytes);
    expectOpeningKeepsEveryReadableRow();
    workOnIt();
  }
}

TEST_F(BrokenFileTest, WithASectorOfNonsenseIsHarmless) {
  std::mt19937 random(1);
  for (std::size_t offset = 0; offset < whole_.size(); offset += kSector) {
    SCOPED_TRACE("sector at " + std::to_string(offset));
    std::string nonsense(kSector, '\0');
    std::generate(nonsense.begin(), nonsense.end(), [&] { return static_cast<char>(random()); });
    replaceFile(std::string(whole_).replace(offset, kSector, nonsense));
    expectOpeningKeepsEveryReadableRow();
    workOnIt();
  }
}

// Something else --------------------------------------------------------------

TEST_F(BrokenFileTest, ThatIsATextIsLeftAlone) {
  const std::string text = "Dear diary, this is no database. " + std::string(2000, '.');
  replaceFile(text);
  const OAUTHDBToken tokens(names::kTokenTable);
  EXPECT_EQ(tokens.GetErrCode(), SQLITE_NOTADB);
  EXPECT_EQ(tokens.GetErrMsg(), "file is not a database");
  EXPECT_GT(SystemLog::count("Run Command failed!![file is not a database][26]"), 0);
  workOnIt();
  EXPECT_EQ(readFile(kDatabase), text);
}

TEST_F(BrokenFileTest, ThatIsADirectoryCannotBeOpened) {
  fs::remove(kDatabase);
  fs::create_directory(kDatabase);
  const OAUTHDBToken tokens(names::kTokenTable);
  EXPECT_EQ(tokens.GetErrCode(), SQLITE_CANTOPEN);
  EXPECT_EQ(tokens.GetErrMsg(), "Open DB failed!!");
}

TEST_F(BrokenFileTest, ThatIsEmptyBecomesADatabase) {
  replaceFile("");
  openEveryStore();
  EXPECT_EQ(sqlText("SELECT count(*) FROM sqlite_master WHERE type = 'table'"), "5");
  workOnIt();
}

TEST_F(BrokenFileTest, OfAnotherProgramKeepsItsTables) {
  fs::remove(kDatabase);
  sql("CREATE TABLE notes(text); INSERT INTO notes VALUES('mine')");
  chmod(kDatabase, S_IRUSR | S_IWUSR);
  expectOpeningKeepsEveryReadableRow();
  workOnIt();
  EXPECT_EQ(sqlText("SELECT text FROM notes"), "mine");
}

TEST_F(BrokenFileTest, InWriteAheadModeStaysPrivate) {
  sql("PRAGMA journal_mode = WAL");
  OAUTHDBLog log(names::kLogTable);
  EXPECT_NE(log.Add("entry"), 0);
  for (const auto& file : fs::directory_iterator(kStateDir)) {
    const fs::perms others = fs::perms::group_all | fs::perms::others_all;
    EXPECT_EQ(file.status().permissions() & others, fs::perms::none) << file.path();
  }
}

TEST_F(BrokenFileTest, WithoutAColumnIsReadButTakesNoNewRows) {
  sql("ALTER TABLE oauth_token DROP COLUMN ip");
  expectOpeningKeepsEveryReadableRow();
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value out;
  EXPECT_TRUE(tokens.Verify(id64('2'), out));
  EXPECT_FALSE(
      tokens.Add("user", id64('a'), "read", id64('8'), id64('9'), "1", "code", "s", "", out));
  EXPECT_EQ(tokens.GetErrCode(), SQLITE_ERROR);
  EXPECT_EQ(tokens.GetErrMsg(), "table oauth_token has no column named ip");
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_token"), "4");
}

// Under a living object -------------------------------------------------------

class LostFileTest : public BrokenFileTest {
 protected:
  void SetUp() override {
    BrokenFileTest::SetUp();
    log_.emplace(names::kLogTable);
  }

  bool readsEveryEntry() {
    Json::Value rows;
    return log_->Get("", "", &rows) != 0 && rows.size() == 5;
  }

  bool addsAnEntry() { return log_->Add("entry") != 0; }

  std::optional<OAUTHDBLog> log_;
};

TEST_F(LostFileTest, ThatWasDeletedIsStillReadButNoLongerWritten) {
  fs::remove(kDatabase);
  EXPECT_TRUE(readsEveryEntry());
  EXPECT_FALSE(addsAnEntry());
  EXPECT_EQ(log_->GetErrCode(), SQLITE_READONLY);
  EXPECT_EQ(log_->GetErrMsg(), "attempt to write a readonly database");
  EXPECT_FALSE(fs::exists(kJournal));
}

TEST_F(LostFileTest, ThatWasReplacedIsNotWrittenThroughTheOldObject) {
  fs::rename(kDatabase, std::string(kDatabase) + ".old");
  replaceFile(whole_);
  EXPECT_FALSE(addsAnEntry());
  EXPECT_EQ(log_->GetErrCode(), SQLITE_READONLY);
  EXPECT_EQ(readFile(kDatabase), whole_);
}

TEST_F(LostFileTest, ThatWasCutShortUnderItGivesAClearCode) {
  fs::resize_file(kDatabase, whole_.size() / 2);
  EXPECT_FALSE(addsAnEntry());
  EXPECT_EQ(log_->GetErrCode(), SQLITE_CORRUPT);
  EXPECT_EQ(log_->GetErrMsg(), "database disk image is malformed");
}

// Settings --------------------------------------------------------------------

class BrokenSettingsTest : public Scene {
 protected:
  static void expectDefaults() {
    support::Platform::useReadableCipher();
    support::Clock::setTo(kNow);
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    Json::Value out;
    EXPECT_NE(codes.Add("user", id64('a'), "read", "state", "", out), 0);
    EXPECT_EQ(sqlText("SELECT expired_time FROM oauth_grantCode"), std::to_string(kNow + 600));
  }
};

TEST_F(BrokenSettingsTest, ThatAreAbsentGiveTheDefaults) {
  expectDefaults();
}

TEST_F(BrokenSettingsTest, ThatAreADirectoryGiveTheDefaults) {
  fs::create_directory(kSettings);
  expectDefaults();
}

TEST_F(BrokenSettingsTest, ThatAreAPipeGiveTheDefaultsWithoutWaiting) {
  ASSERT_EQ(mkfifo(kSettings, S_IRUSR | S_IWUSR), 0);
  expectDefaults();
}

TEST_F(BrokenSettingsTest, ThatAreCutShortGiveTheDefaults) {
  writeSettings(R"({"grantcode_expired": 30, "log_max")");
  expectDefaults();
}

TEST_F(BrokenSettingsTest, ThatAreNestedBeyondReasonGiveTheDefaults) {
  writeSettings(R"({"grantcode_expired": 30, "deep": )" + std::string(100000, '['));
  expectDefaults();
}

}  // namespace
}  // namespace faults
