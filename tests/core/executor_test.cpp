#include <type_traits>

#include "tests/core/core_test.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

static_assert(!std::is_polymorphic_v<OAUTHDBBasic>);
static_assert(!std::is_copy_constructible_v<OAUTHDBBasic>);
static_assert(!std::is_copy_assignable_v<OAUTHDBBasic>);
static_assert(!std::is_move_constructible_v<OAUTHDBBasic>);
static_assert(!std::is_move_assignable_v<OAUTHDBBasic>);

using ExecutorTest = CoreTest;

// The last error and the table ------------------------------------------------

TEST_F(ExecutorTest, FreshObjectHasFailedNothing) {
  const OAUTHDBBasic store;
  expectNoError(store);
  EXPECT_EQ(store.GetTabName(), "");
}

TEST_F(ExecutorTest, ErrorIsWhatWasSet) {
  OAUTHDBBasic store;
  store.SetErrCode(-2147483647);
  store.SetErrMsg("it's %s");
  expectError(store, -2147483647, "it's %s");
}

TEST_F(ExecutorTest, MessageAndTableNameAreTakenByCopy) {
  OAUTHDBBasic store;
  std::string text = "first";
  store.SetErrMsg(text);
  store.SetTabName(text);
  text = "second";
  store.GetErrMsg() += "third";
  EXPECT_EQ(store.GetErrMsg(), "first");
  EXPECT_EQ(store.GetTabName(), "first");
}

TEST_F(ExecutorTest, AccessorsWriteNothing) {
  OAUTHDBBasic store;
  EXPECT_THAT(traced(-1,
                     [&] {
                       store.SetErrCode(1);
                       store.SetErrMsg("m");
                       store.SetTabName("t");
                       store.GetErrCode();
                       store.GetErrMsg();
                       store.GetTabName();
                     }),
              IsEmpty());
}

TEST_F(ExecutorTest, ErrorsOfTwoObjectsAreApart) {
  OAUTHDBBasic one;
  OAUTHDBBasic other;
  one.DBCmd("nonsense", nullptr, nullptr);
  EXPECT_EQ(one.GetErrCode(), 1);
  expectNoError(other);
}

// DBCmd -----------------------------------------------------------------------

TEST_F(ExecutorTest, StatementThatSucceedsGivesOneAndLeavesTheError) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("INSERT INTO oauth_log VALUES(1, 'm', 1)", nullptr, nullptr), 1);
  expectNoError(store);
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "m");

  store.SetErrCode(-2);
  store.SetErrMsg("Bad parameters");
  EXPECT_EQ(store.DBCmd("DELETE FROM oauth_log", nullptr, nullptr), 1);
  expectError(store, -2, "Bad parameters");
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(ExecutorTest, EveryStatementOfTheTextRuns) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("INSERT INTO oauth_log VALUES(1, 'a', 1);"
                        "INSERT INTO oauth_log VALUES(2, 'b', 2);",
                        nullptr, nullptr),
            1);
  EXPECT_EQ(sqlText("SELECT group_concat(msg) FROM oauth_log"), "a,b");
}

TEST_F(ExecutorTest, TextWithoutStatementSucceeds) {
  OAUTHDBBasic store;
  for (const char* text : {"", " \n", ";", "-- nothing"}) {
    EXPECT_EQ(store.DBCmd(text, nullptr, nullptr), 1) << text;
  }
  expectNoError(store);
}

TEST_F(ExecutorTest, TextEndsAtTheFirstNul) {
  OAUTHDBBasic store;
  const std::string text("INSERT INTO oauth_log VALUES(1, 'a', 1);\0nonsense", 49);
  EXPECT_EQ(store.DBCmd(text, nullptr, nullptr), 1);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log"), "1");
}

TEST_F(ExecutorTest, SyntaxErrorIsKeptAndLogged) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("SELEKT 1", nullptr, nullptr), 0);
  expectError(store, 1, "near \"SELEKT\": syntax error");
  EXPECT_THAT(lines(), ElementsAre(runFailed("near \"SELEKT\": syntax error", 1)));
}

TEST_F(ExecutorTest, MissingTableIsKeptAndLogged) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("SELECT * FROM nowhere", nullptr, nullptr), 0);
  expectError(store, 1, "no such table: nowhere");
  EXPECT_THAT(lines(), ElementsAre(runFailed("no such table: nowhere", 1)));
}

TEST_F(ExecutorTest, ViolatedConstraintIsKeptAndLogged) {
  OAUTHDBBasic store;
  const std::string text = "NOT NULL constraint failed: oauth_log.msg";
  EXPECT_EQ(store.DBCmd("INSERT INTO oauth_log(timestamp) VALUES(1)", nullptr, nullptr), 0);
  expectError(store, 19, text);
  EXPECT_THAT(lines(), ElementsAre(runFailed(text, 19)));
}

TEST_F(ExecutorTest, StatementsBeforeTheFailingOneStand) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("INSERT INTO oauth_log VALUES(1, 'a', 1); SELEKT; DELETE FROM oauth_log",
                        nullptr, nullptr),
            0);
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "a");
}

TEST_F(ExecutorTest, LaterFailureReplacesTheEarlierOne) {
  OAUTHDBBasic store;
  store.DBCmd("SELEKT", nullptr, nullptr);
  store.DBCmd("SELECT * FROM nowhere", nullptr, nullptr);
  expectError(store, 1, "no such table: nowhere");
}

TEST_F(ExecutorTest, FailureWithoutSqlitesTextGetsItsStandingText) {
  OAUTHDBBasic store;
  Engine::refuseExec("SELECT", 7);
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 0);
  expectError(store, 7, "out of memory");
  EXPECT_THAT(lines(), ElementsAre(runFailed("out of memory", 7)));
}

TEST_F(ExecutorTest, LongTextIsNeitherFormatNorCut) {
  OAUTHDBBasic store;
  const std::string name = "%s%n" + std::string(100000, 'x');
  EXPECT_EQ(store.DBCmd("SELECT \"" + name + "\".a", nullptr, nullptr), 0);
  EXPECT_EQ(store.GetErrMsg(), "no such column: " + name + ".a");
  EXPECT_THAT(lines(), ElementsAre(runFailed("no such column: " + name + ".a", 1)));
}

// Callbacks -------------------------------------------------------------------

int joinRow(void* arg, int count, char** values, char** columns) {
  auto& seen = *static_cast<Json::Value*>(arg);
  std::string row;
  for (int i = 0; i < count; ++i) {
    row += std::string(columns[i]) + "=" + (values[i] != nullptr ? values[i] : "<NULL>") + ";";
  }
  seen.append(row);
  return 0;
}

int refuseRow(void* arg, int /*count*/, char** /*values*/, char** /*columns*/) {
  static_cast<Json::Value*>(arg)->append("refused");
  return 1;
}

int throwInt(void* /*arg*/, int /*count*/, char** /*values*/, char** /*columns*/) {
  throw 1;
}

TEST_F(ExecutorTest, CallbackGetsEveryRowWithTheArgument) {
  OAUTHDBBasic store;
  Json::Value seen;
  EXPECT_EQ(store.DBCmd("SELECT 1 AS a, NULL AS b UNION ALL SELECT 'x', 2.5", joinRow, &seen), 1);
  EXPECT_EQ(seen, json("['a=1;b=<NULL>;', 'a=x;b=2.5;']"));
}

TEST_F(ExecutorTest, RowsWithoutCallbackAreDropped) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 1);
  expectNoError(store);
}

TEST_F(ExecutorTest, CallbackThatRefusesARowEndsTheStatement) {
  OAUTHDBBasic store;
  Json::Value seen;
  EXPECT_EQ(store.DBCmd("SELECT 1 UNION SELECT 2", refuseRow, &seen), 0);
  EXPECT_EQ(seen.size(), 1U);
  expectError(store, 4, "query aborted");
  EXPECT_THAT(lines(), ElementsAre(runFailed("query aborted", 4)));
}

TEST_F(ExecutorTest, CallbackThatThrowsFailsTheStatement) {
  OAUTHDBBasic store;
  EXPECT_EQ(store.DBCmd("SELECT 1", throwInt, nullptr), 0);
  expectError(store, 7, "out of memory");
  EXPECT_THAT(lines(),
              ElementsAre(Line{kError, "Unexpected failure[%s]", "Unexpected failure[unknown]"}));
}

TEST_F(ExecutorTest, ConnectionWorksOnAfterAThrowingCallback) {
  OAUTHDBBasic store;
  store.DBCmd("INSERT INTO oauth_log VALUES(1, 'a', 1) RETURNING id", throwInt, nullptr);
  EXPECT_EQ(store.DBCmd("INSERT INTO oauth_log VALUES(2, 'b', 2)", nullptr, nullptr), 1);
  sql("INSERT INTO oauth_log VALUES(3, 'c', 3)");  // no lock was left behind
}

// Not ready -------------------------------------------------------------------

class NotReadyTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    blockTable("oauth_log");
    store.emplace("oauth_token");
    SystemLog::clear();
  }

  std::optional<Table> store;
};

TEST_F(NotReadyTest, CommandIsRefusedAndLeavesTheError) {
  EXPECT_EQ(store->DBCmd("SELECT 1", nullptr, nullptr), 0);
  expectError(*store, -1, "Create table failed");
  EXPECT_THAT(lines(), ElementsAre(plain("DB is not ready!!")));
}

TEST_F(NotReadyTest, RefusedCommandDoesNotRun) {
  store->DBCmd("INSERT INTO oauth_meta VALUES('x', 1)", nullptr, nullptr);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_meta WHERE tab_name='x'"), "0");
}

TEST_F(NotReadyTest, RefusalIsTracedAsADBCmdThatRanNothing) {
  EXPECT_THAT(traced(15, [&] { store->DBCmd("SELECT 1", nullptr, nullptr); }),
              ElementsAre("==> DBCmd", "DB is not ready!!"));
}

TEST_F(NotReadyTest, DBCmdRunDoesNotAskForReadiness) {
  EXPECT_EQ(store->DBCmdRun("INSERT INTO oauth_meta VALUES('x', 1)", nullptr, nullptr), 1);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_meta WHERE tab_name='x'"), "1");
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(NotReadyTest, DBCmdRunKeepsItsOwnFailure) {
  EXPECT_EQ(store->DBCmdRun("SELEKT", nullptr, nullptr), 0);
  expectError(*store, 1, "near \"SELEKT\": syntax error");
}

// Traces ----------------------------------------------------------------------

TEST_F(ExecutorTest, StatementIsTracedInFull) {
  OAUTHDBBasic store;
  const std::string text =
      "SELECT strftime('%s','now'), '%n' /* " + std::string(1 << 20, 'x') + " */";
  EXPECT_THAT(tracedLines(8, [&] { store.DBCmd(text, nullptr, nullptr); }),
              ElementsAre(Line{kError, "==> %s", "==> DBCmd"},
                          Line{kError, "==> %s[%s]", "==> DBCmdRun[" + text + "]"}));
}

TEST_F(ExecutorTest, DBCmdRunTracesItselfAlone) {
  OAUTHDBBasic store;
  EXPECT_THAT(traced(8, [&] { store.DBCmdRun("SELECT 1", nullptr, nullptr); }),
              ElementsAre("==> DBCmdRun[SELECT 1]"));
}

TEST_F(ExecutorTest, FailureFollowsTheTraceOfItsStatement) {
  OAUTHDBBasic store;
  EXPECT_THAT(traced(8, [&] { store.DBCmd("SELEKT", nullptr, nullptr); }),
              ElementsAre("==> DBCmd", "==> DBCmdRun[SELEKT]",
                          "Run Command failed!![near \"SELEKT\": syntax error][1]"));
}

TEST_F(ExecutorTest, NothingIsTracedAtOtherLevels) {
  OAUTHDBBasic store;
  EXPECT_THAT(traced(1 + 2 + 4, [&] { store.DBCmd("SELECT 1", nullptr, nullptr); }), IsEmpty());
}

TEST_F(ExecutorTest, NothingIsTracedWithoutTheFlagFile) {
  OAUTHDBBasic store;
  writeSettings(R"({"log_level": 15})");
  inFreshThread([&] { store.DBCmd("SELECT 1", nullptr, nullptr); });
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

// Row callbacks ---------------------------------------------------------------

/// A row as SQLite hands it over.
struct RawRow {
  std::vector<char*> values;
  std::vector<char*> columns;

  void add(const char* column, const char* value) {
    columns.push_back(const_cast<char*>(column));
    values.push_back(const_cast<char*>(value));
  }
  int pass(OAUTHDBBasic::RowCallback callback, Json::Value& arg) {
    return callback(&arg, static_cast<int>(values.size()), values.data(), columns.data());
  }
};

class RowCallbackTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    row.add("id", "7");
    row.add("msg", "it's %s");
    row.add("ip", nullptr);
  }

  RawRow row;
};

TEST_F(RowCallbackTest, CountTakesTheFirstColumnAsText) {
  Json::Value counts = json("['1']");
  EXPECT_EQ(row.pass(OAUTHDBBasic::TabCountCallback, counts), 0);
  EXPECT_EQ(counts, json("['1', '7']"));
}

TEST_F(RowCallbackTest, CountReadsNullAsEmptyText) {
  RawRow null;
  null.add("COUNT(*)", nullptr);
  Json::Value counts(Json::arrayValue);
  EXPECT_EQ(null.pass(OAUTHDBBasic::TabCountCallback, counts), 0);
  EXPECT_EQ(counts, json("['']"));
}

TEST_F(RowCallbackTest, CountDumpsNoColumns) {
  Json::Value counts(Json::arrayValue);
  EXPECT_THAT(traced(15, [&] { row.pass(OAUTHDBBasic::TabCountCallback, counts); }),
              ElementsAre("==> TabCountCallback"));
  EXPECT_THAT(traced(7, [&] { row.pass(OAUTHDBBasic::TabCountCallback, counts); }), IsEmpty());
}

TEST_F(RowCallbackTest, ExistenceIsMarkedBesideOtherMembers) {
  Json::Value found = json("{'exist': false, 'other': 1}");
  EXPECT_EQ(row.pass(OAUTHDBBasic::IsTabExistCallback, found), 0);
  EXPECT_EQ(found, json("{'exist': true, 'other': 1}"));
}

TEST_F(RowCallbackTest, ExistenceIsTracedThenDumped) {
  Json::Value found;
  EXPECT_THAT(tracedLines(2 + 8, [&] { row.pass(OAUTHDBBasic::IsTabExistCallback, found); }),
              ElementsAre(Line{kError, "==> %s", "==> IsTabExistCallback"},
                          Line{kError, "##### [%d][%s = %s]", "##### [0][id = 7]"},
                          Line{kError, "##### [%d][%s = %s]", "##### [1][msg = it's %s]"},
                          Line{kError, "##### [%d][%s = %s]", "##### [2][ip = ]"}));
}

TEST_F(RowCallbackTest, ExistenceDumpHasAMaskOfItsOwn) {
  Json::Value found;
  const auto pass = [&] { row.pass(OAUTHDBBasic::IsTabExistCallback, found); };
  EXPECT_THAT(traced(8 + 4 + 1, pass), ElementsAre("==> IsTabExistCallback"));
  EXPECT_THAT(traced(2, pass),
              ElementsAre("##### [0][id = 7]", "##### [1][msg = it's %s]", "##### [2][ip = ]"));
}

TEST_F(RowCallbackTest, RowIsAppendedAsTexts) {
  Json::Value rows = json("[{'before': '1'}]");
  EXPECT_EQ(row.pass(OAUTHDBBasic::TabGetCallback, rows), 0);
  ASSERT_EQ(rows.size(), 2U);
  Json::Value expected;
  expected["id"] = "7";
  expected["msg"] = "it's %s";
  expected["ip"] = "";
  EXPECT_EQ(rows[1], expected);
}

TEST_F(RowCallbackTest, RowIsTracedThenDumped) {
  Json::Value rows(Json::arrayValue);
  EXPECT_THAT(tracedLines(15, [&] { row.pass(OAUTHDBBasic::TabGetCallback, rows); }),
              ElementsAre(Line{kError, "==> %s", "==> TabGetCallback"},
                          Line{kError, "##### [%d][%s = %s]", "##### [0][id = 7]"},
                          Line{kError, "##### [%d][%s = %s]", "##### [1][msg = it's %s]"},
                          Line{kError, "##### [%d][%s = %s]", "##### [2][ip = ]"}));
}

TEST_F(RowCallbackTest, RowDumpHasAMaskOfItsOwn) {
  Json::Value rows(Json::arrayValue);
  const auto pass = [&] { row.pass(OAUTHDBBasic::TabGetCallback, rows); };
  EXPECT_THAT(traced(8, pass), ElementsAre("==> TabGetCallback"));
  EXPECT_THAT(traced(2, pass),
              ElementsAre("##### [0][id = 7]", "##### [1][msg = it's %s]", "##### [2][ip = ]"));
  EXPECT_THAT(traced(1 + 4, pass), IsEmpty());
}

TEST_F(RowCallbackTest, RowDumpShowsCiphertext) {
  RawRow secret;
  secret.add("client_id", "<abc>");
  Json::Value rows(Json::arrayValue);
  EXPECT_THAT(traced(2, [&] { secret.pass(OAUTHDBBasic::TabGetCallback, rows); }),
              ElementsAre("##### [0][client_id = <abc>]"));
  EXPECT_EQ(rows, json("[{'client_id': 'abc'}]"));
}

}  // namespace
