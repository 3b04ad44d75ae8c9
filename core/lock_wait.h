// How a statement waits for another connection's lock.

#ifndef KELDOAUTH_CORE_LOCK_WAIT_H
#define KELDOAUTH_CORE_LOCK_WAIT_H

#include <ctime>

#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {

/// The longest that a statement of a store waits.
inline constexpr int kLockWaitSeconds = 5;

/// SQLite's busy handler; `waits` counts from 0 in each statement. Short even
/// steps: the growing ones of SQLite's own handler starve some of many writers.
template <int kSeconds>
int waitForLock(void* /*unused*/, int waits) {
  constexpr long kStepNanoseconds = 1000000;
  thread_local long long waitingSince = 0;  // milliseconds
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  const long long milliseconds = static_cast<long long>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
  if (waits == 0) waitingSince = milliseconds;
  if (milliseconds - waitingSince >= kSeconds * 1000LL) return 0;

  const timespec step{0, kStepNanoseconds};
  nanosleep(&step, nullptr);
  return 1;
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_LOCK_WAIT_H
