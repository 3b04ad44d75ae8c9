#include "service/oidc/authentication.h"

#include <algorithm>
#include <ctime>
#include <iostream>

#include "service/oidc/id_token.h"
#include "service/oidc/login_text.h"
#include "service/pages/consent_page.h"
#include "service/pages/sign_in.h"
#include "service/signing/key_fault.h"
#include "service/signing/key_file.h"
#include "service/text/encoding.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

constexpr char kMark[] = "signed_in_since";
constexpr long long kMarkSeconds = 15LL * 60;
constexpr std::size_t kMostDigits = 10;

bool isNumber(const std::string& text) {
  return !text.empty() && text.size() <= kMostDigits &&
         std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
}

long long now() {
  return static_cast<long long>(std::time(nullptr));
}

/// For this request alone: who has a mark of another one cannot use it later on, in
/// a browser that somebody has left.
std::string markOf(const Settings& settings, const AuthorizationRequest& asked, long long time) {
  const std::string text = std::to_string(time);
  const std::string about = "sign-in-again." + text + "." + formSubject(asked);
  return text + '.' + base64Url(hmacSha256(settings.formKey, about));
}

/// When the user was sent to sign in again; nothing without a good mark.
std::optional<long long> timeIn(const Settings& settings, const AuthorizationRequest& asked,
                                const std::string& mark) {
  const std::string text = mark.substr(0, mark.find('.'));
  if (!isNumber(text) || !equalSecrets(mark, markOf(settings, asked, number(text)))) return {};
  const long long age = now() - number(text);
  return age >= 0 && age <= kMarkSeconds ? std::optional(number(text)) : std::nullopt;
}

}  // namespace

std::optional<RequestFault> readAuthentication(const Parameters& given,
                                               AuthorizationRequest& asked) {
  if (given.isAnyDoubled({"nonce", "max_age", kHint})) {
    return RequestFault{"invalid_request", "A parameter occurs more than once"};
  }
  asked.hint = given.value(kHint);
  asked.nonce = given.value("nonce");
  if (asked.nonce.size() > kMaxNonce || !isUtf8(asked.nonce)) {
    return RequestFault{"invalid_request", "nonce has more than 256 bytes, or is no UTF-8"};
  }
  const std::string age = given.value("max_age");
  if (age.empty()) return {};
  if (!isNumber(age)) return RequestFault{"invalid_request", "max_age is no number of seconds"};
  asked.maxAge = number(age);
  return {};
}

std::optional<RequestFault> faultOfKeys(const Settings& settings,
                                        const AuthorizationRequest& asked) try {
  if (offersOpenId(settings) && asksWhoItIs(asked.scope)) {
    static_cast<void>(signing::KeyFile(settings.signingKeysFile).read());
  }
  return {};
} catch (const signing::KeyFault& fault) {
  std::cerr << "keldoauth-service: " << fault.what() << '\n';
  return RequestFault{"server_error", "This box cannot say who its users are just now"};
}

bool isForAnother(const Settings& settings, const Request& request,
                  const AuthorizationRequest& asked) {
  if (asked.hint.empty() || !offersOpenId(settings)) return false;
  const std::string subject = readHint(settings, asked.hint).subject;
  return subject.empty() ? asked.prompt.none : subject != openIdSubject(grants::User(request.user));
}

bool mustSignInAgain(const Settings& settings, const Request& request, const Parameters& given,
                     const AuthorizationRequest& asked, bool isAnothers) {
  if (settings.signIn == SignIn::kWebServer) return false;
  if (const auto since = timeIn(settings, asked, given.value(kMark))) {
    return request.authTime < *since;
  }
  return asked.prompt.login || isAnothers ||
         (asked.maxAge && now() - request.authTime > *asked.maxAge);
}

Answer signInAgain(const Settings& settings, const Request& request,
                   const AuthorizationRequest& asked) {
  Request again = request;
  // Not behind an older one of its kind, which would be read first.
  again.query = again.query.substr(0, again.query.find(std::string("&") + kMark + "="));
  again.query += std::string("&") + kMark + "=" + markOf(settings, asked, now());
  return redirectAnswer(request, signInPath(settings, again));
}

}  // namespace keldoauth::service
