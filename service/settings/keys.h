// The secrets that the service makes for itself: a JSON file that nobody but the
// service's user and group can read.

#ifndef KELDOAUTH_SERVICE_SETTINGS_KEYS_H
#define KELDOAUTH_SERVICE_SETTINGS_KEYS_H

#include <string>

namespace keldoauth::service {

struct Keys {
  std::string form;     // "form_key": signs the tokens in forms
  std::string session;  // "session_key": signs sessions
};

/// At least 32 characters each. Throws SettingsFault (settings.h).
Keys readKeys(const std::string& path);

/// Draws both and makes the file, mode 0600, of the user who runs this. A file
/// that is there is never touched: throws SettingsFault then, too.
void makeKeys(const std::string& path);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_SETTINGS_KEYS_H
