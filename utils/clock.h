// The clock, read by one plain call: a header alone, since the library exports
// no function for it and all floors need one.

#ifndef KELDOAUTH_UTILS_CLOCK_H
#define KELDOAUTH_UTILS_CLOCK_H

#include <ctime>

#include "utils/wide_time.h"

namespace KELDOAUTHSERVER {

/// The current time in Unix seconds, whatever the width of time_t.
inline long long currentTime() {
  return static_cast<long long>(time(nullptr));
}

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_CLOCK_H
