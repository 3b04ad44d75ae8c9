// What a login remembers of how it came about, so that its tokens can say so: it
// goes along with the code and through every refresh (grants::CallerText).

#ifndef KELDOAUTH_SERVICE_OIDC_LOGIN_TEXT_H
#define KELDOAUTH_SERVICE_OIDC_LOGIN_TEXT_H

#include <cstddef>
#include <optional>
#include <string>

#include "grants/texts.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

inline constexpr std::size_t kMaxNonce = 256;

struct LoginText {
  long long authTime;  // when the user's password was asked for
  std::string nonce;   // of the application, kMaxNonce bytes at most; empty: none
};

grants::CallerText packed(const LoginText& login);

/// Nothing for a text that was not made here.
std::optional<LoginText> unpacked(const grants::CallerText& text);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_OIDC_LOGIN_TEXT_H
