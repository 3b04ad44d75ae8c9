// Memory runs out at every allocation of every operation, once and for good.

#include "tests/faults/failing_memory.h"
#include "tests/faults/trials.h"

namespace faults {
namespace {

struct Source {
  const char* name;
  Memory memory;
};

void PrintTo(const Source& source, std::ostream* out) {
  *out << source.name;
}

const Source kSources[] = {
    {"Sqlite", Memory::kSqlite},
    {"New", Memory::kNew},
    {"Malloc", Memory::kMalloc},
};

using Case = std::tuple<Operation, Source>;

class MemoryTest : public Trials, public ::testing::WithParamInterface<Case> {
 protected:
  static void SetUpTestSuite() { FailingMemory::install(); }

  [[nodiscard]] long blocks() const override { return FailingMemory::blocks(); }
};

TEST_P(MemoryTest, ThatRunsOutIsReportedAndLeavesNothingHalfDone) {
  const auto& [operation, source] = GetParam();
  FailingMemory memory(source.memory);
  study(operation);
  throwEverywhere(memory);
}

INSTANTIATE_TEST_SUITE_P(EveryOperation, MemoryTest,
                         ::testing::Combine(::testing::ValuesIn(everyOperation()),
                                            ::testing::ValuesIn(kSources)),
                         [](const ::testing::TestParamInfo<Case>& row) {
                           return std::get<0>(row.param).name + std::get<1>(row.param).name;
                         });

}  // namespace
}  // namespace faults
