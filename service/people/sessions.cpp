#include "service/people/sessions.h"

#include <ctime>
#include <vector>

#include "service/http/request.h"
#include "service/text/encoding.h"
#include "utils/oauth_utils.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

constexpr unsigned int kIdLength = 32;
/// No user name and no time has a colon here: names are percent-encoded.
constexpr char kSeparator = ':';
/// Clocks are set right now and then.
constexpr long long kTolerance = 60;

std::string now() {
  return std::to_string(static_cast<long long>(std::time(nullptr)));
}

std::string newId() {
  return KELDOAUTHSERVER::getRandomStr(kIdLength).substr(0, kIdLength);
}

bool isYoungerThan(long long then, long long seconds) {
  const long long age = static_cast<long long>(std::time(nullptr)) - then;
  return age >= -kTolerance && age < seconds;
}

/// Text and MAC, which stands behind the last separator.
struct Signed {
  std::string text;
  std::string mac;
};

Signed cut(const std::string& cookie) {
  const std::size_t end = cookie.rfind(kSeparator);
  if (end == std::string::npos) return {};
  return {cookie.substr(0, end), cookie.substr(end + 1)};
}

}  // namespace

std::string Sessions::mac(const std::string& text, const std::string& stamp) const {
  return base64Url(hmacSha256(key_, "session\n" + text + "\n" + stamp));
}

std::optional<std::string> Sessions::begin(const std::string& user) const {
  const std::optional<std::string> stamp = directory_.stampOf(user);
  if (!stamp) return std::nullopt;
  const std::string text = now() + kSeparator + newId() + kSeparator + percentEncode(user);
  return text + kSeparator + mac(text, *stamp);
}

std::optional<Session> Sessions::read(const std::string& cookie) const {
  const auto [text, given] = cut(cookie);
  const std::vector<std::string> parts = split(text, kSeparator);
  if (parts.size() != 3) return std::nullopt;
  const std::optional<std::string> user = formDecode(parts[2]);
  const long long authTime = number(parts[0]);
  if (!user || !isYoungerThan(authTime, lifetime_)) return std::nullopt;

  const std::optional<std::string> stamp = directory_.stampOf(*user);
  if (!stamp || !equalSecrets(given, mac(text, *stamp))) return std::nullopt;
  return Session{*user, authTime, parts[1]};
}

std::string KnownBrowsers::mac(const std::string& text, const std::string& user) const {
  return base64Url(hmacSha256(key_, "browser\n" + text + "\n" + user));
}

std::string KnownBrowsers::remember(const std::string& user) const {
  const std::string text = now() + kSeparator + newId();
  return text + kSeparator + mac(text, user);
}

std::string KnownBrowsers::nameOf(const std::string& cookie, const std::string& user) const {
  const auto [text, given] = cut(cookie);
  const bool isOurs = !text.empty() && equalSecrets(given, mac(text, user)) &&
                      isYoungerThan(number(text), kSeconds);
  return isOurs ? text : std::string();
}

}  // namespace keldoauth::service
