// Every call that SQLite makes to the file system fails, once and for good, in
// every operation.

#include "tests/faults/failing_disk.h"
#include "tests/faults/trials.h"

namespace faults {
namespace {

struct Failure {
  const char* name;
  Call call;
  int error;
};

void PrintTo(const Failure& failure, std::ostream* out) {
  *out << failure.name;
}

const Failure kFailures[] = {
    {"Open", Call::kOpen, SQLITE_CANTOPEN},
    {"Read", Call::kRead, SQLITE_IOERR_READ},
    {"Write", Call::kWrite, SQLITE_IOERR_WRITE},
    {"WriteOnFullDisk", Call::kWrite, SQLITE_FULL},
    {"Sync", Call::kSync, SQLITE_IOERR_FSYNC},
    {"Truncate", Call::kTruncate, SQLITE_IOERR_TRUNCATE},
    {"Delete", Call::kDelete, SQLITE_IOERR_DELETE},
    {"Lock", Call::kLock, SQLITE_IOERR_LOCK},
    {"Access", Call::kAccess, SQLITE_IOERR_ACCESS},
    {"FileSize", Call::kFileSize, SQLITE_IOERR_FSTAT},
    {"CheckReservedLock", Call::kCheckReservedLock, SQLITE_IOERR_CHECKRESERVEDLOCK},
};

using Case = std::tuple<Operation, Failure>;

class IoErrorTest : public Trials, public ::testing::WithParamInterface<Case> {};

TEST_P(IoErrorTest, IsReportedAndLeavesNothingHalfDone) {
  const auto& [operation, failure] = GetParam();
  FailingDisk disk(failure.call, failure.error);
  const FaultyVfs vfs(disk);
  study(operation);
  throwEverywhere(disk);
  EXPECT_THAT(vfs.exposed(), ::testing::IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(EveryOperation, IoErrorTest,
                         ::testing::Combine(::testing::ValuesIn(everyOperation()),
                                            ::testing::ValuesIn(kFailures)),
                         [](const ::testing::TestParamInfo<Case>& row) {
                           return std::get<0>(row.param).name + std::get<1>(row.param).name;
                         });

}  // namespace
}  // namespace faults
