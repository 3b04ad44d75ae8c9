#include "service/pages/form_token.h"

#include <ctime>

#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr long long kLifetimeSeconds = 15LL * 60;

/// User names and subjects may hold any character, so each goes in encoded.
std::string tokenFor(const Settings& settings, const std::string& expiry, const std::string& user,
                     const std::string& subject) {
  const std::string signedText = expiry + "." + base64Url(user) + "." + base64Url(subject);
  return expiry + "." + base64Url(hmacSha256(settings.formKey, signedText));
}

}  // namespace

std::string formToken(const Settings& settings, const std::string& user,
                      const std::string& subject) {
  return tokenFor(settings, std::to_string(std::time(nullptr) + kLifetimeSeconds), user, subject);
}

bool isFormToken(const Settings& settings, const std::string& token, const std::string& user,
                 const std::string& subject) {
  const std::string expiry = token.substr(0, token.find('.'));
  return equalSecrets(token, tokenFor(settings, expiry, user, subject)) &&
         number(expiry) >= std::time(nullptr);
}

}  // namespace keldoauth::service
