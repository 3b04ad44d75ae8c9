// Registering applications: what is stored, what the caller gets, what is
// refused, and in which order.

#include <gmock/gmock.h>
#include <json/value.h>

#include <string>

#include "tests/stores/text_operations.h"

using KELDOAUTHSERVER::OAUTHDBClientInfo;
using support::id64;
using support::Row;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;

namespace {

class RegistrationTest : public StoreTest {
 protected:
  static Row client() { return onlyRow(kTable); }

  static constexpr char kTable[] = "oauth_clientInfo";
};

// What is stored --------------------------------------------------------------

TEST_F(RegistrationTest, StoresEveryColumn) {
  ASSERT_TRUE(succeeded(addClient()));
  EXPECT_EQ(client(), (Row{{"enable", "1"},
                           {"client_id", cipher(id64('n'))},
                           {"client_secret", cipher(id64('s'))},
                           {"redirect_uri", "app.example/cb"},
                           {"scope", "read"},
                           {"display_name", "App"},
                           {"id", "1"}}));
}

TEST_F(RegistrationTest, StoresDisabledApplication) {
  ASSERT_TRUE(succeeded(addClient({{"enable", "0"}})));
  EXPECT_EQ(client()["enable"], "0");
}

TEST_F(RegistrationTest, RunsOneInsertWithColumnsInOrderOfTheirNames) {
  const Aftermath outcome = addClient();
  EXPECT_THAT(
      outcome.statements,
      Contains("INSERT INTO oauth_clientInfo (client_id, client_secret, display_name, enable, id, "
               "redirect_uri, scope) VALUES('<" +
               id64('n') + ">', '<" + id64('s') +
               ">', 'App', '1', NULL, 'app.example/cb', 'read');"));
}

TEST_F(RegistrationTest, StoresQuotesDoubled) {
  ASSERT_TRUE(succeeded(addClient({{"client_id", std::string(63, 'n') + "'"},
                                   {"client_secret", "'" + std::string(63, 's')},
                                   {"redirect_uri", "it's/cb"},
                                   {"scope", "'a' 'b'"},
                                   {"display_name", "O'Neill"}})));
  const Row row = client();
  EXPECT_EQ(row.at("client_id"), cipher(std::string(63, 'n') + "''"));
  EXPECT_EQ(row.at("client_secret"), cipher("''" + std::string(63, 's')));
  EXPECT_EQ(row.at("redirect_uri"), "it''s/cb");
  EXPECT_EQ(row.at("scope"), "''a'' ''b''");
  EXPECT_EQ(row.at("display_name"), "O''Neill");
}

struct SchemeCase {
  const char* given;
  const char* stored;
};
void PrintTo(const SchemeCase& c, std::ostream* out) {
  *out << c.given;
}

class SchemeTest : public RegistrationTest, public ::testing::WithParamInterface<SchemeCase> {};

TEST_P(SchemeTest, OnePrefixIsRemoved) {
  ASSERT_TRUE(succeeded(addClient({{"redirect_uri", GetParam().given}})));
  EXPECT_EQ(client()["redirect_uri"], GetParam().stored);
}

INSTANTIATE_TEST_SUITE_P(, SchemeTest,
                         ::testing::Values(SchemeCase{"https://abcdefghijklmnopqrst",
                                                      "abcdefghijklmnopqrst"},
                                           SchemeCase{"http://abcde", "abcde"},  //
                                           SchemeCase{"https://abc", "abc"},     // just long enough
                                           SchemeCase{"http://https://abc", "https://abc"},
                                           SchemeCase{"https://http://abc", "http://abc"},
                                           SchemeCase{"https://https://abc", "https://abc"},
                                           SchemeCase{"HTTPS://abc", "HTTPS://abc"},      //
                                           SchemeCase{"Http://abc", "Http://abc"},        //
                                           SchemeCase{"http:/abc", "http:/abc"},          //
                                           SchemeCase{"https:abc", "https:abc"},          //
                                           SchemeCase{"ftp://abc", "ftp://abc"},          //
                                           SchemeCase{"com.app:/cb", "com.app:/cb"},      //
                                           SchemeCase{" https://abc", " https://abc"},    //
                                           SchemeCase{"a?u=https://b", "a?u=https://b"},  //
                                           SchemeCase{"httpss://abc", "httpss://abc"}));

struct ShortAddressCase {
  const char* given;
  bool accepted;
};
void PrintTo(const ShortAddressCase& c, std::ostream* out) {
  *out << c.given;
}

class ShortAddressTest : public RegistrationTest,
                         public ::testing::WithParamInterface<ShortAddressCase> {};

TEST_P(ShortAddressTest, LengthCountsWithoutScheme) {
  const Aftermath outcome = addClient({{"redirect_uri", GetParam().given}});
  EXPECT_EQ(outcome.ok, GetParam().accepted);
  EXPECT_EQ(rowCount(kTable), GetParam().accepted ? 1 : 0);
}

INSTANTIATE_TEST_SUITE_P(
    , ShortAddressTest,
    ::testing::Values(ShortAddressCase{"https://", false}, ShortAddressCase{"https://a", false},
                      ShortAddressCase{"https://ab", false}, ShortAddressCase{"https://abc", true},
                      ShortAddressCase{"http://", false}, ShortAddressCase{"http://ab", false},
                      ShortAddressCase{"http://abc", true}, ShortAddressCase{"ab", false},
                      ShortAddressCase{"abc", true}, ShortAddressCase{"http:/", true}));

TEST_F(RegistrationTest, AcceptsLongestAddressBehindItsScheme) {
  const std::string longest(2048, 'a');
  ASSERT_TRUE(succeeded(addClient({{"redirect_uri", "https://" + longest}})));
  EXPECT_EQ(client()["redirect_uri"], longest);
  EXPECT_TRUE(
      failed(addClient({{"redirect_uri", "http://" + longest + "a"}}), -2, "Bad parameters"));
}

// What is refused -------------------------------------------------------------

class EnableTest : public RegistrationTest, public ::testing::WithParamInterface<std::string> {};

TEST_P(EnableTest, OnlyZeroAndOneAreAccepted) {
  Json::Value out;
  const Aftermath outcome = addClient({{"enable", GetParam()}}, out);
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_clientInfo:76 Bad parameters"));
  EXPECT_TRUE(out.isNull());
  EXPECT_EQ(rowCount(kTable), 0);
}

INSTANTIATE_TEST_SUITE_P(, EnableTest,
                         ::testing::Values("", "true", "false", "2", "01", "1 ", " 1", "-1", "on",
                                           "11", "'1'", std::string("1\0", 2)));

TEST_F(RegistrationTest, FullTableIsReportedEvenWhenEveryArgumentIsBad) {
  writeSettings(R"({"client_info_max": 1})");
  insertClient();
  Json::Value out;
  const Aftermath outcome = addClient({{"client_id", ""},
                                       {"client_secret", ""},
                                       {"redirect_uri", ""},
                                       {"scope", ""},
                                       {"display_name", ""},
                                       {"enable", "maybe"}},
                                      out);
  EXPECT_TRUE(failed(outcome, -5, "ClientInfo Table is full"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_clientInfo:63 ClientInfo Table is full"));
  EXPECT_TRUE(out.isNull());
}

TEST_F(RegistrationTest, FullTableRunsNoInsert) {
  writeSettings(R"({"client_info_max": 1})");
  insertClient();
  EXPECT_THAT(addClient({{"client_id", id64('d')}}).statements,
              ::testing::Not(Contains(::testing::HasSubstr("INSERT"))));
  EXPECT_EQ(rowCount(kTable), 1);
}

TEST_F(RegistrationTest, LimitIsReadAfreshEachTime) {
  insertClient();
  OAUTHDBClientInfo store(kTable);
  Json::Value out;
  writeSettings(R"({"client_info_max": 1})");
  EXPECT_EQ(store.Add("app.example", "read", "App", out), 0);
  writeSettings(R"({"client_info_max": 2})");
  EXPECT_NE(store.Add("app.example", "read", "App", out), 0);
  EXPECT_EQ(store.Add("app.example", "read", "App", out), 0);
  EXPECT_EQ(rowCount(kTable), 2);
}

TEST_F(RegistrationTest, LimitsOfOtherTablesDoNotCount) {
  writeSettings(R"({"grantcode_max": 1, "token_max": 1, "log_max": 1})");
  insertClient();
  EXPECT_TRUE(succeeded(addClient()));
}

TEST_F(RegistrationTest, FailedCountReadsAsFull) {
  OAUTHDBClientInfo store("no_such_table");
  Json::Value out;
  const Aftermath outcome =
      runOn(store, [&](auto& s) { return s.Add("app.example", "read", "App", out); });
  EXPECT_TRUE(failed(outcome, -5, "ClientInfo Table is full"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![no such table: no_such_table][1]",
                          "oauth_db_basic Get Row Count failed[no_such_table]",
                          "oauth_db_basic Check Row Max failed[no_such_table]",
                          "oauth_clientInfo:63 ClientInfo Table is full"));
}

TEST_F(RegistrationTest, SecondUseOfAnIdentifierFailsInTheDatabase) {
  insertClient({{"client_id", cipher(id64('n'))}});
  const Aftermath outcome = addClient();
  EXPECT_TRUE(failed(outcome, 19, "UNIQUE constraint failed: oauth_clientInfo.client_id"));
  EXPECT_THAT(outcome.lines,
              ElementsAre("oauth_db_basic Run Command failed!![UNIQUE constraint failed: "
                          "oauth_clientInfo.client_id][19]",
                          "oauth_db_basic Add failed[oauth_clientInfo]"));
  EXPECT_EQ(rowCount(kTable), 1);
}

TEST_F(RegistrationTest, SecondUseOfASecretIsNoError) {
  insertClient();
  EXPECT_TRUE(succeeded(addClient()));
}

TEST_F(RegistrationTest, FailedEncryptionStoresNothing) {
  support::Platform::failEncryptFrom(1);
  const Aftermath outcome = addClient();
  EXPECT_TRUE(failed(outcome, -4, "Data Encrypt failed"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Data Encrypt failed"));
  EXPECT_EQ(rowCount(kTable), 0);
}

TEST_F(RegistrationTest, FailedEncryptionOfTheSecretStoresNothing) {
  support::Platform::failEncryptFrom(2);
  EXPECT_TRUE(failed(addClient(), -4, "Data Encrypt failed"));
  EXPECT_EQ(rowCount(kTable), 0);
}

// What the caller gets --------------------------------------------------------

TEST_F(RegistrationTest, CallerGetsIdentifierAndSecretAsGiven) {
  const std::string id = "'" + std::string(63, 'n');
  Json::Value out;
  ASSERT_TRUE(succeeded(addClient({{"client_id", id}}, out)));
  EXPECT_THAT(out.getMemberNames(), ElementsAre("client_id", "client_secret"));
  EXPECT_EQ(out["client_id"].asString(), id);
  EXPECT_EQ(out["client_secret"].asString(), id64('s'));
}

TEST_F(RegistrationTest, OtherMembersOfTheCallersDocumentStay) {
  Json::Value out;
  out["client_id"] = "old";
  out["note"] = 7;
  ASSERT_TRUE(succeeded(addClient({}, out)));
  EXPECT_EQ(out["client_id"].asString(), id64('n'));
  EXPECT_EQ(out["note"], 7);
}

TEST_F(RegistrationTest, CallerGetsIdentifierAndSecretWhenTheInsertFails) {
  insertClient({{"client_id", cipher(id64('n'))}});
  Json::Value out;
  ASSERT_FALSE(addClient({}, out).ok);
  EXPECT_EQ(out["client_id"].asString(), id64('n'));
  EXPECT_EQ(out["client_secret"].asString(), id64('s'));
}

TEST_F(RegistrationTest, CallerGetsIdentifierAndSecretWhenTheEncryptionFails) {
  support::Platform::failEncryptFrom(1);
  Json::Value out;
  ASSERT_FALSE(addClient({}, out).ok);
  EXPECT_EQ(out["client_id"].asString(), id64('n'));
  EXPECT_EQ(out["client_secret"].asString(), id64('s'));
}

TEST_F(RegistrationTest, RefusedArgumentsLeaveTheCallersDocumentAlone) {
  Json::Value out;
  out["client_id"] = "old";
  const Json::Value before = out;
  ASSERT_FALSE(addClient({{"display_name", ""}}, out).ok);
  EXPECT_EQ(out, before);
}

// Generated values ------------------------------------------------------------

constexpr char kHex64[] = "[0-9a-f]{64}";

TEST_F(RegistrationTest, GeneratesIdentifierAndSecret) {
  Json::Value out;
  ASSERT_TRUE(succeeded(onClients(
      [&](auto& store) { return store.Add("https://app.example", "read", "App", out); })));
  EXPECT_THAT(out["client_id"].asString(), MatchesRegex(kHex64));
  EXPECT_THAT(out["client_secret"].asString(), MatchesRegex(kHex64));
  EXPECT_NE(out["client_id"], out["client_secret"]);

  Row row = client();
  EXPECT_EQ(row["client_id"], cipher(out["client_id"].asString()));
  EXPECT_EQ(row["client_secret"], cipher(out["client_secret"].asString()));
  EXPECT_EQ(row["redirect_uri"], "app.example");
  EXPECT_EQ(row["enable"], "1");
}

TEST_F(RegistrationTest, GeneratesIdentifierForTheCallersSecret) {
  Json::Value out;
  ASSERT_TRUE(succeeded(onClients([&](auto& store) {
    return store.Add(id64('p'), "http://app.example", "read", "App", out);
  })));
  EXPECT_THAT(out["client_id"].asString(), MatchesRegex(kHex64));
  EXPECT_EQ(out["client_secret"].asString(), id64('p'));

  Row row = client();
  EXPECT_EQ(row["client_id"], cipher(out["client_id"].asString()));
  EXPECT_EQ(row["client_secret"], cipher(id64('p')));
  EXPECT_EQ(row["redirect_uri"], "app.example");
  EXPECT_EQ(row["enable"], "1");
}

TEST_F(RegistrationTest, EachApplicationGetsItsOwnIdentifier) {
  Json::Value first;
  Json::Value second;
  onClients([&](auto& store) { return store.Add("abc", "read", "App", first); });
  onClients([&](auto& store) { return store.Add("abc", "read", "App", second); });
  EXPECT_NE(first["client_id"], second["client_id"]);
  EXPECT_NE(first["client_secret"], second["client_secret"]);
  EXPECT_EQ(rowCount(kTable), 2);
}

TEST_F(RegistrationTest, RefusedShortFormsRevealNothing) {
  Json::Value out;
  const Aftermath outcome = onClients([&](auto& s) { return s.Add("ab", "read", "App", out); });
  EXPECT_TRUE(failed(outcome, -2, "Bad parameters"));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_clientInfo:76 Bad parameters"));
  EXPECT_TRUE(out.isNull());
}

}  // namespace
