// keldoauth backup.

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <iterator>

#include "tests/faults/small_medium.h"
#include "tests/operations/operations_test.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
using testing::AnyOf;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

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

  /// Whether the attacker's file has got what root wrote.
  static bool isWon(const std::string& path) {
    struct stat status {};
    return ::stat(path.c_str(), &status) == 0 && status.st_uid == cli::kNobody &&
           readFile(path).find("SQLite format 3") != std::string::npos;
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

TEST_F(Backup, KilledAtAnyStepLeavesAWholeCopyOrNothing) {
  const Content content = contentOf();
  const auto check = [&] {
    expectPrivate(kCopies);
    EXPECT_THAT(filesIn(kCopies), AnyOf(IsEmpty(), SizeIs(1)));
    if (!fs::is_empty(kCopies)) {
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

TEST_F(Backup, FailingAtAnyStepSaysSoAndLeavesAWholeCopyOrNothing) {
  const Content content = contentOf();
  const auto check = [&](const Outcome& outcome) {
    EXPECT_THAT(filesIn(kCopies), AnyOf(IsEmpty(), SizeIs(1)));
    if (outcome.exit == cli::kOk || !fs::is_empty(kCopies)) {
      EXPECT_EQ(contentOf(kCopy), content);
    }
    if (outcome.exit != cli::kOk) {
      EXPECT_NE(outcome.err, "");
    }
    EXPECT_EQ(contentOf(), content);
  };
  failAtEachStep(
      {"backup", kCopy}, [] { putBack(kCopies, {}); }, check);
}

TEST_F(Backup, ReportsAFolderThatCannotBeSynced) {
  const Outcome outcome = withoutFolderSync({"backup", kCopy});
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_EQ(outcome.err,
            "keldoauth: backup: /tmp/copies/copy.db is whole, but its folder cannot be synced: "
            "Input/output error\nhint: a power cut may take the name away again\n");
  EXPECT_EQ(contentOf(kCopy), contentOf());
}

TEST_F(Backup, MayBeTriedAgainAfterAKill) {
  dieAt(12, Death::kBeforeTheStep, {"backup", kCopy});
  EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
}

TEST_F(Backup, IsOnTheDiskBeforeItHasItsName) {
  const std::vector<std::string> steps = stepsOf({"backup", kCopy});
  const auto named = std::find(steps.begin(), steps.end(), "link copy.db");
  ASSERT_NE(named, steps.end());
  const auto isWrite = [](const std::string& step) {
    return step.rfind("write /tmp/copies/", 0) == 0;
  };
  const auto isSync = [](const std::string& step) {
    return step.rfind("sync /tmp/copies/", 0) == 0;
  };
  const auto last = std::find_if(std::make_reverse_iterator(named), steps.rend(), isWrite);
  ASSERT_NE(last, steps.rend());
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

TEST_F(Backup, OfAStoreWithATriggerIsKeptAndSaysThatItCannotBeRestored) {
  execute(kDatabase, "CREATE TRIGGER spy AFTER INSERT ON oauth_token BEGIN SELECT 1; END");
  const Outcome outcome = backUp();
  EXPECT_THAT(outcome, ExitsWith(cli::kUnhealthy));
  EXPECT_EQ(outcome.err,
            "keldoauth: backup: the store has what no store has: trigger spy\n"
            "hint: the copy is kept, but 'restore' refuses it; remove the intruder from the store "
            "and make another copy\n");
  EXPECT_EQ(contentOf(kCopy), contentOf());
}

/// While it lives no file can do without a name, as on FAT.
class NoNamelessFiles {
 public:
  NoNamelessFiles() {
    fs::create_directory("/tmp/empty");
    EXPECT_EQ(mount("/tmp/empty", "/proc", nullptr, MS_BIND, nullptr), 0);
  }
  ~NoNamelessFiles() { umount2("/proc", MNT_DETACH); }
  NoNamelessFiles(const NoNamelessFiles&) = delete;
  NoNamelessFiles& operator=(const NoNamelessFiles&) = delete;
};

TEST_F(Backup, WithoutNamelessFilesKeepsItsDraftPrivateAndLeavesNothing) {
  {
    const NoNamelessFiles named;
    EXPECT_THAT(backUp(), ExitsWith(cli::kOk));
  }
  EXPECT_THAT(filesIn(kCopies), SizeIs(1));
  expectPrivate(kCopies);
  EXPECT_EQ(contentOf(kCopy), contentOf());
}

TEST_F(Backup, WithoutNamelessFilesNoticesThatItsDraftWasReplaced) {
  const NoNamelessFiles named;
  const std::vector<std::string> steps = stepsOf({"backup", kCopy});
  const auto sync = std::find_if(steps.begin(), steps.end(), [](const std::string& step) {
    return step.rfind("sync ", 0) == 0;
  });
  ASSERT_NE(sync, steps.end());
  putBack(kCopies, {});
  const Outcome outcome = meanwhile(static_cast<int>(sync - steps.begin()) + 1,
                                    "cd /tmp/copies; mkdir ../prey; for draft in copy.db.*; do "
                                    "mv $draft ../prey; echo other >$draft; done",
                                    {"backup", kCopy});
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err, HasSubstr("/tmp/copies/copy.db is another file now: somebody put it "
                                     "there\n"));
  EXPECT_EQ(readFile(kCopy), "other\n");
}

// An attacker -----------------------------------------------------------------------

/// Watches the folder without any privilege, moves away what appears there and
/// puts a file of its own, open to all, under the same name. Ends when the folder
/// has a file "end".
[[noreturn]] void attack(const char* folder) {
  if (setresgid(cli::kNobody, cli::kNobody, cli::kNobody) != 0) ::_exit(1);
  if (setresuid(cli::kNobody, cli::kNobody, cli::kNobody) != 0) ::_exit(1);
  ::alarm(300);
  int replaced = 0;
  const std::string prey = std::string(folder) + "/prey/";
  while (!fs::exists(std::string(folder) + "/end")) {
    std::error_code error;
    for (const auto& entry : fs::directory_iterator(folder, error)) {
      const std::string name = entry.path().filename();
      struct stat status {};
      const bool isNew = ::lstat(entry.path().c_str(), &status) == 0 && S_ISREG(status.st_mode) &&
                         status.st_uid != cli::kNobody;
      if (!isNew) continue;
      if (::rename(entry.path().c_str(), (prey + std::to_string(++replaced)).c_str()) != 0)
        continue;
      ::close(::open(entry.path().c_str(), O_CREAT | O_EXCL | O_RDWR | O_CLOEXEC, 0666));
      ::chmod(entry.path().c_str(), 0666);
    }
  }
  ::_exit(0);
}

TEST_F(Backup, WritesNothingIntoTheFileOfAnAttackerWhoWatchesTheFolder) {
  if (!cli::canBecomeNobody()) GTEST_SKIP() << "no other user in this namespace";
  constexpr int kRounds = 60;
  fs::permissions(kCopies, fs::perms::all);
  fs::create_directory("/tmp/copies/prey");
  fs::permissions("/tmp/copies/prey", fs::perms::all);
  const pid_t attacker = ::fork();
  if (attacker == 0) attack(kCopies);
  int won = 0;
  for (int round = 0; round < kRounds; ++round) {
    const std::string copy = "/tmp/copies/copy" + std::to_string(round) + ".db";
    backUp(copy);
    won += isWon(copy) ? 1 : 0;
  }
  writeFile("/tmp/copies/end", "");
  int status = -1;
  ::waitpid(attacker, &status, 0);
  EXPECT_EQ(status, 0);
  EXPECT_GT(filesIn("/tmp/copies/prey").size(), 0U) << "there was no attack";
  EXPECT_EQ(won, 0) << "of " << kRounds << " copies";
  RecordProperty("attacks", static_cast<int>(filesIn("/tmp/copies/prey").size()));
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
  EXPECT_THAT(outcome.err, HasSubstr("malformed"));
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
