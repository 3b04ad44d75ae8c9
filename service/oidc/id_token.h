// Who a user is, said in a signed token (OpenID Connect Core, 2).

#ifndef KELDOAUTH_SERVICE_OIDC_ID_TOKEN_H
#define KELDOAUTH_SERVICE_OIDC_ID_TOKEN_H

#include <string>

#include "grants/applications.h"
#include "grants/tokens.h"
#include "service/settings/settings.h"

namespace keldoauth::service {

namespace grants = KELDOAUTHSERVER::grants;

/// The scope that asks for it.
inline constexpr char kOpenId[] = "openid";

/// Whether the owner has this scope on the box: without it nothing is signed and
/// nothing says that it could be.
bool offersOpenId(const Settings& settings);

/// Whether `openid` is among the names of the scope.
bool asksWhoItIs(const std::string& scope);

/// Whether the scope lets an application know what the user is called here.
bool sharesName(const std::string& scope);

/// How applications know the user: by the name on this box. One that is not plain
/// ASCII has a digest of it instead, which begins as no name does.
std::string openIdSubject(const grants::User& user);

/// The parameter with which an application shows a token that it has.
inline constexpr char kHint[] = "id_token_hint";

/// Who was signed in, and where, by a token of ours. Both are empty when it is
/// none, or one that cannot be checked any more.
struct Hint {
  std::string subject;
  std::string client;
};

/// It may have expired: who comes back late was signed in all the same.
Hint readHint(const Settings& settings, const std::string& token);

enum class Occasion { kLogin, kRefresh };

/// For the pair of a user with the scope `openid`, empty for any other. It lasts
/// an hour; on a refresh it has no nonce. Throws signing::KeyFault.
std::string idTokenFor(const Settings& settings, const grants::Application& audience,
                       const grants::Pair& pair, Occasion occasion);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_OIDC_ID_TOKEN_H
