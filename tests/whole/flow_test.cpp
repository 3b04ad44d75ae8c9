// The library as a service uses it, from an empty folder to a verified token,
// with the platform's own cipher.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <algorithm>
#include <cstdlib>
#include <string>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;
using support::Clock;
using support::Row;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::Not;

namespace {

constexpr long long kNow = 1700000000;

class FlowTest : public support::World {
 protected:
  struct Client {
    std::string id;
    std::string secret;
  };
  struct Pair {
    std::string access;
    std::string refresh;
  };

  void SetUp() override {
    World::SetUp();
    Clock::setTo(kNow);
  }

  static Client registerClient(const std::string& name = "Photo Frame") {
    OAUTHDBClientInfo clients(names::kClientInfoTable);
    Json::Value out;
    EXPECT_NE(clients.Add("https://photos.example.org/callback", "photos.read", name, out), 0);
    return {out["client_id"].asString(), out["client_secret"].asString()};
  }

  static std::string issueCode(const Client& client) {
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    Json::Value out;
    EXPECT_NE(codes.Add("alice", client.id, "photos.read", "xyz", "192.0.2.7", out), 0);
    return out["code"].asString();
  }

  static Pair issueToken(const Client& client) {
    OAUTHDBToken tokens(names::kTokenTable);
    Json::Value out;
    EXPECT_NE(tokens.Add("alice", client.id, "photos.read", "authorization_code", "xyz",
                         "192.0.2.7", out),
              0);
    return {out["access_token"].asString(), out["refresh_token"].asString()};
  }

  /// True for the one caller that may go on to issue a token.
  static bool redeem(const std::string& code) {
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    const int id = codes.GetIndex(code);
    return id != 0 && codes.Del(id) != 0;
  }

  static bool isValid(const std::string& accessToken) {
    OAUTHDBToken tokens(names::kTokenTable);
    Json::Value result;
    return tokens.Verify(accessToken, result);
  }

  static int rowCount(const std::string& table) {
    return std::atoi(sqlText("SELECT count(*) FROM " + table + ";").c_str());
  }
};

TEST_F(FlowTest, LeadsFromAnEmptyFolderToAVerifiedToken) {
  const Client client = registerClient();
  const std::string code = issueCode(client);
  ASSERT_TRUE(redeem(code));
  const Pair pair = issueToken(client);

  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value result;
  ASSERT_TRUE(tokens.Verify(pair.access, result));
  EXPECT_EQ(result["username"].asString(), "alice");
  EXPECT_EQ(result["scope"].asString(), "photos.read");
  EXPECT_EQ(result["state"].asString(), "xyz");
  EXPECT_THAT(support::SystemLog::texts(), ElementsAre());
}

TEST_F(FlowTest, LeavesEveryObjectWithoutAnError) {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  OAUTHDBToken tokens(names::kTokenTable);
  OAUTHDBLog log(names::kLogTable);
  Json::Value out;
  clients.Add("https://a.example", "read", "App", out);
  const std::string client = out["client_id"].asString();
  codes.Add("alice", client, "read", "xyz", "", out);
  codes.Del(codes.GetIndex(out["code"].asString()));
  tokens.Add("alice", client, "read", "code", "xyz", "", out);
  tokens.Verify(out["access_token"].asString(), out);
  log.Add("done");
  for (const OAUTHDBBasic* store :
       {static_cast<OAUTHDBBasic*>(&clients), static_cast<OAUTHDBBasic*>(&codes),
        static_cast<OAUTHDBBasic*>(&tokens), static_cast<OAUTHDBBasic*>(&log)}) {
    EXPECT_EQ(store->GetErrCode(), 255);
    EXPECT_EQ(store->GetErrMsg(), "");
  }
}

TEST_F(FlowTest, RedeemsACodeOnce) {
  const std::string code = issueCode(registerClient());
  EXPECT_TRUE(redeem(code));
  EXPECT_FALSE(redeem(code));
}

TEST_F(FlowTest, OneOfTwoThatReadTheSameCodeRedeemsIt) {
  const std::string code = issueCode(registerClient());
  OAUTHDBGrantCode first(names::kGrantCodeTable);
  OAUTHDBGrantCode second(names::kGrantCodeTable);
  const int id = first.GetIndex(code);
  ASSERT_EQ(second.GetIndex(code), id);
  EXPECT_NE(second.Del(id), 0);
  EXPECT_EQ(first.Del(id), 0);
}

TEST_F(FlowTest, RefreshingReplacesThePair) {
  const Client client = registerClient();
  const Pair old = issueToken(client);
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value rows;
  ASSERT_TRUE(tokens.GetWithRefreshToken(old.refresh, &rows));
  ASSERT_EQ(rows.size(), 1U);
  ASSERT_EQ(rows[0U]["client_id"].asString(), client.id);
  ASSERT_TRUE(tokens.Revoke(std::atoll(rows[0U]["id"].asCString())));

  const Pair fresh = issueToken(client);
  EXPECT_FALSE(isValid(old.access));
  EXPECT_TRUE(isValid(fresh.access));
  ASSERT_TRUE(tokens.GetWithRefreshToken(old.refresh, &rows));
  EXPECT_TRUE(rows.empty());
}

TEST_F(FlowTest, TokensOutliveTheCodeTheyWereIssuedFor) {
  writeSettings(R"({"grantcode_expired": 60, "token_expired": 3600})");
  const Client client = registerClient();
  const std::string code = issueCode(client);
  const Pair pair = issueToken(client);
  Clock::advance(61);
  OAUTHDBGrantCode(names::kGrantCodeTable).Purge();
  OAUTHDBToken(names::kTokenTable).Purge();
  EXPECT_FALSE(redeem(code));
  EXPECT_TRUE(isValid(pair.access));
  Clock::advance(3600);
  OAUTHDBToken(names::kTokenTable).Purge();
  EXPECT_EQ(rowCount("oauth_token"), 0);
}

// What the file holds -----------------------------------------------------------

TEST_F(FlowTest, FileHoldsNoIdentifierAndNoSecretInTheClear) {
  const Client client = registerClient();
  issueCode(client);
  issueToken(client);
  const std::string file = readFile(kDatabase);
  EXPECT_THAT(file, Not(HasSubstr(client.id)));
  EXPECT_THAT(file, Not(HasSubstr(client.secret)));
}

TEST_F(FlowTest, FileHoldsCodesAndTokensInTheClear) {
  const Client client = registerClient();
  const std::string code = issueCode(client);
  const Pair pair = issueToken(client);
  const std::string file = readFile(kDatabase);
  EXPECT_THAT(file, HasSubstr(code));
  EXPECT_THAT(file, HasSubstr(pair.access));
  EXPECT_THAT(file, HasSubstr(pair.refresh));
}

TEST_F(FlowTest, OneIdentifierIsOneCiphertextInAllTables) {
  const Client client = registerClient();
  issueCode(client);
  issueToken(client);
  const std::string cipher = sqlText("SELECT client_id FROM oauth_clientInfo;");
  EXPECT_NE(cipher, client.id);
  EXPECT_EQ(sqlText("SELECT client_id FROM oauth_grantCode;"), cipher);
  EXPECT_EQ(sqlText("SELECT client_id FROM oauth_token;"), cipher);
}

TEST_F(FlowTest, LongestIdentifierOfQuotesFitsTheCipher) {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value out;
  const std::string quotes(64, '\'');
  ASSERT_NE(clients.Add(quotes, quotes, "abc", "read", "App", "1", out), 0);
  Json::Value rows;
  ASSERT_NE(clients.Get(quotes, &rows), 0);
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["client_secret"].asString(), quotes + quotes);
}

TEST_F(FlowTest, AddressOfTheRequestIsRecorded) {
  ::setenv("REMOTE_ADDR", "2001:db8::7", 1);
  const Client client = registerClient();
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  Json::Value out;
  EXPECT_NE(codes.Add("alice", client.id, "read", "xyz", getRemoteIP(), out), 0);
  EXPECT_EQ(sqlText("SELECT ip FROM oauth_grantCode;"), "2001:db8::7");
}

// What one store does to the others -----------------------------------------------

TEST_F(FlowTest, EachRegistrationLeavesOneAuditEntry) {
  registerClient("First");
  registerClient("Second");
  OAUTHDBLog log(names::kLogTable);
  Json::Value rows;
  ASSERT_NE(log.Get("registed", "ORDER BY id", &rows), 0);
  ASSERT_EQ(rows.size(), 2U);
  EXPECT_EQ(rows[0U]["msg"].asString(), "Application registed[First]");
  EXPECT_EQ(rows[1U]["msg"].asString(), "Application registed[Second]");
  EXPECT_EQ(rows[1U]["timestamp"].asString(), std::to_string(kNow));
}

TEST_F(FlowTest, RegistrationsRotateTheLog) {
  writeSettings(R"({"log_max": 2})");
  for (const char* name : {"First", "Second", "Third"}) {
    Clock::advance(1);
    registerClient(name);
  }
  EXPECT_EQ(rowCount("oauth_log"), 2);
  EXPECT_EQ(rowCount("oauth_clientInfo"), 3);
}

TEST_F(FlowTest, RemovedClientLeavesItsCodesAndTokens) {
  const Client client = registerClient();
  const std::string code = issueCode(client);
  const Pair pair = issueToken(client);
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  ASSERT_NE(clients.Del(clients.GetIndex(client.id)), 0);
  EXPECT_EQ(clients.GetIndex(client.id), 0);
  EXPECT_TRUE(isValid(pair.access));
  EXPECT_TRUE(redeem(code));
}

TEST_F(FlowTest, DisabledClientIsTheCallersAffair) {
  const Client client = registerClient();
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  ASSERT_NE(clients.Disable(clients.GetIndex(client.id)), 0);
  EXPECT_TRUE(isValid(issueToken(client).access));
}

TEST_F(FlowTest, RevokedTokenLeavesTheCode) {
  const Client client = registerClient();
  const std::string code = issueCode(client);
  const Pair pair = issueToken(client);
  OAUTHDBToken tokens(names::kTokenTable);
  ASSERT_TRUE(tokens.Revoke(tokens.GetIndex(pair.access)));
  EXPECT_TRUE(redeem(code));
}

TEST_F(FlowTest, PurgeOfOneTableLeavesTheOther) {
  const Client client = registerClient();
  issueCode(client);
  issueToken(client);
  Clock::advance(3600);
  OAUTHDBGrantCode(names::kGrantCodeTable).Purge();
  EXPECT_EQ(rowCount("oauth_grantCode"), 0);
  EXPECT_EQ(rowCount("oauth_token"), 1);
  EXPECT_EQ(rowCount("oauth_clientInfo"), 1);
}

// Several objects on one file -------------------------------------------------------

TEST_F(FlowTest, OneObjectSeesWhatAnotherJustWrote) {
  OAUTHDBToken writer(names::kTokenTable);
  OAUTHDBToken reader(names::kTokenTable);
  Json::Value pair;
  Json::Value result;
  for (int i = 0; i < 3; ++i) {
    ASSERT_NE(writer.Add("alice", support::id64('c'), "read", "code", "xyz", "", pair), 0);
    EXPECT_TRUE(reader.Verify(pair["access_token"].asString(), result));
    EXPECT_TRUE(writer.Revoke(reader.GetIndex(pair["access_token"].asString())));
    EXPECT_FALSE(reader.Verify(pair["access_token"].asString(), result));
  }
}

TEST_F(FlowTest, ObjectsKeepTheirErrorsApart) {
  OAUTHDBToken first(names::kTokenTable);
  OAUTHDBToken second(names::kTokenTable);
  EXPECT_EQ(first.GetIndex("short"), 0);
  EXPECT_EQ(first.GetErrCode(), -2);
  EXPECT_EQ(second.GetErrCode(), 255);
}

TEST_F(FlowTest, LimitCountsTheRowsOfAllObjects) {
  writeSettings(R"({"token_max": 2})");
  const Client client = registerClient();
  issueToken(client);
  issueToken(client);
  OAUTHDBToken third(names::kTokenTable);
  Json::Value out;
  EXPECT_EQ(third.Add("alice", client.id, "read", "code", "xyz", "", out), 0);
  EXPECT_EQ(third.GetErrCode(), -5);
}

TEST_F(FlowTest, SettingsReachObjectsThatAlreadyLive) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  Json::Value out;
  writeSettings(R"({"grantcode_expired": 5})");
  codes.Add("alice", support::id64('c'), "read", "xyz", "", out);
  EXPECT_EQ(sqlText("SELECT expired_time FROM oauth_grantCode;"), std::to_string(kNow + 5));
}

TEST_F(FlowTest, ManyObjectsMayLiveAtOnce) {
  std::vector<std::unique_ptr<OAUTHDBToken>> stores;
  for (int i = 0; i < 50; ++i) stores.push_back(std::make_unique<OAUTHDBToken>(names::kTokenTable));
  Json::Value out;
  for (const auto& store : stores) {
    EXPECT_NE(store->Add("alice", support::id64('c'), "read", "code", "xyz", "", out), 0);
  }
  EXPECT_EQ(rowCount("oauth_token"), 50);
}

TEST_F(FlowTest, RowsSurviveTheirObjects) {
  const Client client = registerClient();
  const Pair pair = issueToken(client);
  for (int i = 0; i < 3; ++i) EXPECT_TRUE(isValid(pair.access));
  EXPECT_EQ(rowCount("oauth_meta"), 3);
}

TEST_F(FlowTest, DroppedTableComesBackEmptyWithTheNextObject) {
  const Client client = registerClient();
  issueToken(client);
  OAUTHDBToken tokens(names::kTokenTable);
  ASSERT_NE(tokens.DBDrop(), 0);
  Json::Value rows;
  EXPECT_FALSE(tokens.Get(&rows));
  const OAUTHDBLog creates(names::kLogTable);
  EXPECT_TRUE(tokens.Get(&rows));
  EXPECT_TRUE(rows.empty());
  EXPECT_EQ(rowCount("oauth_clientInfo"), 1);
}

TEST_F(FlowTest, IdsCountFromOneInEachTable) {
  const Client client = registerClient();
  issueCode(client);
  issueToken(client);
  for (const char* table : {"oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log"}) {
    EXPECT_EQ(sqlText(std::string("SELECT id FROM ") + table + ";"), "1") << table;
  }
}

}  // namespace
