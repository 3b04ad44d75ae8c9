// Authorisation codes: issued once the user has agreed, redeemed once.
//
// A code that was redeemed stays behind, spent, so that it is known when it
// comes again. Only its digest is stored: nobody can redeem what stands in the
// file.

#ifndef KELDOAUTH_GRANTS_CODES_H
#define KELDOAUTH_GRANTS_CODES_H

#include <optional>

#include "grants/outcome.h"
#include "grants/texts.h"
#include "grants/tokens.h"

namespace KELDOAUTHSERVER::grants {

class Store;

/// Whether the authorisation request named the redirect address, which the
/// redemption has to repeat then, or it was the only one registered.
enum class AddressNamed { kInRequest, kImplied };

struct Pkce {
  enum class Method { kS256, kPlain };
  Challenge challenge;
  Method method = Method::kS256;
};

struct CodeRequest {
  User user;
  ApplicationId application;
  Scope scope;  // within the application's
  /// The service has found it to be one of the application's. Empty for a code
  /// that is handed over by other means.
  RedirectAddress redirect;
  AddressNamed named = AddressNamed::kInRequest;
  std::optional<Pkce> pkce = {};
  CallerText text = {};
  PeerAddress from = {};
  /// Seconds; the settings' "grantcode_expired" when absent.
  std::optional<long long> lifetime = {};
  /// An administrator's own hand: no challenge although the application needs
  /// one.
  bool waivesPkce = false;
  /// The user is not asked, because what they agreed to before is still alive:
  /// kNotRemembered unless a login of theirs with this application covers the
  /// scope (Access::hasLogin). Who makes a browser ask in the background must
  /// not end anything by it, so nothing that lives goes for such a code, nor for
  /// its login: kWouldEvict beyond a bound of the policy, for the code or, those
  /// that wait to be redeemed counted in, for the login. Either way the user can
  /// be asked instead.
  bool withoutPage = false;
  /// The pushed request that this came from, which ends with it: refused
  /// (kInvalidRequestUri) when it is not this application's, or not any more.
  std::optional<RequestReference> pushed = {};
};

/// What goes to the application, by way of the user.
struct IssuedCode {
  Code code;          // told this once
  long long expires;  // Unix seconds; it is good before this one
};

/// What an application shows at the token endpoint. A redirect address must be
/// the one of the request, byte by byte, and be there when it was named; a
/// verifier must be there when there was a challenge, and only then.
struct Redemption {
  ApplicationId application;  // who shows the code, authenticated
  Code code;
  std::optional<RedirectAddress> redirect = {};
  std::optional<Verifier> verifier = {};
  PeerAddress from = {};
  /// Of the access token, in seconds; the settings' "token_expired" when
  /// absent.
  std::optional<long long> lifetime = {};
};

/// Each throws Trouble.
class Codes {
 public:
  explicit Codes(Store& store) : store_(store) {}

  /// What `issue` would refuse for the request's own sake, without a look at
  /// the store: to be asked before the user is. Counted is the most that this
  /// grant can ever need in a row: redeemed, and refreshed with another scope.
  [[nodiscard]] static std::optional<Refusal> faultOf(const CodeRequest& request);

  /// Refusals: kInvalidRequest (also for what `faultOf` finds), kInvalidClient,
  /// kInvalidScope, kInvalidRequestUri; kAccessDenied without a page. Beyond a bound of the policy
  /// the user's oldest codes for this application, the user's and the
  /// application's go. Trouble: kFull.
  Outcome<IssuedCode> issue(const CodeRequest& request);

  /// The code is spent and the pair stored, or neither. Of several requests
  /// with one code, one succeeds. Refusals: kInvalidClient; kInvalidGrant for
  /// all that is wrong with the code, its address or its verifier, and nothing
  /// is spent then. A spent code that its application shows with the right
  /// address and verifier, later than the policy's grace, ends the login that
  /// came from it (kReplayed). Another program's code is refused (kForeign).
  /// Beyond a bound of the policy the logins go that were renewed longest ago:
  /// the user's with this application, the user's, the application's; a code
  /// without a page is refused instead (kWouldEvict), and still good.
  /// Trouble: kFull; the code is still good.
  Outcome<Pair> redeem(const Redemption& redemption);

 private:
  Store& store_;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_CODES_H
