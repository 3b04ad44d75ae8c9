// keldoauth: the administrator's command line. A table of commands and the loop
// that turns it into sub-commands; parsing and help come from CLI11.

#include <CLI/CLI.hpp>
#include <algorithm>
#include <clocale>
#include <cstdio>
#include <exception>
#include <iostream>
#include <string>
#include <vector>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/presence.h"
#include "tools/keldoauth/storage/trouble.h"

namespace tool {
namespace {

struct Group {
  const char* name;
  const char* summary;
  const std::vector<Command>& (*commands)();
};

constexpr Group kGroups[] = {
    {"client", "Registered applications", clientCommands},
    {"user", "What users have agreed to", userCommands},
    {"code", "Grant codes", codeCommands},
    {"token", "Access and refresh tokens", tokenCommands},
    {"log", "Audit log", logCommands},
    {"engine", "Where the store is", engineCommands},
};

/// What the command line asked for.
struct Invocation {
  const Command* command = nullptr;
  Arguments arguments;
};

// Parsing ---------------------------------------------------------------------------

void addCommand(CLI::App& parent, const Command& command, Invocation& invocation) {
  CLI::App* const sub = parent.add_subcommand(command.name, command.summary);
  for (const Option& option : command.options) declare(option, *sub, invocation.arguments);
  sub->callback([&command, &invocation] { invocation.command = &command; });
}

void addCommands(CLI::App& app, Invocation& invocation) {
  for (const Group& group : kGroups) {
    CLI::App* const sub = app.add_subcommand(group.name, group.summary);
    sub->require_subcommand(1);
    declare(option::kJson, *sub, invocation.arguments);
    for (const Command& command : group.commands()) addCommand(*sub, command, invocation);
  }
  for (const auto command :
       {purgeCommand, statusCommand, backupCommand, restoreCommand, rekeyCommand}) {
    addCommand(app, command(), invocation);
  }
}

/// What the command line got to: the group or the command that it names.
const CLI::App& reached(const CLI::App& app) {
  const CLI::App* at = &app;
  while (!at->get_subcommands().empty()) at = at->get_subcommands().front();
  return *at;
}

/// "client add", empty for the program itself.
std::string commandName(const CLI::App& app) {
  std::string name;
  for (const CLI::App* at = &app; at->get_parent() != nullptr; at = at->get_parent()) {
    name.insert(0, at->get_name() + (name.empty() ? "" : " "));
  }
  return name;
}

/// What is wrong with a command line that reached `app`.
std::string complaint(const CLI::App& app, const CLI::ParseError& error) {
  const bool isCommand = app.get_subcommands({}).empty();
  const std::vector<std::string> rest = app.remaining();
  if (rest.empty()) return isCommand ? error.what() : "a command is missing";
  return (isCommand ? "unexpected argument '" : "unknown command '") + rest.front() + "'";
}

// Answers ---------------------------------------------------------------------------

Json::Value documentOf(const Failure& failure) {
  Json::Value document;
  Json::Value& error = document["error"];
  error["exit"] = static_cast<int>(failure.exit);
  error["code"] = failure.code ? Json::Value(*failure.code) : Json::Value();
  error["message"] = failure.what();
  error["hint"] = failure.hint;
  return document;
}

/// In one piece: others may write to the same place.
ExitCode report(const std::string& command, const Failure& failure, bool asJson) {
  std::string text =
      "keldoauth: " + command + (command.empty() ? "" : ": ") + failure.text() + '\n';
  if (!failure.hint.empty()) text += "hint: " + failure.hint + '\n';
  std::cerr << text;
  if (asJson) printJson(std::cout, documentOf(failure));
  return failure.exit;
}

void prepare(const Command& command) {
  if (command.needs == Needs::kDatabase) requireDatabase();
  if (command.newKey == NewKey::kNever) makeNoKey();
}

ExitCode run(const std::string& name, const Invocation& invocation) {
  const Command& command = *invocation.command;
  const bool asJson = invocation.arguments.json;
  try {
    prepare(command);
    const Answer answer = command.run(invocation.arguments);
    if (asJson) {
      printJson(std::cout, answer.document);
    } else {
      command.print(answer.document, std::cout);
    }
    return answer.exit;
  } catch (const Failure& failure) {
    return report(name, failure, asJson);
  } catch (const KELDOAUTHSERVER::grants::Trouble& trouble) {
    return report(name, failureOf(trouble), asJson);
  } catch (const std::exception& error) {
    return report(name, Failure(kUnavailable, error.what()), asJson);
  }
}

/// Asked-for help is an answer; everything else that ends parsing is a mistake.
ExitCode answerUnparsed(const CLI::App& app, const CLI::ParseError& error, bool asJson) {
  if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success)) {
    app.exit(error, std::cout, std::cerr);
    return kOk;
  }
  const CLI::App& at = reached(app);
  const std::string name = commandName(at);
  const std::string help = "keldoauth " + name + (name.empty() ? "" : " ") + "--help";
  const Failure failure(kUsage, complaint(at, error), "'" + help + "' says what is possible");
  return report(name, failure, asJson);
}

ExitCode answer(int argc, char** argv) {
  Invocation invocation;
  CLI::App app("Administers the storage of the authorisation service.", "keldoauth");
  app.set_version_flag("--version", "keldoauth " KELDOAUTH_VERSION);
  app.require_subcommand(1);
  declare(option::kJson, app, invocation.arguments);
  addCommands(app, invocation);
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    // The parser stops before it fills in flags.
    const bool asJson = std::find(argv, argv + argc, std::string("--json")) != argv + argc;
    return answerUnparsed(app, error, asJson);
  }
  return run(commandName(reached(app)), invocation);
}

}  // namespace
}  // namespace tool

int main(int argc, char** argv) try {
  // Only to tell characters apart; the messages stay English.
  std::setlocale(LC_CTYPE, "C.UTF-8");
  const tool::ExitCode exit = tool::answer(argc, argv);
  std::cout.flush();
  if (std::cout.good()) return exit;
  std::cerr << "keldoauth: cannot write to standard output\n";
  return tool::kNotWritten;
} catch (const std::exception& error) {
  std::fprintf(stderr, "keldoauth: %s\n", tool::printable(error.what()).c_str());
  return tool::kUnavailable;
}
