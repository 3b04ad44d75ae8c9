// What the owner of the box has settled about the service: a JSON file that only
// the service's user can read.

#ifndef KELDOAUTH_SERVICE_SETTINGS_SETTINGS_H
#define KELDOAUTH_SERVICE_SETTINGS_SETTINGS_H

#include <set>
#include <string>

#include "service/settings/scopes.h"

namespace keldoauth::service {

struct Settings {
  std::string issuer;                    // https://box.example, without a slash at the end
  std::string basePath;                  // the issuer's path: empty, or /auth
  std::string initialAccessToken;        // opens registration; empty: nobody may register
  std::string formKey;                   // signs the tokens in forms
  std::set<std::string> administrators;  // who may see /admin
  ScopeTable scopes;

  /// The whole address of `path`, for other programs.
  [[nodiscard]] std::string endpoint(const std::string& path) const { return issuer + path; }

  /// The same for a page of ours, and for a redirect to one.
  [[nodiscard]] std::string link(const std::string& path) const { return basePath + path; }
};

/// Throws std::runtime_error when the file is missing or not as it should be.
Settings readSettings(const std::string& path);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_SETTINGS_SETTINGS_H
