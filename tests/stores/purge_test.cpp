// Purging grant codes and tokens: which rows go, in how many statements, and
// what happens when the transaction around them does not work out.

#include <gmock/gmock.h>
#include <json/value.h>
#include <sqlite3.h>

#include <functional>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"
#include "tests/support/server_world.h"

using namespace KELDOAUTHSERVER;
using support::Clock;
using support::Row;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;
using ::testing::StartsWith;

namespace {

constexpr long long kNow = 1700000000;

using Step = std::function<void(OAUTHDBBasic& store)>;

/// What codes and tokens have in common.
struct Expiring {
  std::string name;
  std::string table;
  /// A purge by an object of its own, with what is done right before and after.
  std::function<Aftermath(const Step& before, const Step& after)> purge;
};
void PrintTo(const Expiring& kind, std::ostream* out) {
  *out << kind.name;
}

template <typename Store>
Aftermath purgeBy(Store& store, const Step& before, const Step& after) {
  return runOn(store, [&](Store& self) {
    before(self);
    const auto purged = self.Purge();
    after(self);
    return purged;
  });
}

void nothing(OAUTHDBBasic& /*store*/) {}

const Expiring kKinds[] = {
    {"Codes", names::kGrantCodeTable,
     [](const Step& before, const Step& after) {
       OAUTHDBGrantCode store(names::kGrantCodeTable);
       return purgeBy(store, before, after);
     }},
    {"Tokens", names::kTokenTable,
     [](const Step& before, const Step& after) {
       OAUTHDBToken store(names::kTokenTable);
       return purgeBy(store, before, after);
     }},
};

/// A connection of the test's own that keeps a lock while it lives.
class Lock {
 public:
  explicit Lock(const char* file) { store_.open(file, &db_); }
  ~Lock() {
    sqlite3_finalize(reading_);
    store_.close(db_);
  }
  Lock(const Lock&) = delete;
  Lock& operator=(const Lock&) = delete;

  void write() {
    EXPECT_EQ(store_.exec(db_, "BEGIN IMMEDIATE;", nullptr, nullptr, nullptr), SQLITE_OK);
  }
  void read(const std::string& table) {
    sqlite3_prepare_v2(db_, ("SELECT * FROM " + table).c_str(), -1, &reading_, nullptr);
    EXPECT_EQ(sqlite3_step(reading_), SQLITE_ROW);
  }

 private:
  const support::StoreCalls store_ = support::storeCalls();
  sqlite3* db_ = nullptr;
  sqlite3_stmt* reading_ = nullptr;
};

class PurgeTest : public StoreTest, public ::testing::WithParamInterface<Expiring> {
 protected:
  void SetUp() override {
    StoreTest::SetUp();
    Clock::setTo(kNow);
  }

  static const std::string& table() { return GetParam().table; }
  static Aftermath purge(const Step& before = nothing, const Step& after = nothing) {
    return GetParam().purge(before, after);
  }
  static bool isCodes() { return table() == names::kGrantCodeTable; }

  /// Rows with the ids 1, 2, ..., expiring at these times.
  static void insertExpiringAt(const std::vector<long long>& times) {
    for (std::size_t i = 0; i < times.size(); ++i) {
      const char letter = static_cast<char>('a' + i);
      const std::string expiry = std::to_string(times[i]);
      if (isCodes()) {
        insertCode({{"code", support::id64(letter)}, {"expired_time", expiry}});
      } else {
        insertToken({{"access_token", support::id64(letter)}, {"expired_time", expiry}});
      }
    }
  }

  static std::string select() { return "SELECT * FROM " + table() + " ;"; }
  static std::string deletion(int id) {
    return "DELETE FROM " + table() + " WHERE id='" + std::to_string(id) + "';";
  }
  static std::string deleteFailed() { return "oauth_db_basic Delete failed[" + table() + "]"; }
  static std::string commandFailed(const std::string& text, int code) {
    return "oauth_db_basic Run Command failed!![" + text + "][" + std::to_string(code) + "]";
  }
  /// The deletion of the row `id` raises what SQLite knows as ABORT, ROLLBACK...
  static void refuseDeletion(int id, const std::string& how) {
    sql("CREATE TRIGGER refuse BEFORE DELETE ON " + table() + " WHEN old.id=" + std::to_string(id) +
        " BEGIN SELECT RAISE(" + how + ", 'kept'); END;");
  }
};

// Which rows --------------------------------------------------------------------

TEST_P(PurgeTest, OfAnEmptyTableSucceeds) {
  const Aftermath outcome = purge();
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre(select()));
}

TEST_P(PurgeTest, KeepsARowThatExpiresThisSecond) {
  insertExpiringAt({kNow});
  EXPECT_TRUE(succeeded(purge()));
  EXPECT_THAT(ids(table()), ElementsAre("1"));
  Clock::advance(1);
  EXPECT_TRUE(succeeded(purge()));
  EXPECT_THAT(ids(table()), IsEmpty());
}

TEST_P(PurgeTest, KeepsEveryRowThatHasNotExpired) {
  insertExpiringAt({kNow - 1, kNow, kNow - 2, kNow + 1, 5});
  EXPECT_TRUE(succeeded(purge()));
  EXPECT_THAT(ids(table()), ElementsAre("2", "4"));
}

TEST_P(PurgeTest, LeavesOtherTablesAlone) {
  insertExpiringAt({5, 6});
  if (isCodes()) {
    insertToken({{"expired_time", "5"}});
  } else {
    insertCode({{"expired_time", "5"}});
  }
  insertClient();
  insertLog();
  EXPECT_TRUE(succeeded(purge()));
  EXPECT_THAT(ids(isCodes() ? "oauth_token" : "oauth_grantCode"), ElementsAre("1"));
  EXPECT_EQ(rowCount("oauth_clientInfo"), 1);
  EXPECT_EQ(rowCount("oauth_log"), 1);
}

TEST_P(PurgeTest, ReadsTheClockOnceAndFirst) {
  insertExpiringAt({kNow - 1, kNow, kNow});
  Statements::before([](const std::string& sql) {
    if (sql.rfind("SELECT * FROM oauth", 0) == 0) Clock::advance(100);
  });
  EXPECT_TRUE(succeeded(purge()));
  EXPECT_THAT(ids(table()), ElementsAre("2", "3"));
}

TEST_P(PurgeTest, RemovesRowsThatCannotBeDecrypted) {
  insertExpiringAt({5});
  sql("UPDATE " + table() + " SET client_id='no cipher';");
  EXPECT_TRUE(succeeded(purge()));
  EXPECT_THAT(ids(table()), IsEmpty());
}

TEST_P(PurgeTest, SucceedsWhenTheRowsCannotBeRead) {
  const std::string missing = "no such table: " + table();
  const Aftermath outcome =
      purge([](OAUTHDBBasic& /*store*/) { sql("DROP TABLE " + table() + ";"); });
  EXPECT_TRUE(outcome.ok);
  EXPECT_EQ(outcome.code, 1);
  EXPECT_EQ(outcome.message, missing);
  EXPECT_THAT(outcome.lines,
              ElementsAre(commandFailed(missing, 1), "oauth_db_basic Get failed[" + table() + "]"));
}

// How many statements -------------------------------------------------------------

TEST_P(PurgeTest, OfOneRowNeedsNoTransaction) {
  insertExpiringAt({5, kNow});
  const Aftermath outcome = purge();
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre(select(), deletion(1)));
}

TEST_P(PurgeTest, OfSeveralRowsIsOneTransaction) {
  insertExpiringAt({5, kNow, 6, 7});
  const Aftermath outcome = purge();
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre(select(), "BEGIN IMMEDIATE", deletion(1), deletion(3),
                                              deletion(4), "COMMIT"));
  EXPECT_THAT(outcome.lines, IsEmpty());
}

TEST_P(PurgeTest, TransactionGoesThroughTheOneExecutor) {
  insertExpiringAt({5, 6});
  Lines lines;
  withDiagnostics(8, [&] { lines = purge().lines; });
  Lines run;
  for (const std::string& line : lines) {
    if (line.rfind("oauth_db_basic ==> DBCmdRun[", 0) == 0) run.push_back(line.substr(27));
  }
  EXPECT_THAT(run, ElementsAre("[" + select() + "]", "[BEGIN IMMEDIATE]", "[" + deletion(1) + "]",
                               "[" + deletion(2) + "]", "[COMMIT]"));
}

TEST_P(PurgeTest, OfManyRowsLeavesNoneAndNoTransactionOpen) {
  std::vector<long long> times(24, 5);
  insertExpiringAt(times);
  EXPECT_TRUE(succeeded(purge()));
  EXPECT_EQ(rowCount(table()), 0);
  insertExpiringAt({kNow});  // another connection can write
  EXPECT_EQ(rowCount(table()), 1);
}

// Deletions that fail ---------------------------------------------------------------

TEST_P(PurgeTest, RefusedDeletionDoesNotStopTheOthers) {
  insertExpiringAt({5, 6, 7});
  refuseDeletion(2, "ABORT");
  const Aftermath outcome = purge();
  EXPECT_TRUE(failed(outcome, 19, "kept"));
  EXPECT_THAT(outcome.lines, ElementsAre(commandFailed("kept", 19), deleteFailed()));
  EXPECT_THAT(ids(table()), ElementsAre("2"));
}

TEST_P(PurgeTest, RefusedDeletionOfTheOnlyRowFails) {
  insertExpiringAt({5});
  refuseDeletion(1, "ABORT");
  EXPECT_TRUE(failed(purge(), 19, "kept"));
  EXPECT_THAT(ids(table()), ElementsAre("1"));
}

TEST_P(PurgeTest, RowThatAnotherRemovedFirstFailsWithoutACode) {
  insertExpiringAt({5, 6});
  Statements::before([this](const std::string& text) {
    if (text == "BEGIN IMMEDIATE") {
      Statements::before(nullptr);
      sql("DELETE FROM " + table() + " WHERE id=1;");
    }
  });
  const Aftermath outcome = purge();
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre(deleteFailed()));
  EXPECT_THAT(ids(table()), IsEmpty());
}

/// The transaction is over with the refusal, and so is the purge: what was
/// deleted before is back, and nothing more is tried.
TEST_P(PurgeTest, DeletionThatEndsTheTransactionEndsThePurge) {
  insertExpiringAt({5, 6, 7});
  const std::vector<Row> before = everything();
  refuseDeletion(2, "ROLLBACK");
  const Aftermath outcome = purge();
  EXPECT_TRUE(failed(outcome, 19, "kept"));
  EXPECT_THAT(outcome.lines, ElementsAre(commandFailed("kept", 19), deleteFailed()));
  EXPECT_THAT(outcome.statements,
              ElementsAre(select(), "BEGIN IMMEDIATE", deletion(1), deletion(2)));
  sql("DROP TRIGGER refuse;");
  EXPECT_EQ(everything(), before);
}

// BEGIN that is refused ---------------------------------------------------------------

void begin(OAUTHDBBasic& store) {
  store.DBCmd("BEGIN;", nullptr, nullptr);
}

TEST_P(PurgeTest, InsideATransactionOfTheCallersRunsOneByOne) {
  insertExpiringAt({5, 6});
  const Aftermath outcome = purge(begin, [](OAUTHDBBasic& store) {
    EXPECT_THAT(ids(table()), ElementsAre("1", "2"));  // not yet for others
    Statements::clear();
    store.DBCmd("COMMIT;", nullptr, nullptr);
  });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("COMMIT;"));
  EXPECT_THAT(outcome.lines,
              ElementsAre(commandFailed("cannot start a transaction within a transaction", 1)));
  EXPECT_THAT(ids(table()), IsEmpty());
}

TEST_P(PurgeTest, RefusedBeginIsFollowedByNoCommit) {
  insertExpiringAt({5, 6});
  const Aftermath outcome = purge(begin);
  EXPECT_THAT(outcome.statements,
              ElementsAre("BEGIN;", select(), "BEGIN IMMEDIATE", deletion(1), deletion(2)));
}

TEST_P(PurgeTest, CallersTransactionCanTakeThePurgeBack) {
  insertExpiringAt({5, 6});
  EXPECT_TRUE(succeeded(
      purge(begin, [](OAUTHDBBasic& store) { store.DBCmd("ROLLBACK;", nullptr, nullptr); })));
  EXPECT_THAT(ids(table()), ElementsAre("1", "2"));
}

TEST_P(PurgeTest, WritersLockEndsItAtTheBegin) {
  insertExpiringAt({5, 6});
  Lock lock(kDatabase);
  lock.write();
  const Aftermath outcome = purge([](OAUTHDBBasic& /*store*/) { Statements::dontWaitForLocks(); });
  EXPECT_TRUE(failed(outcome, 5, "database is locked"));
  EXPECT_THAT(outcome.lines, ElementsAre(commandFailed("database is locked", 5)));
  EXPECT_EQ(outcome.statements.back(), "BEGIN IMMEDIATE");
  EXPECT_THAT(ids(table()), ElementsAre("1", "2"));
}

/// Whoever waits for the whole limit at every row waits for hours.
TEST_P(PurgeTest, MeetsAWritersLockOnceWhateverTheNumberOfRows) {
  insertExpiringAt(std::vector<long long>(24, 5));
  Lock lock(kDatabase);
  lock.write();
  purge([](OAUTHDBBasic& /*store*/) { Statements::dontWaitForLocks(); });
  EXPECT_EQ(Statements::waits(), 1);
}

TEST_P(PurgeTest, OfOneRowMeetsAWritersLockOnce) {
  insertExpiringAt({5});
  Lock lock(kDatabase);
  lock.write();
  const Aftermath outcome = purge([](OAUTHDBBasic& /*store*/) { Statements::dontWaitForLocks(); });
  EXPECT_TRUE(failed(outcome, 5, "database is locked"));
  EXPECT_THAT(outcome.lines, ElementsAre(commandFailed("database is locked", 5), deleteFailed()));
  EXPECT_EQ(Statements::waits(), 1);
}

TEST_P(PurgeTest, BeginRefusedForAnotherReasonRunsOneByOneWithTheErrorAsItWas) {
  insertExpiringAt({5, 6, kNow});
  const Aftermath outcome = purge([](OAUTHDBBasic& /*store*/) { Statements::refuseBegins(); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre(select(), deletion(1), deletion(2)));
  EXPECT_THAT(outcome.lines, ElementsAre(commandFailed("not authorized", 23)));
  EXPECT_THAT(ids(table()), ElementsAre("3"));
}

TEST_P(PurgeTest, OneByOneARefusedDeletionIsTheReasonKept) {
  insertExpiringAt({5, 6, 7});
  refuseDeletion(2, "ABORT");
  const Aftermath outcome = purge([](OAUTHDBBasic& /*store*/) { Statements::refuseBegins(); });
  EXPECT_TRUE(failed(outcome, 19, "kept"));
  EXPECT_THAT(ids(table()), ElementsAre("2"));
}

/// A deletion after it would stand although the caller has taken all back.
TEST_P(PurgeTest, CallersTransactionThatIsLostEndsThePurge) {
  insertExpiringAt({5, 6, 7});
  const std::vector<Row> before = everything();
  refuseDeletion(2, "ROLLBACK");
  const Aftermath outcome = purge(begin);
  EXPECT_TRUE(failed(outcome, 19, "kept"));
  EXPECT_THAT(outcome.statements,
              ElementsAre("BEGIN;", select(), "BEGIN IMMEDIATE", deletion(1), deletion(2)));
  sql("DROP TRIGGER refuse;");
  EXPECT_EQ(everything(), before);
}

// COMMIT that is refused --------------------------------------------------------------

TEST_P(PurgeTest, ReadersLockRefusesTheCommitAndEveryRowIsBack) {
  insertExpiringAt({5, 6, kNow});
  const std::vector<Row> before = everything();
  Lock lock(kDatabase);
  lock.read(table());
  const Aftermath outcome = purge([](OAUTHDBBasic& /*store*/) { Statements::dontWaitForLocks(); });
  EXPECT_TRUE(failed(outcome, 5, "database is locked"));
  EXPECT_THAT(outcome.lines, ElementsAre(commandFailed("database is locked", 5)));
  EXPECT_EQ(outcome.statements.back(), "ROLLBACK");
  EXPECT_EQ(everything(), before);
}

TEST_P(PurgeTest, CommitThatSqliteTurnsIntoARollbackIsAFailure) {
  insertExpiringAt({5, 6});
  const Aftermath outcome =
      purge([](OAUTHDBBasic& /*store*/) { Statements::refuseCommits(true); },
            [](OAUTHDBBasic& /*store*/) { Statements::refuseCommits(false); });
  EXPECT_TRUE(failed(outcome, 19, "constraint failed"));
  EXPECT_THAT(outcome.lines, ElementsAre(commandFailed("constraint failed", 19)));
  EXPECT_EQ(outcome.statements.back(), "COMMIT");  // there is nothing left to take back
  EXPECT_THAT(ids(table()), ElementsAre("1", "2"));
}

TEST_P(PurgeTest, PurgeAfterARefusedCommitWorks) {
  insertExpiringAt({5, 6});
  bool second = false;
  purge([](OAUTHDBBasic& /*store*/) { Statements::refuseCommits(true); },
        [&](OAUTHDBBasic& store) {
          Statements::refuseCommits(false);
          second = isCodes() ? static_cast<OAUTHDBGrantCode&>(store).Purge() != 0
                             : static_cast<OAUTHDBToken&>(store).Purge();
        });
  EXPECT_TRUE(second);
  EXPECT_THAT(ids(table()), IsEmpty());
}

TEST_P(PurgeTest, FailedDeletionIsTheReasonKeptWhenTheCommitWorks) {
  insertExpiringAt({5, 6, 7});
  refuseDeletion(1, "FAIL");
  const Aftermath outcome = purge();
  EXPECT_TRUE(failed(outcome, 19, "kept"));
  EXPECT_EQ(outcome.statements.back(), "COMMIT");
  EXPECT_THAT(ids(table()), ElementsAre("1"));
}

INSTANTIATE_TEST_SUITE_P(Of, PurgeTest, ::testing::ValuesIn(kKinds),
                         ::testing::PrintToStringParamName());

}  // namespace
