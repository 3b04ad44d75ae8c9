#include "grants/rows/read_rows.h"

#include <algorithm>
#include <utility>

#include "core/oauth_errors.h"
#include "grants/rows/checks.h"
#include "grants/rows/digest.h"
#include "grants/rows/quotes.h"
#include "grants/rows/room_rules.h"
#include "utils/decimal.h"
#include "utils/oauth_names.h"

namespace KELDOAUTHSERVER::grants::rows {
namespace {

constexpr char kEnabled[] = "1";

std::string textIn(const Json::Value& row, const char* column) {
  return undoubled(row[column].asString());
}

template <typename Kind>
std::vector<Kind> allOf(const std::vector<std::string>& texts) {
  return {texts.begin(), texts.end()};
}

/// What could not be decrypted is there as it was, and longer.
void requireIdentifier(const std::string& identifier) {
  if (isWithin(identifier, bounds::kIdentifier)) return;
  throw Trouble(errors::kDecryptFailed.code, errors::kDecryptFailed.message);
}

Json::Value rowsWith(OAUTHDBBasic& table, const char* column, const std::string& stored) {
  Json::Value condition;
  condition[column] = stored;
  return Store::rowsBy(table, condition);
}

Json::Value rowCondition(long long row) {
  Json::Value condition;
  condition[names::kId] = std::to_string(row);
  return condition;
}

}  // namespace

bool CodeRow::isOurs() const {
  return state.has_value();
}

bool TokenRow::isOurs() const {
  return state.has_value();
}

bool TokenRow::isOwn() const {
  return flow == kOwnFlow;
}

const std::string& TokenRow::loginScope() const {
  return isOurs() && !state->loginScope.empty() ? state->loginScope : scope;
}

long long TokenRow::ends(const Policy& policy) const {
  if (isOwn()) return expires;
  const long long unused = later(expires, policy.idle);
  return isOurs() ? std::min(unused, later(state->login, policy.family)) : unused;
}

ApplicationRow applicationOf(const Json::Value& row) {
  const std::string secret = textIn(row, names::kClientSecret);
  const bool isPublic = secret.rfind(kPublicStart, 0) == 0;
  RegistryWords words = unpackWords(textIn(row, names::kRedirectUri));
  // By a name, not nested: GCC 12 would destroy its members twice when memory
  // runs out behind it.
  Application shown{ApplicationId(textIn(row, names::kClientId)),
                    ApplicationName(textIn(row, names::kDisplayName)),
                    isPublic ? ApplicationKind::kPublic : ApplicationKind::kConfidential,
                    row[names::kEnable].asString() == kEnabled,
                    allOf<RedirectAddress>(words.addresses),
                    allOf<LogoutAddress>(words.logoutAddresses),
                    Scope(textIn(row, names::kScope)),
                    isPublic || !words.isPkceOptional,
                    words.registeredItself,
                    decimalValue(row[names::kId]),
                    words.wantsEs256};
  return {std::move(shown), secret, std::move(words)};
}

/// What another program stored may be a stranger's text, made up to look like
/// ours: only a row whose text was digested here has a state.
CodeRow codeOf(const Json::Value& row) {
  const std::string state = row[names::kState].asString();
  const std::string code = row[names::kCode].asString();
  return {decimalValue(row[names::kId]),
          textIn(row, names::kUsername),
          textIn(row, names::kClientId),
          textIn(row, names::kScope),
          textIn(row, names::kIp),
          decimalValue(row[names::kExpiredTime]),
          isMark(code) ? unpackCode(undoubled(state)) : std::nullopt,
          code,
          state};
}

TokenRow tokenOf(const Json::Value& row) {
  const std::string state = row[names::kState].asString();
  const std::string access = row[names::kAccessToken].asString();
  return {decimalValue(row[names::kId]),
          textIn(row, names::kUsername),
          textIn(row, names::kClientId),
          textIn(row, names::kScope),
          textIn(row, names::kFlowType),
          textIn(row, names::kIp),
          decimalValue(row[names::kExpiredTime]),
          isMark(access) ? unpackToken(undoubled(state)) : std::nullopt,
          access,
          row[names::kRefreshToken].asString(),
          state};
}

std::optional<ApplicationRow> findApplication(Store& store, const std::string& identifier) {
  if (!isWithin(identifier, bounds::kIdentifier) || hasNul(identifier)) return {};
  const Json::Value rows = rowsWith(store.applications, names::kClientId, doubled(identifier));
  if (rows.empty()) return {};
  ApplicationRow found = applicationOf(rows[0U]);
  requireIdentifier(found.shown.identifier.text());
  requireIdentifier(found.secret);
  return found;
}

Outcome<ApplicationRow> actingApplication(Store& store, const ApplicationId& identifier) {
  std::optional<ApplicationRow> found = findApplication(store, identifier.text());
  if (!found) return Refusal{Error::kInvalidClient, Why::kNoApplication};
  if (!found->shown.isEnabled) return Refusal{Error::kInvalidClient, Why::kDisabled};
  return *std::move(found);
}

std::optional<CodeRow> findCode(Store& store, const char* column, const std::string& stored) {
  const Json::Value rows = rowsWith(store.codes, column, stored);
  if (rows.empty()) return {};
  CodeRow code = codeOf(rows[0U]);
  requireIdentifier(code.application);
  return code;
}

std::optional<TokenRow> findToken(Store& store, const char* column, const std::string& stored) {
  const Json::Value rows = rowsWith(store.tokens, column, stored);
  if (rows.empty()) return {};
  TokenRow token = tokenOf(rows[0U]);
  requireIdentifier(token.application);
  return token;
}

std::optional<CodeRow> findShownCode(Store& store, const std::string& text) {
  if (hasNul(text) || isMark(text)) return {};
  std::optional<CodeRow> code = findCode(store, names::kCode, markOf(text));
  if (code && unpackPushed(undoubled(code->storedState))) return {};
  if (code || !isWithin(text, bounds::kIdentifier)) return code;
  return findCode(store, names::kCode, doubled(text));
}

std::optional<TokenRow> findShownAccess(Store& store, const std::string& text) {
  if (hasNul(text) || isMark(text)) return {};
  std::optional<TokenRow> token = findToken(store, names::kAccessToken, markOf(text));
  if (token || !isWithin(text, bounds::kIdentifier)) return token;
  return findToken(store, names::kAccessToken, doubled(text));
}

std::optional<TokenRow> findForeignRefresh(Store& store, const std::string& text) {
  if (hasNul(text) || isMark(text) || !isWithin(text, bounds::kIdentifier)) return {};
  return findToken(store, names::kRefreshToken, doubled(text));
}

std::optional<TokenRow> loginOf(Store& store, const RefreshText& text) {
  auto login = findToken(store, names::kId, std::to_string(text.row));
  if (!login || !login->isOurs() || login->isOwn() ||
      !equalSecrets(login->state->family, markOf(text.family))) {
    return {};
  }
  return login;
}

bool hasLogin(Store& store, const std::string& user, const std::string& application,
              const std::string& scope, long long now) {
  const Json::Value found = Store::rowsWhere(
      store.tokens, isOneOf(names::kClientId, {Store::sealed(application)}) + " AND " +
                        isOneOf(names::kUsername, spellings(user)) + " AND NOT " + isOwnToken());
  return std::any_of(found.begin(), found.end(), [&](const Json::Value& row) {
    const TokenRow login = tokenOf(row);
    return login.isOurs() && login.ends(store.policy) >= now &&
           isScopeWithin(scope, login.loginScope());
  });
}

std::optional<TokenRow> findShownToken(Store& store, const std::string& text) {
  if (const auto refresh = read(text)) return loginOf(store, *refresh);
  auto token = findShownAccess(store, text);
  return token ? token : findForeignRefresh(store, text);
}

Json::Value conditionOf(const CodeRow& code) {
  Json::Value condition = rowCondition(code.row);
  condition[names::kCode] = code.storedCode;
  condition[names::kState] = code.storedState;
  return condition;
}

Json::Value conditionOf(const TokenRow& token) {
  Json::Value condition = rowCondition(token.row);
  condition[names::kAccessToken] = token.storedAccess;
  condition[names::kRefreshToken] = token.storedRefresh;
  return condition;
}

bool erase(Store& store, const CodeRow& code) {
  return Store::erase(store.codes, conditionOf(code));
}

bool erase(Store& store, const TokenRow& token) {
  return Store::erase(store.tokens, conditionOf(token));
}

}  // namespace KELDOAUTHSERVER::grants::rows
