// What a command is made of.

#ifndef KELDOAUTH_SERVICE_PROGRAM_COMMANDS_COMMAND_H
#define KELDOAUTH_SERVICE_PROGRAM_COMMANDS_COMMAND_H

#include <CLI/App.hpp>
#include <functional>
#include <string>

#include "service/program/commands.h"

namespace keldoauth::service {

/// Does what was asked for, prints it, and returns the exit status. What it
/// throws is said on standard error, and the status is kFaulty.
using Run = std::function<int(const std::string& settingsPath)>;

/// Adds its options to `command`, and returns what is to be done with them once
/// they have been read.
using Declare = Run (*)(CLI::App& command);

Run declareCheck(CLI::App& command);
Run declareKeys(CLI::App& command);
Run declareSetup(CLI::App& command);
Run declareUser(CLI::App& command);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROGRAM_COMMANDS_COMMAND_H
