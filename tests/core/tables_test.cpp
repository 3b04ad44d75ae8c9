// Creating, finding, counting and dropping single tables.

#include <limits>

#include "tests/core/core_test.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class TableTest : public CoreTest {};

// CreateDBTab and IsDBTabExist ------------------------------------------------

TEST_F(TableTest, CreatedTableIsThere) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.CreateDBTab("CREATE TABLE extra(a);"), 1);
  EXPECT_EQ(store.IsDBTabExist("extra"), 1);
  expectNoError(store);
}

TEST_F(TableTest, RefusedTableGivesTheCoresOwnError) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.CreateDBTab("CREATE TABLE oauth_log(a);"), 0);
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(lines(), ElementsAre(runFailed("table oauth_log already exists", 1)));
}

TEST_F(TableTest, CreationIsTraced) {
  OAUTHDBBasic store;
  EXPECT_THAT(traced(15, [&] { store.CreateDBTab("CREATE TABLE extra(a);"); }),
              ElementsAre("==> DBCmdRun[CREATE TABLE extra(a);]", "Create tab success"));
  EXPECT_THAT(traced(7, [&] { store.CreateDBTab("CREATE TABLE more(a);"); }), IsEmpty());
}

TEST_F(TableTest, ExistenceIsThatOfATable) {
  OAUTHDBBasic store;
  sql("CREATE INDEX an_index ON oauth_log(msg); CREATE VIEW a_view AS SELECT 1");
  EXPECT_EQ(store.IsDBTabExist("oauth_log"), 1);
  for (const char* name : {"an_index", "a_view", "nowhere", "OAUTH_LOG", "oauth", ""}) {
    EXPECT_EQ(store.IsDBTabExist(name), 0) << name;
  }
  expectNoError(store);
}

TEST_F(TableTest, ExistenceIsTracedWhenThereIs) {
  OAUTHDBBasic store;
  EXPECT_THAT(tracedLines(8, [&] { store.IsDBTabExist("oauth_log"); }),
              ElementsAre(::testing::_, Line{kError, "==> %s", "==> IsTabExistCallback"},
                          Line{kError, "Tab[%s] is exist", "Tab[oauth_log] is exist"}));
  EXPECT_THAT(traced(8, [&] { store.IsDBTabExist("nowhere"); }),
              ElementsAre("==> DBCmdRun[SELECT * FROM sqlite_master WHERE name='nowhere' "
                          "and type='table';]"));
  EXPECT_THAT(traced(1 + 4, [&] { store.IsDBTabExist("oauth_log"); }), IsEmpty());
}

TEST_F(TableTest, FailedQuestionReadsAsNoTable) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.IsDBTabExist("it's"), 0);
  EXPECT_EQ(store.GetErrCode(), 1);
  EXPECT_THAT(lines(), ElementsAre(runFailed("near \"s\": syntax error", 1)));
}

// Counting --------------------------------------------------------------------

class CountTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace("oauth_log");
    sql("INSERT INTO oauth_log(timestamp, msg) VALUES(1, 'a'), (2, 'b'), (3, 'c')");
  }

  std::optional<Table> store;
};

TEST_F(CountTest, ResultIsAnArrayWithTheCountAsText) {
  Json::Value result = json("{'old': 'content'}");
  EXPECT_EQ(store->DBGetRowCount(result), 1);
  EXPECT_EQ(result, json("['3']"));
  sql("DELETE FROM oauth_log");
  EXPECT_EQ(store->DBGetRowCount(result), 1);
  EXPECT_EQ(result, json("['0']"));
  expectNoError(*store);
}

TEST_F(CountTest, CountThatFailsIsLoggedWithTheTable) {
  store->SetTabName("nowhere");
  Json::Value result = json("['old']");
  EXPECT_EQ(store->DBGetRowCount(result), 0);
  EXPECT_EQ(result, Json::Value(Json::arrayValue));
  expectError(*store, 1, "no such table: nowhere");
  EXPECT_THAT(lines(), ElementsAre(runFailed("no such table: nowhere", 1),
                                   Line{kError, "Get Row Count failed[%s]",
                                        "Get Row Count failed[nowhere]"}));
}

TEST_F(CountTest, CountIsTraced) {
  Json::Value result;
  EXPECT_THAT(traced(15, [&] { store->DBGetRowCount(result); }),
              ElementsAre("==> DBGetRowCount", "==> DBCmd",
                          "==> DBCmdRun[SELECT COUNT(*) FROM oauth_log;]", "==> TabCountCallback"));
  EXPECT_THAT(traced(7, [&] { store->DBGetRowCount(result); }), IsEmpty());
}

TEST_F(CountTest, TableIsFullFromMaxRowsOn) {
  EXPECT_EQ(store->DBCheckRowMax(5), 1);
  EXPECT_EQ(store->DBCheckRowMax(4), 1);
  EXPECT_EQ(store->DBCheckRowMax(3), 0);
  EXPECT_EQ(store->DBCheckRowMax(2), 0);
  EXPECT_EQ(store->DBCheckRowMax(0), 0);
  EXPECT_EQ(store->DBCheckRowMax(std::numeric_limits<unsigned long>::max()), 1);
  expectNoError(*store);
}

TEST_F(CountTest, EmptyTableIsFullAtZero) {
  sql("DELETE FROM oauth_log");
  EXPECT_EQ(store->DBCheckRowMax(0), 0);
  EXPECT_EQ(store->DBCheckRowMax(1), 1);
}

TEST_F(CountTest, OnlyTheObjectsTableCounts) {
  store->SetTabName("oauth_token");
  EXPECT_EQ(store->DBCheckRowMax(1), 1);
}

TEST_F(CountTest, CheckIsTraced) {
  EXPECT_THAT(traced(15, [&] { store->DBCheckRowMax(4); }),
              ElementsAre("==> DBCheckRowMax", "==> DBGetRowCount", "==> DBCmd",
                          "==> DBCmdRun[SELECT COUNT(*) FROM oauth_log;]", "==> TabCountCallback",
                          "Table Row Count[3]"));
  EXPECT_THAT(tracedLines(1, [&] { store->DBCheckRowMax(3); }),
              ElementsAre(Line{kError, "Table Row Count[%lu]", "Table Row Count[3]"}));
  EXPECT_THAT(traced(2 + 4, [&] { store->DBCheckRowMax(3); }), IsEmpty());
}

TEST_F(CountTest, CheckThatFailsReadsAsFull) {
  store->SetTabName("nowhere");
  EXPECT_EQ(store->DBCheckRowMax(100), 0);
  EXPECT_THAT(messages(),
              ElementsAre("Run Command failed!![no such table: nowhere][1]",
                          "Get Row Count failed[nowhere]", "Check Row Max failed[nowhere]"));
}

TEST_F(CountTest, CheckOnAnObjectThatIsNotReadyReadsAsFull) {
  sql("DROP TABLE oauth_log");
  blockTable("oauth_log");
  Table notReady("oauth_token");
  SystemLog::clear();
  EXPECT_EQ(notReady.DBCheckRowMax(100), 0);
  EXPECT_THAT(
      lines(),
      ElementsAre(plain("DB is not ready!!"),
                  Line{kError, "Get Row Count failed[%s]", "Get Row Count failed[oauth_token]"},
                  Line{kError, "Check Row Max failed[%s]", "Check Row Max failed[oauth_token]"}));
  expectError(notReady, -1, "Create table failed");
}

// Dropping --------------------------------------------------------------------

class DropTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace("oauth_log");
    sql("INSERT INTO oauth_log VALUES(1, 'a', 1)");
  }

  /// DROP TABLE refuses a view.
  void makeDropFail() {
    sql("CREATE VIEW a_view AS SELECT 1");
    store->SetTabName("a_view");
  }
  static constexpr char kRefusal[] = "Run Command failed!![use DROP VIEW to delete view a_view][1]";

  std::optional<Table> store;
};

TEST_F(DropTest, TableIsGoneAndTheRestStays) {
  EXPECT_EQ(store->DBDrop(), 1);
  expectNoError(*store);
  EXPECT_EQ(store->IsDBTabExist("oauth_log"), 0);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_meta"), "3");
  EXPECT_EQ(store->DBCmd("SELECT * FROM oauth_token", nullptr, nullptr), 1);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(DropTest, TableComesBackEmptyWithTheNextObject) {
  store->DBDrop();
  const OAUTHDBBasic next;
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log"), "0");
}

TEST_F(DropTest, MissingTableIsASuccess) {
  EXPECT_EQ(store->DBDrop(), 1);
  EXPECT_EQ(store->DBDrop(), 1);
  expectNoError(*store);
}

TEST_F(DropTest, ReadinessIsNotAskedFor) {
  store->SetTabName("oauth_token");
  store->DBDrop();
  blockTable("oauth_token");
  Table notReady("oauth_log");
  EXPECT_EQ(notReady.DBDrop(), 1);
  EXPECT_EQ(notReady.IsDBTabExist("oauth_log"), 0);
}

TEST_F(DropTest, DropIsTraced) {
  EXPECT_THAT(traced(15, [&] { store->DBDrop(); }),
              ElementsAre("==> DBDrop", "==> DBCmdRun[DROP TABLE IF EXISTS oauth_log;]"));
  EXPECT_THAT(traced(7, [&] { store->DBDrop(); }), IsEmpty());
}

TEST_F(DropTest, FailureIsKept) {
  makeDropFail();
  EXPECT_EQ(store->DBDrop(), 0);
  expectError(*store, 1, "use DROP VIEW to delete view a_view");
}

TEST_F(DropTest, OwnFailureLineIsATraceOfClassOne) {
  makeDropFail();
  const auto drop = [&] { store->DBDrop(); };
  EXPECT_THAT(tracedLines(1, drop),
              ElementsAre(runFailed("use DROP VIEW to delete view a_view", 1),
                          Line{kError, "Drop [%s] failed", "Drop [a_view] failed"}));
  EXPECT_THAT(traced(2 + 4, drop), ElementsAre(kRefusal));
  EXPECT_THAT(traced(8, drop),
              ElementsAre("==> DBDrop", "==> DBCmdRun[DROP TABLE IF EXISTS a_view;]", kRefusal));
}

TEST_F(DropTest, OwnFailureLineNeedsTheFlagFile) {
  makeDropFail();
  writeSettings(R"({"log_level": 15})");
  inFreshThread([&] { store->DBDrop(); });
  EXPECT_THAT(messages(), ElementsAre(kRefusal));
}

}  // namespace
