// Several statements as one: begun, kept, taken back, lost.

#include "core/transaction.h"

#include <sqlite3.h>

#include "tests/core/core_test.h"
#include "tests/support/allocations.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr int kLocked = 5;
constexpr int kFull = 13;
constexpr int kConstraint = 19;
constexpr long long kWholeWait = 5000000000;

/// Another process's connection, which waits for nobody.
class Stranger {
 public:
  explicit Stranger(const char* path) { EXPECT_EQ(sqlite3_open(path, &db_), SQLITE_OK); }
  ~Stranger() { sqlite3_close(db_); }
  Stranger(const Stranger&) = delete;
  Stranger& operator=(const Stranger&) = delete;

  int run(const char* sql) { return sqlite3_exec(db_, sql, nullptr, nullptr, nullptr); }
  int write() { return run("INSERT INTO oauth_log VALUES(1, 'stranger', NULL)"); }

 private:
  sqlite3* db_ = nullptr;
};

class TransactionTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace("oauth_log");
    stranger.emplace(kDatabase);
    Engine::onExec([this](const std::string& text) { ran.push_back(text); });
  }
  void TearDown() override {
    stranger.reset();
    store.reset();
    CoreTest::TearDown();
  }

  int insert(const std::string& msg) {
    return store->DBCmd("INSERT INTO oauth_log VALUES(1, '" + msg + "', NULL)", nullptr, nullptr);
  }
  /// Everything that is stored, as others see it.
  static std::string stored() { return sqlText("SELECT group_concat(msg) FROM oauth_log"); }

  /// What `refused` inserts raises, and with it SQLite ends the transaction.
  static void refuseBadRows() {
    sql("CREATE TRIGGER refuse BEFORE INSERT ON oauth_log WHEN new.msg='bad' "
        "BEGIN SELECT RAISE(ROLLBACK, 'refused'); END");
  }

  std::optional<Table> store;
  std::optional<Stranger> stranger;
  std::vector<std::string> ran;  // by sqlite3_exec, the stranger's statements included
};

// Beginning -------------------------------------------------------------------

TEST_F(TransactionTest, ConstructionBeginsNothing) {
  {
    const Transaction transaction(*store);
    EXPECT_FALSE(transaction.IsOpen());
    EXPECT_FALSE(transaction.IsLost());
  }
  EXPECT_THAT(ran, IsEmpty());
  expectNoError(*store);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(TransactionTest, BeginTakesTheWriteLockAtOnce) {
  Transaction transaction(*store);
  EXPECT_TRUE(transaction.Begin());
  EXPECT_TRUE(transaction.IsOpen());
  EXPECT_FALSE(transaction.IsLost());
  EXPECT_THAT(ran, ElementsAre("BEGIN IMMEDIATE"));
  EXPECT_EQ(stranger->write(), kLocked);
}

TEST_F(TransactionTest, BeginGoesThroughTheGuardedEntry) {
  EXPECT_THAT(traced(8,
                     [&] {
                       Transaction transaction(*store);
                       transaction.Begin();
                       transaction.Commit();
                     }),
              ElementsAre("==> DBCmd", "==> DBCmdRun[BEGIN IMMEDIATE]", "==> DBCmd",
                          "==> DBCmdRun[COMMIT]"));
}

TEST_F(TransactionTest, BeginWaitsForAnotherWriterAsAStatementDoes) {
  stranger->run("BEGIN IMMEDIATE");
  Waiting::onNap([&](int nth) {
    if (nth == 300) stranger->run("COMMIT");
  });
  Transaction transaction(*store);
  EXPECT_TRUE(transaction.Begin());
  EXPECT_EQ(Waiting::naps(), 300);
}

TEST_F(TransactionTest, BeginThatWaitedInVainIsFalseAndLocked) {
  stranger->run("BEGIN IMMEDIATE");
  Waiting::onNap([](int /*nth*/) {});
  Transaction transaction(*store);
  EXPECT_FALSE(transaction.Begin());
  EXPECT_EQ(Waiting::napped(), kWholeWait);
  EXPECT_FALSE(transaction.IsOpen());
  expectError(*store, kLocked, "database is locked");
  EXPECT_THAT(lines(), ElementsAre(runFailed("database is locked", kLocked)));
}

TEST_F(TransactionTest, RefusedBeginCanBeTriedAgain) {
  stranger->run("BEGIN IMMEDIATE");
  Waiting::onNap([](int /*nth*/) {});
  Transaction transaction(*store);
  ASSERT_FALSE(transaction.Begin());
  stranger->run("COMMIT");
  EXPECT_TRUE(transaction.Begin());
  insert("a");
  EXPECT_TRUE(transaction.Commit());
  EXPECT_EQ(stored(), "a");
}

TEST_F(TransactionTest, BeginInsideATransactionIsRefusedAndLeavesIt) {
  store->DBCmd("BEGIN", nullptr, nullptr);
  insert("a");
  {
    Transaction transaction(*store);
    EXPECT_FALSE(transaction.Begin());
    EXPECT_FALSE(transaction.Commit());
  }
  expectError(*store, 1, "cannot start a transaction within a transaction");
  store->DBCmd("COMMIT", nullptr, nullptr);
  EXPECT_EQ(stored(), "a");
}

TEST_F(TransactionTest, BeginWhileItIsOpenIsFalseAndChangesNothing) {
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  ran.clear();
  EXPECT_FALSE(transaction.Begin());
  EXPECT_TRUE(transaction.IsOpen());
  EXPECT_THAT(ran, IsEmpty());
  expectNoError(*store);
  EXPECT_TRUE(transaction.Commit());
  EXPECT_EQ(stored(), "a");
}

TEST_F(TransactionTest, BeginOnAnObjectThatIsNotReadySetsNoCode) {
  hideFolder();
  OAUTHDBBasic closed;
  showFolder();
  closed.SetErrCode(42);
  SystemLog::clear();
  Transaction transaction(closed);
  EXPECT_FALSE(transaction.Begin());
  EXPECT_FALSE(transaction.IsOpen());
  EXPECT_FALSE(transaction.IsLost());
  EXPECT_FALSE(transaction.Commit());
  EXPECT_EQ(closed.GetErrCode(), 42);
  EXPECT_THAT(lines(), ElementsAre(plain("DB is not ready!!")));
}

// Keeping ---------------------------------------------------------------------

TEST_F(TransactionTest, CommitKeepsEverythingAtOnce) {
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  insert("b");
  EXPECT_EQ(stored(), "<NULL>");  // not yet for others
  ran.clear();
  EXPECT_TRUE(transaction.Commit());
  EXPECT_THAT(ran, ElementsAre("COMMIT"));
  EXPECT_FALSE(transaction.IsOpen());
  EXPECT_EQ(stored(), "a,b");
  expectNoError(*store);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(TransactionTest, FailedStatementDoesNotEndIt) {
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  EXPECT_EQ(store->DBCmd("nonsense", nullptr, nullptr), 0);
  EXPECT_FALSE(transaction.IsLost());
  insert("b");
  EXPECT_TRUE(transaction.Commit());
  EXPECT_EQ(stored(), "a,b");
  EXPECT_EQ(store->GetErrCode(), 1);
}

TEST_F(TransactionTest, ScopeThatEndsAfterTheCommitDoesNothing) {
  {
    Transaction transaction(*store);
    transaction.Begin();
    transaction.Commit();
    insert("a");
    ran.clear();
  }
  EXPECT_THAT(ran, IsEmpty());
  EXPECT_EQ(stored(), "a");
}

TEST_F(TransactionTest, CommitWithoutBeginIsFalseAndRunsNothing) {
  Transaction transaction(*store);
  EXPECT_FALSE(transaction.Commit());
  EXPECT_THAT(ran, IsEmpty());
  expectNoError(*store);
}

TEST_F(TransactionTest, SecondCommitIsFalseAndRunsNothing) {
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  transaction.Commit();
  ran.clear();
  EXPECT_FALSE(transaction.Commit());
  EXPECT_THAT(ran, IsEmpty());
  EXPECT_EQ(stored(), "a");
}

// Taking back -----------------------------------------------------------------

TEST_F(TransactionTest, EndOfTheScopeTakesEverythingBack) {
  {
    Transaction transaction(*store);
    transaction.Begin();
    insert("a");
    insert("b");
  }
  EXPECT_EQ(ran.back(), "ROLLBACK");
  EXPECT_EQ(stored(), "<NULL>");
  EXPECT_EQ(stranger->write(), SQLITE_OK);
  expectNoError(*store);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(TransactionTest, EndOfTheScopeKeepsTheReasonOnTheStore) {
  {
    Transaction transaction(*store);
    transaction.Begin();
    store->SetErrCode(-2);
    store->SetErrMsg("Bad parameters");
  }
  expectError(*store, -2, "Bad parameters");
}

TEST_F(TransactionTest, EndOfTheScopeNeedsNoMemory) {
  for (int nth = 1; nth <= 3; ++nth) {
    {
      std::optional<Transaction> transaction(*store);
      transaction->Begin();
      insert("a");
      store->SetErrCode(-2);
      store->SetErrMsg("a message of more than fifteen bytes");
      Engine::onExec(nullptr);
      const support::FailingAllocation failing(nth);
      transaction.reset();
    }
    expectError(*store, -2, "a message of more than fifteen bytes");
    EXPECT_EQ(stored(), "<NULL>") << nth;
  }
}

TEST_F(TransactionTest, CommitThatWaitedInVainTakesEverythingBack) {
  sql("INSERT INTO oauth_log VALUES(1, 'before', NULL)");
  stranger->run("BEGIN; SELECT * FROM oauth_log");
  Waiting::onNap([](int /*nth*/) {});
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  EXPECT_FALSE(transaction.Commit());
  EXPECT_FALSE(transaction.IsOpen());
  EXPECT_FALSE(transaction.IsLost());
  EXPECT_EQ(ran.back(), "ROLLBACK");
  expectError(*store, kLocked, "database is locked");
  stranger->run("COMMIT");
  EXPECT_EQ(stranger->write(), SQLITE_OK);
  EXPECT_EQ(stored(), "before,stranger");
}

TEST_F(TransactionTest, StatementsAfterAFailedCommitStandEachForItself) {
  Engine::refuseExec("COMMIT", kFull);
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  EXPECT_FALSE(transaction.Commit());
  expectError(*store, kFull, "database or disk is full");
  insert("b");
  EXPECT_EQ(stored(), "b");
}

/// Nothing else on the connection could ever write again.
TEST_F(TransactionTest, ObjectThatIsNoLongerReadyIsTakenBackToo) {
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  store->DBCmd("DROP TABLE oauth_log; CREATE TABLE t(a); CREATE INDEX oauth_log ON t(a)", nullptr,
               nullptr);
  ASSERT_EQ(store->DBInit(), 0);
  EXPECT_FALSE(transaction.Commit());
  EXPECT_FALSE(transaction.IsOpen());
  expectError(*store, -1, "Create table failed");
  EXPECT_EQ(stranger->write(), SQLITE_OK);
  EXPECT_EQ(stored(), "stranger");
}

// Losing ----------------------------------------------------------------------

class LostTransactionTest : public TransactionTest {
 protected:
  void SetUp() override {
    TransactionTest::SetUp();
    refuseBadRows();
    ASSERT_TRUE(transaction.emplace(*store).Begin());
    insert("a");
  }
  void TearDown() override {
    transaction.reset();
    TransactionTest::TearDown();
  }

  std::optional<Transaction> transaction;
};

TEST_F(LostTransactionTest, IsNoticed) {
  EXPECT_FALSE(transaction->IsLost());
  EXPECT_EQ(insert("bad"), 0);
  EXPECT_TRUE(transaction->IsLost());
  EXPECT_TRUE(transaction->IsOpen());
  EXPECT_EQ(stored(), "<NULL>");
}

TEST_F(LostTransactionTest, IsNotCommitted) {
  insert("bad");
  ran.clear();
  EXPECT_FALSE(transaction->Commit());
  EXPECT_THAT(ran, IsEmpty());
  expectError(*store, kConstraint, "refused");
  EXPECT_FALSE(transaction->IsOpen());
  EXPECT_FALSE(transaction->IsLost());
}

TEST_F(LostTransactionTest, IsNotTakenBackAgain) {
  insert("bad");
  insert("later");
  ran.clear();
  transaction.reset();
  EXPECT_THAT(ran, IsEmpty());
  EXPECT_EQ(stored(), "later");  // stood for itself
}

/// What SQLite itself does when there is no room for one more page.
TEST_F(TransactionTest, FullMediumLosesIt) {
  store->DBCmd("PRAGMA max_page_count=1", nullptr, nullptr);  // as many as there are
  Transaction transaction(*store);
  transaction.Begin();
  insert("a");
  EXPECT_EQ(insert(std::string(100000, 'x')), 0);
  expectError(*store, kFull, "database or disk is full");
  EXPECT_TRUE(transaction.IsLost());
  EXPECT_FALSE(transaction.Commit());
  EXPECT_EQ(stored(), "<NULL>");
}

}  // namespace
