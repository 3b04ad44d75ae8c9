// Commands that only look or tidy up make nothing: what they made would be
// their user's, and of no use to the service.

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <set>

#include "tests/tools/cli.h"

namespace cli {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

constexpr char kKey[] = "/var/packages/Corvane/target/etc/keldcore.key";

std::set<std::string> filesIn(const std::string& folder) {
  std::set<std::string> names;
  for (const auto& entry : fs::directory_iterator(folder)) names.insert(entry.path().filename());
  return names;
}

/// Each with input that makes sense to it.
const std::vector<Arguments>& lookingCommands() {
  static const std::string token(64, 'a');
  static const std::vector<Arguments> commands{
      {"client", "list"},
      {"client", "show", "1"},
      {"client", "show", token},
      {"client", "edit", "1", "--name", "x"},
      {"client", "enable", "1"},
      {"client", "disable", token},
      {"client", "renew-secret", "1", "--yes"},
      {"client", "revoke", "1", "--yes"},
      {"client", "remove", "1", "--yes"},
      {"user", "list"},
      {"user", "show", "u"},
      {"user", "revoke", "u", "--yes"},
      {"purge", "--yes"},
      {"code", "revoke", "--all", "--yes"},
      {"token", "revoke", "--username", "u", "--yes"},
      {"token", "issue", "--client", "1", "--username", "u", "--scope", "s"},
      {"code", "issue", "--client", "1", "--username", "u", "--scope", "s", "--state", "t"},
      {"code", "list"},
      {"code", "list", "--client", token},
      {"code", "show", "1"},
      {"code", "show", "--code-file", "-"},
      {"code", "edit", "1", "--scope", "x"},
      {"code", "redeem"},
      {"code", "revoke", "1", "--yes"},
      {"code", "remove", "1", "--yes"},
      {"code", "purge", "--yes"},
      {"code", "purge", "--dry-run"},
      {"token", "list"},
      {"token", "show", "1"},
      {"token", "verify"},
      {"token", "refresh"},
      {"token", "revoke", "1", "--yes"},
      {"token", "purge", "--yes", "--grace", "5"},
      {"token", "purge", "--dry-run"},
      {"log", "list"},
      {"log", "clear", "--yes"},
      {"backup", "/tmp/copy.db"},
      {"rekey", "--yes"},
  };
  return commands;
}

class Looking : public CliTest {
 protected:
  void TearDown() override {
    EXPECT_EQ(::chown(kStateDir, ::geteuid(), ::getegid()), 0);
    CliTest::TearDown();
  }

  static std::string input() { return std::string(64, 'a'); }
};

TEST_F(Looking, WithoutADatabaseMakesNothingAndSaysSo) {
  for (const Arguments& command : lookingCommands()) {
    SCOPED_TRACE(testing::PrintToString(command));
    const Outcome outcome = run(command, input());
    EXPECT_THAT(outcome, ExitsWith(kUnavailable));
    EXPECT_THAT(outcome.err, HasSubstr(std::string(": there is no database yet: ") + kDatabase +
                                       " does not exist\nhint: "));
    EXPECT_THAT(filesIn(kStateDir), IsEmpty());
  }
}

TEST_F(Looking, AtAFileWithoutTablesAddsNone) {
  sql("CREATE TABLE recipes(name)");
  const std::string before = readFile(kDatabase);
  for (const Arguments& command : lookingCommands()) {
    SCOPED_TRACE(testing::PrintToString(command));
    const Outcome outcome = run(command, input());
    EXPECT_THAT(outcome, ExitsWith(kUnavailable));
    EXPECT_THAT(outcome.err, HasSubstr(std::string(kDatabase) + " has none of the store's tables"));
    EXPECT_EQ(readFile(kDatabase), before);
  }
}

TEST_F(Looking, StatusAddsNoTables) {
  sql("CREATE TABLE recipes(name)");
  const std::string before = readFile(kDatabase);
  EXPECT_THAT(run({"status"}), ExitsWith(kUnhealthy));
  EXPECT_EQ(readFile(kDatabase), before);
}

TEST_F(Looking, LeavesTheServiceWhatItIsTheFirstToMake) {
  if (!canBecomeNobody()) GTEST_SKIP() << "no other user in this namespace";
  ASSERT_EQ(::chown(kStateDir, kNobody, kNobody), 0);
  for (const Arguments& command : lookingCommands()) run(command, input());
  run({"status"});
  EXPECT_THAT(
      runAsNobody({"client", "add", "--redirect-uri", "app:/back", "--scope", "x", "--name", "y"}),
      ExitsWith(kOk));
}

TEST_F(Looking, WithoutAKeyMakesNone) {
  run({"log", "add", "entry"});
  ASSERT_FALSE(fs::exists(kKey));
  for (const Arguments& command : lookingCommands()) {
    SCOPED_TRACE(testing::PrintToString(command));
    run(command, input());
    EXPECT_FALSE(fs::exists(kKey));
  }
  EXPECT_THAT(run({"status"}), ExitsWith(kOk));
  EXPECT_FALSE(fs::exists(kKey));
}

TEST_F(Looking, NamesAKeyThatIsMissing) {
  const std::string client = addClient()["client_id"].asString();
  fs::remove(kKey);
  const Outcome outcome = run({"client", "show", client});
  EXPECT_THAT(outcome, ExitsWith(kUnavailable));
  EXPECT_THAT(outcome.err,
              HasSubstr(std::string(" (-4)\nhint: the key file ") + kKey + " is missing\n"));
  EXPECT_FALSE(fs::exists(kKey));
}

TEST_F(Looking, PurgesWithoutAKeyAndMakesNone) {
  addClient();
  issueCode();
  expireIn("oauth_grantCode", 1, -5);
  fs::remove(kKey);
  EXPECT_THAT(run({"code", "purge", "--yes"}).out, HasSubstr("1 expired code purged.\n"));
  EXPECT_FALSE(fs::exists(kKey));
}

TEST_F(Looking, FindsAStoreWhoseMetaTableIsGone) {
  addClient();
  sql("DROP TABLE oauth_meta");
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr("Photo Frame"));
}

TEST_F(Looking, WhereTheKeyIsNamedByTheEnvironment) {
  addClient();
  ::setenv("KELDCORE_KEY_FILE", "/tmp/nowhere\x1b\x7f/key", 1);
  const Outcome outcome = run({"client", "show", std::string(64, 'a')});
  ::unsetenv("KELDCORE_KEY_FILE");
  EXPECT_THAT(outcome.err, HasSubstr("the key file /tmp/nowhere\\x1b\\x7f/key is missing"));
  EXPECT_THAT(outcome.err, Not(HasSubstr("\x7f")));
}

TEST_F(Looking, RegistrationMakesDatabaseAndKey) {
  addClient();
  EXPECT_TRUE(fs::exists(kDatabase));
  EXPECT_TRUE(fs::exists(kKey));
}

}  // namespace
}  // namespace cli
