// How far every connection goes to keep what it has acknowledged.

#include "tests/core/core_test.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kStatement[] = "PRAGMA synchronous";
constexpr int kIoError = 10;

// As SQLite numbers them.
constexpr char kOff[] = "0";
constexpr char kNormal[] = "1";
constexpr char kExtra[] = "3";

class DurabilityTest : public CoreTest {
 protected:
  /// The setting that is in force on the connection of `store`.
  static std::string settingOf(OAUTHDBBasic& store) {
    Json::Value rows(Json::arrayValue);
    EXPECT_EQ(store.DBCmd(kStatement, OAUTHDBBasic::TabCountCallback, &rows), 1);
    return rows[0].asString();
  }

  static void run(OAUTHDBBasic& store, const std::string& sql) {
    EXPECT_EQ(store.DBCmd(sql, nullptr, nullptr), 1);
  }

  static void refuse() { Engine::refuseExec(kStatement, kIoError); }
};

TEST_F(DurabilityTest, FolderIsSyncedFromTheFirstObjectOn) {
  OAUTHDBBasic first;
  EXPECT_EQ(settingOf(first), kExtra);
  OAUTHDBBasic second;
  EXPECT_EQ(settingOf(second), kExtra);
  EXPECT_EQ(settingOf(first), kExtra);
}

TEST_F(DurabilityTest, SettingComesBeforeEveryOtherStatement) {
  std::vector<std::string> ran;
  Engine::onExec([&](const std::string& sql) { ran.push_back(sql); });
  const OAUTHDBBasic store;
  ASSERT_FALSE(ran.empty());
  EXPECT_EQ(ran.front(), "PRAGMA synchronous=EXTRA;");
}

TEST_F(DurabilityTest, SettingLeavesNoTrace) {
  { const OAUTHDBBasic store; }
  for (const std::string& message : traced(-1, [] { const OAUTHDBBasic store; })) {
    EXPECT_THAT(message, ::testing::Not(::testing::HasSubstr("PRAGMA")));
  }
}

TEST_F(DurabilityTest, LaterInitSetsItAgain) {
  OAUTHDBBasic store;
  run(store, "PRAGMA synchronous=OFF");
  ASSERT_EQ(settingOf(store), kOff);
  EXPECT_EQ(store.DBInit(), 1);
  EXPECT_EQ(settingOf(store), kExtra);
}

TEST_F(DurabilityTest, InitWithinATransactionKeepsTheSettingThatStands) {
  OAUTHDBBasic store;
  run(store, "PRAGMA synchronous=NORMAL; BEGIN; INSERT INTO oauth_log VALUES(1, 'a', 1)");
  EXPECT_EQ(store.DBInit(), 1);
  EXPECT_EQ(settingOf(store), kNormal);
  expectNoError(store);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());

  run(store, "COMMIT");
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "a");
  EXPECT_EQ(store.DBInit(), 1);
  EXPECT_EQ(settingOf(store), kExtra);
}

// Where it is refused ---------------------------------------------------------

TEST_F(DurabilityTest, RefusalLeavesTheEnginesCodeAndText) {
  refuse();
  const OAUTHDBBasic store;
  expectError(store, kIoError, "disk I/O error");
  EXPECT_THAT(lines(), ElementsAre(runFailed("disk I/O error", kIoError)));
}

TEST_F(DurabilityTest, RefusalLeavesTheObjectNotReady) {
  refuse();
  OAUTHDBBasic store;
  Engine::release();
  SystemLog::clear();
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 0);
  EXPECT_THAT(lines(), ElementsAre(plain("DB is not ready!!")));
}

TEST_F(DurabilityTest, RefusalEndsTheStartUpBeforeItsFirstTrace) {
  refuse();
  EXPECT_THAT(traced(-1, [] { const OAUTHDBBasic store; }),
              ElementsAre("Run Command failed!![disk I/O error][10]"));
  Engine::release();
  EXPECT_EQ(sqlText("SELECT count(*) FROM sqlite_master"), "0");
}

TEST_F(DurabilityTest, RefusalOfALaterInitTakesReadinessAway) {
  OAUTHDBBasic store;
  refuse();
  EXPECT_EQ(store.DBInit(), 0);
  Engine::release();
  expectError(store, kIoError, "disk I/O error");
  EXPECT_EQ(store.DBCmd("SELECT 1", nullptr, nullptr), 0);
}

TEST_F(DurabilityTest, RefusedInitCanBeTriedAgain) {
  refuse();
  OAUTHDBBasic store;
  Engine::release();
  EXPECT_EQ(store.DBInit(), 1);
  EXPECT_EQ(settingOf(store), kExtra);
}

}  // namespace
