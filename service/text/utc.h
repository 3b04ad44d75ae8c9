// Times for people.

#ifndef KELDOAUTH_SERVICE_TEXT_UTC_H
#define KELDOAUTH_SERVICE_TEXT_UTC_H

#include <optional>
#include <string>

namespace keldoauth::service {

/// "2026-11-22 03:04:05", in UTC, of Unix seconds; nothing for a time that no
/// calendar has.
std::optional<std::string> utcText(long long seconds);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_TEXT_UTC_H
