#include "tests/core/rows_test.h"

namespace {

using namespace core_tests;
using support::Platform;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

// DBEdit ----------------------------------------------------------------------

class EditTest : public ThreeClientsTest {
 protected:
  void SetUp() override {
    ThreeClientsTest::SetUp();
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
  EXPECT_THAT(lines(), ElementsAre(runFailed("no such column: no_column", 1),
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

class DelTest : public ThreeClientsTest {};

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
  EXPECT_THAT(lines(), ElementsAre(runFailed("no such column: no_column", 1),
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

}  // namespace
