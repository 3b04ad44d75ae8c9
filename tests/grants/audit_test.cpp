// The audit log.

#include "grants/audit.h"

#include "stores/oauth_log.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class AuditTest : public GrantsTest {
 protected:
  Audit& audit() { return grants().audit; }
};

TEST_F(AuditTest, WhatHappensElsewhereIsRecorded) {
  audit().record("Database restored", Actor("O'Brien"));
  EXPECT_THAT(entries(), ElementsAre("Database restored by [O'Brien]"));
}

TEST_F(AuditTest, ARepeatedEntryIsCounted) {
  for (int i = 0; i < 3; ++i) audit().record("Key changed", kAdmin);
  EXPECT_THAT(entries(), ElementsAre("Key changed by [admin] (3 times)"));
}

TEST_F(AuditTest, AnotherSubjectIsNotCounted) {
  audit().record("Key changed", kAdmin);
  audit().record("Key changed", kAdmin);
  audit().record("Key changed", Actor("admin (2 times)"));
  audit().record("Key change", kAdmin);
  audit().record("Key changed", Actor("adm"));
  EXPECT_THAT(entries(),
              ElementsAre("Key changed by [admin] (2 times)", "Key changed by [admin (2 times)]",
                          "Key change by [admin]", "Key changed by [adm]"));
}

TEST_F(AuditTest, AnHourLaterItIsRepeated) {
  audit().record("Key changed", kAdmin);
  support::Clock::advance(kHour + 1);
  audit().record("Key changed", kAdmin);
  EXPECT_THAT(entries(), SizeIs(2));
}

TEST_F(AuditTest, NoTextCanForgeAnEntry) {
  audit().record("x", Actor("bob] (9 times)\nKey changed by [root"));
  EXPECT_THAT(entries(), ElementsAre("x by [bob) (9 times)\\x0aKey changed by (root]"));
}

TEST_F(AuditTest, SixtyFourBytesOfAWordAreKept) {
  audit().record(std::string(64, 'x'), kAdmin);
  audit().record(std::string(65, 'y'), kAdmin);
  EXPECT_THAT(entries(), ElementsAre(std::string(64, 'x') + " by [admin]",
                                     std::string(64, 'y') + " by [admin]"));
}

TEST_F(AuditTest, ARepeatedEntryWithQuotesIsCounted) {
  audit().record("It's", Actor("O''Brien"));
  audit().record("It's", Actor("O''Brien"));
  EXPECT_THAT(entries(), ElementsAre("It's by [O''Brien] (2 times)"));
}

TEST_F(AuditTest, EntriesAreListedNewestFirstAndNarrowed) {
  for (const char* what : {"one", "two", "it's three"}) {
    audit().record(what, kAdmin);
    support::Clock::advance(10);
  }
  EXPECT_EQ(audit().list({})[0].text, "it's three by [admin]");
  EXPECT_EQ(audit().list({})[0].time, kNow + 20);
  EXPECT_THAT(audit().list({"it's"}), SizeIs(1));
  EXPECT_THAT(audit().list({"", kNow + 10}), SizeIs(2));
  EXPECT_THAT(audit().list({"", {}, kNow + 10}), SizeIs(2));
  EXPECT_THAT(audit().list({"o", kNow, kNow + 10}), SizeIs(2));
  EXPECT_THAT(audit().list({"", {}, {}, 1}), SizeIs(1));
  EXPECT_EQ(audit().list({"", {}, {}, 1, 1})[0].text, "two by [admin]");
  EXPECT_THAT(audit().list({"none"}), IsEmpty());
}

TEST_F(AuditTest, AFilterIsNoSql) {
  audit().record("one", kAdmin);
  EXPECT_THAT(audit().list({"x' OR '1'='1"}), IsEmpty());
  EXPECT_THAT(audit().list({std::string("one\0", 4)}), IsEmpty());
}

TEST_F(AuditTest, ClearingLeavesTheEntryThatSaysSo) {
  audit().record("one", kAdmin);
  audit().record("two", kAdmin);
  EXPECT_EQ(audit().clear(Actor("bob")), 2);
  EXPECT_THAT(entries(), ElementsAre("Audit log cleared by [bob]"));
}

TEST_F(AuditTest, WhatApplicationsDoToThemselvesIsOneEntryForAllOfThem) {
  for (const char* name : {"One", "Two", "Three"}) {
    NewApplication application{ApplicationName(name), {kAddress}, kScope};
    application.registersItself = true;
    const auto added = grants().applications.add(application, Actor(name));
    ASSERT_TRUE(added);
    ASSERT_TRUE(grants().applications.change(added->identifier,
                                             {ApplicationName(name + std::string("!"))}, kItself));
    ASSERT_TRUE(grants().applications.remove(added->identifier, kItself));
  }
  EXPECT_THAT(entries(), ElementsAre(testing::StartsWith("Application registered itself[One "),
                                     testing::StartsWith("Application changed itself[One! "),
                                     testing::StartsWith("Application removed itself[One! ")));
  for (const std::string& entry : entries()) EXPECT_THAT(entry, testing::EndsWith("(3 times)"));
}

TEST_F(AuditTest, WhatAnAdministratorDoesToOneThatRegisteredItselfHasAnEntryOfItsOwn) {
  NewApplication application{ApplicationName("One"), {kAddress}, kScope};
  application.registersItself = true;
  const auto added = grants().applications.add(application, Actor("One"));
  ASSERT_TRUE(grants().applications.remove(added->identifier, kAdmin));
  EXPECT_THAT(entries().back(), testing::StartsWith("Application removed[One "));
  EXPECT_THAT(entries().back(), testing::EndsWith("by [admin]"));
}

TEST_F(AuditTest, OtherProgramsEntriesAreRead) {
  KELDOAUTHSERVER::OAUTHDBLog(names::kLogTable).Add("Application registed[O'Frame]");
  EXPECT_THAT(entries(), ElementsAre("Application registed[O'Frame]"));
}

TEST_F(AuditTest, OtherProgramsEntriesAreNeverCountedOn) {
  KELDOAUTHSERVER::OAUTHDBLog(names::kLogTable).Add("Application registered itself at last");
  NewApplication application{ApplicationName("One"), {kAddress}, kScope};
  application.registersItself = true;
  ASSERT_TRUE(grants().applications.add(application, Actor("One")));
  EXPECT_THAT(entries(), ElementsAre("Application registered itself at last",
                                     testing::StartsWith("Application registered itself[One ")));
}

TEST_F(AuditTest, ALogThatRotatesAndFailsTakesTheOperationAlong) {
  add();
  writeSettings(R"({"log_max": 1})");
  sql("CREATE TRIGGER refuse BEFORE DELETE ON oauth_log BEGIN SELECT RAISE(ROLLBACK, 'no'); END;");
  support::Clock::advance(10);
  EXPECT_THROW(add("Other"), Trouble);
  EXPECT_THAT(grants().applications.all(), SizeIs(1));
}

}  // namespace
}  // namespace grants_test
