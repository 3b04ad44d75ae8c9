// Many processes write at the same time, and every call succeeds.

#include <ctime>

#include "tests/load/crowd.h"

/// Takes the place of the C library's: a wait for a lock is as long as its steps,
/// of a millisecond each. By the real clock a machine that is too busy to let a
/// process run would use up its five seconds, and not the other writers. (The times
/// that GoogleTest prints count steps as well.)
extern "C" int clock_gettime(clockid_t clock, timespec* now) noexcept {
  if (clock != CLOCK_MONOTONIC) return timespec_get(now, TIME_UTC) == TIME_UTC ? 0 : -1;
  static long long milliseconds = 0;
  ++milliseconds;
  now->tv_sec = static_cast<time_t>(milliseconds / 1000);
  now->tv_nsec = static_cast<long>(milliseconds % 1000 * 1000000);
  return 0;
}

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
