#include "service/program/commands.h"

#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <exception>
#include <iostream>
#include <string>
#include <vector>

#include "service/program/commands/command.h"

namespace keldoauth::service {
namespace {

constexpr struct {
  const char* name;
  const char* summary;
  Declare declare;
} kCommands[] = {
    {"setup", "Make the settings and the keys, and switch the service on", declareSetup},
    {"check", "Read the settings and say what is wrong with them", declareCheck},
    {"keys", "Make, show or renew the keys that sign who somebody is", declareKeys},
    {"user", "Keep the file of users, where sign_in is htpasswd", declareUser},
};

std::string complaint(const CLI::App& app, const CLI::ParseError& error) {
  const std::vector<std::string> rest = app.remaining(true);
  if (rest.empty()) return app.get_subcommands().empty() ? "a command is missing" : error.what();
  const bool isCommand = app.get_subcommands().empty() && rest.front().front() != '-';
  return (isCommand ? "unknown command '" : "unexpected argument '") + rest.front() + "'";
}

int obey(int argc, const char* const* argv, std::string settingsPath) {
  CLI::App app("The authorisation service. The web server starts it without a command.",
               "keldoauth-service");
  app.set_version_flag("--version", "keldoauth-service " KELDOAUTH_VERSION);
  app.require_subcommand(1);
  app.add_option("--settings", settingsPath, "The file of the settings")
      ->type_name("FILE")
      ->capture_default_str();
  Run chosen;
  for (const auto& command : kCommands) {
    CLI::App* const sub = app.add_subcommand(command.name, command.summary);
    sub->callback([&chosen, run = command.declare(*sub)] { chosen = run; });
  }
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success)) {
      app.exit(error, std::cout, std::cerr);  // asked-for help
      return kDone;
    }
    std::cerr << "keldoauth-service: " << complaint(app, error)
              << "\nkeldoauth-service --help says what is possible\n";
    return kWrongUsage;
  }
  return chosen(settingsPath);
}

}  // namespace

int runCommand(int argc, const char* const* argv, const std::string& settingsPath) try {
  return obey(argc, argv, settingsPath);
} catch (const std::exception& error) {
  std::cerr << "keldoauth-service: " << error.what() << '\n';
  return kFaulty;
}

}  // namespace keldoauth::service
