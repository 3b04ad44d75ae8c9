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
  expectError(store, 26, "file is not a database");
  EXPECT_THAT(lines(), ElementsAre(runFailed("file is not a database", 26)));
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

}  // namespace
