// One transaction over all stores of a connection, registration inside it, and
// what becomes of its audit entry.

#include <gmock/gmock.h>
#include <json/value.h>
#include <sqlite3.h>

#include <optional>
#include <string>
#include <vector>

#include "core/transaction.h"
#include "tests/stores/text_operations.h"

using namespace KELDOAUTHSERVER;
using support::FakeIds;
using support::id64;
using support::Row;
using support::SystemLog;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

namespace {

class LentTransactionTest : public StoreTest {
 protected:
  void SetUp() override {
    StoreTest::SetUp();
    stores_.emplace();
    insertCode();
    SystemLog::clear();
    Statements::clear();
    before_ = everything();
  }

  void TearDown() override {
    stores_.reset();
    StoreTest::TearDown();
  }

  /// One change by each of the four.
  void changeEverything() {
    Json::Value out;
    EXPECT_NE(clients().Add("abc", "read", "App", out), 0);  // and an entry in the log
    EXPECT_NE(codes().Del(1), 0);
    EXPECT_NE(tokens().Add("alice", id64('c'), "read", "code", "xyz", "", out), 0);
    EXPECT_NE(log().Add("changed"), 0);
  }
  static Lines counts() {
    Lines found;
    for (const char* table :
         {names::kClientInfoTable, names::kGrantCodeTable, names::kTokenTable, names::kLogTable}) {
      found.push_back(std::to_string(rowCount(table)));
    }
    return found;
  }
  bool hasChanged() const { return everything() != before_; }

  static void refuseRows(const char* table, const char* how) {
    sql(std::string("CREATE TRIGGER refuse BEFORE INSERT ON ") + table + " BEGIN SELECT RAISE(" +
        how + ", 'no'); END;");
  }
  static void acceptRows() { sql("DROP TRIGGER refuse;"); }

  OAUTHDBGrantCode& codes() { return stores_->codes; }
  OAUTHDBToken& tokens() { return stores_->tokens; }
  OAUTHDBClientInfo& clients() { return stores_->clients; }
  OAUTHDBLog& log() { return stores_->log; }
  std::vector<OAUTHDBBasic*> all() { return {&codes(), &tokens(), &clients(), &log()}; }

  std::vector<Row> before_;

 private:
  struct Stores {
    OAUTHDBGrantCode codes{names::kGrantCodeTable};  // the one with the connection
    OAUTHDBToken tokens{names::kTokenTable, codes};
    OAUTHDBClientInfo clients{names::kClientInfoTable, tokens};
    OAUTHDBLog log{names::kLogTable, codes};
  };
  std::optional<Stores> stores_;
};

// All four --------------------------------------------------------------------

TEST_F(LentTransactionTest, CommitKeepsTheChangesOfAllWhoeverBeganIt) {
  Transaction transaction(clients());
  ASSERT_TRUE(transaction.Begin());
  changeEverything();
  EXPECT_FALSE(hasChanged());
  ASSERT_TRUE(transaction.Commit());
  EXPECT_THAT(counts(), ElementsAre("1", "0", "1", "2"));
  EXPECT_THAT(journal(), IsEmpty());
}

TEST_F(LentTransactionTest, EndOfTheScopeTakesTheChangesOfAllBackWhoeverBeganIt) {
  for (OAUTHDBBasic* store : all()) {
    {
      Transaction transaction(*store);
      ASSERT_TRUE(transaction.Begin());
      changeEverything();
    }
    EXPECT_FALSE(hasChanged());
  }
}

TEST_F(LentTransactionTest, OfOneIsATransactionForTheOthers) {
  Transaction transaction(codes());
  ASSERT_TRUE(transaction.Begin());
  for (OAUTHDBBasic* store : all()) {
    Transaction second(*store);
    EXPECT_FALSE(second.Begin());
    EXPECT_EQ(store->GetErrMsg(), "cannot start a transaction within a transaction");
  }
  changeEverything();
  EXPECT_TRUE(transaction.Commit());
  EXPECT_TRUE(hasChanged());
}

TEST_F(LentTransactionTest, FailureOfOneLeavesTheErrorsOfTheOthers) {
  Transaction transaction(codes());
  ASSERT_TRUE(transaction.Begin());
  EXPECT_EQ(tokens().DBCmd("nonsense", nullptr, nullptr), 0);
  EXPECT_EQ(tokens().GetErrCode(), 1);
  for (OAUTHDBBasic* store : all()) EXPECT_EQ(store->GetErrCode(), store == &tokens() ? 1 : 255);
  EXPECT_FALSE(transaction.IsLost());
  EXPECT_TRUE(transaction.Commit());
}

TEST_F(LentTransactionTest, LostThroughOneIsLostForAll) {
  refuseRows(names::kTokenTable, "ROLLBACK");
  Transaction transaction(clients());
  ASSERT_TRUE(transaction.Begin());
  EXPECT_NE(codes().Del(1), 0);
  Json::Value out;
  EXPECT_EQ(tokens().Add("alice", id64('c'), "read", "code", "xyz", "", out), 0);
  EXPECT_TRUE(transaction.IsLost());
  EXPECT_FALSE(transaction.Commit());
  EXPECT_EQ(tokens().GetErrCode(), 19);  // who carries the reason
  EXPECT_EQ(tokens().GetErrMsg(), "no");
  EXPECT_EQ(clients().GetErrCode(), 255);
  acceptRows();
  EXPECT_FALSE(hasChanged());
}

TEST_F(LentTransactionTest, FullMediumLosesTheChangesOfAll) {
  codes().DBCmd("PRAGMA max_page_count=1;", nullptr, nullptr);  // as many as there are
  Transaction transaction(codes());
  ASSERT_TRUE(transaction.Begin());
  EXPECT_NE(codes().Del(1), 0);
  EXPECT_EQ(log().Add(std::string(100000, 'x')), 0);
  EXPECT_EQ(log().GetErrCode(), SQLITE_FULL);
  EXPECT_TRUE(transaction.IsLost());
  EXPECT_FALSE(transaction.Commit());
  EXPECT_EQ(codes().GetErrCode(), 255);
  EXPECT_FALSE(hasChanged());
}

TEST_F(LentTransactionTest, PurgeThroughABorrowerIsTakenBackWithIt) {
  insertToken({{"access_token", id64('1')}, {"expired_time", "5"}});
  insertToken({{"access_token", id64('2')}, {"expired_time", "6"}});
  before_ = everything();
  {
    Transaction transaction(codes());
    ASSERT_TRUE(transaction.Begin());
    EXPECT_TRUE(succeeded(runOn(tokens(), [](auto& s) { return s.Purge(); })));
    Json::Value counts;
    tokens().DBGetRowCount(counts);
    EXPECT_EQ(counts[0].asString(), "0");
    EXPECT_FALSE(transaction.IsLost());
  }
  EXPECT_FALSE(hasChanged());
  EXPECT_TRUE(tokens().Purge());  // and by itself it is one of its own
  EXPECT_EQ(rowCount("oauth_token"), 0);
}

// Registration ----------------------------------------------------------------

TEST_F(LentTransactionTest, RegistrationThroughABorrowerOpensNothing) {
  FakeIds::use(1000, 1000);
  Json::Value out;
  const Aftermath outcome =
      runOn(clients(), [&](auto& s) { return s.Add("abc", "read", "App", out); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, Each(Not(StartsWith("CREATE"))));
  EXPECT_THAT(outcome.lines, IsEmpty());
  EXPECT_THAT(FakeIds::calls(), IsEmpty());
  EXPECT_EQ(onlyRow(names::kLogTable)["msg"], "Application registed[App]");
}

TEST_F(LentTransactionTest, RegistrationThroughABorrowerIsTakenBackWithItsEntry) {
  {
    Transaction transaction(codes());
    ASSERT_TRUE(transaction.Begin());
    Json::Value out;
    ASSERT_NE(clients().Add("abc", "read", "App", out), 0);
    Json::Value entries;
    log().Get("", "", &entries);
    EXPECT_THAT(entries, SizeIs(1));  // on the same connection
    EXPECT_THAT(journal(), IsEmpty());
  }
  EXPECT_FALSE(hasChanged());
}

TEST_F(LentTransactionTest, RefusedEntryLeavesTheRegistrationInTheTransaction) {
  refuseRows(names::kLogTable, "ABORT");
  Transaction transaction(codes());
  ASSERT_TRUE(transaction.Begin());
  Json::Value out;
  EXPECT_TRUE(succeeded(runOn(clients(), [&](auto& s) { return s.Add("abc", "r", "App", out); })));
  EXPECT_FALSE(transaction.IsLost());
  EXPECT_TRUE(transaction.Commit());
  EXPECT_EQ(rowCount(names::kClientInfoTable), 1);
  EXPECT_EQ(rowCount(names::kLogTable), 0);
}

/// The store that wrote the entry is gone, and with it the reason.
TEST_F(LentTransactionTest, EntryThatEndsTheTransactionTakesTheRegistrationWithIt) {
  refuseRows(names::kLogTable, "ROLLBACK");
  Transaction transaction(codes());
  ASSERT_TRUE(transaction.Begin());
  Json::Value out;
  EXPECT_TRUE(succeeded(runOn(clients(), [&](auto& s) { return s.Add("abc", "r", "App", out); })));
  EXPECT_TRUE(transaction.IsLost());
  EXPECT_FALSE(transaction.Commit());
  acceptRows();
  EXPECT_FALSE(hasChanged());
}

/// The entry's own connection waits for the transaction's lock, in vain: the
/// transaction is the caller's, and he is waiting for the registration.
TEST_F(LentTransactionTest, RegistrationByAnOwnerInATransactionHasNoEntry) {
  OAUTHDBClientInfo owner(names::kClientInfoTable);
  Transaction transaction(owner);
  ASSERT_TRUE(transaction.Begin());
  Statements::before([](const std::string& text) {
    if (text.rfind("SELECT COUNT(*)", 0) == 0) Statements::dontWaitForLocks();  // the entry's
  });
  Json::Value out;
  const Aftermath outcome = runOn(owner, [&](auto& s) { return s.Add("abc", "read", "App", out); });
  EXPECT_TRUE(succeeded(outcome));
  const std::string locked = "oauth_db_basic Run Command failed!![database is locked][5]";
  EXPECT_THAT(outcome.lines, ElementsAre(locked, "oauth_db_basic Add failed[oauth_log]", locked));
  EXPECT_FALSE(transaction.IsLost());
  EXPECT_TRUE(transaction.Commit());
  EXPECT_EQ(rowCount(names::kClientInfoTable), 1);
  EXPECT_EQ(rowCount(names::kLogTable), 0);
}

TEST_F(LentTransactionTest, RegistrationThroughABorrowerThatIsNotReadyReadsAsFull) {
  sql("ALTER TABLE oauth_log RENAME TO old_log; CREATE INDEX oauth_log ON old_log(msg);");
  ASSERT_EQ(codes().DBInit(), 0);
  ASSERT_EQ(tokens().DBInit(), 0);
  ASSERT_EQ(clients().DBInit(), 0);
  Json::Value out;
  const Aftermath outcome =
      runOn(clients(), [&](auto& s) { return s.Add("abc", "r", "App", out); });
  EXPECT_TRUE(failed(outcome, -5, "ClientInfo Table is full"));
  EXPECT_THAT(outcome.statements, IsEmpty());
  EXPECT_EQ(rowCount(names::kClientInfoTable), 0);
}

}  // namespace
