// The disasters of docs/operations.md, step by step as they stand there.

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "tests/faults/small_medium.h"
#include "tests/operations/operations_test.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;

class Disasters : public Operations {
 protected:
  void SetUp() override {
    Operations::SetUp();
    ::chmod(kStateDir, 0700);
    furnish();
  }

  /// One line of the shell, in the state folder.
  static Outcome shell(const std::string& line) {
    return runProgram({"/bin/sh", "-ec", std::string("umask 022; cd ") + kStateDir + "; " + line});
  }

  static void damage(std::size_t page) {
    std::string file = readFile(kDatabase);
    file.replace(page * 4096, 100, 100, 'x');
    writeFile(kDatabase, file);
  }

  static Outcome status() { return run({"status"}); }

  static constexpr char kDamaged[] = "/var/packages/Corvane/target/etc/oauth.db.damaged";
};

TEST_F(Disasters, TheDiskIsFull) {
  const auto state = filesIn(kStateDir);
  const Content content = contentOf();
  const faults::SmallMedium medium(kStateDir);
  putBack(kStateDir, state);
  medium.fill(0);
  const Outcome refused = run({"log", "add", "entry"});
  EXPECT_THAT(refused, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(refused.err, HasSubstr("(13)\nhint: the disk is full\n"));
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr("first0"));
  medium.empty();
  EXPECT_EQ(contentOf(), content);
  EXPECT_THAT(run({"log", "add", "entry"}), ExitsWith(cli::kOk));
}

TEST_F(Disasters, PowerFailed) {
  const Content content = crashWhileWriting();
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr("first0"));
  EXPECT_EQ(contentOf(), content);
}

TEST_F(Disasters, TheDatabaseIsNoneAndThereIsACopy) {
  const Content content = contentOf();
  backUp();
  writeFile(kDatabase, std::string(8192, 'x'));
  EXPECT_THAT(run({"client", "list"}), ExitsWith(cli::kUnavailable));
  EXPECT_THAT(shell("mv oauth.db oauth.db.damaged"), ExitsWith(0));
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), content);
  EXPECT_THAT(status(), ExitsWith(cli::kOk));
}

TEST_F(Disasters, TheDatabaseIsMalformedAndThereIsNoCopy) {
  damage(4);
  EXPECT_THAT(shell("mv oauth.db oauth.db.damaged;"
                    "sqlite3 oauth.db.damaged .dump | sed 's/^ROLLBACK.*/COMMIT;/' |"
                    " sqlite3 oauth.db;"
                    "chmod 600 oauth.db; chown --reference=oauth.db.damaged oauth.db"),
              ExitsWith(0));
  EXPECT_THAT(status(), ExitsWith(cli::kOk));
  expectPrivate(kStateDir);
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr("first0"));
  contentOf();
  expectNextProgramReady();
  EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
}

TEST_F(Disasters, TheDatabaseIsGone) {
  fs::remove(kDatabase);
  EXPECT_THAT(run({"client", "list"}).err, HasSubstr("there is no database yet"));
  addClient();
  EXPECT_EQ(json({"client", "list"})["clients"].size(), 1U);
  EXPECT_THAT(status(), ExitsWith(cli::kOk));
}

TEST_F(Disasters, TheKeyIsGoneAndThereIsACopy) {
  fs::copy_file(kKey, "/tmp/copies/keldcore.key");
  fs::remove(kKey);
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr("first0"));
  const Outcome sick = status();
  EXPECT_THAT(sick, ExitsWith(cli::kUnhealthy));
  EXPECT_THAT(sick.out, HasSubstr(std::string("key: ") + kKey + " is missing"));
  EXPECT_THAT(shell("cp /tmp/copies/keldcore.key keldcore.key; chmod 600 keldcore.key"),
              ExitsWith(0));
  EXPECT_THAT(status(), ExitsWith(cli::kOk));
}

TEST_F(Disasters, TheKeyIsLostForGood) {
  fs::remove(kKey);
  EXPECT_THAT(shell("rm oauth.db"), ExitsWith(0));
  addClient();
  EXPECT_THAT(status(), ExitsWith(cli::kOk));
}

TEST_F(Disasters, AChangeOfTheKeyWasInterrupted) {
  const std::vector<std::string> steps = stepsOf({"rekey", "--yes"});
  const auto rename = std::find(steps.begin(), steps.end(), std::string("rename ") + kKey);
  dieAt(static_cast<int>(rename - steps.begin()) + 1, Death::kBeforeTheStep, {"rekey", "--yes"});
  ASSERT_TRUE(fs::exists(kNextKey));
  EXPECT_THAT(status(), ExitsWith(cli::kUnhealthy));
  EXPECT_THAT(run({"rekey", "--yes"}), ExitsWith(cli::kOk));
  EXPECT_THAT(status(), ExitsWith(cli::kOk));
}

TEST_F(Disasters, ASecretHasLeaked) {
  EXPECT_THAT(run({"client", "disable", "1"}), ExitsWith(cli::kOk));
  addClient("its successor");
  const Json::Value tokens = json({"token", "list", "--client", "1"})["tokens"];
  ASSERT_EQ(tokens.size(), 1U);
  EXPECT_THAT(run({"token", "revoke", "--yes", tokens[0U]["id"].asString()}), ExitsWith(cli::kOk));
  EXPECT_EQ(json({"token", "list", "--client", "1"})["tokens"].size(), 0U);
  EXPECT_THAT(run({"client", "remove", "--yes", "1"}), ExitsWith(cli::kOk));
}

TEST_F(Disasters, ATableIsFull) {
  writeSettings(R"({"token_max": 3})");
  EXPECT_THAT(status().out, HasSubstr("full (3 of 3 rows)"));
  expireIn("oauth_token", 1, -31LL * 24 * 60 * 60);
  EXPECT_THAT(run({"token", "purge", "--yes"}), ExitsWith(cli::kOk));
  const Arguments issue{"token", "issue", "--client", "1", "--username", "late", "--scope", "read"};
  EXPECT_THAT(run(issue), ExitsWith(cli::kOk));
  writeSettings(R"({"token_max": 4})");
  EXPECT_THAT(run(issue), ExitsWith(cli::kOk));
}

// Moving to another box -------------------------------------------------------------

TEST_F(Disasters, TheBoxIsReplaced) {
  const Content content = contentOf();
  backUp();
  fs::copy_file(kKey, "/tmp/copies/keldcore.key");
  putBack(kStateDir, {});
  EXPECT_THAT(shell("install -m 600 /tmp/copies/keldcore.key keldcore.key"), ExitsWith(0));
  EXPECT_THAT(restore(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(), content);
  EXPECT_THAT(run({"client", "list"}).out, HasSubstr("first0"));
  EXPECT_THAT(status(), ExitsWith(cli::kOk));
  expectPrivate(kStateDir);
}

}  // namespace
}  // namespace operations
