#include "grants/tokens.h"

#include <string>

#include "grants/rows/checks.h"
#include "grants/rows/digest.h"
#include "grants/rows/issuing.h"
#include "grants/rows/notes.h"
#include "grants/rows/quotes.h"
#include "grants/rows/read_rows.h"
#include "grants/rows/refresh_text.h"
#include "grants/rows/store.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants {
namespace {

using rows::ApplicationRow;
using rows::TokenRow;

Refusal requestFault(Why why) {
  return {Error::kInvalidRequest, why};
}

Refusal grantFault(Why why) {
  return {Error::kInvalidGrant, why};
}

constexpr Refusal kWider{Error::kInvalidScope, Why::kWiderScope};

std::optional<Refusal> faultOf(const PeerAddress& from, const std::optional<long long>& lifetime) {
  if (!rows::isPeer(from.text())) return requestFault(Why::kBadPeer);
  if (!rows::isLifetime(lifetime)) return requestFault(Why::kOutOfBounds);
  return {};
}

std::optional<Refusal> faultOf(const std::optional<Scope>& scope) {
  if (!scope) return {};
  const auto why = rows::faultOf({{scope->text(), bounds::kScope}});
  return why ? std::optional<Refusal>(requestFault(*why)) : std::nullopt;
}

std::optional<Refusal> faultOf(const LoginRequest& request) {
  const auto why = rows::faultOf({{request.user.text(), bounds::kUsername},
                                  {request.scope.text(), bounds::kScope},
                                  {request.text.text(), kCallerTextBounds}});
  if (why) return requestFault(*why);
  if (request.user.text() == kNoUser) return requestFault(Why::kReservedUser);
  if (!fitsEver(rows::TokenState{0, 0, 0, "", "", "", "", request.text.text()},
                request.scope.text())) {
    return requestFault(Why::kTooMuch);
  }
  return faultOf(request.from, request.lifetime);
}

// Refreshing --------------------------------------------------------------------

bool isCurrent(const TokenRow& login, const std::string& shown) {
  return rows::equalSecrets(login.storedRefresh, rows::markOf(shown));
}

/// Whether the login's token was this one until a moment ago.
bool isJustReplaced(const TokenRow& login, const std::string& shown, long long now,
                    const Policy& policy) {
  return isWithinGrace(login.state->issued, now, policy) &&
         rows::equalSecrets(login.state->refreshBefore, rows::markOf(shown));
}

void noteEnd(Store& store, const ApplicationRow& application, const TokenRow& token,
             const std::string& by) {
  rows::noteEnd(store,
                {application.shown.name, token.application, application.shown.registeredItself},
                token.isOwn() ? std::nullopt : std::optional<std::string>(token.user), by);
}

Refusal endReplayed(Store& store, Whole& whole, const ApplicationRow& application,
                    const TokenRow& login) {
  rows::erase(store, login);
  noteEnd(store, application, login, rows::kAfterReplay);
  whole.commit();
  return grantFault(Why::kReplayed);
}

/// A refresh token of another form may be another program's.
Why whyUnknown(Store& store, const std::string& shown) {
  return rows::findForeignRefresh(store, shown) ? Why::kForeign : Why::kUnknown;
}

// Looking up --------------------------------------------------------------------

/// Member by member, as the entries of a list are.
Bearer bearerOf(const TokenRow& token, const Application& application, const std::string& scope,
                long long expires) {
  Bearer bearer{};
  if (!token.isOwn()) bearer.user = User(token.user);
  bearer.scope = Scope(scope);
  bearer.application = application.identifier;
  bearer.applicationName = application.name;
  if (token.isOurs()) bearer.issued = token.state->issued;
  bearer.expires = expires;
  if (token.isOurs()) bearer.text = CallerText(token.state->text);
  return bearer;
}

Outcome<Bearer> verifyAt(Store& store, const std::string& shown, long long now) {
  const auto refuse = [](Why why) { return Refusal{Error::kInvalidToken, why}; };
  if (rows::hasNul(shown)) return refuse(Why::kHasNul);
  const auto found = rows::findShownAccess(store, shown);
  if (!found) return refuse(Why::kUnknown);
  if (found->expires < now) return refuse(Why::kExpired);
  const auto application = rows::actingApplication(store, ApplicationId(found->application));
  if (!application) return refuse(application.refusal().why);
  return bearerOf(*found, application->shown, found->scope, found->expires);
}

/// Of a refresh token that its application holds and may still use.
std::optional<Introspection> introspectRefresh(Store& store, const TokenRow& login,
                                               const ApplicationId& asking, long long now) {
  if (login.isOwn() || login.application != asking.text() || login.ends(store.policy) < now) {
    return {};
  }
  const auto application = rows::actingApplication(store, asking);
  if (!application) return {};
  return Introspection{
      Introspection::Kind::kRefresh,
      bearerOf(login, application->shown, login.loginScope(), login.ends(store.policy))};
}

/// A row whose access token this was until it was refreshed. Read among the
/// application's own, by what they remember.
std::optional<TokenRow> findReplacedAccess(Store& store, const ApplicationId& asking,
                                           const std::string& shown) {
  const std::string mark = rows::markOf(shown);
  const Json::Value found = Store::rowsWhere(
      store.tokens, std::string(names::kClientId) + "=" +
                        rows::literal(Store::sealed(asking.text())) + " AND instr(" +
                        names::kState + "," + rows::literal(mark) + ")>0");
  for (const Json::Value& row : found) {
    TokenRow token = rows::tokenOf(row);
    if (token.isOurs() && token.state->accessBefore == mark) return token;
  }
  return {};
}

/// The row to which a token belongs or belonged, whichever of the two it is.
std::optional<TokenRow> rowOf(Store& store, const ApplicationId& asking, const std::string& shown) {
  if (rows::hasNul(shown) || rows::isMark(shown)) return {};
  const auto token = rows::findShownToken(store, shown);
  return token ? token : findReplacedAccess(store, asking, shown);
}

}  // namespace

Outcome<Pair> Tokens::issue(const LoginRequest& request) {
  if (const auto fault = faultOf(request)) return *fault;
  Whole whole(store_);
  const long long now = currentTime();
  const auto application = rows::actingApplication(store_, request.application);
  if (!application) return application.refusal();
  if (!rows::isScopeWithin(request.scope.text(), application->shown.scope.text())) return kWider;
  const auto login = rows::storeToken(store_,
                                      {request.user, request.application, request.scope,
                                       request.text, request.from, request.lifetime, now},
                                      now);
  whole.commit();
  return login->pair;
}

Outcome<Pair> Tokens::refresh(const Refresh& refresh) {
  if (const auto fault = faultOf(refresh.from, refresh.lifetime)) return *fault;
  const std::string& shown = refresh.token.text();
  if (rows::hasNul(shown)) return grantFault(Why::kHasNul);
  if (const auto fault = faultOf(refresh.scope)) return *fault;

  Whole whole(store_);
  const long long now = currentTime();
  const auto application = rows::actingApplication(store_, refresh.application);
  if (!application) return application.refusal();
  const auto text = rows::read(shown);
  if (!text) return grantFault(whyUnknown(store_, shown));
  const auto login = rows::loginOf(store_, *text);
  if (!login) return grantFault(Why::kUnknown);
  if (login->application != refresh.application.text()) return grantFault(Why::kOtherApplication);
  if (!isCurrent(*login, shown)) {
    if (isJustReplaced(*login, shown, now, store_.policy)) {
      return grantFault(Why::kUsedBefore);
    }
    return endReplayed(store_, whole, *application, *login);
  }
  if (login->ends(store_.policy) < now) return grantFault(Why::kExpired);
  const Scope scope = refresh.scope.value_or(Scope(login->loginScope()));
  if (!rows::isScopeWithin(scope.text(), login->loginScope())) return kWider;

  const Pair pair =
      rows::replaceToken(store_, *login, shown, {scope, refresh.from, refresh.lifetime}, now);
  whole.commit();
  return pair;
}

Outcome<Pair> Tokens::issueToItself(const OwnTokenRequest& request) {
  if (const auto fault = faultOf(request.from, request.lifetime)) return *fault;
  if (const auto fault = faultOf(request.scope)) return *fault;

  Whole whole(store_);
  const long long now = currentTime();
  const auto application = rows::actingApplication(store_, request.application);
  if (!application) return application.refusal();
  if (application->shown.kind == ApplicationKind::kPublic) {
    return Refusal{Error::kUnauthorizedClient, Why::kPublic};
  }
  const Scope scope = request.scope.value_or(application->shown.scope);
  if (!rows::isScopeWithin(scope.text(), application->shown.scope.text())) return kWider;
  const auto token = rows::storeToken(store_,
                                      {{},
                                       request.application,
                                       scope,
                                       {},
                                       request.from,
                                       request.lifetime,
                                       now,
                                       application->shown.registeredItself},
                                      now);
  whole.commit();
  return token->pair;
}

Outcome<Bearer> Tokens::verify(const AccessToken& token) const {
  return verifyAt(store_, token.text(), currentTime());
}

std::optional<Introspection> Tokens::introspect(const ApplicationId& asking,
                                                const AnyToken& token) const {
  const std::string& shown = token.text();
  if (rows::hasNul(shown) || rows::isMark(shown)) return {};
  const long long now = currentTime();
  if (const auto text = rows::read(shown)) {
    const auto login = rows::loginOf(store_, *text);
    if (!login || !isCurrent(*login, shown)) return {};
    return introspectRefresh(store_, *login, asking, now);
  }
  if (const auto bearer = verifyAt(store_, shown, now)) {
    return Introspection{Introspection::Kind::kAccess, *bearer};
  }
  const auto foreign = rows::findForeignRefresh(store_, shown);
  return foreign ? introspectRefresh(store_, *foreign, asking, now) : std::nullopt;
}

Outcome<Revoked> Tokens::revoke(const ApplicationId& asking, const AnyToken& token) {
  Whole whole(store_);
  const auto application = rows::actingApplication(store_, asking);
  if (!application) return application.refusal();
  const auto found = rowOf(store_, asking, token.text());
  if (!found) return Revoked{false};
  if (found->application != asking.text()) return grantFault(Why::kOtherApplication);
  rows::erase(store_, *found);
  noteEnd(store_, *application, *found, rows::kByItself);
  whole.commit();
  return Revoked{true};
}

}  // namespace KELDOAUTHSERVER::grants
