#include <iostream>
#include <memory>
#include <stdexcept>

#include "service/people/htpasswd.h"
#include "service/people/htpasswd_edit.h"
#include "service/program/commands/command.h"
#include "service/program/terminal.h"
#include "service/settings/settings.h"

namespace keldoauth::service {
namespace {

struct Chosen {
  std::string file;  // empty: the one of the settings
  std::string user;
  Run run;
};

std::string fileOf(const Chosen& chosen, const std::string& settingsPath) {
  if (!chosen.file.empty()) return chosen.file;
  const Settings settings = readSettingsWithoutKeys(settingsPath);
  if (settings.signIn == SignIn::kHtpasswd) return settings.htpasswdFile;
  throw std::runtime_error(R"(the settings have no file of users (sign_in: "htpasswd"))");
}

int add(const Chosen& chosen, const std::string& settingsPath) {
  const std::string file = fileOf(chosen, settingsPath);
  const bool isNew = setHtpasswdUser(file, chosen.user, readNewPassword(chosen.user));
  std::cout << chosen.user << (isNew ? " can sign in." : " has a new password.") << '\n';
  return kDone;
}

int remove(const Chosen& chosen, const std::string& settingsPath) {
  if (!removeHtpasswdUser(fileOf(chosen, settingsPath), chosen.user)) {
    throw std::runtime_error("there is no " + chosen.user);
  }
  std::cout << chosen.user << " cannot sign in any more.\n";
  return kDone;
}

/// Control characters of a broken line do not get to the terminal.
std::string shown(const HtpasswdLine& line) {
  if (line.problem.empty()) return line.name;
  return "line " + std::to_string(line.number) + " " + line.problem;
}

int list(const Chosen& chosen, const std::string& settingsPath) {
  int status = kDone;
  for (const HtpasswdLine& line : readHtpasswd(htpasswdText(fileOf(chosen, settingsPath)))) {
    (line.problem.empty() ? std::cout : std::cerr) << shown(line) << '\n';
    if (!line.problem.empty()) status = kFaulty;
  }
  return status;
}

using Act = int (*)(const Chosen& chosen, const std::string& settingsPath);

void declare(CLI::App& command, const std::shared_ptr<Chosen>& chosen, const char* name,
             const char* summary, Act act) {
  CLI::App* const sub = command.add_subcommand(name, summary);
  sub->add_option("--file", chosen->file, "The file, if not the one of the settings")
      ->type_name("FILE");
  if (act != list) {
    sub->add_option("name", chosen->user, "The user's name")->required()->type_name("NAME");
  }
  sub->callback([chosen, act] {
    chosen->run = [chosen = chosen.get(), act](const std::string& path) {
      return act(*chosen, path);
    };
  });
}

}  // namespace

Run declareUser(CLI::App& command) {
  const auto chosen = std::make_shared<Chosen>();
  command.require_subcommand(1);
  declare(command, chosen, "add",
          "Add a user, or set a new password: asked for, or one line of standard input", add);
  declare(command, chosen, "remove", "Remove a user, whose sessions end", remove);
  declare(command, chosen, "list", "List the users, and lines that let nobody in", list);
  return [chosen](const std::string& settingsPath) { return chosen->run(settingsPath); };
}

}  // namespace keldoauth::service
