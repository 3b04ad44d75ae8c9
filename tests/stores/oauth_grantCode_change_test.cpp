// Editing, revoking, removing and finding grant codes.

#include <gmock/gmock.h>
#include <json/value.h>

#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBGrantCode;
using support::Clock;
using support::id64;
using support::Row;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace {

constexpr char kTable[] = "oauth_grantCode";

class GrantCodeChangeTest : public OperationsTest {
 protected:
  static Row code(const std::string& id) {
    const std::vector<Row> found = sql("SELECT * FROM oauth_grantCode WHERE id=" + id + ";");
    return found.empty() ? Row() : found.front();
  }

  static Aftermath revoke(long long id) {
    return onCodes([&](auto& store) { return store.Revoke(id); });
  }
  static Aftermath remove(long long id) {
    return onCodes([&](auto& store) { return store.Del(id); });
  }
  static Json::Value find(const std::string& text) {
    Json::Value rows;
    EXPECT_TRUE(succeeded(onCodes([&](auto& store) { return store.Get(text, &rows); })));
    return rows;
  }

  static inline const Texts kNew{{"username", "bob"},
                                 {"client_id", std::string(64, 'e')},
                                 {"scope", "write"},
                                 {"state", "new"}};
  static inline const Texts kQuotes{{"username", "O'N"},
                                    {"client_id", std::string(63, 'e') + "'"},
                                    {"scope", "'w'"},
                                    {"state", "it's"}};
};

// Edit ------------------------------------------------------------------------

TEST_F(GrantCodeChangeTest, EditChangesFourColumns) {
  Row expected = code("1");
  expected["username"] = "bob";
  expected["client_id"] = cipher(id64('e'));
  expected["scope"] = "write";
  expected["state"] = "new";
  const std::vector<Row> others = everythingBut(kTable, "1");
  ASSERT_TRUE(succeeded(editCode(1, kNew)));
  EXPECT_EQ(code("1"), expected);
  EXPECT_EQ(everythingBut(kTable, "1"), others);
}

TEST_F(GrantCodeChangeTest, EditRunsOneUpdate) {
  EXPECT_THAT(editCode(1, kNew).statements,
              ElementsAre("UPDATE oauth_grantCode SET client_id='<" + id64('e') +
                          ">', scope='write', state='new', username='bob' WHERE id='1';"));
}

TEST_F(GrantCodeChangeTest, EditStoresQuotesAsGiven) {
  ASSERT_TRUE(succeeded(editCode(1, kQuotes)));
  const Row row = code("1");
  EXPECT_EQ(row.at("username"), "O'N");
  EXPECT_EQ(row.at("client_id"), cipher(std::string(63, 'e') + "'"));
  EXPECT_EQ(row.at("scope"), "'w'");
  EXPECT_EQ(row.at("state"), "it's");
}

TEST_F(GrantCodeChangeTest, EditWithExpiryChangesFiveColumns) {
  Row expected = code("1");
  expected["username"] = "bob";
  expected["client_id"] = cipher(id64('e'));
  expected["scope"] = "write";
  expected["expired_time"] = "1700000000";
  expected["state"] = "new";
  Texts changes = kNew;
  changes["expired_time"] = "1700000000";
  const std::vector<Row> others = everythingBut(kTable, "1");
  ASSERT_TRUE(succeeded(editCodeAndExpiry(1, changes)));
  EXPECT_EQ(code("1"), expected);
  EXPECT_EQ(everythingBut(kTable, "1"), others);
}

TEST_F(GrantCodeChangeTest, EditWithExpiryRunsOneUpdate) {
  EXPECT_THAT(editCodeAndExpiry(1, kNew).statements,
              ElementsAre("UPDATE oauth_grantCode SET client_id='<" + id64('e') +
                          ">', expired_time='9999999999', scope='write', state='new', "
                          "username='bob' WHERE id='1';"));
}

TEST_F(GrantCodeChangeTest, EditWithExpiryDoublesQuotesButNotThoseOfTheExpiry) {
  Texts changes = kQuotes;
  changes["expired_time"] = "'5'";
  ASSERT_TRUE(succeeded(editCodeAndExpiry(1, changes)));
  const Row row = code("1");
  EXPECT_EQ(row.at("username"), "O''N");
  EXPECT_EQ(row.at("client_id"), cipher(std::string(63, 'e') + "''"));
  EXPECT_EQ(row.at("scope"), "''w''");
  EXPECT_EQ(row.at("state"), "it''s");
  EXPECT_EQ(row.at("expired_time"), "'5'");
}

TEST_F(GrantCodeChangeTest, EditOfAnUnknownIdFailsWithoutACode) {
  const std::vector<Row> before = everything();
  for (const Aftermath& outcome : {editCode(99), editCodeAndExpiry(99)}) {
    EXPECT_TRUE(failedSilently(outcome));
    EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Edit failed[oauth_grantCode]"));
  }
  EXPECT_EQ(everything(), before);
}

TEST_F(GrantCodeChangeTest, RefusedEditsSetNoCode) {
  EXPECT_TRUE(failedSilently(editCode(1, {{"username", ""}})));
  EXPECT_TRUE(failedSilently(editCodeAndExpiry(1, {{"expired_time", ""}})));
}

TEST_F(GrantCodeChangeTest, FailedEncryptionChangesNothing) {
  const std::vector<Row> before = everything();
  support::Platform::failEncryptFrom(1);
  for (const Aftermath& outcome : {editCode(1, kNew), editCodeAndExpiry(1, kNew)}) {
    EXPECT_TRUE(failed(outcome, -4, "Data Encrypt failed"));
    EXPECT_THAT(outcome.statements, IsEmpty());
  }
  EXPECT_EQ(everything(), before);
}

// Revoke ----------------------------------------------------------------------

TEST_F(GrantCodeChangeTest, RevokeMovesTheExpiryToNow) {
  Clock::setTo(1700000000);
  Row expected = code("1");
  expected["expired_time"] = "1700000000";
  const std::vector<Row> others = everythingBut(kTable, "1");
  const Aftermath outcome = revoke(1);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements,
              ElementsAre("UPDATE oauth_grantCode SET expired_time='1700000000' WHERE id='1';"));
  EXPECT_EQ(code("1"), expected);
  EXPECT_EQ(everythingBut(kTable, "1"), others);
}

TEST_F(GrantCodeChangeTest, RevokedCodeIsStillFound) {
  Clock::setTo(1700000000);
  revoke(1);
  Json::Value rows;
  EXPECT_TRUE(succeeded(onCodes([&](auto& store) { return store.Get(1LL, &rows); })));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["expired_time"].asString(), "1700000000");
  EXPECT_EQ(find(id64('g')).size(), 1U);
}

TEST_F(GrantCodeChangeTest, PurgeRemovesARevokedCodeOneSecondLater) {
  Clock::setTo(1700000000);
  revoke(1);
  EXPECT_TRUE(succeeded(onCodes([](auto& store) { return store.Purge(); })));
  EXPECT_THAT(ids(kTable), ElementsAre("1", "2"));
  Clock::advance(1);
  EXPECT_TRUE(succeeded(onCodes([](auto& store) { return store.Purge(); })));
  EXPECT_THAT(ids(kTable), ElementsAre("2"));
}

TEST_F(GrantCodeChangeTest, RevokeSucceedsAgainAndAgain) {
  EXPECT_TRUE(succeeded(revoke(1)));
  EXPECT_TRUE(succeeded(revoke(1)));
}

TEST_F(GrantCodeChangeTest, RevokeMovesAnExpiredCodeForward) {
  Clock::setTo(1700000000);
  sql("UPDATE oauth_grantCode SET expired_time='5' WHERE id=1;");
  EXPECT_TRUE(succeeded(revoke(1)));
  EXPECT_EQ(code("1")["expired_time"], "1700000000");
}

TEST_F(GrantCodeChangeTest, RevokeOfAnUnknownIdFailsWithoutACode) {
  const Aftermath outcome = revoke(99);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Edit failed[oauth_grantCode]"));
}

// Del -------------------------------------------------------------------------

TEST_F(GrantCodeChangeTest, DelRemovesOneRow) {
  const std::vector<Row> others = everythingBut(kTable, "1");
  const Aftermath outcome = remove(1);
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("DELETE FROM oauth_grantCode WHERE id='1';"));
  EXPECT_EQ(everything(), others);
}

TEST_F(GrantCodeChangeTest, OnlyOneDelOfACodeSucceeds) {
  OAUTHDBGrantCode first(kTable);
  OAUTHDBGrantCode second(kTable);
  EXPECT_NE(first.Del(1), 0);
  EXPECT_EQ(second.Del(1), 0);
  EXPECT_EQ(second.GetErrCode(), 255);
}

TEST_F(GrantCodeChangeTest, DelOfAnUnknownIdFailsWithoutACode) {
  const Aftermath outcome = remove(99);
  EXPECT_TRUE(failedSilently(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Delete failed[oauth_grantCode]"));
}

// Look-ups --------------------------------------------------------------------

TEST_F(GrantCodeChangeTest, GetDeliversTheRowInTheClear) {
  const Json::Value rows = find(id64('g'));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_THAT(rows[0U].getMemberNames(), ElementsAre("client_id", "code", "expired_time", "id",
                                                     "ip", "scope", "state", "username"));
  EXPECT_EQ(rows[0U]["client_id"].asString(), id64('c'));
  EXPECT_EQ(rows[0U]["expired_time"].asString(), "9999999999");
  EXPECT_TRUE(rows[0U]["id"].isString());
}

TEST_F(GrantCodeChangeTest, GetFindsAnExpiredCode) {
  sql("UPDATE oauth_grantCode SET expired_time='5';");
  EXPECT_EQ(find(id64('g')).size(), 1U);
}

TEST_F(GrantCodeChangeTest, GetOfAnUnknownCodeIsAnEmptySuccess) {
  EXPECT_EQ(find(id64('z')), Json::Value(Json::arrayValue));
}

/// Issuing stores the quote doubled and the look-up asks for it as given.
TEST_F(GrantCodeChangeTest, GetDoesNotFindACodeWithAQuoteAgain) {
  const std::string withQuote = std::string(63, 'k') + "'";
  ASSERT_TRUE(succeeded(addCode({{"code", withQuote}})));
  EXPECT_TRUE(find(withQuote).empty());
  EXPECT_EQ(OAUTHDBGrantCode(kTable).GetIndex(withQuote), 0);
}

TEST_F(GrantCodeChangeTest, GetAsksForTheCodeAsGiven) {
  Json::Value rows;
  const Aftermath outcome =
      onCodes([&](auto& store) { return store.Get(std::string(63, 'k') + "'", &rows); });
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_grantCode WHERE code='" +
                                              std::string(63, 'k') + "''' ;"));
}

TEST_F(GrantCodeChangeTest, RefusedGetLeavesTheResultAlone) {
  Json::Value rows("old");
  const Aftermath outcome = onCodes([&](auto& store) { return store.Get("short", &rows); });
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_grantCode:194 Bad parameters"));
  EXPECT_THAT(outcome.statements, IsEmpty());
  EXPECT_EQ(rows.asString(), "old");
}

TEST_F(GrantCodeChangeTest, GetIndexIsTheIdOfTheRow) {
  EXPECT_EQ(OAUTHDBGrantCode(kTable).GetIndex(id64('g')), 1);
  EXPECT_EQ(OAUTHDBGrantCode(kTable).GetIndex(id64('h')), 2);
}

TEST_F(GrantCodeChangeTest, GetIndexOfAShortCodeIsZeroWithACode) {
  const Aftermath outcome =
      onCodes([](auto& store) { return store.GetIndex(std::string(63, 'g')); });
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_grantCode:194 Bad parameters"));
}

TEST_F(GrantCodeChangeTest, GetIndexOfAnUnknownCodeIsZeroWithoutACode) {
  EXPECT_TRUE(failedSilently(onCodes([](auto& store) { return store.GetIndex(id64('z')); })));
}

TEST_F(GrantCodeChangeTest, GetByIdDeliversTheRow) {
  Json::Value rows;
  const Aftermath outcome = onCodes([&](auto& store) { return store.Get(2LL, &rows); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_grantCode WHERE id='2' ;"));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["code"].asString(), id64('h'));
}

TEST_F(GrantCodeChangeTest, GetByAnUnknownIdIsAnEmptySuccess) {
  Json::Value rows;
  EXPECT_TRUE(succeeded(onCodes([&](auto& store) { return store.Get(99LL, &rows); })));
  EXPECT_EQ(rows, Json::Value(Json::arrayValue));
}

TEST_F(GrantCodeChangeTest, GetOfAllDeliversEveryRow) {
  Json::Value rows;
  const Aftermath outcome = onCodes([&](auto& store) { return store.Get(&rows); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.statements, ElementsAre("SELECT * FROM oauth_grantCode ;"));
  ASSERT_EQ(rows.size(), 2U);
  EXPECT_EQ(rows[0U]["code"].asString(), id64('g'));
  EXPECT_EQ(rows[1U]["code"].asString(), id64('h'));
}

TEST_F(GrantCodeChangeTest, FailedLookUpsLeaveSqlitesError) {
  OAUTHDBGrantCode store(kTable);
  sql("DROP TABLE oauth_grantCode;");
  Json::Value rows;
  const Aftermath outcome = runOn(store, [&](auto& s) { return s.Get(id64('g'), &rows); });
  EXPECT_TRUE(failed(outcome, 1, "no such table: oauth_grantCode"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![no such table: oauth_grantCode][1]",
                          "oauth_db_basic Get failed[oauth_grantCode]"));
  EXPECT_EQ(store.GetIndex(id64('g')), 0);
}

}  // namespace
