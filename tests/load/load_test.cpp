// Many processes write at the same time, and every call succeeds.

#include "tests/load/crowd.h"

namespace load {
namespace {

using ::testing::IsEmpty;

class LoadTest : public Crowd {
 protected:
  static void expectEveryCallSucceeds(Size size) {
    const Ledger ledger = visit(size);
    report(ledger);
    EXPECT_THAT(ledger.failures, IsEmpty());
    expectAsAcknowledged(ledger);
    expectAuditComplete();
  }
};

TEST_F(LoadTest, EveryCallOfFewBusyProcessesSucceeds) {
  expectEveryCallSucceeds(fewBusyProcesses());
}

TEST_F(LoadTest, EveryCallOfManyProcessesSucceeds) {
  expectEveryCallSucceeds(manyProcesses());
}

}  // namespace
}  // namespace load
