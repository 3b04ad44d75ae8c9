// Clocks that are wrong, and requests that overtake one another.

#include <sqlite3.h>

#include "grants/rows/store.h"
#include "stores/oauth_log.h"
#include "tests/grants/grants_test.h"
#include "tests/support/server_world.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

class HostileClockTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
  }

  /// Whether the write lock is held at the moment.
  static bool isLocked() {
    sqlite3* db = nullptr;
    const support::StoreCalls store = support::storeCalls();
    store.open(kDatabase, &db);
    const int result = store.exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr);
    store.close(db);
    return result == SQLITE_BUSY;
  }

  /// How often `operation` looked at the clock while another request could
  /// still have overtaken it, and how often at all.
  template <typename Operation>
  static std::pair<int, int> looks(Operation operation) {
    std::pair<int, int> looks{0, 0};
    support::Clock::onRead([&looks] {
      ++looks.second;
      if (!isLocked()) ++looks.first;
    });
    operation();
    support::Clock::onRead({});
    return looks;
  }

  template <typename Operation>
  static void expectUnderTheLock(const char* name, Operation operation) {
    const auto [before, all] = looks(operation);
    EXPECT_EQ(before, 0) << name;
    EXPECT_GT(all, 0) << name;
  }

  ApplicationId frame_;
};

// A request that waits for the lock must not compare a time from before the
// wait with what the other one wrote meanwhile: its age would be below 0, as
// after a clock that was set back, and a client that tried twice would lose its
// login.
TEST_F(HostileClockTest, TheTimeIsTakenUnderTheLock) {
  Code code;
  Pair pair;
  expectUnderTheLock("issue", [&] { code = issue(frame_); });
  expectUnderTheLock("redeem", [&] { pair = *grants().codes.redeem(redemption(frame_, code)); });
  expectUnderTheLock("redeem again", [&] { grants().codes.redeem(redemption(frame_, code)); });
  expectUnderTheLock("refresh", [&] { refresh(frame_, pair); });
  expectUnderTheLock("refresh again", [&] { grants().tokens.refresh({frame_, *pair.refresh}); });
  expectUnderTheLock("log in", [&] { grants().tokens.issue({kBob, frame_, kScope}); });
  expectUnderTheLock("own token", [&] { grants().tokens.issueToItself({frame_}); });
  expectUnderTheLock("end", [&] { grants().access.endUser(kBob, kAdmin); });
  const AccessHandle handle = grants().access.find(AnyToken(pair.refresh->text()))->handle;
  expectUnderTheLock("end one", [&] { grants().access.end(handle, kAdmin); });
  expectUnderTheLock("purge", [&] { grants().room.purge(); });
}

// The log, whose store drops whole seconds ----------------------------------------------

class HostileLogTest : public HostileClockTest {
 protected:
  std::string lastEntry() {
    const std::vector<std::string> texts = entries();
    return texts.empty() ? "" : texts.back();
  }
  static std::string subject(int number) { return "Event " + std::to_string(number); }
};

TEST_F(HostileLogTest, AnEntryStaysAfterTheClockWasSetBack) {
  writeSettings(R"({"log_max": 5})");
  for (int i = 0; i < 5; ++i) {
    support::Clock::advance(kHour);
    grants().audit.record(subject(i), kAdmin);
  }
  support::Clock::setTo(kNow - 365 * kDay);
  ASSERT_TRUE(grants().applications.disable(frame_, kAdmin));
  EXPECT_THAT(lastEntry(), StartsWith("Application disabled[Photo Frame"));
  EXPECT_THAT(entries(), SizeIs(5));
}

TEST_F(HostileLogTest, ManyEntriesOfOneSecondDoNotDriveOneAnotherOut) {
  writeSettings(R"({"log_max": 5})");
  for (int i = 0; i < 50; ++i) {
    grants().audit.record(subject(i), kAdmin);
    ASSERT_EQ(lastEntry(), subject(i) + " by [admin]");
  }
  EXPECT_THAT(entries(), SizeIs(5));
}

TEST_F(HostileLogTest, OneOperationWithMoreEntriesThanTheLogHoldsLeavesTheLast) {
  writeSettings(R"({"log_max": 3})");
  std::vector<AccessHandle> handles;
  for (const char* user : {"a", "b", "c", "d", "e"}) login(frame_, User(user));
  for (const AccessEntry& entry : grants().access.list({})) handles.push_back(entry.handle);
  EXPECT_EQ(grants().access.end(handles, kAdmin).tokens, 5);
  EXPECT_THAT(entries(), SizeIs(3));
  EXPECT_THAT(lastEntry(), HasSubstr(" for [e] by [admin]"));
}

TEST_F(HostileLogTest, AnEntryFromTheFutureIsNotCounted) {
  support::Clock::advance(10 * kDay);
  grants().audit.record("Database restored", kAdmin);
  support::Clock::setTo(kNow);
  grants().audit.record("Database restored", kAdmin);
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_log WHERE msg='Database restored by [admin]'"),
            "2");
}

TEST_F(HostileLogTest, AnEntryThatCannotMakeRoomFailsTheOperation) {
  sql("CREATE TRIGGER refuse BEFORE DELETE ON oauth_log BEGIN SELECT RAISE(ROLLBACK, 'no'); END;");
  writeSettings(R"({"log_max": 1})");
  EXPECT_THROW(grants().applications.disable(frame_, kAdmin), Trouble);
  EXPECT_TRUE(grants().applications.find(frame_)->isEnabled);
  EXPECT_THAT(entries(), Not(Contains(StartsWith("Application disabled"))));
}

TEST_F(HostileLogTest, ACountThatAnotherProgramWroteMayBeAsLargeAsItLikes) {
  for (const char* count : {"2147483647", "4294967295", "99999999999999999999"}) {
    sql("DELETE FROM oauth_log");
    KELDOAUTHSERVER::OAUTHDBLog(KELDOAUTHSERVER::names::kLogTable)
        .Add("Event by [admin] (" + std::string(count) + " times)");
    grants().audit.record("Event", kAdmin);
    EXPECT_THAT(lastEntry(), StartsWith("Event by [admin]"));
    EXPECT_THAT(lastEntry(), Not(HasSubstr("-")));
  }
}

}  // namespace
}  // namespace grants_test
