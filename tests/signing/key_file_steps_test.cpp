// A key file that comes to be, or changes, when a call on the way fails or the
// process dies there.

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <filesystem>

#include "tests/signing/calls.h"
#include "tests/signing/signing_test.h"
#include "tests/support/case_name.h"

namespace signing_test {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

namespace fs = std::filesystem;

class StepsTest : public SigningTest {
 protected:
  void SetUp() override {
    SigningTest::SetUp();
    changed_ = anySet();
    changed_.rotate(kStart);
  }

  static void create() { KeyFile(kPath).create(anySet(), {}); }
  void update() const {
    KeyFile(kPath).update([&](KeySet& set) { set = changed_; });
  }

  /// Whether `body` died right before its `nth` call; else it came to its end.
  static bool dieAt(int nth, const std::function<void()>& body) {
    const pid_t child = fork();
    if (child == 0) {
      int left = nth;
      Calls::follow([&left](const std::string&) { return --left == 0 ? raise(SIGKILL) : 0; });
      body();
      _exit(0);
    }
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    return WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL;
  }

  static std::string textInFile() { return KeyFile(kPath).read().text(); }

  KeySet changed_ = anySet();
};

TEST_F(StepsTest, NewFileIsOnTheDiskBeforeItsNameAndTheNameBeforeTheEnd) {
  static_cast<void>(anySet());
  Calls::follow([](const std::string&) { return 0; });
  create();
  EXPECT_THAT(Calls::names(), ElementsAre("getentropy", "create", "fchown", "fchmod", "write",
                                          "fsync", "link", "fsync folder", "unlink"));
}

TEST_F(StepsTest, ChangedFileIsOnTheDiskBeforeItsNameAndTheNameBeforeTheEnd) {
  putAnySet();
  Calls::follow([](const std::string&) { return 0; });
  update();
  EXPECT_THAT(Calls::names(), ElementsAre("flock", "unlink", "create", "fchown", "fchmod", "write",
                                          "fsync", "rename", "fsync folder"));
}

TEST_F(StepsTest, WritesMayBeShortAndInterrupted) {
  Calls::writeOneByte();
  Calls::follow([interrupt = false](const std::string& name) mutable {
    if (name != "write") return 0;
    interrupt = !interrupt;
    return interrupt ? EINTR : 0;
  });
  create();
  Calls::release();
  EXPECT_EQ(textInFile(), anySet().text());
}

TEST_F(StepsTest, WaitingForOthersMayBeInterrupted) {
  putAnySet();
  Calls::follow([interrupt = false](const std::string& name) mutable {
    if (name != "flock") return 0;
    interrupt = !interrupt;
    return interrupt ? EINTR : 0;
  });
  update();
  Calls::release();
  EXPECT_EQ(textInFile(), changed_.text());
}

TEST_F(StepsTest, KillAtAnyStepOfTheCreationLeavesNoFileOrAWholeOne) {
  static_cast<void>(anySet());
  int steps = 0;
  for (bool died = true; died; ++steps) {
    fs::remove_all(kFolder);
    fs::create_directory(kFolder);
    died = dieAt(steps + 1, create);
    if (fs::exists(kPath)) {
      EXPECT_EQ(textInFile(), anySet().text());
    } else {
      EXPECT_TRUE(died);
      create();
    }
    EXPECT_EQ(modeOf(kPath), 0600U);
  }
  EXPECT_EQ(steps, 10) << "nine calls to die at, and a run that gets by";
}

TEST_F(StepsTest, KillAtAnyStepOfTheChangeLeavesTheOldFileOrTheNewOne) {
  int steps = 0;
  bool wasOld = false;
  bool wasNew = false;
  for (bool died = true; died; ++steps) {
    putAnySet();
    died = dieAt(steps + 1, [&] { update(); });
    const std::string found = textInFile();
    wasOld = wasOld || found == anySet().text();
    wasNew = wasNew || found == changed_.text();
    EXPECT_TRUE(found == changed_.text() || (died && found == anySet().text())) << steps;
    update();
    EXPECT_EQ(textInFile(), changed_.text());
    EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json")) << "nothing stays behind";
  }
  EXPECT_EQ(steps, 10) << "nine calls to die at, and a run that gets by";
  EXPECT_TRUE(wasOld && wasNew);
}

/// A call that fails, and what is said then.
struct FailedCall {
  const char* name;
  const char* call;
  int error;
  const char* reason;
};

void PrintTo(const FailedCall& row, std::ostream* out) {
  *out << row.name;
}

class FailedCreationTest : public StepsTest, public ::testing::WithParamInterface<FailedCall> {};

TEST_P(FailedCreationTest, LeavesNothingBehind) {
  static_cast<void>(anySet());
  Calls::fail(GetParam().call, GetParam().error);
  EXPECT_THAT(failureOf(create), HasSubstr(GetParam().reason));
  Calls::release();
  EXPECT_THAT(filesIn(kFolder), IsEmpty());
}

constexpr char kIo[] = "Input/output error";
constexpr char kFull[] = "No space left on device";
constexpr char kDenied[] = "Operation not permitted";

const FailedCall kFailedCreations[] = {
    {"NoRandomNumbers", "getentropy", ENOSYS, "no random numbers"},
    {"ReadOnlyMedium", "create", EROFS, "Read-only file system"},
    {"OwnerRefused", "fchown", EPERM, kDenied},
    {"ModeRefused", "fchmod", EPERM, kDenied},
    {"MediumFull", "write", ENOSPC, kFull},
    {"MediumBroken", "fsync", EIO, kIo},
    {"NoHardLinks", "link", EPERM, kDenied},
};
INSTANTIATE_TEST_SUITE_P(Steps, FailedCreationTest, ::testing::ValuesIn(kFailedCreations),
                         support::CaseName());

class FailedChangeTest : public StepsTest, public ::testing::WithParamInterface<FailedCall> {};

TEST_P(FailedChangeTest, LeavesTheOldKeys) {
  putAnySet();
  Calls::fail(GetParam().call, GetParam().error);
  EXPECT_THAT(failureOf([&] { update(); }), HasSubstr(GetParam().reason));
  Calls::release();
  EXPECT_EQ(readFile(kPath), anySet().text());
  EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
}

const FailedCall kFailedChanges[] = {
    {"NoLocks", "flock", ENOLCK, "No locks available"},
    {"DraftThatStays", "unlink", EPERM, kDenied},
    {"ReadOnlyMedium", "create", EROFS, "Read-only file system"},
    {"OwnerRefused", "fchown", EPERM, kDenied},
    {"ModeRefused", "fchmod", EPERM, kDenied},
    {"MediumFull", "write", ENOSPC, kFull},
    {"MediumBroken", "fsync", EIO, kIo},
    {"NameRefused", "rename", EACCES, "Permission denied"},
};
INSTANTIATE_TEST_SUITE_P(Steps, FailedChangeTest, ::testing::ValuesIn(kFailedChanges),
                         support::CaseName());

// The name is there by then, and another process may have used it already.
TEST_F(StepsTest, FolderThatCannotBeSyncedFailsTheCallAndKeepsTheNewKeys) {
  putAnySet();
  Calls::fail("fsync folder", EIO);
  EXPECT_THAT(failureOf([&] { update(); }), HasSubstr(kIo));
  Calls::release();
  EXPECT_EQ(textInFile(), changed_.text());
}

TEST_F(StepsTest, RotationWithoutRandomNumbersChangesNothing) {
  putAnySet();
  Calls::fail("getentropy", ENOSYS);
  EXPECT_EQ(failureOf([] { KeyFile(kPath).update([](KeySet& set) { set.rotate(kStart); }); }),
            "no random numbers: Function not implemented");
  Calls::release();
  EXPECT_EQ(readFile(kPath), anySet().text());
}

}  // namespace
}  // namespace signing_test
