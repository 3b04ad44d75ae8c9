#include <limits>

#include "tests/core/core_test.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::Row;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;

using Texts = std::vector<std::string>;

constexpr char kMeta[] = "(tab_name text NOT NULL, version integer NOT NULL)";
constexpr char kClientInfo[] =
    "(enable text NOT NULL, client_id text NOT NULL UNIQUE, client_secret text NOT NULL, "
    "redirect_uri text NOT NULL, scope text NOT NULL, display_name text NOT NULL, "
    "id integer PRIMARY KEY)";
constexpr char kToken[] =
    "(username text NOT NULL,  client_id text NOT NULL,  scope text NOT NULL,  "
    "refresh_token text NOT NULL, access_token text NOT NULL UNIQUE, expired_time text NOT NULL, "
    "flow_type text NOT NULL, state text NOT NULL, ip text NOT NULL DEFAULT 'None', "
    "id integer PRIMARY KEY)";
constexpr char kGrantCode[] =
    "(username text NOT NULL, client_id text NOT NULL, scope text NOT NULL, "
    "code text NOT NULL UNIQUE, expired_time text NOT NULL, state text NOT NULL, "
    "ip text NOT NULL DEFAULT 'None', id integer PRIMARY KEY)";
constexpr char kLog[] = "(timestamp integer NOT NULL, msg text NOT NULL, id integer PRIMARY KEY)";

std::string created(const std::string& table, const std::string& columns) {
  return "==> DBCmdRun[CREATE TABLE IF NOT EXISTS " + table + columns + ";]";
}

std::string metaInserted(const std::string& table) {
  return "==> DBCmdRun[INSERT INTO oauth_meta(tab_name, version) VALUES('" + table + "', 2);]";
}

constexpr char kMetaAsked[] =
    "==> DBCmdRun[SELECT * FROM sqlite_master WHERE name='oauth_meta' and type='table';]";

Line createFailed(const std::string& table) {
  return {kError, "Create Table failed!![%s]", "Create Table failed!![" + table + "]"};
}

Line runFailed(const std::string& text, int code) {
  return {kError, "Run Command failed!![%s][%d]",
          "Run Command failed!![" + text + "][" + std::to_string(code) + "]"};
}

class SchemaTest : public CoreTest {
 protected:
  static void construct() { const OAUTHDBBasic store; }

  static Texts tables() {
    Texts names;
    for (const Row& row : sql("SELECT name FROM sqlite_master WHERE type='table' ORDER BY rowid")) {
      names.push_back(row.at("name"));
    }
    return names;
  }

  static Texts metaRows() {
    Texts rows;
    for (const Row& row : sql("SELECT tab_name || ' ' || version AS row FROM oauth_meta")) {
      rows.push_back(row.at("row"));
    }
    return rows;
  }
};

const char* const kAllTables[] = {"oauth_meta", "oauth_clientInfo", "oauth_token",
                                  "oauth_grantCode", "oauth_log"};
const char* const kMetaRows[] = {"oauth_clientInfo 2", "oauth_grantCode 2", "oauth_token 2"};

// What is created -------------------------------------------------------------

struct TableText {
  const char* name;
  const char* columns;
};

void PrintTo(const TableText& table, std::ostream* out) {
  *out << table.name;
}

class TableTextTest : public SchemaTest, public ::testing::WithParamInterface<TableText> {};

TEST_P(TableTextTest, IsStoredToTheLetter) {
  construct();
  const std::string name = GetParam().name;
  EXPECT_EQ(sqlText("SELECT sql FROM sqlite_master WHERE type='table' AND name='" + name + "'"),
            "CREATE TABLE " + name + GetParam().columns);
}

const TableText kTableTexts[] = {
    {"oauth_meta", kMeta},   {"oauth_clientInfo", kClientInfo},
    {"oauth_token", kToken}, {"oauth_grantCode", kGrantCode},
    {"oauth_log", kLog},
};

INSTANTIATE_TEST_SUITE_P(Core, TableTextTest, ::testing::ValuesIn(kTableTexts),
                         support::CaseName());

TEST_F(SchemaTest, NewFileGetsTheFiveTablesInOrder) {
  construct();
  EXPECT_THAT(tables(), ElementsAreArray(kAllTables));
}

TEST_F(SchemaTest, NewFileGetsThreeMetaRowsInOrder) {
  construct();
  EXPECT_THAT(metaRows(), ElementsAreArray(kMetaRows));
  EXPECT_EQ(sqlText("SELECT group_concat(DISTINCT typeof(version)) FROM oauth_meta"), "integer");
}

TEST_F(SchemaTest, NewObjectIsReadyWithoutALine) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
  expectNoError(store);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(SchemaTest, LaterConstructionLeavesTheFileByteForByte) {
  construct();
  const std::string before = readFile(kDatabase);
  construct();
  EXPECT_EQ(readFile(kDatabase), before);
}

TEST_F(SchemaTest, RowsSurviveALaterConstruction) {
  construct();
  sql("INSERT INTO oauth_log VALUES(1, 'kept', 1)");
  construct();
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "kept");
}

TEST_F(SchemaTest, DroppedTableComesBackWithoutAMetaRow) {
  construct();
  sql("DROP TABLE oauth_log; INSERT INTO oauth_grantCode VALUES('u','c','s','k','1','t','None',1)");
  OAUTHDBBasic store;
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log"), "0");
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_grantCode"), "1");
  EXPECT_THAT(metaRows(), ElementsAreArray(kMetaRows));
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
}

TEST_F(SchemaTest, DroppedMetaTableComesBackWithItsRows) {
  construct();
  sql("DROP TABLE oauth_meta; INSERT INTO oauth_log VALUES(1, 'kept', 1)");
  construct();
  EXPECT_THAT(metaRows(), ElementsAreArray(kMetaRows));
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "kept");
}

TEST_F(SchemaTest, EmptiedMetaTableStaysEmpty) {
  construct();
  sql("DELETE FROM oauth_meta");
  construct();
  EXPECT_THAT(metaRows(), IsEmpty());
}

TEST_F(SchemaTest, VersionIsNeverCompared) {
  construct();
  sql("UPDATE oauth_meta SET version=99");
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
  EXPECT_EQ(sqlText("SELECT DISTINCT version FROM oauth_meta"), "99");
}

TEST_F(SchemaTest, TableOfAnotherShapeStaysAsItIs) {
  sql("CREATE TABLE oauth_log(something)");
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("SELECT something FROM oauth_log", nullptr, nullptr), 1);
}

// What start-up writes --------------------------------------------------------

TEST_F(SchemaTest, StartOnAnAbsentFileAtEveryLevel) {
  EXPECT_THAT(
      traced(15, construct),
      ElementsAre("==> DBInit[init meta table]", kMetaAsked, created("oauth_meta", kMeta),
                  "Create tab success", "==> AddMetaData", metaInserted("oauth_clientInfo"),
                  metaInserted("oauth_grantCode"), metaInserted("oauth_token"),
                  "==> DBInit[init client table]", created("oauth_clientInfo", kClientInfo),
                  "Create tab success", "==> DBInit[init token table]",
                  created("oauth_token", kToken), "Create tab success",
                  "==> DBInit[init grantCode table]", created("oauth_grantCode", kGrantCode),
                  "Create tab success", "==> DBInit[init log table]", created("oauth_log", kLog),
                  "Create tab success"));
}

TEST_F(SchemaTest, StartOnAnExistingFileAtEveryLevel) {
  construct();
  EXPECT_THAT(
      traced(15, construct),
      ElementsAre("==> DBInit[init meta table]", kMetaAsked, "==> IsTabExistCallback",
                  "##### [0][type = table]", "##### [1][name = oauth_meta]",
                  "##### [2][tbl_name = oauth_meta]", "##### [3][rootpage = 2]",
                  std::string("##### [4][sql = CREATE TABLE oauth_meta") + kMeta + "]",
                  "Tab[oauth_meta] is exist", "==> DBInit[init client table]",
                  created("oauth_clientInfo", kClientInfo), "Create tab success",
                  "==> DBInit[init token table]", created("oauth_token", kToken),
                  "Create tab success", "==> DBInit[init grantCode table]",
                  created("oauth_grantCode", kGrantCode), "Create tab success",
                  "==> DBInit[init log table]", created("oauth_log", kLog), "Create tab success"));
}

TEST_F(SchemaTest, LevelOneShowsTheLastThreeStepsAlone) {
  EXPECT_THAT(
      tracedLines(1, construct),
      ElementsAre(Line{kError, "==> %s[init token table]", "==> DBInit[init token table]"},
                  Line{kError, "==> %s[init grantCode table]", "==> DBInit[init grantCode table]"},
                  Line{kError, "==> %s[init log table]", "==> DBInit[init log table]"}));
}

TEST_F(SchemaTest, LevelEightShowsTheFirstTwoStepsAndTheStatements) {
  EXPECT_THAT(
      tracedLines(8, construct),
      ElementsAre(
          Line{kError, "==> %s[init meta table]", "==> DBInit[init meta table]"},
          Line{kError, "==> %s[%s]", kMetaAsked},
          Line{kError, "==> %s[%s]", created("oauth_meta", kMeta)}, plain("Create tab success"),
          Line{kError, "==> %s", "==> AddMetaData"},
          Line{kError, "==> %s[%s]", metaInserted("oauth_clientInfo")},
          Line{kError, "==> %s[%s]", metaInserted("oauth_grantCode")},
          Line{kError, "==> %s[%s]", metaInserted("oauth_token")},
          Line{kError, "==> %s[init client table]", "==> DBInit[init client table]"},
          Line{kError, "==> %s[%s]", created("oauth_clientInfo", kClientInfo)},
          plain("Create tab success"), Line{kError, "==> %s[%s]", created("oauth_token", kToken)},
          plain("Create tab success"),
          Line{kError, "==> %s[%s]", created("oauth_grantCode", kGrantCode)},
          plain("Create tab success"), Line{kError, "==> %s[%s]", created("oauth_log", kLog)},
          plain("Create tab success")));
}

TEST_F(SchemaTest, LevelTwoShowsTheMetaTableFoundAlone) {
  EXPECT_THAT(traced(2, construct), IsEmpty());
  EXPECT_EQ(traced(2, construct).size(), 5U);
}

TEST_F(SchemaTest, LevelFourShowsNothing) {
  EXPECT_THAT(traced(4, construct), IsEmpty());
}

TEST_F(SchemaTest, LevelNineShowsClassesOneAndEightOnly) {
  construct();
  EXPECT_THAT(
      traced(9, construct),
      ElementsAre("==> DBInit[init meta table]", kMetaAsked, "==> IsTabExistCallback",
                  "Tab[oauth_meta] is exist", "==> DBInit[init client table]",
                  created("oauth_clientInfo", kClientInfo), "Create tab success",
                  "==> DBInit[init token table]", created("oauth_token", kToken),
                  "Create tab success", "==> DBInit[init grantCode table]",
                  created("oauth_grantCode", kGrantCode), "Create tab success",
                  "==> DBInit[init log table]", created("oauth_log", kLog), "Create tab success"));
}

TEST_F(SchemaTest, NothingIsWrittenWithoutTheFlagFile) {
  writeSettings(R"({"log_level": 15})");
  inFreshThread(construct);
  inFreshThread(construct);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

// Start-up that fails ---------------------------------------------------------

struct BlockedTable {
  const char* name;
  const char* called;  // in the failure line
  std::size_t before;  // tables created before it
};

void PrintTo(const BlockedTable& table, std::ostream* out) {
  *out << table.name;
}

class BlockedTableTest : public SchemaTest, public ::testing::WithParamInterface<BlockedTable> {
 protected:
  void SetUp() override {
    SchemaTest::SetUp();
    blockTable(GetParam().name);
  }
};

TEST_P(BlockedTableTest, LeavesTheObjectNotReady) {
  OAUTHDBBasic store;
  expectError(store, -1, "Create table failed");
  SystemLog::clear();
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 0);
  EXPECT_THAT(lines(), ElementsAre(plain("DB is not ready!!")));
}

TEST_P(BlockedTableTest, IsLoggedBehindTheEnginesOwnLine) {
  construct();
  EXPECT_THAT(lines(), ElementsAre(runFailed(blocked(GetParam().name), 1),
                                   GetParam().called == std::string("meta")
                                       ? plain("Create Table failed!![meta]")
                                       : createFailed(GetParam().called)));
}

TEST_P(BlockedTableTest, EndsTheStartUp) {
  construct();
  Texts expected = {"other"};
  expected.insert(expected.end(), kAllTables, kAllTables + GetParam().before);
  EXPECT_EQ(tables(), expected);
}

TEST_P(BlockedTableTest, CanBeMendedAndTriedAgain) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBInit(), 0);
  sql(std::string("DROP INDEX ") + GetParam().name);
  EXPECT_EQ(store.DBInit(), 1);
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
  expectError(store, -1, "Create table failed");  // a success takes nothing back
}

const BlockedTable kBlockedTables[] = {
    {"oauth_meta", "meta", 0},         {"oauth_clientInfo", "oauth_clientInfo", 1},
    {"oauth_token", "oauth_token", 2}, {"oauth_grantCode", "oauth_grantCode", 3},
    {"oauth_log", "oauth_log", 4},
};

INSTANTIATE_TEST_SUITE_P(Core, BlockedTableTest, ::testing::ValuesIn(kBlockedTables),
                         support::CaseName());

TEST_F(SchemaTest, FailingStepIsTracedUpToItsEnd) {
  construct();
  sql("DROP TABLE oauth_grantCode");
  blockTable("oauth_grantCode");
  EXPECT_THAT(traced(1, construct),
              ElementsAre("==> DBInit[init token table]", "==> DBInit[init grantCode table]",
                          "Run Command failed!![" + blocked("oauth_grantCode") + "][1]",
                          "Create Table failed!![oauth_grantCode]"));
}

TEST_F(SchemaTest, FileThatIsNoDatabaseLeavesTheObjectNotReady) {
  writeFile(kDatabase, std::string(4096, 'x'));
  OAUTHDBBasic store;
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(lines(), ElementsAre(runFailed("file is not a database", 26),
                                   runFailed("file is not a database", 26),
                                   plain("Create Table failed!![meta]")));
  EXPECT_EQ(readFile(kDatabase), std::string(4096, 'x'));
}

TEST_F(SchemaTest, RefusedMetaRowsAreLoggedAndIgnored) {
  Engine::refuseExec("INSERT INTO oauth_meta", 13);
  OAUTHDBBasic store;
  Engine::release();
  const Line full = runFailed("database or disk is full", 13);
  const Line failed = plain("Add Meta failed");
  EXPECT_THAT(lines(), ElementsAre(full, failed, full, failed, full, failed));
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
  expectError(store, 13, "database or disk is full");
  EXPECT_THAT(tables(), ElementsAreArray(kAllTables));
}

// DBInit and AddMetaData by themselves ----------------------------------------

TEST_F(SchemaTest, InitOfAReadyObjectChangesNothing) {
  OAUTHDBBasic store;
  const std::string before = readFile(kDatabase);
  EXPECT_EQ(store.DBInit(), 1);
  EXPECT_EQ(readFile(kDatabase), before);
  expectNoError(store);
}

TEST_F(SchemaTest, MetaRowThatIsRefusedDoesNotStopTheOthers) {
  OAUTHDBBasic store;
  sql("DELETE FROM oauth_meta; CREATE TRIGGER refusal BEFORE INSERT ON oauth_meta "
      "WHEN NEW.tab_name='oauth_grantCode' BEGIN SELECT RAISE(ABORT, 'not this one'); END");
  store.AddMetaData();
  EXPECT_THAT(metaRows(), ElementsAre("oauth_clientInfo 2", "oauth_token 2"));
  EXPECT_THAT(lines(), ElementsAre(runFailed("not this one", 19), plain("Add Meta failed")));
}

// CreateDBTab and IsDBTabExist ------------------------------------------------

TEST_F(SchemaTest, CreatedTableIsThere) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.CreateDBTab("CREATE TABLE extra(a);"), 1);
  EXPECT_EQ(store.IsDBTabExist("extra"), 1);
  expectNoError(store);
}

TEST_F(SchemaTest, RefusedTableGivesTheCoresOwnError) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.CreateDBTab("CREATE TABLE oauth_log(a);"), 0);
  expectError(store, -1, "Create table failed");
  EXPECT_THAT(lines(), ElementsAre(runFailed("table oauth_log already exists", 1)));
}

TEST_F(SchemaTest, CreationIsTraced) {
  OAUTHDBBasic store;
  EXPECT_THAT(traced(15, [&] { store.CreateDBTab("CREATE TABLE extra(a);"); }),
              ElementsAre("==> DBCmdRun[CREATE TABLE extra(a);]", "Create tab success"));
  EXPECT_THAT(traced(7, [&] { store.CreateDBTab("CREATE TABLE more(a);"); }), IsEmpty());
}

TEST_F(SchemaTest, ExistenceIsThatOfATable) {
  OAUTHDBBasic store;
  sql("CREATE INDEX an_index ON oauth_log(msg); CREATE VIEW a_view AS SELECT 1");
  EXPECT_EQ(store.IsDBTabExist("oauth_log"), 1);
  for (const char* name : {"an_index", "a_view", "nowhere", "OAUTH_LOG", "oauth", ""}) {
    EXPECT_EQ(store.IsDBTabExist(name), 0) << name;
  }
  expectNoError(store);
}

TEST_F(SchemaTest, ExistenceIsTracedWhenThereIs) {
  OAUTHDBBasic store;
  EXPECT_THAT(tracedLines(8, [&] { store.IsDBTabExist("oauth_log"); }),
              ElementsAre(::testing::_, Line{kError, "==> %s", "==> IsTabExistCallback"},
                          Line{kError, "Tab[%s] is exist", "Tab[oauth_log] is exist"}));
  EXPECT_THAT(traced(8, [&] { store.IsDBTabExist("nowhere"); }),
              ElementsAre("==> DBCmdRun[SELECT * FROM sqlite_master WHERE name='nowhere' "
                          "and type='table';]"));
  EXPECT_THAT(traced(1 + 4, [&] { store.IsDBTabExist("oauth_log"); }), IsEmpty());
}

TEST_F(SchemaTest, FailedQuestionReadsAsNoTable) {
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
