// The privilege switch with the ids of a real process: dropped in a child before
// the construction, as a web server's programs have them.

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <fstream>
#include <sstream>

#include "tests/core/core_test.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::SystemLog;

constexpr int kNobody = 65534;

bool isRealRoot() {
  std::ifstream map("/proc/self/uid_map");
  long long inside = -1;
  long long outside = -1;
  long long count = 0;
  map >> inside >> outside >> count;
  return geteuid() == 0 && inside == 0 && outside == 0 && count == 4294967295;
}

/// Runs `body` in a process of its own and returns what it wrote.
std::string inChild(const std::function<void(std::ostream&)>& body) {
  std::array<int, 2> ends{};
  EXPECT_EQ(pipe(ends.data()), 0);
  const pid_t child = fork();
  if (child == 0) {
    std::ostringstream report;
    body(report);
    const std::string text = report.str();
    _exit(write(ends[1], text.data(), text.size()) == static_cast<ssize_t>(text.size()) ? 0 : 1);
  }
  close(ends[1]);
  std::string text;
  std::array<char, 4096> buffer{};
  for (ssize_t got = 0; (got = read(ends[0], buffer.data(), buffer.size())) > 0;) {
    text.append(buffer.data(), static_cast<std::size_t>(got));
  }
  close(ends[0]);
  int status = -1;
  EXPECT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  return text;
}

class RealIdsTest : public CoreTest {
 protected:
  void SetUp() override {
    if (!isRealRoot()) GTEST_SKIP() << "changing ids for real takes root of the initial namespace";
    CoreTest::SetUp();
  }
  void TearDown() override {
    if (IsSkipped()) return;
    giveFolderTo(0);
    CoreTest::TearDown();
  }

  static void giveFolderTo(uid_t user) { ASSERT_EQ(chown(kStateDir, user, user), 0); }

  static std::string ids() { return std::to_string(geteuid()) + ":" + std::to_string(getegid()); }

  static void report(std::ostream& out, const OAUTHDBBasic& store) {
    out << "ids " << ids() << "\n";
    out << "error " << store.GetErrCode() << " " << store.GetErrMsg() << "\n";
    for (const support::LogLine& line : SystemLog::lines()) {
      out << "<" << line.priority << "> " << line.message() << "\n";
    }
    SystemLog::clear();
  }

  /// Constructs and destroys an object after `drop`.
  static std::string play(const std::function<bool()>& drop) {
    return inChild([&](std::ostream& out) {
      if (!drop()) out << "ids not dropped\n";
      std::optional<OAUTHDBBasic> store(std::in_place);
      report(out, *store);
      store.reset();
      out << "errno " << errno << " ids " << ids() << "\n";
      for (const std::string& message : SystemLog::messages()) out << message << "\n";
    });
  }

  static constexpr char kBothRaised[] =
      "<38> WARNING: setresgid(-1, 0, -1)\n"
      "<38> WARNING: setresuid(-1, 0, -1)\n"
      "<38> WARNING: setresuid(-1, 0, -1)\n";
};

TEST_F(RealIdsTest, DroppedEffectiveIdsAreRaisedAndRestored) {
  giveFolderTo(kNobody);
  EXPECT_EQ(play([] { return setegid(kNobody) == 0 && seteuid(kNobody) == 0; }),
            "ids 65534:65534\n"
            "error 255 \n" +
                std::string(kBothRaised) +
                "errno 0 ids 65534:65534\n"
                "WARNING: setresgid(-1, 0, -1)\n"
                "WARNING: setresuid(-1, 0, -1)\n"
                "WARNING: setresuid(-1, 0, -1)\n");
}

TEST_F(RealIdsTest, FileIsRootsWhoeverAskedForIt) {
  giveFolderTo(kNobody);
  play([] { return setegid(kNobody) == 0 && seteuid(kNobody) == 0; });
  struct stat status {};
  ASSERT_EQ(stat(kDatabase, &status), 0);
  EXPECT_EQ(status.st_uid, 0U);
  EXPECT_EQ(status.st_gid, 0U);
  EXPECT_EQ(status.st_mode & 07777U, 0600U);
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_meta"), "3");
}

TEST_F(RealIdsTest, RootsOwnFileOpensForDroppedIds) {
  { const OAUTHDBBasic store; }
  giveFolderTo(kNobody);
  EXPECT_EQ(play([] { return seteuid(kNobody) == 0; }),
            "ids 65534:0\n"
            "error 255 \n"
            "<38> WARNING: setresuid(-1, 0, -1)\n"
            "<38> WARNING: setresuid(-1, 0, -1)\n"
            "errno 0 ids 65534:0\n"
            "WARNING: setresuid(-1, 0, -1)\n"
            "WARNING: setresuid(-1, 0, -1)\n");
}

TEST_F(RealIdsTest, DroppedGroupAloneIsRaisedAndRestored) {
  EXPECT_EQ(play([] { return setegid(kNobody) == 0; }),
            "ids 0:65534\n"
            "error 255 \n"
            "<38> WARNING: setresgid(-1, 0, -1)\n"
            "errno 0 ids 0:65534\n"
            "WARNING: setresgid(-1, 0, -1)\n");
}

TEST_F(RealIdsTest, RootSwitchesNothing) {
  EXPECT_EQ(play([] { return true; }), "ids 0:0\nerror 255 \nerrno 0 ids 0:0\n");
}

TEST_F(RealIdsTest, IdsGivenUpForGoodAreRefused) {
  EXPECT_EQ(play([] {
              return setresgid(kNobody, kNobody, kNobody) == 0 &&
                     setresuid(kNobody, kNobody, kNobody) == 0;
            }),
            "ids 65534:65534\n"
            "error 14 Open DB failed!!\n"
            "<35> ERROR: setresgid(-1, 0, -1) [Operation not permitted]\n"
            "<35> ERROR: ENTERCriticalSection\n"
            "<3> Open DB failed!![14]\n"
            "errno 0 ids 65534:65534\n");
}

TEST_F(RealIdsTest, RefusedSwitchDoesNotKeepAFileOfOnesOwnShut) {
  giveFolderTo(kNobody);
  EXPECT_EQ(play([] {
              return setresgid(kNobody, kNobody, kNobody) == 0 &&
                     setresuid(kNobody, kNobody, kNobody) == 0;
            }),
            "ids 65534:65534\n"
            "error 255 \n"
            "<35> ERROR: setresgid(-1, 0, -1) [Operation not permitted]\n"
            "<35> ERROR: ENTERCriticalSection\n"
            "errno 0 ids 65534:65534\n"
            "ERROR: setresgid(-1, 0, -1) [Operation not permitted]\n"
            "ERROR: ENTERCriticalSection\n");
}

TEST_F(RealIdsTest, StatementsNeedAFolderThatTheDroppedIdsCanWrite) {
  const std::string seen = play([] { return setegid(kNobody) == 0 && seteuid(kNobody) == 0; });
  EXPECT_THAT(seen, ::testing::StartsWith("ids 65534:65534\nerror -1 Create table failed\n" +
                                          std::string(kBothRaised)));
  EXPECT_THAT(seen, ::testing::HasSubstr("<3> Create Table failed!![meta]\n"));
}

}  // namespace
