// keldoauth restore.

#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "tests/faults/small_medium.h"
#include "tests/operations/operations_test.h"
#include "tests/support/case_name.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
using testing::AnyOf;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

class Restore : public Operations {
 protected:
  /// A copy of a store that has changed since.
  void SetUp() override {
    Operations::SetUp();
    furnish("first");
    then_ = contentOf();
    backUp();
    furnish("second");
    now_ = contentOf();
  }

  void expectRefused(const std::string& path, const std::string& error, int exit = cli::kRefused) {
    const auto state = filesIn(kStateDir);
    const Outcome outcome = restore(path);
    EXPECT_THAT(outcome, ExitsWith(exit));
    EXPECT_EQ(outcome.err, "keldoauth: restore: " + error);
    EXPECT_EQ(filesIn(kStateDir), state);
  }

  static constexpr char kOtherKey[] = "/var/packages/Corvane/target/etc/other.key";

  Content then_;
  Content now_;
};

TEST_F(Restore, BringsBackEveryRowAndTakesAwayWhatCameSince) {
  const Outcome outcome = restore();
  EXPECT_THAT(outcome, ExitsWith(cli::kOk));
  EXPECT_EQ(outcome.out, "Restored the store from /tmp/copies/copy.db.\n");
  EXPECT_EQ(outcome.err, "");
  EXPECT_EQ(contentOf(), then_);
}

TEST_F(Restore, LeavesTheCopyAsItIs) {
  const auto before = filesIn(kCopies);
  restore();
  EXPECT_EQ(filesIn(kCopies), before);
}

TEST_F(Restore, KeepsTheDatabasePrivate) {
  restore();
  expectPrivate(kStateDir);
}

TEST_F(Restore, LeavesAnEntryInTheRestoredAuditLog) {
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log ORDER BY id DESC LIMIT 1"),
            "Database restored by [carol]");
}

TEST_F(Restore, MakesTheDatabaseWhereThereIsNone) {
  fs::remove(kDatabase);
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), then_);
  expectPrivate(kStateDir);
}

TEST_F(Restore, ThroughALink) {
  fs::create_symlink(kCopy, "/tmp/copies/link");
  EXPECT_THAT(restore("/tmp/copies/link"), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), then_);
}

TEST_F(Restore, IntoAStoreInWalMode) {
  execute(kDatabase, "PRAGMA journal_mode=WAL");
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), then_);
  expectNextProgramReady();
}

TEST_F(Restore, OfACopyInWalModeLeavesTheStoreInItsOwn) {
  execute(kCopy, "PRAGMA journal_mode=WAL");
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), then_);
  EXPECT_EQ(valueIn(kDatabase, "PRAGMA journal_mode"), "delete");
}

TEST_F(Restore, OfACopyWithAWriteAheadLogBesideIt) {
  sqlite3* db = nullptr;
  sqlite3_open(kCopy, &db);
  sqlite3_exec(db,
               "PRAGMA journal_mode=WAL; PRAGMA wal_autocheckpoint=0;"
               "UPDATE oauth_clientInfo SET scope='from the log'",
               nullptr, nullptr, nullptr);
  ASSERT_GT(readFile("/tmp/copies/copy.db-wal").size(), 0U);
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  sqlite3_close(db);
  EXPECT_EQ(contentOf(), contentOf(kCopy));
  EXPECT_EQ(sqlText("SELECT scope FROM oauth_clientInfo"), "from the log");
}

TEST_F(Restore, IsSeenByAConnectionThatStoodOpen) {
  sqlite3* db = nullptr;
  sqlite3_open(kDatabase, &db);
  sqlite3_stmt* count = nullptr;
  sqlite3_prepare_v2(db, "SELECT count(*) FROM oauth_clientInfo", -1, &count, nullptr);
  ASSERT_EQ(sqlite3_step(count), SQLITE_ROW);
  EXPECT_EQ(sqlite3_column_int(count, 0), 6);
  sqlite3_reset(count);
  restore();
  ASSERT_EQ(sqlite3_step(count), SQLITE_ROW);
  EXPECT_EQ(sqlite3_column_int(count, 0), 3);
  sqlite3_finalize(count);
  sqlite3_close(db);
}

TEST_F(Restore, AsksFirst) {
  const Outcome outcome = run({"restore", kCopy});
  EXPECT_THAT(outcome, ExitsWith(cli::kNotConfirmed));
  EXPECT_EQ(contentOf(), now_);
}

// The key ---------------------------------------------------------------------------

TEST_F(Restore, WarnsOfAnotherKey) {
  writeFile(kKey, std::string(64, 'k'));
  const Outcome outcome = restore();
  EXPECT_THAT(outcome, ExitsWith(cli::kUnhealthy));
  EXPECT_EQ(outcome.out, "Restored the store from /tmp/copies/copy.db.\n");
  EXPECT_EQ(outcome.err,
            "keldoauth: restore: the platform's key is not the one of this copy\n"
            "hint: put back the key that belongs to it; until then no client is found\n");
  EXPECT_EQ(contentOf(), then_);
}

TEST_F(Restore, NamesAMissingKeyAndMakesNone) {
  fs::rename(kKey, kOtherKey);
  const Outcome outcome = restore();
  EXPECT_THAT(outcome, ExitsWith(cli::kUnhealthy));
  EXPECT_EQ(outcome.err,
            std::string("keldoauth: restore: the key file ") + kKey +
                " is missing\nhint: put back the key that belongs to it; until then no client "
                "is found\n");
  EXPECT_EQ(contentOf(), then_);
  EXPECT_FALSE(fs::exists(kKey));
}

TEST_F(Restore, WithoutADatabaseAndAKeyMakesNoKey) {
  fs::remove(kDatabase);
  fs::remove(kKey);
  EXPECT_THAT(restore(), ExitsWith(cli::kUnhealthy));
  EXPECT_EQ(contentOf(), then_);
  EXPECT_FALSE(fs::exists(kKey));
}

TEST_F(Restore, WarnsOfACipherThatDoesNotWork) {
  ::chmod(kKey, 0644);
  const Outcome outcome = restore();
  EXPECT_THAT(outcome, ExitsWith(cli::kUnhealthy));
  EXPECT_EQ(outcome.err,
            "keldoauth: restore: the platform's cipher does not work for this user\n"
            "hint: the system log says why; 'keldoauth status', run by the service's user, says "
            "whether its key fits\n");
  EXPECT_EQ(contentOf(), then_);
  EXPECT_EQ(json({"restore", "--yes", kCopy}, "", cli::kUnhealthy)["key_fits"], Json::Value());
}

TEST_F(Restore, SaysInJsonWhetherTheKeyFits) {
  EXPECT_EQ(json({"restore", "--yes", kCopy})["key_fits"], Json::Value(true));
  fs::rename(kKey, kOtherKey);
  EXPECT_EQ(json({"restore", "--yes", kCopy}, "", cli::kUnhealthy)["key_fits"], Json::Value(false));
}

TEST_F(Restore, IsGoodOnceTheKeyIsBack) {
  fs::rename(kKey, kOtherKey);
  restore();
  fs::rename(kOtherKey, kKey);
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr("first0"));
}

// Killed ----------------------------------------------------------------------------

TEST_F(Restore, KilledAtAnyStepLeavesTheOldStoreOrTheNew) {
  const auto before = filesIn(kStateDir);
  int restored = 0;
  const auto check = [&] {
    expectPrivate(kStateDir);
    expectNextProgramReady();
    const Content content = contentOf();
    EXPECT_THAT(content, AnyOf(now_, then_));
    if (content == then_) ++restored;
  };
  const int steps = dieAtEachStep(
      {"restore", "--yes", kCopy}, [&] { putBack(kStateDir, before); }, check);
  EXPECT_GT(steps, 20);
  EXPECT_GT(restored, 0);
  RecordProperty("steps", steps);
}

TEST_F(Restore, KilledAtAnyStepOfMakingTheDatabaseMayBeTriedAgain) {
  auto before = filesIn(kStateDir);
  before.erase("oauth.db");
  int kills = 0;
  const auto check = [&] {
    expectPrivate(kStateDir);
    expectNextProgramReady();
    if (++kills % 5 != 0) return;
    EXPECT_THAT(restore(), ExitsWith(cli::kOk));
    EXPECT_EQ(contentOf(), then_);
  };
  EXPECT_GT(dieAtEachStep(
                {"restore", "--yes", kCopy}, [&] { putBack(kStateDir, before); }, check),
            20);
}

// Failing ---------------------------------------------------------------------------

TEST_F(Restore, FailingAtAnyStepSaysWhatHasBecomeOfTheStore) {
  const auto before = filesIn(kStateDir);
  int replaced = 0;
  const auto check = [&](const Outcome& outcome) {
    const Content content = contentOf();
    EXPECT_THAT(content, AnyOf(now_, then_));
    if (outcome.exit == cli::kOk) {
      EXPECT_EQ(content, then_);
    }
    if (outcome.err.find("the store is as it was") != std::string::npos) {
      EXPECT_EQ(content, now_) << outcome.err;
    }
    if (outcome.err.find("the store was replaced") != std::string::npos) {
      EXPECT_EQ(content, then_) << outcome.err;
      ++replaced;
    }
    if (outcome.exit == cli::kUnavailable && content == then_) {
      EXPECT_THAT(outcome.err, HasSubstr("replaced")) << "and nothing is said of it";
    }
  };
  failAtEachStep(
      {"restore", "--yes", kCopy}, [&] { putBack(kStateDir, before); }, check);
  EXPECT_GT(replaced, 0) << "no step failed past the commit";
}

TEST_F(Restore, ReportsAFolderThatCannotBeSyncedAndThatItIsReplacedAllTheSame) {
  const Outcome outcome = withoutFolderSync({"restore", "--yes", kCopy});
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("the store was replaced all the same, but a power cut may "
                                     "undo it; run the command again\n"));
  EXPECT_EQ(contentOf(), then_);
}

TEST_F(Restore, IsOnTheDiskWithTheRemovalOfItsJournal) {
  const std::vector<std::string> steps = stepsOf({"restore", "--yes", kCopy});
  const auto removed = std::find(steps.rbegin(), steps.rend(), std::string("unlink ") + kJournal);
  ASSERT_NE(removed, steps.rend());
  EXPECT_NE(std::find(removed.base(), steps.end(), std::string("sync ") + kStateDir), steps.end());
}

// Refusals --------------------------------------------------------------------------

TEST_F(Restore, OfTheDatabaseItself) {
  expectRefused(kDatabase, std::string(kDatabase) + " is the database itself\n");
}

TEST_F(Restore, OfALinkToTheDatabase) {
  fs::create_symlink(kDatabase, "/tmp/copies/link");
  expectRefused("/tmp/copies/link", "/tmp/copies/link is the database itself\n");
}

TEST_F(Restore, OfAnotherNameOfTheDatabase) {
  const std::string other = std::string(kStateDir) + "/other.db";
  fs::create_hard_link(kDatabase, other);
  expectRefused(other, other + " is the database itself\n");
}

constexpr char kAdvice[] = "\nhint: 'keldoauth backup' makes copies that are whole\n";

TEST_F(Restore, OfWhatIsNoDatabase) {
  writeFile("/tmp/copies/text", std::string(10000, 'x'));
  expectRefused("/tmp/copies/text", std::string("/tmp/copies/text is not a database") + kAdvice);
}

TEST_F(Restore, OfAnEmptyFile) {
  writeFile("/tmp/copies/empty", "");
  expectRefused("/tmp/copies/empty", "/tmp/copies/empty is no store: no such table: oauth_meta\n");
}

TEST_F(Restore, OfADatabaseOfAnotherProgram) {
  writeFile("/tmp/copies/other.db", "");
  execute("/tmp/copies/other.db", "CREATE TABLE songs(title)");
  expectRefused("/tmp/copies/other.db",
                "/tmp/copies/other.db is no store: no such table: oauth_meta\n");
}

TEST_F(Restore, OfAStoreWithoutOneOfItsColumns) {
  execute(kCopy, "ALTER TABLE oauth_token RENAME COLUMN flow_type TO flow");
  expectRefused(kCopy, "/tmp/copies/copy.db is no store: no such column: flow_type\n");
}

/// What rides along in a copy.
struct Stranger {
  const char* name;
  const char* sql;
  const char* told;
};

void PrintTo(const Stranger& stranger, std::ostream* out) {
  *out << stranger.name;
}

class StrangerTest : public Restore, public testing::WithParamInterface<Stranger> {};

TEST_P(StrangerTest, InACopyIsRefused) {
  execute(kCopy, GetParam().sql);
  expectRefused(kCopy, std::string("/tmp/copies/copy.db has what no store has: ") +
                           GetParam().told +
                           "\nhint: it would work on in the store; a copy of the file without it "
                           "can be restored\n");
}

const Stranger kStrangers[] = {
    {"Trigger", "CREATE TRIGGER spy AFTER INSERT ON oauth_token BEGIN SELECT 1; END",
     "trigger spy"},
    {"View", "CREATE VIEW oauth_all AS SELECT * FROM oauth_token", "view oauth_all"},
    {"OtherTable", "CREATE TABLE songs(title)", "table songs"},
    {"VirtualTable", "CREATE VIRTUAL TABLE pages USING fts5(text)", "table pages"},
    {"OtherIndex", "CREATE INDEX by_user ON oauth_token(username)", "index by_user"},
    {"UniqueIndex", "CREATE UNIQUE INDEX once ON oauth_log(id)", "index once"},
    {"MoreColumns", "ALTER TABLE oauth_token ADD COLUMN more text", "table oauth_token"},
    {"OtherKindOfTable",
     "CREATE TABLE other AS SELECT * FROM oauth_log; DROP TABLE oauth_log;"
     "ALTER TABLE other RENAME TO oauth_log",
     "table oauth_log"},
    {"TriggerWithANameOfSqlites",
     "CREATE TRIGGER spy AFTER INSERT ON oauth_token BEGIN SELECT 1; END;"
     "PRAGMA writable_schema=1; UPDATE sqlite_master SET "
     "name='sqlite_spy',sql=replace(sql,'spy','sqlite_spy') WHERE type='trigger'",
     "trigger sqlite_spy"},
};
INSTANTIATE_TEST_SUITE_P(Restore, StrangerTest, testing::ValuesIn(kStrangers), support::CaseName());

/// Locks do not keep away who ignores them. The copy is larger than what SQLite
/// keeps of it in memory.
TEST_F(Restore, OfACopyThatIsOverwrittenAfterItsCheckBringsInNothingUnchecked) {
  writeSettings(R"({"log_max": 5000})");
  execute(kCopy,
          "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i+1 FROM n WHERE i<1000) "
          "INSERT INTO oauth_log(timestamp, msg) SELECT i, hex(randomblob(2000)) FROM n");
  const Content checked = contentOf(kCopy);
  const Arguments command{"restore", "--yes", kCopy};
  const auto state = filesIn(kStateDir);
  const std::vector<std::string> steps = stepsOf(command);
  putBack(kStateDir, state);
  const auto first = std::find(steps.begin(), steps.end(), std::string("create ") + kJournal);
  ASSERT_NE(first, steps.end());
  const Outcome outcome = meanwhile(
      static_cast<int>(first - steps.begin()) + 1,
      "dd if=/dev/zero of=/tmp/copies/copy.db bs=4096 seek=1 count=900 conv=notrunc status=none",
      command);
  EXPECT_THAT(outcome, ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), checked);
}

TEST_F(Restore, OfACopyWithSqlitesOwnStatistics) {
  execute(kCopy, "ANALYZE");
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), then_);
}

TEST_F(Restore, OfADamagedPage) {
  std::string file = readFile(kCopy);
  file.replace(4096 * 2, 100, 100, 'x');
  writeFile(kCopy, file);
  const auto state = filesIn(kStateDir);
  const Outcome outcome = restore();
  EXPECT_THAT(outcome, ExitsWith(cli::kRefused));
  EXPECT_THAT(outcome.err, HasSubstr("/tmp/copies/copy.db is malformed\n"));
  EXPECT_EQ(filesIn(kStateDir), state);
}

TEST_F(Restore, OfACopyThatWasCutOff) {
  fs::resize_file(kCopy, 4096 * 2);
  const Outcome outcome = restore();
  EXPECT_THAT(outcome, ExitsWith(cli::kRefused));
  EXPECT_THAT(outcome.err, HasSubstr("/tmp/copies/copy.db is malformed\n"));
  EXPECT_EQ(contentOf(), now_);
}

TEST_F(Restore, OfAFileThatNeedsItsJournal) {
  crashWhileWriting();
  fs::copy(kDatabase, "/tmp/copies/torn.db");
  fs::copy(kJournal, "/tmp/copies/torn.db-journal");
  const auto before = filesIn(kCopies);
  const Outcome outcome = restore("/tmp/copies/torn.db");
  EXPECT_THAT(outcome, ExitsWith(cli::kRefused));
  EXPECT_EQ(outcome.err, std::string("keldoauth: restore: /tmp/copies/torn.db is not complete "
                                     "without the journal beside it") +
                             kAdvice);
  EXPECT_EQ(filesIn(kCopies), before);
}

TEST_F(Restore, OfADirectory) {
  expectRefused(kCopies, "/tmp/copies is not a regular file\n");
}

TEST_F(Restore, OfAFileThatIsNotThere) {
  expectRefused("/tmp/copies/none", "/tmp/copies/none: No such file or directory\n",
                cli::kUnavailable);
}

TEST_F(Restore, OverADamagedDatabaseSaysToMoveItAway) {
  writeFile(kDatabase, std::string(4096, 'x'));
  expectRefused(kCopy,
                "file is not a database (26)\n"
                "hint: if the database is damaged, move it away together with its journal\n",
                cli::kUnavailable);
}

TEST_F(Restore, OntoAFullDiskKeepsTheOldStore) {
  const auto state = filesIn(kStateDir);
  const faults::SmallMedium medium(kStateDir);
  putBack(kStateDir, state);
  execute(kDatabase, "DELETE FROM oauth_token; DELETE FROM oauth_log; VACUUM");
  const Content old = contentOf();
  medium.fill(1);
  const Outcome outcome = restore();
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("(13)\nhint: the disk is full; the store is as it was\n"));
  EXPECT_EQ(contentOf(), old);
  medium.empty();
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), then_);
}

// Whoever waits for the lock waits for the disk: a restore keeps them waiting no
// longer than any change does.
TEST_F(Restore, SyncsTheStoreAsOftenAsTheWritingOfOneRow) {
  const auto syncs = [](const Arguments& arguments) {
    std::vector<std::string> steps = stepsOf(arguments);
    const auto isOther = [](const std::string& step) {
      return step.rfind(std::string("sync ") + kDatabase, 0) != 0;
    };
    steps.erase(std::remove_if(steps.begin(), steps.end(), isOther), steps.end());
    fs::remove("/tmp/steps");
    return steps;
  };
  const std::vector<std::string> ofARow = syncs({"log", "add", "entry"});
  EXPECT_THAT(ofARow, Not(IsEmpty()));
  std::vector<std::string> twice = ofARow;  // the entry in the audit log is one, too
  twice.insert(twice.end(), ofARow.begin(), ofARow.end());
  EXPECT_EQ(syncs({"restore", "--yes", kCopy}), twice);
}

TEST_F(Restore, GivesUpOnALockThatNeverGoes) {
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(kDatabase, &db), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
  const Outcome outcome = hurry({"restore", "--yes", kCopy});
  sqlite3_close(db);
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("database is locked (5)\n"));
  EXPECT_EQ(contentOf(), now_);
}

}  // namespace
}  // namespace operations
