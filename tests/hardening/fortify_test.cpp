// Where a packager builds with _FORTIFY_SOURCE, syslog becomes another function.
// An observer still sees every line.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <thread>

#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/hardening/elf_file.h"
#include "tests/support/doubles.h"
#include "tests/support/private_mounts.h"
#include "tests/support/system_log.h"
#include "utils/oauth_names.h"

namespace hardening {
namespace {

namespace names = KELDOAUTHSERVER::names;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsSupersetOf;

class FortifyTest : public ::testing::Test {
 protected:
  void SetUp() override {
    support::requirePrivateMounts();
    std::filesystem::remove(names::kDatabaseFile);
    SystemLog::clear();
  }
};

TEST_F(FortifyTest, LibraryCallsTheFortifiedFunctionOnly) {
  const ElfFile library(HARDENING_FORTIFIED);
  EXPECT_TRUE(library.imports("__syslog_chk"));
  EXPECT_FALSE(library.imports("syslog"));
}

TEST_F(FortifyTest, FailureLineIsSeenWithItsFormat) {
  KELDOAUTHSERVER::OAUTHDBToken tokens(names::kTokenTable);
  Json::Value rows;
  EXPECT_FALSE(tokens.GetWithAccessToken("short", &rows));
  const auto lines = SystemLog::lines();
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_EQ(lines[0].priority, 3);
  EXPECT_EQ(lines[0].format, "%s:%d Bad parameters");
  EXPECT_EQ(lines[0].text, "oauth_token:212 Bad parameters");
}

TEST_F(FortifyTest, PrivilegeLinesAreSeen) {
  support::FakeIds::use(1000, 1000);
  { const KELDOAUTHSERVER::OAUTHDBLog log(names::kLogTable); }
  support::FakeIds::release();
  const std::string group = "WARNING: setresgid(-1, 0, -1)";
  const std::string user = "WARNING: setresuid(-1, 0, -1)";
  EXPECT_THAT(SystemLog::messages(), ElementsAre(group, user, user, group, user, user));
}

void useEveryClassOfLine() {
  KELDOAUTHSERVER::OAUTHDBLog log(names::kLogTable);
  Json::Value rows;
  EXPECT_NE(log.Add("it's"), 0);
  EXPECT_NE(log.Get("", "", &rows), 0);
  EXPECT_FALSE(KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable).GetWithAccessToken("x", &rows));
}

TEST_F(FortifyTest, TracesOfEveryClassAreSeen) {
  std::ofstream(names::kDebugFlagFile) << "";
  std::ofstream(names::kSettingsFile) << R"({"log_level": 15})";
  std::thread(useEveryClassOfLine).join();  // a thread looks at the switches once
  EXPECT_THAT(SystemLog::messages(),
              IsSupersetOf({"==> DBInit[init meta table]", "Create tab success", "==> Add",
                            "==> DBAdd", "[oauth_log] Add success, changed[1]", "==> DBGet",
                            "##### [1][msg = it''s]", "ClientInfo Get Done", "checkStrLen[x]"}));
}

}  // namespace
}  // namespace hardening
