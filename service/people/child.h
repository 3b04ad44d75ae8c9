// Another program that is asked one thing and answers by its exit status.

#ifndef KELDOAUTH_SERVICE_PEOPLE_CHILD_H
#define KELDOAUTH_SERVICE_PEOPLE_CHILD_H

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace keldoauth::service {

/// What every pipe has room for, so that nobody waits for a reader.
inline constexpr std::size_t kMaxQuestionBytes = 4096;

/// Starts `program`, a path, without arguments, without environment and with no
/// descriptor of ours but a pipe that holds `question` and then ends; what it
/// prints is lost. Returns its exit status; nothing when it could not be started,
/// was ended by a signal, or was still running after `patience`, when it is
/// killed. `question` has at most kMaxQuestionBytes.
std::optional<int> exitStatusOf(const std::string& program, std::string_view question,
                                std::chrono::milliseconds patience);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_CHILD_H
