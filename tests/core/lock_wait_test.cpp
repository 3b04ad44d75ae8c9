#include <sqlite3.h>

#include <chrono>

#include "tests/core/core_test.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr int kLocked = 5;
constexpr long long kMillisecond = 1000000;
constexpr long long kLimit = 5000 * kMillisecond;

/// Another process's connection with a lock on the database.
class Holder {
 public:
  explicit Holder(const char* path) { EXPECT_EQ(sqlite3_open(path, &db_), SQLITE_OK); }
  ~Holder() { sqlite3_close(db_); }
  Holder(const Holder&) = delete;
  Holder& operator=(const Holder&) = delete;

  void run(const char* sql) { EXPECT_EQ(sqlite3_exec(db_, sql, nullptr, nullptr, nullptr), 0); }

 private:
  sqlite3* db_ = nullptr;
};

class LockWaitTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    store.emplace("oauth_log");
    holder.emplace(kDatabase);
  }
  void TearDown() override {
    holder.reset();
    CoreTest::TearDown();
  }

  /// Naps take no time and change nothing.
  static void waitInVain() {
    Waiting::onNap([](int /*nth*/) {});
  }

  int insert() {
    return store->DBCmd("INSERT INTO oauth_log VALUES(1, 'a', NULL)", nullptr, nullptr);
  }

  std::optional<Table> store;
  std::optional<Holder> holder;
};

TEST_F(LockWaitTest, WriterWaitsUntilAnotherWriterIsDone) {
  holder->run("BEGIN IMMEDIATE");
  Waiting::onNap([&](int nth) {
    if (nth == 300) holder->run("COMMIT");
  });
  EXPECT_EQ(insert(), 1);
  EXPECT_EQ(Waiting::naps(), 300);
  expectNoError(*store);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(LockWaitTest, ReaderWaitsUntilAWriterIsDone) {
  holder->run("BEGIN EXCLUSIVE; INSERT INTO oauth_log VALUES(1, 'b', NULL)");
  Waiting::onNap([&](int nth) {
    if (nth == 7) holder->run("COMMIT");
  });
  Json::Value counts;
  EXPECT_EQ(store->DBGetRowCount(counts), 1);
  EXPECT_EQ(counts, json("['1']"));
}

TEST_F(LockWaitTest, StartUpWaitsToo) {
  holder->run("BEGIN EXCLUSIVE");
  Waiting::onNap([&](int nth) {
    if (nth == 7) holder->run("COMMIT");
  });
  OAUTHDBBasic other;
  EXPECT_EQ(Waiting::naps(), 7);
  Json::Value setting(Json::arrayValue);
  EXPECT_EQ(other.DBCmd("PRAGMA synchronous", OAUTHDBBasic::TabCountCallback, &setting), 1);
  EXPECT_EQ(setting, json("['3']"));
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(LockWaitTest, StartUpThatWaitsInVainIsNotReady) {
  holder->run("BEGIN EXCLUSIVE");
  waitInVain();
  OAUTHDBBasic other;
  EXPECT_EQ(Waiting::napped(), kLimit);
  expectError(other, kLocked, "database is locked");
  EXPECT_THAT(lines(), ElementsAre(runFailed("database is locked", kLocked)));
  holder->run("COMMIT");
  EXPECT_EQ(other.DBCmd("SELECT 1", nullptr, nullptr), 0);
}

TEST_F(LockWaitTest, WaitGoesInEvenStepsOfAMillisecond) {
  holder->run("BEGIN IMMEDIATE");
  long long before = 0;
  Waiting::onNap([&](int /*nth*/) {
    EXPECT_EQ(Waiting::napped() - before, kMillisecond);
    before = Waiting::napped();
  });
  EXPECT_EQ(insert(), 0);
}

TEST_F(LockWaitTest, EveryStatementWaitsFiveSecondsOfItsOwn) {
  holder->run("BEGIN IMMEDIATE");
  waitInVain();
  for (int statement = 1; statement <= 2; ++statement) {
    const long long before = Waiting::napped();
    EXPECT_EQ(insert(), 0);
    EXPECT_EQ(Waiting::napped() - before, kLimit);
  }
}

TEST_F(LockWaitTest, WallClockThatJumpsDoesNotEndTheWait) {
  holder->run("BEGIN IMMEDIATE");
  Waiting::onNap([&](int nth) {
    support::Clock::advance(nth % 2 == 0 ? 1000000 : -2000000);
    if (nth == 100) holder->run("COMMIT");
  });
  EXPECT_EQ(insert(), 1);
}

TEST_F(LockWaitTest, ObjectWorksOnAfterAWaitInVain) {
  holder->run("BEGIN IMMEDIATE");
  waitInVain();
  EXPECT_EQ(insert(), 0);
  holder->run("COMMIT");
  EXPECT_EQ(insert(), 1);
}

/// The one case that spends its five seconds.
TEST_F(LockWaitTest, AfterFiveSecondsTheDatabaseIsLocked) {
  holder->run("BEGIN IMMEDIATE");
  const auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(insert(), 0);
  // The wait is measured in whole milliseconds.
  EXPECT_GT(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(4990));
  expectError(*store, kLocked, "database is locked");
  EXPECT_THAT(lines(), ElementsAre(runFailed("database is locked", 5)));
}

}  // namespace
