#include "service/people/auth_log.h"

#include <syslog.h>

#include "service/people/address.h"

namespace keldoauth::service {
namespace {

/// Of what a stranger can make as long as a request.
constexpr std::size_t kMostBytes = 256;

std::string quoted(const std::string& text) {
  constexpr char kDigits[] = "0123456789ABCDEF";
  std::string safe = "\"";
  for (const char c : text.substr(0, kMostBytes)) {
    if (c >= ' ' && c <= '~' && c != '"' && c != '\\') {
      safe += c;
      continue;
    }
    const auto byte = static_cast<unsigned char>(c);
    safe.append("\\x").append(1, kDigits[byte >> 4U]).append(1, kDigits[byte & 15U]);
  }
  return safe + "\"";
}

}  // namespace

void logFailedSignIn(const std::string& peer, const std::string& user, const std::string& why) {
  const std::string whom = user.empty() ? "nobody known" : "user " + quoted(user);
  syslog(LOG_AUTH | LOG_NOTICE, "failed sign-in from %s of %s: %s", loggedAddress(peer).c_str(),
         whom.c_str(), why.c_str());
}

void logThrottled(const std::string& what, const std::string& peer) {
  syslog(LOG_AUTH | LOG_NOTICE, "throttled %s from %s", what.c_str(), loggedAddress(peer).c_str());
}

void logFailedSecret(const std::string& peer, const std::string& path) {
  syslog(LOG_AUTH | LOG_NOTICE, "failed secret from %s at %s", loggedAddress(peer).c_str(),
         quoted(path).c_str());
}

void logCannotCheck(const std::string& why) {
  syslog(LOG_AUTH | LOG_ERR, "cannot check passwords: %s", why.c_str());
}

}  // namespace keldoauth::service
