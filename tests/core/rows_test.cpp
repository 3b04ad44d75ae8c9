#include "tests/core/core_test.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::Clock;
using support::Platform;
using support::Row;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

const Json::Value kEmptyArray(Json::arrayValue);

Line failed(const std::string& what, const std::string& table) {
  return {kError, what + " failed[%s]", what + " failed[" + table + "]"};
}

/// A client in clear, but for its numbers.
Json::Value client(const std::string& id) {
  Json::Value row = json("{'enable': '1', 'redirect_uri': 'https://a', 'scope': 'read'}");
  row["client_id"] = id;
  row["client_secret"] = "secret of " + id;
  row["display_name"] = "app " + id;
  return row;
}

class RowsTest : public CoreTest {
 protected:
  void SetUp() override {
    CoreTest::SetUp();
    clients.emplace("oauth_clientInfo");
    logs.emplace("oauth_log");
  }

  void addClient(const std::string& id) {
    Json::Value row = client(id);
    ASSERT_TRUE(clients->DBAdd(row));
  }

  static std::string ids(const Json::Value& rows) {
    std::string all;
    for (const Json::Value& row : rows) all += row["client_id"].asString() + ' ';
    return all;
  }
  static std::string storedIds() {
    return sqlText(
        "SELECT group_concat(client_id) FROM (SELECT * FROM oauth_clientInfo ORDER BY id)");
  }

  std::optional<Table> clients;
  std::optional<Table> logs;
};

// DBAdd -----------------------------------------------------------------------

TEST_F(RowsTest, AddStoresTheRowWithItsSecretsEncrypted) {
  Json::Value row = client("abc");
  EXPECT_TRUE(clients->DBAdd(row));
  EXPECT_THAT(sql("SELECT * FROM oauth_clientInfo"),
              ElementsAre(Row{{"enable", "1"},
                              {"client_id", "<abc>"},
                              {"client_secret", "<secret of abc>"},
                              {"redirect_uri", "https://a"},
                              {"scope", "read"},
                              {"display_name", "app abc"},
                              {"id", "1"}}));
  expectNoError(*clients);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(RowsTest, AddLeavesCiphertextInTheCallersRow) {
  Json::Value row = client("abc");
  Json::Value expected = row;
  clients->DBAdd(row);
  expected["client_id"] = "<abc>";
  expected["client_secret"] = "<secret of abc>";
  EXPECT_EQ(row, expected);
}

TEST_F(RowsTest, AddStampsALogRowWithTheDatabasesClock) {
  Clock::setTo(1700000000);
  Json::Value row;
  row["msg"] = "it's";
  row["timestamp"] = Json::Value();
  row["id"] = Json::Value();
  EXPECT_TRUE(logs->DBAdd(row));
  EXPECT_THAT(sql("SELECT *, typeof(timestamp) AS type FROM oauth_log"),
              ElementsAre(Row{
                  {"timestamp", "1700000000"}, {"msg", "it's"}, {"id", "1"}, {"type", "integer"}}));
}

TEST_F(RowsTest, AddedTextsTakeTheTypeOfTheirColumn) {
  Json::Value row = json("{'id': '42', 'timestamp': '7', 'msg': '8'}");
  EXPECT_TRUE(logs->DBAdd(row));
  EXPECT_EQ(sqlText("SELECT typeof(id) || typeof(timestamp) || typeof(msg) FROM oauth_log"),
            "integerintegertext");
}

TEST_F(RowsTest, AddOfAnEmptyRowFailsInTheEngine) {
  for (Json::Value row : {json("{}"), Json::Value()}) {
    SystemLog::clear();
    EXPECT_FALSE(logs->DBAdd(row));
    expectError(*logs, 1, "near \")\": syntax error");
    EXPECT_THAT(lines(), ElementsAre(Line{kError, "Run Command failed!![%s][%d]",
                                          "Run Command failed!![near \")\": syntax error][1]"},
                                     failed("Add", "oauth_log")));
  }
}

TEST_F(RowsTest, AddOfARepeatedUniqueValueFailsInTheEngine) {
  addClient("abc");
  Json::Value row = client("abc");
  const std::string text = "UNIQUE constraint failed: oauth_clientInfo.client_id";
  EXPECT_FALSE(clients->DBAdd(row));
  expectError(*clients, 19, text);
  EXPECT_THAT(messages(), ElementsAre("Run Command failed!![" + text + "][19]",
                                      "Add failed[oauth_clientInfo]"));
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_clientInfo"), "1");
}

TEST_F(RowsTest, AddThatFailsLeavesCiphertextInTheCallersRow) {
  Json::Value row = json("{'client_id': 'abc'}");
  EXPECT_FALSE(clients->DBAdd(row));
  EXPECT_EQ(row, json("{'client_id': '<abc>'}"));
}

TEST_F(RowsTest, AddWithoutCipherRunsNoStatement) {
  Platform::failEncryptFrom(2);
  Json::Value row = client("abc");
  EXPECT_FALSE(clients->DBAdd(row));
  expectError(*clients, -4, "Data Encrypt failed");
  EXPECT_THAT(lines(), ElementsAre(plain("Data Encrypt failed")));
  EXPECT_THAT(sql("SELECT * FROM oauth_clientInfo"), IsEmpty());
  EXPECT_EQ(row["client_id"], "<abc>");
  EXPECT_EQ(row["client_secret"], "secret of abc");
}

TEST_F(RowsTest, AddIsTracedToItsEnd) {
  Json::Value row = json(
      "{'code': 'k', 'client_id': 'abc', 'username': \"u\", 'scope': 's',"
      "'expired_time': '1', 'state': 't'}");
  Table codes("oauth_grantCode");
  EXPECT_THAT(
      traced(15, [&] { codes.DBAdd(row); }),
      ElementsAre("==> DBAdd", "==> ParamEncrypt[client_id]", "==> GetInsertParam", "==> DBCmd",
                  "==> DBCmdRun[INSERT INTO oauth_grantCode (client_id, code, expired_time, scope, "
                  "state, username) VALUES('<abc>', 'k', '1', 's', 't', 'u');]",
                  "[oauth_grantCode] Add success, changed[1]"));
}

TEST_F(RowsTest, AddSaysSuccessAtLevelOne) {
  Json::Value row = json("{'msg': 'a', 'timestamp': null}");
  EXPECT_THAT(tracedLines(1, [&] { logs->DBAdd(row); }),
              ElementsAre(Line{kError, "[%s] Add success, changed[%d]",
                               "[oauth_log] Add success, changed[1]"}));
  EXPECT_THAT(traced(2 + 4, [&] { logs->DBAdd(row); }), IsEmpty());
}

// DBGet -----------------------------------------------------------------------

class GetTest : public RowsTest {
 protected:
  void SetUp() override {
    RowsTest::SetUp();
    for (const char* id : {"b", "a", "c"}) addClient(id);
  }

  Json::Value request;
  Json::Value rows;
};

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
  EXPECT_THAT(lines(), ElementsAre(Line{kError, "Run Command failed!![%s][%d]",
                                        "Run Command failed!![near \";\": syntax error][1]"},
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

// DBEdit ----------------------------------------------------------------------

class EditTest : public GetTest {
 protected:
  void SetUp() override {
    GetTest::SetUp();
    request = json("{'condition': {'client_id': 'a'}, 'modified': {'scope': 'write'}}");
  }

  static std::string scopes() {
    return sqlText("SELECT group_concat(scope) FROM oauth_clientInfo");
  }
};

TEST_F(EditTest, ChangesTheColumnsOfTheRowsThatMeetTheCondition) {
  EXPECT_TRUE(clients->DBEdit(request));
  EXPECT_EQ(scopes(), "read,write,read");
  expectNoError(*clients);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(EditTest, WithoutConditionEveryRowChanges) {
  request.removeMember("condition");
  EXPECT_TRUE(clients->DBEdit(request));
  EXPECT_EQ(scopes(), "write,write,write");
  EXPECT_EQ(request["condition"], Json::Value());
  EXPECT_TRUE(request.isMember("condition"));
}

TEST_F(EditTest, ModifiedSecretsAreEncryptedInPlace) {
  request["modified"] = json("{'client_id': 'x', 'client_secret': 'y'}");
  EXPECT_TRUE(clients->DBEdit(request));
  EXPECT_EQ(storedIds(), "<b>,<x>,<c>");
  EXPECT_EQ(request, json("{'condition': {'client_id': '<a>'},"
                          "'modified': {'client_id': '<x>', 'client_secret': '<y>'}}"));
}

TEST_F(EditTest, RowThatStaysAsItWasCountsAsChanged) {
  request["modified"]["scope"] = "read";
  EXPECT_TRUE(clients->DBEdit(request));
}

TEST_F(EditTest, NoMatchingRowIsAFailureWithoutAnError) {
  request["condition"]["client_id"] = "nobody";
  EXPECT_FALSE(clients->DBEdit(request));
  expectNoError(*clients);
  EXPECT_THAT(lines(), ElementsAre(failed("Edit", "oauth_clientInfo")));
}

TEST_F(EditTest, NoMatchingRowLeavesAnEarlierError) {
  clients->SetErrCode(-5);
  clients->SetErrMsg("ClientInfo Table is full");
  request["condition"]["client_id"] = "nobody";
  EXPECT_FALSE(clients->DBEdit(request));
  expectError(*clients, -5, "ClientInfo Table is full");
}

TEST_F(EditTest, FailureInTheEngineIsLoggedWithTheTable) {
  request["modified"] = json("{'no_column': '1'}");
  EXPECT_FALSE(clients->DBEdit(request));
  expectError(*clients, 1, "no such column: no_column");
  EXPECT_THAT(lines(), ElementsAre(Line{kError, "Run Command failed!![%s][%d]",
                                        "Run Command failed!![no such column: no_column][1]"},
                                   failed("Edit", "oauth_clientInfo")));
}

TEST_F(EditTest, NothingToModifyFailsInTheEngine) {
  request.removeMember("modified");
  EXPECT_FALSE(clients->DBEdit(request));
  EXPECT_EQ(clients->GetErrCode(), 1);
  EXPECT_EQ(scopes(), "read,read,read");
}

TEST_F(EditTest, RepeatedUniqueValueFailsInTheEngine) {
  request["modified"] = json("{'client_id': 'b'}");
  EXPECT_FALSE(clients->DBEdit(request));
  expectError(*clients, 19, "UNIQUE constraint failed: oauth_clientInfo.client_id");
  EXPECT_EQ(storedIds(), "<b>,<a>,<c>");
}

TEST_F(EditTest, FailedEncryptionOfTheConditionRunsNoStatement) {
  Platform::failEncryptFrom(1);
  request["modified"]["client_secret"] = "y";
  EXPECT_FALSE(clients->DBEdit(request));
  expectError(*clients, -4, "Data Encrypt failed");
  EXPECT_THAT(lines(), ElementsAre(plain("Data Encrypt failed")));
  EXPECT_EQ(scopes(), "read,read,read");
  EXPECT_EQ(request["modified"]["client_secret"], "y");
}

TEST_F(EditTest, FailedEncryptionOfAChangeRunsNoStatement) {
  Platform::failEncryptFrom(2);
  request["modified"]["client_secret"] = "y";
  EXPECT_FALSE(clients->DBEdit(request));
  expectError(*clients, -4, "Data Encrypt failed");
  EXPECT_THAT(lines(), ElementsAre(plain("Data Encrypt failed")));
  EXPECT_EQ(scopes(), "read,read,read");
  EXPECT_EQ(request["condition"]["client_id"], "<a>");
}

TEST_F(EditTest, EditIsTracedToItsEnd) {
  EXPECT_THAT(
      traced(15, [&] { clients->DBEdit(request); }),
      ElementsAre("==> DBEdit", "==> ParamEncrypt[client_id]", "==> GetUpdateParam",
                  "==> ConcateParam", "==> GetConditionParam", "==> ConcateParam", "==> DBCmd",
                  "==> DBCmdRun[UPDATE oauth_clientInfo SET scope='write' WHERE "
                  "client_id='<a>';]",
                  "ClientInfo Edit success, changed[1]"));
}

TEST_F(EditTest, SuccessNamesTheClientsForEveryTable) {
  Json::Value row = json("{'timestamp': '5', 'msg': 'a'}");
  logs->DBAdd(row);
  row = json("{'timestamp': '5', 'msg': 'b'}");
  logs->DBAdd(row);
  request = json("{'modified': {'msg': 'c'}}");
  EXPECT_THAT(tracedLines(1, [&] { logs->DBEdit(request); }),
              ElementsAre(Line{kError, "ClientInfo Edit success, changed[%d]",
                               "ClientInfo Edit success, changed[2]"}));
  EXPECT_THAT(traced(2 + 4, [&] { logs->DBEdit(request); }), IsEmpty());
}

// DBDel -----------------------------------------------------------------------

class DelTest : public GetTest {};

TEST_F(DelTest, DeletesTheRowsThatMeetTheCondition) {
  request["condition"]["client_id"] = "a";
  EXPECT_TRUE(clients->DBDel(request));
  EXPECT_EQ(storedIds(), "<b>,<c>");
  EXPECT_EQ(request, json("{'condition': {'client_id': '<a>'}}"));
  expectNoError(*clients);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(DelTest, WithoutConditionEveryRowGoes) {
  EXPECT_TRUE(clients->DBDel(request));
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_clientInfo"), "0");
  EXPECT_EQ(request, json("{'condition': null}"));
}

TEST_F(DelTest, EmptyTableIsAFailureWithoutAnError) {
  EXPECT_FALSE(logs->DBDel(request));
  expectNoError(*logs);
  EXPECT_THAT(lines(), ElementsAre(failed("Delete", "oauth_log")));
}

TEST_F(DelTest, NoMatchingRowLeavesAnEarlierError) {
  clients->SetErrCode(-2);
  clients->SetErrMsg("Bad parameters");
  request["condition"]["id"] = "99";
  EXPECT_FALSE(clients->DBDel(request));
  expectError(*clients, -2, "Bad parameters");
  EXPECT_THAT(lines(), ElementsAre(failed("Delete", "oauth_clientInfo")));
}

TEST_F(DelTest, LikeAndOptionAreNotRead) {
  request = json("{'condition': {'id': '1'}, 'condition_like': '0', 'option': 'nonsense'}");
  EXPECT_TRUE(clients->DBDel(request));
  EXPECT_EQ(storedIds(), "<a>,<c>");
}

TEST_F(DelTest, FailureInTheEngineIsLoggedWithTheTable) {
  request["condition"]["no_column"] = "1";
  EXPECT_FALSE(clients->DBDel(request));
  expectError(*clients, 1, "no such column: no_column");
  EXPECT_THAT(lines(), ElementsAre(Line{kError, "Run Command failed!![%s][%d]",
                                        "Run Command failed!![no such column: no_column][1]"},
                                   failed("Delete", "oauth_clientInfo")));
}

TEST_F(DelTest, FailedEncryptionRunsNoStatement) {
  Platform::failEncryptFrom(1);
  request["condition"]["client_id"] = "a";
  EXPECT_FALSE(clients->DBDel(request));
  expectError(*clients, -4, "Data Encrypt failed");
  EXPECT_THAT(lines(), ElementsAre(plain("Data Encrypt failed")));
  EXPECT_EQ(storedIds(), "<b>,<a>,<c>");
}

TEST_F(DelTest, DelIsTracedToItsEnd) {
  request["condition"]["client_id"] = "a";
  EXPECT_THAT(traced(15, [&] { clients->DBDel(request); }),
              ElementsAre("==> DBDel", "==> ParamEncrypt[client_id]", "==> GetConditionParam",
                          "==> ConcateParam", "==> DBCmd",
                          "==> DBCmdRun[DELETE FROM oauth_clientInfo WHERE client_id='<a>';]",
                          "ClientInfo Delete success, changed[1]"));
}

TEST_F(DelTest, StatementWithoutConditionIsTheTableAlone) {
  EXPECT_THAT(traced(8, [&] { clients->DBDel(request); }),
              ElementsAre("==> DBDel", "==> GetConditionParam", "==> DBCmd",
                          "==> DBCmdRun[DELETE FROM oauth_clientInfo;]"));
}

TEST_F(DelTest, SuccessNamesTheClientsAndCountsTheRows) {
  EXPECT_THAT(tracedLines(1, [&] { clients->DBDel(request); }),
              ElementsAre(Line{kError, "ClientInfo Delete success, changed[%d]",
                               "ClientInfo Delete success, changed[3]"}));
}

TEST_F(DelTest, FailureIsTracedWithoutASuccess) {
  request["condition"]["id"] = "99";
  EXPECT_THAT(traced(1, [&] { clients->DBDel(request); }),
              ElementsAre("Delete failed[oauth_clientInfo]"));
}

// Hostile values --------------------------------------------------------------

TEST_F(RowsTest, ValuesOfAnyTextComeBackAsTheyWere) {
  const std::string texts[] = {"it's",
                               "'); DROP TABLE oauth_log; --",
                               "%s%n%q",
                               "\xff\xfe\x80",
                               "d\xc3\xa9j\xc3\xa0 \xf0\x9f\x94\x91",
                               "line\nand\ttab",
                               "",
                               std::string(1 << 20, '\'')};
  for (const std::string& text : texts) {
    Json::Value row;
    row["msg"] = text;
    row["timestamp"] = Json::Value();
    EXPECT_TRUE(logs->DBAdd(row));
    Json::Value request;
    request["condition"]["msg"] = text;
    Json::Value rows;
    EXPECT_TRUE(logs->DBGet(request, &rows));
    ASSERT_THAT(rows, SizeIs(1)) << text.substr(0, 40);
    EXPECT_EQ(rows[0]["msg"].asString(), text);
  }
}

TEST_F(RowsTest, ValueWithANulByteIsRefusedByTheEngine) {
  Json::Value row;
  row["msg"] = std::string("a\0b", 3);
  row["timestamp"] = Json::Value();
  EXPECT_FALSE(logs->DBAdd(row));
  EXPECT_EQ(logs->GetErrCode(), 1);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log"), "0");
}

}  // namespace
