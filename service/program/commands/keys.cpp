#include <sys/stat.h>

#include <ctime>
#include <iostream>
#include <memory>

#include "service/program/commands/command.h"
#include "service/settings/settings.h"
#include "service/signing/key_file.h"
#include "service/signing/key_set.h"
#include "service/text/utc.h"

namespace keldoauth::service {
namespace {

using signing::KeyFile;
using signing::KeySet;

constexpr signing::Time kDay = 86400;
constexpr int kMostDays = 36500;

std::string dateOf(signing::Time time) {
  return utcText(time).value_or("?");
}

void print(const KeySet& keys) {
  const signing::Time now = std::time(nullptr);
  for (std::size_t i = 0; i < keys.keys().size(); ++i) {
    const signing::DatedKey& dated = keys.keys()[i];
    std::cout << nameOf(dated.key.algorithm()) << ' ' << dated.key.identifier() << ' '
              << nameOf(keys.stateOf(i, now)) << ", signs from " << dateOf(dated.signsFrom)
              << " UTC, made " << dateOf(dated.made) << '\n';
  }
}

/// New keys are whose the service's other secrets are.
signing::Access accessLike(const std::string& path) {
  struct stat status {};
  if (lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return {};
  return {status.st_uid, status.st_gid, static_cast<mode_t>((status.st_mode & 0040U) | 0600U)};
}

int show(const Settings& settings) {
  print(KeyFile(settings.signingKeysFile).read());
  return kDone;
}

int add(const Settings& settings) {
  const KeySet keys = KeySet::make(std::time(nullptr));
  KeyFile(settings.signingKeysFile).create(keys, accessLike(settings.keysFile));
  print(keys);
  return kDone;
}

struct Rotation {
  int days = 0;
  bool isAtOnce = false;
};

int rotate(const Settings& settings, const Rotation& wanted) {
  const KeyFile file(settings.signingKeysFile);
  file.update([&](KeySet& keys) {
    const signing::Time now = std::time(nullptr);
    if (wanted.isAtOnce) {
      keys.replace(now);
    } else if (wanted.days == 0 || keys.isDue(now, wanted.days * kDay)) {
      keys.rotate(now);
    } else {
      keys.forget(now);
    }
  });
  print(file.read());
  return kDone;
}

using Work = std::function<int(const Settings& settings)>;

void declare(CLI::App& command, const char* name, const char* summary,
             const std::shared_ptr<Work>& chosen, const Work& work) {
  command.add_subcommand(name, summary)->callback([=] { *chosen = work; });
}

}  // namespace

Run declareKeys(CLI::App& command) {
  const auto chosen = std::make_shared<Work>();
  const auto rotation = std::make_shared<Rotation>();
  command.require_subcommand(1);
  declare(command, "show", "List the keys, and which of them signs", chosen, show);
  declare(command, "add", "Make the file of the keys, where there is none", chosen, add);
  declare(command, "rotate", "Publish new keys, which sign from tomorrow on", chosen,
          [rotation](const Settings& settings) { return rotate(settings, *rotation); });

  CLI::App* const rotating = command.get_subcommand("rotate");
  CLI::Option* const days =
      rotating->add_option("--if-older-than", rotation->days, "Only if one has signed for so long")
          ->type_name("DAYS")
          ->check(CLI::Range(1, kMostDays));
  rotating
      ->add_flag("--at-once", rotation->isAtOnce,
                 "Throw the old keys away, which somebody has got hold of, and all they signed")
      ->excludes(days);
  return [chosen](const std::string& settingsPath) {
    return (*chosen)(readSettingsWithoutKeys(settingsPath));
  };
}

}  // namespace keldoauth::service
