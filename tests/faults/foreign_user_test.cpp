// A process whose effective user may not write the state folder, or not even
// read the file.

#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <functional>

#include "stores/oauth_log.h"
#include "tests/faults/scene.h"
#include "utils/oauth_names.h"

namespace faults {
namespace {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBLog;

constexpr id_t kNobody = 65534;
constexpr id_t kUnchanged = static_cast<id_t>(-1);

/// How much of root a process keeps.
enum class Root { kSaved, kGone };

bool becomeNobody(Root root) {
  const id_t others = root == Root::kSaved ? kUnchanged : kNobody;
  return setresgid(others, kNobody, others) == 0 && setresuid(others, kNobody, others) == 0;
}

/// What such a process gets: "ready", "entries" read, whether an entry was
/// "added", then code and message of the object.
std::string workOnLog() {
  OAUTHDBLog log(names::kLogTable);
  Json::Value rows(Json::arrayValue);
  std::string report = isReady(log) ? "ready" : "not ready";
  report += log.Get("", "", &rows) != 0 ? ", " + std::to_string(rows.size()) + " entries" : "";
  report += log.Add("entry") != 0 ? ", added" : ", refused";
  return report + ", " + std::to_string(log.GetErrCode()) + " " + log.GetErrMsg();
}

class ForeignUserTest : public Scene {
 protected:
  void SetUp() override {
    Scene::SetUp();
    support::Platform::useReadableCipher();
    chmod(kStateDir, 0755);
    if (asNobody(Root::kGone, [] { return std::string("here"); }) != "here") {
      GTEST_SKIP() << "this user namespace has no other user to become";
    }
  }

  void TearDown() override {
    chmod(kStateDir, 0700);
    Scene::TearDown();
  }

  /// Runs `body` in a process of that user and returns what it says.
  static std::string asNobody(Root root, const std::function<std::string()>& body) {
    std::array<int, 2> ends{};
    if (pipe(ends.data()) != 0) return "no pipe";
    const pid_t child = fork();
    if (child == 0) {
      const std::string report = becomeNobody(root) ? body() : "still root";
      const ssize_t written = write(ends[1], report.data(), report.size());
      _exit(written == static_cast<ssize_t>(report.size()) ? 0 : 1);
    }
    close(ends[1]);
    std::string report;
    std::array<char, 256> piece{};
    for (ssize_t got = 0; (got = read(ends[0], piece.data(), piece.size())) > 0;) {
      report.append(piece.data(), static_cast<std::size_t>(got));
    }
    close(ends[0]);
    int status = 0;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    return report;
  }

  static std::string entriesInFile() { return sqlText("SELECT count(*) FROM oauth_log"); }
};

// The file is opened as root; its journal is not.
TEST_F(ForeignUserTest, ThatMayBecomeRootReadsButCannotKeepAJournalInRootsFolder) {
  furnish(Household::kComplete);
  EXPECT_EQ(asNobody(Root::kSaved, workOnLog),
            "ready, 5 entries, refused, 8 attempt to write a readonly database");
  EXPECT_EQ(entriesInFile(), "5");
  expectPrivate();
}

TEST_F(ForeignUserTest, ThatMayBecomeRootWritesInAFolderOfItsOwn) {
  furnish(Household::kComplete);
  ASSERT_EQ(chown(kStateDir, kNobody, kNobody), 0);
  EXPECT_EQ(asNobody(Root::kSaved, workOnLog), "ready, 5 entries, added, 255 ");
  EXPECT_EQ(entriesInFile(), "6");
  expectPrivate();
  ASSERT_EQ(chown(kStateDir, 0, 0), 0);
}

TEST_F(ForeignUserTest, ThatMayBecomeRootCannotFillANewFileInRootsFolder) {
  EXPECT_EQ(asNobody(Root::kSaved, workOnLog), "not ready, refused, -1 Create table failed");
  expectPrivate();
}

TEST_F(ForeignUserTest, WithoutAWayToRootIsNotLetIntoRootsFile) {
  furnish(Household::kComplete);
  EXPECT_EQ(asNobody(Root::kGone, workOnLog), "not ready, refused, 14 Open DB failed!!");
  EXPECT_EQ(entriesInFile(), "5");
}

TEST_F(ForeignUserTest, WithoutAWayToRootReadsAFileThatItMayOnlyRead) {
  furnish(Household::kComplete);
  chmod(kDatabase, 0644);
  EXPECT_EQ(asNobody(Root::kGone, workOnLog),
            "ready, 5 entries, refused, 8 attempt to write a readonly database");
  EXPECT_EQ(entriesInFile(), "5");
}

}  // namespace
}  // namespace faults
