// The service's own settings: a JSON file that only its user can read, named by
// the web server in the variable SERVICE_SETTINGS.

#ifndef KELDOAUTH_EXAMPLES_CGI_SETTINGS_H
#define KELDOAUTH_EXAMPLES_CGI_SETTINGS_H

#include <set>
#include <string>

namespace service {

struct Settings {
  std::string issuer;                    // https://box.example, without a slash at the end
  std::string initialAccessToken;        // opens registration; empty: nobody may register
  std::string formKey;                   // signs the tokens in forms
  std::set<std::string> administrators;  // who may see /admin

  [[nodiscard]] std::string endpoint(const std::string& path) const { return issuer + path; }
};

/// Throws std::runtime_error when the file is missing or not as it should be.
const Settings& settings();

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_SETTINGS_H
