// Times: Unix seconds, and their form for people.

#ifndef KELDOAUTH_TOOLS_CLOCK_H
#define KELDOAUTH_TOOLS_CLOCK_H

#include <optional>
#include <string>

namespace tool {

/// "2026-01-31T08:15:00Z"; empty before 1970 and after 9999.
std::string isoTime(long long seconds);

/// "2d 3h", "9m 12s", "4s": the two largest units of a duration.
std::string duration(long long seconds);

/// The moment that a user means: "2026-01-31", "2026-01-31T08:15" or
/// "2026-01-31T08:15:00Z" (all UTC), or so long before `now`: "90m", "1h30m",
/// "2d 3h", "1w". Nothing for any other text.
std::optional<long long> momentIn(const std::string& text, long long now);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_CLOCK_H
