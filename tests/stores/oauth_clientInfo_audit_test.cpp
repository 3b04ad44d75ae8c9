// The audit entry of a registration, and the log that is open while it lasts.

#include <gmock/gmock.h>
#include <json/value.h>

#include <algorithm>
#include <string>

#include "tests/stores/text_operations.h"

using support::Row;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

namespace {

constexpr char kTable[] = "oauth_clientInfo";
constexpr char kLog[] = "oauth_log";

class AuditTest : public StoreTest {
 protected:
  static void refuseEntries() {
    sql("CREATE TRIGGER refuse BEFORE INSERT ON oauth_log BEGIN SELECT RAISE(ABORT, 'no'); END;");
  }

  /// Position of the first line that contains `text`.
  static long positionOf(const Lines& lines, const std::string& text) {
    const auto found = std::find_if(lines.begin(), lines.end(), [&](const std::string& line) {
      return line.find(text) != std::string::npos;
    });
    EXPECT_NE(found, lines.end()) << text;
    return found - lines.begin();
  }
};

TEST_F(AuditTest, RegistrationWritesOneEntry) {
  support::Clock::setTo(1700000000);
  ASSERT_TRUE(succeeded(addClient({{"display_name", "Photo Frame"}})));
  EXPECT_EQ(onlyRow(kLog), (Row{{"id", "1"},
                                {"msg", "Application registed[Photo Frame]"},
                                {"timestamp", "1700000000"}}));
}

TEST_F(AuditTest, ShortFormsWriteTheEntryToo) {
  Json::Value out;
  onClients([&](auto& store) { return store.Add("abc", "read", "First", out); });
  onClients(
      [&](auto& store) { return store.Add(support::id64('s'), "abc", "read", "Second", out); });
  EXPECT_THAT(rows(kLog),
              ElementsAre(Contains(::testing::Pair("msg", "Application registed[First]")),
                          Contains(::testing::Pair("msg", "Application registed[Second]"))));
}

TEST_F(AuditTest, EntryHoldsTheNameAsGivenWithItsQuotesDoubledOnce) {
  ASSERT_TRUE(succeeded(addClient({{"display_name", "O'Neill"}})));
  EXPECT_EQ(onlyRow(kLog)["msg"], "Application registed[O''Neill]");
}

TEST_F(AuditTest, EntryComesAfterTheRow) {
  const Lines statements = addClient().statements;
  EXPECT_LT(positionOf(statements, "INSERT INTO oauth_clientInfo"),
            positionOf(statements, "INSERT INTO oauth_log"));
}

TEST_F(AuditTest, RefusedRegistrationsWriteNoEntry) {
  ASSERT_FALSE(addClient({{"scope", ""}}).ok);
  EXPECT_EQ(rowCount(kLog), 0);
}

TEST_F(AuditTest, FailedInsertWritesNoEntry) {
  insertClient({{"client_id", cipher(support::id64('n'))}});
  ASSERT_FALSE(addClient().ok);
  EXPECT_EQ(rowCount(kLog), 0);
}

TEST_F(AuditTest, RefusedEntryDoesNotChangeTheResult) {
  refuseEntries();
  const Aftermath outcome = addClient();
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.lines, ElementsAre("oauth_db_basic Run Command failed!![no][19]",
                                         "oauth_db_basic Add failed[oauth_log]"));
  EXPECT_EQ(rowCount(kTable), 1);
}

TEST_F(AuditTest, FailedRotationDoesNotChangeTheResult) {
  sql("CREATE TRIGGER refuse BEFORE DELETE ON oauth_log BEGIN SELECT RAISE(ABORT, 'no'); END;");
  writeSettings(R"({"log_max": 1})");
  insertLog();
  EXPECT_TRUE(succeeded(addClient()));
  EXPECT_EQ(rowCount(kLog), 2);
}

TEST_F(AuditTest, LogTableThatWasDroppedComesBackWithTheRegistration) {
  KELDOAUTHSERVER::OAUTHDBClientInfo store(kTable);
  sql("DROP TABLE oauth_log;");
  Json::Value out;
  EXPECT_TRUE(succeeded(runOn(store, [&](auto& s) { return s.Add("abc", "r", "App", out); })));
  EXPECT_EQ(rowCount(kLog), 1);
}

TEST_F(AuditTest, LogIsOpenedBeforeTheTableIsCounted) {
  const Lines statements = addClient().statements;
  EXPECT_LT(positionOf(statements, "CREATE TABLE IF NOT EXISTS oauth_log("),
            positionOf(statements, "SELECT COUNT(*) FROM oauth_clientInfo"));
}

/// Ids that are not root's make opening and closing visible: either raises them
/// and puts them back, the user being root again before the group may change.
class HeldLogTest : public AuditTest {
 protected:
  /// The lines of one registration by an object that exists before; what comes
  /// of opening or closing the log is one entry.
  static Lines linesOf(const Texts& changes) {
    support::FakeIds::use(1000, 1000);
    const Lines all = addClient(changes).lines;
    Lines lines;
    for (std::size_t i = 0; i < all.size(); ++i) {
      const bool isSwitch = all.size() - i >= kSwitch.size() &&
                            std::equal(kSwitch.begin(), kSwitch.end(), all.begin() + i);
      lines.push_back(isSwitch ? "switch" : all[i]);
      if (isSwitch) i += kSwitch.size() - 1;
    }
    return lines;
  }

  static inline const Lines kSwitch{"<38>oauth_db_basic WARNING: setresgid(-1, 0, -1)",
                                    "<38>oauth_db_basic WARNING: setresuid(-1, 0, -1)",
                                    "<38>oauth_db_basic WARNING: setresuid(-1, 0, -1)"};
};

TEST_F(HeldLogTest, AcceptedRegistrationOpensAndClosesItOnce) {
  EXPECT_THAT(linesOf({}), ElementsAre("switch", "switch"));
}

TEST_F(HeldLogTest, RefusedArgumentsOpenItBeforeAndCloseItAfter) {
  EXPECT_THAT(linesOf({{"enable", "x"}}),
              ElementsAre("switch", "oauth_clientInfo:76 Bad parameters", "switch"));
}

TEST_F(HeldLogTest, FullTableOpensItBeforeAndClosesItAfter) {
  writeSettings(R"({"client_info_max": 1})");
  insertClient();
  EXPECT_THAT(linesOf({}),
              ElementsAre("switch", "oauth_clientInfo:63 ClientInfo Table is full", "switch"));
}

TEST_F(HeldLogTest, LogThatCannotBeOpenedDoesNotChangeTheResult) {
  KELDOAUTHSERVER::OAUTHDBClientInfo store(kTable);
  sql("ALTER TABLE oauth_log RENAME TO old_log;");
  sql("CREATE INDEX oauth_log ON old_log(msg);");  // the table cannot be created beside it
  Json::Value out;
  const Aftermath outcome = runOn(store, [&](auto& s) { return s.Add("abc", "r", "App", out); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.lines, Contains("oauth_db_basic Create Table failed!![oauth_log]"));
  EXPECT_THAT(outcome.lines, Contains("oauth_db_basic DB is not ready!!"));
  EXPECT_EQ(rowCount(kTable), 1);
}

}  // namespace
