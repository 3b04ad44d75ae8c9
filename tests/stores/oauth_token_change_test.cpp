// Editing, revoking, removing and finding token pairs.

#include <gmock/gmock.h>
#include <json/value.h>

#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBToken;
using support::id64;
using support::Row;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace {

constexpr char kTable[] = "oauth_token";

class TokenChangeTest : public OperationsTest {
 protected:
  static Row token(const std::string& id) {
    const std::vector<Row> found = sql("SELECT * FROM oauth_token WHERE id=" + id + ";");
    return found.empty() ? Row() : found.front();
  }

  static Aftermath revoke(long long id) {
    return onTokens([&](auto& store) { return store.Revoke(id); });
  }
  static Aftermath remove(long long id) {
    return onTokens([&](auto& store) { return store.Del(id); });
  }
  static Aftermath findAccess(const std::string& text, Json::Value& rows) {
    return onTokens([&](auto& store) { return store.GetWithAccessToken(text, &rows); });
  }
  static Aftermath findRefresh(const std::string& text, Json::Value& rows) {
    return onTokens([&](auto& store) { return store.GetWithRefreshToken(text, &rows); });
  }

  static inline const Texts kNew{{"username", "bob"},
                                 {"client_id", std::string(64, 'e')},
                                 {"scope", "write"},
                                 {"flow_type", "implicit"},
                                 {"state", "new"}};
  static inline const Texts kQuotes{{"username", "O'N"},
                                    {"client_id", std::string(63, 'e') + "'"},
                                    {"scope", "'w'"},
                                    {"flow_type", "f'"},
                                    {"state", "it's"}};
};

// Edit ------------------------------------------------------------------------

TEST_F(TokenChangeTest, EditChangesFiveColumns) {
  Row expected = token("1");
  for (const auto& [name, text] : kNew) expected[name] = text;
  expected["client_id"] = cipher(id64('e'));
  const std::vector<Row> others = everythingBut(kTable, "1");
  ASSERT_TRUE(succeeded(editToken(1, kNew)));
  EXPECT_EQ(token("1"), expected);
  EXPECT_EQ(everythingBut(kTable, "1"), others);
}

TEST_F(TokenChangeTest, EditRunsOneUpdate) {
  EXPECT_THAT(editToken(1, kNew).statements,
              ElementsAre("UPDATE oauth_token SET client_id='<" + id64('e') +
                          ">', flow_type='implicit', scope='write', state='new', username='bob' "
                          "WHERE id='1';"));
}

TEST_F(TokenChangeTest, EditStoresQuotesAsGiven) {
  ASSERT_TRUE(succeeded(editToken(1, kQuotes)));
  const Row row = token("1");
  EXPECT_EQ(row.at("username"), "O'N");
  EXPECT_EQ(row.at("client_id"), cipher(std::string(63, 'e') + "'"));
  EXPECT_EQ(row.at("scope"), "'w'");
  EXPECT_EQ(row.at("flow_type"), "f'");
  EXPECT_EQ(row.at("state"), "it's");
}

TEST_F(TokenChangeTest, EditWithExpiryChangesSixColumns) {
  Texts changes = kNew;
  changes["expired_time"] = "1700000000";
  Row expected = token("1");
  for (const auto& [name, text] : changes) expected[name] = text;
  expected["client_id"] = cipher(id64('e'));
  const std::vector<Row> others = everythingBut(kTable, "1");
  ASSERT_TRUE(succeeded(editTokenAndExpiry(1, changes)));
  EXPECT_EQ(token("1"), expected);
  EXPECT_EQ(everythingBut(kTable, "1"), others);
}

TEST_F(TokenChangeTest, EditWithExpiryRunsOneUpdate) {
  EXPECT_THAT(editTokenAndExpiry(1, kNew).statements,
              ElementsAre("UPDATE oauth_token SET client_id='<" + id64('e') +
                          ">', expired_time='9999999999', flow_type='implicit', scope='write', "
                          "state='new', username='bob' WHERE id='1';"));
}

TEST_F(TokenChangeTest, EditWithExpiryDoublesQuotesButNotThoseOfTheExpiry) {
  Texts changes = kQuotes;
  changes["expired_time"] = "'5'";
  ASSERT_TRUE(succeeded(editTokenAndExpiry(1, changes)));
  const Row row = token("1");
  EXPECT_EQ(row.at("username"), "O''N");
  EXPECT_EQ(row.at("client_id"), cipher(std::string(63, 'e') + "''"));
  EXPECT_EQ(row.at("scope"), "''w''");
  EXPECT_EQ(row.at("flow_type"), "f''");
  EXPECT_EQ(row.at("state"), "it''s");
  EXPECT_EQ(row.at("expired_time"), "'5'");
}

TEST_F(TokenChangeTest, EditOfAnUnknownIdFailsWithoutACode) {
  const std::vector<Row> before = everything();
  for (const Aftermath& outcome : {editToken(99), editTokenAndExpiry(99)}) {
    EXPECT_TRUE(failedSilently(outcome));
    EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Edit failed[oauth_token]"));
  }
  EXPECT_EQ(everything(), before);
}

TEST_F(TokenChangeTest, FailedEncryptionChangesNothing) {
  const std::vector<Row> before = everything();
  support::Platform::failEncryptFrom(1);
  for (const Aftermath& outcome : {editToken(1, kNew), editTokenAndExpiry(1, kNew)}) {
    EXPECT_TRUE(failed(outcome, -4, "Data Encrypt failed"));
    EXPECT_THAT(outcome.statements, IsEmpty());
  }
  EXPECT_EQ(everything(), before);
}

TEST_F(TokenChangeTest, EditIgnoresTheRowLimit) {
  writeSettings(R"({"token_max": 1})");
  EXPECT_TRUE(succeeded(editToken(1)));
}

// Del and Revoke ----------------------------------------------------------------

TEST_F(TokenChangeTest, DelRemovesOneRow) {
  const std::vector<Row> others = everythingBut(kTable, "1");
  const Aftermath outcome = remove(1);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("DELETE FROM oauth_token WHERE id='1';"));
  EXPECT_EQ(everything(), others);
}

TEST_F(TokenChangeTest, RevokeRemovesTheRow) {
  const std::vector<Row> others = everythingBut(kTable, "1");
  const Aftermath outcome = revoke(1);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("DELETE FROM oauth_token WHERE id='1';"));
  EXPECT_EQ(everything(), others);
}

TEST_F(TokenChangeTest, RevokedPairIsFoundByNeitherToken) {
  revoke(1);
  Json::Value rows;
  EXPECT_TRUE(succeeded(findAccess(id64('a'), rows)));
  EXPECT_TRUE(rows.empty());
  EXPECT_TRUE(succeeded(findRefresh(id64('r'), rows)));
  EXPECT_TRUE(rows.empty());
}

TEST_F(TokenChangeTest, RemovingAnUnknownIdFailsWithoutACode) {
  for (const Aftermath& outcome : {remove(99), revoke(99)}) {
    EXPECT_TRUE(failedSilently(outcome));
    EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Delete failed[oauth_token]"));
  }
}

TEST_F(TokenChangeTest, OnlyOneRevokeOfAPairSucceeds) {
  OAUTHDBToken first(kTable);
  OAUTHDBToken second(kTable);
  EXPECT_TRUE(first.Revoke(1));
  EXPECT_FALSE(second.Revoke(1));
  EXPECT_EQ(second.GetErrCode(), 255);
}

// Look-ups --------------------------------------------------------------------

TEST_F(TokenChangeTest, GetWithAccessTokenDeliversTheRowInTheClear) {
  Json::Value rows;
  const Aftermath outcome = findAccess(id64('a'), rows);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements,
              ElementsAre("SELECT * FROM oauth_token WHERE access_token='" + id64('a') + "' ;"));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_THAT(rows[0U].getMemberNames(),
              ElementsAre("access_token", "client_id", "expired_time", "flow_type", "id", "ip",
                          "refresh_token", "scope", "state", "username"));
  EXPECT_EQ(rows[0U]["client_id"].asString(), id64('c'));
  EXPECT_TRUE(rows[0U]["id"].isString());
}

TEST_F(TokenChangeTest, GetWithRefreshTokenDeliversTheRow) {
  Json::Value rows;
  const Aftermath outcome = findRefresh(id64('q'), rows);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements,
              ElementsAre("SELECT * FROM oauth_token WHERE refresh_token='" + id64('q') + "' ;"));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["id"].asString(), "2");
}

TEST_F(TokenChangeTest, OneTokenIsNotFoundAsTheOther) {
  Json::Value rows;
  EXPECT_TRUE(succeeded(findAccess(id64('r'), rows)));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
  EXPECT_TRUE(succeeded(findRefresh(id64('a'), rows)));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
}

TEST_F(TokenChangeTest, EveryRowOfASharedRefreshTokenIsFound) {
  sql("UPDATE oauth_token SET refresh_token='" + id64('r') + "';");
  Json::Value rows;
  EXPECT_TRUE(succeeded(findRefresh(id64('r'), rows)));
  EXPECT_EQ(rows.size(), 2U);
}

TEST_F(TokenChangeTest, ExpiredPairIsFound) {
  sql("UPDATE oauth_token SET expired_time='5';");
  Json::Value rows;
  EXPECT_TRUE(succeeded(findAccess(id64('a'), rows)));
  EXPECT_EQ(rows.size(), 1U);
}

TEST_F(TokenChangeTest, TokensWithQuotesAreFoundAgain) {
  const std::string access = std::string(63, 't') + "'";
  const std::string refresh = "'" + std::string(63, 'u');
  ASSERT_TRUE(succeeded(addToken({{"access_token", access}, {"refresh_token", refresh}})));
  Json::Value rows;
  EXPECT_TRUE(succeeded(findAccess(access, rows)));
  EXPECT_EQ(rows.size(), 1U);
  EXPECT_TRUE(succeeded(findRefresh(refresh, rows)));
  EXPECT_EQ(rows.size(), 1U);
  EXPECT_EQ(OAUTHDBToken(kTable).GetIndex(access), 3);
}

TEST_F(TokenChangeTest, RefusedLookUpsLeaveTheResultAlone) {
  Json::Value rows("old");
  const Aftermath access = findAccess("short", rows);
  EXPECT_TRUE(failed(access, -2, "Bad parameters"));
  EXPECT_THAT(access.statements, IsEmpty());
  EXPECT_TRUE(failed(findRefresh("short", rows), -2, "Bad parameters"));
  EXPECT_EQ(rows.asString(), "old");
}

TEST_F(TokenChangeTest, GetIndexIsTheIdOfTheRow) {
  EXPECT_EQ(OAUTHDBToken(kTable).GetIndex(id64('a')), 1);
  EXPECT_EQ(OAUTHDBToken(kTable).GetIndex(id64('b')), 2);
}

TEST_F(TokenChangeTest, GetIndexOfAnUnknownTokenIsZeroWithoutACode) {
  const Aftermath outcome = onTokens([](auto& store) { return store.GetIndex(id64('z')); });
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, IsEmpty());
}

TEST_F(TokenChangeTest, GetIndexOfAMalformedTokenIsZeroWithACode) {
  const Aftermath outcome = onTokens([](auto& store) { return store.GetIndex("short"); });
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_token:212 Bad parameters"));
}

TEST_F(TokenChangeTest, GetByIdDeliversTheRow) {
  Json::Value rows;
  const Aftermath outcome = onTokens([&](auto& store) { return store.Get(2LL, &rows); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_token WHERE id='2' ;"));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["access_token"].asString(), id64('b'));
}

TEST_F(TokenChangeTest, GetByAnUnknownIdIsAnEmptySuccess) {
  Json::Value rows;
  EXPECT_TRUE(succeeded(onTokens([&](auto& store) { return store.Get(99LL, &rows); })));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
}

TEST_F(TokenChangeTest, GetOfAllDeliversEveryRow) {
  Json::Value rows;
  const Aftermath outcome = onTokens([&](auto& store) { return store.Get(&rows); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_token ;"));
  ASSERT_EQ(rows.size(), 2U);
  EXPECT_EQ(rows[0U]["access_token"].asString(), id64('a'));
  EXPECT_EQ(rows[1U]["access_token"].asString(), id64('b'));
}

TEST_F(TokenChangeTest, FailedLookUpsLeaveSqlitesError) {
  OAUTHDBToken store(kTable);
  sql("DROP TABLE oauth_token;");
  Json::Value rows;
  const Aftermath outcome =
      runOn(store, [&](auto& s) { return s.GetWithRefreshToken(id64('r'), &rows); });
  EXPECT_TRUE(failed(outcome, 1, "no such table: oauth_token"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![no such table: oauth_token][1]",
                          "oauth_db_basic Get failed[oauth_token]"));
  EXPECT_EQ(store.GetIndex(id64('a')), 0);
}

}  // namespace
