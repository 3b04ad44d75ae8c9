// How long something may take, on the clock that nobody sets.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_DEADLINE_H
#define KELDOAUTH_ENGINES_POSTGRESQL_DEADLINE_H

#include <poll.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstddef>
#include <vector>

namespace keldoauth::postgresql {

/// Of one connection: as long as a statement waits for a lock. Servers are asked
/// all at once, so that one that does not answer takes nothing from the others.
inline constexpr std::chrono::seconds kConnectingSeconds{5};

/// Of one statement. The server gives up a lock after 5 seconds and a statement
/// after 8, and says so: only one that is frozen or cut off, or that waits for
/// its standby, has not answered after that.
inline constexpr std::chrono::seconds kAnswerSeconds{10};

class Deadline {
 public:
  explicit Deadline(std::chrono::milliseconds left) : end_(Clock::now() + left) {}

  [[nodiscard]] bool isOver() const { return Clock::now() >= end_; }

  /// Waits for one of them, at most until the deadline or `most`. False when
  /// nothing came.
  bool wait(std::vector<pollfd>& sockets, std::chrono::milliseconds most) const {
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end_ - Clock::now());
    const auto time = std::clamp(left, std::chrono::milliseconds(0), most);
    const int ready = poll(sockets.data(), sockets.size(), static_cast<int>(time.count()) + 1);
    return ready > 0 || (ready < 0 && errno != EINTR);
  }

 private:
  using Clock = std::chrono::steady_clock;
  Clock::time_point end_;
};

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_DEADLINE_H
