#include <iostream>
#include <memory>

#include "service/people/people.h"
#include "service/program/commands/command.h"
#include "service/settings/settings.h"

namespace keldoauth::service {
namespace {

int check(const std::string& path) try {
  const Settings settings = readSettings(path);
  const std::unique_ptr<Directory> directory = directoryOf(settings);
  if (const std::string problem = directory ? directory->problem() : ""; !problem.empty()) {
    throw SettingsFault({problem});
  }
  std::cout << "The settings in " << path << " are in order.\nThe issuer is " << settings.issuer
            << ".\n";
  return kDone;
} catch (const SettingsFault& fault) {
  for (const std::string& line : fault.faults()) std::cerr << line << '\n';
  return kFaulty;
}

}  // namespace

Run declareCheck(CLI::App& /*command*/) {
  return check;
}

}  // namespace keldoauth::service
