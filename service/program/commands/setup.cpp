#include <fcntl.h>
#include <grp.h>
#include <json/writer.h>
#include <pwd.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <CLI/App.hpp>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <iostream>
#include <memory>
#include <stdexcept>
#include <vector>

#include "grants/grants.h"
#include "service/program/commands/command.h"
#include "service/settings/keys.h"
#include "service/settings/private_text.h"
#include "service/settings/settings.h"
#include "service/signing/key_file.h"
#include "service/signing/key_set.h"
#include "utils/descriptor.h"
#include "utils/folder.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace keldoauth::service {
namespace {

namespace grants = KELDOAUTHSERVER::grants;

using KELDOAUTHSERVER::folderOf;

constexpr char kSwitchOn[] = "/usr/sbin/lighttpd-enable-mod";
constexpr char kServices[] = "/usr/sbin/service";
constexpr unsigned kIdentifierCharacters = 64;
constexpr int kSwitchedOnBefore = 2;  // of lighttpd-enable-mod

struct Wishes {
  std::string issuer;
  std::vector<std::string> administrators;
  std::string signIn = "system";
  std::string htpasswdFile;
  std::string webServer = "lighttpd";
};

bool isThere(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0;
}

// Files -------------------------------------------------------------------------

/// The folder's group is the service's: what it has to read, that group can. A
/// link, or a second name, in the place of the file may be to anybody's.
void shareWithFolder(const std::string& path) {
  const KELDOAUTHSERVER::Descriptor file(
      open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat folder {};
  struct stat status {};
  if (!file.isOpen() || fstat(file.get(), &status) != 0 ||
      stat(folderOf(path).c_str(), &folder) != 0) {
    throw SettingsFault({path + ": " + std::strerror(errno)});
  }
  if (!S_ISREG(status.st_mode) || status.st_nlink != 1) {
    throw SettingsFault({path + " is no file of this folder alone"});
  }
  if (fchown(file.get(), static_cast<uid_t>(-1), folder.st_gid) != 0 ||
      fchmod(file.get(), S_IRUSR | S_IWUSR | S_IRGRP) != 0) {
    throw SettingsFault({path + ": " + std::strerror(errno)});
  }
}

std::string quoted(const std::string& text) {
  return Json::valueToQuotedString(text.c_str());
}

/// Laid out for the owner, who will edit it.
std::string settingsText(const Wishes& wishes) {
  std::string administrators;
  for (const std::string& name : wishes.administrators) {
    administrators += (administrators.empty() ? "" : ", ") + quoted(name);
  }
  std::string text = "{\n  \"issuer\": " + quoted(wishes.issuer) + ",\n  \"administrators\": [" +
                     administrators + "],\n  \"sign_in\": " + quoted(wishes.signIn) + ",\n";
  if (!wishes.htpasswdFile.empty()) {
    text += "  \"htpasswd_file\": " + quoted(wishes.htpasswdFile) + ",\n";
  }
  return text + R"(  "scopes": {
    "openid": "Know who you are on this box",
    "profile": "See your user name on this box"
  }
}
)";
}

// Checks ------------------------------------------------------------------------

/// What `text` settles. Throws SettingsFault; nothing has been made yet.
Settings checkedSettings(const Wishes& wishes, const std::string& text, const std::string& path) {
  Settings settings = parseSettings(text, path);
  if (isThere(path)) {
    throw SettingsFault({path + " is there already: edit it, and ask keldoauth-service check"});
  }
  if (wishes.signIn != "system") return settings;
  for (const std::string& name : wishes.administrators) {
    if (getpwnam(name.c_str()) == nullptr) {
      throw SettingsFault({name + " is no user of this box; --sign-in htpasswd knows others"});
    }
  }
  return settings;
}

// The store ---------------------------------------------------------------------

/// Becomes the user whom the folder of the store belongs to, for good.
void becomeOwnerOf(const std::string& folder) {
  struct stat status {};
  const bool done =
      stat(folder.c_str(), &status) == 0 &&
      (geteuid() != 0 ||
       (setgroups(0, nullptr) == 0 && setresgid(status.st_gid, status.st_gid, status.st_gid) == 0 &&
        setresuid(status.st_uid, status.st_uid, status.st_uid) == 0));
  if (!done) throw SettingsFault({folder + ": " + std::strerror(errno)});
}

/// The store and its key are the service's from their first moment: what root
/// made there the service could not open.
int openStoreAsItsOwner() try {
  becomeOwnerOf(folderOf(KELDOAUTHSERVER::names::kDatabaseFile));
  const grants::Grants store;
  // The first identifier that is encrypted makes the key.
  const grants::ApplicationId nobody(KELDOAUTHSERVER::getRandomStr(kIdentifierCharacters));
  static_cast<void>(store.applications.find(nobody));
  return kDone;
} catch (const std::exception& error) {
  std::cerr << "keldoauth-service: the store: " << error.what() << '\n';
  return kFaulty;
}

int statusOf(pid_t child) {
  int status = 0;
  while (waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) return -1;
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

void makeStore() {
  const pid_t child = fork();
  if (child == 0) _exit(openStoreAsItsOwner());
  if (child < 0 || statusOf(child) != kDone) {
    throw std::runtime_error("the store cannot be opened by the user whose folder it is in");
  }
}

// The web server ----------------------------------------------------------------

/// What goes well says nothing. The exit status; -1 when it could not be started.
int run(std::vector<std::string> words) {
  std::vector<char*> arguments;
  arguments.reserve(words.size() + 1);
  for (std::string& word : words) arguments.push_back(word.data());
  arguments.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  if (posix_spawn_file_actions_init(&actions) != 0) return -1;
  pid_t child = 0;
  const bool hasStarted =
      posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0) == 0 &&
      posix_spawn(&child, arguments[0], &actions, nullptr, arguments.data(), environ) == 0;
  posix_spawn_file_actions_destroy(&actions);
  if (!hasStarted) return -1;
  return statusOf(child);
}

/// lighttpd's variable: below which of its paths the service lies.
void tellPath(const std::string& path, const std::string& basePath) {
  unlink(path.c_str());
  makePrivateFile(path, "var.keldoauth_base = \"" + basePath + "\"\n");
  shareWithFolder(path);
}

void switchOnLighttpd(const std::string& basePath, const std::string& folder) {
  tellPath(folder + "/lighttpd.conf", basePath);
  const int status = run({kSwitchOn, "keldoauth"});
  if (status != 0 && status != kSwitchedOnBefore) {
    throw std::runtime_error("lighttpd-enable-mod keldoauth did not succeed");
  }
  if (run({kServices, "lighttpd", "restart"}) != 0) {
    throw std::runtime_error("all is set up, but lighttpd did not start again: see its own words");
  }
}

// -------------------------------------------------------------------------------

int setUp(const Wishes& wishes, const std::string& path) try {
  const std::string text = settingsText(wishes);
  const Settings settings = checkedSettings(wishes, text, path);
  makeStore();
  if (!isThere(settings.keysFile)) makeKeys(settings.keysFile);
  shareWithFolder(settings.keysFile);
  if (!isThere(settings.signingKeysFile)) {
    signing::KeyFile(settings.signingKeysFile)
        .create(signing::KeySet::make(std::time(nullptr)), {});
  }
  shareWithFolder(settings.signingKeysFile);
  makePrivateFile(path, text);
  shareWithFolder(path);
  std::cout << "Made " << path << " and " << settings.keysFile << ".\n" << std::flush;

  if (wishes.webServer == "lighttpd") switchOnLighttpd(settings.basePath, folderOf(path));
  std::cout << "The service is " << settings.issuer << "\n"
            << "Administration: " << settings.endpoint("/admin") << "\n";
  if (settings.isHttps()) {
    std::cout << "It answers by TLS alone: a web server without a certificate needs one now "
                 "(lighttpd-enable-mod ssl; /etc/lighttpd/server.pem).\n";
  }
  return kDone;
} catch (const SettingsFault& fault) {
  for (const std::string& line : fault.faults()) std::cerr << line << '\n';
  return kFaulty;
}

}  // namespace

Run declareSetup(CLI::App& command) {
  const auto wishes = std::make_shared<Wishes>();
  command.add_option("--issuer", wishes->issuer, "How the world calls it: https://box.example")
      ->type_name("ADDRESS")
      ->required();
  command
      .add_option("--admin", wishes->administrators,
                  "A user who may administer it; once for each of several")
      ->type_name("USER")
      ->required();
  command.add_option("--sign-in", wishes->signIn, "Who says who a user is")
      ->check(CLI::IsMember({"system", "htpasswd", "web-server"}))
      ->capture_default_str();
  command.add_option("--htpasswd-file", wishes->htpasswdFile, "For --sign-in htpasswd")
      ->type_name("FILE");
  command.add_option("--web-server", wishes->webServer, "Which one to set up with it")
      ->check(CLI::IsMember({"lighttpd", "none"}))
      ->capture_default_str();
  return [wishes](const std::string& path) { return setUp(*wishes, path); };
}

}  // namespace keldoauth::service
