// Times: the library's decimal Unix seconds, and their form for people.

#ifndef KELDOAUTH_TOOLS_CLOCK_H
#define KELDOAUTH_TOOLS_CLOCK_H

#include <json/value.h>

#include <string>

namespace tool {

long long currentTime();

/// A number from the library's text, read as the library reads it: leading
/// digits count, no digits are 0.
long long numberIn(const Json::Value& text);

/// "2026-01-31T08:15:00Z"; empty before 1970 and after 9999.
std::string isoTime(long long seconds);

/// "2d 3h", "9m 12s", "4s": the two largest units of a duration.
std::string duration(long long seconds);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_CLOCK_H
