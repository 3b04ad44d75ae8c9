// Every call to the file system and every allocation fails in every operation,
// once and for good: what cannot be done is Trouble, never another answer, and
// the file says what it said before, or what it says after.

#include <exception>

#include "tests/faults/failing_disk.h"
#include "tests/faults/failing_memory.h"
#include "tests/grants/household.h"
#include "tests/support/long_form.h"

namespace grants_test {
namespace {

using faults::Call;
using faults::FailingDisk;
using faults::FailingMemory;
using faults::Fault;
using faults::FaultyVfs;
using faults::Memory;

std::vector<Operation> everyOperation() {
  std::vector<Operation> all = everyChange();
  for (const Operation& lookUp : everyLookUp()) all.push_back(lookUp);
  return all;
}

class TroublesTest : public HouseholdTest {
 protected:
  /// What happens undisturbed.
  void study(const Operation& operation) {
    operation_ = operation;
    reset();
    Grants grants;
    answer_ = operation.run(grants, household_);
    after_ = state();
  }

  /// Throws the fault into every `stride`-th occasion.
  void throwEverywhere(Fault& fault, int stride) {
    for (const bool lasting : {false, true}) {
      for (int nth = 1; !HasFailure(); nth += stride, ++trials_) {
        SCOPED_TRACE(operation_.name + ", occasion " + std::to_string(nth) +
                     (lasting ? " and all later" : ""));
        if (!throwAt(fault, nth, lasting)) break;
      }
    }
  }

  int trials_ = 0;
  bool canBeShortOfMemory_ = false;

 private:
  /// Whether it came to that occasion.
  bool throwAt(Fault& fault, int nth, bool lasting) {
    reset();
    Grants grants;
    fault.arm(nth, lasting);
    const std::optional<std::string> answer = answerOf(grants);
    const bool struck = fault.struck();
    fault.disarm();
    EXPECT_EQ(answer.value_or(answer_), answer_);
    judge(state(), answer.has_value());
    // Whatever it was, it has passed: the object works again.
    EXPECT_NO_THROW(operation_.run(grants, household_));
    return struck;
  }

  /// Nothing when it was Trouble.
  std::optional<std::string> answerOf(Grants& grants) try {
    return operation_.run(grants, household_);
  } catch (const Trouble&) {
    return {};
  } catch (const std::exception&) {
    EXPECT_TRUE(canBeShortOfMemory_);
    return {};
  }

  void judge(const std::string& found, bool isDone) {
    const bool isEither = found == before_ && !isDone;
    EXPECT_EQ(isEither ? after_ : found, after_);
  }

  Operation operation_;
  std::string answer_, after_;
};

struct FileFailure {
  const char* name;
  Call call;
  int error;
};
void PrintTo(const FileFailure& failure, std::ostream* out) {
  *out << failure.name;
}

class FileTroublesTest : public TroublesTest, public ::testing::WithParamInterface<FileFailure> {};

TEST_P(FileTroublesTest, AreNeverAnAnswer) {
  FailingDisk disk(GetParam().call, GetParam().error);
  const FaultyVfs vfs(disk);
  for (const Operation& operation : everyOperation()) {
    study(operation);
    throwEverywhere(disk, 1);
  }
  RecordProperty("trials", trials_);
}

INSTANTIATE_TEST_SUITE_P(
    EveryCall, FileTroublesTest,
    ::testing::Values(FileFailure{"Open", Call::kOpen, SQLITE_CANTOPEN},
                      FileFailure{"Read", Call::kRead, SQLITE_IOERR_READ},
                      FileFailure{"Write", Call::kWrite, SQLITE_IOERR_WRITE},
                      FileFailure{"WriteOnFullDisk", Call::kWrite, SQLITE_FULL},
                      FileFailure{"Sync", Call::kSync, SQLITE_IOERR_FSYNC},
                      FileFailure{"Truncate", Call::kTruncate, SQLITE_IOERR_TRUNCATE},
                      FileFailure{"Delete", Call::kDelete, SQLITE_IOERR_DELETE},
                      FileFailure{"Lock", Call::kLock, SQLITE_IOERR_LOCK},
                      FileFailure{"Access", Call::kAccess, SQLITE_IOERR_ACCESS},
                      FileFailure{"FileSize", Call::kFileSize, SQLITE_IOERR_FSTAT}),
    ::testing::PrintToStringParamName());

struct MemoryFailure {
  const char* name;
  Memory memory;
};
void PrintTo(const MemoryFailure& failure, std::ostream* out) {
  *out << failure.name;
}

class MemoryTroublesTest : public TroublesTest,
                           public ::testing::WithParamInterface<MemoryFailure> {
 protected:
  static void SetUpTestSuite() { FailingMemory::install(); }
  void SetUp() override {
    TroublesTest::SetUp();
    canBeShortOfMemory_ = true;
  }
};

TEST_P(MemoryTroublesTest, AreNeverAnAnswer) {
  FailingMemory memory(GetParam().memory);
  for (const Operation& operation : everyOperation()) {
    study(operation);
    throwEverywhere(memory, support::isLongForm() ? 1 : 11);
  }
  RecordProperty("trials", trials_);
}

INSTANTIATE_TEST_SUITE_P(EverySource, MemoryTroublesTest,
                         ::testing::Values(MemoryFailure{"Sqlite", Memory::kSqlite},
                                           MemoryFailure{"New", Memory::kNew},
                                           MemoryFailure{"Malloc", Memory::kMalloc}),
                         ::testing::PrintToStringParamName());

}  // namespace
}  // namespace grants_test
