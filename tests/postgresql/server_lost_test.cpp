// What stores make of a server that hangs up, hangs, or cannot keep a promise,
// through the library alone.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <libpq-fe.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include "core/oauth_errors.h"
#include "core/transaction.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/support/server_world.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using support::id64;
using ::testing::HasSubstr;
using ::testing::Not;

namespace {

constexpr int kIoError = 10;
constexpr int kBusy = 5;

class ServerTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    admin_ = PQconnectdb(std::getenv("KELDOAUTH_TEST_SERVER"));
    ASSERT_EQ(PQstatus(admin_), CONNECTION_OK) << PQerrorMessage(admin_);
  }
  void TearDown() override {
    PQfinish(admin_);
    World::TearDown();
  }

  /// On a connection of the test's own, as the stores' role.
  std::string ask(const std::string& sql) {
    PGresult* const result = PQexec(admin_, sql.c_str());
    const std::string answer = PQntuples(result) > 0 ? PQgetvalue(result, 0, 0) : "";
    EXPECT_THAT(PQresultErrorMessage(result), testing::StrEq("")) << sql;
    PQclear(result);
    return answer;
  }

  /// The server hangs up on all stores.
  void hangUp() {
    ask("SELECT count(pg_terminate_backend(pid)) FROM pg_stat_activity WHERE usename = "
        "current_user AND pid <> pg_backend_pid()");
    // It says so, and is gone a moment later.
    while (ask("SELECT count(*) FROM pg_stat_activity WHERE usename = current_user AND pid <> "
               "pg_backend_pid() AND backend_type = 'client backend'") != "0") {
      std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
  }

  std::string logRows() { return ask("SELECT count(*) FROM keldoauth.oauth_log"); }

  PGconn* admin_ = nullptr;
};

/// The same failure at each call of a statement.
void expectLost(OAUTHDBBasic& store) {
  EXPECT_EQ(store.GetErrCode(), kIoError);
  EXPECT_THAT(store.GetErrMsg(), HasSubstr("lost, and the transaction with it"));
}

}  // namespace

TEST_F(ServerTest, AResidentProcessTakesUpAnotherConnection) {
  OAUTHDBLog log(names::kLogTable);
  ASSERT_TRUE(log.Add("before"));
  hangUp();
  ASSERT_TRUE(log.Add("after")) << log.GetErrMsg();
  hangUp();
  Json::Value rows;
  ASSERT_TRUE(log.Get("", "", &rows));
  EXPECT_EQ(rows.size(), 2U);
  hangUp();
  Transaction transaction(log);
  EXPECT_TRUE(transaction.Begin());
}

TEST_F(ServerTest, ATableThatWasDroppedMeanwhileIsMadeAgain) {
  OAUTHDBLog log(names::kLogTable);
  ASSERT_TRUE(log.Add("before"));
  hangUp();
  ASSERT_NE(log.DBDrop(), 0);
  ASSERT_NE(log.DBInit(), 0);
  EXPECT_TRUE(log.Add("after")) << log.GetErrMsg();
  EXPECT_EQ(logRows(), "1");

  OAUTHDBBasic fresh;
  fresh.SetTabName(names::kMetaTable);
  ASSERT_NE(fresh.DBDrop(), 0);
  ASSERT_NE(fresh.DBInit(), 0);
  EXPECT_EQ(ask("SELECT count(*) FROM keldoauth.oauth_meta"), "3");
}

TEST_F(ServerTest, NeverWithinATransaction) {
  OAUTHDBLog log(names::kLogTable);
  Transaction transaction(log);
  ASSERT_TRUE(transaction.Begin());
  ASSERT_TRUE(log.Add("within"));
  hangUp();
  EXPECT_FALSE(log.Add("later"));
  expectLost(log);
  EXPECT_FALSE(log.Add("later still"));
  expectLost(log);
  EXPECT_FALSE(transaction.Commit());
  expectLost(log);
  EXPECT_EQ(logRows(), "0");
  EXPECT_TRUE(log.Add("alone"));
  EXPECT_EQ(logRows(), "1");
}

TEST_F(ServerTest, ATransactionLostBeforeItsCommitHasNotHappened) {
  OAUTHDBLog log(names::kLogTable);
  Transaction transaction(log);
  ASSERT_TRUE(transaction.Begin());
  ASSERT_TRUE(log.Add("within"));
  hangUp();
  EXPECT_FALSE(transaction.Commit());
  expectLost(log);
  EXPECT_EQ(logRows(), "0");
}

TEST_F(ServerTest, AFailedStatementLeavesTheTransactionAsItWas) {
  OAUTHDBLog log(names::kLogTable);
  Transaction transaction(log);
  ASSERT_TRUE(transaction.Begin());
  ASSERT_TRUE(log.Add("one"));
  Json::Value twice;
  twice[names::kId] = "1";
  twice[names::kTimestamp] = "5";
  twice[names::kMsg] = "two";
  EXPECT_FALSE(log.DBAdd(twice));
  EXPECT_EQ(log.GetErrCode(), 19);
  EXPECT_EQ(log.GetErrMsg(), "UNIQUE constraint failed: oauth_log.id");
  EXPECT_TRUE(log.Add("three"));
  EXPECT_TRUE(transaction.Commit());
  EXPECT_EQ(logRows(), "2");
}

TEST_F(ServerTest, AnotherWritersLockIsWaitedForAndThenBusy) {
  OAUTHDBLog log(names::kLogTable);
  ask("BEGIN");
  ask("SELECT pg_advisory_xact_lock(0, 1)");
  Transaction transaction(log);
  EXPECT_FALSE(transaction.Begin());
  EXPECT_EQ(log.GetErrCode(), kBusy);
  EXPECT_EQ(log.GetErrMsg(), "database is locked");
  ask("ROLLBACK");
  EXPECT_TRUE(transaction.Begin());
}

TEST_F(ServerTest, AWriterThatIsKilledLetsGoOfTheLock) {
  const pid_t child = fork();
  if (child == 0) {
    OAUTHDBLog log(names::kLogTable);
    Transaction transaction(log);
    const bool hasBegun = transaction.Begin() && log.Add("never");
    if (hasBegun) kill(getpid(), SIGKILL);
    _exit(1);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  ASSERT_TRUE(WIFSIGNALED(status));
  OAUTHDBLog log(names::kLogTable);
  EXPECT_TRUE(log.Add("at once"));
  EXPECT_EQ(logRows(), "1");
}

TEST_F(ServerTest, AChildDoesNotSpeakInItsParentsName) {
  OAUTHDBLog log(names::kLogTable);
  Transaction transaction(log);
  ASSERT_TRUE(transaction.Begin());
  const pid_t child = fork();
  if (child == 0) _exit(log.Add("from the child") || log.GetErrCode() != 21 ? 1 : 0);
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  EXPECT_TRUE(log.Add("from the parent"));
  EXPECT_TRUE(transaction.Commit());
}

TEST_F(ServerTest, BytesComeBackAsTheyWere) {
  OAUTHDBLog log(names::kLogTable);
  std::string all;
  for (int c = 1; c < 256; ++c) all += static_cast<char>(c);
  ASSERT_TRUE(log.Add(all));
  Json::Value rows;
  ASSERT_TRUE(log.Get("", "", &rows));
  std::string stored = rows[0U][names::kMsg].asString();
  stored.erase(stored.find("''"), 1);  // which the store doubles
  EXPECT_EQ(stored, all);
}

TEST_F(ServerTest, EightyFirstConstructionsAtOnceAllSucceed) {
  ask("DROP TABLE IF EXISTS keldoauth.oauth_meta, keldoauth.oauth_clientinfo, "
      "keldoauth.oauth_grantcode, keldoauth.oauth_token, keldoauth.oauth_log");
  std::vector<pid_t> children;
  for (int i = 0; i < 80; ++i) {
    const pid_t child = fork();
    if (child == 0) {
      OAUTHDBLog log(names::kLogTable);
      _exit(log.GetErrCode() == errors::kNone.code && log.Add("there") ? 0 : 1);
    }
    children.push_back(child);
  }
  int failed = 0;
  for (const pid_t child : children) {
    int status = 0;
    waitpid(child, &status, 0);
    if (status != 0) ++failed;
  }
  EXPECT_EQ(failed, 0);
  EXPECT_EQ(logRows(), "80");
}

TEST_F(ServerTest, NothingOfAStatementIsInTheServersLog) {
  const std::string mark = id64('7');
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value answer;
  Json::Value row;
  row[names::kAccessToken] = mark;
  EXPECT_FALSE(tokens.DBAdd(row));  // other columns are missing
  Json::Value request;
  request[names::kConditionLike] = "nothing='" + mark + "' AND";
  EXPECT_FALSE(tokens.DBGet(request, &answer));
  request[names::kConditionLike] = "CAST(substr('" + mark + "',1,x) AS INTEGER)";
  EXPECT_FALSE(tokens.DBGet(request, &answer));
  Json::Value log;
  log[names::kTimestamp] = mark;  // too large a number
  log[names::kMsg] = mark;
  OAUTHDBLog other(names::kLogTable);
  EXPECT_FALSE(other.DBAdd(log));
  EXPECT_EQ(other.GetErrCode(), 20);

  const std::string written = readFile(std::getenv("KELDOAUTH_TEST_SERVER_LOG"));
  ASSERT_THAT(written, HasSubstr("ready to accept connections"));
  EXPECT_THAT(written, Not(HasSubstr(mark)));
  EXPECT_THAT(written, Not(HasSubstr("oauth_token")));
}
