#include <filesystem>
#include <iterator>

#include "tests/core/core_test.h"
#include "tests/support/case_name.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
namespace fs = std::filesystem;

constexpr int kCannotOpen = 14;

class ConnectionTest : public CoreTest {};

TEST_F(ConnectionTest, DatabaseLiesAtItsDocumentedPath) {
  const OAUTHDBBasic store;
  EXPECT_TRUE(fs::is_regular_file("/var/packages/Corvane/target/etc/oauth.db"));
}

// Settings of the connection --------------------------------------------------

struct Pragma {
  const char* name;
  const char* value;
};

void PrintTo(const Pragma& pragma, std::ostream* out) {
  *out << pragma.name;
}

class PragmaTest : public ConnectionTest, public ::testing::WithParamInterface<Pragma> {};

TEST_P(PragmaTest, IsAsTheEngineHasItButForTheFoldersSync) {
  OAUTHDBBasic store;
  Json::Value rows(Json::arrayValue);
  ASSERT_EQ(
      store.DBCmd(std::string("PRAGMA ") + GetParam().name, OAUTHDBBasic::TabCountCallback, &rows),
      1);
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0], GetParam().value);
}

const Pragma kPragmas[] = {
    {"journal_mode", "delete"}, {"synchronous", "3"}, {"locking_mode", "normal"},
    {"foreign_keys", "0"},      {"auto_vacuum", "0"}, {"encoding", "UTF-8"},
    {"temp_store", "0"},        {"query_only", "0"},  {"cache_size", "-2000"},
};

INSTANTIATE_TEST_SUITE_P(Core, PragmaTest, ::testing::ValuesIn(kPragmas), support::CaseName());

// Life ------------------------------------------------------------------------

TEST_F(ConnectionTest, EveryObjectHoldsOneConnectionForItsLife) {
  {
    OAUTHDBBasic one;
    OAUTHDBBasic other;
    EXPECT_EQ(Engine::opened(), 2);
    one.DBCmd("SELECT 1", nullptr, nullptr);
    one.DBInit();
    EXPECT_EQ(Engine::opened(), 2);
    EXPECT_EQ(Engine::closed(), 0);
  }
  EXPECT_EQ(Engine::closed(), 2);
}

TEST_F(ConnectionTest, NoDescriptorIsLeftOpen) {
  const auto descriptors = [] {
    return std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator());
  };
  const auto before = descriptors();
  { OAUTHDBBasic store; }
  EXPECT_EQ(descriptors(), before);
  fs::remove(kDatabase);
  fs::create_directory(kDatabase);
  { OAUTHDBBasic store; }
  EXPECT_EQ(descriptors(), before);
}

TEST_F(ConnectionTest, ObjectsSeeEachOthersRows) {
  OAUTHDBBasic writer;
  Table reader("oauth_log");
  writer.DBCmd("INSERT INTO oauth_log VALUES(1, 'a', 1)", nullptr, nullptr);
  Json::Value counts;
  EXPECT_EQ(reader.DBGetRowCount(counts), 1);
  EXPECT_EQ(counts, json("['1']"));
}

TEST_F(ConnectionTest, UnfinishedTransactionGoesWithItsObject) {
  {
    OAUTHDBBasic store;
    store.DBCmd("BEGIN; INSERT INTO oauth_log VALUES(1, 'a', 1)", nullptr, nullptr);
  }
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log"), "0");
}

TEST_F(ConnectionTest, CloseIsSilent) {
  std::optional<OAUTHDBBasic> store(std::in_place);
  EXPECT_THAT(traced(-1, [&] { store.reset(); }), IsEmpty());
}

TEST_F(ConnectionTest, CloseThatFailsIsLogged) {
  {
    OAUTHDBBasic store;
    Engine::answerClose(5);
  }
  EXPECT_THAT(lines(), ElementsAre(Line{kError, "Close DB failed!![%d]", "Close DB failed!![5]"}));
}

// Failed open -----------------------------------------------------------------

class FailedOpenTest : public ConnectionTest {
 protected:
  void SetUp() override {
    ConnectionTest::SetUp();
    fs::create_directory(kDatabase);
    store.emplace("oauth_log");
    openLines = lines();
    closedAtOnce = Engine::closed();
    SystemLog::clear();
  }

  void expectOpenError() const { expectError(*store, kCannotOpen, "Open DB failed!!"); }

  std::optional<Table> store;
  std::vector<Line> openLines;
  int closedAtOnce = 0;
};

TEST_F(FailedOpenTest, EnginesCodeIsKeptAndLogged) {
  expectOpenError();
  EXPECT_THAT(openLines, ElementsAre(Line{kError, "Open DB failed!![%d]", "Open DB failed!![14]"}));
}

TEST_F(FailedOpenTest, NothingElseIsWrittenAtAnyLevel) {
  EXPECT_THAT(traced(-1, [] { const OAUTHDBBasic other; }), ElementsAre("Open DB failed!![14]"));
}

TEST_F(FailedOpenTest, NoStatementRuns) {
  std::vector<std::string> ran;
  Engine::onExec([&](const std::string& sql) { ran.push_back(sql); });
  const OAUTHDBBasic other;
  EXPECT_THAT(ran, IsEmpty());
}

TEST_F(FailedOpenTest, HandleIsClosedAtOnceAndOnlyThen) {
  EXPECT_EQ(closedAtOnce, 1);
  store.reset();
  EXPECT_EQ(Engine::closed(), 1);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(FailedOpenTest, InitDoesNothing) {
  EXPECT_THAT(traced(-1, [&] { EXPECT_EQ(store->DBInit(), 0); }), IsEmpty());
  expectOpenError();
}

TEST_F(FailedOpenTest, ThereIsNoReopen) {
  fs::remove(kDatabase);
  EXPECT_EQ(store->DBInit(), 0);
  EXPECT_EQ(store->DBCmd("SELECT 1", nullptr, nullptr), 0);
  EXPECT_EQ(Engine::opened(), 1);
  EXPECT_FALSE(fs::exists(kDatabase));
}

TEST_F(FailedOpenTest, CommandIsRefused) {
  EXPECT_EQ(store->DBCmd("SELECT 1", nullptr, nullptr), 0);
  expectOpenError();
  EXPECT_THAT(lines(), ElementsAre(plain("DB is not ready!!")));
}

TEST_F(FailedOpenTest, RowOperationsAreRefused) {
  Json::Value row = json("{'msg': 'a'}");
  EXPECT_FALSE(store->DBAdd(row));
  Json::Value request = json("{'modified': {'msg': 'a'}}");
  EXPECT_FALSE(store->DBEdit(request));
  EXPECT_FALSE(store->DBDel(request));
  expectOpenError();
  EXPECT_THAT(messages(), ElementsAre("DB is not ready!!", "Add failed[oauth_log]",
                                      "DB is not ready!!", "Edit failed[oauth_log]",
                                      "DB is not ready!!", "Delete failed[oauth_log]"));
}

TEST_F(FailedOpenTest, ReadingIsRefusedWithAnEmptyResult) {
  Json::Value request;
  Json::Value rows = json("['old']");
  EXPECT_FALSE(store->DBGet(request, &rows));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
  expectOpenError();
  EXPECT_THAT(messages(), ElementsAre("DB is not ready!!", "Get failed[oauth_log]"));
}

TEST_F(FailedOpenTest, CountingIsRefused) {
  EXPECT_EQ(store->DBCheckRowMax(100), 0);
  expectOpenError();
  EXPECT_THAT(messages(), ElementsAre("DB is not ready!!", "Get Row Count failed[oauth_log]",
                                      "Check Row Max failed[oauth_log]"));
}

TEST_F(FailedOpenTest, DropGetsTheEnginesStandingText) {
  EXPECT_EQ(store->DBDrop(), 0);
  expectError(*store, 21, "bad parameter or other API misuse");
  EXPECT_THAT(lines(), ElementsAre(runFailed("bad parameter or other API misuse", 21)));
}

TEST_F(FailedOpenTest, DropIsTracedAsAFailure) {
  EXPECT_THAT(traced(9, [&] { store->DBDrop(); }),
              ElementsAre("==> DBDrop", "==> DBCmdRun[DROP TABLE IF EXISTS oauth_log;]",
                          "Run Command failed!![bad parameter or other API misuse][21]",
                          "Drop [oauth_log] failed"));
}

TEST_F(FailedOpenTest, CreationAndMetaRowsFailOneByOne) {
  EXPECT_EQ(store->CreateDBTab("CREATE TABLE a(b);"), 0);
  expectError(*store, -1, "Create table failed");
  EXPECT_EQ(store->IsDBTabExist("oauth_log"), 0);
  expectError(*store, 21, "bad parameter or other API misuse");
  SystemLog::clear();
  store->AddMetaData();
  EXPECT_EQ(SystemLog::count("Add Meta failed"), 3);
}

TEST_F(ConnectionTest, MissingFolderFailsTheOpenAndCreatesNothing) {
  hideFolder();
  const OAUTHDBBasic store;
  expectError(store, kCannotOpen, "Open DB failed!!");
  EXPECT_THAT(messages(), ElementsAre("Open DB failed!![14]"));
  EXPECT_FALSE(fs::exists("/var/packages/Corvane/target"));
}

}  // namespace
