// What the owner of the box has settled about the service: a JSON file, and
// beside it the file of the keys (keys.h).
//
//   issuer                https://box.example or https://box.example/path: how the
//                         whole world calls this service; http on loopback alone
//   administrators        who may see /admin, user names; [] without it
//   scopes                name: words that tell people what it allows
//   initial_access_token  opens registration, 32 to 256 characters; "" or none:
//                         nobody registers an application itself
//   sign_in               "web-server" (which then says who the user is),
//                         "system" (the users of the box) or "htpasswd"
//   htpasswd_file         for the last
//   session_hours         how long a sign-in lasts, 1 to 8760; 12 without it
//   keys_file             service.keys.json beside this file without it
//   counters_file         what went wrong how often; /var/lib/keldoauth/counters
//                         without it, "" counts nothing
//   signing_keys_file     signing.keys.json beside this file without it: the keys
//                         that sign who somebody is (signing/key_file.h)

#ifndef KELDOAUTH_SERVICE_SETTINGS_SETTINGS_H
#define KELDOAUTH_SERVICE_SETTINGS_SETTINGS_H

#include <set>
#include <stdexcept>
#include <string>
#include <vector>

#include "service/settings/scopes.h"

namespace keldoauth::service {

enum class SignIn { kWebServer, kSystem, kHtpasswd };

struct Settings {
  std::string issuer;                    // without a slash at the end
  std::string basePath;                  // the issuer's path: empty, or /auth
  std::set<std::string> administrators;  // who may see /admin
  ScopeTable scopes;
  std::string initialAccessToken;  // empty: nobody may register
  SignIn signIn = SignIn::kWebServer;
  std::string htpasswdFile;
  long long sessionSeconds = 12LL * 60 * 60;
  std::string keysFile;
  std::string countersFile;     // empty: nothing is counted
  std::string signingKeysFile;  // read by who signs alone
  std::string formKey;          // signs the tokens in forms
  std::string sessionKey;       // signs sessions

  [[nodiscard]] bool isHttps() const { return issuer.rfind("https:", 0) == 0; }

  /// The whole address of `path`, for other programs.
  [[nodiscard]] std::string endpoint(const std::string& path) const { return issuer + path; }

  /// The same for a page of ours, and for a redirect to one.
  [[nodiscard]] std::string link(const std::string& path) const { return basePath + path; }
};

/// What is wrong with the settings, a line for each fault: it names the key, and
/// no value. All faults of a file are found at once.
class SettingsFault : public std::runtime_error {
 public:
  explicit SettingsFault(std::vector<std::string> faults);
  [[nodiscard]] const std::vector<std::string>& faults() const { return faults_; }

 private:
  std::vector<std::string> faults_;
};

/// The settings but for the keys. `path` is where the text comes from. Throws
/// SettingsFault.
Settings parseSettings(const std::string& text, const std::string& path);

/// The same for a file. Throws SettingsFault.
Settings readSettingsWithoutKeys(const std::string& path);

/// The settings with the keys. Throws SettingsFault.
Settings readSettings(const std::string& path);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_SETTINGS_SETTINGS_H
