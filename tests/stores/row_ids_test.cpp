// Row ids of any 64-bit value, and the one place that cuts them.

#include <gmock/gmock.h>
#include <json/value.h>

#include <limits>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"

using namespace KELDOAUTHSERVER;
using support::id64;
using ::testing::ElementsAre;

namespace {

struct IdCase {
  const char* name;
  long long id;
  int index;  // what GetIndex makes of it
};
void PrintTo(const IdCase& c, std::ostream* out) {
  *out << c.name;
}

/// A row with the id stands in each table; another one stays what it is.
class RowIdTest : public StoreTest, public ::testing::WithParamInterface<IdCase> {
 protected:
  void SetUp() override {
    StoreTest::SetUp();
    insertClient({{"id", text()}});
    insertClient({{"id", "1"}, {"client_id", cipher(id64('d'))}});
    insertCode({{"id", text()}});
    insertCode({{"id", "1"}, {"code", id64('h')}});
    insertToken({{"id", text()}});
    insertToken({{"id", "1"}, {"access_token", id64('b')}});
  }

  static long long id() { return GetParam().id; }
  static std::string text() { return std::to_string(id()); }
  static std::string column(const std::string& name, const std::string& table) {
    return sqlText("SELECT " + name + " FROM " + table + " WHERE id=" + text() + ";");
  }
};

TEST_P(RowIdTest, IsFoundById) {
  Json::Value rows;
  EXPECT_TRUE(succeeded(onClients([&](auto& store) { return store.Get(id(), &rows); })));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["id"].asString(), text());
  EXPECT_TRUE(succeeded(onCodes([&](auto& store) { return store.Get(id(), &rows); })));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["id"].asString(), text());
  EXPECT_TRUE(succeeded(onTokens([&](auto& store) { return store.Get(id(), &rows); })));
  ASSERT_EQ(rows.size(), 1U);
  EXPECT_EQ(rows[0U]["id"].asString(), text());
}

TEST_P(RowIdTest, IsEdited) {
  const Texts scope{{"scope", "changed"}};
  EXPECT_TRUE(succeeded(editClient(id(), scope)));
  EXPECT_TRUE(succeeded(editCode(id(), scope)));
  EXPECT_TRUE(succeeded(editToken(id(), scope)));
  for (const char* table : {"oauth_clientInfo", "oauth_grantCode", "oauth_token"}) {
    EXPECT_EQ(column("scope", table), "changed") << table;
    EXPECT_EQ(sqlText(std::string("SELECT scope FROM ") + table + " WHERE id=1;"), "read");
  }
}

TEST_P(RowIdTest, IsEditedWithItsExpiry) {
  const Texts expiry{{"expired_time", "77"}};
  EXPECT_TRUE(succeeded(editCodeAndExpiry(id(), expiry)));
  EXPECT_TRUE(succeeded(editTokenAndExpiry(id(), expiry)));
  EXPECT_EQ(column("expired_time", "oauth_grantCode"), "77");
  EXPECT_EQ(column("expired_time", "oauth_token"), "77");
}

TEST_P(RowIdTest, IsSwitchedOffAndOn) {
  EXPECT_TRUE(succeeded(onClients([&](auto& store) { return store.Disable(id()); })));
  EXPECT_EQ(column("enable", "oauth_clientInfo"), "0");
  EXPECT_TRUE(succeeded(onClients([&](auto& store) { return store.Enable(id()); })));
  EXPECT_EQ(column("enable", "oauth_clientInfo"), "1");
}

TEST_P(RowIdTest, IsRemoved) {
  EXPECT_TRUE(succeeded(onClients([&](auto& store) { return store.Del(id()); })));
  EXPECT_TRUE(succeeded(onCodes([&](auto& store) { return store.Del(id()); })));
  EXPECT_TRUE(succeeded(onTokens([&](auto& store) { return store.Del(id()); })));
  for (const char* table : {"oauth_clientInfo", "oauth_grantCode", "oauth_token"}) {
    EXPECT_THAT(ids(table), ElementsAre("1")) << table;
  }
}

TEST_P(RowIdTest, IsRevoked) {
  support::Clock::setTo(1700000000);
  EXPECT_TRUE(succeeded(onCodes([&](auto& store) { return store.Revoke(id()); })));
  EXPECT_EQ(column("expired_time", "oauth_grantCode"), "1700000000");
  EXPECT_TRUE(succeeded(onTokens([&](auto& store) { return store.Revoke(id()); })));
  EXPECT_THAT(ids("oauth_token"), ElementsAre("1"));
}

TEST_P(RowIdTest, IsPurged) {
  sql("UPDATE oauth_grantCode SET expired_time='5' WHERE id=" + text() + ";");
  sql("UPDATE oauth_token SET expired_time='5' WHERE id=" + text() + ";");
  EXPECT_TRUE(succeeded(onCodes([](auto& store) { return store.Purge(); })));
  EXPECT_TRUE(succeeded(onTokens([](auto& store) { return store.Purge(); })));
  EXPECT_THAT(ids("oauth_grantCode"), ElementsAre("1"));
  EXPECT_THAT(ids("oauth_token"), ElementsAre("1"));
}

TEST_P(RowIdTest, IsCutByGetIndex) {
  EXPECT_EQ(OAUTHDBClientInfo(names::kClientInfoTable).GetIndex(id64('c')), GetParam().index);
  EXPECT_EQ(OAUTHDBGrantCode(names::kGrantCodeTable).GetIndex(id64('g')), GetParam().index);
  EXPECT_EQ(OAUTHDBToken(names::kTokenTable).GetIndex(id64('a')), GetParam().index);
}

INSTANTIATE_TEST_SUITE_P(
    Ids, RowIdTest,
    ::testing::Values(IdCase{"Negative", -5, -5}, IdCase{"Zero", 0, 0},
                      IdCase{"HighestOf32Bits", 2147483647, 2147483647},
                      IdCase{"OneAbove31Bits", 2147483648LL, std::numeric_limits<int>::min()},
                      IdCase{"OneAbove32Bits", 4294967296LL, 0},
                      IdCase{"Beyond32Bits", 5000000000LL, 705032704},
                      IdCase{"Highest", std::numeric_limits<long long>::max(), -1},
                      IdCase{"Lowest", std::numeric_limits<long long>::min(), 0}),
    ::testing::PrintToStringParamName());

}  // namespace
