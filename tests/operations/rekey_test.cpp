// keldoauth rekey.

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <filesystem>

#include "platform/keldcore.h"
#include "tests/faults/small_medium.h"
#include "tests/operations/operations_test.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
using support::Row;
using testing::Contains;
using testing::HasSubstr;
using testing::Not;
using testing::SizeIs;

/// What a key makes of every encrypted value, nothing where it is not its own.
using Clear = std::vector<std::string>;

class Rekey : public Operations {
 protected:
  void SetUp() override {
    Operations::SetUp();
    furnish();
    before_ = filesIn(kStateDir);
    clear_ = clearWith(kKey);
    ASSERT_THAT(clear_, Not(Contains("")));
    ASSERT_EQ(clear_.size(), 12U);
  }

  void TearDown() override {
    ::unsetenv("KELDCORE_KEY_FILE");
    Operations::TearDown();
  }

  static Outcome rekey() { return run({"rekey", "--yes"}); }

  static Clear clearWith(const std::string& key) {
    Clear clear;
    ::setenv("KELDCORE_KEY_FILE", key.c_str(), 1);
    for (const char* column :
         {"client_id FROM oauth_clientInfo", "client_secret FROM oauth_clientInfo",
          "client_id FROM oauth_grantCode", "client_id FROM oauth_token"}) {
      for (const Row& row : sql(std::string("SELECT ") + column + " ORDER BY id")) {
        std::array<char, 1024> text{};
        const int done = KCORECryptSzDecrypt(row.begin()->second.c_str(), text.data(), text.size());
        clear.emplace_back(done != 0 ? text.data() : "");
      }
    }
    ::unsetenv("KELDCORE_KEY_FILE");
    return clear;
  }

  /// What one of two keys makes of each value.
  static Clear clearWithEither(const std::string& one, const std::string& other) {
    Clear clear = clearWith(one);
    const Clear others = clearWith(other);
    for (std::size_t i = 0; i < clear.size(); ++i) {
      if (clear[i].empty()) clear[i] = others[i];
    }
    return clear;
  }

  /// The store and its one key.
  void expectNothingLeft() const {
    EXPECT_THAT(filesIn(kStateDir), SizeIs(before_.size()));
    EXPECT_EQ(fs::hard_link_count(kKey), 1U);
  }

  void expectRefused(const Outcome& outcome, int exit, const std::string& error) const {
    EXPECT_THAT(outcome, ExitsWith(exit));
    EXPECT_EQ(outcome.err, "keldoauth: rekey: " + error);
  }

  std::map<std::string, std::string> before_;
  Clear clear_;
};

TEST_F(Rekey, EncryptsEveryValueWithANewKey) {
  const Outcome outcome = rekey();
  EXPECT_THAT(outcome, ExitsWith(cli::kOk));
  EXPECT_THAT(outcome.out, HasSubstr("Encrypted 12 values with a new key"));
  EXPECT_EQ(clearWith(kKey), clear_);
  EXPECT_NE(readFile(kKey), before_["keldcore.key"]);
  EXPECT_FALSE(fs::exists(kNextKey));
}

TEST_F(Rekey, LeavesNothingThatTheOldKeyDecrypts) {
  writeFile("/tmp/old.key", before_["keldcore.key"]);
  ::chmod("/tmp/old.key", 0600);
  rekey();
  EXPECT_EQ(clearWith("/tmp/old.key"), Clear(12));
}

TEST_F(Rekey, KeepsItsFilesPrivate) {
  rekey();
  expectPrivate(kStateDir);
}

TEST_F(Rekey, OfAnEmptyStore) {
  sql("DELETE FROM oauth_clientInfo; DELETE FROM oauth_grantCode; DELETE FROM oauth_token");
  EXPECT_THAT(rekey().out, HasSubstr("Encrypted 0 values"));
}

TEST_F(Rekey, TwiceInARow) {
  rekey();
  EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
  EXPECT_EQ(clearWith(kKey), clear_);
}

// Killed ----------------------------------------------------------------------------

TEST_F(Rekey, KilledAtAnyStepIsFinishedByTheNextRun) {
  int resumed = 0;
  const auto check = [&] {
    expectPrivate(kStateDir);
    if (!fs::exists(kNextKey)) fs::copy(kKey, kNextKey);
    EXPECT_EQ(clearWithEither(kKey, kNextKey), clear_) << "a key was lost";
    if (readFile(kKey) == readFile(kNextKey)) fs::remove(kNextKey);
    if (clearWith(kKey) != clear_) ++resumed;
    EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
    EXPECT_EQ(clearWith(kKey), clear_);
    expectNothingLeft();
    contentOf();
  };
  const int steps = dieAtEachStep(
      {"rekey", "--yes"}, [&] { putBack(kStateDir, before_); }, check);
  EXPECT_GT(steps, 50);
  EXPECT_GT(resumed, 0) << "no kill struck between the commit and the new key's place";
  RecordProperty("steps", steps);
}

TEST_F(Rekey, KilledManyTimesLeavesNothingOnceTheNextRunIsThrough) {
  int kills = 0;
  for (int nth = 1; nth < 400 && !HasFailure(); nth += 3) {
    kills += dieAt(nth, Death::kBeforeTheStep, {"rekey", "--yes"}).exit == -9 ? 1 : 0;
  }
  EXPECT_GT(kills, 20);
  EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
  EXPECT_EQ(clearWith(kKey), clear_);
  expectNothingLeft();
}

TEST_F(Rekey, RemovesTheDraftsOfKilledProcessesAndNothingElse) {
  for (const char* name : {".draft-a1B2c3", ".backup", ".draft-long-ago"}) {
    writeFile(kKey + std::string(name), "bytes");
  }
  EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
  EXPECT_FALSE(fs::exists(std::string(kKey) + ".draft-a1B2c3"));
  EXPECT_TRUE(fs::exists(std::string(kKey) + ".backup"));
  EXPECT_TRUE(fs::exists(std::string(kKey) + ".draft-long-ago"));
}

TEST_F(Rekey, FailingAtAnyStepSaysSoAndIsFinishedByTheNextRun) {
  const auto check = [&](const Outcome& outcome) {
    if (outcome.exit == cli::kOk) {
      EXPECT_EQ(clearWith(kKey), clear_);
    } else {
      EXPECT_NE(outcome.err, "");
    }
    EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
    EXPECT_EQ(clearWith(kKey), clear_);
    expectNothingLeft();
  };
  failAtEachStep(
      {"rekey", "--yes"}, [&] { putBack(kStateDir, before_); }, check);
}

TEST_F(Rekey, WithoutASyncedFolderChangesNothingAndSaysSo) {
  const Outcome outcome = withoutFolderSync({"rekey", "--yes"});
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_EQ(outcome.err, std::string("keldoauth: rekey: ") + kStateDir + ": Input/output error\n");
  EXPECT_EQ(filesIn(kStateDir), before_);
}

TEST_F(Rekey, DrawsAnewWhenTheWaitingKeyDecryptsNothing) {
  for (const std::string& waiting :
       {std::string(64, 'w'), std::string("half a key"), std::string()}) {
    writeFile(kNextKey, waiting);
    ::chmod(kNextKey, 0600);
    EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
    EXPECT_NE(readFile(kKey), waiting);
    EXPECT_EQ(clearWith(kKey), clear_);
    expectNothingLeft();
  }
}

TEST_F(Rekey, KilledTwice) {
  for (int nth = 5; nth < 90 && !HasFailure(); nth += 7) {
    SCOPED_TRACE(nth);
    putBack(kStateDir, before_);
    dieAt(nth, Death::kBeforeTheStep, {"rekey", "--yes"});
    dieAt(90 - nth, Death::kWithinTheStep, {"rekey", "--yes"});
    EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
    EXPECT_EQ(clearWith(kKey), clear_);
  }
}

TEST_F(Rekey, TakesUpAStoreInWhichTheServiceHasWrittenSinceTheKill) {
  const std::vector<std::string> steps = stepsOf({"rekey", "--yes"});
  putBack(kStateDir, before_);
  const auto rename = std::find(steps.begin(), steps.end(), std::string("rename ") + kKey);
  ASSERT_NE(rename, steps.end());
  dieAt(static_cast<int>(rename - steps.begin()) + 1, Death::kBeforeTheStep, {"rekey", "--yes"});
  EXPECT_EQ(clearWith(kKey), Clear(12)) << "nothing was left to take up";
  furnish("later");
  EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
  EXPECT_THAT(clearWith(kKey), Not(Contains("")));
}

TEST_F(Rekey, RemovesTheOldKeyOnlyWhenTheNewValuesAreOnTheDisk) {
  const std::vector<std::string> steps = stepsOf({"rekey", "--yes"});
  const auto at = [&](const std::string& step) {
    return std::find(steps.rbegin(), steps.rend(), step).base() - steps.begin();
  };
  const auto commit = std::find(steps.begin(), steps.end(), std::string("unlink ") + kJournal);
  ASSERT_NE(commit, steps.end());
  const auto committed = commit - steps.begin() + 1;  // the next one is of the audit log
  const auto renamed = at(std::string("rename ") + kKey);
  const auto folder = std::string("sync ") + kStateDir;
  ASSERT_GT(renamed, committed);
  EXPECT_NE(std::find(steps.begin() + committed, steps.begin() + renamed, folder),
            steps.begin() + renamed);
  EXPECT_GT(at(folder), renamed);
}

TEST_F(Rekey, LeavesAnEntryInTheAuditLog) {
  EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log ORDER BY id DESC LIMIT 1"),
            "Key changed by [carol]");
}

TEST_F(Rekey, KnowsItsNewKeyOnTheDiskBeforeItCommits) {
  const std::vector<std::string> steps = stepsOf({"rekey", "--yes"});
  const auto made = std::find(steps.begin(), steps.end(), std::string("write ") + kNextKey);
  const auto written = std::find(steps.begin(), steps.end(), std::string("write ") + kDatabase);
  ASSERT_LT(made, written);
  EXPECT_NE(std::find(made, written, std::string("sync ") + kStateDir), written);
}

/// The service was not stopped: it encrypts with the old key still. It comes in
/// after the commit and the sync that ends it.
TEST_F(Rekey, KeepsBothKeysWhenAValueCameInAfterTheCommit) {
  const std::string cipher = sqlText("SELECT client_id FROM oauth_clientInfo WHERE id=1");
  const std::vector<std::string> steps = stepsOf({"rekey", "--yes"});
  putBack(kStateDir, before_);
  const auto commit = std::find(steps.begin(), steps.end(), std::string("unlink ") + kJournal);
  const Outcome outcome = meanwhile(static_cast<int>(commit - steps.begin()) + 3,
                                    std::string("sqlite3 ") + kDatabase +
                                        " \"INSERT INTO oauth_grantCode VALUES('u','" + cipher +
                                        "','s','c','1','x','i',9)\"",
                                    {"rekey", "--yes"});
  expectRefused(outcome, cli::kUnavailable,
                "the store has values that the new key does not decrypt\n"
                "hint: both keys are still there; stop the service and run the command again\n");
  EXPECT_EQ(readFile(kKey), before_["keldcore.key"]);
  EXPECT_TRUE(fs::exists(kNextKey));
  EXPECT_THAT(rekey().out, HasSubstr("Encrypted 1 value "));
  EXPECT_THAT(clearWith(kKey), Not(Contains("")));
}

TEST_F(Rekey, NeverFollowsALinkInThePlaceOfTheWaitingKey) {
  writeFile("/tmp/copies/precious", "precious");
  fs::create_symlink("/tmp/copies/precious", kNextKey);
  EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
  EXPECT_EQ(readFile("/tmp/copies/precious"), "precious");
  EXPECT_TRUE(fs::is_regular_file(fs::symlink_status(kKey)));
  EXPECT_EQ(clearWith(kKey), clear_);
  expectNothingLeft();
}

TEST_F(Rekey, OnAFullDiskChangesNothingAndMayBeTriedAgain) {
  const faults::SmallMedium medium(kStateDir);
  putBack(kStateDir, before_);
  for (int pages = 0; pages < 6; ++pages) {
    medium.fill(pages);
    EXPECT_THAT(rekey(), ExitsWith(cli::kUnavailable));
    EXPECT_EQ(clearWith(kKey), clear_);
    EXPECT_FALSE(fs::exists(kNextKey));
    medium.empty();
  }
  EXPECT_THAT(rekey(), ExitsWith(cli::kOk));
  EXPECT_EQ(clearWith(kKey), clear_);
  expectNothingLeft();
}

// Refusals --------------------------------------------------------------------------

TEST_F(Rekey, OfAValueThatNeitherKeyDecryptsChangesNothing) {
  execute(kDatabase, "UPDATE oauth_grantCode SET client_id='unknown' WHERE id=2");
  const auto before = filesIn(kStateDir);
  expectRefused(rekey(), cli::kRefused,
                "oauth_grantCode 2: client_id is encrypted with another key\n"
                "hint: nothing was changed\n");
  EXPECT_EQ(filesIn(kStateDir), before);
}

TEST_F(Rekey, WithAnotherKeyChangesNothing) {
  writeFile(kKey, std::string(64, 'k'));
  const auto before = filesIn(kStateDir);
  expectRefused(rekey(), cli::kRefused,
                "oauth_clientInfo 1: client_id is encrypted with another key\n"
                "hint: nothing was changed\n");
  EXPECT_EQ(filesIn(kStateDir), before);
}

TEST_F(Rekey, WithoutAKeyMakesNone) {
  fs::remove(kKey);
  expectRefused(
      rekey(), cli::kRefused,
      std::string("the key file ") + kKey +
          " is missing\nhint: put it back; where nothing was encrypted yet, the stand-in cipher "
          "makes one when it is first needed\n");
  EXPECT_FALSE(fs::exists(kKey));
}

TEST_F(Rekey, InAFolderThatCannotBeWrittenChangesNothing) {
  {
    const cli::ReadOnlyFolder readOnly;
    expectRefused(rekey(), cli::kUnavailable, std::string(kNextKey) + ": Read-only file system\n");
  }
  EXPECT_EQ(filesIn(kStateDir), before_);
}

TEST_F(Rekey, WithItsKeyApartAndADatabaseThatCannotBeWrittenChangesNothing) {
  const std::string key = "/tmp/copies/apart.key";
  fs::copy_file(kKey, key);
  fs::remove(kKey);
  ::setenv("KELDCORE_KEY_FILE", key.c_str(), 1);
  const auto keys = filesIn(kCopies);
  const cli::ReadOnlyFolder readOnly;
  expectRefused(rekey(), cli::kUnavailable,
                "attempt to write a readonly database (8)\n"
                "hint: 'keldoauth status' shows who may write the folder and the database\n");
  EXPECT_EQ(filesIn(kCopies), keys);
}

TEST_F(Rekey, WithAnotherKeyAndAWaitingOneThatIsNoneChangesNothing) {
  writeFile(kKey, std::string(64, 'k'));
  writeFile(kNextKey, "half a key");
  ::chmod(kNextKey, 0600);
  const auto before = filesIn(kStateDir);
  expectRefused(rekey(), cli::kRefused,
                "oauth_clientInfo 1: client_id is encrypted with another key\n"
                "hint: nothing was changed\n");
  EXPECT_EQ(filesIn(kStateDir), before);
}

TEST_F(Rekey, BesideAnotherOneChangesNothing) {
  const int folder = open(kStateDir, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  ASSERT_EQ(flock(folder, LOCK_EX), 0);
  expectRefused(rekey(), cli::kRefused,
                "another restore or rekey is at work\nhint: nothing was changed\n");
  EXPECT_EQ(filesIn(kStateDir), before_);
  close(folder);
}

TEST_F(Rekey, UnderALockThatNeverGoesChangesNothing) {
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(kDatabase, &db), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr), SQLITE_OK);
  expectRefused(hurry({"rekey", "--yes"}), cli::kUnavailable,
                "database is locked (5)\nhint: another process holds the database; try again\n");
  sqlite3_close(db);
  EXPECT_EQ(filesIn(kStateDir), before_);
}

TEST_F(Rekey, AtTheSameTimeEightTimesLosesNothing) {
  runEightTimes({"rekey", "--yes"}, "");
  EXPECT_EQ(clearWith(kKey), clear_);
  EXPECT_FALSE(fs::exists(kNextKey));
}

}  // namespace
}  // namespace operations
