// The program's commands, for the owner of the box. To add one: a file in
// commands/ with its `declare`, and a line in the table of commands.cpp.

#ifndef KELDOAUTH_SERVICE_PROGRAM_COMMANDS_H
#define KELDOAUTH_SERVICE_PROGRAM_COMMANDS_H

#include <string>

namespace keldoauth::service {

/// The exit status of a command.
enum Exit : int {
  kDone = 0,
  kWrongUsage = 1,
  kFaulty = 2,  // the settings, or what they name, need a hand
};

/// Reads and obeys the command line. Throws nothing. `settingsPath` is where the
/// service itself looks.
int runCommand(int argc, const char* const* argv, const std::string& settingsPath);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROGRAM_COMMANDS_H
