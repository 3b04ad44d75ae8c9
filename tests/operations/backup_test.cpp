// keldoauth backup.

#include <sqlite3.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <iterator>

#include "tests/faults/small_medium.h"
#include "tests/operations/operations.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;
using testing::IsEmpty;

class Backup : public Operations {
 protected:
  void SetUp() override {
    Operations::SetUp();
    furnish();
  }

  static void expectRefused(const std::string& path, int exit, const std::string& error) {
    const auto before = filesIn(kStateDir);
    const Outcome outcome = backUp(path);
    EXPECT_THAT(outcome, ExitsWith(exit));
    EXPECT_EQ(outcome.err, "keldoauth: backup: " + error);
    EXPECT_EQ(filesIn(kStateDir), before);
  }
};

TEST_F(Backup, HasEveryRow) {
  const Outcome outcome = backUp();
  EXPECT_THAT(outcome, ExitsWith(cli::kOk));
  EXPECT_THAT(outcome.out, HasSubstr("Wrote /tmp/copies/copy.db ("));
  EXPECT_EQ(contentOf(kCopy), contentOf());
}

TEST_F(Backup, LeavesNothingBesideIt) {
  backUp();
  EXPECT_EQ(filesIn(kCopies).size(), 1U);
}

TEST_F(Backup, IsPrivateUnderEveryUmask) {
  for (const mode_t mask : {0U, 022U, 077U, 0777U}) {
    ::umask(mask);
    EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
    expectPrivate(kCopies);
    fs::remove(kCopy);
  }
}

TEST_F(Backup, KilledAtAnyStepLeavesNoHalfCopyAndNobodyElseReadsItsDraft) {
  const Content content = contentOf();
  const auto check = [&] {
    expectPrivate(kCopies);
    if (fs::exists(kCopy)) {
      EXPECT_EQ(contentOf(kCopy), content);
    }
    expectNextProgramReady();
    EXPECT_EQ(contentOf(), content);
  };
  const int steps = dieAtEachStep(
      {"backup", kCopy}, [] { putBack(kCopies, {}); }, check);
  EXPECT_GT(steps, 20);
  RecordProperty("steps", steps);
}

TEST_F(Backup, MayBeTriedAgainAfterAKill) {
  dieAt(12, Death::kBeforeTheStep, {"backup", kCopy});
  EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
}

TEST_F(Backup, IsOnTheDiskBeforeItHasItsName) {
  const std::vector<std::string> steps = stepsOf({"backup", kCopy});
  const auto named = std::find(steps.begin(), steps.end(), "rename /tmp/copies/copy.db");
  ASSERT_NE(named, steps.end());
  const auto isWrite = [](const std::string& step) {
    return step.rfind("write /tmp/copies/copy.db", 0) == 0;
  };
  const auto isSync = [](const std::string& step) {
    return step.rfind("sync /tmp/copies/copy.db", 0) == 0 &&
           step.find("-journal") == std::string::npos;
  };
  const auto last = std::find_if(std::make_reverse_iterator(named), steps.rend(), isWrite);
  EXPECT_NE(std::find_if(last.base(), named, isSync), named) << "written but not synced";
  EXPECT_NE(std::find(named, steps.end(), "sync /tmp/copies"), steps.end());
}

TEST_F(Backup, OfAStoreThatACrashLeftWithAJournal) {
  const Content content = crashWhileWriting();
  EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
  EXPECT_EQ(contentOf(kCopy), content);
}

TEST_F(Backup, OfAStoreInWalModeStandsAlone) {
  execute(kDatabase, "PRAGMA journal_mode=WAL");
  EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
  EXPECT_EQ(filesIn(kCopies).size(), 1U);
  EXPECT_EQ(valueIn(kCopy, "PRAGMA journal_mode"), "delete");
  const fs::path elsewhere("/tmp/elsewhere");
  fs::create_directory(elsewhere);
  fs::copy(kCopy, elsewhere / "copy.db");
  EXPECT_EQ(contentOf(elsewhere / "copy.db"), contentOf());
}

// Refusals --------------------------------------------------------------------------

TEST_F(Backup, NeverReplacesAFile) {
  writeFile(kCopy, "precious");
  expectRefused(kCopy, cli::kRefused,
                "/tmp/copies/copy.db is there already\nhint: a copy never replaces a file\n");
  EXPECT_EQ(readFile(kCopy), "precious");
}

TEST_F(Backup, NeverReplacesADirectory) {
  expectRefused(kCopies, cli::kRefused,
                "/tmp/copies is there already\nhint: a copy never replaces a file\n");
}

TEST_F(Backup, NeverFollowsALinkThatLeadsNowhere) {
  fs::create_symlink("/tmp/copies/elsewhere", kCopy);
  expectRefused(kCopy, cli::kRefused,
                "/tmp/copies/copy.db is there already\nhint: a copy never replaces a file\n");
  EXPECT_FALSE(fs::exists("/tmp/copies/elsewhere"));
}

TEST_F(Backup, OntoTheDatabaseItself) {
  for (const char* path : {kDatabase, "/var/packages/Corvane/target/etc/../etc/oauth.db"}) {
    expectRefused(path, cli::kRefused,
                  std::string(path) + " is there already\nhint: a copy never replaces a file\n");
  }
}

TEST_F(Backup, IntoAFolderThatDoesNotExist) {
  expectRefused("/tmp/none/copy.db", cli::kUnavailable,
                "/tmp/none/copy.db: No such file or directory\n");
}

TEST_F(Backup, IntoAFolderThatCannotBeWritten) {
  ASSERT_EQ(mount("none", kCopies, "tmpfs", MS_RDONLY, nullptr), 0);
  expectRefused(kCopy, cli::kUnavailable, "/tmp/copies/copy.db: Read-only file system\n");
  umount2(kCopies, MNT_DETACH);
}

TEST_F(Backup, OntoAFullDiskLeavesNothing) {
  const faults::SmallMedium medium(kCopies);
  for (int pages = 0; pages < 8; ++pages) {
    medium.fill(pages);
    const Outcome outcome = backUp();
    EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
    EXPECT_THAT(outcome.err, HasSubstr("hint: the disk is full\n"));
    EXPECT_EQ(filesIn(kCopies).size(), 1U);
  }
  medium.empty();
  EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
}

TEST_F(Backup, WithoutADatabase) {
  fs::remove(kDatabase);
  const Outcome outcome = backUp();
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr(": there is no database yet: "));
  EXPECT_THAT(filesIn(kCopies), IsEmpty());
}

TEST_F(Backup, OfADamagedStoreIsNotKept) {
  std::string file = readFile(kDatabase);
  file.replace(4096 * 3, 100, 100, 'x');
  writeFile(kDatabase, file);
  const Outcome outcome = backUp();
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("the database is no whole store: "));
  EXPECT_THAT(filesIn(kCopies), IsEmpty());
}

TEST_F(Backup, GivesUpOnALockThatNeverGoes) {
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(kDatabase, &db), SQLITE_OK);
  ASSERT_EQ(sqlite3_exec(db, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr), SQLITE_OK);
  const Outcome outcome = hurry({"backup", kCopy});
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("database is locked (5)\n"));
  EXPECT_THAT(filesIn(kCopies), IsEmpty());
  sqlite3_close(db);
}

}  // namespace
}  // namespace operations
