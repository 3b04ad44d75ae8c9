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

/// Whether a command has anything to do without a database.
enum class Needs { kDatabase, kNothing };

/// Whether a command may lead to a key for the stand-in cipher where none is.
enum class NewKey { kNever, kAllowed };

struct Command {
  const char* name;
  const char* summary;
  std::vector<Option> options;
  /// Throws Failure.
  Answer (*run)(const Arguments& arguments);
  void (*print)(const Json::Value& document, std::ostream& out);
  Needs needs = Needs::kDatabase;
  NewKey newKey = NewKey::kNever;
};

const std::vector<Command>& clientCommands();
const std::vector<Command>& userCommands();
const std::vector<Command>& codeCommands();
const std::vector<Command>& tokenCommands();
const std::vector<Command>& logCommands();
const std::vector<Command>& engineCommands();
const Command& purgeCommand();
const Command& statusCommand();
const Command& backupCommand();
const Command& restoreCommand();
const Command& rekeyCommand();

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_COMMAND_H
