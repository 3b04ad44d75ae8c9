// The audit log: writing, rotating, listing and clearing.

#include <gmock/gmock.h>
#include <json/value.h>
#include <sqlite3.h>

#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBLog;
using support::Clock;
using support::Row;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::IsEmpty;
using ::testing::Not;

namespace {

constexpr char kTable[] = "oauth_log";
constexpr long long kNow = 1700000000;

class LogTest : public StoreTest {
 protected:
  void SetUp() override {
    StoreTest::SetUp();
    Clock::setTo(kNow);
  }

  static Aftermath add(const std::string& msg) {
    return onLog([&](auto& store) { return store.Add(msg); });
  }
  static Aftermath get(const std::string& filter, const std::string& option, Json::Value& rows) {
    return onLog([&](auto& store) { return store.Get(filter, option, &rows); });
  }
  static Aftermath clear() {
    return onLog([](auto& store) { return store.Del(); });
  }

  /// The messages that a look-up delivers.
  static Lines found(const std::string& filter, const std::string& option = "") {
    Json::Value rows;
    EXPECT_TRUE(succeeded(get(filter, option, rows)));
    Lines messages;
    for (const Json::Value& row : rows) messages.push_back(row["msg"].asString());
    return messages;
  }

  static Lines messages() {
    Lines all;
    for (const Row& row : rows(kTable)) all.push_back(row.at("msg"));
    return all;
  }

  static void refuse(const std::string& what) {
    sql("CREATE TRIGGER refuse BEFORE " + what +
        " ON oauth_log BEGIN SELECT RAISE(ABORT, 'no'); END;");
  }
};

// Writing ---------------------------------------------------------------------

TEST_F(LogTest, AddStoresTheMessageWithTheDatabasesTime) {
  ASSERT_TRUE(succeeded(add("login")));
  EXPECT_EQ(onlyRow(kTable), (Row{{"id", "1"}, {"msg", "login"}, {"timestamp", "1700000000"}}));
}

TEST_F(LogTest, AddStoresANumberAsTime) {
  add("login");
  EXPECT_EQ(sqlText("SELECT typeof(timestamp) FROM oauth_log;"), "integer");
}

TEST_F(LogTest, AddInsertsThenRotates) {
  EXPECT_THAT(add("login").statements,
              ElementsAre("INSERT INTO oauth_log (id, msg, timestamp) VALUES(NULL, 'login', "
                          "strftime('%s','now'));",
                          "DELETE FROM oauth_log WHERE timestamp IN (SELECT timestamp FROM "
                          "oauth_log ORDER BY timestamp DESC LIMIT -1 OFFSET 1000)"));
}

TEST_F(LogTest, AddStoresQuotesDoubled) {
  ASSERT_TRUE(succeeded(add("it's 'quoted'")));
  EXPECT_THAT(messages(), ElementsAre("it''s ''quoted''"));
}

TEST_F(LogTest, AddStoresAnEmptyMessage) {
  ASSERT_TRUE(succeeded(add("")));
  EXPECT_THAT(messages(), ElementsAre(""));
}

TEST_F(LogTest, AddEndsAtNul) {
  ASSERT_TRUE(succeeded(add(std::string("head\0tail", 9))));
  EXPECT_THAT(messages(), ElementsAre("head"));
}

TEST_F(LogTest, AddStoresAMegabyte) {
  const std::string message(1 << 20, 'm');
  ASSERT_TRUE(succeeded(add(message)));
  EXPECT_THAT(messages(), ElementsAre(message));
}

TEST_F(LogTest, StatementBeyondSqlitesLimitIsRefusedByIt) {
  OAUTHDBLog store(kTable);
  Statements::limitStatementsTo(1000);
  const Aftermath outcome = runOn(store, [](auto& s) { return s.Add(textOf(1000)); });
  EXPECT_TRUE(failed(outcome, 18, "string or blob too big"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![string or blob too big][18]",
                          "oauth_db_basic Add failed[oauth_log]"));
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_F(LogTest, TextBeyondSqlitesLimitIsRefusedByIt) {
  OAUTHDBLog store(kTable);
  Statements::limitTextsTo(1000);
  const Aftermath outcome = runOn(store, [](auto& s) { return s.Add(textOf(1001)); });
  EXPECT_TRUE(failed(outcome, 18, "string or blob too big"));
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_F(LogTest, MessageThatSqliteCannotQuoteIsStoredEmpty) {
  OAUTHDBLog store(kTable);
  const std::string message = textOf(1 << 20);
  sqlite3_hard_heap_limit64(sqlite3_memory_used() + (1 << 19));
  const Aftermath outcome = runOn(store, [&](auto& s) { return s.Add(message); });
  sqlite3_hard_heap_limit64(0);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_utils Can't transfer to SQL format"));
  EXPECT_THAT(messages(), ElementsAre(""));
}

TEST_F(LogTest, AddUsesTheTableOfTheObject) {
  sql("CREATE TABLE other AS SELECT * FROM oauth_log;");
  OAUTHDBLog store("other");
  const Aftermath outcome = runOn(store, [](auto& s) { return s.Add("here"); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements,
              Contains("DELETE FROM other WHERE timestamp IN (SELECT timestamp FROM other ORDER BY "
                       "timestamp DESC LIMIT -1 OFFSET 1000)"));
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_F(LogTest, RefusedInsertLeavesSqlitesError) {
  refuse("INSERT");
  const Aftermath outcome = add("login");
  EXPECT_TRUE(failed(outcome, 19, "no"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Run Command failed!![no][19]",
                                         "oauth_db_basic Add failed[oauth_log]"));
}

// Rotating --------------------------------------------------------------------

class RotationTest : public LogTest {
 protected:
  static void setLimit(const std::string& limit) { writeSettings("{\"log_max\": " + limit + "}"); }
  /// One message in each of `count` seconds.
  static void addInDifferentSeconds(int count) {
    OAUTHDBLog store(kTable);
    for (int i = 1; i <= count; ++i) {
      Clock::advance(1);
      store.Add(std::to_string(i));
    }
  }
};

TEST_F(RotationTest, KeepsTheNewest) {
  setLimit("3");
  addInDifferentSeconds(4);
  EXPECT_THAT(messages(), ElementsAre("2", "3", "4"));
}

TEST_F(RotationTest, KeepsAsManyAsAllowed) {
  setLimit("3");
  addInDifferentSeconds(3);
  EXPECT_THAT(messages(), ElementsAre("1", "2", "3"));
}

TEST_F(RotationTest, BurstWithinOneSecondEmptiesTheTable) {
  setLimit("3");
  OAUTHDBLog store(kTable);
  for (const int expected : {1, 2, 3, 0, 1, 2, 3, 0}) {
    EXPECT_NE(store.Add("burst"), 0);
    EXPECT_EQ(rowCount(kTable), expected);
  }
}

TEST_F(RotationTest, WholeSecondGoesWithItsOldestRow) {
  setLimit("3");
  for (int i = 0; i < 3; ++i) insertLog({{"timestamp", "1000"}, {"msg", "old"}});
  add("new");
  EXPECT_THAT(messages(), ElementsAre("new"));
}

TEST_F(RotationTest, GoesByTimeAndNotById) {
  setLimit("2");
  insertLog({{"id", "1"}, {"timestamp", "3000000000"}, {"msg", "from the future"}});
  insertLog({{"id", "2"}, {"timestamp", "1000"}, {"msg", "from the past"}});
  add("now");
  EXPECT_THAT(messages(), ElementsAre("from the future", "now"));
}

TEST_F(RotationTest, MessageOlderThanAllOthersGoesAtOnce) {
  setLimit("1");
  insertLog({{"timestamp", "3000000000"}, {"msg", "from the future"}});
  EXPECT_TRUE(succeeded(add("now")));
  EXPECT_THAT(messages(), ElementsAre("from the future"));
}

TEST_F(RotationTest, LimitIsReadAfreshEachTime) {
  setLimit("3");
  addInDifferentSeconds(3);
  setLimit("1");
  Clock::advance(1);
  add("last");
  EXPECT_THAT(messages(), ElementsAre("last"));
}

TEST_F(RotationTest, LimitIsCapped) {
  setLimit("50000");
  EXPECT_THAT(add("login").statements, Contains(EndsWith("LIMIT -1 OFFSET 10000)")));
}

TEST_F(RotationTest, LimitsOfOtherTablesDoNotCount) {
  writeSettings(R"({"client_info_max": 1, "grantcode_max": 1, "token_max": 1})");
  addInDifferentSeconds(3);
  EXPECT_EQ(rowCount(kTable), 3);
}

TEST_F(RotationTest, RunsAfterAFailedInsert) {
  setLimit("1");
  insertLog({{"timestamp", "1"}, {"msg", "older"}});
  insertLog({{"timestamp", "2"}, {"msg", "newer"}});
  refuse("INSERT");
  EXPECT_TRUE(failed(add("refused"), 19, "no"));
  EXPECT_THAT(messages(), ElementsAre("newer"));
}

TEST_F(RotationTest, FailureDoesNotChangeTheResult) {
  setLimit("1");
  insertLog();
  refuse("DELETE");
  const Aftermath outcome = add("login");
  EXPECT_TRUE(outcome.ok);
  EXPECT_EQ(rowCount(kTable), 2);
}

/// The statement that failed is still a statement that failed.
TEST_F(RotationTest, FailureLeavesSqlitesError) {
  setLimit("1");
  insertLog();
  refuse("DELETE");
  const Aftermath outcome = add("login");
  EXPECT_EQ(outcome.code, 19);
  EXPECT_EQ(outcome.message, "no");
}

TEST_F(RotationTest, FailureIsNotLoggedWithoutTheFlagFile) {
  writeSettings(R"({"log_max": 1, "log_level": 15})");
  insertLog();
  refuse("DELETE");
  Lines lines;
  inFreshThread([&] { lines = add("login").lines; });
  EXPECT_THAT(lines, ElementsAre("oauth_db_basic Run Command failed!![no][19]"));
}

TEST_F(RotationTest, FailureIsLoggedWithTheFlagFileWhateverTheLevel) {
  insertLog();
  refuse("DELETE");
  Lines lines;
  withDiagnostics(
      0, [&] { lines = add("login").lines; }, "\"log_max\": 1");
  EXPECT_THAT(lines, ElementsAre("oauth_db_basic Run Command failed!![no][19]",
                                 "oauth_log:32 Log rotate failed"));
}

TEST_F(RotationTest, ObjectThatIsNotReadyFailsToInsertAndToRotate) {
  writeFile(kDatabase, "no database, but long enough to be taken for a broken one");
  Lines lines;
  withDiagnostics(0, [&] { lines = add("login").lines; });
  EXPECT_THAT(
      lines, ElementsAre("oauth_db_basic DB is not ready!!", "oauth_db_basic Add failed[oauth_log]",
                         "oauth_db_basic DB is not ready!!", "oauth_log:32 Log rotate failed"));
}

// Listing ---------------------------------------------------------------------

class ListingTest : public LogTest {
 protected:
  void SetUp() override {
    LogTest::SetUp();
    for (const char* message : {"login alice", "login bob", "logout alice", "50% of it_all"}) {
      insertLog({{"msg", message}});
    }
  }
};

TEST_F(ListingTest, EmptyTextsDeliverEveryRow) {
  EXPECT_THAT(found(""), ElementsAre("login alice", "login bob", "logout alice", "50% of it_all"));
}

TEST_F(ListingTest, RowsHaveThreeTexts) {
  Json::Value rows;
  ASSERT_TRUE(succeeded(get("", "", rows)));
  EXPECT_THAT(rows[0U].getMemberNames(), ElementsAre("id", "msg", "timestamp"));
  EXPECT_EQ(rows[0U]["timestamp"].asString(), "1000");
  EXPECT_TRUE(rows[0U]["timestamp"].isString());
}

TEST_F(ListingTest, FilterDeliversMessagesThatContainIt) {
  EXPECT_THAT(found("alice"), ElementsAre("login alice", "logout alice"));
}

TEST_F(ListingTest, FilterIgnoresTheCaseOfAsciiLetters) {
  EXPECT_THAT(found("LOGIN"), ElementsAre("login alice", "login bob"));
}

TEST_F(ListingTest, FilterThatMatchesNothingIsAnEmptySuccess) {
  EXPECT_THAT(found("carol"), IsEmpty());
}

TEST_F(ListingTest, WildcardsInTheFilterWork) {
  EXPECT_THAT(found("l_gin%b"), ElementsAre("login bob"));
  EXPECT_EQ(found("%").size(), 4U);
}

TEST_F(ListingTest, FilterIsQuoted) {
  EXPECT_THAT(found("' OR '1'='1"), IsEmpty());
  add("it's");  // stored as it''s
  EXPECT_THAT(found("it's"), IsEmpty());
  EXPECT_THAT(found("it''s"), ElementsAre("it''s"));
}

TEST_F(ListingTest, FilterEndsAtNul) {
  EXPECT_THAT(found(std::string("bob\0zzz", 7)), ElementsAre("login bob"));
}

TEST_F(ListingTest, OptionEndsTheStatement) {
  EXPECT_THAT(found("", "ORDER BY id DESC LIMIT 2"), ElementsAre("50% of it_all", "logout alice"));
}

TEST_F(ListingTest, FilterAndOptionWorkTogether) {
  EXPECT_THAT(found("alice", "ORDER BY id DESC"), ElementsAre("logout alice", "login alice"));
}

TEST_F(ListingTest, StatementHasItsPartsInOrder) {
  Json::Value rows;
  EXPECT_THAT(get("alice", "LIMIT 1", rows).statements,
              ElementsAre("SELECT * FROM oauth_log WHERE msg like '%alice%' LIMIT 1;"));
  EXPECT_THAT(get("", "LIMIT 1", rows).statements, ElementsAre("SELECT * FROM oauth_log LIMIT 1;"));
  EXPECT_THAT(get("alice", "", rows).statements,
              ElementsAre("SELECT * FROM oauth_log WHERE msg like '%alice%' ;"));
  EXPECT_THAT(get("", "", rows).statements, ElementsAre("SELECT * FROM oauth_log ;"));
}

TEST_F(ListingTest, QuotesInTheOptionAreDoubled) {
  Json::Value rows;
  const Aftermath outcome = get("", "LIMIT '1'", rows);
  EXPECT_FALSE(outcome.ok);
  EXPECT_EQ(outcome.code, 1);
  EXPECT_EQ(outcome.message, "near \"1\": syntax error");
}

TEST_F(ListingTest, BadOptionLeavesSqlitesError) {
  Json::Value rows("old");
  const Aftermath outcome = get("", "nonsense here", rows);
  EXPECT_TRUE(failed(outcome, 1, "near \"here\": syntax error"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![near \"here\": syntax error][1]",
                          "oauth_db_basic Get failed[oauth_log]"));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
}

TEST_F(ListingTest, ListingChangesNothing) {
  const std::vector<Row> before = everything();
  found("alice", "LIMIT 1");
  EXPECT_EQ(everything(), before);
}

// Clearing --------------------------------------------------------------------

TEST_F(ListingTest, DelEmptiesTheTable) {
  const Aftermath outcome = clear();
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("DELETE FROM oauth_log;"));
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_F(LogTest, DelOfAnEmptyLogFailsWithoutACode) {
  const Aftermath outcome = clear();
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Delete failed[oauth_log]"));
}

TEST_F(ListingTest, DelLeavesOtherTablesAlone) {
  insertClient();
  insertCode();
  insertToken();
  clear();
  EXPECT_EQ(rowCount("oauth_clientInfo"), 1);
  EXPECT_EQ(rowCount("oauth_grantCode"), 1);
  EXPECT_EQ(rowCount("oauth_token"), 1);
}

TEST_F(ListingTest, LogIsWrittenAgainAfterDel) {
  clear();
  ASSERT_TRUE(succeeded(add("first")));
  EXPECT_THAT(messages(), ElementsAre("first"));
}

}  // namespace
