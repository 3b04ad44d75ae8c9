// A process that dies at any statement of any operation, and power that goes at
// any write or sync of it: the file says what it said before, or what it says
// after, and after when the operation had come to its end.

#include <sys/wait.h>
#include <unistd.h>

#include "tests/faults/faulty_vfs.h"
#include "tests/faults/write_back_disk.h"
#include "tests/grants/household.h"
#include "tests/stores/statements.h"
#include "tests/support/case_name.h"
#include "tests/support/long_form.h"

namespace grants_test {
namespace {

using faults::FaultyVfs;
using faults::WriteBackDisk;

class KilledTest : public HouseholdTest, public ::testing::WithParamInterface<Operation> {
 protected:
  void SetUp() override {
    HouseholdTest::SetUp();
    run();
    after_ = state();
    ASSERT_NE(before_, after_);
    reset();
    ASSERT_EQ(state(), before_);
  }

  void run() {
    Grants grants;
    GetParam().run(grants, household_);
  }

  /// A process that dies right before its `nth` statement. False when it came
  /// to its end first.
  bool dieAt(int nth) {
    const pid_t child = fork();
    if (child == 0) {
      Grants grants;
      int left = nth;
      Statements::before([&left](const std::string&) {
        if (--left == 0) _exit(1);
      });
      GetParam().run(grants, household_);
      _exit(0);
    }
    int status = 0;
    waitpid(child, &status, 0);
    EXPECT_TRUE(WIFEXITED(status));
    return WEXITSTATUS(status) == 1;
  }

  /// Power goes during the `change`-th write, sync or removal. False when the
  /// operation came to its end first.
  bool cutAt(int change, unsigned seed) {
    WriteBackDisk disk(kDatabase, seed);
    bool isDone = false;
    {
      const FaultyVfs vfs(disk);
      Grants grants;
      disk.cutAt(change);
      isDone = isAcknowledged(grants);
    }
    const bool wasDuring = disk.isOut();
    if (!wasDuring) disk.cut();
    disk.restoreFiles();
    judge(isDone);
    return wasDuring;
  }

  bool isAcknowledged(Grants& grants) try {
    GetParam().run(grants, household_);
    return true;
  } catch (const Trouble&) {
    return false;
  }

  void judge(bool isDone) {
    const std::string found = state();
    if (isDone) {
      EXPECT_EQ(found, after_);
    } else if (found != before_) {
      EXPECT_EQ(found, after_);
    }
  }

  void cutEverywhere() {
    const unsigned seeds = support::isLongForm() ? 250 : 2;
    int cuts = 0;
    for (unsigned seed = 1; seed <= seeds && !HasFailure(); ++seed) {
      for (int change = 1; !HasFailure(); ++change, ++cuts) {
        SCOPED_TRACE("seed " + std::to_string(seed) + ", change " + std::to_string(change));
        reset();
        if (!cutAt(change, seed)) break;
      }
    }
    RecordProperty("cuts", cuts);
  }

  std::string after_;
};

TEST_P(KilledTest, AtAnyStatementLeavesTheOldStateOrTheNewOne) {
  Statements::watch();
  int deaths = 0;
  for (int nth = 1; dieAt(nth) && !HasFailure(); ++nth, ++deaths) {
    SCOPED_TRACE("statement " + std::to_string(nth));
    judge(false);
    reset();
  }
  EXPECT_GE(deaths, 3);  // BEGIN, a change, COMMIT
  EXPECT_EQ(state(), after_);
  RecordProperty("deaths", deaths);
}

TEST_P(KilledTest, AtAnyWriteOrSyncLeavesWhatWasAcknowledged) {
  cutEverywhere();
}

INSTANTIATE_TEST_SUITE_P(EveryChange, KilledTest, ::testing::ValuesIn(everyChange()),
                         support::CaseName());

}  // namespace
}  // namespace grants_test
