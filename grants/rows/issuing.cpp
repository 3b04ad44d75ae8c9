#include "grants/rows/issuing.h"

#include <algorithm>

#include "grants/rows/digest.h"
#include "grants/rows/quotes.h"
#include "grants/rows/refresh_text.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

long long expiryOf(const std::optional<long long>& lifetime, long long now) {
  return now + lifetime.value_or(getExpiredPeriod(names::kTokenExpired));
}

/// No access token outlives the login.
long long expiryWithin(const Policy& policy, const std::optional<long long>& lifetime,
                       long long login, long long now) {
  return std::min(expiryOf(lifetime, now), later(login, policy.family));
}

Json::Value rowOf(const NewToken& token, const TokenState& state, const Pair& pair,
                  const std::string& refreshText) {
  Json::Value row;
  row[names::kUsername] = doubled(token.user ? token.user->text() : kNoUser);
  row[names::kClientId] = doubled(token.application.text());
  row[names::kScope] = doubled(token.scope.text());
  row[names::kRefreshToken] = markOf(refreshText);
  row[names::kAccessToken] = markOf(pair.access.text());
  row[names::kExpiredTime] = std::to_string(pair.expires);
  row[names::kFlowType] = token.user ? kLoginFlow : kOwnFlow;
  row[names::kState] = doubled(pack(state));
  row[names::kIp] = token.from.text();
  return row;
}

std::optional<Stored> storeLogin(Store& store, const NewToken& token, long long now) {
  const auto row =
      makeRoomForLogin(store, token.user->text(), token.application.text(), token.evicts, now);
  if (!row) return {};
  const RefreshText refresh = firstOf(*row);
  const std::string family = markOf(refresh.family);
  const std::string text = write(refresh);
  const Pair pair{AccessToken(randomDigits(kIdentifierLength)),
                  RefreshToken(text),
                  token.user,
                  token.scope,
                  now,
                  expiryWithin(store.policy, token.lifetime, token.login, now),
                  token.text};
  Json::Value document =
      rowOf(token, {token.login, now, now, family, "", "", "", token.text.text()}, pair, text);
  document[names::kId] = std::to_string(*row);
  Store::insert(store.tokens, document);
  return Stored{pair, *row, family};
}

/// As refresh token it gets the mark of random digits that nobody is told.
Stored storeOwn(Store& store, const NewToken& token, long long now) {
  const long long row =
      makeRoomForOwnToken(store, token.application.text(), token.ofSelfRegistered, now);
  const Pair pair{AccessToken(randomDigits(kIdentifierLength)),
                  {},
                  {},
                  token.scope,
                  now,
                  expiryOf(token.lifetime, now),
                  token.text};
  Json::Value document = rowOf(token, {now, now, now, "", "", "", "", token.text.text()}, pair,
                               randomDigits(kIdentifierLength));
  document[names::kId] = std::to_string(row);
  Store::insert(store.tokens, document);
  return {pair, row, ""};
}

}  // namespace

std::optional<Stored> storeToken(Store& store, const NewToken& token, long long now) {
  return token.user ? storeLogin(store, token, now) : storeOwn(store, token, now);
}

Pair replaceToken(Store& store, const TokenRow& old, const std::string& shown,
                  const Renewal& renewal, long long now) {
  const std::string refresh = write(nextOf(*read(shown)));
  Pair pair{AccessToken(randomDigits(kIdentifierLength)),
            RefreshToken(refresh),
            User(old.user),
            renewal.scope,
            now,
            expiryWithin(store.policy, renewal.lifetime, old.state->login, now),
            CallerText(old.state->text)};
  TokenState state = *old.state;
  state.issued = now;
  state.refreshBefore = old.storedRefresh;
  state.accessBefore = old.storedAccess;
  state.loginScope = old.loginScope() == renewal.scope.text() ? "" : old.loginScope();

  Json::Value modified;
  modified[names::kRefreshToken] = markOf(refresh);
  modified[names::kAccessToken] = markOf(pair.access.text());
  modified[names::kExpiredTime] = std::to_string(pair.expires);
  modified[names::kScope] = doubled(renewal.scope.text());
  modified[names::kState] = doubled(pack(state));
  if (!renewal.from.text().empty()) modified[names::kIp] = renewal.from.text();
  Store::changeSeen(store.tokens, conditionOf(old), modified);
  return pair;
}

}  // namespace KELDOAUTHSERVER::grants::rows
