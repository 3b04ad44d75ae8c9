#include "service/oidc/id_token.h"

#include <json/value.h>

#include <algorithm>

#include "service/oidc/login_text.h"
#include "service/settings/scopes.h"
#include "service/signing/base64url.h"
#include "service/signing/jws.h"
#include "service/signing/key_fault.h"
#include "service/signing/key_file.h"
#include "service/signing/sha256.h"
#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr signing::Time kLifetime = 3600;
static_assert(kLifetime < signing::kAfter, "a key is published as long as what it signed is good");

constexpr std::size_t kMostSubject = 255;
constexpr char kProfile[] = "profile";

Json::Value claimsFor(const Settings& settings, const grants::Application& audience,
                      const grants::Pair& pair, Occasion occasion) {
  Json::Value claims(Json::objectValue);
  claims["iss"] = settings.issuer;
  claims["sub"] = openIdSubject(*pair.user);
  claims["aud"] = audience.identifier.text();
  claims["iat"] = static_cast<Json::Int64>(pair.issued);
  claims["exp"] = static_cast<Json::Int64>(pair.issued + kLifetime);
  claims["at_hash"] = signing::halfDigest(pair.access.text());
  // There are web sites that never ask for more than this token.
  if (sharesName(pair.scope.text())) claims["preferred_username"] = pair.user->text();
  const auto login = unpacked(pair.text);
  if (login) claims["auth_time"] = static_cast<Json::Int64>(login->authTime);
  if (login && occasion == Occasion::kLogin && !login->nonce.empty()) {
    claims["nonce"] = login->nonce;
  }
  return claims;
}

std::string textIn(const Json::Value& claims, const char* name) {
  return claims[name].isString() ? claims[name].asString() : "";
}

}  // namespace

bool offersOpenId(const Settings& settings) {
  return !settings.scopes.known(kOpenId).empty();
}

bool sharesName(const std::string& scope) {
  return isWithin(kProfile, scope);
}

bool asksWhoItIs(const std::string& scope) {
  return isWithin(kOpenId, scope);
}

std::string openIdSubject(const grants::User& user) {
  const std::string& name = user.text();
  const bool isPlain =
      name.size() <= kMostSubject &&
      std::all_of(name.begin(), name.end(), [](char c) { return c >= ' ' && c <= '~'; });
  if (isPlain) return name;
  const signing::Digest digest = signing::sha256(name);
  return "sha256:" + base64Url({reinterpret_cast<const char*>(digest.data()), digest.size()});
}

Hint readHint(const Settings& settings, const std::string& token) try {
  if (token.empty()) return {};
  const auto claims = signing::claimsOf(token, signing::KeyFile(settings.signingKeysFile).read());
  if (!claims || textIn(*claims, "iss") != settings.issuer) return {};
  return {textIn(*claims, "sub"), textIn(*claims, "aud")};
} catch (const signing::KeyFault&) {
  return {};
}

std::string idTokenFor(const Settings& settings, const grants::Application& audience,
                       const grants::Pair& pair, Occasion occasion) {
  if (!pair.user || !offersOpenId(settings) || !asksWhoItIs(pair.scope.text())) return {};
  const signing::KeySet keys = signing::KeyFile(settings.signingKeysFile).read();
  const auto algorithm =
      audience.wantsEs256 ? signing::Algorithm::kEs256 : signing::Algorithm::kRs256;
  return signing::signedToken(claimsFor(settings, audience, pair, occasion),
                              keys.signingKey(algorithm, pair.issued));
}

}  // namespace keldoauth::service
