// Tokens: the pair of a login, one row however often it is refreshed, and the
// access tokens of applications that act for themselves. Only digests are
// stored: nobody can use what stands in the file.
//
// Rows in the clear, which other programs stored, are verified, introspected,
// listed and revoked here; they are not refreshed.

#ifndef KELDOAUTH_GRANTS_TOKENS_H
#define KELDOAUTH_GRANTS_TOKENS_H

#include <optional>

#include "grants/outcome.h"
#include "grants/texts.h"

namespace KELDOAUTHSERVER::grants {

class Store;

/// What an application gets. The texts are told this once.
struct Pair {
  AccessToken access;
  std::optional<RefreshToken> refresh;  // none for an application's own token
  std::optional<User> user;             // none likewise
  Scope scope;
  long long issued;   // Unix seconds
  long long expires;  // Unix seconds, of the access token; the last good one
  CallerText text;
};

/// A login without a code, for an administrator's own hand.
struct LoginRequest {
  User user;
  ApplicationId application;
  Scope scope;  // within the application's
  CallerText text = {};
  PeerAddress from = {};
  std::optional<long long> lifetime = {};  // as in Redemption
};

struct Refresh {
  ApplicationId application;  // who shows the token, authenticated
  RefreshToken token;
  /// Within the scope of the login, whatever was asked for in between; all of
  /// it when absent.
  std::optional<Scope> scope = {};
  PeerAddress from = {};
  std::optional<long long> lifetime = {};
};

struct OwnTokenRequest {
  ApplicationId application;        // authenticated
  std::optional<Scope> scope = {};  // all of the application's when absent
  PeerAddress from = {};
  std::optional<long long> lifetime = {};
};

/// What a good access token says.
struct Bearer {
  std::optional<User> user;  // none: the application acts for itself
  Scope scope;
  ApplicationId application;
  ApplicationName applicationName;
  std::optional<long long> issued;  // not known of another program's token
  long long expires;                // Unix seconds; the last good one
  CallerText text;
};

struct Introspection {
  enum class Kind { kAccess, kRefresh };
  Kind kind;
  Bearer bearer;  // of a refresh token: the login's scope, and when it ends unused
};

struct Revoked {
  bool wasThere;
};

/// Each throws Trouble.
class Tokens {
 public:
  explicit Tokens(Store& store) : store_(store) {}

  /// Bounds as with Codes::redeem. Refusals: kInvalidRequest, kInvalidClient,
  /// kInvalidScope. Trouble: kFull.
  Outcome<Pair> issue(const LoginRequest& request);

  /// Another pair in place of the one that this token belongs to; both of its
  /// tokens are no good from now on. Of several requests with one token, one
  /// succeeds. Needs no room. Refusals: kInvalidClient, kInvalidGrant,
  /// kInvalidScope (the token is still good then), kInvalidRequest.
  ///
  /// A token that was replaced before is a replay when its own application
  /// shows it: it ends the login (kReplayed), but for the one that was replaced
  /// last, less than the policy's grace ago (kUsedBefore).
  /// Note: so a client that lost the answer to a refresh has lost its login.
  Outcome<Pair> refresh(const Refresh& refresh);

  /// A token of the application's own. Beyond the policy's bound its oldest
  /// goes. Refusals: kInvalidClient, kUnauthorizedClient (a public one),
  /// kInvalidScope, kInvalidRequest. Trouble: kFull.
  Outcome<Pair> issueToItself(const OwnTokenRequest& request);

  /// Who a bearer is. Refusals: kInvalidToken, also for a token whose
  /// application is disabled or gone.
  Outcome<Bearer> verify(const AccessToken& token) const;

  /// As `verify` for an access token, which any application may ask about; of a
  /// refresh token only the application that holds it. Nothing: inactive.
  std::optional<Introspection> introspect(const ApplicationId& asking, const AnyToken& token) const;

  /// Ends the login that the token belongs to, or the application's own token.
  /// A refresh token, or the access token, that was replaced meanwhile still
  /// ends its login. One that is not there any more is a success. Refusal:
  /// kInvalidGrant for another application's, which stays. One audit entry when
  /// something was ended.
  Outcome<Revoked> revoke(const ApplicationId& asking, const AnyToken& token);

 private:
  Store& store_;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_TOKENS_H
