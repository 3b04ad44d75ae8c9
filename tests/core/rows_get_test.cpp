#include "core/tables.h"
#include "tests/core/rows_test.h"

namespace {

using namespace core_tests;
using support::Platform;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

using GetTest = ThreeClientsTest;

TEST_F(GetTest, WithoutConditionEveryRowComesInTheEnginesOrder) {
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(ids(rows), "b a c ");
  expectNoError(*clients);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(GetTest, RowsMapEveryColumnToAClearText) {
  request["condition"]["client_id"] = "a";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  Json::Value expected = client("a");
  expected["id"] = "2";
  ASSERT_THAT(rows, SizeIs(1));
  EXPECT_EQ(rows[0], expected);
}

TEST_F(GetTest, ColumnThatNoStoreHasComesUnderItsName) {
  sql("ALTER TABLE oauth_clientInfo ADD COLUMN zebra text DEFAULT 'striped'");
  sql("ALTER TABLE oauth_clientInfo ADD COLUMN identity text DEFAULT 'short of none'");
  request["condition"]["client_id"] = "a";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  Json::Value expected = client("a");
  expected["id"] = "2";
  expected["zebra"] = "striped";
  expected["identity"] = "short of none";
  EXPECT_EQ(rows[0], expected);
}

TEST_F(GetTest, RowsOfAListingShareTheNamesOfEveryColumn) {
  std::string row;
  for (const auto* table : KELDOAUTHSERVER::schema::kTables) {
    for (const char* column : table->columns)
      row += (row.empty() ? "SELECT 1 AS " : ", 1 AS ") + std::string(column);
  }
  rows = kEmptyArray;
  ASSERT_TRUE(clients->DBCmd(row + " UNION ALL " + row, Table::TabGetCallback, &rows));
  ASSERT_THAT(rows, SizeIs(2));
  auto again = rows[1].begin();
  for (auto member = rows[0].begin(); member != rows[0].end(); ++member, ++again) {
    const char* end = nullptr;
    EXPECT_EQ(static_cast<const void*>(member.memberName(&end)), again.memberName(&end))
        << member.name();
  }
}

TEST_F(GetTest, EveryMemberOfTheConditionMustHold) {
  request["condition"]["client_id"] = "a";
  request["condition"]["enable"] = "0";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(rows, kEmptyArray);
}

TEST_F(GetTest, ConditionOnASecretComparesCiphertext) {
  request["condition"]["client_secret"] = "secret of c";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(ids(rows), "c ");
  EXPECT_EQ(request["condition"]["client_secret"], "<secret of c>");
}

TEST_F(GetTest, RequestWithoutConditionIsLeftWithANullOne) {
  clients->DBGet(request, &rows);
  EXPECT_EQ(request, json("{'condition': null}"));
}

TEST_F(GetTest, OldContentOfTheResultGoes) {
  rows = json("{'old': ['content']}");
  request["condition"]["id"] = "99";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(rows, kEmptyArray);
}

TEST_F(GetTest, EmptyTableIsASuccess) {
  EXPECT_TRUE(logs->DBGet(request, &rows));
  EXPECT_EQ(rows, kEmptyArray);
  expectNoError(*logs);
}

TEST_F(GetTest, LikeReplacesTheCondition) {
  request["condition"]["client_id"] = "a";
  request["condition_like"] = "display_name like '%app b%'";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(ids(rows), "b ");
}

TEST_F(GetTest, ConditionBesideLikeIsEncryptedAllTheSame) {
  request["condition"]["client_id"] = "a";
  request["condition_like"] = "1";
  clients->DBGet(request, &rows);
  EXPECT_EQ(request["condition"]["client_id"], "<a>");
}

TEST_F(GetTest, OptionEndsTheStatement) {
  request["option"] = "ORDER BY client_id DESC LIMIT 2";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(ids(rows), "c b ");
}

TEST_F(GetTest, OtherKeysAreNotRead) {
  request["limit"] = "1";
  request["offset"] = "1";
  request["total"] = "1";
  request["modified"]["enable"] = "0";
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(ids(rows), "b a c ");
}

struct Statement {
  const char* request;
  const char* sql;
};

TEST_F(GetTest, StatementIsMadeOfTheRequest) {
  const Statement statements[] = {
      {"null", "SELECT * FROM oauth_log ;"},
      {"{'condition': {}}", "SELECT * FROM oauth_log ;"},
      {"{'condition': {'id': '7'}}", "SELECT * FROM oauth_log WHERE id='7' ;"},
      {"{'condition': {'id': '7', 'client_id': 'x'}}",
       "SELECT * FROM oauth_log WHERE client_id='<x>' and id='7' ;"},
      {"{'condition_like': 'msg like 1'}", "SELECT * FROM oauth_log WHERE msg like 1 ;"},
      {"{'condition_like': ''}", "SELECT * FROM oauth_log WHERE  ;"},
      {"{'condition_like': null}", "SELECT * FROM oauth_log WHERE  ;"},
      {"{'option': 'ORDER BY id DESC'}", "SELECT * FROM oauth_log ORDER BY id DESC;"},
      {"{'option': ''}", "SELECT * FROM oauth_log ;"},
      {"{'option': null}", "SELECT * FROM oauth_log ;"},
      {"{'condition': {'id': '7'}, 'option': 'LIMIT 1'}",
       "SELECT * FROM oauth_log WHERE id='7' LIMIT 1;"},
      {"{'condition_like': 'id', 'condition': {'id': '7'}, 'option': 'LIMIT 1'}",
       "SELECT * FROM oauth_log WHERE id LIMIT 1;"},
  };
  for (const Statement& statement : statements) {
    std::string ran;
    Engine::onExec([&](const std::string& sql) { ran = sql; });
    request = json(statement.request);
    logs->DBGet(request, &rows);
    EXPECT_EQ(ran, statement.sql) << statement.request;
  }
}

TEST_F(GetTest, FailureInTheEngineIsLoggedWithTheTable) {
  request["option"] = "ORDER";
  rows = json("['old']");
  EXPECT_FALSE(clients->DBGet(request, &rows));
  expectError(*clients, 1, "near \";\": syntax error");
  EXPECT_EQ(rows, kEmptyArray);
  EXPECT_THAT(lines(), ElementsAre(runFailed("near \";\": syntax error", 1),
                                   failed("Get", "oauth_clientInfo")));
}

TEST_F(GetTest, RowsBeforeAFailureStayInTheResult) {
  // abs() of the lowest integer overflows, but only in the last of the rows.
  request["condition_like"] = "CASE id WHEN 3 THEN abs(-9223372036854775807 - 1) ELSE 1 END";
  EXPECT_FALSE(clients->DBGet(request, &rows));
  expectError(*clients, 1, "integer overflow");
  EXPECT_EQ(ids(rows), "b a ");
}

TEST_F(GetTest, FailedEncryptionSpeaksOfDecryption) {
  Platform::failEncryptFrom(1);
  request["condition"]["client_id"] = "a";
  rows = json("['untouched']");
  SystemLog::clear();
  EXPECT_FALSE(clients->DBGet(request, &rows));
  expectError(*clients, -4, "Data Decrypt failed");
  EXPECT_EQ(rows, json("['untouched']"));
  EXPECT_THAT(lines(), ElementsAre(plain("Data Encrypt failed")));
}

TEST_F(GetTest, RowThatCannotBeDecryptedComesAsItIs) {
  sql("UPDATE oauth_clientInfo SET client_id='clear' WHERE id=2");
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(ids(rows), "b clear c ");
  EXPECT_EQ(rows[1]["client_secret"], "<secret of a>");
  expectNoError(*clients);
  EXPECT_THAT(lines(), ElementsAre(plain("Data Decrypt failed"), plain("Decrypt data failed")));
}

TEST_F(GetTest, RowWithABrokenSecretComesHalfDecrypted) {
  sql("UPDATE oauth_clientInfo SET client_secret='clear' WHERE id=2");
  EXPECT_TRUE(clients->DBGet(request, &rows));
  EXPECT_EQ(rows[1]["client_id"], "a");
  EXPECT_EQ(rows[1]["client_secret"], "clear");
}

TEST_F(GetTest, NullColumnReadsAsEmptyText) {
  sql("CREATE TABLE loose(a, client_id, n); INSERT INTO loose VALUES(NULL, '<>', 2.5)");
  Table loose("loose");
  EXPECT_TRUE(loose.DBGet(request, &rows));
  EXPECT_EQ(rows, json("[{'a': '', 'client_id': '', 'n': '2.5'}]"));
}

TEST_F(GetTest, NullSecretCannotBeDecrypted) {
  sql("CREATE TABLE loose(client_id); INSERT INTO loose VALUES(NULL)");
  Table loose("loose");
  EXPECT_TRUE(loose.DBGet(request, &rows));
  EXPECT_EQ(rows, json("[{'client_id': ''}]"));
  EXPECT_THAT(messages(), ElementsAre("Data Decrypt failed", "Decrypt data failed"));
}

TEST_F(GetTest, GetIsTracedToItsEnd) {
  Json::Value row = json("{'timestamp': '5', 'msg': 'it', 'id': '7'}");
  logs->DBAdd(row);
  request["condition"]["id"] = "7";
  EXPECT_THAT(traced(15, [&] { logs->DBGet(request, &rows); }),
              ElementsAre("==> DBGet", "==> GetConditionParam", "==> ConcateParam", "==> DBCmd",
                          "==> DBCmdRun[SELECT * FROM oauth_log WHERE id='7' ;]",
                          "==> TabGetCallback", "##### [0][timestamp = 5]", "##### [1][msg = it]",
                          "##### [2][id = 7]", "ClientInfo Get Done"));
}

TEST_F(GetTest, SecretsAreTracedOnTheirWayInAndOut) {
  request["condition"]["client_id"] = "a";
  EXPECT_THAT(tracedLines(1, [&] { clients->DBGet(request, &rows); }),
              ElementsAre(Line{kError, "==> %s[client_id]", "==> ParamEncrypt[client_id]"},
                          Line{kError, "==> %s[client_id]", "==> ParamDecrypt[client_id]"},
                          Line{kError, "==> %s[client_secret]", "==> ParamDecrypt[client_secret]"},
                          plain("ClientInfo Get Done")));
}

TEST_F(GetTest, LikeIsTracedWithoutACondition) {
  request["condition_like"] = "0";
  EXPECT_THAT(
      traced(8, [&] { logs->DBGet(request, &rows); }),
      ElementsAre("==> DBGet", "==> DBCmd", "==> DBCmdRun[SELECT * FROM oauth_log WHERE 0 ;]"));
}

TEST_F(GetTest, LevelFourShowsNothing) {
  EXPECT_THAT(traced(4, [&] { clients->DBGet(request, &rows); }), IsEmpty());
}

}  // namespace
