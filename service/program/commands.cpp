#include "service/program/commands.h"

#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <exception>
#include <iostream>

#include "service/program/commands/command.h"

namespace keldoauth::service {
namespace {

constexpr struct {
  const char* name;
  const char* summary;
  Declare declare;
} kCommands[] = {
    {"check", "Read the settings and say what is wrong with them", declareCheck},
};

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
    return app.exit(error, std::cout, std::cerr) == 0 ? kDone : kWrongUsage;
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
