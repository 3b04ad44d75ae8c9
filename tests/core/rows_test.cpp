#include "tests/core/rows_test.h"

namespace {

using namespace core_tests;
using support::Clock;
using support::Platform;
using support::Row;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

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
    EXPECT_THAT(lines(),
                ElementsAre(runFailed("near \")\": syntax error", 1), failed("Add", "oauth_log")));
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
