// Token rows as the endpoints see them.

#ifndef KELDOAUTH_EXAMPLES_CGI_TOKENS_H
#define KELDOAUTH_EXAMPLES_CGI_TOKENS_H

#include <json/value.h>

#include <optional>
#include <string>

#include "examples/cgi/code_state.h"

namespace service {

/// A refresh token that nobody used for so long is worth nothing, even while
/// its row stands.
inline constexpr long long kRefreshSeconds = 30LL * 24 * 60 * 60;

inline constexpr char kFlowCode[] = "authorization_code";
inline constexpr char kFlowClient[] = "client_credentials";

struct Token {
  std::string user;  // the client's identifier in the client's own flow
  std::string clientId;
  std::string scope;
  std::string flow;
  std::string address;
  long long expires;
  TokenState state;
  std::string access;
  std::string refresh;

  [[nodiscard]] bool isRefreshable() const;
};

Token tokenOf(const Json::Value& row);

/// The row of an access or of a refresh token, live or not. Throws Unavailable
/// when the store cannot say.
std::optional<Token> findAccessToken(const std::string& text);
std::optional<Token> findRefreshToken(const std::string& text);

/// The live token of an enabled application behind a bearer's text.
std::optional<Token> verifiedToken(const std::string& text);

/// Removes the row. False when somebody else has removed it before. Throws
/// Unavailable.
bool removeToken(const Token& token);

struct Pair {
  std::string access;
  std::string refresh;
};

/// Draws the pair that follows one with this refresh token. The first quarter of
/// a refresh token names its family, all that came one from the other; the rest
/// is drawn anew.
Pair nextPair(const std::string& refresh);

// For codes and refresh tokens that come a second time (RFC 6749, 4.1.2; RFC
// 9700, 4.14.2): each removes the tokens of a client that came from it and were
// issued before `before`.

void removeTokensOfCode(const std::string& clientId, const std::string& codeDigest,
                        long long before);
void removeTokensOfFamily(const std::string& clientId, const std::string& refresh,
                          long long before);

/// Throws Unavailable while the table is full, rather than after the grant is
/// gone; `freed` rows of it will go first. To make room, tokens that are worth
/// nothing go; only when there are none, all expired ones, for their refresh
/// tokens go with them.
void requireRoom(unsigned long freed);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_TOKENS_H
