// What a sub-command is: a name, the options that it takes, the function that
// does it and the function that shows its answer to people. Dispatch, help and
// option parsing all come from tables of these.

#ifndef KELDOAUTH_TOOLS_COMMAND_H
#define KELDOAUTH_TOOLS_COMMAND_H

#include <json/value.h>

#include <iosfwd>
#include <optional>
#include <string>
#include <vector>

#include "tools/keldoauth/console/failure.h"
#include "tools/keldoauth/console/options.h"

namespace tool {

/// The answer of a command that was carried out. `document` is what --json
/// writes; the readable form is made from it and from nothing else.
struct Answer {
  Json::Value document;
  ExitCode exit = kOk;
};

struct Command {
  const char* name;
  const char* summary;
  std::vector<Option> options;
  /// Throws Failure.
  Answer (*run)(const Arguments& arguments);
  void (*print)(const Json::Value& document, std::ostream& out);
};

const std::vector<Command>& clientCommands();
const std::vector<Command>& codeCommands();
const std::vector<Command>& tokenCommands();
const std::vector<Command>& logCommands();
const Command& statusCommand();
const Command& backupCommand();
const Command& restoreCommand();
const Command& rekeyCommand();

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_COMMAND_H
