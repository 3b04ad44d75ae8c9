#include "service/oidc/login_text.h"

#include <algorithm>

#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

// "openid1 1700000000 nonce": the nonce, which may have any bytes, is the rest.
constexpr std::string_view kStart = "openid1 ";
constexpr std::size_t kMostDigits = 18;

static_assert(kStart.size() + kMostDigits + 1 + kMaxNonce <= grants::kCallerTextBounds.max);

bool isNumber(const std::string& text) {
  return !text.empty() && text.size() <= kMostDigits &&
         std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
}

}  // namespace

grants::CallerText packed(const LoginText& login) {
  const long long time = std::max(login.authTime, 0LL);
  return grants::CallerText(std::string(kStart) + std::to_string(time) + ' ' + login.nonce);
}

std::optional<LoginText> unpacked(const grants::CallerText& text) {
  const std::string& all = text.text();
  const std::size_t blank = all.find(' ', kStart.size());
  if (all.compare(0, kStart.size(), kStart) != 0 || blank == std::string::npos) return {};
  const std::string time = all.substr(kStart.size(), blank - kStart.size());
  if (!isNumber(time)) return {};
  return LoginText{number(time), all.substr(blank + 1)};
}

}  // namespace keldoauth::service
