#include "examples/cgi/tokens.h"

#include <ctime>
#include <functional>
#include <vector>

#include "core/oauth_errors.h"
#include "examples/cgi/answer.h"
#include "examples/cgi/clients.h"
#include "examples/cgi/encoding.h"
#include "stores/oauth_token.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace service {
namespace {

using namespace KELDOAUTHSERVER;

/// 60 random bits name a family; the other three quarters are the secret.
constexpr std::size_t kFamilyBytes = 16;

using LookUp = bool (OAUTHDBToken::*)(const std::string&, Json::Value*);

std::optional<Token> find(LookUp lookUp, const std::string& text) {
  // The store would call another length a failure; here it is an unknown token.
  if (text.size() != kIdentifierLength) return std::nullopt;
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value rows;
  if (!(tokens.*lookUp)(text, &rows)) throw Unavailable{};
  if (rows.empty()) return std::nullopt;
  return tokenOf(rows[0]);
}

/// In one transaction: there may be many, and each alone waits for the medium.
void removeTokens(const std::function<bool(const Token&)>& isOne) {
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value rows;
  if (!tokens.Get(&rows)) throw Unavailable{};
  std::vector<std::string> ended;
  for (const Json::Value& row : rows) {
    const Token token = tokenOf(row);
    if (isOne(token)) ended.push_back(token.access);
  }
  if (ended.empty()) return;
  if (tokens.DBCmd("BEGIN IMMEDIATE", nullptr, nullptr) == 0) throw Unavailable{};
  for (const std::string& access : ended) takeRow(tokens, names::kAccessToken, access);
  if (tokens.DBCmd("COMMIT", nullptr, nullptr) == 0) throw Unavailable{};
}

/// A token that this service did not issue has a state of its own kind.
TokenState stateOf(const Json::Value& row) {
  std::optional<TokenState> state = unpackTokenState(undoubled(row[names::kState]));
  if (state) return *state;
  return {undoubled(row[names::kScope]), "", 0};
}

}  // namespace

bool Token::isRefreshable() const {
  return flow == kFlowCode && expires + kRefreshSeconds >= std::time(nullptr);
}

Token tokenOf(const Json::Value& row) {
  return {undoubled(row[names::kUsername]),
          undoubled(row[names::kClientId]),
          undoubled(row[names::kScope]),
          undoubled(row[names::kFlowType]),
          undoubled(row[names::kIp]),
          number(row[names::kExpiredTime].asString()),
          stateOf(row),
          row[names::kAccessToken].asString(),
          row[names::kRefreshToken].asString()};
}

std::optional<Token> findAccessToken(const std::string& text) {
  return find(&OAUTHDBToken::GetWithAccessToken, text);
}

std::optional<Token> findRefreshToken(const std::string& text) {
  return find(&OAUTHDBToken::GetWithRefreshToken, text);
}

std::optional<Token> verifiedToken(const std::string& text) {
  if (text.size() != kIdentifierLength) return std::nullopt;
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value holder;
  if (!tokens.Verify(text, holder)) {
    // Anything but "expired" means that the store could not look.
    if (holder[names::kErrCode].asInt() != errors::kAccessTokenExpired.code) throw Unavailable{};
    return std::nullopt;
  }
  // Verify does not name the application, and one that the administrator has
  // disabled or removed must not get in any more.
  Json::Value rows;
  if (!tokens.GetWithAccessToken(text, &rows)) throw Unavailable{};
  if (rows.empty()) return std::nullopt;
  Token token = tokenOf(rows[0]);
  const std::optional<Client> client = findClient(token.clientId);
  if (!client || !client->enabled) return std::nullopt;
  return token;
}

bool removeToken(const Token& token) {
  OAUTHDBToken tokens(names::kTokenTable);
  return takeRow(tokens, names::kAccessToken, token.access);
}

Pair nextPair(const std::string& refresh) {
  return {getRandomStr(kIdentifierLength),
          refresh.substr(0, kFamilyBytes) + getRandomStr(kIdentifierLength).substr(kFamilyBytes)};
}

void removeTokensOfCode(const std::string& clientId, const std::string& codeDigest,
                        long long before) {
  removeTokens([&](const Token& token) {
    return token.clientId == clientId && token.state.codeDigest == codeDigest &&
           token.state.issued < before;
  });
}

void removeTokensOfFamily(const std::string& clientId, const std::string& refresh,
                          long long before) {
  if (refresh.size() != kIdentifierLength) return;
  removeTokens([&](const Token& token) {
    return token.clientId == clientId && token.state.issued < before &&
           token.refresh.compare(0, kFamilyBytes, refresh, 0, kFamilyBytes) == 0;
  });
}

void requireRoom(unsigned long freed) {
  const auto most = static_cast<unsigned long>(getTableRowMax(names::kTokenMax)) + freed;
  OAUTHDBToken tokens(names::kTokenTable);
  if (tokens.DBCheckRowMax(most) != 0) return;
  removeTokens([](const Token& token) {
    return token.expires < std::time(nullptr) && !token.isRefreshable();
  });
  if (tokens.DBCheckRowMax(most) != 0) return;
  tokens.Purge();
  if (tokens.DBCheckRowMax(most) == 0) throw Unavailable{};
}

}  // namespace service
