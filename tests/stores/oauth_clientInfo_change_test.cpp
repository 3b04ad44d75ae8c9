// Editing, switching, removing and finding applications.

#include <gmock/gmock.h>
#include <json/value.h>

#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBClientInfo;
using support::id64;
using support::Row;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace {

constexpr char kTable[] = "oauth_clientInfo";

class ClientTest : public OperationsTest {
 protected:
  static Row client(const std::string& id) {
    const std::vector<Row> found = sql("SELECT * FROM oauth_clientInfo WHERE id=" + id + ";");
    return found.empty() ? Row() : found.front();
  }

  static Aftermath enable(long long id) {
    return onClients([&](auto& store) { return store.Enable(id); });
  }
  static Aftermath disable(long long id) {
    return onClients([&](auto& store) { return store.Disable(id); });
  }
  static Aftermath remove(long long id) {
    return onClients([&](auto& store) { return store.Del(id); });
  }
  static Json::Value find(const std::string& clientId) {
    Json::Value rows;
    EXPECT_TRUE(succeeded(onClients([&](auto& store) { return store.Get(clientId, &rows); })));
    return rows;
  }
  static int index(const std::string& clientId) {
    return OAUTHDBClientInfo(kTable).GetIndex(clientId);
  }
};

// Edit ------------------------------------------------------------------------

TEST_F(ClientTest, EditChangesThreeColumns) {
  Row expected = client("1");
  expected["redirect_uri"] = "new.example/cb";
  expected["scope"] = "write";
  expected["display_name"] = "New";
  const std::vector<Row> others = everythingBut(kTable, "1");
  ASSERT_TRUE(succeeded(editClient(
      1, {{"redirect_uri", "new.example/cb"}, {"scope", "write"}, {"display_name", "New"}})));
  EXPECT_EQ(client("1"), expected);
  EXPECT_EQ(everythingBut(kTable, "1"), others);
}

TEST_F(ClientTest, EditRunsOneUpdate) {
  EXPECT_THAT(editClient(1).statements,
              ElementsAre("UPDATE oauth_clientInfo SET display_name='App', "
                          "redirect_uri='https://app.example/cb', scope='read' WHERE id='1';"));
}

TEST_F(ClientTest, EditKeepsTheSchemeThatRegistrationRemoves) {
  ASSERT_TRUE(succeeded(editClient(1, {{"redirect_uri", "https://app.example/cb"}})));
  ASSERT_TRUE(succeeded(addClient({{"redirect_uri", "https://app.example/cb"}})));
  EXPECT_EQ(client("1")["redirect_uri"], "https://app.example/cb");
  EXPECT_EQ(client("3")["redirect_uri"], "app.example/cb");
}

TEST_F(ClientTest, EditAcceptsAnAddressThatIsOnlyAScheme) {
  ASSERT_TRUE(succeeded(editClient(1, {{"redirect_uri", "https://"}})));
  EXPECT_EQ(client("1")["redirect_uri"], "https://");
}

TEST_F(ClientTest, EditStoresQuotesDoubled) {
  ASSERT_TRUE(succeeded(
      editClient(1, {{"redirect_uri", "it's"}, {"scope", "'a'"}, {"display_name", "O'N"}})));
  const Row row = client("1");
  EXPECT_EQ(row.at("redirect_uri"), "it''s");
  EXPECT_EQ(row.at("scope"), "''a''");
  EXPECT_EQ(row.at("display_name"), "O''N");
}

TEST_F(ClientTest, EditToTheSameValuesIsASuccess) {
  ASSERT_TRUE(succeeded(editClient(1)));
  EXPECT_TRUE(succeeded(editClient(1)));
}

TEST_F(ClientTest, EditOfAnUnknownIdFailsWithoutACode) {
  const std::vector<Row> before = everything();
  const Aftermath outcome = editClient(99);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Edit failed[oauth_clientInfo]"));
  EXPECT_EQ(everything(), before);
}

TEST_F(ClientTest, EditIgnoresTheRowLimit) {
  writeSettings(R"({"client_info_max": 1})");
  EXPECT_TRUE(succeeded(editClient(1)));
}

TEST_F(ClientTest, EditWritesNoAuditEntry) {
  ASSERT_TRUE(succeeded(editClient(1)));
  EXPECT_EQ(rowCount("oauth_log"), 2);
}

TEST_F(ClientTest, StatementThatFailsLeavesSqlitesError) {
  sql("CREATE TRIGGER t BEFORE UPDATE ON oauth_clientInfo BEGIN SELECT RAISE(ABORT, 'no'); END;");
  const Aftermath outcome = editClient(1);
  EXPECT_TRUE(failed(outcome, 19, "no"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Run Command failed!![no][19]",
                                         "oauth_db_basic Edit failed[oauth_clientInfo]"));
}

// Enable and Disable ----------------------------------------------------------

TEST_F(ClientTest, DisableChangesOneColumn) {
  Row expected = client("1");
  expected["enable"] = "0";
  const std::vector<Row> others = everythingBut(kTable, "1");
  const Aftermath outcome = disable(1);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements,
              ElementsAre("UPDATE oauth_clientInfo SET enable='0' WHERE id='1';"));
  EXPECT_EQ(client("1"), expected);
  EXPECT_EQ(everythingBut(kTable, "1"), others);
}

TEST_F(ClientTest, EnableTakesDisableBack) {
  const Row before = client("1");
  disable(1);
  const Aftermath outcome = enable(1);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements,
              ElementsAre("UPDATE oauth_clientInfo SET enable='1' WHERE id='1';"));
  EXPECT_EQ(client("1"), before);
}

TEST_F(ClientTest, SwitchingToTheSameStateIsASuccess) {
  EXPECT_TRUE(succeeded(enable(1)));
  EXPECT_TRUE(succeeded(disable(1)));
  EXPECT_TRUE(succeeded(disable(1)));
}

TEST_F(ClientTest, SwitchingAnUnknownIdFailsWithoutACode) {
  for (const Aftermath& outcome : {enable(99), disable(99)}) {
    EXPECT_TRUE(failedSilently(outcome));
    EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Edit failed[oauth_clientInfo]"));
  }
}

TEST_F(ClientTest, DisabledApplicationIsStillFound) {
  disable(1);
  EXPECT_EQ(find(id64('c'))[0U]["enable"].asString(), "0");
}

// Del -------------------------------------------------------------------------

TEST_F(ClientTest, DelRemovesOneRow) {
  const std::vector<Row> others = everythingBut(kTable, "1");
  const Aftermath outcome = remove(1);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("DELETE FROM oauth_clientInfo WHERE id='1';"));
  EXPECT_EQ(everything(), others);
}

TEST_F(ClientTest, DelLeavesCodesAndTokensOfTheApplication) {
  ASSERT_TRUE(succeeded(remove(1)));
  EXPECT_THAT(ids("oauth_grantCode"), ElementsAre("1", "2"));
  EXPECT_THAT(ids("oauth_token"), ElementsAre("1", "2"));
}

TEST_F(ClientTest, SecondDelFailsWithoutACode) {
  remove(1);
  const Aftermath outcome = remove(1);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Delete failed[oauth_clientInfo]"));
}

TEST_F(ClientTest, IdentifierIsFreeAgainAfterDel) {
  remove(1);
  EXPECT_TRUE(succeeded(addClient({{"client_id", id64('c')}})));
}

// Look-ups --------------------------------------------------------------------

TEST_F(ClientTest, GetDeliversTheRowInTheClear) {
  const Json::Value rows = find(id64('c'));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_THAT(rows[0U].getMemberNames(), ElementsAre("client_id", "client_secret", "display_name",
                                                     "enable", "id", "redirect_uri", "scope"));
  EXPECT_EQ(rows[0U]["client_id"].asString(), id64('c'));
  EXPECT_EQ(rows[0U]["client_secret"].asString(), id64('s'));
  EXPECT_TRUE(rows[0U]["id"].isString());
  EXPECT_EQ(rows[0U]["id"].asString(), "1");
}

TEST_F(ClientTest, GetComparesCiphertext) {
  Json::Value rows;
  const Aftermath outcome = onClients([&](auto& store) { return store.Get(id64('c'), &rows); });
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_clientInfo WHERE client_id='" +
                                              cipher(id64('c')) + "' ;"));
}

TEST_F(ClientTest, GetOfAnUnknownIdentifierIsAnEmptySuccess) {
  const Json::Value rows = find(id64('z'));
  EXPECT_TRUE(rows.isArray());
  EXPECT_TRUE(rows.empty());
}

TEST_F(ClientTest, GetFindsAnIdentifierWithAQuoteAgain) {
  const std::string clientId = std::string(63, 'q') + "'";
  ASSERT_TRUE(succeeded(addClient({{"client_id", clientId}})));
  const Json::Value rows = find(clientId);
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["client_id"].asString(), clientId + "'");  // a reader sees it doubled
  EXPECT_EQ(index(clientId), 3);
}

TEST_F(ClientTest, GetReplacesWhateverTheResultHeld) {
  Json::Value rows;
  rows["old"] = "member";
  onClients([&](auto& store) { return store.Get(id64('c'), &rows); });
  ASSERT_TRUE(rows.isArray());
  EXPECT_EQ(rows.size(), 1U);
}

TEST_F(ClientTest, RefusedGetLeavesTheResultAlone) {
  Json::Value rows("old");
  EXPECT_TRUE(failed(onClients([&](auto& store) { return store.Get("short", &rows); }), -2,
                     "Bad parameters"));
  EXPECT_EQ(rows.asString(), "old");
}

TEST_F(ClientTest, GetByIdDeliversTheRow) {
  Json::Value rows;
  const Aftermath outcome = onClients([&](auto& store) { return store.Get(2LL, &rows); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_clientInfo WHERE id='2' ;"));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["client_id"].asString(), id64('d'));
}

TEST_F(ClientTest, GetByAnUnknownIdIsAnEmptySuccess) {
  Json::Value rows;
  EXPECT_TRUE(succeeded(onClients([&](auto& store) { return store.Get(99LL, &rows); })));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
}

TEST_F(ClientTest, GetOfAllDeliversEveryRowInOrder) {
  Json::Value rows;
  const Aftermath outcome = onClients([&](auto& store) { return store.Get(&rows); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_clientInfo ;"));
  ASSERT_EQ(rows.size(), 2U);
  EXPECT_EQ(rows[0U]["client_id"].asString(), id64('c'));
  EXPECT_EQ(rows[1U]["client_id"].asString(), id64('d'));
}

TEST_F(ClientTest, GetOfAllOfAnEmptyTableIsAnEmptySuccess) {
  sql("DELETE FROM oauth_clientInfo;");
  Json::Value rows;
  EXPECT_TRUE(succeeded(onClients([&](auto& store) { return store.Get(&rows); })));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
}

TEST_F(ClientTest, RowThatCannotBeDecryptedIsDeliveredAsItIs) {
  sql("UPDATE oauth_clientInfo SET client_secret='clear' WHERE id=1;");
  Json::Value rows;
  const Aftermath outcome = onClients([&](auto& store) { return store.Get(1LL, &rows); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Data Decrypt failed",
                                         "oauth_db_basic Decrypt data failed"));
  EXPECT_EQ(rows[0U]["client_id"].asString(), id64('c'));
  EXPECT_EQ(rows[0U]["client_secret"].asString(), "clear");
}

TEST_F(ClientTest, FailedEncryptionOfTheIdentifierSaysDecrypt) {
  support::Platform::failEncryptFrom(1);
  Json::Value rows("old");
  const Aftermath outcome = onClients([&](auto& store) { return store.Get(id64('c'), &rows); });
  EXPECT_TRUE(failed(outcome, -4, "Data Decrypt failed"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Data Encrypt failed"));
  EXPECT_THAT(outcome.statements, IsEmpty());
  EXPECT_EQ(rows.asString(), "old");
}

TEST_F(ClientTest, GetIndexIsTheIdOfTheRow) {
  EXPECT_EQ(index(id64('c')), 1);
  EXPECT_EQ(index(id64('d')), 2);
}

TEST_F(ClientTest, GetIndexOfAnUnknownIdentifierIsZeroWithoutACode) {
  const Aftermath outcome = onClients([&](auto& store) { return store.GetIndex(id64('z')); });
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, IsEmpty());
}

TEST_F(ClientTest, GetIndexOfAMalformedIdentifierIsZeroWithACode) {
  const Aftermath outcome = onClients([&](auto& store) { return store.GetIndex("short"); });
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_clientInfo:180 Bad parameters"));
}

TEST_F(ClientTest, FailedLookUpsLeaveSqlitesError) {
  OAUTHDBClientInfo store(kTable);
  sql("DROP TABLE oauth_clientInfo;");
  Json::Value rows;
  const Aftermath outcome = runOn(store, [&](auto& s) { return s.Get(&rows); });
  EXPECT_TRUE(failed(outcome, 1, "no such table: oauth_clientInfo"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Run Command failed!![no such table: "
                                         "oauth_clientInfo][1]",
                                         "oauth_db_basic Get failed[oauth_clientInfo]"));
  EXPECT_EQ(store.GetIndex(id64('c')), 0);
}

}  // namespace
